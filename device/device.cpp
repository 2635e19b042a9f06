// The command that starts, stops and uses the virtual device.
#include <limits.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

#include "answers.h"
#include "daemon_verbs.h"
#include "life.h"
#include "messages.h"
#include "platform/device_root.h"
#include "platform/events.h"
#include "platform/files.h"
#include "programs.h"
#include "properties.h"

namespace {

using device::Fail;
using device::FailForErrno;

// Exit statuses of `device status`.
constexpr int kExitStopped = 3;
constexpr int kExitUnknown = 4;

int UsageError(const std::string& error) {
    return Fail(error + "; see " + device::Command("--help"), device::kUsageError);
}

int Stop(int, char**) { return device::Stop(); }

int Start(int argc, char** argv) {
    if (argc > 0 && strcmp(argv[0], "--permissive") != 0) {
        return UsageError(std::string("start: unexpected argument '") + argv[0] + "'");
    }
    const pid_t init = device::FindInit().process;
    const int status =
            device::BringUp(argc > 0 ? "Permissive" : "Enforcing", device::Until::kDaemonAlive);
    if (status != 0) {
        return status;
    }
    if (argc > 0 && !host::ReplaceFile(host::kSelinuxFile, "Permissive")) {
        return FailForErrno("cannot set the SELinux mode");
    }
    if (device::FindInit().process == init) {
        device::PrintMessage("already running; SELinux is " + device::SelinuxMode());
    }
    return 0;
}

int Reboot(int, char**) { return device::Reboot(); }

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
    const device::Init init = device::FindInit();
    if (init.state == device::State::kUnknown) {
        puts("unknown");
        return Fail(init.reason, kExitUnknown);
    }
    if (init.state == device::State::kStopped) {
        puts("stopped");
        return kExitStopped;
    }
    printf("running in %s, process %d%s\n", host::DeviceRootPath().c_str(), init.process,
           init.state == device::State::kOtherBuild ? ", another build" : "");
    for (const auto& line : kStatusLines) {
        const std::string value = device::GetProperty(line.key);
        printf("%s: %s\n", line.label, value.empty() ? line.unset : value.c_str());
    }
    const int64_t port = device::GetPropertyNumber(device::kAdbPortKey);
    printf("adb serial: %s\n",
           port > 0 ? ("emulator-" + std::to_string(port - 1)).c_str() : "none");
    printf("SELinux: %s\nrecorded answers: %zu\n", device::SelinuxMode().c_str(),
           device::RecordedCommands().size());
    return 0;
}

int Root(int, char**) {
    puts(host::DeviceRootPath().c_str());
    return 0;
}

int Shell(int argc, char** argv) {
    return device::ExpectRunning() ? device::ExecShell(argc, argv) : 1;
}

int Run(int argc, char** argv) {
    const int status = device::BringUp("Permissive", device::Until::kBooted);
    return status != 0 ? status : device::ExecSibling("bin/tpd", {argv, argv + argc});
}

int Adb(int argc, char** argv) {
    if (!device::ExpectRunning()) {
        return 1;
    }
    std::vector<const char*> arguments = {program_invocation_name};
    arguments.insert(arguments.end(), argv, argv + argc);
    return device::ExecSibling("connect_adb", arguments);
}

// The first arguments of trace.py are a file descriptor of the device root and this program's name.
int Trace(int argc, char** argv) {
    if (!device::ExpectRunning()) {
        return 1;
    }
    host::UpdateTracing();    // removes the trace file if its owner was killed
    signal(SIGINT, SIG_IGN);  // until trace.py handles it
    const std::string root = std::to_string(dup(host::DeviceRoot()));
    std::vector<const char*> arguments = {root.c_str(), program_invocation_name};
    arguments.insert(arguments.end(), argv, argv + argc);
    return device::ExecSibling("trace.py", arguments);
}

int Fault(int argc, char** argv) {
    const bool isPossible = argc == 0 || device::ExpectRunning();
    return isPossible ? device::ManageFaults(argc, argv) : 1;
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
        {"adb", " [--shared]",
         "prints the shell command that makes adb use the device; --shared: uses adb's usual "
         "server",
         1, Adb},
        {"fault", " [FAULT [ARGUMENT] [COUNT]]",
         "sets the daemon's fault; without arguments, lists the faults", 3, Fault},
        {"answer", " [COMMAND TEXT | COMMAND - | --remove COMMAND]",
         "records an answer (-: from standard input) or removes it; without arguments, lists all",
         INT_MAX, device::ManageAnswers}};

void PrintUsage(FILE* stream, const Verb& verb) {
    fprintf(stream, "    %s %s%s\n        %s\n", program_invocation_name, verb.name, verb.arguments,
            verb.effect);
}

bool AsksForHelp(const char* word) {
    return strcmp(word, "-h") == 0 || strcmp(word, "--help") == 0;
}

int RunVerb(int argc, char** argv) {
    const std::string name = argc > 1 ? argv[1] : "";
    if (name == "--version") {
        puts("tpd-device " TPD_VERSION);
        return 0;
    }
    if (argc < 2 || name == "help" || AsksForHelp(argv[1])) {
        FILE* const stream = argc < 2 ? stderr : stdout;
        fputs("usage:\n", stream);
        for (const Verb& verb : kVerbs) {
            PrintUsage(stream, verb);
        }
        fprintf(stream, "    %s help | --version\n        prints this text or the version\n",
                program_invocation_name);
        return argc < 2 ? device::kUsageError : 0;
    }
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
