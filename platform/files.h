// Files of the device, by their paths below the device root. Symbolic links are not followed in any
// component of a path. A function that fails sets errno.
#pragma once

#include <filesystem>
#include <string>
#include <string_view>

#include "platform/unique_fd.h"

namespace host {

// The contents of the device root, except "settings/SPACE/KEY" and the binder driver.
constexpr char kCommandLineFile[] = "proc/cmdline";
constexpr char kInitLockFile[] = "init.lock";  // init holds a record lock on it while it runs
constexpr char kLogFile[] = "log";
constexpr char kPropertiesDirectory[] = "properties";
constexpr char kSelinuxFile[] = "selinux";
constexpr char kTemporaryDirectory[] = "tmp";  // new files are written here first
constexpr char kTraceFile[] = "trace";

enum class IfMissing { kFail, kMake };

// Opens a directory for reading and for the *at() calls. "." is the device root. The path may begin
// with a slash.
UniqueFd OpenDirectory(const std::filesystem::path& path, IfMissing ifMissing = IfMissing::kFail);

// The properties directory, made when missing. It stays open. -1 on failure.
int PropertiesDirectory();

// Opens a file with these flags of open().
UniqueFd OpenFile(const std::filesystem::path& path, int flags);
UniqueFd OpenFileAt(int directory, const std::string& name, int flags);

// Opens a regular file in the root itself for appending. The caller closes the descriptor. Rejects
// a pipe: a write to one without a reader would kill the process. O_CREAT in `flags` makes a
// missing file.
int OpenForAppending(const char* name, int flags);

// Replaces a file atomically, or makes it and its missing directories. `flags` are those of
// renameat2().
bool ReplaceFile(const std::filesystem::path& path, std::string_view content);
bool ReplaceFileAt(int directory, const std::string& name, std::string_view content,
                   unsigned flags = 0);

bool RemoveFile(const std::filesystem::path& path);

}  // namespace host
