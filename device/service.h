// A service of the device's init. The property init.svc.NAME holds its state, as on a phone:
// running, stopped or restarting.
#pragma once

#include <sys/types.h>

#include <chrono>
#include <string>

namespace device {

class Service {
  public:
    // What init knows about the program.
    struct Program {
        const char* service;           // the service's name
        const char* file;              // in init's directory
        bool (*isUp)();                // returns true if the running program is ready
        void (*onExit)(bool isCrash);  // called after it has exited by itself or was stopped
    };

    explicit Service(const Program& program);

    const char* name() const { return mProgram.service; }

    // Makes the service due unless it is running.
    void Start();

    // Kills the process, if any, and waits for it.
    void Stop();

    // Like Stop() and Start().
    void Restart();

    // If the process has exited by itself, makes the service due after a pause, which doubles each
    // time the process exits before it is up. After exit status 0, the service is stopped.
    void Reap();

    // Writes the state to the property; a boot clears the properties.
    void PublishState() const;

    // Starts the process if it is due. Returns the time in milliseconds until it is due, or -1 if
    // it is running or stopped.
    int StartIfDue();

  private:
    using Clock = std::chrono::steady_clock;

    [[noreturn]] void Run(pid_t init) const;
    void Kill();

    const Program mProgram;
    pid_t mProcess = -1;
    bool mIsEnabled = false;
    int mPauseMs = 0;  // before the next start
    Clock::time_point mDue;
};

}  // namespace device
