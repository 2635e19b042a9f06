// Host implementation of the platform's per-process binder state: which driver the process uses.
#pragma once

#include <string>

#include <utils/RefBase.h>

namespace android {

class ProcessState : public virtual RefBase {
  public:
    // The process's only instance, on "/dev/binder" unless initWithDriver() came first.
    static sp<ProcessState> self();

    // Chooses the driver: the directory of this path in the device root. A later call with another
    // path aborts the process.
    static sp<ProcessState> initWithDriver(const char* driver);

    const std::string& getDriverName() const { return mDriver; }

  private:
    explicit ProcessState(const char* driver) : mDriver(driver) {}

    const std::string mDriver;
};

}  // namespace android
