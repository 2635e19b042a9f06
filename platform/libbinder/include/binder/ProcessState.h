// Host implementation of the platform's per-process binder state: which driver the process uses.
#pragma once

#include <string>

#include <utils/RefBase.h>

namespace android {

class ProcessState : public virtual RefBase {
  public:
    // Returns the process's only instance, for "/dev/binder" unless initWithDriver() was called
    // first.
    static sp<ProcessState> self();

    // Selects the driver, a directory in the device root. A later call with another path aborts the
    // process.
    static sp<ProcessState> initWithDriver(const char* driver);

    const std::string& getDriverName() const { return mDriver; }

  private:
    explicit ProcessState(const char* driver) : mDriver(driver) {}

    const std::string mDriver;
};

}  // namespace android
