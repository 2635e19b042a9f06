#include <binder/Binder.h>

#include <binder/IInterface.h>
#include <binder/IPCThreadState.h>
#include <binder/IServiceManager.h>
#include <binder/Parcel.h>
#include <binder/ProcessState.h>
#include <malloc.h>

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <thread>

#include "device_root.h"
#include "vndbinder.h"

namespace android {

namespace {

constexpr char kDefaultDriver[] = "/dev/binder";
constexpr std::chrono::milliseconds kGetServiceLimit(5000);
constexpr std::chrono::milliseconds kGetServicePause(100);

sp<ProcessState> gProcess;
sp<IServiceManager> gServiceManager;

std::chrono::milliseconds GetServiceLimit() {
    const char* const text = getenv("TPD_GET_SERVICE_MS");
    return text != nullptr ? std::chrono::milliseconds(strtoul(text, nullptr, 10))
                           : kGetServiceLimit;
}

// Service names are plain ASCII; any other code unit makes a name that nobody publishes.
std::string ServiceName(const String16& name) {
    std::string text;
    for (size_t i = 0; i < name.size(); ++i) {
        const char16_t unit = name.string()[i];
        text += unit > 0x20 && unit < 0x7F ? static_cast<char>(unit) : '/';
    }
    return text;
}

// The sockets in the driver's folder are the list of services.
class DriverServiceManager : public IServiceManager {
  public:
    sp<IBinder> getService(const String16& name) const override {
        const auto deadline = std::chrono::steady_clock::now() + GetServiceLimit();
        for (;;) {
            sp<IBinder> binder = checkService(name);
            if (binder != nullptr ||
                std::chrono::steady_clock::now() + kGetServicePause > deadline) {
                return binder;
            }
            std::this_thread::sleep_for(kGetServicePause);
        }
    }

    sp<IBinder> checkService(const String16& name) const override {
        return host::ConnectService(ProcessState::self()->getDriverName(), ServiceName(name));
    }

    status_t addService(const String16& name, const sp<IBinder>& service, bool /* allowIsolated */,
                        int /* dumpsysFlags */) override {
        return host::PublishService(ProcessState::self()->getDriverName(), ServiceName(name),
                                    service);
    }

  protected:
    IBinder* onAsBinder() override { return nullptr; }
};

}  // namespace

IInterface::IInterface() = default;

IInterface::~IInterface() = default;

sp<IBinder> IInterface::asBinder(const IInterface* interface) {
    return interface != nullptr ? const_cast<IInterface*>(interface)->onAsBinder() : nullptr;
}

sp<IBinder> IInterface::asBinder(const sp<IInterface>& interface) {
    return asBinder(interface.get());
}

sp<IInterface> IBinder::queryLocalInterface(const String16& /* descriptor */) { return nullptr; }

const String16& BBinder::getInterfaceDescriptor() const {
    static const String16 none;
    return none;
}

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

BpRefBase::BpRefBase(const sp<IBinder>& remote) : mRemote(remote) {}

BpRefBase::~BpRefBase() = default;

// On the device the driver's receive buffer is mapped once for the life of the process. Here
// parcels take it from the heap, which therefore keeps the memory of one call for the next.
ProcessState::ProcessState(std::string driver) : mDriver(std::move(driver)) {
    mallopt(M_MMAP_THRESHOLD, 2 * host::kMaxTransactionBytes);
    mallopt(M_TRIM_THRESHOLD, 8 * host::kMaxTransactionBytes);
}

ProcessState::~ProcessState() = default;

sp<ProcessState> ProcessState::self() {
    if (gProcess == nullptr) {
        gProcess = new ProcessState(kDefaultDriver);
    }
    return gProcess;
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

void IPCThreadState::joinThreadPool(bool /* isMain */) { host::ServeServices(); }

sp<IServiceManager> defaultServiceManager() {
    if (gServiceManager == nullptr && host::DeviceRoot() >= 0) {
        gServiceManager = new DriverServiceManager;
    }
    return gServiceManager;
}

void setDefaultServiceManager(const sp<IServiceManager>& manager) { gServiceManager = manager; }

}  // namespace android
