// The device's files. Paths are relative to the device root; symbolic links are not followed in any
// component. Functions set errno on failure.
#pragma once

#include <filesystem>
#include <string>
#include <string_view>

#include "platform/unique_fd.h"

namespace host {

// Paths in the device root.
constexpr char kCommandLineFile[] = "proc/cmdline";
constexpr char kLogFile[] = "log";
constexpr char kMarkFile[] = ".tpd-device";  // marks a directory as a device root
constexpr char kPropertiesDirectory[] = "properties";
constexpr char kSelinuxFile[] = "selinux";
constexpr char kTemporaryDirectory[] = "tmp";  // files are written here, then renamed
constexpr char kTraceFile[] = "trace";

enum class IfMissing { kFail, kMake };

// Opens a directory for reading and for the *at() calls. "." is the device root. The path may begin
// with a slash.
UniqueFd OpenDirectory(const std::filesystem::path& path, IfMissing ifMissing = IfMissing::kFail);

// Returns a descriptor of the properties directory, which stays open, or -1. Creates a missing
// directory.
int PropertiesDirectory();

// Opens a file. `flags` are those of open().
UniqueFd OpenFile(const std::filesystem::path& path, int flags);
UniqueFd OpenFileAt(int directory, const std::string& name, int flags);

// Opens a regular file directly in the device root for appending. The caller closes the descriptor.
// Rejects pipes: a write without a reader would kill the process. Creates a missing file if `flags`
// contains O_CREAT.
int OpenForAppending(const char* name, int flags);

// Replaces or creates a file atomically. ReplaceFile() also creates missing directories. `flags`
// are those of renameat2().
bool ReplaceFile(const std::filesystem::path& path, std::string_view content);
bool ReplaceFileAt(int directory, const std::string& name, std::string_view content,
                   unsigned flags = 0);

bool RemoveFile(const std::filesystem::path& path);

}  // namespace host
