#include "platform/libbinder/vndbinder_wire.h"

#include <sys/socket.h>
#include <sys/uio.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>

namespace host {

bool SendMessage(int connection, const void* header, size_t headerSize,
                 const android::Parcel& parcel) {
    iovec parts[] = {{const_cast<void*>(header), headerSize},
                     {const_cast<uint8_t*>(parcel.data()), parcel.dataSize()}};
    msghdr message = {};
    message.msg_iov = parts;
    message.msg_iovlen = 2;
    while (parts[0].iov_len + parts[1].iov_len > 0) {
        const ssize_t sent = sendmsg(connection, &message, MSG_NOSIGNAL);
        if (sent < 0 && errno == EINTR) {
            continue;
        }
        if (sent < 0) {
            return false;
        }
        auto done = static_cast<size_t>(sent);
        for (iovec& part : parts) {
            const size_t bytes = std::min(done, part.iov_len);
            part.iov_base = static_cast<char*>(part.iov_base) + bytes;
            part.iov_len -= bytes;
            done -= bytes;
        }
    }
    return true;
}

bool Receive(int connection, void* buffer, size_t size) {
    auto* next = static_cast<char*>(buffer);
    while (size > 0) {
        const ssize_t received = recv(connection, next, size, MSG_WAITALL);
        if (received < 0 && errno == EINTR) {
            continue;
        }
        if (received <= 0) {
            return false;
        }
        next += received;
        size -= static_cast<size_t>(received);
    }
    return true;
}

UniqueFd NewSocket() { return UniqueFd(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)); }

bool IsServiceName(const std::string& name) {
    constexpr size_t kMaxLength = 64;
    return !name.empty() && name.length() <= kMaxLength && name.front() != '.' &&
           name.find('/') == std::string::npos;
}

sockaddr_un Address(const UniqueFd& fd, const std::string& name) {
    sockaddr_un address = {};
    address.sun_family = AF_UNIX;
    snprintf(address.sun_path, sizeof(address.sun_path), "/proc/self/fd/%d%s%s", fd.get(),
             name.empty() ? "" : "/", name.c_str());
    return address;
}

}  // namespace host
