#include <binder/Binder.h>

#include <binder/IInterface.h>
#include <binder/IPCThreadState.h>
#include <binder/IServiceManager.h>
#include <binder/Parcel.h>
#include <binder/ProcessState.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <thread>

#include "platform/device_root.h"
#include "platform/libbinder/vndbinder.h"
#include "platform/trace.h"

namespace android {

namespace {

constexpr char kDefaultDriver[] = "/dev/binder";
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

// The services are the sockets in the driver's directory.
class DriverServiceManager : public IServiceManager {
  public:
    sp<IBinder> getService(const String16& name) const override {
        return LookUp(ServiceName(name), GetServiceLimitUs());
    }

    sp<IBinder> checkService(const String16& name) const override {
        return LookUp(ServiceName(name), 0);
    }

    status_t addService(const String16& name, const sp<IBinder>& service, bool /* allowIsolated */,
                        int /* dumpsysFlags */) override {
        return host::PublishService(ProcessState::self()->getDriverName(), ServiceName(name),
                                    service);
    }

  protected:
    IBinder* onAsBinder() override { return nullptr; }

  private:
    static sp<IBinder> LookUp(const std::string& name, int64_t limitUs) {
        host::TraceEvent event("lookup");
        const std::string driver = ProcessState::self()->getDriverName();
        const int64_t start = host::MonotonicUs();
        sp<IBinder> binder = host::ConnectService(driver, name);
        while (binder == nullptr && host::MonotonicUs() + kGetServicePauseUs <= start + limitUs) {
            std::this_thread::sleep_for(std::chrono::microseconds(kGetServicePauseUs));
            binder = host::ConnectService(driver, name);
        }
        event.Add("service", name)
                .Add("found", binder != nullptr ? 1 : 0)
                .Add("us", host::MonotonicUs() - start);
        return binder;
    }
};

}  // namespace

sp<IInterface> IBinder::queryLocalInterface(const String16& /* descriptor */) { return nullptr; }

status_t BBinder::transact(uint32_t code, const Parcel& data, Parcel* reply, uint32_t flags) {
    data.setDataPosition(0);
    const status_t status = onTransact(code, data, reply, flags);
    if (reply != nullptr) {
        reply->setDataPosition(0);
    }
    return status;
}

status_t BBinder::linkToDeath(const sp<DeathRecipient>& /* recipient */, void* /* cookie */,
                              uint32_t /* flags */) {
    return INVALID_OPERATION;
}

status_t BBinder::unlinkToDeath(const wp<DeathRecipient>& /* recipient */, void* /* cookie */,
                                uint32_t /* flags */, wp<DeathRecipient>* /* outRecipient */) {
    return INVALID_OPERATION;
}

status_t BBinder::onTransact(uint32_t /* code */, const Parcel& /* data */, Parcel* /* reply */,
                             uint32_t /* flags */) {
    return UNKNOWN_TRANSACTION;
}

ProcessState::ProcessState(std::string driver) : mDriver(std::move(driver)) {}

sp<ProcessState> ProcessState::self() {
    return gProcess != nullptr ? gProcess : initWithDriver(kDefaultDriver);
}

sp<ProcessState> ProcessState::initWithDriver(const char* driver) {
    if (gProcess == nullptr) {
        gProcess = new ProcessState(driver);
    } else if (gProcess->mDriver != driver) {
        fprintf(stderr, "binder: the driver is %s already, not %s\n", gProcess->mDriver.c_str(),
                driver);
        abort();
    }
    return gProcess;
}

IPCThreadState* IPCThreadState::self() {
    static IPCThreadState state;
    return &state;
}

void IPCThreadState::joinThreadPool(bool /* isMain */) {
    for (;;) {
        pause();
    }
}

sp<IServiceManager> defaultServiceManager() {
    if (gServiceManager == nullptr && host::DeviceRoot() >= 0) {
        gServiceManager = new DriverServiceManager;
    }
    return gServiceManager;
}

void setDefaultServiceManager(const sp<IServiceManager>& manager) { gServiceManager = manager; }

}  // namespace android
