// Client and service of a connection, with a peer that sends the input, never reads and hangs up.
#include <binder/Parcel.h>
#include <sys/socket.h>
#include <sys/time.h>
#include <unistd.h>

#include "fuzz.h"
#include "platform/libbinder/vndbinder.h"

namespace {

// The request says where to read.
class EchoService : public android::BBinder {
    android::status_t onTransact(uint32_t /* code */, const android::Parcel& data,
                                 android::Parcel* reply, uint32_t /* flags */) override {
        data.setDataPosition(static_cast<size_t>(data.readInt32()));
        data.enforceInterface(android::String16("x"));
        const char* const text = data.readCString();
        Check(data.dataPosition() <= data.dataSize());
        return reply->writeCString(text);
    }
};

// Connects to such a peer. Returns our end of the connection; the peer's is in `peer`. The socket's
// buffer takes every input that scripts/fuzz makes.
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
    int peer = -1;
    host::ServeClient(Connect(data, size, peer), new EchoService);
    close(peer);

    const android::sp<android::IBinder> proxy = host::NewProxy(Connect(data, size, peer));
    android::Parcel request;
    android::Parcel reply;
    while (proxy->transact(0, request, &reply, 0) != android::DEAD_OBJECT) {
        Check(reply.dataSize() <= size);
    }
    close(peer);
    return 0;
}
