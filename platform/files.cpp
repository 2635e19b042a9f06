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

using std::filesystem::path;

constexpr int kAnyFile = O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC;
constexpr int kDirectory = O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;

UniqueFd OpenParent(const path& path, IfMissing ifMissing) {
    return OpenDirectory(path.has_parent_path() ? path.parent_path() : ".", ifMissing);
}

bool WriteAll(UniqueFd file, std::string_view content) {
    return file.ok() &&
           write(file.get(), content.data(), content.size()) ==
                   static_cast<ssize_t>(content.size()) &&
           close(file.release()) == 0;
}

}  // namespace

UniqueFd OpenDirectory(const path& path, IfMissing ifMissing) {
    UniqueFd directory;
    int above = DeviceRoot();
    for (const auto& name : path.relative_path()) {
        if (name.empty()) {
            break;  // a trailing slash
        }
        UniqueFd next(openat(above, name.c_str(), kDirectory));
        if (!next.ok() && errno == ENOENT && ifMissing == IfMissing::kMake) {
            mkdirat(above, name.c_str(), 0700);
            next.reset(openat(above, name.c_str(), kDirectory));
        }
        directory = std::move(next);
        above = directory.get();
        if (!directory.ok()) {
            break;
        }
    }
    return directory;
}

int PropertiesDirectory() {
    static const int properties = OpenDirectory(kPropertiesDirectory, IfMissing::kMake).release();
    return properties;
}

UniqueFd OpenFileAt(int directory, const std::string& name, int flags) {
    return UniqueFd(openat(directory, name.c_str(), flags | kAnyFile, 0600));
}

UniqueFd OpenFile(const path& path, int flags) {
    const UniqueFd parent = OpenParent(path, IfMissing::kFail);
    return parent.ok() ? OpenFileAt(parent.get(), path.filename(), flags) : UniqueFd();
}

int OpenForAppending(const char* name, int flags) {
    UniqueFd file = OpenFileAt(DeviceRoot(), name, O_WRONLY | O_APPEND | flags);
    struct stat status = {};
    if (file.ok() && (fstat(file.get(), &status) != 0 || !S_ISREG(status.st_mode))) {
        errno = EINVAL;
        return -1;
    }
    return file.release();
}

bool ReplaceFile(const path& path, std::string_view content) {
    const UniqueFd parent = OpenParent(path, IfMissing::kMake);
    return parent.ok() && ReplaceFileAt(parent.get(), path.filename(), content);
}

bool ReplaceFileAt(int directory, const std::string& name, std::string_view content,
                   unsigned flags) {
    static const int temporaries = OpenDirectory(kTemporaryDirectory, IfMissing::kMake).release();
    static std::atomic<unsigned> serial{0};
    const std::string temporary = std::to_string(getpid()) + "." + std::to_string(serial++);
    if (WriteAll(OpenFileAt(temporaries, temporary, O_WRONLY | O_CREAT | O_TRUNC), content) &&
        renameat2(temporaries, temporary.c_str(), directory, name.c_str(), flags) == 0) {
        return true;
    }
    const int error = errno;
    unlinkat(temporaries, temporary.c_str(), 0);
    errno = error;
    return false;
}

bool RemoveFile(const path& path) {
    const UniqueFd parent = OpenParent(path, IfMissing::kFail);
    return parent.ok() && unlinkat(parent.get(), path.filename().c_str(), 0) == 0;
}

}  // namespace host
