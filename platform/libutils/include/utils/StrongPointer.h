// Host implementation of the platform's strong reference to a RefBase object.
#pragma once

#include <memory>

namespace android {

class RefBase;

// Unlike std::shared_ptr, it can be constructed from the same raw pointer more than once.
template <typename T>
class sp : public std::shared_ptr<T> {
  public:
    sp() = default;
    sp(T* object) : std::shared_ptr<T>(Share(object)) {}  // NOLINT(google-explicit-constructor)
    template <typename U>
    sp(const std::shared_ptr<U>& object)  // NOLINT(google-explicit-constructor)
        : std::shared_ptr<T>(object) {}

  private:
    static std::shared_ptr<T> Share(T* object) {
        if (object == nullptr) {
            return nullptr;
        }
        const std::shared_ptr<RefBase> owner = object->weak_from_this().lock();
        return {owner != nullptr ? owner : std::shared_ptr<RefBase>(object), object};
    }
};

}  // namespace android
