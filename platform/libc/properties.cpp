// Properties are files: properties/KEY in the device root contains the value of KEY. A request to
// init is the file properties/KEY$VALUE, so that quick requests with the same key are not lost.
#include <sys/system_properties.h>

#include <fcntl.h>
#include <locale.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>

#include "platform/device_root.h"
#include "platform/events.h"
#include "platform/files.h"
#include "platform/libc/properties.h"

namespace {

bool IsReadOnlyKey(const std::string& name) { return name.rfind("ro.", 0) == 0; }

bool IsRequestKey(const std::string& name) { return name.rfind("ctl.", 0) == 0; }

bool IsLegalName(const std::string& name) {
    constexpr char kLegal[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789_.@:-";
    return !name.empty() && name.front() != '.' && name.back() != '.' &&
           name.find("..") == std::string::npos &&
           name.find_first_not_of(kLegal) == std::string::npos;
}

// Returns true if the value is valid UTF-8. The C library reads files to load the locale, so ASCII,
// the usual case, is checked without it.
bool IsUtf8(const std::string& value) {
    if (std::all_of(value.begin(), value.end(), [](char c) { return (c & 0x80) == 0; })) {
        return true;
    }
    static const locale_t utf8 = newlocale(LC_CTYPE_MASK, "C.UTF-8", nullptr);
    const locale_t previous = uselocale(utf8);
    std::wstring text(value.length(), L'\0');
    const size_t length = mbstowcs(text.data(), value.c_str(), text.length());
    uselocale(previous);
    // The C library also decodes characters above U+10FFFF.
    return length != static_cast<size_t>(-1) &&
           *std::max_element(text.begin(), text.end()) <= 0x10FFFF;
}

// Returns true if the owner has no write permission. Then even root cannot write the property.
bool IsWriteProtected(const std::string& name) {
    struct stat status = {};
    const std::string file = host::PropertyFile(name);
    return fstatat(host::DeviceRoot(), file.c_str(), &status, AT_SYMLINK_NOFOLLOW) == 0 &&
           (status.st_mode & S_IWUSR) == 0;
}

int Get(const std::string& name, char* value) {
    ssize_t length = 0;
    if (IsLegalName(name)) {
        const host::UniqueFd file = host::OpenFile(host::PropertyFile(name), O_RDONLY);
        length = file.ok() ? read(file.get(), value, PROP_VALUE_MAX - 1) : 0;
    }
    value[length > 0 ? length : 0] = '\0';
    return static_cast<int>(strlen(value));
}

bool Set(const std::string& name, const std::string& value) {
    if (host::PropertyError(name, value) != nullptr || IsWriteProtected(name)) {
        return false;
    }
    const unsigned flags = IsReadOnlyKey(name) ? RENAME_NOREPLACE : 0;
    const std::string file = IsRequestKey(name) ? name + "$" + value : name;
    return host::ReplaceFile(host::PropertyFile(file), value, flags);
}

}  // namespace

std::string host::PropertyFile(const std::string& name) {
    return std::string(host::kPropertiesDirectory) + "/" + name;
}

const char* host::PropertyError(const std::string& name, const std::string& value) {
    if (!IsLegalName(name)) {
        return "The name is illegal.";
    }
    if (value.length() >= PROP_VALUE_MAX && !IsReadOnlyKey(name)) {
        return "The value is longer than 91 bytes.";
    }
    return IsUtf8(value) ? nullptr : "The value is not UTF-8.";
}

int __system_property_get(const char* name, char* value) {
    host::Event event("property_read");
    const int length = Get(name, value);
    event.Add("name", name).Add("value", value);
    return length;
}

int __system_property_set(const char* name, const char* value) {
    host::Event event("property_write");
    char old[PROP_VALUE_MAX] = "";
    if (host::IsTraced()) {
        Get(name, old);
    }
    const int status = Set(name, value) ? 0 : -1;
    event.Add("name", name).Add("old", old).Add("new", value).Add("status", status);
    return status;
}
