// Host implementation of the platform's service manager.
#pragma once

#include <binder/IInterface.h>

namespace android {

class IServiceManager : public IInterface {
  public:
    // Returns the service's binder, or null if the service does not appear within 5 s. The
    // environment variable TPD_GET_SERVICE_MS sets another limit in milliseconds.
    virtual sp<IBinder> getService(const String16& name) const = 0;

    // Publishes a binder of this process, replacing any earlier one of that name. Returns 0 or a
    // negative status.
    virtual status_t addService(const String16& name, const sp<IBinder>& service) = 0;
};

// Returns the process's service manager, or null if the device root is unusable.
sp<IServiceManager> defaultServiceManager();

// Replaces the service manager; for tests.
void setDefaultServiceManager(const sp<IServiceManager>& manager);

}  // namespace android
