// A binder driver in the device root: every published service is a socket in the driver's folder,
// every proxy a connection to one.
//
// A request is its code, flags and size, a reply its status and size, each followed by that many
// parcel bytes; a one-way request has no reply. All numbers have 32 bits in the machine's order.
#pragma once

#include <string>

#include <binder/Binder.h>

namespace host {

// The driver's receive buffer: 1 MiB less two pages. Neither a request nor a reply is larger.
constexpr size_t kMaxTransactionBytes = (1 << 20) - 2 * 4096;

// A proxy of the service, or null when nobody serves it. `driver` is its path on the device.
android::sp<android::IBinder> ConnectService(const std::string& driver, const std::string& name);

// A proxy over a connected socket, which it owns.
android::sp<android::IBinder> NewProxy(int connection);

// Publishes a binder of this process. Calls wait until ServeServices().
android::status_t PublishService(const std::string& driver, const std::string& name,
                                 const android::sp<android::IBinder>& service);

// Accepts clients for ever and serves each on a thread of its own.
[[noreturn]] void ServeServices();

// Serves one client until it goes or says something that is not a request. Owns the socket.
void ServeClient(int connection, const android::sp<android::IBinder>& service);

}  // namespace host
