// The virtual device for people and scripts: its life, and the ways into it. The kernel says who
// runs it: init holds a record lock, and asking for that lock's holder takes nothing.
#include <fcntl.h>
#include <poll.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <functional>
#include <string>
#include <thread>
#include <vector>

#include "common.h"
#include "faults.h"
#include "platform/device_root.h"

// The C library's header declares them without the C linkage that they have.
extern "C" {
#include <sys/pidfd.h>
}

namespace {

constexpr int kStopped = 3;
constexpr int kWrongUse = 2;
constexpr int kStartLimitMs = 10000;
constexpr int kStopLimitMs = 5000;
constexpr std::chrono::milliseconds kPollPause(5);

int Fail(const std::string& why) {
    fprintf(stderr, "device: %s\n", why.c_str());
    return 1;
}

void Say(const char* what) {
    fprintf(stderr, "device: %s in %s\n", what, host::DeviceRootPath().c_str());
}

bool WaitUntil(int limitMs, const std::function<bool()>& isDone) {
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::milliseconds(limitMs);
    while (!isDone()) {
        if (std::chrono::steady_clock::now() >= deadline) {
            return false;
        }
        std::this_thread::sleep_for(kPollPause);
    }
    return true;
}

// The process that runs the device, or 0.
pid_t FindInit() {
    const int file = openat(host::DeviceRoot(), device::kInitLock,
                            O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC);
    struct flock holder = {};
    holder.l_type = F_WRLCK;
    const bool isHeld = file >= 0 && fcntl(file, F_GETLK, &holder) == 0 &&
                        holder.l_type != F_UNLCK && holder.l_pid > 0;
    close(file);
    return isHeld ? holder.l_pid : 0;
}

// Whether the process runs another file than the one of that name beside this program. Not so for
// a process that has just ended.
bool RunsOtherFile(pid_t process, const char* name) {
    struct stat running = {};
    struct stat built = {};
    return stat(("/proc/" + std::to_string(process) + "/exe").c_str(), &running) == 0 &&
           stat(device::PathBesideProgram(name).c_str(), &built) == 0 &&
           (running.st_dev != built.st_dev || running.st_ino != built.st_ino);
}

// Whether init and its daemon, which is init itself for a moment, run what was built last.
bool IsCurrentBuild(pid_t init) {
    const std::string number = std::to_string(init);
    std::ifstream children("/proc/" + number + "/task/" + number + "/children");
    pid_t daemon = init;
    children >> daemon;
    return !RunsOtherFile(init, "init") &&
           (!RunsOtherFile(daemon, "corvane_daemon") || !RunsOtherFile(daemon, "init"));
}

// Asks the process to end, and ends it when it does not. The descriptor stands for this one process
// even when its number passes to another.
bool EndProcess(int process) {
    for (const int signal : {SIGTERM, SIGKILL}) {
        pollfd ended = {process, POLLIN, 0};
        if (pidfd_send_signal(process, signal, nullptr, 0) != 0 ||
            poll(&ended, 1, kStopLimitMs) > 0) {
            return true;
        }
    }
    return false;
}

int Stop() {
    const pid_t init = FindInit();
    if (init == 0) {
        return 0;
    }
    const int process = pidfd_open(init, 0);
    // Init may have ended before the descriptor was there, which is then somebody else's.
    const bool isInit = process >= 0 && FindInit() == init;
    const bool hasEnded = !isInit || EndProcess(process);
    close(process);
    if (!hasEnded) {
        return Fail("process " + std::to_string(init) + " does not end");
    }
    Say("stopped");
    return 0;
}

int AwaitDaemon() {
    const bool isUp = WaitUntil(kStartLimitMs, [] {
        return device::IsDaemonAlive() || FindInit() == 0 || !device::IsDaemonEnabled();
    });
    if (device::IsDaemonAlive() && FindInit() != 0) {
        return 0;
    }
    return Fail(FindInit() == 0 ? "init has ended"
                : isUp          ? "the daemon is stopped: odm.thp.service_enable is not 1"
                       : "the daemon is not alive yet; `device shell logcat -d` may say why");
}

// Starts init and waits until it has booted the device. What fails is said by init.
int Boot(const char* selinuxMode) {
    int report[2];
    if (pipe2(report, O_CLOEXEC) != 0) {
        return Fail(strerror(errno));
    }
    const pid_t init = fork();
    if (init == 0) {
        dup2(report[1], STDOUT_FILENO);
        const std::string program = device::PathBesideProgram("init");
        execl(program.c_str(), program.c_str(), selinuxMode, nullptr);
        Fail(program + ": " + strerror(errno));
        _exit(1);
    }
    close(report[1]);
    pollfd booted = {report[0], POLLIN, 0};
    char byte = 0;
    const bool isBooted =
            init > 0 && poll(&booted, 1, kStartLimitMs) > 0 && read(report[0], &byte, 1) == 1;
    close(report[0]);
    if (!isBooted) {
        return Fail("did not start");
    }
    Say("started");
    fprintf(stderr, "device: SELinux is %s\n", selinuxMode);
    return 0;
}

// Boots the device unless it runs already, from this build, and then leaves it as it is. Waits for
// a start in progress.
int Start(const char* selinuxMode) {
    const int root = openat(host::DeviceRoot(), ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (!WaitUntil(2 * kStartLimitMs, [root] { return flock(root, LOCK_EX | LOCK_NB) == 0; })) {
        return Fail("another start does not end");
    }
    const pid_t init = FindInit();
    if (init != 0 && IsCurrentBuild(init)) {
        close(root);
        return 0;
    }
    if (init != 0) {
        Say("another build runs");
        Stop();
    }
    int status = Boot(selinuxMode);
    status = status != 0 ? status : AwaitDaemon();
    close(root);
    return status;
}

int Status() {
    const pid_t init = FindInit();
    if (init == 0) {
        puts("stopped");
        return kStopped;
    }
    printf("running in %s, process %d%s\n", host::DeviceRootPath().c_str(), init,
           IsCurrentBuild(init) ? "" : ", from another build than this");
    printf("daemon alive: %s, binder: %s, SELinux: %s\n",
           device::GetProperty(device::kDaemonAliveKey).c_str(),
           device::GetProperty(device::kDaemonBinderKey).c_str(), device::SelinuxMode().c_str());
    return 0;
}

// Becomes a program that finds the device's commands and the tool before those of the machine.
int Become(const std::string& program, std::vector<const char*> arguments) {
    const char* const path = getenv("PATH");
    const std::string bin = device::PathBesideProgram("bin");
    setenv("PATH", (bin + ":" + (path != nullptr ? path : "/usr/bin:/bin")).c_str(), 1);
    setenv("TPD_DEVICE_ROOT", host::DeviceRootPath().c_str(), 1);
    arguments.push_back(nullptr);
    execv(program.c_str(), const_cast<char* const*>(arguments.data()));
    return Fail(program + ": " + strerror(errno));
}

// What `adb shell` is to a phone: the arguments, joined by spaces, are one shell command.
int Shell(int argc, char** argv) {
    std::string command;
    for (int i = 0; i < argc; ++i) {
        command += (i > 0 ? " " : "") + std::string(argv[i]);
    }
    if (argc == 0) {
        return Become("/bin/sh", {"sh"});
    }
    return Become("/bin/sh", {"sh", "-c", command.c_str()});
}

int BecomeBeside(const char* name, int argc, char** argv) {
    std::vector<const char*> arguments = {name};
    arguments.insert(arguments.end(), argv, argv + argc);
    return Become(device::PathBesideProgram(name), arguments);
}

int Usage() {
    fputs("usage: device start [--permissive]  boots it; 0 once its daemon is alive\n"
          "       device stop | status | root  status: 3 when it is stopped\n"
          "       device shell [COMMAND...]    as `adb shell`\n"
          "       device run [ARGUMENT...]     runs the tool; starts a stopped device, Permissive\n"
          "       device trace [--bytes] [--json | --mermaid] ARGUMENT...\n"
          "                                    runs the tool and shows what everybody did\n"
          "       device fault [NAME [ARGUMENT] [COUNT] | none]\n"
          "                                    gives the daemon a fault; alone: lists them\n",
          stderr);
    return kWrongUse;
}

}  // namespace

int main(int argc, char** argv) {
    const std::string verb = argc > 1 ? argv[1] : "";
    const int count = argc - 2;
    char** const arguments = argv + 2;
    const bool permissive = count == 1 && arguments[0] == std::string("--permissive");
    if (verb == "fault" && count == 0) {
        return device::FaultCommand(0, nullptr);
    }
    const bool isLone = verb == "stop" || verb == "status" || verb == "root";
    if (verb.empty() || (isLone && count > 0) || (verb == "start" && count > 0 && !permissive)) {
        return Usage();
    }
    if (host::DeviceRoot() < 0) {
        return 1;
    }
    if (verb == "start") {
        const int status = Start(permissive ? "Permissive" : "Enforcing");
        return status != 0 ? status : AwaitDaemon();
    }
    if (verb == "stop") {
        return Stop();
    }
    if (verb == "status") {
        return Status();
    }
    if (verb == "root") {
        puts(host::DeviceRootPath().c_str());
        return 0;
    }
    if (verb == "shell") {
        return Shell(count, arguments);
    }
    if (verb == "run") {
        const int status = Start("Permissive");
        return status != 0 ? status : BecomeBeside("bin/tpd", count, arguments);
    }
    if (verb != "trace" && verb != "fault") {
        return Usage();
    }
    if (FindInit() == 0) {
        return Fail("is stopped; `device start` boots it");
    }
    return verb == "trace" ? BecomeBeside("trace.py", count, arguments)
                           : device::FaultCommand(count, arguments);
}
