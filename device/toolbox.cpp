// The device's shell commands in one program, which is found by the name that it is called by. They
// use the platform's own calls, so that the rules for names, sizes and access are one set.
#include <strings.h>
#include <sys/system_properties.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <string>

#include "common.h"
#include "logcat.h"
#include "platform/device_root.h"
#include "platform/files.h"

namespace {

// The longest argument that the kernel passes to a program.
constexpr size_t kMaxSettingBytes = 131072;

int Usage(const char* usage) {
    fprintf(stderr, "usage: %s\n", usage);
    return 1;
}

int Fail(const char* what) {
    fprintf(stderr, "%s: %s\n", what, strerror(errno));
    return 1;
}

int Getprop(int argc, char** argv) {
    if (argc > 2) {
        return Usage("getprop [NAME]");
    }
    if (argc == 2) {
        puts(device::GetProperty(argv[1]).c_str());
        return 0;
    }
    for (const std::string& name : device::FilesIn("properties")) {
        printf("[%s]: [%s]\n", name.c_str(), device::GetProperty(name.c_str()).c_str());
    }
    return 0;
}

int Setprop(int argc, char** argv) {
    if (argc != 3) {
        return Usage("setprop NAME VALUE");
    }
    const char* const name = argv[1];
    const std::string value = argv[2];
    // A value that stands already is no change, which init would act on.
    if ((!value.empty() && device::GetProperty(name) == value) ||
        __system_property_set(name, value.c_str()) == 0) {
        return 0;
    }
    fprintf(stderr, "Failed to set property '%s' to '%s'.\n", name, value.c_str());
    return 1;
}

int Getenforce(int argc, char** /* argv */) {
    if (argc != 1) {
        return Usage("getenforce");
    }
    puts(device::SelinuxMode().c_str());
    return 0;
}

int Setenforce(int argc, char** argv) {
    const std::string wanted = argc == 2 ? argv[1] : "";
    const bool isPermissive = wanted == "0" || strcasecmp(wanted.c_str(), "permissive") == 0;
    if (!isPermissive && wanted != "1" && strcasecmp(wanted.c_str(), "enforcing") != 0) {
        return Usage("setenforce enforcing|permissive|1|0");
    }
    if (!host::ReplaceFile("selinux", isPermissive ? "Permissive\n" : "Enforcing\n")) {
        return Fail("setenforce");
    }
    return 0;
}

std::string GetSetting(const std::string& path) {
    std::string value(kMaxSettingBytes, '\0');
    const ssize_t length = host::ReadFile(path, value.data(), value.size());
    return length < 0 ? "null" : value.substr(0, static_cast<size_t>(length));
}

int Settings(int argc, char** argv) {
    constexpr char kUsage[] = "settings put|get|delete|list system|secure|global [KEY [VALUE]]";
    const std::string verb = argc > 1 ? argv[1] : "";
    const std::string space = argc > 2 ? argv[2] : "";
    const std::string key = argc > 3 ? argv[3] : "";
    const std::string folder = "settings/" + space + "/";
    if (space != "system" && space != "secure" && space != "global") {
        return Usage(kUsage);
    }
    if (verb == "list" && argc == 3) {
        for (const std::string& name : device::FilesIn(folder)) {
            printf("%s=%s\n", name.c_str(), GetSetting(std::string(folder).append(name)).c_str());
        }
        return 0;
    }
    if (key.empty() || key.front() == '.' || key.find('/') != std::string::npos) {
        return Usage(kUsage);
    }
    const std::string path = folder + key;
    if (verb == "get" && argc == 4) {
        puts(GetSetting(path).c_str());
        return 0;
    }
    if (verb == "delete" && argc == 4) {
        printf("Deleted %d rows\n", unlinkat(host::DeviceRoot(), path.c_str(), 0) == 0 ? 1 : 0);
        return 0;
    }
    if (verb == "put" && argc == 5) {
        return host::ReplaceFile(path, argv[4]) ? 0 : Fail("settings");
    }
    return Usage(kUsage);
}

constexpr struct {
    const char* name;
    int (*run)(int argc, char** argv);
} kCommands[] = {{"getenforce", Getenforce}, {"getprop", Getprop}, {"logcat", device::Logcat},
                 {"setenforce", Setenforce}, {"setprop", Setprop}, {"settings", Settings}};

// A reader that has gone needs nothing more and is no error.
int Finish(int status) {
    if ((fflush(stdout) == 0 && ferror(stdout) == 0) || errno == EPIPE) {
        return status;
    }
    return Fail(program_invocation_short_name);
}

}  // namespace

int main(int argc, char** argv) {
    signal(SIGPIPE, SIG_IGN);
    if (host::DeviceRoot() < 0) {
        return 1;
    }
    for (const auto& command : kCommands) {
        if (strcmp(program_invocation_short_name, command.name) == 0) {
            return Finish(command.run(argc, argv));
        }
    }
    return Usage("getenforce|getprop|logcat|setenforce|setprop|settings, by links of these names");
}
