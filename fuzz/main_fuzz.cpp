// Runs the tool with arbitrary arguments on a fake device. The first two bytes of the input are
// bits that set the device's state; the arguments follow as zero-terminated strings. The last
// argument is also the kernel command line, the output of getenforce and the daemon's answer.
#include <bitset>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <sstream>

#include "daemon/TpdClient.h"
#include "tests/fake_device.h"

int tpd_main(int argc, char** argv);

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    static const bool silent = freopen("/dev/null", "w", stdout) != nullptr;
    if (size < 2) {
        return 0;
    }
    const std::bitset<16> state(data[0] + 256U * data[1]);
    std::istringstream strings(std::string(data + 2, data + size));
    std::vector<std::string> arguments = {"tpd"};
    for (std::string text; arguments.size() < 6 && std::getline(strings, text, '\0');) {
        arguments.push_back(text);
    }
    std::vector<char*> argv;
    for (std::string& argument : arguments) {
        argv.push_back(argument.data());
    }

    test::FakeDevice device;
    device.properties["odm.thp.dae_alive"] = state[0] ? "" : "true";
    device.properties["odm.thp.is_updating_fw"] = state[1] ? "1" : "";
    device.properties["odm.thp.debug.selinux.permissive"] = state[2] ? "" : "1";
    device.getenforce = state[3] ? "Permissive\n" : arguments.back();
    device.properties["persist.odm.thp.thplog_enabled"] = state[4] ? "true" : "";
    device.lookups = {!state[5], !state[6]};
    for (const bool dies : {state[7], state[8]}) {
        device.answers.push_back({dies ? android::DEAD_OBJECT : android::OK, argv.back()});
    }
    if (state[9]) {
        device.rejectedWrites = {"odm.thp.service_enable", "odm.thp.screen_status"};
    }
    device.kernelCommandLine = arguments.back();

    const bool succeeded = silent && tpd_main(static_cast<int>(argv.size()), argv.data()) == 0;
    if (!succeeded || device.calls({test::kTransact}).size() > 2 || !device.openStreams.empty()) {
        abort();  // libFuzzer saves the input
    }
    // The tool marks every command as two-way. RunCmd() without the mark reaches the one-way calls
    // and the check of a capacity test.
    if (argv.size() == 3) {
        TpdClient().RunCmd(argv[1], argv[2]);
    }
    return 0;
}
