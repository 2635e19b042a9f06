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

// Receives exactly `size` bytes. False when the peer is gone before.
bool Receive(int connection, void* buffer, size_t size);

// A new socket, which the caller closes, and the address of the service's socket below the driver's
// folder. -1 when there is no root, the name is no file name or too long, or there is no socket;
// the reason is in errno.
int NewSocket(const std::string& driver, const std::string& name, sockaddr_un& address);

}  // namespace host
