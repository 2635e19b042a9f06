#include "vndbinder.h"

#include <fcntl.h>
#include <poll.h>
#include <pthread.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/uio.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <memory>
#include <mutex>
#include <vector>

#include <binder/Parcel.h>

#include "device_root.h"

using android::IBinder;
using android::Parcel;
using android::sp;
using android::status_t;
using android::wp;

namespace host {

namespace {

// The client's library tells the service that it accepts file descriptors in the reply.
constexpr uint32_t kAcceptFds = 0x10;
constexpr int kBacklog = 128;
constexpr useconds_t kNoDescriptorPauseUs = 10000;
constexpr int kMaxNameBytes = 80;
// The kernel takes a dying process's descriptors away from the highest down. With the listener
// above the connections, whoever sees a call die finds nobody listening, as with a real driver.
constexpr int kListenerDescriptor = 900;

struct RequestHead {
    uint32_t code;
    uint32_t flags;
    uint32_t size;
};

struct ReplyHead {
    int32_t status;
    uint32_t size;
};

// Sends head and body whole. False when the peer is gone.
bool SendMessage(int connection, const void* head, size_t headSize, const Parcel& body) {
    iovec parts[] = {{const_cast<void*>(head), headSize},
                     {const_cast<uint8_t*>(body.data()), body.dataSize()}};
    msghdr message = {};
    message.msg_iov = parts;
    message.msg_iovlen = 2;
    size_t left = headSize + body.dataSize();
    while (left > 0) {
        const ssize_t sent = sendmsg(connection, &message, MSG_NOSIGNAL);
        if (sent < 0) {
            if (errno == EINTR) {
                continue;
            }
            return false;
        }
        left -= static_cast<size_t>(sent);
        auto done = static_cast<size_t>(sent);
        for (iovec& part : parts) {
            const size_t step = std::min(done, part.iov_len);
            part.iov_base = static_cast<char*>(part.iov_base) + step;
            part.iov_len -= step;
            done -= step;
        }
    }
    return true;
}

// Receives exactly `size` bytes. False when the peer is gone before.
bool Receive(int connection, void* buffer, size_t size) {
    auto* next = static_cast<char*>(buffer);
    while (size > 0) {
        const ssize_t received = recv(connection, next, size, MSG_WAITALL);
        if (received < 0 && errno == EINTR) {
            continue;
        }
        if (received <= 0) {
            return false;
        }
        next += received;
        size -= static_cast<size_t>(received);
    }
    return true;
}

// Neither a service nor a client of another user is talked to.
bool IsOwnPeer(int connection) {
    ucred peer = {};
    socklen_t size = sizeof(peer);
    return getsockopt(connection, SOL_SOCKET, SO_PEERCRED, &peer, &size) == 0 &&
           peer.uid == geteuid();
}

// The service's socket below the driver's folder, reached through the root's descriptor so that no
// length of the root's path matters. False for a name that is no file name.
bool SocketAddress(const std::string& driver, const std::string& name, sockaddr_un& address) {
    if (name.empty() || name.front() == '.' || name.find('/') != std::string::npos ||
        name.length() > kMaxNameBytes) {
        return false;
    }
    address = {};
    address.sun_family = AF_UNIX;
    const int length = snprintf(address.sun_path, sizeof(address.sun_path), "/proc/self/fd/%d%s/%s",
                                DeviceRoot(), driver.c_str(), name.c_str());
    return length > 0 && static_cast<size_t>(length) < sizeof(address.sun_path);
}

int NewSocket() { return socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0); }

// The client's end of one service. For one thread at a time, like the process that uses it.
class RemoteBinder : public IBinder {
  public:
    explicit RemoteBinder(int connection) : mConnection(connection) {}
    ~RemoteBinder() override { Close(); }

    status_t transact(uint32_t code, const Parcel& data, Parcel* reply, uint32_t flags) override {
        if (data.dataSize() > kMaxTransactionBytes) {
            return mConnection < 0 ? android::DEAD_OBJECT : android::FAILED_TRANSACTION;
        }
        const RequestHead head = {code, flags | kAcceptFds, static_cast<uint32_t>(data.dataSize())};
        if (mConnection < 0 || !SendMessage(mConnection, &head, sizeof(head), data)) {
            return OwnerDied();
        }
        return (flags & FLAG_ONEWAY) != 0 ? android::OK : ReceiveReply(reply);
    }

    status_t linkToDeath(const sp<DeathRecipient>& recipient, void* cookie,
                         uint32_t flags) override {
        if (mConnection < 0) {
            return android::DEAD_OBJECT;
        }
        mLinks.push_back({recipient, cookie, flags});
        return android::OK;
    }

    status_t unlinkToDeath(const wp<DeathRecipient>& recipient, void* cookie, uint32_t flags,
                           wp<DeathRecipient>* outRecipient) override {
        if (mConnection < 0) {
            return android::DEAD_OBJECT;
        }
        const auto link = std::find_if(mLinks.begin(), mLinks.end(), [&](const Link& each) {
            return each.recipient == recipient && each.cookie == cookie && each.flags == flags;
        });
        if (link == mLinks.end()) {
            return android::NAME_NOT_FOUND;
        }
        if (outRecipient != nullptr) {
            *outRecipient = link->recipient;
        }
        mLinks.erase(link);
        return android::OK;
    }

  private:
    struct Link {
        wp<DeathRecipient> recipient;
        void* cookie;
        uint32_t flags;
    };

    status_t ReceiveReply(Parcel* reply) {
        ReplyHead head = {};
        if (!Receive(mConnection, &head, sizeof(head))) {
            return OwnerDied();
        }
        if (head.size > kMaxTransactionBytes) {
            // What follows cannot be told from the next reply: the connection is of no more use.
            OwnerDied();
            return android::FAILED_TRANSACTION;
        }
        Parcel discarded;
        Parcel& body = reply != nullptr ? *reply : discarded;
        uint8_t* const room = body.resizeForOverwrite(head.size);
        if (room == nullptr || !Receive(mConnection, room, head.size)) {
            body.resizeForOverwrite(0);
            return OwnerDied();
        }
        return head.status;
    }

    void Close() {
        if (mConnection >= 0) {
            close(mConnection);
            mConnection = -1;
        }
    }

    // Tells the recipients, once, on this thread.
    status_t OwnerDied() {
        Close();
        const sp<IBinder> keep(this);
        const std::vector<Link> links = std::move(mLinks);
        mLinks.clear();
        for (const Link& link : links) {
            const sp<DeathRecipient> recipient = link.recipient.promote();
            if (recipient != nullptr) {
                recipient->binderDied(wp<IBinder>(this));
            }
        }
        return android::DEAD_OBJECT;
    }

    int mConnection;  // -1 once the owner is known to be dead
    std::vector<Link> mLinks;
};

struct Listener {
    int socket;
    sp<IBinder> service;
};

std::mutex gListenersMutex;
std::vector<Listener> gListeners;

void MakeDriverFolder(const std::string& driver) {
    for (size_t end = driver.find('/', 1); end != std::string::npos;
         end = driver.find('/', end + 1)) {
        mkdirat(DeviceRoot(), driver.substr(1, end - 1).c_str(), 0700);
    }
    mkdirat(DeviceRoot(), driver.substr(1).c_str(), 0700);
}

struct Client {
    int connection;
    sp<IBinder> service;
};

void* RunClient(void* argument) {
    const std::unique_ptr<Client> client(static_cast<Client*>(argument));
    ServeClient(client->connection, client->service);
    return nullptr;
}

// A client that no thread can be had for is hung up on.
void StartClient(int connection, const sp<IBinder>& service) {
    auto* const client = new Client{connection, service};
    pthread_t thread;
    if (pthread_create(&thread, nullptr, RunClient, client) != 0) {
        close(connection);
        delete client;
        return;
    }
    pthread_detach(thread);
}

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

sp<IBinder> ConnectService(const std::string& driver, const std::string& name) {
    sockaddr_un address;
    if (DeviceRoot() < 0 || !SocketAddress(driver, name, address)) {
        return nullptr;
    }
    const int connection = NewSocket();
    if (connection < 0) {
        return nullptr;
    }
    if (connect(connection, reinterpret_cast<const sockaddr*>(&address), sizeof(address)) != 0) {
        close(connection);
        return nullptr;
    }
    if (!IsOwnPeer(connection)) {
        fprintf(stderr, "%s: served by another user\n", name.c_str());
        close(connection);
        return nullptr;
    }
    return NewProxy(connection);
}

sp<IBinder> NewProxy(int connection) { return new RemoteBinder(connection); }

status_t PublishService(const std::string& driver, const std::string& name,
                        const sp<IBinder>& service) {
    sockaddr_un address;
    if (service == nullptr || DeviceRoot() < 0 || !SocketAddress(driver, name, address)) {
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
    MakeDriverFolder(driver);
    if (!ListenAt(socket, address)) {
        const status_t status = errno != 0 ? -errno : android::UNKNOWN_ERROR;
        close(socket);
        return status;
    }
    const std::lock_guard<std::mutex> lock(gListenersMutex);
    gListeners.push_back({socket, service});
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
            } else if (!IsOwnPeer(connection)) {
                close(connection);
            } else {
                StartClient(connection, listeners[i].service);
            }
        }
    }
}

void ServeClient(int connection, const sp<IBinder>& service) {
    RequestHead head = {};
    while (Receive(connection, &head, sizeof(head)) && head.size <= kMaxTransactionBytes) {
        Parcel request;
        Parcel reply;
        uint8_t* const room = request.resizeForOverwrite(head.size);
        if (room == nullptr || !Receive(connection, room, head.size)) {
            break;
        }
        status_t status = service->transact(head.code, request, &reply, head.flags);
        if ((head.flags & IBinder::FLAG_ONEWAY) != 0) {
            continue;
        }
        if (status == android::OK && reply.dataSize() > kMaxTransactionBytes) {
            status = android::FAILED_TRANSACTION;
        }
        if (status != android::OK) {
            reply.resizeForOverwrite(0);
        }
        const ReplyHead answer = {status, static_cast<uint32_t>(reply.dataSize())};
        if (!SendMessage(connection, &answer, sizeof(answer), reply)) {
            break;
        }
    }
    close(connection);
}

}  // namespace host
