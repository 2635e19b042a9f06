#include <binder/IServiceManager.h>
#include <binder/ProcessState.h>

#include <chrono>
#include <cstdlib>
#include <thread>

#include "platform/device_root.h"
#include "platform/events.h"
#include "platform/libbinder/vndbinder.h"

namespace android {

namespace {

using Clock = std::chrono::steady_clock;
using Milliseconds = std::chrono::duration<double, std::milli>;

constexpr double kGetServiceLimitMs = 5000;
constexpr Milliseconds kGetServicePause(100);

sp<IServiceManager> gServiceManager;

Milliseconds GetServiceLimit() {
    const char* const ms = getenv("TPD_GET_SERVICE_MS");
    const bool isSet = ms != nullptr && *ms != '\0';
    return Milliseconds(isSet ? strtod(ms, nullptr) : kGetServiceLimitMs);
}

// Service names are ASCII.
std::string ServiceName(const String16& name) {
    return {name.string(), name.string() + name.size()};
}

std::string SocketPath(const String16& name) {
    return ProcessState::self()->getDriverName() + "/" + ServiceName(name);
}

// Finds services as sockets in the driver's directory.
class DriverServiceManager : public IServiceManager {
  public:
    sp<IBinder> getService(const String16& name) const override {
        host::Event event("lookup");
        const std::string path = SocketPath(name);
        const auto start = Clock::now();
        sp<IBinder> binder = host::ConnectService(path);
        while (binder == nullptr && Clock::now() - start < GetServiceLimit()) {
            std::this_thread::sleep_for(kGetServicePause);
            binder = host::ConnectService(path);
        }
        event.Add("service", ServiceName(name))
                .Add("found", binder != nullptr ? 1 : 0)
                .Add("us", (Clock::now() - start) / std::chrono::microseconds(1));
        return binder;
    }

    status_t addService(const String16& name, const sp<IBinder>& service) override {
        return host::PublishService(SocketPath(name), service);
    }
};

}  // namespace

sp<IServiceManager> defaultServiceManager() {
    if (gServiceManager == nullptr && host::DeviceRoot() >= 0) {
        gServiceManager = new DriverServiceManager;
    }
    return gServiceManager;
}

void setDefaultServiceManager(const sp<IServiceManager>& manager) { gServiceManager = manager; }

}  // namespace android
