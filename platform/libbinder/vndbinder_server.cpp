#include <fcntl.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <deque>
#include <mutex>
#include <thread>

#include <binder/Parcel.h>

#include "platform/device_root.h"
#include "platform/files.h"
#include "platform/libbinder/vndbinder.h"
#include "platform/libbinder/vndbinder_wire.h"
#include "platform/trace.h"

using android::IBinder;
using android::Parcel;
using android::sp;
using android::status_t;

namespace host {

namespace {

constexpr int kBacklog = 128;
constexpr std::chrono::milliseconds kNoDescriptorPause(10);
// The kernel closes a dying process's descriptors from the highest down. With the listener above
// the connections, a client whose call fails finds no listener any more, as with a real driver.
constexpr int kListenerDescriptor = 900;

// Carries out the one-way calls of all clients of a service one after another, in the order in
// which they were read. Two-way calls do not wait for them. The queue has no limit.
class OneWayQueue : public android::BBinder {
  public:
    explicit OneWayQueue(const sp<IBinder>& service) : mService(service) {}

  protected:
    status_t onTransact(uint32_t code, const Parcel& data, Parcel* reply, uint32_t flags) override {
        if ((flags & FLAG_ONEWAY) == 0) {
            return mService->transact(code, data, reply, flags);
        }
        if (Append(code, data, flags)) {
            std::thread([keep = sp<OneWayQueue>(this)] { keep->CarryOut(); }).detach();
        }
        return android::OK;
    }

  private:
    struct Call {
        uint32_t code = 0;
        uint32_t flags = 0;
        Parcel data;
    };

    // Returns whether the queue was empty: then no thread is carrying it out.
    bool Append(uint32_t code, const Parcel& data, uint32_t flags) {
        const std::lock_guard<std::mutex> lock(mMutex);
        Call& call = mCalls.emplace_back();
        call.code = code;
        call.flags = flags;
        call.data.setData(data.data(), data.dataSize());
        return mCalls.size() == 1;
    }

    void CarryOut() {
        std::unique_lock<std::mutex> lock(mMutex);
        while (!mCalls.empty()) {
            Call& call = mCalls.front();
            lock.unlock();
            Parcel reply;
            mService->transact(call.code, call.data, &reply, call.flags);
            lock.lock();
            mCalls.pop_front();
        }
    }

    const sp<IBinder> mService;
    std::mutex mMutex;
    std::deque<Call> mCalls;  // the first is the one being carried out
};

// Replaces a socket that an earlier service of that name left behind.
bool ListenAt(int socket, const sockaddr_un& address) {
    unlink(address.sun_path);
    return bind(socket, reinterpret_cast<const sockaddr*>(&address), sizeof(address)) == 0 &&
           listen(socket, kBacklog) == 0;
}

// Serves each client on a thread of its own. Never returns.
void AcceptClients(int listener, const sp<IBinder>& service) {
    for (;;) {
        const int connection = accept4(listener, nullptr, nullptr, SOCK_CLOEXEC);
        if (connection < 0) {
            // Out of descriptors, for example: clients get time to close some.
            std::this_thread::sleep_for(kNoDescriptorPause);
        } else {
            std::thread(ServeClient, connection, service).detach();
        }
    }
}

}  // namespace

status_t PublishService(const std::string& driver, const std::string& name,
                        const sp<IBinder>& binder) {
    if (binder == nullptr) {
        return android::BAD_VALUE;
    }
    sockaddr_un address;
    int listener = NewSocket(driver, name, address);
    if (listener < 0) {
        return -errno;
    }
    const int high = fcntl(listener, F_DUPFD_CLOEXEC, kListenerDescriptor);
    if (high >= 0) {
        close(listener);
        listener = high;
    }
    OpenDirectory(driver.substr(1), IfMissing::kMake);
    if (!ListenAt(listener, address)) {
        const status_t status = -errno;
        close(listener);
        return status;
    }
    std::thread(AcceptClients, listener, sp<IBinder>(new OneWayQueue(binder))).detach();
    return android::OK;
}

void ServeClient(int connection, const sp<IBinder>& service) {
    RequestHeader header = {};
    while (Receive(connection, &header, sizeof(header)) && header.size <= kMaxTransactionBytes) {
        Parcel request;
        Parcel reply;
        if (!Receive(connection, request.resize(header.size), header.size)) {
            break;
        }
        LookForTrace();
        status_t status = service->transact(header.code, request, &reply, header.flags);
        if ((header.flags & IBinder::FLAG_ONEWAY) != 0) {
            continue;
        }
        if (status == android::OK && reply.dataSize() > kMaxTransactionBytes) {
            status = android::FAILED_TRANSACTION;
        }
        if (status != android::OK) {
            reply.resize(0);
        }
        const ReplyHeader answer = {status, static_cast<uint32_t>(reply.dataSize())};
        if (!SendMessage(connection, &answer, sizeof(answer), reply)) {
            break;
        }
    }
    close(connection);
}

}  // namespace host
