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

// Returns a proxy for the service, or null if the service is not published or too busy to accept
// another client. `path` is DRIVER/NAME, at most 80 bytes.
android::sp<android::IBinder> ConnectService(const std::string& path);

// Returns a proxy over a connected socket.
android::sp<android::IBinder> NewProxy(UniqueFd connection);

// Publishes a binder of this process, replacing any earlier one of that path, and serves its
// clients on other threads. Returns 0 or a negative status.
android::status_t PublishService(const std::string& path,
                                 const android::sp<android::IBinder>& binder);

// Calls `action` on this thread when the reply to the call that it executes has been sent.
void AfterReply(void (*action)());

// Precedes the parcel of a request or reply. Numbers are in the machine's byte order.
struct Header {
    int32_t code;    // a request's code or a reply's status
    uint32_t flags;  // of a request
    uint32_t size;   // of the parcel in bytes
};

// Sends the header with the parcel's size, then the parcel. Returns false if the peer is gone.
bool SendMessage(const UniqueFd& connection, Header header, const android::Parcel& parcel);

// Receives a header and its parcel. If the peer hangs up first or the parcel exceeds the driver's
// buffer, the connection becomes unusable and the function returns false.
bool ReceiveMessage(const UniqueFd& connection, Header* header, android::Parcel* parcel);

// Returns the address of a socket in the device root.
sockaddr_un AddressOf(const std::string& path);

}  // namespace host
