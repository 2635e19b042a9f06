// Host implementation of the platform's local binder object.
#pragma once

#include <binder/IBinder.h>

namespace android {

// A binder of this process. Calls may arrive on several threads at once.
class BBinder : public IBinder {
  public:
    status_t transact(uint32_t code, const Parcel& data, Parcel* reply, uint32_t flags = 0) final {
        return onTransact(code, data, reply, flags);
    }

  protected:
    // Executes one call. Returns UNKNOWN_TRANSACTION for an unknown code.
    virtual status_t onTransact(uint32_t code, const Parcel& data, Parcel* reply,
                                uint32_t flags = 0) = 0;
};

}  // namespace android
