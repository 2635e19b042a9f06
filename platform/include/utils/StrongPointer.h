// Host implementation of the platform's strong reference to a RefBase object.
#pragma once

#include <utility>

namespace android {

template <typename T>
class sp {
  public:
    sp() = default;
    sp(T* object) : mObject(object) { Acquire(); }  // NOLINT(google-explicit-constructor)
    sp(const sp& other) : sp(other.mObject) {}
    sp(sp&& other) noexcept : mObject(std::exchange(other.mObject, nullptr)) {}
    template <typename U>
    sp(U* object) : sp(static_cast<T*>(object)) {}  // NOLINT(google-explicit-constructor)
    template <typename U>
    sp(const sp<U>& other) : sp(other.get()) {}  // NOLINT(google-explicit-constructor)
    ~sp() { clear(); }

    sp& operator=(sp other) noexcept {
        std::swap(mObject, other.mObject);
        return *this;
    }

    void clear() {
        if (T* const object = std::exchange(mObject, nullptr)) {
            object->decStrong(this);
        }
    }

    T* get() const { return mObject; }
    T* operator->() const { return mObject; }
    T& operator*() const { return *mObject; }
    explicit operator bool() const { return mObject != nullptr; }
    bool operator==(const sp& other) const { return mObject == other.mObject; }
    bool operator!=(const sp& other) const { return mObject != other.mObject; }
    bool operator==(const T* other) const { return mObject == other; }
    bool operator!=(const T* other) const { return mObject != other; }

  private:
    void Acquire() const {
        if (mObject != nullptr) {
            mObject->incStrong(this);
        }
    }

    T* mObject = nullptr;
};

}  // namespace android
