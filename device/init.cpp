// The part of the device's init that boots it and controls the touch daemon: starts and stops it as
// "odm.thp.service_enable" says, and starts it again, counting, when it ends on its own.
//
// init MODE: boots the device root with SELinux in that mode. One byte on standard output says that
// the device is booted; a failure before that goes to standard error. Ends on SIGTERM or SIGINT, or
// when the folder of properties goes away.
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
#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <set>
#include <string>
#include <thread>

#include "common.h"
#include "platform/device_root.h"
#include "platform/files.h"
#include "platform/log_file.h"
#include "platform/trace.h"

namespace {

constexpr char kRestartsKey[] = "odm.thp.dae_reboot_times";
// A daemon that was alive is back soon; the pause doubles for one that ends before it is.
constexpr int kMinRestartPauseMs = 50;
constexpr int kMaxRestartPauseMs = 5000;

constexpr const char* kBootProperties[][2] = {
        {"ro.build.display.id", "VIRTUAL-11.0"}, {"ro.logsystem.usertype", "1"},
        {"odm.thp.ver_firmware", "virtual-1"},   {device::kDaemonAliveKey, "false"},
        {device::kDaemonBinderKey, "0"},         {kRestartsKey, "0"},
        {"odm.thp.is_updating_fw", "false"},     {"odm.thp.dae_bootflag", "true"},
        {device::kServiceEnableKey, "1"},
};

int Fail(const char* what, const char* why) {
    fprintf(stderr, "init: %s: %s\n", what, why);
    return 1;
}

void Remove(const std::string& path) {
    std::error_code error;
    std::filesystem::remove_all(host::DeviceRootPath() + "/" + path, error);
}

// Whether a boot, which removes files, destroys nothing of anybody else's: the folder was booted
// before, or has only what the tool and the device's commands make. These leave nothing in tmp and
// no log without properties. A symbolic link would lead the boot to files elsewhere.
bool IsDeviceRoot() {
    const std::set<std::string> files = device::FilesIn(".");
    const std::set<std::string> own = {"dev",     "log",      "proc", "properties",
                                       "selinux", "settings", "tmp",  "trace"};
    const bool hasLink = std::any_of(files.begin(), files.end(), [](const std::string& name) {
        std::error_code error;
        return std::filesystem::is_symlink(host::DeviceRootPath() + "/" + name, error);
    });
    return !hasLink &&
           (files.count(device::kInitLock) > 0 ||
            (device::FilesIn("tmp").empty() && files.count("log") <= files.count("properties") &&
             std::includes(own.begin(), own.end(), files.begin(), files.end())));
}

// Makes this process the device's one init. The kernel ends a record lock when the process closes
// any descriptor of the file: nothing else may open it here.
bool LockDevice() {
    const int file = openat(host::DeviceRoot(), device::kInitLock,
                            O_RDWR | O_CREAT | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC, 0600);
    struct flock whole = {};
    whole.l_type = F_WRLCK;
    return file >= 0 && fcntl(file, F_SETLK, &whole) == 0;
}

// The state of a device that has just been switched on: what persists, and the boot properties.
bool Boot(const std::string& selinuxMode) {
    const host::TraceEvent event("boot");
    Remove("tmp");
    Remove("dev/vndbinder");
    for (const std::string& name : device::FilesIn("properties")) {
        if (name.rfind("persist.", 0) != 0) {
            Remove("properties/" + name);
        }
    }
    for (const auto& [key, value] : kBootProperties) {
        if (__system_property_set(key, value) != 0) {
            return false;
        }
    }
    return host::WriteFile(host::kLogFile, "") && host::ReplaceFile("selinux", selinuxMode);
}

// Whether a property that init follows was written since the last call.
bool TakeWrites(int watch) {
    alignas(inotify_event) char events[16384];
    const ssize_t size = read(watch, events, sizeof(events));
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

class DaemonMinder {
  public:
    // Follows a write. Of several quick writes only the last value can be read: "1" for a running
    // daemon means that "0" came before it. Writes until the daemon has ended are followed at once.
    void Restart(int watch) {
        Stop();
        TakeWrites(watch);
        mIsEnabled = device::IsDaemonEnabled();
        mPauseMs = 0;
    }

    // Notices that the daemon has ended, and starts one that is to run. False when that failed.
    bool Mind() {
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
    // Whatever becomes of init, its daemon goes with it: also when init is gone before this begins.
    [[noreturn]] void RunDaemon(pid_t init) const {
        prctl(PR_SET_PDEATHSIG, SIGKILL);
        sigset_t none;
        sigemptyset(&none);
        sigprocmask(SIG_SETMASK, &none, nullptr);
        std::this_thread::sleep_for(std::chrono::milliseconds(mPauseMs));
        if (getppid() == init) {
            host::LookForTrace();
            host::TraceEvent("daemon_start").Add("daemon", getpid());
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
        const int64_t restarts = device::GetPropertyNumber(kRestartsKey) + 1;
        __system_property_set(kRestartsKey, std::to_string(restarts).c_str());
        host::TraceEvent("restart_pause").Add("ms", mPauseMs);
        if (mPauseMs == kMinRestartPauseMs * 2) {
            __android_log_print(ANDROID_LOG_ERROR, nullptr,
                                "corvane_daemon does not come up; trying again at growing pauses");
        }
    }

    void DaemonGone() {
        mDaemon = -1;
        Remove("dev/vndbinder");
        __system_property_set(device::kDaemonAliveKey, "false");
        __system_property_set(device::kDaemonBinderKey, "0");
        __system_property_set("odm.thp.is_updating_fw", "false");
    }

    pid_t mDaemon = -1;
    bool mIsEnabled = false;
    int mPauseMs = 0;  // before the next daemon runs; its process waits
};

// Signal handling, descriptors, session and folder as they are for no caller in particular.
bool LeaveCaller() {
    for (int each = 1; each < NSIG; ++each) {
        signal(each, SIG_DFL);
    }
    close_range(STDERR_FILENO + 1, ~0U, 0);
    setsid();
    umask(077);
    return chdir("/") == 0;
}

// Makes the signals that end this process or report its daemon readable.
int OpenSignals() {
    sigset_t signals;
    sigemptyset(&signals);
    for (const int each : {SIGCHLD, SIGINT, SIGTERM}) {
        sigaddset(&signals, each);
    }
    sigprocmask(SIG_SETMASK, &signals, nullptr);
    return signalfd(-1, &signals, SFD_CLOEXEC | SFD_NONBLOCK);
}

int OpenPropertyWatch() {
    const int watch = inotify_init1(IN_CLOEXEC | IN_NONBLOCK);
    const std::string folder = host::DeviceRootPath() + "/properties";
    constexpr uint32_t kEvents = IN_MOVED_TO | IN_DELETE_SELF | IN_MOVE_SELF;
    return inotify_add_watch(watch, folder.c_str(), kEvents) >= 0 ? watch : -1;
}

// Reports that the device is booted to the process that waits for it.
void ReportBoot() {
    [[maybe_unused]] const ssize_t written = write(STDOUT_FILENO, "\n", 1);
    const int null = open("/dev/null", O_RDWR | O_CLOEXEC);
    for (const int descriptor : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO}) {
        dup2(null, descriptor);
    }
}

}  // namespace

int main(int argc, char** argv) {
    if (argc != 2) {
        return Fail("usage", "init MODE");
    }
    if (!LeaveCaller() || host::DeviceRoot() < 0) {
        return 1;
    }
    if (!IsDeviceRoot()) {
        return Fail(host::DeviceRootPath().c_str(), "has files that are no device's; nothing done");
    }
    if (!LockDevice()) {
        return Fail("cannot lock init.lock", strerror(errno));
    }
    if (!Boot(argv[1])) {
        return Fail("cannot write to the device root", strerror(errno));
    }
    const int signals = OpenSignals();
    const int watch = OpenPropertyWatch();
    if (signals < 0 || watch < 0) {
        return Fail("cannot watch the properties", strerror(errno));
    }
    ReportBoot();
    DaemonMinder minder;
    minder.Restart(watch);
    pollfd waits[] = {{signals, POLLIN, 0}, {watch, POLLIN, 0}};
    signalfd_siginfo signal = {};
    do {
        poll(waits, std::size(waits), minder.Mind() ? -1 : kMinRestartPauseMs);
        host::LookForTrace();
        if (TakeWrites(watch)) {
            minder.Restart(watch);
        }
    } while ((read(signals, &signal, sizeof(signal)) < 0 || signal.ssi_signo == SIGCHLD) &&
             faccessat(host::DeviceRoot(), "properties", F_OK, 0) == 0);
    minder.Stop();
    Remove("tmp");
    return 0;
}
