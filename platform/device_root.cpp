#include "platform/device_root.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>

#include "platform/files.h"
#include "platform/unique_fd.h"

namespace host {

namespace {

int Refuse(const std::string& path, const char* why) {
    fprintf(stderr, "device root %s: %s\n", path.c_str(), why);
    return -1;
}

// Opens closed standard descriptors on /dev/null. Otherwise a file of the device could become
// standard output.
void FillStandardDescriptors() {
    UniqueFd null(open("/dev/null", O_RDWR));
    while (null.ok() && null.get() <= STDERR_FILENO) {
        (void)null.release();
        null.reset(open("/dev/null", O_RDWR));
    }
}

bool IsMarked(int root) {
    struct stat status = {};
    return fstatat(root, kMarkFile, &status, AT_SYMLINK_NOFOLLOW) == 0 && S_ISREG(status.st_mode);
}

// Marks an empty directory as a device root. Returns null, or the reason for the failure.
const char* Mark(int root, const std::string& path) {
    std::error_code error;
    if (std::filesystem::is_empty(path, error)) {
        const UniqueFd mark(openat(root, kMarkFile, O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600));
        return mark.ok() || errno == EEXIST ? nullptr : strerror(errno);
    }
    // Another process may have marked it in the meantime.
    return IsMarked(root) ? nullptr
                          : "contains files that do not belong to a device; use an empty directory";
}

// Returns null, or the reason why the directory cannot be the device root.
const char* Check(int root, const std::string& path) {
    struct stat status = {};
    if (fstat(root, &status) != 0) {
        return strerror(errno);
    }
    if (status.st_uid != geteuid()) {
        return "belongs to another user";
    }
    if ((status.st_mode & 0077) != 0) {
        return "is open to other users; its mode must be 0700";
    }
    return IsMarked(root) ? nullptr : Mark(root, path);
}

int OpenRoot() {
    FillStandardDescriptors();
    umask(077);
    signal(SIGXFSZ, SIG_IGN);  // a write beyond a limit fails, as on a full disk
    const std::string path = DeviceRootPath();
    if (path.empty()) {
        return Refuse("is unknown", "none of TPD_DEVICE_ROOT, XDG_STATE_HOME and HOME is set");
    }
    if (path.front() != '/') {
        return Refuse(path, "is not an absolute path");
    }
    constexpr int kFlags = O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;
    UniqueFd root(open(path.c_str(), kFlags));
    std::error_code error;
    if (!root.ok() && errno == ENOENT) {
        std::filesystem::create_directories(path, error);
        root.reset(open(path.c_str(), kFlags));
    }
    if (!root.ok()) {
        return Refuse(path, error ? strerror(error.value()) : strerror(errno));
    }
    const char* const why = Check(root.get(), path);
    return why == nullptr ? root.release() : Refuse(path, why);
}

}  // namespace

std::string DeviceRootPath() {
    constexpr const char* kPlaces[][2] = {{"TPD_DEVICE_ROOT", ""},
                                          {"XDG_STATE_HOME", "/tpd-device"},
                                          {"HOME", "/.local/state/tpd-device"}};
    std::string path;
    for (const auto& [variable, rest] : kPlaces) {
        const char* const value = getenv(variable);
        if (path.empty() && value != nullptr && *value != '\0') {
            path = std::string(value) + rest;
        }
    }
    // With a trailing slash, open() would follow a symbolic link despite O_NOFOLLOW.
    while (path.length() > 1 && path.back() == '/') {
        path.pop_back();
    }
    return path;
}

int DeviceRoot() {
    static const int root = OpenRoot();
    return root;
}

}  // namespace host
