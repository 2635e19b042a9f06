// Owns a file descriptor.
#pragma once

#include <unistd.h>

#include <cerrno>
#include <utility>

namespace host {

// Closes its descriptor when destroyed. Preserves errno.
class UniqueFd {
  public:
    UniqueFd() = default;
    explicit UniqueFd(int fd) : mFd(fd) {}
    UniqueFd(UniqueFd&& other) noexcept : mFd(other.release()) {}
    UniqueFd& operator=(UniqueFd&& other) noexcept {
        reset(other.release());
        return *this;
    }
    ~UniqueFd() { reset(); }

    int get() const { return mFd; }  // -1 when empty
    bool ok() const { return mFd >= 0; }

    // Transfers the descriptor to the caller, who must close it.
    [[nodiscard]] int release() { return std::exchange(mFd, -1); }

    void reset(int fd = -1) {
        const int old = std::exchange(mFd, fd);
        if (old >= 0) {
            const int error = errno;
            close(old);
            errno = error;
        }
    }

  private:
    int mFd = -1;
};

}  // namespace host
