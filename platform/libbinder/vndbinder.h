// A binder driver in the device root: a published service is a socket in the driver's directory, a
// proxy is a connection to one.
#pragma once

#include <string>

#include <binder/Binder.h>

#include "platform/unique_fd.h"

namespace host {

// The size of the driver's receive buffer: 1 MiB less two pages. A request or a reply must fit into
// it, a one-way request into half of it.
constexpr size_t kMaxTransactionBytes = (1 << 20) - 2 * 4096;
constexpr size_t kMaxOneWayBytes = kMaxTransactionBytes / 2;

// Returns a proxy of the service, or null when the service is not published or too busy to accept
// another client. `driver` is the driver's path on the device, `name` a file name of at most 64
// bytes.
android::sp<android::IBinder> ConnectService(const std::string& driver, const std::string& name);

// Returns a proxy over a connected socket.
android::sp<android::IBinder> NewProxy(UniqueFd connection);

// Publishes a binder of this process, replaces an earlier one of that name, and serves its clients
// on other threads. Returns 0 or a negative status.
android::status_t PublishService(const std::string& driver, const std::string& name,
                                 const android::sp<android::IBinder>& binder);

}  // namespace host
