#include "platform/libbinder/vndbinder.h"

#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <string_view>

namespace host {

bool Send(const UniqueFd& connection, const std::string& bytes) {
    std::string_view left = bytes;
    while (!left.empty()) {
        const ssize_t sent =
                TEMP_FAILURE_RETRY(send(connection.get(), left.data(), left.size(), MSG_NOSIGNAL));
        if (sent < 0) {
            return false;
        }
        left.remove_prefix(static_cast<size_t>(sent));
    }
    return true;
}

bool Receive(const UniqueFd& connection, void* buffer, size_t size) {
    auto* next = static_cast<char*>(buffer);
    while (size > 0) {
        const ssize_t received =
                TEMP_FAILURE_RETRY(recv(connection.get(), next, size, MSG_WAITALL));
        if (received <= 0) {
            return false;
        }
        next += received;
        size -= static_cast<size_t>(received);
    }
    return true;
}

UniqueFd NewSocket() { return UniqueFd(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)); }

sockaddr_un Address(const UniqueFd& fd, const std::string& name) {
    sockaddr_un address = {};
    address.sun_family = AF_UNIX;
    snprintf(address.sun_path, sizeof(address.sun_path), "/proc/self/fd/%d%s%s", fd.get(),
             name.empty() ? "" : "/", name.c_str());
    return address;
}

}  // namespace host
