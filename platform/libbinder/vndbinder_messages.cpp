#include "platform/libbinder/vndbinder.h"

#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <memory>

#include "platform/files.h"

namespace host {

namespace {

// Receives exactly `size` bytes. Returns false if the peer hangs up first.
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

}  // namespace

bool SendMessage(const UniqueFd& connection, Header header, const android::Parcel& parcel) {
    header.size = static_cast<uint32_t>(parcel.dataSize());
    std::string message(reinterpret_cast<const char*>(&header), sizeof(header));
    message.append(reinterpret_cast<const char*>(parcel.data()), parcel.dataSize());
    for (size_t sent = 0; sent < message.size();) {
        const ssize_t more = TEMP_FAILURE_RETRY(
                send(connection.get(), message.data() + sent, message.size() - sent, MSG_NOSIGNAL));
        if (more < 0) {
            return false;
        }
        sent += static_cast<size_t>(more);
    }
    return true;
}

bool ReceiveMessage(const UniqueFd& connection, Header* header, android::Parcel* parcel) {
    if (!Receive(connection, header, sizeof(*header)) || header->size > kMaxTransactionBytes) {
        return false;
    }
    const std::unique_ptr<uint8_t[]> data(new uint8_t[header->size]);
    return Receive(connection, data.get(), header->size) &&
           parcel->setData(data.get(), header->size) == android::OK;
}

sockaddr_un AddressOf(const std::string& path) {
    sockaddr_un address = {};
    address.sun_family = AF_UNIX;
    AbsolutePath(path).copy(address.sun_path, sizeof(address.sun_path) - 1);
    return address;
}

}  // namespace host
