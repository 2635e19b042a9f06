// The life of the device: whether it runs, how it is booted and stopped. Init holds record locks on
// the device root's mark, which tell its state and its process ID. The kernel releases them when
// init dies.
#pragma once

#include <sys/types.h>

#include <string>

namespace device {

// The bytes of the mark that init locks.
enum class InitLock : off_t {
    kRunning,  // while init runs
    kBooted,   // from the end of the boot until init is told to exit
};

// The exit status of an init that finds another one running.
constexpr int kExitAlreadyRunning = 5;

enum class State {
    kStopped,
    kBootingOrStopping,
    kRunning,
    kOtherBuild,  // an init of another build runs, in any state
    kUnknown,
};

struct Init {
    State state;
    pid_t process = 0;        // 0 if there is no init or the state is unknown
    std::string reason = {};  // why the state is unknown
};

// Returns the current state.
Init FindInit();

// Returns true if the device is running. Otherwise prints an error.
bool ExpectRunning();

enum class Until { kBooted, kDaemonAlive };

// Boots the device with this SELinux mode unless this build's init is running, and waits until it
// has booted or its daemon is alive. Always waits for the daemon of a device that it has booted.
// Returns the exit status, after a message if it is not 0.
int BringUp(const char* selinuxMode, Until until);

// Reboots the device with SELinux enforcing; boots a stopped one. Returns the exit status, after a
// message.
int Reboot();

// Stops the device with SIGTERM, then SIGKILL after a time-out. Returns the exit status, after a
// message.
int Stop();

}  // namespace device
