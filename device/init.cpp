// The device's init: boots the device and runs its services. The property
// "odm.thp.service_enable" starts and stops the touch daemon, as ctl.start, ctl.stop and
// ctl.restart do with the name of any service.
//
// init MODE: boots the device with SELinux in MODE. Prints errors to standard error until the
// device has booted. Exits on SIGTERM or SIGINT, or when the mark is removed.
#include <android/log.h>
#include <fcntl.h>
#include <poll.h>
#include <sys/inotify.h>
#include <sys/signalfd.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/system_properties.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <cstdio>
#include <string>
#include <string_view>
#include <vector>

#include "life.h"
#include "messages.h"
#include "platform/device_root.h"
#include "platform/events.h"
#include "platform/files.h"
#include "platform/libbinder/vndbinder.h"
#include "platform/libc/properties.h"
#include "platform/unique_fd.h"
#include "properties.h"
#include "service.h"

namespace {

using device::Service;
using host::UniqueFd;

constexpr char kDriverDirectory[] = "dev/vndbinder";

constexpr const char* kBootProperties[][2] = {{"ro.build.display.id", "VIRTUAL-11.0"},
                                              {"ro.build.version.release", "11"},
                                              {"ro.build.version.sdk", "30"},
                                              {"ro.debuggable", "1"},
                                              {"ro.logsystem.usertype", "1"},
                                              {"ro.product.cpu.abi", "arm64-v8a"},
                                              {"ro.product.device", "virtual"},
                                              {"ro.product.manufacturer", "virtual"},
                                              {"ro.product.model", "virtual"},
                                              {"ro.product.name", "virtual"},
                                              {"ro.serialno", "virtual"},
                                              {"odm.thp.ver_firmware", "virtual-1"},
                                              {"odm.thp.dae_bootflag", "true"},
                                              {device::kDaemonAliveKey, "false"},
                                              {device::kDaemonBinderKey, "0"},
                                              {device::kRestartCountKey, "0"},
                                              {device::kIsUpdatingFirmwareKey, "false"},
                                              {device::kServiceEnableKey, "1"}};

// Deletes the files in a directory, except those whose names begin with `keptPrefix`, if any.
// Creates a missing directory. Returns false if the directory cannot be opened.
bool DeleteFiles(const std::string& path, const char* keptPrefix = nullptr) {
    host::MakeParents(path + "/");
    if (!host::OpenFile(path, O_RDONLY | O_DIRECTORY).ok()) {
        return false;  // for example, a symbolic link
    }
    for (const std::string& name : host::FilesIn(path)) {
        if (keptPrefix == nullptr || name.rfind(keptPrefix, 0) != 0) {
            host::RemoveFile(std::string(path).append("/").append(name));
        }
    }
    return true;
}

// Returns a descriptor of the mark, which stays open: closing any descriptor of the file would
// release the record locks.
int Mark() {
    static const int mark = host::OpenFile(host::kMarkFile, O_RDWR).release();
    return mark;
}

// Locks or unlocks (F_WRLCK, F_UNLCK) a byte of the mark.
bool SetLock(device::InitLock byte, short type) {
    struct flock lock = {};
    lock.l_type = type;
    lock.l_start = static_cast<off_t>(byte);
    lock.l_len = 1;
    return Mark() >= 0 && fcntl(Mark(), F_SETLK, &lock) == 0;
}

// Writes the files directly: another process may have just set a "ro." property, which
// __system_property_set() would not replace.
bool SetBootProperties() {
    return std::all_of(std::begin(kBootProperties), std::end(kBootProperties),
                       [](const auto& property) {
                           return host::ReplaceFile(host::PropertyFile(property[0]), property[1]);
                       });
}

// Resets the device's files to their state at power-on. Returns null, or the path that could not be
// reset.
const char* Boot(const char* selinuxMode) {
    const host::Event event("boot");
    if (!DeleteFiles(host::kTemporaryDirectory)) {
        return host::kTemporaryDirectory;
    }
    if (!DeleteFiles(kDriverDirectory)) {
        return kDriverDirectory;
    }
    if (!DeleteFiles(host::kPropertiesDirectory, "persist.") || !SetBootProperties()) {
        return host::kPropertiesDirectory;
    }
    if (!host::OpenFile(host::kLogFile, O_WRONLY | O_CREAT | O_TRUNC).ok()) {
        return host::kLogFile;
    }
    return host::ReplaceFile(host::kSelinuxFile, selinuxMode) ? nullptr : host::kSelinuxFile;
}

bool IsRequest(const std::string& property) {
    return property == device::kServiceEnableKey || property == device::kUpdatingFirmwareKey ||
           property == device::kPowerControlKey || property.rfind(device::kControlPrefix, 0) == 0;
}

// Returns the properties that init acts on and that were written since the last call, in order.
std::vector<std::string> ReadRequests(const UniqueFd& watch) {
    alignas(inotify_event) char events[16384];
    const ssize_t size = read(watch.get(), events, sizeof(events));
    std::vector<std::string> requests;
    for (ssize_t at = 0; at < size;) {
        const auto* const event = reinterpret_cast<const inotify_event*>(events + at);
        at += static_cast<ssize_t>(sizeof(inotify_event) + event->len);
        const bool isLost = (event->mask & IN_Q_OVERFLOW) != 0;
        const std::string name = isLost           ? device::kServiceEnableKey
                                 : event->len > 0 ? event->name
                                                  : "";
        if (IsRequest(name)) {
            requests.push_back(name);
        }
    }
    return requests;
}

void OnDaemonExit(bool isCrash) {
    DeleteFiles(kDriverDirectory);
    __system_property_set(device::kDaemonAliveKey, "false");
    __system_property_set(device::kDaemonBinderKey, "0");
    __system_property_set(device::kIsUpdatingFirmwareKey, "false");
    if (isCrash) {
        const int64_t restarts = device::GetPropertyNumber(device::kRestartCountKey);
        const int64_t next = std::clamp<int64_t>(restarts, 0, INT32_MAX - 1) + 1;
        __system_property_set(device::kRestartCountKey, std::to_string(next).c_str());
    }
}

constexpr Service::Program kDaemon = {"corvane_daemon", "corvane_daemon", device::IsDaemonAlive,
                                      OnDaemonExit};

bool IsAdbdUp() { return !device::GetProperty(device::kAdbPortKey).empty(); }

void OnAdbdExit(bool /* isCrash */) { __system_property_set(device::kAdbPortKey, ""); }

void OnAdbServerExit(bool /* isCrash */) {}

constexpr Service::Program kAdbd = {"adbd", "adbd.py", IsAdbdUp, OnAdbdExit};
constexpr Service::Program kAdbServer = {"adb_server", "adb_server", IsAdbdUp, OnAdbServerExit};

// Ends an adb server in the device root that adb started in the absence of the service.
void StopAdbServer() {
    constexpr std::string_view kRequest = "0009host:kill";
    const sockaddr_un address = host::AddressOf("adb.sock");
    const UniqueFd server(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
    if (connect(server.get(), reinterpret_cast<const sockaddr*>(&address), sizeof(address)) == 0) {
        send(server.get(), kRequest.data(), kRequest.size(), MSG_NOSIGNAL);
    }
}

class Services {
  public:
    // Starts the services of a device that has just booted.
    void Start() {
        for (const Service* const service : mAll) {
            service->PublishState();
        }
        FollowServiceEnable();
        if (device::GetProperty(device::kUsbConfigKey) == "adb") {
            mAdbServer.Start();
            mAdbd.Start();
        }
    }

    // Stops the services, except the adb server, which survives the reboot of a phone.
    void StopForReboot() {
        mDaemon.Stop();
        mAdbd.Stop();
    }

    void Stop() {
        StopForReboot();
        mAdbServer.Stop();
        StopAdbServer();
    }

    // Carries out the requests, including those that arrive in the meantime. Returns true if one of
    // them is to reboot.
    bool Obey(const UniqueFd& watch) {
        bool isRebootRequested = false;
        std::vector<std::string> requests = ReadRequests(watch);
        for (; !requests.empty(); requests = ReadRequests(watch)) {
            for (const std::string& request : requests) {
                if (request == device::kPowerControlKey) {
                    isRebootRequested |= device::GetProperty(request) == "reboot";
                } else if (request.rfind(device::kControlPrefix, 0) == 0) {
                    Control(request);
                } else {
                    FollowServiceEnable();
                }
            }
        }
        return isRebootRequested;
    }

    // Reaps and starts processes. Returns the time in milliseconds until the next start, or -1.
    int Supervise() {
        int untilNextStartMs = -1;
        for (Service* const service : mAll) {
            service->Reap();
            const int ms = service->StartIfDue();
            const bool isSooner = untilNextStartMs < 0 || ms < untilNextStartMs;
            untilNextStartMs = ms >= 0 && isSooner ? ms : untilNextStartMs;
        }
        return untilNextStartMs;
    }

  private:
    // Also restarts a running daemon: if "0" and "1" are written in quick succession, init reads
    // only "1".
    void FollowServiceEnable() {
        const std::string enable = device::GetProperty(device::kServiceEnableKey);
        if (enable == "1" || enable == "true") {
            mDaemon.Restart();
        } else {
            mDaemon.Stop();
        }
    }

    // Carries out a request, for example ctl.start$corvane_daemon, and removes it.
    void Control(const std::string& request) {
        const std::string verb = request.substr(0, request.find('$'));
        for (Service* const service : mAll) {
            if (request != verb + "$" + service->name()) {
                continue;
            }
            if (verb == "ctl.start") {
                service->Start();
            } else if (verb == "ctl.stop") {
                service->Stop();
            } else if (verb == "ctl.restart") {
                service->Restart();
            }
        }
        host::RemoveFile(host::PropertyFile(request));
    }

    Service mDaemon{kDaemon};
    Service mAdbd{kAdbd};
    Service mAdbServer{kAdbServer};
    Service* const mAll[3] = {&mDaemon, &mAdbd, &mAdbServer};
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

// Returns an inotify descriptor for writes to properties and the removal of the mark.
UniqueFd OpenWatch() {
    UniqueFd watch(inotify_init1(IN_CLOEXEC | IN_NONBLOCK));
    const auto add = [&watch](const char* directory, uint32_t events) {
        const std::string path = host::AbsolutePath(directory);
        return inotify_add_watch(watch.get(), path.c_str(), events) >= 0;
    };
    const bool isWatching = watch.ok() && add(host::kPropertiesDirectory, IN_MOVED_TO) &&
                            add(".", IN_MOVED_FROM | IN_DELETE);
    return isWatching ? std::move(watch) : UniqueFd();
}

bool ExitRequested(const UniqueFd& signals) {
    signalfd_siginfo signal = {};
    const bool isSignaled = read(signals.get(), &signal, sizeof(signal)) == sizeof(signal);
    return isSignaled && signal.ssi_signo != SIGCHLD;
}

// Returns true if the name in the device root still refers to the open file.
bool IsInPlace(int file, const char* name) {
    struct stat opened = {};
    struct stat found = {};
    return fstat(file, &opened) == 0 &&
           fstatat(host::DeviceRoot(), name, &found, AT_SYMLINK_NOFOLLOW) == 0 &&
           opened.st_ino == found.st_ino;
}

bool OwnsDevice() { return IsInPlace(Mark(), host::kMarkFile); }

void ReleaseStreams() {
    const UniqueFd null(open("/dev/null", O_RDWR | O_CLOEXEC));
    for (const int stream : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO}) {
        dup2(null.get(), stream);
    }
}

// Runs the services until init is told to exit, or a reboot fails.
void RunServices(const UniqueFd& signals, const UniqueFd& watch) {
    const UniqueFd properties = host::OpenFile(host::kPropertiesDirectory, O_RDONLY);
    Services services;
    services.Start();
    SetLock(device::InitLock::kBooted, F_WRLCK);
    const char* unwritable = nullptr;
    do {
        host::UpdateTracing();
        if (services.Obey(watch)) {
            SetLock(device::InitLock::kBooted, F_UNLCK);
            services.StopForReboot();
            unwritable = Boot("Enforcing");
            services.Start();
            SetLock(device::InitLock::kBooted, F_WRLCK);
        }
        const int untilNextStartMs = services.Supervise();
        const bool isBootCompleted = !device::GetProperty(device::kBootCompletedKey).empty();
        if (!isBootCompleted && device::IsDaemonAlive()) {
            __system_property_set(device::kBootCompletedKey, "1");
        }
        pollfd waits[] = {{signals.get(), POLLIN, 0}, {watch.get(), POLLIN, 0}};
        poll(waits, std::size(waits), untilNextStartMs);
    } while (unwritable == nullptr && !ExitRequested(signals) && OwnsDevice() &&
             IsInPlace(properties.get(), host::kPropertiesDirectory));
    SetLock(device::InitLock::kBooted, F_UNLCK);
    if (OwnsDevice()) {
        services.Stop();
        DeleteFiles(host::kTemporaryDirectory);
    }
}

}  // namespace

int main(int argc, char** argv) {
    if (argc != 2) {
        fputs("usage: init MODE\n", stderr);
        return device::kUsageError;
    }
    if (!Daemonize()) {
        return device::FailForErrno("cannot change to /");
    }
    if (host::DeviceRoot() < 0) {
        return device::kFailure;
    }
    if (!SetLock(device::InitLock::kRunning, F_WRLCK)) {
        const bool isRunning = errno == EAGAIN || errno == EACCES;
        return isRunning ? device::kExitAlreadyRunning
                         : device::FailForErrno(std::string("cannot lock ") + host::kMarkFile);
    }
    if (const char* const path = Boot(argv[1]); path != nullptr) {
        return device::FailForErrno(path);
    }
    const UniqueFd signals = OpenSignals();
    const UniqueFd watch = OpenWatch();
    if (!signals.ok() || !watch.ok()) {
        return device::FailForErrno("cannot watch the properties");
    }
    ReleaseStreams();
    RunServices(signals, watch);
    return 0;
}
