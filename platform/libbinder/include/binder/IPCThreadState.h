// Host implementation of the platform's serving threads.
#pragma once

namespace android {

class IPCThreadState {
  public:
    static IPCThreadState* self();

    // Never returns. Every service of this process has threads of its own from addService() on.
    [[noreturn]] void joinThreadPool(bool isMain = true);
};

}  // namespace android
