// Host implementation of the platform's serving threads.
#pragma once

namespace android {

class IPCThreadState {
  public:
    static IPCThreadState* self();

    // Never returns. addService() has already started the threads of every service.
    [[noreturn]] void joinThreadPool(bool isMain = true);
};

}  // namespace android
