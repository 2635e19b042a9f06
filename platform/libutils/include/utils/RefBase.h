// Host implementation of the platform's reference-counted base and weak references to it.
#pragma once

#include <atomic>
#include <cstdint>
#include <memory>

#include <utils/StrongPointer.h>

namespace android {

// The last strong reference destroys the object.
class RefBase {
  public:
    RefBase(const RefBase&) = delete;
    RefBase& operator=(const RefBase&) = delete;

    void incStrong(const void* /* id */) const { ++*mStrong; }
    void decStrong(const void* /* id */) const {
        if (--*mStrong == 0) {
            delete this;
        }
    }

  protected:
    RefBase() = default;
    virtual ~RefBase() = default;

  private:
    template <typename T>
    friend class wp;

    // The number of strong references. It outlives the object, since weak references share it.
    const std::shared_ptr<std::atomic<int32_t>> mStrong = std::make_shared<std::atomic<int32_t>>(0);
};

template <typename T>
class wp {
  public:
    wp() = default;
    wp(T* object)  // NOLINT(google-explicit-constructor)
        : mObject(object), mStrong(object != nullptr ? object->mStrong : nullptr) {}
    wp(const sp<T>& object) : wp(object.get()) {}  // NOLINT(google-explicit-constructor)
    template <typename U>
    wp(const sp<U>& object) : wp(object.get()) {}  // NOLINT(google-explicit-constructor)

    // A strong reference; null when the object has been destroyed.
    sp<T> promote() const {
        int32_t strong = mStrong != nullptr ? mStrong->load() : 0;
        while (strong > 0) {
            if (mStrong->compare_exchange_weak(strong, strong + 1)) {
                sp<T> object(mObject);
                mObject->decStrong(this);
                return object;
            }
        }
        return nullptr;
    }

    bool operator==(const wp& other) const { return mStrong == other.mStrong; }
    bool operator!=(const wp& other) const { return mStrong != other.mStrong; }

  private:
    T* mObject = nullptr;
    std::shared_ptr<std::atomic<int32_t>> mStrong;
};

}  // namespace android
