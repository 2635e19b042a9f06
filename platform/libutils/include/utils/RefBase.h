// Host implementation of the platform's reference-counted base class and weak references.
#pragma once

#include <memory>

#include <utils/StrongPointer.h>

namespace android {

// The object is destroyed with its last strong reference.
class RefBase : public std::enable_shared_from_this<RefBase> {
  public:
    RefBase(const RefBase&) = delete;
    RefBase& operator=(const RefBase&) = delete;
    virtual ~RefBase() = default;

  protected:
    RefBase() = default;
};

// A weak reference. When it is constructed, the object must have a strong reference.
template <typename T>
class wp : public std::weak_ptr<T> {
  public:
    wp() = default;
    wp(T* object) : wp(sp<T>(object)) {}  // NOLINT(google-explicit-constructor)
    template <typename U>
    wp(const sp<U>& object) : std::weak_ptr<T>(object) {}  // NOLINT(google-explicit-constructor)

    // Returns a strong reference, or null if the object has been destroyed.
    sp<T> promote() const { return this->lock(); }

    bool operator==(const wp& other) const {
        return !this->owner_before(other) && !other.owner_before(*this);
    }
};

}  // namespace android
