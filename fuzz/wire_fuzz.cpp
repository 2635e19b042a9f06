// Both ends of a connection against a hostile peer, which says the input and hangs up, and the
// reading of its parcels in the order that the call's code spells.
#include <binder/Parcel.h>
#include <sys/socket.h>

#include <algorithm>

#include "fuzz.h"
#include "platform/vndbinder.h"

namespace {

constexpr size_t kMaxInput = 65536;  // well within a socket's buffer, so that nobody blocks

class Echo : public android::BBinder {
  protected:
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

// Our end of a connection whose other end has said these bytes and will say no more.
int Connection(const uint8_t* data, size_t size, int& peer) {
    int ends[2];
    Check(socketpair(AF_UNIX, SOCK_STREAM, 0, ends) == 0);
    Check(send(ends[1], data, size, 0) == static_cast<ssize_t>(size));
    shutdown(ends[1], SHUT_WR);
    peer = ends[1];
    return ends[0];
}

}  // namespace

int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    size = std::min(size, kMaxInput);
    int peer = -1;
    host::ServeClient(Connection(data, size, peer), new Echo);
    close(peer);

    const android::sp<android::IBinder> proxy = host::NewProxy(Connection(data, size, peer));
    android::Parcel request;
    request.writeCString("x");
    android::status_t status = android::OK;
    for (size_t calls = 0; status != android::DEAD_OBJECT && calls <= size; ++calls) {
        android::Parcel reply;
        status = proxy->transact(0, request, &reply, 0);
        Check(reply.dataSize() <= size);
    }
    close(peer);
    return 0;
}
