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

#include "messages.h"
#include "platform/device_root.h"
#include "platform/events.h"
#include "platform/files.h"
#include "platform/libc/properties.h"
#include "programs.h"
#include "properties.h"

namespace {

using device::FailForErrno;
using device::kUsageError;  // makes main() print the usage

// Returns the whole value; __system_property_get() truncates a long one.
std::string WholeProperty(const std::string& name) {
    const std::string value = device::GetProperty(name);
    const bool isCut = value.length() == PROP_VALUE_MAX - 1;
    return isCut ? host::ReadFile(host::PropertyFile(name)).value_or("") : value;
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

int Setprop(int, char** argv) {
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
    if (device::GetProperty(device::kServiceStatePrefix + service).empty()) {
        return device::Fail("unknown service '" + service + "'");
    }
    const std::string request = device::kControlPrefix + verb;
    return __system_property_set(request.c_str(), service.c_str()) == 0
                   ? 0
                   : FailForErrno("cannot ask init");
}

int Getenforce(int, char**) {
    puts(device::SelinuxMode().c_str());
    return 0;
}

int Setenforce(int, char** argv) {
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

int Settings(int argc, char** argv) {
    const std::string verb = argv[1];
    const std::string space = argv[2];
    const std::string key = argc > 3 ? argv[3] : "";
    const std::string directory = "settings/" + space + "/";
    const std::string path = directory + key;
    const bool isSpace = space == "system" || space == "secure" || space == "global";
    if (!isSpace || key[0] == '.' || key.find('/') != std::string::npos) {
        return kUsageError;
    }
    if (verb == "list" && argc == 3) {
        for (const std::string& name : host::FilesIn(directory)) {
            const std::string value = host::ReadFile(directory + name).value_or("null");
            printf("%s=%s\n", name.c_str(), value.c_str());
        }
        return 0;
    }
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

int Log(int argc, char** argv) {
    const std::string letters = "VDIWEFS";  // from ANDROID_LOG_VERBOSE on
    size_t priority = letters.find('I');
    const char* tag = "log";
    for (int name = 0; (name = getopt(argc, argv, "+p:t:")) != -1;) {
        switch (name) {
            case 'p':
                priority = letters.find(static_cast<char>(toupper(optarg[0])));
                break;
            case 't':
                tag = optarg;
                break;
            default:
                return kUsageError;
        }
    }
    if (priority >= letters.length() || optind == argc) {
        return kUsageError;
    }
    const std::string text = device::Join(argc - optind, argv + optind);
    const int result = host::WriteLog(ANDROID_LOG_VERBOSE + static_cast<int>(priority), tag, text);
    return result >= 0 ? 0 : device::Fail(std::string("cannot log: ") + strerror(-result));
}

// The first argument of logcat.py is a file descriptor of the device root.
int Logcat(int argc, char** argv) {
    const std::string root = std::to_string(dup(host::DeviceRoot()));
    std::vector<const char*> arguments = {root.c_str()};
    arguments.insert(arguments.end(), argv + 1, argv + argc);
    return device::ExecSibling("logcat.py", arguments);
}

// The device's user is root, whoever runs the device.
int Id(int argc, char** argv) {
    const std::string options = argc > 1 ? device::Join(argc - 1, argv + 1) : "";
    if (options.find_first_not_of("-Ggnru ") != std::string::npos) {
        return kUsageError;
    }
    const bool isName = options.find('n') != std::string::npos;
    puts(options.empty() ? "uid=0(root) gid=0(root) groups=0(root)" : isName ? "root" : "0");
    return 0;
}

int Whoami(int, char**) {
    puts("root");
    return 0;
}

int Reboot(int, char**) { return device::ExecSibling("device", {"reboot"}); }

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
