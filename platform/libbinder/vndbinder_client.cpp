#include <binder/IInterface.h>
#include <fcntl.h>
#include <sys/socket.h>

#include <algorithm>
#include <chrono>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/events.h"
#include "platform/libbinder/vndbinder.h"

using android::IBinder;
using android::Parcel;
using android::sp;
using android::status_t;
using android::wp;

namespace host {

namespace {

using Clock = std::chrono::steady_clock;

// The platform's library adds this flag to every call: the client accepts file descriptors in the
// reply.
constexpr uint32_t kAcceptFds = 0x10;

// A client's proxy for a service. Not thread-safe.
class RemoteBinder : public IBinder {
  public:
    explicit RemoteBinder(UniqueFd connection) : mConnection(std::move(connection)) {}

    status_t transact(uint32_t code, const Parcel& data, Parcel* reply, uint32_t flags) override {
        flags |= kAcceptFds;
        Event("call")
                .Add("code", code)
                .Add("flags", flags)
                .Add("request", {reinterpret_cast<const char*>(data.data()), data.dataSize()});
        const auto start = Clock::now();
        Parcel discarded;
        Parcel& received = reply != nullptr ? *reply : discarded;
        const status_t status = Deliver(code, data, received, flags);
        Event("reply")
                .Add("status", status)
                .Add("bytes", static_cast<int64_t>(received.dataSize()))
                .Add("us", (Clock::now() - start) / std::chrono::microseconds(1));
        return status;
    }

    status_t linkToDeath(const sp<DeathRecipient>& recipient, void* /* cookie */,
                         uint32_t /* flags */) override {
        const status_t status = mConnection.ok() ? android::OK : android::DEAD_OBJECT;
        if (status == android::OK) {
            mRecipients.emplace_back(recipient);
        }
        Event("link_to_death").Add("status", status);
        return status;
    }

    status_t unlinkToDeath(const wp<DeathRecipient>& recipient, void* /* cookie */,
                           uint32_t /* flags */, wp<DeathRecipient>* /* outRecipient */) override {
        // If the owner is dead, there are no recipients.
        status_t status = mConnection.ok() ? android::NAME_NOT_FOUND : android::DEAD_OBJECT;
        const auto found = std::find(mRecipients.begin(), mRecipients.end(), recipient);
        if (found != mRecipients.end()) {
            mRecipients.erase(found);
            status = android::OK;
        }
        Event("unlink_to_death").Add("status", status);
        return status;
    }

  private:
    status_t Deliver(uint32_t code, const Parcel& data, Parcel& reply, uint32_t flags) {
        if (!mConnection.ok()) {
            return android::DEAD_OBJECT;
        }
        const bool oneWay = (flags & FLAG_ONEWAY) != 0;
        if (data.dataSize() > kMaxTransactionBytes / (oneWay ? 2 : 1)) {
            return android::FAILED_TRANSACTION;
        }
        Header header = {static_cast<int32_t>(code), flags, 0};
        if (!SendMessage(mConnection, header, data) ||
            (!oneWay && !ReceiveMessage(mConnection, &header, &reply))) {
            return OwnerDied();
        }
        // A positive status counts as success, as on a device.
        return oneWay ? android::OK : std::min<status_t>(header.code, android::OK);
    }

    // Notifies each recipient once, on this thread.
    status_t OwnerDied() {
        const Event event("binder_died");
        mConnection.reset();
        const sp<IBinder> keep(this);  // a recipient may drop the last other reference
        for (const wp<DeathRecipient>& linked : std::exchange(mRecipients, {})) {
            const sp<DeathRecipient> recipient = linked.promote();
            if (recipient != nullptr) {
                recipient->binderDied(wp<IBinder>(this));
            }
        }
        return android::DEAD_OBJECT;
    }

    UniqueFd mConnection;  // closed once the owner is known to be dead
    std::vector<wp<DeathRecipient>> mRecipients;
};

}  // namespace

sp<IBinder> ConnectService(const std::string& path) {
    // Do not wait for a busy service; a later lookup may reach it.
    UniqueFd connection(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
    const sockaddr_un address = AddressOf(path);
    if (connect(connection.get(), reinterpret_cast<const sockaddr*>(&address), sizeof(address)) !=
        0) {
        return nullptr;
    }
    fcntl(connection.get(), F_SETFL, 0);
    return NewProxy(std::move(connection));
}

sp<IBinder> NewProxy(UniqueFd connection) { return new RemoteBinder(std::move(connection)); }

}  // namespace host

// Here, because the header of the platform's own sp<> needs the whole type.
android::sp<android::IInterface> IBinder::queryLocalInterface(
        const android::String16& /* descriptor */) {
    return nullptr;
}
