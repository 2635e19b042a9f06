// The tool with any arguments, on a device with any kernel command line. The input's first byte
// chooses the state of the device; the arguments follow, each with a terminating zero.
#include <cstdio>
#include <vector>

#include "fuzz.h"
#include "tests/fake_device.h"

int tpd_main(int argc, char** argv);

int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    static const bool silent = freopen("/dev/null", "w", stdout) != nullptr;
    const int state = size > 0 ? data[0] : 0;
    test::FakeDevice device;
    device.properties["odm.thp.dae_alive"] = state % 3 != 0 ? "true" : "";
    device.properties["odm.thp.is_updating_fw"] = state % 5 == 0 ? "1" : "";
    device.properties["odm.thp.debug.selinux.permissive"] = state % 7 != 0 ? "1" : "";
    device.kernelCommandLine = ToString(data, size);
    device.lookups = {state % 11 != 0};
    device.answers = {{state % 2 != 0 ? android::OK : android::DEAD_OBJECT}};

    std::vector<std::string> arguments = {"tpd"};
    for (size_t at = 1; at < size && arguments.size() < 6; at += arguments.back().size() + 1) {
        arguments.emplace_back(ToString(data + at, size - at).c_str());
    }
    std::vector<char*> argv;
    for (std::string& argument : arguments) {
        argv.push_back(argument.data());
    }
    Check(silent && tpd_main(static_cast<int>(argv.size()), argv.data()) == 0);
    Check(device.calls({test::kTransact}).size() <= 2);
    return 0;
}
