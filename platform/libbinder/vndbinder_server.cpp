#include <fcntl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <condition_variable>
#include <deque>
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

void Replied() {
    if (gAfterReply != nullptr) {
        gAfterReply();
    }
}

struct Request {
    RequestHeader header = {};
    Parcel data;
};

// A published binder.
class Service {
  public:
    explicit Service(const sp<IBinder>& binder) : mBinder(binder) {}

    status_t Execute(const Request& request, Parcel* reply) {
        return mBinder->transact(request.header.code, request.data, reply, request.header.flags);
    }

    // Queues a copy of a one-way call. The queue is unbounded.
    void Enqueue(const Request& request) {
        const std::lock_guard<std::mutex> lock(mMutex);
        Request& call = mCalls.emplace_back();
        const size_t size = request.data.dataSize();
        call.header = request.header;
        std::copy_n(request.data.data(), size, call.data.resize(size));
        mHasCalls.notify_one();
    }

    // Executes the one-way calls of all clients one at a time, in order of arrival. Two-way calls
    // do not wait for them. Never returns.
    [[noreturn]] void Drain() {
        std::unique_lock<std::mutex> lock(mMutex);
        for (;;) {
            mHasCalls.wait(lock, [this] { return !mCalls.empty(); });
            const std::deque<Request> calls = std::exchange(mCalls, {});
            lock.unlock();
            for (const Request& call : calls) {
                Parcel reply;
                Execute(call, &reply);
                Replied();
            }
            lock.lock();
        }
    }

  private:
    const sp<IBinder> mBinder;
    std::mutex mMutex;
    std::condition_variable mHasCalls;
    std::deque<Request> mCalls;
};

// Replaces the socket of an earlier service, but no other kind of file.
bool Listen(const UniqueFd& listener, const UniqueFd& directory, const std::string& name) {
    struct stat old = {};
    if (fstatat(directory.get(), name.c_str(), &old, AT_SYMLINK_NOFOLLOW) == 0 &&
        S_ISSOCK(old.st_mode)) {
        unlinkat(directory.get(), name.c_str(), 0);
    }
    const sockaddr_un address = Address(directory, name);
    return bind(listener.get(), reinterpret_cast<const sockaddr*>(&address), sizeof(address)) ==
                   0 &&
           listen(listener.get(), SOMAXCONN) == 0;
}

// Serves one client until it hangs up or sends an invalid request.
void ServeClient(const UniqueFd& connection, Service* service) {
    for (;;) {
        Request request;
        if (!ReceiveMessage(connection, &request.header, &request.data)) {
            return;
        }
        if ((request.header.flags & IBinder::FLAG_ONEWAY) != 0) {
            service->Enqueue(request);
            continue;
        }
        Parcel reply;
        status_t status = service->Execute(request, &reply);
        if (status == android::OK && reply.dataSize() > kMaxTransactionBytes) {
            status = android::FAILED_TRANSACTION;
        }
        if (status != android::OK) {
            reply.resize(0);
        }
        const bool isSent = SendMessage(connection, ReplyHeader{status, 0}, reply);
        Replied();
        if (!isSent) {
            return;
        }
    }
}

// Serves every client on its own thread. Never returns.
[[noreturn]] void AcceptClients(const UniqueFd& listener, Service* service) {
    for (;;) {
        UniqueFd connection(accept4(listener.get(), nullptr, nullptr, SOCK_CLOEXEC));
        if (!connection.ok()) {
            // Probably out of descriptors: wait for clients to disconnect.
            std::this_thread::sleep_for(kRetryPause);
            continue;
        }
        std::thread([connection = std::move(connection), service] {
            ServeClient(connection, service);
        }).detach();
    }
}

}  // namespace

void AfterReply(void (*action)()) { gAfterReply = action; }

status_t PublishService(const std::string& driver, const std::string& name,
                        const sp<IBinder>& binder) {
    const UniqueFd directory = OpenDirectory(driver, IfMissing::kMake);
    if (!directory.ok()) {
        return -errno;
    }
    UniqueFd listener = NewSocket();
    if (const int high = fcntl(listener.get(), F_DUPFD_CLOEXEC, kListenerDescriptor); high >= 0) {
        listener.reset(high);
    }
    if (!Listen(listener, directory, name)) {
        return -errno;
    }
    auto* const service = new Service(binder);  // its threads use it until the process exits
    std::thread([service] { service->Drain(); }).detach();
    std::thread([listener = std::move(listener), service] {
        AcceptClients(listener, service);
    }).detach();
    return android::OK;
}

}  // namespace host
