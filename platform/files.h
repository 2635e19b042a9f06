// Files of the device, by their paths below the device root. No symbolic link is followed in the
// last place of a path. What fails leaves the reason in errno.
#pragma once

#include <sys/types.h>

#include <string>
#include <string_view>

namespace host {

// Makes a folder and those above it, for this user only. `base` is what a relative path begins at.
void MakeFolders(int base, const std::string& path);

// Reads at most `size` bytes from the beginning of a file. Returns how many, or -1.
ssize_t ReadFile(const std::string& path, char* buffer, size_t size);

// Puts the content into a file, which is made when it is missing. Other processes may see the file
// empty or half-written meanwhile.
bool WriteFile(const std::string& path, std::string_view content);

// Puts a new file in the place of the old one, in one step for every other process. Missing folders
// are made. `flags` are those of renameat2().
bool ReplaceFile(const std::string& path, std::string_view content, unsigned flags = 0);

// A descriptor that appends to a regular file, which the caller closes, or -1. A pipe is refused:
// writing to it ends the process once its reader is gone. O_CREAT in `flags` makes a missing file.
int OpenForAppending(const char* path, int flags);

}  // namespace host
