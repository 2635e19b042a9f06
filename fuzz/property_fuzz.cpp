// The property store over hostile files: whatever a file holds reads as a text within the limits,
// and whatever is accepted reads back.
#include <sys/system_properties.h>

#include <cstring>

#include "fuzz.h"

int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    const std::string bytes(reinterpret_cast<const char*>(data), size);
    WriteFile(UseDeviceRoot() + "/properties/odm.thp.binder", bytes);
    char value[PROP_VALUE_MAX];
    const int length = __system_property_get("odm.thp.binder", value);
    Check(std::string(value, static_cast<size_t>(length)) == bytes.substr(0, 91).c_str());

    const std::string text = bytes.c_str();
    const bool set = __system_property_set("odm.thp.rotate", text.c_str()) == 0;
    Check(set == (text.size() < PROP_VALUE_MAX));
    Check(!set || (__system_property_get("odm.thp.rotate", value), text == value));

    // The text as a name: nothing outside the store is ever written.
    Check(__system_property_set(text.c_str(), "1") != 0 || text.find('/') == std::string::npos);
    unlink((UseDeviceRoot() + "/properties/" + text).c_str());
    return 0;
}
