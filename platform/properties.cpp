// One file a property: properties/KEY in the device root holds the value's bytes.
#include <sys/system_properties.h>

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <atomic>
#include <cctype>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <string>

#include "device_root.h"

namespace {

constexpr char kFolder[] = "properties";
// New values are written here first. The device clears what a killed writer left behind.
constexpr char kTemporaryFolder[] = "tmp";

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

std::string PropertyPath(const std::string& name) { return std::string(kFolder) + "/" + name; }

// A property whose file the owner may not write is refused to every user, root included.
bool IsWriteProtected(int root, const std::string& path) {
    struct stat status = {};
    return fstatat(root, path.c_str(), &status, AT_SYMLINK_NOFOLLOW) == 0 &&
           (status.st_mode & S_IWUSR) == 0;
}

bool WriteFile(int root, const std::string& path, const char* value, size_t length) {
    constexpr int kFlags = O_WRONLY | O_CREAT | O_TRUNC | O_NOFOLLOW | O_CLOEXEC;
    int file = openat(root, path.c_str(), kFlags, 0600);
    if (file < 0 && errno == ENOENT) {
        mkdirat(root, kTemporaryFolder, 0700);
        mkdirat(root, kFolder, 0700);
        file = openat(root, path.c_str(), kFlags, 0600);
    }
    if (file < 0) {
        return false;
    }
    const bool written = write(file, value, length) == static_cast<ssize_t>(length);
    return close(file) == 0 && written;
}

}  // namespace

int __system_property_get(const char* name, char* value) {
    value[0] = '\0';
    const int root = host::DeviceRoot();
    if (root < 0 || !IsLegalName(name)) {
        return 0;
    }
    const int file = openat(root, PropertyPath(name).c_str(),
                            O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC);
    if (file < 0) {
        return 0;
    }
    const ssize_t length = read(file, value, PROP_VALUE_MAX - 1);
    close(file);
    value[length > 0 ? length : 0] = '\0';
    return static_cast<int>(strlen(value));
}

int __system_property_set(const char* name, const char* value) {
    const int root = host::DeviceRoot();
    const size_t length = strlen(value);
    if (root < 0 || !IsLegalName(name) || (length >= PROP_VALUE_MAX && !IsReadOnlyKey(name))) {
        return -1;
    }
    const std::string path = PropertyPath(name);
    if (IsWriteProtected(root, path)) {
        return -1;
    }
    static std::atomic<unsigned> serial{0};
    char temporary[64];
    snprintf(temporary, sizeof(temporary), "%s/%d.%u", kTemporaryFolder, getpid(), serial++);
    const unsigned flags = IsReadOnlyKey(name) ? RENAME_NOREPLACE : 0;
    if (WriteFile(root, temporary, value, length) &&
        renameat2(root, temporary, root, path.c_str(), flags) == 0) {
        return 0;
    }
    unlinkat(root, temporary, 0);
    return -1;
}
