// Host implementation of the platform's service manager.
#pragma once

#include <binder/IInterface.h>

namespace android {

class IServiceManager : public IInterface {
  public:
    // The service's binder, waiting up to 5 s for it; null when it does not appear. The environment
    // variable TPD_GET_SERVICE_MS sets another limit in milliseconds, up to a day.
    virtual sp<IBinder> getService(const String16& name) const = 0;

    // Publishes a binder of this process and replaces an earlier one of that name. Returns 0 or a
    // negative status.
    virtual status_t addService(const String16& name, const sp<IBinder>& service) = 0;
};

// The process's service manager, null when the device root cannot be used.
sp<IServiceManager> defaultServiceManager();

// Replaces it; for tests.
void setDefaultServiceManager(const sp<IServiceManager>& manager);

}  // namespace android
