// Reads of a property whose file has any bytes, and writes of any name and value.
#include <sys/system_properties.h>
#include <unistd.h>

#include "fuzz.h"
#include "platform/device_root.h"
#include "platform/files.h"

int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    const std::string bytes = ToString(data, size);
    Check(host::ReplaceFile("properties/odm.thp.binder", bytes));
    char value[PROP_VALUE_MAX];
    __system_property_get("odm.thp.binder", value);
    Check(value == std::string(bytes.substr(0, 91).c_str()));

    const std::string text = bytes.c_str();
    const bool accepted = __system_property_set("odm.thp.rotate", text.c_str()) == 0;
    Check(accepted == (text.size() < PROP_VALUE_MAX));
    __system_property_get("odm.thp.rotate", value);
    Check(!accepted || text == value);

    const bool named = __system_property_set(text.c_str(), "1") == 0;
    Check(!named || text.find('/') == std::string::npos);
    unlinkat(host::DeviceRoot(), ("properties/" + text).c_str(), 0);
    return 0;
}
