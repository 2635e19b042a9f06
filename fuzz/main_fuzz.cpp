// The front end with any words, on a device in memory: the input's first byte is what the daemon
// makes of the call, then come the words, each ended by a zero byte.
#include <cstdio>

#include "fuzz.h"
#include "tests/fake_device.h"

extern int tpd_main(int argc, char** argv);

namespace {

class FuzzedDevice : public test::Device {
    void TestBody() override {}
};

}  // namespace

int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    static const bool silent = freopen("/dev/null", "w", stdout) != nullptr;
    const int script = size > 0 ? data[0] : 0;
    FuzzedDevice device;
    device.DaemonIs(script % 3 != 0 ? "true" : "", "1", script % 5 == 0 ? "1" : "");
    device.holds[test::kPermissive] = script % 7 != 0 ? "1" : "";
    device.lookups = {script % 11 != 0};
    device.answers = {{script % 2 != 0 ? android::OK : android::DEAD_OBJECT}};

    std::vector<std::string> words(1, "tpd");
    for (size_t at = 1; at < size && words.size() < 6; at += words.back().size() + 1) {
        words.emplace_back(std::string(data + at, data + size).c_str());
    }
    std::vector<char*> argv;
    for (std::string& word : words) {
        argv.push_back(word.data());
    }
    argv.push_back(nullptr);
    Check(silent && tpd_main(static_cast<int>(words.size()), argv.data()) == 0);
    Check(device.Shape("call").size() <= 8);  // two calls at the most
    return 0;
}
