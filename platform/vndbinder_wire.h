// What client and service say to each other over a socket in the driver's folder.
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

// Whether the peer is of this user: nobody talks to another one's service or client.
bool IsOwnPeer(int connection);

// A new socket, or -1.
int NewSocket();

// The service's socket below the driver's folder, reached through the root's descriptor so that no
// length of the root's path matters. False when there is no root or the name is no file name.
bool SocketAddress(const std::string& driver, const std::string& name, sockaddr_un& address);

}  // namespace host
