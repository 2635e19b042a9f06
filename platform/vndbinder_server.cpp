#include <fcntl.h>
#include <poll.h>
#include <pthread.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <deque>
#include <functional>
#include <memory>
#include <mutex>
#include <vector>

#include <binder/Parcel.h>

#include "device_root.h"
#include "files.h"
#include "trace.h"
#include "vndbinder.h"
#include "vndbinder_wire.h"

using android::IBinder;
using android::Parcel;
using android::sp;
using android::status_t;

namespace host {

namespace {

constexpr int kBacklog = 128;
constexpr useconds_t kNoDescriptorPauseUs = 10000;
// The kernel takes a dying process's descriptors away from the highest down. With the listener
// above the connections, whoever sees a call die finds nobody listening, as with a real driver.
constexpr int kListenerDescriptor = 900;

// Does the work on a thread of its own. False when none can be had.
bool StartThread(std::function<void()> work) {
    auto* const task = new std::function<void()>(std::move(work));
    const auto run = [](void* argument) -> void* {
        const std::unique_ptr<std::function<void()>> owned(
                static_cast<std::function<void()>*>(argument));
        (*owned)();
        return nullptr;
    };
    pthread_t thread;
    if (pthread_create(&thread, nullptr, run, task) != 0) {
        delete task;
        return false;
    }
    pthread_detach(thread);
    return true;
}

// Carries out the one-way calls of all clients of a service one after another, in the order in
// which they were read, while two-way calls pass them. Any number may wait.
class OneWayQueue : public android::BBinder {
  public:
    explicit OneWayQueue(const sp<IBinder>& service) : mService(service) {}

  protected:
    status_t onTransact(uint32_t code, const Parcel& data, Parcel* reply, uint32_t flags) override {
        if ((flags & FLAG_ONEWAY) == 0) {
            return mService->transact(code, data, reply, flags);
        }
        if (!Append(code, data, flags)) {
            return android::OK;
        }
        const sp<OneWayQueue> keep(this);
        if (!StartThread([keep] { keep->CarryOut(); })) {
            CarryOut();
        }
        return android::OK;
    }

  private:
    struct Call {
        uint32_t code = 0;
        uint32_t flags = 0;
        Parcel data;
    };

    // Whether the queue was empty, which nobody carries out then.
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

struct Listener {
    int socket;
    sp<IBinder> service;
};

std::mutex gListenersMutex;
std::vector<Listener> gListeners;

// Binds beside the name and moves the socket there, so that a dead service's socket is replaced and
// nobody finds one that does not listen yet.
bool ListenAt(int socket, const sockaddr_un& address) {
    sockaddr_un fresh = address;
    const size_t length = strlen(fresh.sun_path);
    if (length + 1 >= sizeof(fresh.sun_path)) {
        return false;
    }
    fresh.sun_path[length] = '~';
    unlink(fresh.sun_path);
    if (bind(socket, reinterpret_cast<const sockaddr*>(&fresh), sizeof(fresh)) != 0) {
        return false;
    }
    if (listen(socket, kBacklog) == 0 && rename(fresh.sun_path, address.sun_path) == 0) {
        return true;
    }
    unlink(fresh.sun_path);
    return false;
}

}  // namespace

status_t PublishService(const std::string& driver, const std::string& name,
                        const sp<IBinder>& service) {
    sockaddr_un address;
    if (service == nullptr || !SocketAddress(driver, name, address)) {
        return android::BAD_VALUE;
    }
    int socket = NewSocket();
    if (socket < 0) {
        return -errno;
    }
    const int high = fcntl(socket, F_DUPFD_CLOEXEC, kListenerDescriptor);
    if (high >= 0) {
        close(socket);
        socket = high;
    }
    MakeFolders(DeviceRoot(), driver.substr(1));
    if (!ListenAt(socket, address)) {
        const status_t status = errno != 0 ? -errno : android::UNKNOWN_ERROR;
        close(socket);
        return status;
    }
    const std::lock_guard<std::mutex> lock(gListenersMutex);
    gListeners.push_back({socket, new OneWayQueue(service)});
    return android::OK;
}

void ServeServices() {
    std::vector<Listener> listeners;
    {
        const std::lock_guard<std::mutex> lock(gListenersMutex);
        listeners = gListeners;
    }
    std::vector<pollfd> waits;
    waits.reserve(listeners.size());
    for (const Listener& listener : listeners) {
        waits.push_back({listener.socket, POLLIN, 0});
    }
    for (;;) {
        poll(waits.data(), waits.size(), -1);
        for (size_t i = 0; i < waits.size(); ++i) {
            if (waits[i].revents == 0) {
                continue;
            }
            const int connection = accept4(waits[i].fd, nullptr, nullptr, SOCK_CLOEXEC);
            if (connection < 0) {
                // Out of descriptors, say: leave the others time to give some back.
                usleep(kNoDescriptorPauseUs);
                continue;
            }
            const sp<IBinder> service = listeners[i].service;
            if (!IsOwnPeer(connection) ||
                !StartThread([connection, service] { ServeClient(connection, service); })) {
                close(connection);
            }
        }
    }
}

void ServeClient(int connection, const sp<IBinder>& service) {
    RequestHeader header = {};
    while (Receive(connection, &header, sizeof(header)) && header.size <= kMaxTransactionBytes) {
        Parcel request;
        Parcel reply;
        uint8_t* const buffer = request.resizeForOverwrite(header.size);
        if (buffer == nullptr || !Receive(connection, buffer, header.size)) {
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
            reply.resizeForOverwrite(0);
        }
        const ReplyHeader answer = {status, static_cast<uint32_t>(reply.dataSize())};
        if (!SendMessage(connection, &answer, sizeof(answer), reply)) {
            break;
        }
    }
    close(connection);
}

}  // namespace host
