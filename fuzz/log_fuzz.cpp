// The log facility, with any function signature and message.
#include "fuzz.h"
#include "log/Log.h"
#include "tests/fake_device.h"

int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    test::FakeDevice device;
    const std::string signature = ToString(data, size);
    const std::string text = signature.c_str();
    gSysLog.Printf(LOG_INFO, signature, 7, "%s|%s", text.c_str(), text.c_str());

    std::string name;
    for (const char c : signature.substr(0, signature.find('('))) {
        name = c == ' ' ? "" : name + c;
    }
    Check(gSysLog.PrettyTrim(signature) == name);
    const std::string message = (text + "|" + text).substr(0, 2047);
    Check(device.calls().back() == test::Log(test::INFO, name.c_str() + ("[7] " + message)));
    return 0;
}
