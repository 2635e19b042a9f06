// Host implementation of the platform's strong reference to a RefBase object.
#pragma once

#include <utility>

namespace android {

template <typename T>
class sp {
  public:
    sp() = default;
    sp(T* object) : mObject(object) {  // NOLINT(google-explicit-constructor)
        if (mObject != nullptr) {
            mObject->incStrong(this);
        }
    }
    sp(const sp& other) : sp(other.mObject) {}
    sp(sp&& other) noexcept : mObject(std::exchange(other.mObject, nullptr)) {}
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
    bool operator==(const sp& other) const { return mObject == other.mObject; }
    bool operator!=(const sp& other) const { return mObject != other.mObject; }

  private:
    T* mObject = nullptr;
};

}  // namespace android
