// Client and service of a connection, with a peer that sends the input, never reads and hangs up.
// The service reads the values of a request in an order that the call's code chooses.
#include <binder/Parcel.h>
#include <sys/socket.h>
#include <sys/time.h>
#include <unistd.h>

#include <algorithm>

#include "fuzz.h"
#include "platform/vndbinder.h"

namespace {

constexpr size_t kMaxInputBytes = 65536;  // well within a socket's buffer: the peer never blocks

class EchoService : public android::BBinder {
    android::status_t onTransact(uint32_t code, const android::Parcel& data, android::Parcel* reply,
                                 uint32_t /* flags */) override {
        const char* text = nullptr;
        for (; code != 0; code >>= 2) {
            if (code % 4 == 1) {
                data.enforceInterface(android::String16("x"));
            } else if (code % 4 == 2) {
                data.setDataPosition(static_cast<size_t>(data.readInt32()));
            } else if (code % 4 == 3) {
                text = data.readCString();
            }
            Check(data.dataPosition() <= data.dataSize());
        }
        return reply->writeCString(text);
    }
};

// Connects to such a peer. Returns our end of the connection; the peer's is in `peer`.
int Connect(const uint8_t* data, size_t size, int& peer) {
    int ends[2];
    Check(socketpair(AF_UNIX, SOCK_STREAM, 0, ends) == 0);
    peer = ends[1];
    Check(send(peer, data, size, 0) == static_cast<ssize_t>(size));
    shutdown(peer, SHUT_WR);
    // A few hundred messages fill the peer's buffer, which it never reads. Then it counts as gone.
    const timeval shortest = {0, 1};
    Check(setsockopt(ends[0], SOL_SOCKET, SO_SNDTIMEO, &shortest, sizeof(shortest)) == 0);
    return ends[0];
}

}  // namespace

int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    size = std::min(size, kMaxInputBytes);
    int peer = -1;
    host::ServeClient(Connect(data, size, peer), new EchoService);
    close(peer);

    const android::sp<android::IBinder> proxy = host::NewProxy(Connect(data, size, peer));
    android::Parcel request;
    request.writeCString("x");
    android::status_t status = android::OK;
    while (status != android::DEAD_OBJECT) {
        android::Parcel reply;
        status = proxy->transact(0, request, &reply, 0);
        Check(reply.dataSize() <= size);
    }
    close(peer);
    return 0;
}
