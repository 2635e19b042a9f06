// The log facility: any message is formatted within its buffer, any signature trimmed as by hand.
#include "fuzz.h"
#include "log/Log.h"

int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    UseDeviceRoot();
    const std::string text(reinterpret_cast<const char*>(data), size);
    gSysLog.Printf(LOG_INFO, text, static_cast<int>(size), "%s|%s", text.c_str(), text.c_str());

    std::string name;
    for (const char c : text.substr(0, text.find('('))) {
        name = c == ' ' ? "" : name + c;
    }
    Check(gSysLog.PrettyTrim(text) == name);
    return 0;
}
