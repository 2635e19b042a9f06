// A binder driver in the device root: a published service is a socket in the driver's directory, a
// proxy is a connection to one.
#pragma once

#include <sys/un.h>

#include <cstddef>
#include <cstdint>
#include <string>

#include <binder/Binder.h>
#include <binder/Parcel.h>

#include "platform/unique_fd.h"

namespace host {

// The size of the driver's receive buffer: 1 MiB less two pages. A request or a reply must fit into
// it, a one-way request into half of it.
constexpr size_t kMaxTransactionBytes = (1 << 20) - 2 * 4096;
constexpr size_t kMaxOneWayBytes = kMaxTransactionBytes / 2;

// Returns a proxy of the service, or null when the service is not published or too busy to accept
// another client. `driver` is the driver's path on the device, `name` a file name of at most 64
// bytes.
android::sp<android::IBinder> ConnectService(const std::string& driver, const std::string& name);

// Returns a proxy over a connected socket.
android::sp<android::IBinder> NewProxy(UniqueFd connection);

// Publishes a binder of this process, replaces an earlier one of that name, and serves its clients
// on other threads. Returns 0 or a negative status.
android::status_t PublishService(const std::string& driver, const std::string& name,
                                 const android::sp<android::IBinder>& binder);

// A request of a proxy: this header and `size` parcel bytes. All numbers are in the machine's byte
// order.
struct RequestHeader {
    uint32_t code;
    uint32_t flags;
    uint32_t size;
};

// A service's reply to a two-way request: this header and `size` parcel bytes.
struct ReplyHeader {
    int32_t status;
    uint32_t size;
};

// Sends all these bytes. False when the peer is gone.
bool Send(const UniqueFd& connection, const std::string& bytes);

// Receives exactly `size` bytes. False when the peer hangs up first.
bool Receive(const UniqueFd& connection, void* buffer, size_t size);

// Sends a header, completed with the parcel's size, and the parcel. False when the peer is gone.
template <typename Header>
bool SendMessage(const UniqueFd& connection, Header header, const android::Parcel& parcel) {
    header.size = static_cast<uint32_t>(parcel.dataSize());
    std::string message(reinterpret_cast<const char*>(&header), sizeof(header));
    message.append(reinterpret_cast<const char*>(parcel.data()), parcel.dataSize());
    return Send(connection, message);
}

// Receives a header and its parcel. False when the peer hangs up first or the parcel does not fit
// into the driver's buffer; then the connection is unusable.
template <typename Header>
bool ReceiveMessage(const UniqueFd& connection, Header* header, android::Parcel* parcel) {
    return Receive(connection, header, sizeof(Header)) && header->size <= kMaxTransactionBytes &&
           Receive(connection, parcel->resize(header->size), header->size);
}

// A new, unconnected socket.
UniqueFd NewSocket();

// The address of the file `name` in the directory `fd`; without a name, of the file `fd` itself.
// The length of the device root's path does not matter.
sockaddr_un Address(const UniqueFd& fd, const std::string& name = "");

}  // namespace host
