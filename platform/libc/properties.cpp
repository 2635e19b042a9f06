// One file for each property: properties/KEY in the device root, with the bytes of the value.
#include <sys/system_properties.h>

#include <fcntl.h>
#include <sys/stat.h>

#include <cctype>
#include <cstdio>
#include <cstring>
#include <string>

#include "platform/device_root.h"
#include "platform/files.h"
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

std::string PropertyPath(const std::string& name) { return "properties/" + name; }

// Whether the file's owner may not write it. Then nobody writes the property, not even root.
bool IsWriteProtected(const std::string& path) {
    struct stat status = {};
    return fstatat(host::DeviceRoot(), path.c_str(), &status, AT_SYMLINK_NOFOLLOW) == 0 &&
           (status.st_mode & S_IWUSR) == 0;
}

int Get(const std::string& name, char* value) {
    ssize_t length = -1;
    if (host::DeviceRoot() >= 0 && IsLegalName(name)) {
        length = host::ReadFile(PropertyPath(name), value, PROP_VALUE_MAX - 1);
    }
    value[length > 0 ? length : 0] = '\0';
    return static_cast<int>(strlen(value));
}

bool Set(const std::string& name, const std::string& value) {
    if (host::DeviceRoot() < 0 || !IsLegalName(name) ||
        (value.length() >= PROP_VALUE_MAX && !IsReadOnlyKey(name))) {
        return false;
    }
    const std::string path = PropertyPath(name);
    return !IsWriteProtected(path) &&
           host::ReplaceFile(path, value, IsReadOnlyKey(name) ? RENAME_NOREPLACE : 0);
}

}  // namespace

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
