// The part of the device's init that boots it and minds the touch daemon: starts and stops it as
// "odm.thp.service_enable" says, and starts it again, counting, when it ends on its own.
//
// init [Permissive]: boots the device root, with SELinux Enforcing unless told otherwise. One byte
// on standard output says that the device is booted; what fails before is said on standard error.
// Ends on SIGTERM or SIGINT, or when the device root goes away.
#include <android/log.h>
#include <fcntl.h>
#include <poll.h>
#include <sys/inotify.h>
#include <sys/prctl.h>
#include <sys/signalfd.h>
#include <sys/stat.h>
#include <sys/system_properties.h>
#include <sys/time.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <set>
#include <string>
#include <tuple>

#include "common.h"
#include "platform/device_root.h"
#include "platform/files.h"
#include "platform/log_entry.h"
#include "platform/trace.h"

namespace {

constexpr char kUpdatingFirmwareKey[] = "sim.updating_fw";
constexpr char kRestartsKey[] = "odm.thp.dae_reboot_times";
// A daemon that was alive is back soon; the pause doubles for one that ends before it is.
constexpr long kMinRestartPauseMs = 50;
constexpr long kMaxRestartPauseMs = 5000;

constexpr struct {
    const char* key;
    const char* value;
} kBootProperties[] = {
        {"ro.build.display.id", "VIRTUAL-11.0"}, {"ro.logsystem.usertype", "1"},
        {"odm.thp.ver_firmware", "virtual-1"},   {device::kDaemonAliveKey, "false"},
        {device::kDaemonBinderKey, "0"},         {kRestartsKey, "0"},
        {"odm.thp.is_updating_fw", "false"},     {"odm.thp.dae_bootflag", "true"},
        {device::kServiceEnableKey, "1"},
};

// Empties a folder of the device root, but for the files whose names begin with `kept`.
void ClearFolder(const std::string& folder, const char* kept = nullptr) {
    host::MakeFolders(host::DeviceRoot(), folder);
    for (const std::string& name : device::FilesIn(folder)) {
        if (kept == nullptr || name.rfind(kept, 0) != 0) {
            unlinkat(host::DeviceRoot(), std::string(folder).append("/").append(name).c_str(), 0);
        }
    }
}

void ClearLeftovers() {
    ClearFolder("tmp");
    ClearFolder("dev/vndbinder");
}

// Whether a boot, which empties folders, destroys nothing of anybody else's: the folder was booted
// before, is empty, or has only what earlier versions, the tool and the device's commands make in a
// root. Some of these names say little: alone, they do not make a device.
bool IsDeviceRoot() {
    const std::set<std::string> files = device::FilesIn(".");
    const std::set<std::string> common = {"dev", "log", "tmp"};
    std::set<std::string> own = {"init.pid", "proc", "properties", "selinux", "settings", "trace"};
    own.insert(common.begin(), common.end());
    const auto areAmong = [&files](const std::set<std::string>& names) {
        return std::includes(names.begin(), names.end(), files.begin(), files.end());
    };
    return files.empty() || files.count(device::kInitLock) > 0 ||
           (areAmong(own) && !areAmong(common));
}

// The state of a device that has just been switched on: what persists, and the boot properties.
bool Boot(const std::string& selinuxMode) {
    const host::TraceEvent event("boot");
    ClearLeftovers();
    ClearFolder("properties", "persist.");
    for (const auto& property : kBootProperties) {
        if (__system_property_set(property.key, property.value) != 0) {
            return false;
        }
    }
    return host::WriteFile(host::kLogFile, "") && host::ReplaceFile("selinux", selinuxMode + "\n");
}

class DaemonMinder {
  public:
    void Start() {
        if (mDaemon > 0 || !device::IsDaemonEnabled()) {
            return;
        }
        const pid_t init = getpid();
        mDaemon = fork();
        if (mDaemon == 0) {
            RunDaemon(init);
        } else if (mDaemon < 0) {
            PlanStart();
        } else {
            host::TraceEvent("daemon_start").Add("daemon", mDaemon);
        }
    }

    void Stop() {
        if (mDaemon > 0) {
            host::TraceEvent("daemon_stop").Add("daemon", mDaemon);
            kill(mDaemon, SIGKILL);
            waitpid(mDaemon, nullptr, 0);
            DaemonGone();
        }
    }

    // What changed until the daemon has ended is followed with this.
    void Restart() {
        Stop();
        mPauseMs = kMinRestartPauseMs;
        mFollowed = EnablingWrite();
        Start();
    }

    // After each write of the enabling property that was not followed yet. Each but the last may
    // have been overtaken by the next: "1" for a running daemon means that a "0" was.
    void FollowServiceEnable() {
        if (EnablingWrite() != mFollowed) {
            Restart();
        }
    }

    void ReapDaemon() {
        int status = 0;
        if (mDaemon <= 0 || waitpid(mDaemon, &status, WNOHANG) != mDaemon) {
            return;
        }
        host::TraceEvent("daemon_exit")
                .Add("daemon", mDaemon)
                .Add(WIFSIGNALED(status) ? "signal" : "status",
                     WIFSIGNALED(status) ? WTERMSIG(status) : WEXITSTATUS(status));
        if (device::IsDaemonAlive()) {
            mPauseMs = kMinRestartPauseMs;
        }
        DaemonGone();
        const int64_t restarts = device::GetPropertyNumber(kRestartsKey) + 1;
        __system_property_set(kRestartsKey, std::to_string(restarts).c_str());
        PlanStart();
    }

  private:
    // The file and its time: of no two writes the same.
    using Write = std::tuple<ino_t, time_t, int64_t>;

    static Write EnablingWrite() {
        struct stat status = {};
        const std::string path = std::string("properties/") + device::kServiceEnableKey;
        fstatat(host::DeviceRoot(), path.c_str(), &status, AT_SYMLINK_NOFOLLOW);
        return {status.st_ino, status.st_ctim.tv_sec, status.st_ctim.tv_nsec};
    }

    // Whatever becomes of init, its daemon goes with it: also when init is gone before this begins.
    [[noreturn]] static void RunDaemon(pid_t init) {
        prctl(PR_SET_PDEATHSIG, SIGKILL);
        if (getppid() == init) {
            sigset_t none;
            sigemptyset(&none);
            sigprocmask(SIG_SETMASK, &none, nullptr);
            const std::string program = device::PathBesideProgram("corvane_daemon");
            execl(program.c_str(), program.c_str(), nullptr);
        }
        _exit(127);
    }

    // SIGALRM comes after the pause.
    void PlanStart() {
        if (mPauseMs == kMinRestartPauseMs * 2) {
            __android_log_print(ANDROID_LOG_ERROR, nullptr,
                                "corvane_daemon does not come up; trying again at growing pauses");
        }
        host::TraceEvent("restart_pause").Add("ms", mPauseMs);
        const itimerval pause = {{0, 0}, {mPauseMs / 1000, mPauseMs % 1000 * 1000}};
        setitimer(ITIMER_REAL, &pause, nullptr);
        mPauseMs = std::min(mPauseMs * 2, kMaxRestartPauseMs);
    }

    void DaemonGone() {
        mDaemon = -1;
        ClearFolder("dev/vndbinder");
        __system_property_set(device::kDaemonAliveKey, "false");
        __system_property_set(device::kDaemonBinderKey, "0");
        __system_property_set("odm.thp.is_updating_fw", "false");
    }

    pid_t mDaemon = -1;
    long mPauseMs = kMinRestartPauseMs;  // before the next start
    Write mFollowed;
};

// Whether init goes on.
bool HandleSignal(int signals, DaemonMinder& minder) {
    signalfd_siginfo signal = {};
    const bool isRead = read(signals, &signal, sizeof(signal)) == sizeof(signal);
    if (isRead && signal.ssi_signo == SIGALRM) {
        minder.Start();
    }
    minder.ReapDaemon();
    return isRead && (signal.ssi_signo == SIGALRM || signal.ssi_signo == SIGCHLD);
}

// Whether the folder of properties is still there after these events.
bool HandlePropertyEvents(int watch, DaemonMinder& minder) {
    alignas(inotify_event) char events[16384];
    const ssize_t size = read(watch, events, sizeof(events));
    for (ssize_t at = 0; at < size;) {
        const auto* const event = reinterpret_cast<const inotify_event*>(events + at);
        at += static_cast<ssize_t>(sizeof(inotify_event) + event->len);
        if ((event->mask & (IN_IGNORED | IN_DELETE_SELF | IN_MOVE_SELF)) != 0) {
            return false;
        }
        const bool overflow = (event->mask & IN_Q_OVERFLOW) != 0;
        if (overflow || strcmp(event->name, device::kServiceEnableKey) == 0) {
            minder.FollowServiceEnable();
        } else if (strcmp(event->name, kUpdatingFirmwareKey) == 0 &&
                   device::GetProperty(kUpdatingFirmwareKey) == "true") {
            minder.Restart();
        }
    }
    return true;
}

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

// Makes this process the device's one init. The kernel ends a record lock when the process closes
// any descriptor of the file: nothing else may open it here.
bool LockDevice() {
    const int file = openat(host::DeviceRoot(), device::kInitLock,
                            O_RDWR | O_CREAT | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC, 0600);
    struct flock whole = {};
    whole.l_type = F_WRLCK;
    return file >= 0 && fcntl(file, F_SETLK, &whole) == 0;
}

// Signals that end this process or tell of its daemon become readable.
int OpenSignals() {
    sigset_t signals;
    sigemptyset(&signals);
    for (const int each : {SIGALRM, SIGCHLD, SIGINT, SIGTERM}) {
        sigaddset(&signals, each);
    }
    sigprocmask(SIG_SETMASK, &signals, nullptr);
    return signalfd(-1, &signals, SFD_CLOEXEC);
}

int OpenPropertyWatch() {
    const int watch = inotify_init1(IN_CLOEXEC);
    const std::string folder = host::DeviceRootPath() + "/properties";
    constexpr uint32_t kEvents = IN_MOVED_TO | IN_DELETE_SELF | IN_MOVE_SELF;
    return inotify_add_watch(watch, folder.c_str(), kEvents) >= 0 ? watch : -1;
}

// Tells that the device is booted and lets go of whoever waits for that.
void ReportBoot() {
    [[maybe_unused]] const ssize_t written = write(STDOUT_FILENO, "\n", 1);
    const int null = open("/dev/null", O_RDWR | O_CLOEXEC);
    for (const int descriptor : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO}) {
        dup2(null, descriptor);
    }
}

int Fail(const char* what, const char* why) {
    fprintf(stderr, "init: %s: %s\n", what, why);
    return 1;
}

}  // namespace

int main(int argc, char** argv) {
    if (!LeaveCaller() || host::DeviceRoot() < 0) {
        return 1;
    }
    if (!IsDeviceRoot()) {
        return Fail(host::DeviceRootPath().c_str(), "has files that are no device's; nothing done");
    }
    if (!LockDevice()) {
        return Fail("this device runs already", strerror(errno));
    }
    const int signals = OpenSignals();
    if (!Boot(argc > 1 ? argv[1] : "Enforcing")) {
        return Fail("cannot write to the device root", strerror(errno));
    }
    const int watch = OpenPropertyWatch();
    if (signals < 0 || watch < 0) {
        return Fail("cannot watch the properties", strerror(errno));
    }
    ReportBoot();
    DaemonMinder minder;
    minder.Restart();
    pollfd waits[] = {{signals, POLLIN, 0}, {watch, POLLIN, 0}};
    for (bool running = true; running;) {
        if (poll(waits, std::size(waits), -1) > 0) {
            host::LookForTrace();
            running = (waits[0].revents == 0 || HandleSignal(signals, minder)) &&
                      (waits[1].revents == 0 || HandlePropertyEvents(watch, minder));
        }
    }
    minder.Stop();
    ClearLeftovers();
    return 0;
}
