// The virtual device for people and scripts: starts, stops and enters it. The kernel knows which
// process runs it: init holds a record lock, and to ask for the holder takes no lock.
#include <fcntl.h>
#include <limits.h>
#include <poll.h>
#include <sys/file.h>
#include <sys/system_properties.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
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

constexpr char kUsage[] =
        "usage: device start [--permissive]  boots it, SELinux Enforcing without the option;\n"
        "                                    status 0 once its daemon is alive\n"
        "       device stop | status | root  status 3 when it is stopped\n"
        "       device shell [COMMAND...]    as `adb shell`\n"
        "       device run [ARGUMENT...]     runs the tool; starts a stopped device, Permissive\n"
        "       device trace [--bytes] [--json | --mermaid] ARGUMENT...\n"
        "                                    runs the tool and shows what all processes did\n"
        "       device fault [NAME [ARGUMENT] [COUNT] | none]\n"
        "                                    gives the daemon a fault; alone: lists them\n";

int Usage() {
    fputs(kUsage, stderr);
    return kWrongUse;
}

int Fail(const std::string& why) {
    fprintf(stderr, "device: %s\n", why.c_str());
    return 1;
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

// What the process runs; empty when it has ended. The name of a replaced file grows by a word.
std::filesystem::path ProgramOf(pid_t process) {
    std::error_code error;
    return std::filesystem::read_symlink("/proc/" + std::to_string(process) + "/exe", error);
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
    // Another program may hold a lock, too.
    const bool isInit = isHeld && ProgramOf(holder.l_pid).filename().string().rfind("init", 0) == 0;
    return isInit ? holder.l_pid : 0;
}

// Whether the process, unless it has just ended, runs the init that was built last.
bool IsCurrentBuild(pid_t init) {
    const std::filesystem::path program = ProgramOf(init);
    return program.empty() || program == device::PathBesideProgram("init");
}

// Asks init to end, and ends it when it does not. The descriptor stands for this one process even
// when its number passes to another.
int Stop(int, char**) {
    const pid_t init = FindInit();
    const int process = init != 0 ? pidfd_open(init, 0) : -1;
    // Init may have ended before the descriptor was there, which then belongs to another process.
    if (process < 0 || FindInit() != init) {
        close(process);
        return 0;
    }
    pollfd ended = {process, POLLIN, 0};
    pidfd_send_signal(process, SIGTERM, nullptr, 0);
    if (poll(&ended, 1, kStopLimitMs) == 0) {
        pidfd_send_signal(process, SIGKILL, nullptr, 0);
        poll(&ended, 1, kStopLimitMs);
    }
    close(process);
    if (ended.revents == 0) {
        return Fail("process " + std::to_string(init) + " does not end");
    }
    fputs("device: stopped\n", stderr);
    return 0;
}

int AwaitDaemon() {
    WaitUntil(kStartLimitMs, [] {
        return device::IsDaemonAlive() || !device::IsDaemonEnabled() || FindInit() == 0;
    });
    return FindInit() != 0 && device::IsDaemonAlive()
                   ? 0
                   : Fail("the daemon is not alive; `device shell logcat -d` may say why, "
                          "`device shell tpd start` starts one that was stopped");
}

// Starts init and waits until it has booted the device. Init reports what fails there.
int Boot(const char* selinuxMode) {
    int report[2];
    if (pipe2(report, O_CLOEXEC) != 0) {
        return Fail(strerror(errno));
    }
    const std::string program = device::PathBesideProgram("init");
    if (fork() == 0) {
        dup2(report[1], STDOUT_FILENO);
        execl(program.c_str(), program.c_str(), selinuxMode, nullptr);
        _exit(Fail(program + ": " + strerror(errno)));
    }
    close(report[1]);
    char byte = 0;
    const bool isBooted = read(report[0], &byte, 1) == 1;
    close(report[0]);
    if (!isBooted) {
        return Fail("did not start");
    }
    fprintf(stderr, "device: started in %s, SELinux is %s\n", host::DeviceRootPath().c_str(),
            selinuxMode);
    return AwaitDaemon();
}

// Boots the device unless it runs already, from this build: then it stays as it is. Waits for a
// start in progress, which holds a lock on the root.
int StartIfStopped(const char* selinuxMode) {
    const int root = openat(host::DeviceRoot(), ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (!WaitUntil(2 * kStartLimitMs, [root] { return flock(root, LOCK_EX | LOCK_NB) == 0; })) {
        return Fail("another start does not end");
    }
    const pid_t init = FindInit();
    if (init != 0 && !IsCurrentBuild(init)) {
        fputs("device: runs another build\n", stderr);
        Stop(0, nullptr);
    }
    const int status = FindInit() != 0 ? 0 : Boot(selinuxMode);
    close(root);
    return status;
}

int Start(int argc, char** argv) {
    if (argc > 1 || (argc == 1 && argv[0] != std::string("--permissive"))) {
        return Usage();
    }
    const int status = StartIfStopped(argc == 1 ? "Permissive" : "Enforcing");
    return status != 0 ? status : AwaitDaemon();
}

int Status(int, char**) {
    const pid_t init = FindInit();
    if (init == 0) {
        puts("stopped");
        return kStopped;
    }
    printf("running in %s, process %d%s\n", host::DeviceRootPath().c_str(), init,
           IsCurrentBuild(init) ? "" : ", another build");
    printf("daemon alive: %s, binder: %s, SELinux: %s\n",
           device::GetProperty(device::kDaemonAliveKey).c_str(),
           device::GetProperty(device::kDaemonBinderKey).c_str(), device::SelinuxMode().c_str());
    return 0;
}

int Root(int, char**) {
    puts(host::DeviceRootPath().c_str());
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

// The arguments, joined by spaces, are one shell command, as for `adb shell`.
int Shell(int argc, char** argv) {
    std::string command = argc > 0 ? argv[0] : "exec sh";
    for (int i = 1; i < argc; ++i) {
        command.append(" ").append(argv[i]);
    }
    return Become("/bin/sh", {"sh", "-c", "--", command.c_str()});
}

int BecomeBeside(const char* name, int argc, char** argv) {
    std::vector<const char*> arguments = {name};
    arguments.insert(arguments.end(), argv, argv + argc);
    return Become(device::PathBesideProgram(name), arguments);
}

int Run(int argc, char** argv) {
    const int status = StartIfStopped("Permissive");
    return status != 0 ? status : BecomeBeside("bin/tpd", argc, argv);
}

int Trace(int argc, char** argv) {
    return FindInit() != 0 ? BecomeBeside("trace.py", argc, argv)
                           : Fail("the device is stopped; `device start` boots it");
}

int ListFaults() {
    for (const device::Fault* const fault : device::kFaults) {
        printf("%-16s the daemon %s", fault->name, fault->effect);
        if (fault->argument != nullptr) {
            printf("; %s: %jd to %jd", fault->argument, intmax_t{fault->min}, intmax_t{fault->max});
        }
        puts("");
    }
    return 0;
}

int Fault(int argc, char** argv) {
    if (argc == 0) {
        return ListFaults();
    }
    if (FindInit() == 0) {
        return Fail("the device is stopped; `device start` boots it");
    }
    const device::Fault* const fault = device::FindFault(argv[0]);
    const int arguments = fault != nullptr && fault->argument != nullptr ? 2 : 1;
    const std::string argument = arguments == 2 && argc > 1 ? argv[1] : "";
    const std::string count = argc > arguments ? argv[arguments] : "";
    if (fault == nullptr || argc > arguments + (fault == &device::kNoFault ? 0 : 1) ||
        (arguments == 2 && !device::IsNumberWithin(argument, fault->min, fault->max)) ||
        (argc > arguments && !device::IsNumberWithin(count, 1, INT32_MAX))) {
        Fail("no such fault, argument or count; `device fault` lists what there is");
        return kWrongUse;
    }
    // The fault comes last, so that no call meets it with another one's argument.
    const bool isSet =
            __system_property_set("sim.fault", "") == 0 &&
            __system_property_set("sim.fault_arg", argument.c_str()) == 0 &&
            __system_property_set("sim.fault_count", count.c_str()) == 0 &&
            (fault == &device::kNoFault || __system_property_set("sim.fault", fault->name) == 0);
    return isSet ? 0 : Fail("fault: the property is refused");
}

constexpr struct {
    const char* name;
    int maxArguments;
    int (*run)(int argc, char** argv);
} kVerbs[] = {{"start", 1, Start},       {"stop", 0, Stop},         {"status", 0, Status},
              {"root", 0, Root},         {"shell", INT_MAX, Shell}, {"run", INT_MAX, Run},
              {"trace", INT_MAX, Trace}, {"fault", 3, Fault}};

}  // namespace

int main(int argc, char** argv) {
    for (const auto& verb : kVerbs) {
        if (argc > 1 && argv[1] == std::string(verb.name) && argc - 2 <= verb.maxArguments) {
            const int status = host::DeviceRoot() < 0 ? 1 : verb.run(argc - 2, argv + 2);
            const bool isWritten = fflush(stdout) == 0 && ferror(stdout) == 0;
            return isWritten ? status : Fail(std::string("cannot write: ") + strerror(errno));
        }
    }
    if (argc == 2 && (argv[1] == std::string("-h") || argv[1] == std::string("--help"))) {
        fputs(kUsage, stdout);
        return 0;
    }
    return Usage();
}
