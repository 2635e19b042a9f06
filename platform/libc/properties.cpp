// Every property is a file: properties/KEY in the device root contains the value.
#include <sys/system_properties.h>

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cctype>
#include <cstdio>
#include <cstring>
#include <string>

#include "platform/device_root.h"
#include "platform/files.h"
#include "platform/libc/properties.h"
#include "platform/trace.h"

namespace {

bool IsReadOnlyKey(const std::string& name) { return name.compare(0, 3, "ro.") == 0; }

bool IsLegalName(const std::string& name) {
    if (name.empty() || name.front() == '.' || name.back() == '.' ||
        name.find("..") != std::string::npos) {
        return false;
    }
    for (const char c : name) {
        if (isalnum(static_cast<unsigned char>(c)) == 0 && strchr("_.@:-", c) == nullptr) {
            return false;
        }
    }
    return true;
}

// Whether the value is valid UTF-8, without overlong forms and surrogates.
bool IsUtf8(const std::string& value) {
    constexpr char32_t kLeast[] = {0, 0x80, 0x800, 0x10000};
    for (size_t i = 0; i < value.length();) {
        const auto lead = static_cast<unsigned char>(value[i++]);
        const int following = lead < 0x80 ? 0 : lead < 0xE0 ? 1 : lead < 0xF0 ? 2 : 3;
        if ((lead >= 0x80 && lead < 0xC0) || lead > 0xF7) {
            return false;
        }
        char32_t point = following == 0 ? lead : lead & (0x3FU >> following);
        for (int k = 0; k < following; ++k) {
            const auto byte = static_cast<unsigned char>(i < value.length() ? value[i++] : '\0');
            if ((byte & 0xC0) != 0x80) {
                return false;
            }
            point = point << 6 | (byte & 0x3F);
        }
        const bool isSurrogate = point >= 0xD800 && point <= 0xDFFF;
        if (point < kLeast[following] || isSurrogate || point > 0x10FFFF) {
            return false;
        }
    }
    return true;
}

// Whether the owner's write permission is missing. Then not even root may write the property.
bool IsWriteProtected(int properties, const std::string& name) {
    struct stat status = {};
    return fstatat(properties, name.c_str(), &status, AT_SYMLINK_NOFOLLOW) == 0 &&
           (status.st_mode & S_IWUSR) == 0;
}

int Get(const std::string& name, char* value) {
    ssize_t length = -1;
    if (host::DeviceRoot() >= 0 && IsLegalName(name)) {
        const host::UniqueFd file = host::OpenFileAt(host::PropertiesDirectory(), name, O_RDONLY);
        length = file.ok() ? read(file.get(), value, PROP_VALUE_MAX - 1) : -1;
    }
    value[length > 0 ? length : 0] = '\0';
    return static_cast<int>(strlen(value));
}

bool Set(const std::string& name, const std::string& value) {
    if (host::DeviceRoot() < 0 || host::BrokenPropertyRule(name, value) != nullptr) {
        return false;
    }
    const int properties = host::PropertiesDirectory();
    return properties >= 0 && !IsWriteProtected(properties, name) &&
           host::ReplaceFileAt(properties, name, value, IsReadOnlyKey(name) ? RENAME_NOREPLACE : 0);
}

}  // namespace

const char* host::BrokenPropertyRule(const std::string& name, const std::string& value) {
    if (!IsLegalName(name)) {
        return "The name is illegal.";
    }
    if (value.length() >= PROP_VALUE_MAX && !IsReadOnlyKey(name)) {
        return "The value is longer than 91 bytes.";
    }
    return IsUtf8(value) ? nullptr : "The value is not UTF-8.";
}

int __system_property_get(const char* name, char* value) {
    host::TraceEvent event("property_read");
    const int length = Get(name, value);
    event.Add("name", name).Add("value", value);
    return length;
}

int __system_property_set(const char* name, const char* value) {
    host::TraceEvent event("property_write");
    char old[PROP_VALUE_MAX] = "";
    if (host::IsTraced()) {
        Get(name, old);
    }
    const int status = Set(name, value) ? 0 : -1;
    event.Add("name", name).Add("old", old).Add("new", value).Add("status", status);
    return status;
}
