#include "life.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/file.h>
#include <sys/system_properties.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstring>
#include <filesystem>
#include <thread>
#include <utility>

#include "messages.h"
#include "platform/device_root.h"
#include "platform/files.h"
#include "platform/unique_fd.h"
#include "programs.h"
#include "properties.h"

// The C library's header lacks extern "C".
extern "C" {
#include <sys/pidfd.h>
}

namespace device {

namespace {

using Clock = std::chrono::steady_clock;
using host::UniqueFd;

constexpr int kStartLimitMs = 20000;
constexpr int kStopLimitMs = 5000;
constexpr std::chrono::milliseconds kPollPause(5);

// Stores who holds init's lock. Returns false if the lock cannot be read.
bool ReadLock(const UniqueFd& mark, InitLock byte, struct flock& holder) {
    holder = {};
    holder.l_type = F_WRLCK;
    holder.l_start = static_cast<off_t>(byte);
    holder.l_len = 1;
    return mark.ok() && fcntl(mark.get(), F_GETLK, &holder) == 0;
}

// Returns the state of a device whose init is this process. An exiting process loses its program
// before its locks.
State StateOf(pid_t init, bool isBooted) {
    std::error_code error;
    const auto program =
            std::filesystem::read_symlink("/proc/" + std::to_string(init) + "/exe", error);
    if (!error && program != PathBesideProgram("init")) {
        return State::kOtherBuild;
    }
    return isBooted && !error ? State::kRunning : State::kBootingOrStopping;
}

// Locks the device root, so that one process at a time starts init. Closing the descriptor releases
// the lock.
UniqueFd TryToLockStart() {
    UniqueFd root = host::OpenFile(".", O_RDONLY);
    return flock(root.get(), LOCK_EX | LOCK_NB) == 0 ? std::move(root) : UniqueFd();
}

// Starts init in the background. Returns its process ID, or -1 after an error message.
pid_t SpawnInit(const char* selinuxMode) {
    signal(SIGCHLD, SIG_DFL);  // otherwise its exit status could be lost
    const std::string program = PathBesideProgram("init");
    const pid_t init = fork();
    if (init == 0) {
        EnterDevice();
        execl(program.c_str(), program.c_str(), selinuxMode, nullptr);
        _exit(FailForErrno(program));
    }
    if (init < 0) {
        FailForErrno("cannot fork");
    }
    return init;
}

// Starts init unless it has been started before; `process` is 0 or its process ID. Returns false
// if it failed. An init that was stopped, or that found another one, is started again.
bool StartInit(const char* selinuxMode, pid_t& process) {
    int status = 0;
    if (process > 0 && waitpid(process, &status, WNOHANG) == process) {
        const bool hasFailed = WIFEXITED(status) && WEXITSTATUS(status) != 0 &&
                               WEXITSTATUS(status) != kExitAlreadyRunning;
        if (hasFailed) {
            Fail("init did not boot the device");
            return false;
        }
        process = 0;
    }
    if (process == 0) {
        process = SpawnInit(selinuxMode);
    }
    return process > 0;
}

// Sends SIGTERM, then SIGKILL after a time-out. Returns true when the process has exited.
bool Terminate(const UniqueFd& process) {
    pollfd exited = {process.get(), POLLIN, 0};
    for (const int number : {SIGTERM, SIGKILL}) {
        pidfd_send_signal(process.get(), number, nullptr, 0);
        if (poll(&exited, 1, kStopLimitMs) == 1) {
            return true;
        }
    }
    return false;
}

bool IsDaemonStopped() { return GetProperty(kDaemonStateKey) == "stopped"; }

int FailForUnknown(const Init& init) {
    return Fail("cannot tell whether the device is running: " + init.reason);
}

int FailForDaemon() {
    return Fail("the daemon is not alive; see " + Command("shell logcat -d") +
                ", or start a stopped daemon with " + Command("shell start corvane_daemon"));
}

}  // namespace

Init FindInit() {
    const UniqueFd mark = host::OpenFile(host::kMarkFile, O_RDONLY);
    struct flock running = {};
    struct flock booted = {};
    if (!ReadLock(mark, InitLock::kRunning, running) ||
        !ReadLock(mark, InitLock::kBooted, booted)) {
        return {State::kUnknown, 0, std::string(host::kMarkFile) + ": " + strerror(errno)};
    }
    if (running.l_type == F_UNLCK) {
        return {State::kStopped};
    }
    if (running.l_pid <= 0) {
        return {State::kUnknown, 0, "init runs in another PID namespace"};
    }
    return {StateOf(running.l_pid, booted.l_type != F_UNLCK), running.l_pid};
}

bool ExpectRunning() {
    const Init init = FindInit();
    if (init.state == State::kUnknown) {
        FailForUnknown(init);
    } else if (init.state == State::kStopped) {
        Fail("the device is stopped; " + Command("start") + " boots it");
    }
    return init.process > 0;
}

int BringUp(const char* selinuxMode, Until until) {
    const auto deadline = Clock::now() + std::chrono::milliseconds(kStartLimitMs);
    pid_t started = 0;
    UniqueFd lock;
    for (; Clock::now() < deadline; std::this_thread::sleep_for(kPollPause)) {
        if (!lock.ok()) {
            lock = TryToLockStart();
        }
        // Asked before and after the locks are read, because the device may stop or boot meanwhile.
        const bool wasDaemonStopped = IsDaemonStopped();
        const Init init = FindInit();
        if (init.state != State::kStopped) {
            lock.reset();
        }
        switch (init.state) {
            case State::kUnknown:
                return FailForUnknown(init);
            case State::kStopped:
                if (lock.ok() && !StartInit(selinuxMode, started)) {
                    return kFailure;
                }
                break;
            case State::kOtherBuild:
                PrintMessage("the device runs another build; rebooting it");
                if (Stop() != 0) {
                    return kFailure;
                }
                break;
            case State::kBootingOrStopping:
                break;
            case State::kRunning:
                const bool isStartedHere = init.process == started;
                const bool isBootCompleted = GetProperty(kBootCompletedKey) == "1";
                const bool isUp = IsDaemonAlive() && (isBootCompleted || !isStartedHere);
                if (isUp && isStartedHere) {
                    PrintMessage("started in " + host::DeviceRootPath() + ", SELinux is " +
                                 selinuxMode);
                }
                if (isUp || (until == Until::kBooted && !isStartedHere)) {
                    return 0;
                }
                if (wasDaemonStopped && IsDaemonStopped()) {
                    return FailForDaemon();
                }
        }
    }
    return FindInit().state == State::kRunning ? FailForDaemon() : Fail("the device does not boot");
}

int Reboot() {
    const bool isAsked = FindInit().state == State::kRunning &&
                         __system_property_set(kPowerControlKey, "reboot") == 0;
    const auto deadline = Clock::now() + std::chrono::milliseconds(kStopLimitMs);
    while (isAsked && !GetProperty(kPowerControlKey).empty() && Clock::now() < deadline) {
        std::this_thread::sleep_for(kPollPause);
    }
    const bool isRebooting = isAsked && GetProperty(kPowerControlKey).empty();
    if (!isRebooting && Stop() != 0) {
        return kFailure;
    }
    const int status = BringUp("Enforcing", Until::kDaemonAlive);
    if (status == 0) {
        PrintMessage("rebooted; SELinux is Enforcing");
    }
    return status;
}

int Stop() {
    for (;;) {
        const Init init = FindInit();
        if (init.state == State::kUnknown) {
            return FailForUnknown(init);
        }
        if (init.state == State::kStopped) {
            PrintMessage("already stopped");
            return 0;
        }
        // The process ID may have been reused before pidfd_open().
        const UniqueFd process(pidfd_open(init.process, 0));
        if (FindInit().process != init.process) {
            continue;
        }
        if (!Terminate(process)) {
            return Fail("process " + std::to_string(init.process) + " does not exit");
        }
        PrintMessage("stopped");
        return 0;
    }
}

}  // namespace device
