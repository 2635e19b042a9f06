#include "programs.h"

#include <sys/stat.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>

#include "messages.h"
#include "platform/device_root.h"
#include "platform/files.h"

namespace device {

namespace {

// Runs the program with the directory of the device's commands first in PATH. `others` is the rest
// of PATH, with a colon before every directory. `arguments` includes argv[0].
int Exec(const std::string& program, std::vector<const char*> arguments,
         const std::string& others) {
    EnterDevice();
    setenv("PATH", (PathBesideProgram("bin") + others).c_str(), 1);
    arguments.push_back(nullptr);
    execv(program.c_str(), const_cast<char* const*>(arguments.data()));
    return FailForErrno(program);
}

}  // namespace

std::string PathBesideProgram(const std::string& name) {
    std::error_code error;
    const std::filesystem::path program = std::filesystem::read_symlink("/proc/self/exe", error);
    return (error ? "/proc/self/exe" : program.parent_path()) / name;
}

void EnterDevice() {
    struct stat root = {};
    fstat(host::DeviceRoot(), &root);
    const std::string identity = std::to_string(root.st_dev) + ":" + std::to_string(root.st_ino);
    setenv("TPD_DEVICE_PROCESS", identity.c_str(), 1);
    std::error_code error;
    const std::filesystem::path path = std::filesystem::canonical(host::AbsolutePath(""), error);
    setenv("TPD_DEVICE_ROOT", error ? host::DeviceRootPath().c_str() : path.c_str(), 1);
}

int ExecSibling(const char* name, std::vector<const char*> arguments) {
    arguments.insert(arguments.begin(), name);
    const char* const path = getenv("PATH");
    return Exec(PathBesideProgram(name), std::move(arguments),
                path == nullptr ? "" : std::string(":") + path);
}

int ExecShell(int argc, char** argv) {
    // The startup file and the prompt of an interactive shell.
    setenv("ENV", "/dev/null", 1);
    setenv("PS1", "virtual:$PWD # ", 1);
    if (argc == 0) {
        return Exec("/usr/bin/mksh", {"sh"}, "");
    }
    const std::string command = Join(argc, argv);
    return Exec("/usr/bin/mksh", {"sh", "-c", "--", command.c_str()}, "");
}

}  // namespace device
