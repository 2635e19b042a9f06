// Feeds the input to a published service and to a proxy; the peer then hangs up.
#include <binder/Binder.h>
#include <binder/Parcel.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <filesystem>

#include "fuzz.h"
#include "platform/libbinder/vndbinder.h"

namespace {

using namespace android;

// Reads at a position given by the request.
class EchoService : public BBinder {
    status_t onTransact(uint32_t, const Parcel& data, Parcel* reply, uint32_t) override {
        data.setDataPosition(static_cast<size_t>(data.readInt32()));
        data.enforceInterface(String16("x"));
        const char* const text = data.readCString();
        Check(data.dataPosition() <= data.dataSize());
        return reply->writeCString(text);
    }
};

struct Recipient : IBinder::DeathRecipient {
    void binderDied(const wp<IBinder>& /* who */) override { ++deaths; }
    int deaths = 0;
};

// The device root of this process.
const struct TemporaryRoot {
    TemporaryRoot() { setenv("TPD_DEVICE_ROOT", mkdtemp(path), 1); }
    ~TemporaryRoot() { std::filesystem::remove_all(path); }
    char path[32] = "/tmp/tpd-fuzz-XXXXXX";
} kRoot;

// The inputs of scripts/fuzz fit into a socket's buffer.
void SendAndHangUp(int socket, const uint8_t* data, size_t size) {
    Check(send(socket, data, size, MSG_NOSIGNAL) == static_cast<ssize_t>(size));
    shutdown(socket, SHUT_WR);
}

void CallService(const uint8_t* data, size_t size) {
    static const status_t published = host::PublishService("/driver", "echo", new EchoService);
    sockaddr_un address = {AF_UNIX, {}};
    snprintf(address.sun_path, sizeof(address.sun_path), "%s/driver/echo", kRoot.path);
    const int peer = socket(AF_UNIX, SOCK_STREAM, 0);
    Check(published == OK &&
          connect(peer, reinterpret_cast<sockaddr*>(&address), sizeof(address)) == 0);
    SendAndHangUp(peer, data, size);
    char replies[4096];
    while (recv(peer, replies, sizeof(replies), 0) > 0) {
    }
    close(peer);

    // The service must still accept clients. It rejects an empty request, which contains no text.
    const sp<IBinder> proxy = host::ConnectService("/driver", "echo");
    Check(proxy != nullptr && proxy->transact(0, Parcel(), nullptr) == BAD_VALUE);
}

void AnswerProxy(const uint8_t* data, size_t size) {
    int ends[2];
    Check(socketpair(AF_UNIX, SOCK_STREAM, 0, ends) == 0);
    SendAndHangUp(ends[1], data, size);
    const sp<IBinder> proxy = host::NewProxy(host::UniqueFd(ends[0]));
    const sp<Recipient> recipient = new Recipient;
    Check(proxy->linkToDeath(recipient) == OK);
    // The peer never reads, so the calls must be few enough to fit into its buffer.
    for (int i = 0; i < 100 && recipient->deaths == 0; ++i) {
        Parcel reply;
        proxy->transact(0, Parcel(), &reply);
        Check(reply.dataSize() <= size);
    }
    Check(recipient->deaths <= 1);
    close(ends[1]);
}

}  // namespace

int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    CallService(data, size);
    AnswerProxy(data, size);
    return 0;
}
