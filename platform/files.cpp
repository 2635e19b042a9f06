#include "platform/files.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <cstdio>

#include "platform/device_root.h"

namespace host {

namespace {

constexpr int kAnyFile = O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC;
constexpr int kDirectory = O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;
constexpr mode_t kDirectoryMode = 0700;
constexpr mode_t kFileMode = 0600;

// A file as the *at() calls name it: an open directory, -1 on failure, and a name in it.
class Place {
  public:
    Place(const std::string& path, IfMissing ifMissing)
        : mName(path.substr(path.rfind('/') + 1)),
          mIsInRoot(mName.length() == path.length()),
          mAbove(mIsInRoot ? UniqueFd()
                           : OpenDirectory(path.substr(0, path.length() - mName.length()),
                                           ifMissing)) {}

    int directory() const { return mIsInRoot ? DeviceRoot() : mAbove.get(); }
    const char* name() const { return mName.c_str(); }

  private:
    const std::string mName;
    const bool mIsInRoot;
    const UniqueFd mAbove;
};

UniqueFd OpenFileAt(int directory, const char* name, int flags) {
    return UniqueFd(openat(directory, name, flags | kAnyFile, kFileMode));
}

bool WriteAll(UniqueFd file, std::string_view content) {
    return file.ok() &&
           write(file.get(), content.data(), content.size()) ==
                   static_cast<ssize_t>(content.size()) &&
           close(file.release()) == 0;
}

// A directory that is made when it is missing and stays open once it could be opened.
int KeepOpen(const char* path, std::atomic<int>& kept) {
    if (kept < 0) {
        UniqueFd directory = OpenDirectory(path, IfMissing::kMake);
        int none = -1;
        if (directory.ok() && kept.compare_exchange_strong(none, directory.get())) {
            return directory.release();
        }
    }
    return kept;
}

int TemporaryDirectory() {
    static std::atomic<int> kept{-1};
    return KeepOpen(kTemporaryDirectory, kept);
}

}  // namespace

UniqueFd OpenDirectory(const std::string& path, IfMissing ifMissing) {
    UniqueFd directory;
    size_t begin = 0;
    do {
        const size_t end = std::min(path.find('/', begin), path.length());
        const std::string name = path.substr(begin, end - begin);
        const int above = begin == 0 ? DeviceRoot() : directory.get();
        UniqueFd next(openat(above, name.c_str(), kDirectory));
        if (!next.ok() && errno == ENOENT && ifMissing == IfMissing::kMake) {
            mkdirat(above, name.c_str(), kDirectoryMode);
            next.reset(openat(above, name.c_str(), kDirectory));
        }
        directory = std::move(next);
        begin = end + 1;
    } while (directory.ok() && begin < path.length());
    return directory;
}

int PropertiesDirectory() {
    static std::atomic<int> kept{-1};
    return KeepOpen(kPropertiesDirectory, kept);
}

UniqueFd OpenFile(const std::string& path, int flags) {
    const Place place(path, (flags & O_CREAT) != 0 ? IfMissing::kMake : IfMissing::kFail);
    return place.directory() < 0 ? UniqueFd() : OpenFileAt(place.directory(), place.name(), flags);
}

int OpenForAppending(const char* path, int flags) {
    UniqueFd file = OpenFile(path, O_WRONLY | O_APPEND | flags);
    struct stat status = {};
    if (file.ok() && (fstat(file.get(), &status) != 0 || !S_ISREG(status.st_mode))) {
        errno = EINVAL;
        return -1;
    }
    return file.release();
}

ssize_t ReadFile(const std::string& path, char* buffer, size_t size) {
    const UniqueFd file = OpenFile(path, O_RDONLY);
    return file.ok() ? read(file.get(), buffer, size) : -1;
}

ssize_t ReadFileAt(int directory, const std::string& name, char* buffer, size_t size) {
    const UniqueFd file = OpenFileAt(directory, name.c_str(), O_RDONLY);
    return file.ok() ? read(file.get(), buffer, size) : -1;
}

bool WriteFile(const std::string& path, std::string_view content) {
    return WriteAll(OpenFile(path, O_WRONLY | O_CREAT | O_TRUNC), content);
}

bool ReplaceFile(const std::string& path, std::string_view content) {
    const Place place(path, IfMissing::kMake);
    return place.directory() >= 0 && ReplaceFileAt(place.directory(), place.name(), content);
}

bool ReplaceFileAt(int directory, const std::string& name, std::string_view content,
                   unsigned flags) {
    static std::atomic<unsigned> serial{0};
    const std::string temporary = std::to_string(getpid()) + "." + std::to_string(serial++);
    const int from = TemporaryDirectory();
    if (from < 0) {
        return false;
    }
    constexpr int kNewFile = O_WRONLY | O_CREAT | O_TRUNC;
    if (WriteAll(OpenFileAt(from, temporary.c_str(), kNewFile), content) &&
        renameat2(from, temporary.c_str(), directory, name.c_str(), flags) == 0) {
        return true;
    }
    const int error = errno;
    unlinkat(from, temporary.c_str(), 0);
    errno = error;
    return false;
}

bool RemoveFile(const std::string& path) {
    const Place place(path, IfMissing::kFail);
    return place.directory() >= 0 && unlinkat(place.directory(), place.name(), 0) == 0;
}

}  // namespace host
