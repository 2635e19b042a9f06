// The virtual device for people and scripts: starts, stops and enters it. The kernel knows which
// process runs it: init holds a record lock, and asking who holds it takes no lock.
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

#include "answers.h"
#include "common.h"
#include "faults.h"
#include "platform/device_root.h"
#include "platform/files.h"
#include "platform/trace.h"
#include "platform/unique_fd.h"

// The C library's header declares them without the C linkage that they have.
extern "C" {
#include <sys/pidfd.h>
}

namespace {

using host::UniqueFd;

constexpr int kUsageError = 2;
constexpr int kExitStopped = 3;  // of `status`
constexpr int kExitUnknown = 4;
constexpr int kFindLimitMs = 200;
constexpr int kStartLimitMs = 10000;
constexpr int kStopLimitMs = 5000;
constexpr std::chrono::milliseconds kPollPause(5);

constexpr char kUsage[] =
        "usage: device start [--permissive]  boots it, SELinux Enforcing without the option;\n"
        "                                    status 0 once its daemon is alive\n"
        "       device reboot                stops it and boots it again, SELinux Enforcing\n"
        "       device stop\n"
        "       device status                status 3 when it is stopped, 4 when unknown\n"
        "       device root                  prints the directory of its files, and makes it\n"
        "       device shell [COMMAND...]    as `adb shell`\n"
        "       device run [ARGUMENT...]     runs the tool; boots a stopped device Permissive\n"
        "       device trace [--bytes] [--json | --mermaid] ARGUMENT...\n"
        "                                    runs the tool and shows what all processes did\n"
        "       device fault [NAME [ARGUMENT] [COUNT] | none]\n"
        "                                    gives the daemon a fault; alone: lists them\n"
        "       device answer [COMMAND TEXT | COMMAND - | --remove COMMAND]\n"
        "                                    records an answer, `-` from standard input; alone:\n"
        "                                    lists the commands that have one\n";

int Usage() {
    fputs(kUsage, stderr);
    return kUsageError;
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

struct Init {
    enum class State { kRunning, kStopped, kUnknown };
    State state;
    pid_t pid;           // of a running one, else 0
    std::string reason;  // why its state is unknown
};

std::filesystem::path ProgramOf(pid_t process, std::error_code& error) {
    return std::filesystem::read_symlink("/proc/" + std::to_string(process) + "/exe", error);
}

// Looks once which process holds init's lock.
Init LookForInit() {
    const auto unknown = [](const std::string& reason) {
        return Init{Init::State::kUnknown, 0, reason};
    };
    const UniqueFd lock = host::OpenFile(host::kInitLockFile, O_RDONLY);
    if (!lock.ok() && errno == ENOENT) {
        return {Init::State::kStopped, 0, ""};
    }
    struct flock holder = {};
    holder.l_type = F_WRLCK;
    if (!lock.ok() || fcntl(lock.get(), F_GETLK, &holder) != 0) {
        return unknown(std::string(host::kInitLockFile) + ": " + strerror(errno));
    }
    if (holder.l_type == F_UNLCK) {
        return {Init::State::kStopped, 0, ""};
    }
    if (holder.l_pid <= 0) {
        return unknown("init runs in another process namespace");
    }
    const std::string process = "process " + std::to_string(holder.l_pid);
    std::error_code error;
    const std::filesystem::path program = ProgramOf(holder.l_pid, error);
    if (error) {
        return unknown(process + ": " + error.message());
    }
    // The name of a replaced file is followed by " (deleted)".
    if (program.filename().string().rfind("init", 0) != 0) {
        return unknown(process + ", which is not init, holds " + host::kInitLockFile);
    }
    return {Init::State::kRunning, holder.l_pid, ""};
}

// Looks again while the state is unknown, as it is for a moment when init exits: it still has its
// lock then, but no executable.
Init FindInit() {
    Init init = {};
    WaitUntil(kFindLimitMs, [&init] {
        init = LookForInit();
        return init.state != Init::State::kUnknown;
    });
    return init;
}

bool IsRunning() { return FindInit().state == Init::State::kRunning; }

int FailUnknown(const Init& init) {
    return Fail("cannot find out whether the device runs: " + init.reason);
}

// Returns 0 when the device runs, else 1 after a message.
int ExpectRunning() {
    const Init init = FindInit();
    switch (init.state) {
        case Init::State::kRunning:
            return 0;
        case Init::State::kStopped:
            return Fail("the device is stopped; `device start` boots it");
        case Init::State::kUnknown:
            break;
    }
    return FailUnknown(init);
}

// Whether the process, unless it has just exited, runs the init that was built last.
bool IsCurrentBuild(pid_t init) {
    std::error_code error;
    const std::filesystem::path program = ProgramOf(init, error);
    return error || program == device::PathBesideProgram("init");
}

// Sends SIGTERM, then SIGKILL after a time-out. The descriptor stands for this one process even
// when its number passes to another.
int Stop(int argc, char** argv) {
    const Init init = FindInit();
    if (init.state == Init::State::kUnknown) {
        return FailUnknown(init);
    }
    if (init.state == Init::State::kStopped) {
        fputs("device: already stopped\n", stderr);
        return 0;
    }
    const std::string name = "process " + std::to_string(init.pid);
    const UniqueFd process(pidfd_open(init.pid, 0));
    if (!process.ok() && errno != ESRCH) {
        return Fail(name + ": " + strerror(errno));
    }
    const bool isInit = process.ok() && FindInit().pid == init.pid;
    if (!isInit) {
        return Stop(argc, argv);
    }
    pollfd exited = {process.get(), POLLIN, 0};
    pidfd_send_signal(process.get(), SIGTERM, nullptr, 0);
    if (poll(&exited, 1, kStopLimitMs) == 0) {
        pidfd_send_signal(process.get(), SIGKILL, nullptr, 0);
        poll(&exited, 1, kStopLimitMs);
    }
    if (exited.revents == 0) {
        return Fail(name + " does not exit");
    }
    fputs("device: stopped\n", stderr);
    return 0;
}

bool IsBootCompleted() { return device::GetProperty(device::kBootCompletedKey) == "1"; }

int AwaitDaemon() {
    WaitUntil(kStartLimitMs, [] {
        return (device::IsDaemonAlive() && IsBootCompleted()) || !device::IsDaemonEnabled() ||
               !IsRunning();
    });
    if (const int status = ExpectRunning(); status != 0) {
        return status;
    }
    return device::IsDaemonAlive()
                   ? 0
                   : Fail("the daemon is not alive; `device shell logcat -d` may say why, "
                          "`device shell tpd start` starts one that was stopped");
}

// Starts init and waits until it has booted the device. Init reports what fails there.
int Boot(const char* selinuxMode) {
    int report[2];
    if (pipe2(report, O_CLOEXEC) != 0) {
        return Fail(std::string("cannot make a pipe: ") + strerror(errno));
    }
    const UniqueFd reader(report[0]);
    UniqueFd writer(report[1]);
    const std::string program = device::PathBesideProgram("init");
    const pid_t init = fork();
    if (init < 0) {
        return Fail(std::string("cannot fork: ") + strerror(errno));
    }
    if (init == 0) {
        dup2(writer.get(), STDOUT_FILENO);
        execl(program.c_str(), program.c_str(), selinuxMode, nullptr);
        _exit(Fail(program + ": " + strerror(errno)));
    }
    writer.reset();
    char byte = 0;
    if (read(reader.get(), &byte, 1) != 1) {
        return Fail("did not start");
    }
    fprintf(stderr, "device: started in %s, SELinux is %s\n", host::DeviceRootPath().c_str(),
            selinuxMode);
    return AwaitDaemon();
}

// Waits for a start in progress. The lock lasts as long as the descriptor.
UniqueFd LockStart() {
    UniqueFd root = host::OpenDirectory(".");
    int error = root.ok() ? EWOULDBLOCK : errno;
    WaitUntil(2 * kStartLimitMs, [&root, &error] {
        if (error == EWOULDBLOCK) {
            error = flock(root.get(), LOCK_EX | LOCK_NB) == 0 ? 0 : errno;
        }
        return error != EWOULDBLOCK;
    });
    if (error == 0) {
        return root;
    }
    Fail(error == EWOULDBLOCK ? "another start does not finish"
                              : std::string("cannot lock the device root: ") + strerror(error));
    return UniqueFd();
}

enum class IfRunning { kLeave, kSayAndLeave, kReboot };

// Boots the device. One that runs from an older build is booted again; `ifRunning` is for one that
// runs from this build.
int BringUp(const char* selinuxMode, IfRunning ifRunning) {
    const UniqueFd lock = LockStart();
    if (!lock.ok()) {
        return 1;
    }
    const Init init = FindInit();
    if (init.state == Init::State::kUnknown) {
        return FailUnknown(init);
    }
    const bool isRunning = init.state == Init::State::kRunning;
    const bool isCurrent = isRunning && IsCurrentBuild(init.pid);
    if (isCurrent && ifRunning != IfRunning::kReboot) {
        if (ifRunning == IfRunning::kSayAndLeave) {
            fprintf(stderr, "device: already running, left as it is; SELinux is %s\n",
                    device::SelinuxMode().c_str());
        }
        return 0;
    }
    if (isRunning && !isCurrent) {
        fputs("device: runs another build\n", stderr);
    }
    const int status = isRunning ? Stop(0, nullptr) : 0;
    return status != 0 ? status : Boot(selinuxMode);
}

int Start(int argc, char** argv) {
    const bool isPermissive = argc == 1 && strcmp(argv[0], "--permissive") == 0;
    if (argc > 0 && !isPermissive) {
        return Usage();
    }
    const int status = BringUp(isPermissive ? "Permissive" : "Enforcing", IfRunning::kSayAndLeave);
    return status != 0 ? status : AwaitDaemon();
}

int Reboot(int, char**) { return BringUp("Enforcing", IfRunning::kReboot); }

int Status(int, char**) {
    const Init init = FindInit();
    switch (init.state) {
        case Init::State::kUnknown:
            puts("unknown");
            FailUnknown(init);
            return kExitUnknown;
        case Init::State::kStopped:
            puts("stopped");
            return kExitStopped;
        case Init::State::kRunning:
            break;
    }
    printf("running in %s, process %d%s\n", host::DeviceRootPath().c_str(), init.pid,
           IsCurrentBuild(init.pid) ? "" : ", another build");
    printf("daemon alive: %s, binder: %s, SELinux: %s\n",
           device::GetProperty(device::kDaemonAliveKey).c_str(),
           device::GetProperty(device::kDaemonBinderKey).c_str(), device::SelinuxMode().c_str());
    return 0;
}

int Root(int, char**) {
    puts(host::DeviceRootPath().c_str());
    return 0;
}

// Executes a program that finds the device's commands and the tool before those of the machine.
int Exec(const std::string& program, std::vector<const char*> arguments) {
    const char* const path = getenv("PATH");
    const bool hasPath = path != nullptr && *path != '\0';
    const std::string bin = device::PathBesideProgram("bin");
    setenv("PATH", (bin + ":" + (hasPath ? path : "/usr/bin:/bin")).c_str(), 1);
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
    return Exec("/bin/sh", {"sh", "-c", "--", command.c_str()});
}

int ExecSibling(const char* name, int argc, char** argv) {
    std::vector<const char*> arguments = {name};
    arguments.insert(arguments.end(), argv, argv + argc);
    return Exec(device::PathBesideProgram(name), arguments);
}

int Run(int argc, char** argv) {
    const int status = BringUp("Permissive", IfRunning::kLeave);
    return status != 0 ? status : ExecSibling("bin/tpd", argc, argv);
}

// The recorder gets the device root as a descriptor, whose number is its first argument.
int Trace(int argc, char** argv) {
    if (const int status = ExpectRunning(); status != 0) {
        return status;
    }
    host::LookForTrace();  // removes what a killed recorder left behind
    const std::string root = std::to_string(dup(host::DeviceRoot()));
    std::vector<const char*> arguments = {"trace.py", root.c_str()};
    arguments.insert(arguments.end(), argv, argv + argc);
    return Exec(device::PathBesideProgram("trace.py"), arguments);
}

int Fault(int argc, char** argv) {
    const int status = argc > 0 ? ExpectRunning() : 0;
    return status != 0 ? status : device::SetOrListFaults(argc, argv);
}

constexpr struct {
    const char* name;
    int maxArguments;
    int (*run)(int argc, char** argv);
} kVerbs[] = {{"start", 1, Start},   {"reboot", 0, Reboot},
              {"stop", 0, Stop},     {"status", 0, Status},
              {"root", 0, Root},     {"shell", INT_MAX, Shell},
              {"run", INT_MAX, Run}, {"trace", INT_MAX, Trace},
              {"fault", 3, Fault},   {"answer", INT_MAX, device::ListOrRecordAnswers}};

int RunVerb(int argc, char** argv) {
    const std::string name = argc > 1 ? argv[1] : "";
    for (const auto& verb : kVerbs) {
        if (name == verb.name && argc - 2 <= verb.maxArguments) {
            return host::DeviceRoot() < 0 ? 1 : verb.run(argc - 2, argv + 2);
        }
    }
    if (argc == 2 && (name == "-h" || name == "--help")) {
        fputs(kUsage, stdout);
        return 0;
    }
    return Usage();
}

}  // namespace

int main(int argc, char** argv) {
    const int status = RunVerb(argc, argv);
    const bool isFlushed = fflush(stdout) == 0 && ferror(stdout) == 0;
    return isFlushed ? status : Fail(std::string("cannot write: ") + strerror(errno));
}
