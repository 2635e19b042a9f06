// Host implementation of the platform's base classes of binder interfaces.
#pragma once

#include <binder/IBinder.h>

namespace android {

class IInterface : public virtual RefBase {};

// The client side of an interface. Holds a reference to the remote binder.
template <typename INTERFACE>
class BpInterface : public INTERFACE {
  public:
    explicit BpInterface(const sp<IBinder>& remote) : mRemote(remote) {}

  protected:
    IBinder* remote() const { return mRemote.get(); }

  private:
    const sp<IBinder> mRemote;
};

}  // namespace android
