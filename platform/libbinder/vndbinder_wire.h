// Messages between a client and a service, over a socket in the driver's directory.
#pragma once

#include <sys/un.h>

#include <cstddef>
#include <cstdint>
#include <string>

#include <binder/Parcel.h>

#include "platform/unique_fd.h"

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

// Sends the whole header and parcel. False when the peer is gone.
bool SendMessage(int connection, const void* header, size_t headerSize,
                 const android::Parcel& parcel);

// Receives exactly `size` bytes. False when the peer hangs up first.
bool Receive(int connection, void* buffer, size_t size);

// A new, unconnected socket.
UniqueFd NewSocket();

// Whether this is a valid service name: a file name that fits into a socket address.
bool IsServiceName(const std::string& name);

// The address of the file `name` in the directory `fd`; without a name, of the file `fd` itself.
// The length of the device root's path does not matter.
sockaddr_un Address(const UniqueFd& fd, const std::string& name = "");

}  // namespace host
