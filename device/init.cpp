// The device's init: boots the device and supervises the touch daemon. "odm.thp.service_enable"
// starts and stops the daemon. Init restarts a daemon that exits, and counts the restarts.
//
// init MODE: boots the device with SELinux in MODE. Writes one byte to standard output when the
// device has booted, and prints earlier failures to standard error. Exits on SIGTERM or SIGINT, or
// when the properties directory is removed.
#include <android/log.h>
#include <fcntl.h>
#include <poll.h>
#include <sys/inotify.h>
#include <sys/prctl.h>
#include <sys/signalfd.h>
#include <sys/stat.h>
#include <sys/system_properties.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <thread>

#include "common.h"
#include "platform/device_root.h"
#include "platform/files.h"
#include "platform/trace.h"
#include "platform/unique_fd.h"

namespace {

using host::UniqueFd;

constexpr char kDriverDirectory[] = "dev/vndbinder";
// The pause doubles each time the daemon exits before it is alive.
constexpr int kMinRestartPauseMs = 50;
constexpr int kMaxRestartPauseMs = 5000;

constexpr const char* kBootProperties[][2] = {{"ro.build.display.id", "VIRTUAL-11.0"},
                                              {"ro.build.version.release", "11"},
                                              {"ro.build.version.sdk", "30"},
                                              {"ro.debuggable", "1"},
                                              {"ro.logsystem.usertype", "1"},
                                              {"ro.product.cpu.abi", "arm64-v8a"},
                                              {"ro.serialno", "virtual"},
                                              {"odm.thp.ver_firmware", "virtual-1"},
                                              {"odm.thp.dae_bootflag", "true"},
                                              {device::kDaemonAliveKey, "false"},
                                              {device::kDaemonBinderKey, "0"},
                                              {device::kRestartCountKey, "0"},
                                              {device::kIsUpdatingFirmwareKey, "false"},
                                              {device::kServiceEnableKey, "1"}};

// Removes the files in a directory, except those whose names begin with `keptPrefix`, if any.
// Creates a missing directory. Returns false if the directory cannot be opened.
bool Empty(const char* path, const char* keptPrefix = nullptr) {
    const UniqueFd directory = host::OpenDirectory(path, host::IfMissing::kMake);
    if (!directory.ok()) {
        return false;
    }
    for (const std::string& name : device::FilesIn(path)) {
        if (keptPrefix == nullptr || name.rfind(keptPrefix, 0) != 0) {
            unlinkat(directory.get(), name.c_str(), 0);
        }
    }
    return true;
}

// Makes this process the device's only init. Closing any descriptor of the file would release the
// record lock, so this process must not open the file again.
bool LockDevice() {
    static const UniqueFd file = host::OpenFile(host::kInitLockFile, O_RDWR | O_CREAT);
    struct flock whole = {};
    whole.l_type = F_WRLCK;
    return file.ok() && fcntl(file.get(), F_SETLK, &whole) == 0;
}

// Writes the files directly: another process may have just set a "ro." property, which
// __system_property_set() would not replace.
bool SetBootProperties() {
    return std::all_of(
            std::begin(kBootProperties), std::end(kBootProperties), [](const auto& property) {
                return host::ReplaceFileAt(host::PropertiesDirectory(), property[0], property[1]);
            });
}

// Resets the device's files to their state at power-on. Returns null, or the path that could not be
// reset.
const char* Boot(const char* selinuxMode) {
    const host::TraceEvent event("boot");
    if (!Empty(host::kTemporaryDirectory)) {
        return host::kTemporaryDirectory;
    }
    if (!Empty(kDriverDirectory)) {
        return kDriverDirectory;
    }
    if (!Empty(host::kPropertiesDirectory, "persist.") || !SetBootProperties()) {
        return host::kPropertiesDirectory;
    }
    if (!host::OpenFile(host::kLogFile, O_WRONLY | O_CREAT | O_TRUNC).ok()) {
        return host::kLogFile;
    }
    return host::ReplaceFile(host::kSelinuxFile, selinuxMode) ? nullptr : host::kSelinuxFile;
}

// Returns true if a property that init watches has been written since the last call.
bool DrainEvents(const UniqueFd& watch) {
    alignas(inotify_event) char events[16384];
    const ssize_t size = read(watch.get(), events, sizeof(events));
    bool isWritten = false;
    for (ssize_t at = 0; at < size;) {
        const auto* const event = reinterpret_cast<const inotify_event*>(events + at);
        at += static_cast<ssize_t>(sizeof(inotify_event) + event->len);
        const std::string name = event->len > 0 ? event->name : "";
        isWritten |= (event->mask & IN_Q_OVERFLOW) != 0 || name == device::kServiceEnableKey ||
                     name == device::kUpdatingFirmwareKey;
    }
    return isWritten;
}

class DaemonSupervisor {
  public:
    // Acts on a write. Always stops the daemon: if "0" and "1" are written in quick succession,
    // init reads only "1", but the daemon must still restart. Also acts on writes made during the
    // stop.
    void Restart(const UniqueFd& watch) {
        Stop();
        DrainEvents(watch);
        mIsEnabled = device::IsDaemonEnabled();
        mPauseMs = 0;
    }

    // Reaps a daemon that has exited, and starts one if enabled. Returns false if fork() fails.
    bool ReapAndStart() {
        ReapDaemon();
        if (mDaemon < 0 && mIsEnabled) {
            const pid_t init = getpid();
            mDaemon = fork();
            if (mDaemon == 0) {
                RunDaemon(init);
            }
        }
        return mDaemon > 0 || !mIsEnabled;
    }

    void Stop() {
        if (mDaemon > 0) {
            host::TraceEvent("daemon_stop").Add("daemon", mDaemon);
            kill(mDaemon, SIGKILL);
            waitpid(mDaemon, nullptr, 0);
            DaemonGone();
        }
    }

  private:
    // The daemon dies with init, even if init dies before prctl().
    [[noreturn]] void RunDaemon(pid_t init) const {
        prctl(PR_SET_PDEATHSIG, SIGKILL);
        sigset_t none;
        sigemptyset(&none);
        sigprocmask(SIG_SETMASK, &none, nullptr);
        std::this_thread::sleep_for(std::chrono::milliseconds(mPauseMs));
        if (getppid() == init) {
            host::LookForTrace();
            host::TraceEvent("daemon_start").Add("daemon", getpid());
            // This path refers to the same directory even after the root is renamed.
            const std::string root =
                    "/proc/self/fd/" + std::to_string(dup(host::DeviceRoot())) + "/.";
            setenv("TPD_DEVICE_ROOT", root.c_str(), 1);
            const std::string program = device::PathBesideProgram("corvane_daemon");
            execl(program.c_str(), program.c_str(), nullptr);
        }
        _exit(127);
    }

    void ReapDaemon() {
        int status = 0;
        if (mDaemon < 0 || waitpid(mDaemon, &status, WNOHANG) != mDaemon) {
            return;
        }
        host::TraceEvent("daemon_exit")
                .Add("daemon", mDaemon)
                .Add(WIFSIGNALED(status) ? "signal" : "status",
                     WIFSIGNALED(status) ? WTERMSIG(status) : WEXITSTATUS(status));
        mPauseMs = device::IsDaemonAlive()
                           ? kMinRestartPauseMs
                           : std::clamp(mPauseMs * 2, kMinRestartPauseMs, kMaxRestartPauseMs);
        DaemonGone();
        const int64_t restarts = device::GetPropertyNumber(device::kRestartCountKey);
        const int64_t next = std::clamp<int64_t>(restarts, 0, INT32_MAX - 1) + 1;
        __system_property_set(device::kRestartCountKey, std::to_string(next).c_str());
        host::TraceEvent("restart_pause").Add("ms", mPauseMs);
        if (mPauseMs == kMinRestartPauseMs * 2) {
            __android_log_print(
                    ANDROID_LOG_ERROR, nullptr,
                    "corvane_daemon exits before it is alive; retrying with increasing pauses");
        }
    }

    void DaemonGone() {
        mDaemon = -1;
        Empty(kDriverDirectory);
        __system_property_set(device::kDaemonAliveKey, "false");
        __system_property_set(device::kDaemonBinderKey, "0");
        __system_property_set(device::kIsUpdatingFirmwareKey, "false");
    }

    pid_t mDaemon = -1;
    bool mIsEnabled = false;
    int mPauseMs = 0;  // before the next daemon starts; the child process waits
};

// Drops the caller's descriptors, signal handling, session and working directory.
bool Daemonize() {
    close_range(STDERR_FILENO + 1, ~0U, 0);
    for (int number = 1; number < NSIG; ++number) {
        signal(number, SIG_DFL);
    }
    setsid();
    return chdir("/") == 0;
}

// Returns a signalfd for SIGCHLD and the signals that terminate init.
UniqueFd OpenSignals() {
    sigset_t signals;
    sigemptyset(&signals);
    for (const int number : {SIGCHLD, SIGINT, SIGTERM}) {
        sigaddset(&signals, number);
    }
    sigprocmask(SIG_SETMASK, &signals, nullptr);
    return UniqueFd(signalfd(-1, &signals, SFD_CLOEXEC | SFD_NONBLOCK));
}

// Returns an inotify descriptor for writes to properties and the removal of their directory.
UniqueFd OpenWatch() {
    UniqueFd watch(inotify_init1(IN_CLOEXEC | IN_NONBLOCK));
    const auto add = [&watch](int directory, uint32_t events) {
        const std::string path = "/proc/self/fd/" + std::to_string(directory);
        return inotify_add_watch(watch.get(), path.c_str(), events) >= 0;
    };
    const bool isWatching = watch.ok() && add(host::PropertiesDirectory(), IN_MOVED_TO) &&
                            add(host::DeviceRoot(), IN_MOVED_FROM | IN_DELETE);
    return isWatching ? std::move(watch) : UniqueFd();
}

bool ExitRequested(const UniqueFd& signals) {
    signalfd_siginfo signal = {};
    const bool isSignaled = read(signals.get(), &signal, sizeof(signal)) == sizeof(signal);
    return isSignaled && signal.ssi_signo != SIGCHLD;
}

// Returns true if the properties directory is still the one that init watches.
bool PropertiesExist() {
    struct stat followed = {};
    struct stat found = {};
    return fstat(host::PropertiesDirectory(), &followed) == 0 &&
           fstatat(host::DeviceRoot(), host::kPropertiesDirectory, &found, AT_SYMLINK_NOFOLLOW) ==
                   0 &&
           followed.st_ino == found.st_ino;
}

// Tells the waiting `device start` that the device has booted, and closes the standard streams.
void ReportBoot(const UniqueFd& null) {
    [[maybe_unused]] const ssize_t written = write(STDOUT_FILENO, "\n", 1);
    for (const int stream : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO}) {
        dup2(null.get(), stream);
    }
}

void FollowProperties(const UniqueFd& signals, const UniqueFd& watch) {
    DaemonSupervisor supervisor;
    supervisor.Restart(watch);
    bool isBootCompleted = false;
    pollfd waits[] = {{signals.get(), POLLIN, 0}, {watch.get(), POLLIN, 0}};
    do {
        poll(waits, std::size(waits), supervisor.ReapAndStart() ? -1 : kMinRestartPauseMs);
        host::LookForTrace();
        if (DrainEvents(watch)) {
            supervisor.Restart(watch);
        }
        if (!isBootCompleted && device::IsDaemonAlive()) {
            isBootCompleted = __system_property_set(device::kBootCompletedKey, "1") == 0;
        }
    } while (!ExitRequested(signals) && PropertiesExist());
    supervisor.Stop();
}

}  // namespace

int main(int argc, char** argv) {
    if (argc != 2) {
        fputs("usage: init MODE\n", stderr);
        return 2;
    }
    if (!Daemonize()) {
        return device::FailForErrno("cannot change to /");
    }
    if (host::DeviceRoot() < 0) {
        return 1;
    }
    if (!LockDevice()) {
        return device::FailForErrno(std::string("cannot lock ") + host::kInitLockFile);
    }
    const UniqueFd null(open("/dev/null", O_RDWR | O_CLOEXEC));
    if (!null.ok()) {
        return device::FailForErrno("/dev/null");
    }
    if (const char* const unprepared = Boot(argv[1]); unprepared != nullptr) {
        return device::FailForErrno(unprepared);
    }
    const UniqueFd signals = OpenSignals();
    const UniqueFd watch = OpenWatch();
    if (!signals.ok() || !watch.ok()) {
        return device::FailForErrno("cannot watch the properties");
    }
    ReportBoot(null);
    FollowProperties(signals, watch);
    Empty(host::kTemporaryDirectory);
    return 0;
}
