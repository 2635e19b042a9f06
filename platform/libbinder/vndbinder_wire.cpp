#include "platform/libbinder/vndbinder_wire.h"

#include <sys/socket.h>
#include <sys/uio.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>

#include "platform/device_root.h"

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

int NewSocket(const std::string& driver, const std::string& name, sockaddr_un& address) {
    address = {};
    address.sun_family = AF_UNIX;
    // Through the root's descriptor, so that no length of the root's path matters.
    const int length = snprintf(address.sun_path, sizeof(address.sun_path), "/proc/self/fd/%d%s/%s",
                                DeviceRoot(), driver.c_str(), name.c_str());
    if (DeviceRoot() < 0 || name.empty() || name.front() == '.' ||
        name.find('/') != std::string::npos ||
        static_cast<size_t>(length) >= sizeof(address.sun_path)) {
        errno = EINVAL;
        return -1;
    }
    return socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
}

}  // namespace host
