// Helpers shared by the programs of the virtual device.
#pragma once

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/system_properties.h>
#include <unistd.h>

#include <cerrno>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <optional>
#include <set>
#include <string>

#include "keys.h"
#include "platform/files.h"

namespace device {

// Exit statuses of the device's programs.
constexpr int kFailure = 1;
constexpr int kUsageError = 2;

// Prints the program's name and the message to standard error.
inline void Inform(const std::string& message) {
    fprintf(stderr, "%s: %s\n", program_invocation_short_name, message.c_str());
}

// Like Inform(). Returns `status`.
inline int Fail(const std::string& error, int status = kFailure) {
    Inform(error);
    return status;
}

// Like Fail(), with the reason from errno.
inline int FailForErrno(const std::string& what) { return Fail(what + ": " + strerror(errno)); }

// Returns the command that the user would type to run this program with these arguments, quoted.
inline std::string Command(const std::string& arguments) {
    return std::string("'") + program_invocation_short_name + " " + arguments + "'";
}

// Returns the arguments, at least one, separated by spaces.
inline std::string Join(int argc, char** argv) {
    std::string text = argv[0];
    for (int i = 1; i < argc; ++i) {
        text.append(" ").append(argv[i]);
    }
    return text;
}

// Returns the property's value, or an empty string if it is not set.
inline std::string GetProperty(const char* key) {
    char value[PROP_VALUE_MAX];
    __system_property_get(key, value);
    return value;
}

// Returns the decimal number at the start of the property's value, or 0 if it has none.
inline int64_t GetPropertyNumber(const char* key) {
    return strtoll(GetProperty(key).c_str(), nullptr, 10);
}

// Returns true if the daemon reports that it is alive and has published its service.
inline bool IsDaemonAlive() {
    return GetProperty(kDaemonAliveKey) == "true" && GetProperty(kDaemonBinderKey) == "1";
}

// Returns the contents of a regular file in the device root, or nullopt if it cannot be read.
inline std::optional<std::string> ReadFile(const std::string& path) {
    const host::UniqueFd file = host::OpenFile(path, O_RDONLY);
    struct stat status = {};
    if (!file.ok() || fstat(file.get(), &status) != 0 || !S_ISREG(status.st_mode)) {
        return std::nullopt;
    }
    std::string text(static_cast<size_t>(status.st_size), '\0');
    const ssize_t length = read(file.get(), text.data(), text.size());
    text.resize(length > 0 ? static_cast<size_t>(length) : 0);
    return text;
}

// Returns what `getenforce` prints: Enforcing, Permissive or Disabled.
inline std::string SelinuxMode() { return ReadFile(host::kSelinuxFile).value_or("Enforcing"); }

// Returns the names in a directory of the device root, or an empty set if it cannot be read.
inline std::set<std::string> FilesIn(const std::string& path) {
    const host::UniqueFd directory = host::OpenDirectory(path);
    const std::string opened = "/proc/self/fd/" + std::to_string(directory.get());
    std::set<std::string> names;
    std::error_code error;
    std::filesystem::directory_iterator file(opened, error);
    for (; file != std::filesystem::directory_iterator(); file.increment(error)) {
        names.insert(file->path().filename());
    }
    return names;
}

// Returns the path of a file in the directory of the running executable. Without /proc, returns a
// path that does not exist.
inline std::string PathBesideProgram(const char* name) {
    std::error_code error;
    const std::filesystem::path program = std::filesystem::read_symlink("/proc/self/exe", error);
    return (error ? "/proc/self/exe" : program.parent_path()) / name;
}

}  // namespace device
