// Helpers shared by the programs of the virtual device.
#pragma once

#include <sys/system_properties.h>

#include <cerrno>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
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

// Returns what `getenforce` prints: Enforcing, Permissive or Disabled.
inline std::string SelinuxMode() {
    return host::ReadFile(host::kSelinuxFile).value_or("Enforcing");
}

// Returns the path of a file in the directory of the running executable. Without /proc, returns a
// path that does not exist.
inline std::string PathBesideProgram(const char* name) {
    std::error_code error;
    const std::filesystem::path program = std::filesystem::read_symlink("/proc/self/exe", error);
    return (error ? "/proc/self/exe" : program.parent_path()) / name;
}

}  // namespace device
