// Host implementation of the platform's binder threads.
#pragma once

#include <unistd.h>

namespace android {

class IPCThreadState {
  public:
    static IPCThreadState* self() {
        static IPCThreadState state;
        return &state;
    }

    // Never returns. addService() has already started the threads of every service.
    [[noreturn]] void joinThreadPool() {
        for (;;) {
            pause();
        }
    }
};

}  // namespace android
