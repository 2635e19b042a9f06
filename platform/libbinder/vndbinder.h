// A binder driver in the device root: every published service is a socket in the driver's folder,
// every proxy a connection to one.
#pragma once

#include <string>

#include <binder/Binder.h>

namespace host {

// The driver's receive buffer: 1 MiB less two pages. Neither a request nor a reply is larger, and a
// one-way request gets half of it.
constexpr size_t kMaxTransactionBytes = (1 << 20) - 2 * 4096;
constexpr size_t kMaxOneWayBytes = kMaxTransactionBytes / 2;

// A proxy of the service; null when there is none, or when it has too many clients to accept now.
// `driver` is the driver's path on the device.
android::sp<android::IBinder> ConnectService(const std::string& driver, const std::string& name);

// A proxy over a connected socket, which it owns.
android::sp<android::IBinder> NewProxy(int connection);

// Publishes a binder of this process and serves each client on a thread of its own from now on.
// Returns 0 or a negative status.
android::status_t PublishService(const std::string& driver, const std::string& name,
                                 const android::sp<android::IBinder>& binder);

// Serves one client until it hangs up or sends something that is not a request. Closes the socket.
void ServeClient(int connection, const android::sp<android::IBinder>& service);

}  // namespace host
