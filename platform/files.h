// The device's files. Paths are relative to the device root. A file or directory that is a symbolic
// link is not opened. A function that fails sets errno and returns an invalid descriptor or false.
#pragma once

#include <optional>
#include <set>
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

// Opens a file or a directory. `flags` are those of open().
UniqueFd OpenFile(const std::string& path, int flags);

// Creates the missing directories above a file.
void MakeParents(const std::string& path);

// Returns the contents of a regular file, or nullopt if it cannot be read.
std::optional<std::string> ReadFile(const std::string& path);

// Replaces or creates a file atomically, in a directory that may be missing. `flags` are those of
// renameat2().
bool ReplaceFile(const std::string& path, std::string_view content, unsigned flags = 0);

bool RemoveFile(const std::string& path);

// Returns the names in a directory, or an empty set if it cannot be read.
std::set<std::string> FilesIn(const std::string& path);

// Returns an absolute path of the file for functions that take no directory descriptor. It is valid
// in this process only.
std::string AbsolutePath(const std::string& path);

}  // namespace host
