// Files of the device, by their paths below the device root. No symbolic link in the last
// component of a path is followed. A function that returns false or -1 leaves the reason in errno.
#pragma once

#include <sys/types.h>

#include <string>
#include <string_view>

namespace host {

// Makes a folder and those above it, for this user only. A relative path begins at the folder that
// `base` is a descriptor of. A failure shows when the folder is used.
void MakeFolders(int base, const std::string& path);

// Reads at most `size` bytes from the beginning of a file. Returns how many, or -1.
ssize_t ReadFile(const std::string& path, char* buffer, size_t size);

// Overwrites a file, or makes it when it is missing. Other processes may see it empty or half
// written meanwhile.
bool WriteFile(const std::string& path, std::string_view content);

// Replaces a file atomically, or makes it and its missing folders. `flags` are those of
// renameat2().
bool ReplaceFile(const std::string& path, std::string_view content, unsigned flags = 0);

// A descriptor that appends to a regular file, or -1; the caller closes it. A pipe is rejected:
// writing to it ends the process once its reader is gone. O_CREAT in `flags` makes a missing file.
int OpenForAppending(const char* path, int flags);

}  // namespace host
