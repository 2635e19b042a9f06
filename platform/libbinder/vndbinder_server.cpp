#include <fcntl.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <mutex>
#include <thread>
#include <utility>

#include "platform/files.h"
#include "platform/libbinder/vndbinder.h"

using android::IBinder;
using android::Parcel;
using android::sp;
using android::status_t;

namespace host {

namespace {

constexpr std::chrono::milliseconds kRetryPause(10);
// The kernel closes a dying process's descriptors from the highest down. The listener must be
// closed before the connections: a client whose call fails must not connect to the dying process
// again.
constexpr int kListenerDescriptor = 900;

thread_local void (*gAfterReply)() = nullptr;

// Executes one call. One-way calls of all clients are executed one at a time.
status_t Execute(const sp<IBinder>& binder, const Header& request, const Parcel& data,
                 Parcel* reply) {
    static std::mutex oneWayCalls;
    std::unique_lock<std::mutex> lock(oneWayCalls, std::defer_lock);
    if ((request.flags & IBinder::FLAG_ONEWAY) != 0) {
        lock.lock();
    }
    const status_t status =
            binder->transact(static_cast<uint32_t>(request.code), data, reply, request.flags);
    const bool isTooLarge = reply->dataSize() > kMaxTransactionBytes;
    return status == android::OK && isTooLarge ? android::FAILED_TRANSACTION : status;
}

// Serves one client until it hangs up or sends an invalid request.
void ServeClient(const UniqueFd& connection, const sp<IBinder>& binder) {
    Header request = {};
    Parcel data;
    while (ReceiveMessage(connection, &request, &data)) {
        Parcel reply;
        const status_t status = Execute(binder, request, data, &reply);
        if (status != android::OK) {
            reply.freeData();
        }
        if ((request.flags & IBinder::FLAG_ONEWAY) == 0) {
            SendMessage(connection, {status, 0, 0}, reply);
        }
        if (gAfterReply != nullptr) {
            gAfterReply();
        }
    }
}

// Serves every client on its own thread. Never returns.
[[noreturn]] void AcceptClients(const UniqueFd& listener, const sp<IBinder>& binder) {
    for (;;) {
        UniqueFd connection(accept4(listener.get(), nullptr, nullptr, SOCK_CLOEXEC));
        if (connection.ok()) {
            std::thread(ServeClient, std::move(connection), binder).detach();
        } else {
            // Probably out of descriptors: wait for clients to disconnect.
            std::this_thread::sleep_for(kRetryPause);
        }
    }
}

}  // namespace

void AfterReply(void (*action)()) { gAfterReply = action; }

status_t PublishService(const std::string& path, const sp<IBinder>& binder) {
    UniqueFd listener(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
    if (const int high = fcntl(listener.get(), F_DUPFD_CLOEXEC, kListenerDescriptor); high >= 0) {
        listener.reset(high);
    }
    MakeParents(path);
    RemoveFile(path);
    const sockaddr_un address = AddressOf(path);
    if (bind(listener.get(), reinterpret_cast<const sockaddr*>(&address), sizeof(address)) != 0 ||
        listen(listener.get(), SOMAXCONN) != 0) {
        return -errno;
    }
    std::thread(AcceptClients, std::move(listener), binder).detach();
    return android::OK;
}

}  // namespace host
