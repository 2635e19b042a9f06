#include "common.h"

#include <dirent.h>
#include <fcntl.h>
#include <limits.h>
#include <sys/system_properties.h>
#include <unistd.h>

#include <cstdlib>

#include "platform/device_root.h"
#include "platform/files.h"

namespace device {

std::string GetProperty(const char* key) {
    char value[PROP_VALUE_MAX];
    __system_property_get(key, value);
    return value;
}

int64_t GetPropertyNumber(const char* key) {
    return strtoll(GetProperty(key).c_str(), nullptr, 10);
}

bool IsDaemonAlive() {
    return GetProperty(kDaemonAliveKey) == "true" && GetProperty(kDaemonBinderKey) == "1";
}

bool IsDaemonEnabled() {
    const std::string enable = GetProperty(kServiceEnableKey);
    return enable == "1" || enable == "true";
}

std::string SelinuxMode() {
    char mode[32];
    const ssize_t length = host::ReadFile("selinux", mode, sizeof(mode));
    if (length < 0) {
        return "Enforcing";
    }
    const std::string text(mode, static_cast<size_t>(length));
    return text.substr(0, text.find('\n'));
}

std::set<std::string> FilesIn(const std::string& folder) {
    std::set<std::string> names;
    DIR* const files = fdopendir(openat(host::DeviceRoot(), folder.c_str(),
                                        O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    while (const dirent* const file = files != nullptr ? readdir(files) : nullptr) {
        names.insert(file->d_name);
    }
    if (files != nullptr) {
        closedir(files);
    }
    names.erase(".");
    names.erase("..");
    return names;
}

std::string PathBesideProgram(const std::string& name) {
    char path[PATH_MAX];
    const ssize_t length = readlink("/proc/self/exe", path, sizeof(path));
    const std::string self(path, length > 0 ? static_cast<size_t>(length) : 0);
    return self.substr(0, self.rfind('/') + 1) + name;
}

}  // namespace device
