#include "platform/files.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <cstdio>

#include "platform/device_root.h"

namespace host {

namespace {

constexpr int kAnyFile = O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC;
constexpr mode_t kFolderMode = 0700;
constexpr mode_t kFileMode = 0600;
// New files are written here first. The device clears what a killed writer left behind.
constexpr char kTemporaryFolder[] = "tmp";

bool TryReplace(const std::string& temporary, const std::string& path, std::string_view content,
                unsigned flags) {
    if (WriteFile(temporary, content) &&
        renameat2(DeviceRoot(), temporary.c_str(), DeviceRoot(), path.c_str(), flags) == 0) {
        return true;
    }
    const int error = errno;
    unlinkat(DeviceRoot(), temporary.c_str(), 0);
    errno = error;
    return false;
}

}  // namespace

void MakeFolders(int base, const std::string& path) {
    for (size_t end = path.find('/', 1); end != std::string::npos; end = path.find('/', end + 1)) {
        mkdirat(base, path.substr(0, end).c_str(), kFolderMode);
    }
    mkdirat(base, path.c_str(), kFolderMode);
}

ssize_t ReadFile(const std::string& path, char* buffer, size_t size) {
    const int file = openat(DeviceRoot(), path.c_str(), O_RDONLY | kAnyFile);
    if (file < 0) {
        return -1;
    }
    const ssize_t length = read(file, buffer, size);
    close(file);
    return length;
}

bool WriteFile(const std::string& path, std::string_view content) {
    const int file =
            openat(DeviceRoot(), path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | kAnyFile, kFileMode);
    if (file < 0) {
        return false;
    }
    const ssize_t written = write(file, content.data(), content.size());
    return close(file) == 0 && written == static_cast<ssize_t>(content.size());
}

bool ReplaceFile(const std::string& path, std::string_view content, unsigned flags) {
    static std::atomic<unsigned> serial{0};
    const std::string temporary = std::string(kTemporaryFolder) + "/" + std::to_string(getpid()) +
                                  "." + std::to_string(serial++);
    if (TryReplace(temporary, path, content, flags)) {
        return true;
    }
    if (errno != ENOENT) {
        return false;
    }
    MakeFolders(DeviceRoot(), kTemporaryFolder);
    MakeFolders(DeviceRoot(), path.substr(0, path.rfind('/')));
    return TryReplace(temporary, path, content, flags);
}

int OpenForAppending(const char* path, int flags) {
    const int file = openat(DeviceRoot(), path, O_WRONLY | O_APPEND | kAnyFile | flags, kFileMode);
    struct stat status = {};
    if (file >= 0 && (fstat(file, &status) != 0 || !S_ISREG(status.st_mode))) {
        close(file);
        errno = EINVAL;
        return -1;
    }
    return file;
}

}  // namespace host
