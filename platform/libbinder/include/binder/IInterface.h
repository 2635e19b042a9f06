// Host implementation of the platform's bases of binder interfaces.
#pragma once

#include <binder/Binder.h>

namespace android {

class IInterface : public virtual RefBase {};

// Client side: the interface on a remote binder.
template <typename INTERFACE>
class BpInterface : public INTERFACE, public BpRefBase {
  public:
    explicit BpInterface(const sp<IBinder>& remote) : BpRefBase(remote) {}
};

}  // namespace android
