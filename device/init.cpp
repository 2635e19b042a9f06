// The part of the device's init that boots it and minds the touch daemon: starts and stops it as
// "odm.thp.service_enable" says, and starts it again, counting, when it dies on its own.
#include <dirent.h>
#include <fcntl.h>
#include <poll.h>
#include <sys/file.h>
#include <sys/inotify.h>
#include <sys/signalfd.h>
#include <sys/stat.h>
#include <sys/system_properties.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>

#include "platform/device_root.h"

namespace {

constexpr char kServiceEnableKey[] = "odm.thp.service_enable";
constexpr char kUpdatingFirmwareKey[] = "sim.updating_fw";
constexpr char kRestartsKey[] = "odm.thp.dae_reboot_times";
// A daemon that cannot live is not started at a rate that would eat the machine.
constexpr useconds_t kRestartPauseUs = 50000;
constexpr int kLockTries = 20;
constexpr useconds_t kLockPauseUs = 10000;

struct BootProperty {
    const char* key;
    const char* value;
};

constexpr BootProperty kBootProperties[] = {
        {"ro.build.display.id", "VIRTUAL-11.0"},
        {"ro.logsystem.usertype", "1"},
        {"odm.thp.ver_firmware", "virtual-1"},
        {"odm.thp.dae_alive", "false"},
        {"odm.thp.binder", "0"},
        {"odm.thp.dae_reboot_times", "0"},
        {"odm.thp.is_updating_fw", "false"},
        {"odm.thp.dae_bootflag", "true"},
        {"odm.thp.service_enable", "1"},
};

std::string PropertyText(const char* key) {
    char value[PROP_VALUE_MAX];
    __system_property_get(key, value);
    return value;
}

// Empties a folder of the device root, but for the files whose names begin with `kept`.
void ClearFolder(const char* folder, const char* kept) {
    mkdirat(host::DeviceRoot(), folder, 0700);
    const int descriptor =
            openat(host::DeviceRoot(), folder, O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
    DIR* const files = descriptor >= 0 ? fdopendir(descriptor) : nullptr;
    if (files == nullptr) {
        return;
    }
    while (const dirent* const file = readdir(files)) {
        if (file->d_name[0] != '.' &&
            (kept == nullptr || strncmp(file->d_name, kept, strlen(kept)) != 0)) {
            unlinkat(dirfd(files), file->d_name, 0);
        }
    }
    closedir(files);
}

bool WriteFile(const char* name, const std::string& text) {
    const int file = openat(host::DeviceRoot(), name,
                            O_WRONLY | O_CREAT | O_TRUNC | O_NOFOLLOW | O_CLOEXEC, 0600);
    if (file < 0) {
        return false;
    }
    const bool written = write(file, text.data(), text.size()) == static_cast<ssize_t>(text.size());
    close(file);
    return written;
}

void ClearLeftovers() {
    ClearFolder("tmp", nullptr);
    mkdirat(host::DeviceRoot(), "dev", 0700);
    ClearFolder("dev/vndbinder", nullptr);
}

// The state of a device that has just been switched on: what persists, and the boot properties.
bool Boot() {
    ClearLeftovers();
    ClearFolder("properties", "persist.");
    for (const BootProperty& property : kBootProperties) {
        if (__system_property_set(property.key, property.value) != 0) {
            return false;
        }
    }
    return WriteFile("log", "") && WriteFile("selinux", "Enforcing\n");
}

class DaemonMinder {
  public:
    explicit DaemonMinder(std::string program) : mProgram(std::move(program)) {}

    void Start() {
        if (mDaemon > 0) {
            return;
        }
        mDaemon = fork();
        if (mDaemon == 0) {
            sigset_t none;
            sigemptyset(&none);
            sigprocmask(SIG_SETMASK, &none, nullptr);
            execl(mProgram.c_str(), mProgram.c_str(), nullptr);
            fprintf(stderr, "init: %s: %s\n", mProgram.c_str(), strerror(errno));
            _exit(127);
        }
    }

    void Stop() {
        if (mDaemon > 0) {
            kill(mDaemon, SIGKILL);
            waitpid(mDaemon, nullptr, 0);
            Gone();
        }
    }

    // After any change of the enabling property. Each change but the last may have been overtaken
    // by the next before it was read: "1" for a running daemon means that a "0" was.
    void FollowServiceEnable() {
        struct stat status = {};
        const std::string path = std::string("properties/") + kServiceEnableKey;
        if (fstatat(host::DeviceRoot(), path.c_str(), &status, 0) != 0 ||
            (status.st_ino == mSeenInode && status.st_ctim.tv_sec == mSeenTime.tv_sec &&
             status.st_ctim.tv_nsec == mSeenTime.tv_nsec)) {
            return;
        }
        mSeenInode = status.st_ino;
        mSeenTime = status.st_ctim;
        Restart();
    }

    void Restart() {
        Stop();
        if (IsEnabled()) {
            Start();
        }
    }

    void ReapDaemon() {
        if (mDaemon > 0 && waitpid(mDaemon, nullptr, WNOHANG) == mDaemon) {
            Gone();
            const long restarts = strtol(PropertyText(kRestartsKey).c_str(), nullptr, 10);
            __system_property_set(kRestartsKey, std::to_string(restarts + 1).c_str());
            if (IsEnabled()) {
                usleep(kRestartPauseUs);
                Start();
            }
        }
    }

  private:
    static bool IsEnabled() {
        const std::string enable = PropertyText(kServiceEnableKey);
        return enable == "1" || enable == "true";
    }

    void Gone() {
        mDaemon = -1;
        ClearFolder("dev/vndbinder", nullptr);
        __system_property_set("odm.thp.dae_alive", "false");
        __system_property_set("odm.thp.binder", "0");
        __system_property_set("odm.thp.is_updating_fw", "false");
    }

    const std::string mProgram;
    pid_t mDaemon = -1;
    ino_t mSeenInode = 0;
    timespec mSeenTime = {};
};

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
        if (overflow || strcmp(event->name, kServiceEnableKey) == 0) {
            minder.FollowServiceEnable();
        } else if (strcmp(event->name, kUpdatingFirmwareKey) == 0 &&
                   PropertyText(kUpdatingFirmwareKey) == "true") {
            minder.Restart();
        }
    }
    return true;
}

int Fail(const char* what) {
    fprintf(stderr, "init: %s: %s\n", what, strerror(errno));
    return 1;
}

// Whether this process is the device's one init; its number is then in the locked file. Somebody
// who only asks whether the device runs holds the lock for a moment.
bool LockDevice() {
    const int file =
            openat(host::DeviceRoot(), "init.pid", O_RDWR | O_CREAT | O_NOFOLLOW | O_CLOEXEC, 0600);
    for (int tries = 0; tries < kLockTries; ++tries) {
        if (flock(file, LOCK_EX | LOCK_NB) == 0) {
            return ftruncate(file, 0) == 0 && dprintf(file, "%d\n", getpid()) > 0;
        }
        usleep(kLockPauseUs);
    }
    return false;
}

std::string ProgramBesideThisOne(const char* name) {
    char path[4096];
    const ssize_t length = readlink("/proc/self/exe", path, sizeof(path) - 1);
    const std::string self(path, length > 0 ? static_cast<size_t>(length) : 0);
    return self.substr(0, self.rfind('/') + 1) + name;
}

}  // namespace

// Runs until it is told to end (SIGTERM, SIGINT) or its device root goes away.
int main() {
    if (host::DeviceRoot() < 0) {
        return 1;
    }
    if (!LockDevice()) {
        return Fail("this device runs already");
    }

    sigset_t signals;
    sigemptyset(&signals);
    for (const int each : {SIGCHLD, SIGTERM, SIGINT}) {
        sigaddset(&signals, each);
    }
    sigprocmask(SIG_BLOCK, &signals, nullptr);
    const int signalled = signalfd(-1, &signals, SFD_CLOEXEC);
    if (!Boot()) {
        return Fail("cannot write to the device root");
    }
    const int watch = inotify_init1(IN_CLOEXEC);
    const std::string folder = host::DeviceRootPath() + "/properties";
    if (signalled < 0 || watch < 0 ||
        inotify_add_watch(watch, folder.c_str(), IN_MOVED_TO | IN_DELETE_SELF | IN_MOVE_SELF) < 0) {
        return Fail("cannot watch the properties");
    }

    DaemonMinder minder(ProgramBesideThisOne("corvane_daemon"));
    minder.FollowServiceEnable();
    pollfd waits[] = {{signalled, POLLIN, 0}, {watch, POLLIN, 0}};
    for (bool running = true; running;) {
        if (poll(waits, 2, -1) < 0) {
            continue;
        }
        if (waits[0].revents != 0) {
            signalfd_siginfo signal = {};
            running = read(signalled, &signal, sizeof(signal)) == sizeof(signal) &&
                      signal.ssi_signo == SIGCHLD;
            minder.ReapDaemon();
        }
        if (running && waits[1].revents != 0) {
            running = HandlePropertyEvents(watch, minder);
        }
    }
    minder.Stop();
    ClearLeftovers();
    return 0;
}
