// Host implementation of the platform's binder object, local or remote.
#pragma once

#include <cstdint>

#include <utils/Errors.h>
#include <utils/RefBase.h>
#include <utils/String16.h>

namespace android {

class IInterface;
class Parcel;

class IBinder : public virtual RefBase {
  public:
    enum { FLAG_ONEWAY = 0x00000001 };

    class DeathRecipient : public virtual RefBase {
      public:
        // Called once, on the thread whose binder call found the owner dead.
        virtual void binderDied(const wp<IBinder>& who) = 0;
    };

    // Returns the implementation if it is in this process, otherwise null.
    virtual sp<IInterface> queryLocalInterface(const String16& descriptor);

    // Sends the request and waits for the reply. With FLAG_ONEWAY, does not wait and leaves the
    // reply empty. Returns 0 or a negative status from the owner or the driver.
    virtual status_t transact(uint32_t code, const Parcel& data, Parcel* reply,
                              uint32_t flags = 0) = 0;

    // Registers a recipient and keeps a weak reference to it. Returns 0, DEAD_OBJECT if the owner
    // is known to be dead, or INVALID_OPERATION for a binder of this process.
    virtual status_t linkToDeath(const sp<DeathRecipient>& /* recipient */,
                                 void* /* cookie */ = nullptr, uint32_t /* flags */ = 0) {
        return INVALID_OPERATION;
    }

    // Removes one registration of the recipient; ignores the other arguments. Returns 0,
    // NAME_NOT_FOUND if the recipient is not registered, or the errors of linkToDeath().
    virtual status_t unlinkToDeath(const wp<DeathRecipient>& /* recipient */,
                                   void* /* cookie */ = nullptr, uint32_t /* flags */ = 0,
                                   wp<DeathRecipient>* /* outRecipient */ = nullptr) {
        return INVALID_OPERATION;
    }
};

}  // namespace android
