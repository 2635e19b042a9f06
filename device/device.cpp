// The command that starts, stops and uses the virtual device. Init holds a record lock while the
// device runs. F_GETLK finds the holder without taking the lock.
#include <fcntl.h>
#include <limits.h>
#include <poll.h>
#include <sys/file.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdio>
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
#include "shell.h"

// The C library's header lacks extern "C".
extern "C" {
#include <sys/pidfd.h>
}

namespace {

using device::Fail;
using device::FailForErrno;
using host::UniqueFd;

// Exit statuses of `device status`.
constexpr int kExitStopped = 3;
constexpr int kExitUnknown = 4;

constexpr int kFindLimitMs = 200;
constexpr int kStartLimitMs = 10000;
constexpr int kStopLimitMs = 5000;
constexpr std::chrono::milliseconds kPollPause(5);

int UsageError(const std::string& error) {
    return Fail(error + "; see " + device::Command("--help"), device::kUsageError);
}

// Prints a message to standard error. Returns 0, the exit status for success.
int Say(const std::string& what) { return Fail(what, 0); }

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

std::filesystem::path ProgramOf(pid_t process, std::error_code& error) {
    return std::filesystem::read_symlink("/proc/" + std::to_string(process) + "/exe", error);
}

// Returns the ID of the process that holds init's lock, or 0 if the lock is free. If the holder
// cannot be identified, stores the reason and returns -1.
pid_t LookForInit(std::string& reason) {
    const UniqueFd lock = host::OpenFile(host::kInitLockFile, O_RDONLY);
    if (!lock.ok() && errno == ENOENT) {
        return 0;
    }
    struct flock holder = {};
    holder.l_type = F_WRLCK;
    std::error_code error;
    if (!lock.ok() || fcntl(lock.get(), F_GETLK, &holder) != 0) {
        reason = std::string(host::kInitLockFile) + ": " + strerror(errno);
    } else if (holder.l_type == F_UNLCK) {
        return 0;
    } else if (holder.l_pid <= 0) {
        reason = "init runs in another PID namespace";
    } else if (const auto program = ProgramOf(holder.l_pid, error); error) {
        reason = "process " + std::to_string(holder.l_pid) + ": " + error.message();
    } else if (program.filename().string().rfind("init", 0) != 0) {
        reason = std::string(host::kInitLockFile) + " is held by " + program.string() +
                 ", which is not init";
    } else {
        return holder.l_pid;
    }
    return -1;
}

// Returns init's process ID, 0 if the device is stopped, or -1 after an error message. Retries
// because an exiting init loses its /proc/PID/exe link before its lock.
pid_t FindInit() {
    pid_t init = -1;
    std::string reason;
    WaitUntil(kFindLimitMs, [&init, &reason] { return (init = LookForInit(reason)) >= 0; });
    if (init < 0) {
        Fail("cannot tell whether the device is running: " + reason);
    }
    return init;
}

// Returns true if the device is running. Otherwise prints an error.
bool ExpectRunning() {
    const pid_t init = FindInit();
    if (init == 0) {
        Fail("the device is stopped; " + device::Command("start") + " boots it");
    }
    return init > 0;
}

// Returns true if the process runs this build's init, or has just exited.
bool IsCurrentBuild(pid_t init) {
    std::error_code error;
    const std::filesystem::path program = ProgramOf(init, error);
    return error || program == device::PathBesideProgram("init");
}

// Sends SIGTERM, then SIGKILL after a time-out. The pidfd protects against a reused process ID.
int Stop(int argc, char** argv) {
    const pid_t init = FindInit();
    if (init <= 0) {
        return init < 0 ? 1 : Say("already stopped");
    }
    const std::string name = "process " + std::to_string(init);
    const UniqueFd process(pidfd_open(init, 0));
    if (!process.ok() && errno != ESRCH) {
        return FailForErrno(name);
    }
    const bool isInit = process.ok() && FindInit() == init;
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
    return Say("stopped");
}

int AwaitDaemon() {
    pid_t init = 0;
    WaitUntil(kStartLimitMs, [&init] {
        const bool isUp =
                device::IsDaemonAlive() && device::GetProperty(device::kBootCompletedKey) == "1";
        init = FindInit();
        return init <= 0 || isUp || !device::IsDaemonEnabled();
    });
    if (init <= 0) {
        return init < 0 ? 1 : Fail("the device was stopped");
    }
    return device::IsDaemonAlive()
                   ? 0
                   : Fail("the daemon is not alive; see " + device::Command("shell logcat -d") +
                          ", or start a stopped daemon with " + device::Command("shell tpd start"));
}

// Starts init and waits until it has booted the device. Init prints its own errors.
int Boot(const char* selinuxMode) {
    int report[2];
    if (pipe2(report, O_CLOEXEC) != 0) {
        return FailForErrno("cannot create a pipe");
    }
    const UniqueFd reader(report[0]);
    UniqueFd writer(report[1]);
    const std::string program = device::PathBesideProgram("init");
    const pid_t init = fork();
    if (init < 0) {
        return FailForErrno("cannot fork");
    }
    if (init == 0) {
        dup2(writer.get(), STDOUT_FILENO);
        device::EnterDevice();
        execl(program.c_str(), program.c_str(), selinuxMode, nullptr);
        _exit(FailForErrno(program));
    }
    writer.reset();
    char byte = 0;
    if (read(reader.get(), &byte, 1) != 1) {
        return Fail("init did not boot the device");
    }
    Say("started in " + host::DeviceRootPath() + ", SELinux is " + selinuxMode);
    return AwaitDaemon();
}

// Boots the device unless this build's init is running. A lock on the device root prevents
// concurrent starts.
int BringUp(const char* selinuxMode) {
    const UniqueFd root = host::OpenDirectory(".");
    const auto isFree = [&root] {
        return flock(root.get(), LOCK_EX | LOCK_NB) == 0 || errno != EWOULDBLOCK;
    };
    const bool isLocked = root.ok() && WaitUntil(2 * kStartLimitMs, isFree) &&
                          flock(root.get(), LOCK_EX | LOCK_NB) == 0;
    if (!isLocked) {
        return FailForErrno("cannot lock the device root");
    }
    const pid_t init = FindInit();
    if (init < 0) {
        return 1;
    }
    if (init > 0 && IsCurrentBuild(init)) {
        return 0;
    }
    if (init > 0) {
        Say("the device runs another build; rebooting it");
        if (Stop(0, nullptr) != 0) {
            return 1;
        }
    }
    return Boot(selinuxMode);
}

int Start(int argc, char** argv) {
    if (argc > 0 && strcmp(argv[0], "--permissive") != 0) {
        return UsageError(std::string("start: unexpected argument '") + argv[0] + "'");
    }
    const pid_t init = FindInit();
    const int status = BringUp(argc > 0 ? "Permissive" : "Enforcing");
    if (init > 0 && status == 0 && FindInit() == init) {
        Say("already running; SELinux is " + device::SelinuxMode());
    }
    return status != 0 ? status : AwaitDaemon();
}

int Reboot(int, char**) { return Stop(0, nullptr) == 0 ? Start(0, nullptr) : 1; }

constexpr struct {
    const char* label;
    const char* key;
    const char* unset;
} kStatusLines[] = {{"daemon alive", device::kDaemonAliveKey, "false"},
                    {"binder", device::kDaemonBinderKey, "0"},
                    {"restarts", device::kRestartCountKey, "0"},
                    {"firmware update", device::kIsUpdatingFirmwareKey, "false"},
                    {"fault", device::kFaultKey, "none"},
                    {"permissive flag", device::kPermissiveFlagKey, "unset"}};

int Status(int, char**) {
    const pid_t init = FindInit();
    if (init <= 0) {
        puts(init < 0 ? "unknown" : "stopped");
        return init < 0 ? kExitUnknown : kExitStopped;
    }
    printf("running in %s, process %d%s\n", host::DeviceRootPath().c_str(), init,
           IsCurrentBuild(init) ? "" : ", another build");
    for (const auto& line : kStatusLines) {
        const std::string value = device::GetProperty(line.key);
        printf("%s: %s\n", line.label, value.empty() ? line.unset : value.c_str());
    }
    printf("SELinux: %s\nrecorded answers: %zu\n", device::SelinuxMode().c_str(),
           device::RecordedCommands().size());
    return 0;
}

int Root(int, char**) {
    puts(host::DeviceRootPath().c_str());
    return 0;
}

int Shell(int argc, char** argv) { return ExpectRunning() ? device::Shell(argc, argv) : 1; }

int ExecSibling(const char* name, std::vector<const char*> arguments) {
    arguments.insert(arguments.begin(), name);
    return device::Exec(device::PathBesideProgram(name), std::move(arguments));
}

int Run(int argc, char** argv) {
    const int status = BringUp("Permissive");
    return status != 0 ? status : ExecSibling("bin/tpd", {argv, argv + argc});
}

// The first arguments of trace.py are a file descriptor of the device root and this program's name.
int Trace(int argc, char** argv) {
    if (!ExpectRunning()) {
        return 1;
    }
    host::LookForTrace();  // removes the trace file if its owner was killed
    const std::string root = std::to_string(dup(host::DeviceRoot()));
    std::vector<const char*> arguments = {root.c_str(), program_invocation_short_name};
    arguments.insert(arguments.end(), argv, argv + argc);
    return ExecSibling("trace.py", arguments);
}

int Fault(int argc, char** argv) {
    const bool isPossible = argc == 0 || ExpectRunning();
    return isPossible ? device::SetOrListFaults(argc, argv) : 1;
}

constexpr struct Verb {
    const char* name;
    const char* arguments;
    const char* effect;
    int maxArguments;
    int (*run)(int argc, char** argv);
} kVerbs[] = {
        {"start", " [--permissive]",
         "boots the device and waits for its daemon; without the option, SELinux is enforcing", 1,
         Start},
        {"reboot", "", "reboots the device, with SELinux enforcing", 0, Reboot},
        {"stop", "", "stops the device", 0, Stop},
        {"status", "", "prints the device's state; exits with 3 if stopped, 4 if unknown", 0,
         Status},
        {"root", "", "prints the device's directory; creates it if missing", 0, Root},
        {"shell", " [COMMAND...]", "runs a command or an interactive shell, like `adb shell`",
         INT_MAX, Shell},
        {"run", " [ARGUMENT...]", "runs the tool; boots a stopped device in permissive mode",
         INT_MAX, Run},
        {"trace", " [--bytes] [--json | --mermaid] [ARGUMENT...]",
         "runs the tool and shows what the tool, the daemon and init did", INT_MAX, Trace},
        {"fault", " [FAULT [ARGUMENT] [COUNT]]",
         "sets the daemon's fault; without arguments, lists the faults", 3, Fault},
        {"answer", " [COMMAND TEXT | COMMAND - | --remove COMMAND]",
         "records an answer (-: from standard input) or removes it; without arguments, lists all",
         INT_MAX, device::ListOrRecordAnswers}};

void PrintUsage(FILE* stream, const Verb& verb) {
    fprintf(stream, "    %s %s%s\n        %s\n", program_invocation_short_name, verb.name,
            verb.arguments, verb.effect);
}

bool AsksForHelp(const char* word) {
    return strcmp(word, "-h") == 0 || strcmp(word, "--help") == 0;
}

int RunVerb(int argc, char** argv) {
    if (argc < 2 || AsksForHelp(argv[1])) {
        FILE* const stream = argc < 2 ? stderr : stdout;
        fputs("usage:\n", stream);
        for (const Verb& verb : kVerbs) {
            PrintUsage(stream, verb);
        }
        return argc < 2 ? device::kUsageError : 0;
    }
    const std::string name = argv[1];
    for (const Verb& verb : kVerbs) {
        if (name != verb.name) {
            continue;
        }
        if (argc > 2 && AsksForHelp(argv[2])) {
            puts("usage:");
            PrintUsage(stdout, verb);
            return 0;
        }
        if (argc - 2 > verb.maxArguments) {
            return UsageError(name + ": unexpected argument '" + argv[2 + verb.maxArguments] + "'");
        }
        return host::DeviceRoot() < 0 ? 1 : verb.run(argc - 2, argv + 2);
    }
    return UsageError("unknown command '" + name + "'");
}

}  // namespace

int main(int argc, char** argv) {
    const int status = RunVerb(argc, argv);
    const bool isFlushed = fflush(stdout) == 0 && ferror(stdout) == 0;
    return isFlushed ? status : FailForErrno("cannot write");
}
