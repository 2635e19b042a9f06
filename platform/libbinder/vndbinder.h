// A binder driver in the device root: a published service is a socket in the driver's directory,
// and a proxy is a connection to a service.
#pragma once

#include <sys/un.h>

#include <cstddef>
#include <cstdint>
#include <string>

#include <binder/IBinder.h>
#include <binder/Parcel.h>

#include "platform/unique_fd.h"

namespace host {

// The size of the driver's receive buffer: 1 MiB minus two pages. A request or reply must fit into
// it, a one-way request into half of it.
constexpr size_t kMaxTransactionBytes = (1 << 20) - 2 * 4096;
constexpr size_t kMaxOneWayBytes = kMaxTransactionBytes / 2;

// Returns a proxy for the service, or null if the service is not published or too busy to accept
// another client. `driver` is the driver's path on the device, `name` a file name of at most 64
// bytes.
android::sp<android::IBinder> ConnectService(const std::string& driver, const std::string& name);

// Returns a proxy over a connected socket.
android::sp<android::IBinder> NewProxy(UniqueFd connection);

// Publishes a binder of this process, replacing any earlier one of that name, and serves its
// clients on other threads. Returns 0 or a negative status.
android::status_t PublishService(const std::string& driver, const std::string& name,
                                 const android::sp<android::IBinder>& binder);

// Calls `action` on this thread when the reply to the call that it executes has been sent.
void AfterReply(void (*action)());

// A request: this header, then a parcel of `size` bytes. Numbers are in the machine's byte order.
struct RequestHeader {
    uint32_t code;
    uint32_t flags;
    uint32_t size;
};

// A service's reply to a two-way request: this header, then a parcel of `size` bytes.
struct ReplyHeader {
    int32_t status;
    uint32_t size;
};

// Sends all bytes. Returns false if the peer is gone.
bool Send(const UniqueFd& connection, const std::string& bytes);

// Receives exactly `size` bytes. Returns false if the peer hangs up first.
bool Receive(const UniqueFd& connection, void* buffer, size_t size);

// Sets the header's size and sends the header and the parcel. Returns false if the peer is gone.
template <typename Header>
bool SendMessage(const UniqueFd& connection, Header header, const android::Parcel& parcel) {
    header.size = static_cast<uint32_t>(parcel.dataSize());
    std::string message(reinterpret_cast<const char*>(&header), sizeof(header));
    message.append(reinterpret_cast<const char*>(parcel.data()), parcel.dataSize());
    return Send(connection, message);
}

// Receives a header and its parcel. If the peer hangs up first or the parcel exceeds the driver's
// buffer, the connection becomes unusable and the function returns false.
template <typename Header>
bool ReceiveMessage(const UniqueFd& connection, Header* header, android::Parcel* parcel) {
    return Receive(connection, header, sizeof(Header)) && header->size <= kMaxTransactionBytes &&
           Receive(connection, parcel->resize(header->size), header->size);
}

// Returns a new, unconnected socket.
UniqueFd NewSocket();

// Returns the address of the socket `name` in the directory `fd` or, without a name, of the socket
// `fd`. The path of the device root may be longer than a socket address can hold.
sockaddr_un Address(const UniqueFd& fd, const std::string& name = "");

}  // namespace host
