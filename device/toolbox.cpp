// The device's own shell commands, selected by argv[0]. They use the platform's functions, so the
// same rules for names, sizes and access apply.
#include <android/log.h>
#include <limits.h>
#include <strings.h>
#include <sys/system_properties.h>
#include <unistd.h>

#include <cctype>
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

#include "common.h"
#include "platform/device_root.h"
#include "platform/events.h"
#include "platform/files.h"
#include "platform/libc/properties.h"

namespace {

using device::FailForErrno;
using device::kUsageError;  // makes main() print the usage

// Returns the whole value; __system_property_get() truncates a long one.
std::string WholeProperty(const std::string& name) {
    const std::string value = device::GetProperty(name.c_str());
    const bool isCut = value.length() == PROP_VALUE_MAX - 1;
    return isCut ? host::ReadFile(std::string(host::kPropertiesDirectory) + "/" + name).value_or("")
                 : value;
}

int Getprop(int argc, char** argv) {
    if (argc > 1) {
        const std::string value = WholeProperty(argv[1]);
        const bool usesDefault = value.empty() && argc > 2;
        puts(usesDefault ? argv[2] : value.c_str());
        return 0;
    }
    for (const std::string& name : host::FilesIn(host::kPropertiesDirectory)) {
        printf("[%s]: [%s]\n", name.c_str(), WholeProperty(name).c_str());
    }
    return 0;
}

int Setprop(int /* argc */, char** argv) {
    const char* const name = argv[1];
    const std::string value = argv[2];
    // Do not write an unchanged value: init acts on every write.
    const bool isUnchanged = !value.empty() && device::GetProperty(name) == value;
    if (isUnchanged || __system_property_set(name, value.c_str()) == 0) {
        return 0;
    }
    fprintf(stderr, "Failed to set property '%s' to '%s'.\n", name, value.c_str());
    if (const char* const error = host::PropertyError(name, value); error != nullptr) {
        fprintf(stderr, "%s\n", error);
    }
    return 1;
}

// `start NAME` and `stop NAME`. Without a name, they control a phone's user interface. This device
// has none, but programs wait for its start.
int ControlService(int argc, char** argv) {
    const std::string verb = program_invocation_short_name;
    if (argc == 1) {
        return verb == "stop" || __system_property_set(device::kBootCompletedKey, "1") == 0 ? 0 : 1;
    }
    const std::string service = argv[1];
    const std::string state = device::GetProperty((device::kServiceStatePrefix + service).c_str());
    if (state.empty()) {
        return device::Fail("unknown service '" + service + "'");
    }
    const std::string request = device::kControlPrefix + verb;
    return __system_property_set(request.c_str(), service.c_str()) == 0
                   ? 0
                   : FailForErrno("cannot ask init");
}

int Getenforce(int /* argc */, char** /* argv */) {
    puts(device::SelinuxMode().c_str());
    return 0;
}

int Setenforce(int /* argc */, char** argv) {
    const std::string mode = argv[1];
    const bool isPermissive = mode == "0" || strcasecmp(mode.c_str(), "permissive") == 0;
    const bool isEnforcing = mode == "1" || strcasecmp(mode.c_str(), "enforcing") == 0;
    if (!isPermissive && !isEnforcing) {
        return kUsageError;
    }
    return host::ReplaceFile(host::kSelinuxFile, isPermissive ? "Permissive" : "Enforcing")
                   ? 0
                   : FailForErrno("cannot set the SELinux mode");
}

int ListSettings(const std::string& directory) {
    for (const std::string& key : host::FilesIn(directory)) {
        printf("%s=%s\n", key.c_str(), host::ReadFile(directory + key).value_or("null").c_str());
    }
    return 0;
}

int Settings(int argc, char** argv) {
    const std::string verb = argv[1];
    const std::string space = argv[2];
    const std::string directory = "settings/" + space + "/";
    if (space != "system" && space != "secure" && space != "global") {
        return kUsageError;
    }
    if (verb == "list" && argc == 3) {
        return ListSettings(directory);
    }
    const std::string key = argc > 3 ? argv[3] : "";
    const bool isFileName = !key.empty() && key[0] != '.' && key.find('/') == std::string::npos;
    if (!isFileName) {
        return kUsageError;
    }
    const std::string path = directory + key;
    if (verb == "get" && argc == 4) {
        puts(host::ReadFile(path).value_or("null").c_str());
        return 0;
    }
    if (verb == "delete" && argc == 4) {
        printf("Deleted %d rows\n", host::RemoveFile(path) ? 1 : 0);
        return 0;
    }
    if (verb == "put" && argc == 5) {
        return host::ReplaceFile(path, argv[4]) ? 0 : FailForErrno("cannot store the setting");
    }
    return kUsageError;
}

// Returns the log priority for the letter, or -1 if it is unknown.
int PriorityOf(const std::string& letter) {
    const size_t found = std::string("VDIWEFS").find(static_cast<char>(toupper(letter[0])));
    const bool valid = letter.length() == 1 && found != std::string::npos;
    return valid ? static_cast<int>(found) + ANDROID_LOG_VERBOSE : -1;
}

int Log(int argc, char** argv) {
    int priority = ANDROID_LOG_INFO;
    const char* tag = "log";
    for (int name = 0; (name = getopt(argc, argv, "+p:t:")) != -1;) {
        switch (name) {
            case 'p':
                priority = PriorityOf(optarg);
                break;
            case 't':
                tag = optarg;
                break;
            default:
                return kUsageError;
        }
    }
    if (priority < 0 || optind == argc) {
        return kUsageError;
    }
    const std::string text = device::Join(argc - optind, argv + optind);
    const int result = host::WriteLog(priority, tag, text);
    return result >= 0 ? 0 : device::Fail(std::string("cannot log: ") + strerror(-result));
}

// The first argument of logcat.py is a file descriptor of the device root.
int Logcat(int argc, char** argv) {
    const std::string script = device::PathBesideProgram("logcat.py");
    const std::string root = std::to_string(dup(host::DeviceRoot()));
    std::vector<const char*> arguments = {script.c_str(), root.c_str()};
    arguments.insert(arguments.end(), argv + 1, argv + argc + 1);  // with the final null pointer
    execv(script.c_str(), const_cast<char* const*>(arguments.data()));
    return FailForErrno(script);
}

// The device's user is root, whoever runs the device.
int Id(int argc, char** argv) {
    bool isOneId = false;
    bool isName = false;
    for (int name = 0; (name = getopt(argc, argv, "Ggnru")) != -1;) {
        if (name == '?') {
            return kUsageError;
        }
        isOneId |= strchr("Ggu", name) != nullptr;
        isName |= name == 'n';
    }
    if (optind < argc) {
        return kUsageError;
    }
    puts(!isOneId ? "uid=0(root) gid=0(root) groups=0(root)" : isName ? "root" : "0");
    return 0;
}

int Whoami(int /* argc */, char** /* argv */) {
    puts("root");
    return 0;
}

int Reboot(int /* argc */, char** /* argv */) {
    const std::string device = device::PathBesideProgram("device");
    execl(device.c_str(), "device", "reboot", nullptr);
    return FailForErrno(device);
}

constexpr struct {
    const char* name;
    int minArguments;  // including argv[0]
    int maxArguments;
    int (*run)(int argc, char** argv);
    const char* arguments;
} kCommands[] = {
        {"getenforce", 1, 1, Getenforce, ""},
        {"getprop", 1, 3, Getprop, "[NAME [DEFAULT]]"},
        {"id", 1, INT_MAX, Id, "[-Ggnru]"},
        {"log", 2, INT_MAX, Log, "[-p V|D|I|W|E|F|S] [-t TAG] TEXT..."},
        {"logcat", 1, INT_MAX, Logcat, ""},
        {"reboot", 1, 1, Reboot, ""},
        {"setenforce", 2, 2, Setenforce, "enforcing|permissive|1|0"},
        {"setprop", 3, 3, Setprop, "NAME VALUE"},
        {"settings", 3, 5, Settings, "put|get|delete|list system|secure|global [KEY [VALUE]]"},
        {"start", 1, 2, ControlService, "[SERVICE]"},
        {"stop", 1, 2, ControlService, "[SERVICE]"},
        {"whoami", 1, 1, Whoami, ""},
};

}  // namespace

int main(int argc, char** argv) {
    signal(SIGPIPE, SIG_IGN);
    if (host::DeviceRoot() < 0) {
        return 1;
    }
    for (const auto& command : kCommands) {
        if (strcmp(program_invocation_short_name, command.name) != 0) {
            continue;
        }
        const bool hasArguments = argc >= command.minArguments && argc <= command.maxArguments;
        const int status = hasArguments ? command.run(argc, argv) : kUsageError;
        if (status == kUsageError) {
            fprintf(stderr, "usage: %s %s\n", command.name, command.arguments);
        }
        // A closed pipe is not an error.
        const bool flushed = fflush(stdout) == 0 && ferror(stdout) == 0;
        return flushed || errno == EPIPE ? status : FailForErrno("cannot write");
    }
    fprintf(stderr, "toolbox: unknown command '%s'; run a command in device/bin\n",
            program_invocation_short_name);
    return 1;
}
