// Host stand-in for the platform's bases of binder interfaces.
#pragma once

#include <binder/Binder.h>

namespace android {

class IInterface : public virtual RefBase {
  public:
    static sp<IBinder> asBinder(const IInterface* interface);
    static sp<IBinder> asBinder(const sp<IInterface>& interface);

  protected:
    IInterface();
    ~IInterface() override;
    virtual IBinder* onAsBinder() = 0;
};

// Client side: the interface on a remote binder.
template <typename INTERFACE>
class BpInterface : public INTERFACE, public BpRefBase {
  public:
    explicit BpInterface(const sp<IBinder>& remote) : BpRefBase(remote) {}

  protected:
    typedef INTERFACE BaseInterface;
    IBinder* onAsBinder() override { return remote(); }
};

// Service side: the interface as a binder of this process.
template <typename INTERFACE>
class BnInterface : public INTERFACE, public BBinder {
  public:
    sp<IInterface> queryLocalInterface(const String16& descriptor) override {
        return descriptor == INTERFACE::descriptor ? sp<IInterface>(this) : nullptr;
    }
    const String16& getInterfaceDescriptor() const override { return INTERFACE::descriptor; }

  protected:
    typedef INTERFACE BaseInterface;
    IBinder* onAsBinder() override { return this; }
};

}  // namespace android
