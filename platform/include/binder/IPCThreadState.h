// Host stand-in for the platform's serving threads.
#pragma once

namespace android {

class IPCThreadState {
  public:
    static IPCThreadState* self();

    // Serves the services that this process has added, each client on a thread of its own, and
    // never returns.
    [[noreturn]] void joinThreadPool(bool isMain = true);
};

}  // namespace android
