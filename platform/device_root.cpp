#include "platform/device_root.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "platform/files.h"

namespace host {

namespace {

bool IsSet(const char* value) { return value != nullptr && *value != '\0'; }

int Refuse(const std::string& path, const char* why) {
    fprintf(stderr, "device root %s: %s\n", path.c_str(), why);
    return -1;
}

// Opens closed standard descriptors. A file of the device must not get the number of one, since the
// program's output would go to that file.
void FillStandardDescriptors() {
    int null = open("/dev/null", O_RDWR);
    while (null >= 0 && null <= STDERR_FILENO) {
        null = open("/dev/null", O_RDWR);
    }
    close(null);
}

int OpenRoot() {
    FillStandardDescriptors();
    const std::string path = DeviceRootPath();
    if (path.empty()) {
        return Refuse("", "neither TPD_DEVICE_ROOT, XDG_STATE_HOME nor HOME names a place for it");
    }
    if (path.front() != '/') {
        return Refuse(path, "is not an absolute path");
    }
    constexpr int kFlags = O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;
    int root = open(path.c_str(), kFlags);
    if (root < 0 && errno == ENOENT) {
        MakeFolders(AT_FDCWD, path);
        root = open(path.c_str(), kFlags);
    }
    if (root < 0) {
        return Refuse(path, strerror(errno));
    }
    struct stat status = {};
    const char* why = nullptr;
    if (fstat(root, &status) != 0) {
        why = strerror(errno);
    } else if (status.st_uid != geteuid()) {
        why = "belongs to another user";
    } else if ((status.st_mode & 0077) != 0) {
        why = "is open to other users; its mode must be 0700";
    }
    if (why != nullptr) {
        close(root);
        return Refuse(path, why);
    }
    return root;
}

}  // namespace

std::string DeviceRootPath() {
    std::string path;
    if (const char* const root = getenv("TPD_DEVICE_ROOT"); IsSet(root)) {
        path = root;
    } else if (const char* const state = getenv("XDG_STATE_HOME"); IsSet(state)) {
        path = std::string(state) + "/tpd-device";
    } else if (const char* const home = getenv("HOME"); IsSet(home)) {
        path = std::string(home) + "/.local/state/tpd-device";
    }
    // With a trailing slash open() would follow a symbolic link.
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
