// Host implementation of the platform's reference-counted base and weak references to it.
#pragma once

#include <memory>

#include <utils/StrongPointer.h>

namespace android {

// The last strong reference destroys the object.
class RefBase : public std::enable_shared_from_this<RefBase> {
  public:
    RefBase(const RefBase&) = delete;
    RefBase& operator=(const RefBase&) = delete;
    virtual ~RefBase() = default;

  protected:
    RefBase() = default;
};

// A weak reference, empty or to an object that has a strong reference at that time.
template <typename T>
class wp : public std::weak_ptr<T> {
  public:
    wp() = default;
    wp(T* object) : wp(sp<T>(object)) {}  // NOLINT(google-explicit-constructor)
    template <typename U>
    wp(const sp<U>& object) : std::weak_ptr<T>(object) {}  // NOLINT(google-explicit-constructor)

    // A strong reference; null when the object has been destroyed.
    sp<T> promote() const { return this->lock(); }

    bool operator==(const wp& other) const {
        return !this->owner_before(other) && !other.owner_before(*this);
    }
};

}  // namespace android
