#include "common.h"

#include <sys/system_properties.h>

#include <cstdlib>
#include <filesystem>

#include "platform/device_root.h"
#include "platform/files.h"

namespace fs = std::filesystem;

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

std::string ReadText(const std::string& path, const std::string& missing) {
    constexpr size_t kMaxArgumentBytes = 131072;
    std::string text(kMaxArgumentBytes, '\0');
    const ssize_t length = host::ReadFile(path, text.data(), text.size());
    return length < 0 ? missing : text.substr(0, static_cast<size_t>(length));
}

std::string SelinuxMode() { return ReadText("selinux", "Enforcing"); }

std::set<std::string> FilesIn(const std::string& folder) {
    std::set<std::string> names;
    std::error_code error;
    fs::directory_iterator file(fs::path(host::DeviceRootPath()) / folder, error);
    for (; file != fs::directory_iterator(); file.increment(error)) {
        names.insert(file->path().filename());
    }
    return names;
}

std::string PathBesideProgram(const std::string& name) {
    std::error_code error;
    return fs::read_symlink("/proc/self/exe", error).replace_filename(name);
}

}  // namespace device
