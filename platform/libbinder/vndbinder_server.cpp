#include <fcntl.h>
#include <pthread.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <condition_variable>
#include <deque>
#include <memory>
#include <mutex>
#include <thread>
#include <utility>

#include <binder/Parcel.h>

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
constexpr std::chrono::milliseconds kRetryPause(10);
// The kernel closes the descriptors of a dying process from the highest down. The listener is above
// the connections, so a client whose call fails cannot find it again, as with a real driver.
constexpr int kListenerDescriptor = 900;

// Runs `work` on a detached thread. Retries until the system can make one; std::thread would abort
// the process instead.
template <typename Work>
void StartThread(Work work) {
    const auto run = [](void* argument) -> void* {
        const std::unique_ptr<Work> owned(static_cast<Work*>(argument));
        (*owned)();
        return nullptr;
    };
    auto* const argument = new Work(std::move(work));
    pthread_t thread;
    while (pthread_create(&thread, nullptr, run, argument) != 0) {
        std::this_thread::sleep_for(kRetryPause);
    }
    pthread_detach(thread);
}

// Executes the one-way calls of all clients of a service in sequence, in the order of their
// arrival. Two-way calls do not wait for them. The queue is unbounded.
class OneWayQueue : public android::BBinder {
  public:
    explicit OneWayQueue(const sp<IBinder>& service) : mService(service) {}

    // Executes the queued calls as they come. Never returns.
    [[noreturn]] void Drain() {
        std::unique_lock<std::mutex> lock(mMutex);
        for (;;) {
            mHasCalls.wait(lock, [this] { return !mCalls.empty(); });
            const std::deque<Call> calls = std::exchange(mCalls, {});
            lock.unlock();
            for (const Call& call : calls) {
                Parcel reply;
                mService->transact(call.code, call.data, &reply, call.flags);
            }
            lock.lock();
        }
    }

  protected:
    status_t onTransact(uint32_t code, const Parcel& data, Parcel* reply, uint32_t flags) override {
        if ((flags & FLAG_ONEWAY) == 0) {
            return mService->transact(code, data, reply, flags);
        }
        const std::lock_guard<std::mutex> lock(mMutex);
        Call& call = mCalls.emplace_back();
        call.code = code;
        call.flags = flags;
        call.data.setData(data.data(), data.dataSize());
        mHasCalls.notify_one();
        return android::OK;
    }

  private:
    struct Call {
        uint32_t code = 0;
        uint32_t flags = 0;
        Parcel data;
    };

    const sp<IBinder> mService;
    std::mutex mMutex;
    std::condition_variable mHasCalls;
    std::deque<Call> mCalls;
};

// Replaces the socket of an earlier service of that name, but no other kind of file.
bool Listen(const UniqueFd& listener, const UniqueFd& directory, const std::string& name) {
    struct stat old = {};
    if (fstatat(directory.get(), name.c_str(), &old, AT_SYMLINK_NOFOLLOW) == 0 &&
        S_ISSOCK(old.st_mode)) {
        unlinkat(directory.get(), name.c_str(), 0);
    }
    const sockaddr_un address = Address(directory, name);
    return bind(listener.get(), reinterpret_cast<const sockaddr*>(&address), sizeof(address)) ==
                   0 &&
           listen(listener.get(), kBacklog) == 0;
}

// Serves one client until it hangs up or sends something that is not a request.
void ServeClient(const UniqueFd& connection, const sp<IBinder>& service) {
    RequestHeader header = {};
    while (Receive(connection.get(), &header, sizeof(header)) &&
           header.size <= kMaxTransactionBytes) {
        Parcel request;
        Parcel reply;
        if (!Receive(connection.get(), request.resize(header.size), header.size)) {
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
        if (!SendMessage(connection.get(), &answer, sizeof(answer), reply)) {
            break;
        }
    }
}

// Serves every client on its own thread. Never returns.
[[noreturn]] void AcceptClients(const UniqueFd& listener, const sp<IBinder>& service) {
    for (;;) {
        UniqueFd connection(accept4(listener.get(), nullptr, nullptr, SOCK_CLOEXEC));
        if (!connection.ok()) {
            // Probably out of descriptors: wait for clients to disconnect.
            std::this_thread::sleep_for(kRetryPause);
            continue;
        }
        StartThread([connection = std::move(connection), service] {
            ServeClient(connection, service);
        });
    }
}

}  // namespace

status_t PublishService(const std::string& driver, const std::string& name,
                        const sp<IBinder>& binder) {
    if (binder == nullptr || !IsServiceName(name)) {
        return android::BAD_VALUE;
    }
    const UniqueFd directory = OpenDirectory(driver.substr(1), IfMissing::kMake);
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
    const sp<OneWayQueue> queue = new OneWayQueue(binder);
    StartThread([queue] { queue->Drain(); });
    StartThread([listener = std::move(listener), queue] { AcceptClients(listener, queue); });
    return android::OK;
}

}  // namespace host
