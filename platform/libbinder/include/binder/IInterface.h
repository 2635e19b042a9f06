// Host implementation of the platform's bases of binder interfaces.
#pragma once

#include <binder/IBinder.h>

namespace android {

class IInterface : public virtual RefBase {};

// Client side: the interface on a remote binder, to which it keeps a reference.
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
