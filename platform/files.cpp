#include "platform/files.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <cstdio>
#include <filesystem>

#include "platform/device_root.h"

namespace host {

namespace {

bool WriteAll(UniqueFd file, std::string_view content) {
    return file.ok() &&
           write(file.get(), content.data(), content.size()) ==
                   static_cast<ssize_t>(content.size()) &&
           close(file.release()) == 0;
}

}  // namespace

UniqueFd OpenFile(const std::string& path, int flags) {
    constexpr int kAnyFile = O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC;
    return UniqueFd(openat(DeviceRoot(), path.c_str(), flags | kAnyFile, 0600));
}

void MakeParents(const std::string& path) {
    for (size_t end = path.find('/'); end != std::string::npos; end = path.find('/', end + 1)) {
        mkdirat(DeviceRoot(), path.substr(0, end).c_str(), 0700);
    }
}

std::optional<std::string> ReadFile(const std::string& path) {
    const UniqueFd file = OpenFile(path, O_RDONLY);
    struct stat status = {};
    if (!file.ok() || fstat(file.get(), &status) != 0 || !S_ISREG(status.st_mode)) {
        return std::nullopt;
    }
    std::string text(static_cast<size_t>(status.st_size), '\0');
    const ssize_t length = read(file.get(), text.data(), text.size());
    text.resize(length > 0 ? static_cast<size_t>(length) : 0);
    return text;
}

bool ReplaceFile(const std::string& path, std::string_view content, unsigned flags) {
    static std::atomic<unsigned> serial{0};
    const std::string temporary = std::string(kTemporaryDirectory) + "/" +
                                  std::to_string(getpid()) + "." + std::to_string(serial++);
    MakeParents(temporary);
    MakeParents(path);
    if (WriteAll(OpenFile(temporary, O_WRONLY | O_CREAT | O_TRUNC), content) &&
        renameat2(DeviceRoot(), temporary.c_str(), DeviceRoot(), path.c_str(), flags) == 0) {
        return true;
    }
    const int error = errno;
    RemoveFile(temporary);
    errno = error;
    return false;
}

bool RemoveFile(const std::string& path) { return unlinkat(DeviceRoot(), path.c_str(), 0) == 0; }

std::set<std::string> FilesIn(const std::string& path) {
    std::set<std::string> names;
    std::error_code error;
    std::filesystem::directory_iterator file(AbsolutePath(path), error);
    for (; file != std::filesystem::directory_iterator(); file.increment(error)) {
        names.insert(file->path().filename());
    }
    return names;
}

std::string AbsolutePath(const std::string& path) {
    return "/proc/self/fd/" + std::to_string(DeviceRoot()) + "/" + path;
}

}  // namespace host
