// The device's shell commands in one program, which is found by the name that it is called by. They
// use the platform's own calls, so that the rules for names, sizes and access are one set.
#include <dirent.h>
#include <fcntl.h>
#include <strings.h>
#include <sys/system_properties.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <set>
#include <string>

#include "common.h"
#include "logcat.h"
#include "platform/device_root.h"
#include "platform/files.h"

namespace {

constexpr size_t kMaxSettingBytes = 65536;

int Usage(const char* usage) {
    fprintf(stderr, "usage: %s\n", usage);
    return 1;
}

// The names in a folder of the device root, sorted. Empty when there is no such folder.
std::set<std::string> FilesIn(const std::string& folder) {
    std::set<std::string> names;
    const int descriptor = openat(host::DeviceRoot(), folder.c_str(),
                                  O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
    if (DIR* const files = fdopendir(descriptor); files != nullptr) {
        while (const dirent* const file = readdir(files)) {
            if (file->d_name[0] != '.') {
                names.insert(file->d_name);
            }
        }
        closedir(files);
    }
    return names;
}

int Getprop(int argc, char** argv) {
    if (argc > 2) {
        return Usage("getprop [NAME]");
    }
    if (argc == 2) {
        puts(device::GetProperty(argv[1]).c_str());
        return 0;
    }
    for (const std::string& name : FilesIn("properties")) {
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
    const char* const wanted = argc == 2 ? argv[1] : "";
    const char* mode = nullptr;
    if (strcmp(wanted, "0") == 0 || strcasecmp(wanted, "permissive") == 0) {
        mode = "Permissive\n";
    } else if (strcmp(wanted, "1") == 0 || strcasecmp(wanted, "enforcing") == 0) {
        mode = "Enforcing\n";
    } else {
        return Usage("setenforce enforcing|permissive|1|0");
    }
    if (!host::ReplaceFile("selinux", mode)) {
        fprintf(stderr, "setenforce: %s\n", strerror(errno));
        return 1;
    }
    return 0;
}

bool IsPlainName(const std::string& name) {
    return !name.empty() && name.front() != '.' && name.find('/') == std::string::npos;
}

std::string GetSetting(const std::string& path) {
    std::string value(kMaxSettingBytes, '\0');
    const ssize_t length = host::ReadFile(path, value.data(), value.size());
    value.resize(length > 0 ? static_cast<size_t>(length) : 0);
    return length >= 0 ? value : "null";
}

int Settings(int argc, char** argv) {
    const std::string verb = argc > 1 ? argv[1] : "";
    const std::string space = argc > 2 ? argv[2] : "";
    const std::string key = argc > 3 ? argv[3] : "";
    const int wanted = verb == "list" ? 3 : verb == "put" ? 5 : 4;
    if ((verb != "put" && verb != "get" && verb != "delete" && verb != "list") || argc != wanted ||
        (space != "system" && space != "secure" && space != "global") ||
        (verb != "list" && !IsPlainName(key))) {
        return Usage("settings put|get|delete|list system|secure|global [KEY [VALUE]]");
    }
    const std::string folder = "settings/" + space;
    const std::string path = folder + "/" + key;
    if (verb == "list") {
        for (const std::string& name : FilesIn(folder)) {
            printf("%s=%s\n", name.c_str(), GetSetting(folder + "/" + name).c_str());
        }
    } else if (verb == "get") {
        puts(GetSetting(path).c_str());
    } else if (verb == "delete") {
        printf("Deleted %d rows\n", unlinkat(host::DeviceRoot(), path.c_str(), 0) == 0 ? 1 : 0);
    } else if (strlen(argv[4]) > kMaxSettingBytes || !host::ReplaceFile(path, argv[4])) {
        fprintf(stderr, "settings: cannot store %s\n", key.c_str());
        return 1;
    }
    return 0;
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
    fprintf(stderr, "%s: %s\n", program_invocation_short_name, strerror(errno));
    return 1;
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
