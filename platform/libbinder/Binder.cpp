#include <binder/IServiceManager.h>
#include <binder/ProcessState.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <thread>

#include "platform/device_root.h"
#include "platform/events.h"
#include "platform/libbinder/vndbinder.h"

namespace android {

namespace {

constexpr int64_t kGetServiceLimitMs = 5000;
constexpr int64_t kMaxGetServiceLimitMs = 86'400'000;  // a day
constexpr int64_t kGetServicePauseUs = 100000;

sp<ProcessState> gProcess;
sp<IServiceManager> gServiceManager;

int64_t GetServiceLimitUs() {
    const char* const ms = getenv("TPD_GET_SERVICE_MS");
    const int64_t limitMs = ms != nullptr ? strtoll(ms, nullptr, 10) : kGetServiceLimitMs;
    return std::clamp<int64_t>(limitMs, 0, kMaxGetServiceLimitMs) * 1000;
}

// Service names are ASCII.
std::string ServiceName(const String16& name) {
    return {name.string(), name.string() + name.size()};
}

// Finds services as sockets in the driver's directory.
class DriverServiceManager : public IServiceManager {
  public:
    sp<IBinder> getService(const String16& name) const override {
        host::Event event("lookup");
        const std::string driver = ProcessState::self()->getDriverName();
        const std::string service = ServiceName(name);
        const int64_t start = host::MonotonicUs();
        const int64_t lastTry = start + GetServiceLimitUs() - kGetServicePauseUs;
        sp<IBinder> binder = host::ConnectService(driver, service);
        while (binder == nullptr && host::MonotonicUs() <= lastTry) {
            std::this_thread::sleep_for(std::chrono::microseconds(kGetServicePauseUs));
            binder = host::ConnectService(driver, service);
        }
        event.Add("service", service)
                .Add("found", binder != nullptr ? 1 : 0)
                .Add("us", host::MonotonicUs() - start);
        return binder;
    }

    status_t addService(const String16& name, const sp<IBinder>& service) override {
        return host::PublishService(ProcessState::self()->getDriverName(), ServiceName(name),
                                    service);
    }
};

}  // namespace

sp<IInterface> IBinder::queryLocalInterface(const String16& /* descriptor */) { return nullptr; }

sp<ProcessState> ProcessState::self() {
    return gProcess != nullptr ? gProcess : initWithDriver("/dev/binder");
}

sp<ProcessState> ProcessState::initWithDriver(const char* driver) {
    if (gProcess == nullptr) {
        gProcess = new ProcessState(driver);
    } else if (gProcess->mDriver != driver) {
        fprintf(stderr, "binder: the driver is already %s; cannot use %s\n",
                gProcess->mDriver.c_str(), driver);
        abort();
    }
    return gProcess;
}

sp<IServiceManager> defaultServiceManager() {
    if (gServiceManager == nullptr && host::DeviceRoot() >= 0) {
        gServiceManager = new DriverServiceManager;
    }
    return gServiceManager;
}

void setDefaultServiceManager(const sp<IServiceManager>& manager) { gServiceManager = manager; }

}  // namespace android
