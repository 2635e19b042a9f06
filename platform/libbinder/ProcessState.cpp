#include <binder/ProcessState.h>

#include <cstdio>
#include <cstdlib>

namespace android {

namespace {

sp<ProcessState> gProcess;

}  // namespace

sp<ProcessState> ProcessState::self() {
    return gProcess != nullptr ? gProcess : initWithDriver("/dev/binder");
}

sp<ProcessState> ProcessState::initWithDriver(const char* driver) {
    if (gProcess == nullptr) {
        gProcess = new ProcessState(driver);
    } else if (gProcess->mDriver != driver) {
        fprintf(stderr, "binder: the driver is already %s; cannot use %s\n",
                gProcess->mDriver.c_str(), driver);
        abort();
    }
    return gProcess;
}

}  // namespace android
