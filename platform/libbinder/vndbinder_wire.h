// The messages between a client and a service, over a socket in the driver's folder.
#pragma once

#include <sys/un.h>

#include <cstddef>
#include <cstdint>
#include <string>

#include <binder/Parcel.h>

namespace host {

// A request: this header and `size` parcel bytes. All numbers are in the machine's byte order.
struct RequestHeader {
    uint32_t code;
    uint32_t flags;
    uint32_t size;
};

// The reply to a two-way request: this header and `size` parcel bytes.
struct ReplyHeader {
    int32_t status;
    uint32_t size;
};

// Sends header and parcel whole. False when the peer is gone.
bool SendMessage(int connection, const void* header, size_t headerSize,
                 const android::Parcel& parcel);

// Receives exactly `size` bytes. False when the peer hangs up before.
bool Receive(int connection, void* buffer, size_t size);

// A new socket, which the caller closes; `address` becomes that of the service's socket in the
// driver's folder. -1, with the reason in errno, when there is no device root, when the name is no
// file name or too long, or when no socket can be made.
int NewSocket(const std::string& driver, const std::string& name, sockaddr_un& address);

}  // namespace host
