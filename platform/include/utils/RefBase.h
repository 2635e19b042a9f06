// Host stand-in for the platform's reference-counted base and weak references to it.
#pragma once

#include <atomic>
#include <cstdint>

#include <utils/StrongPointer.h>

namespace android {

// Destroyed with its last strong reference. The counts outlive it until the last weak one is gone.
class RefBase {
  public:
    class weakref_type {
      public:
        explicit weakref_type(RefBase* object) : mObject(object) {}
        void incWeak(const void* id);
        void decWeak(const void* id);
        // Takes a strong reference if somebody else holds one. Returns whether it did.
        bool attemptIncStrong(const void* id);
        RefBase* refBase() const { return mObject; }

      private:
        friend class RefBase;
        std::atomic<int32_t> mStrong{0};
        std::atomic<int32_t> mWeak{1};  // the object itself holds one
        RefBase* const mObject;
    };

    RefBase(const RefBase&) = delete;
    RefBase& operator=(const RefBase&) = delete;

    void incStrong(const void* id) const;
    void decStrong(const void* id) const;
    int32_t getStrongCount() const;

    // A weak reference, which the caller gives back with decWeak().
    weakref_type* createWeak(const void* id) const;

  protected:
    RefBase();
    virtual ~RefBase();

  private:
    weakref_type* const mRefs;
};

template <typename T>
class wp {
  public:
    wp() = default;
    wp(T* object)  // NOLINT(google-explicit-constructor)
        : mObject(object), mRefs(object != nullptr ? object->createWeak(this) : nullptr) {}
    wp(const sp<T>& object) : wp(object.get()) {}  // NOLINT(google-explicit-constructor)
    template <typename U>
    wp(const sp<U>& object) : wp(object.get()) {}  // NOLINT(google-explicit-constructor)
    wp(const wp& other) : mObject(other.mObject), mRefs(other.mRefs) {
        if (mRefs != nullptr) {
            mRefs->incWeak(this);
        }
    }
    ~wp() {
        if (mRefs != nullptr) {
            mRefs->decWeak(this);
        }
    }

    wp& operator=(wp other) noexcept {
        std::swap(mObject, other.mObject);
        std::swap(mRefs, other.mRefs);
        return *this;
    }

    // A strong reference, null when nobody holds the object any more.
    sp<T> promote() const {
        if (mRefs == nullptr || !mRefs->attemptIncStrong(this)) {
            return nullptr;
        }
        sp<T> object(mObject);
        mObject->decStrong(this);
        return object;
    }

    T* unsafe_get() const { return mObject; }
    bool operator==(const wp& other) const { return mRefs == other.mRefs; }
    bool operator!=(const wp& other) const { return mRefs != other.mRefs; }

  private:
    T* mObject = nullptr;
    RefBase::weakref_type* mRefs = nullptr;
};

}  // namespace android
