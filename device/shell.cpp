#include "shell.h"

#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <filesystem>

#include "common.h"
#include "platform/device_root.h"

namespace device {

namespace {

constexpr char kShell[] = "/usr/bin/mksh";

// Runs the program with the directory of the device's commands first in PATH. `others` is the rest
// of PATH, with a colon before every directory.
int ExecWithPath(const std::string& program, std::vector<const char*> arguments,
                 const std::string& others) {
    const std::string bin = PathBesideProgram("bin");
    if (bin.find(':') != std::string::npos) {
        return Fail("'" + bin +
                    "' cannot be in PATH: it contains ':'; use another build directory");
    }
    EnterDevice();
    setenv("PATH", (bin + others).c_str(), 1);
    arguments.push_back(nullptr);
    execv(program.c_str(), const_cast<char* const*>(arguments.data()));
    return FailForErrno(program);
}

}  // namespace

void EnterDevice() {
    struct stat root = {};
    fstat(host::DeviceRoot(), &root);
    const std::string identity = std::to_string(root.st_dev) + ":" + std::to_string(root.st_ino);
    setenv("TPD_DEVICE_PROCESS", identity.c_str(), 1);
    std::error_code error;
    const std::string opened = "/proc/self/fd/" + std::to_string(host::DeviceRoot());
    const std::filesystem::path path = std::filesystem::read_symlink(opened, error);
    setenv("TPD_DEVICE_ROOT", error ? host::DeviceRootPath().c_str() : path.c_str(), 1);
}

int Exec(const std::string& program, std::vector<const char*> arguments) {
    const char* const path = getenv("PATH");
    const bool hasPath = path != nullptr && *path != '\0';
    return ExecWithPath(program, std::move(arguments),
                        std::string(":") + (hasPath ? path : "/usr/bin:/bin"));
}

int Shell(int argc, char** argv) {
    for (const char* const program : {kShell, "/usr/bin/toybox", "/usr/bin/original-awk"}) {
        if (access(program, X_OK) != 0) {
            return Fail(std::string(program) + ": " + strerror(errno) +
                        "; the shell needs the packages mksh, toybox and original-awk");
        }
    }
    // The startup file and the prompt of an interactive shell.
    setenv("ENV", "/dev/null", 1);
    setenv("PS1", "virtual:$PWD # ", 1);
    if (argc == 0) {
        return ExecWithPath(kShell, {"sh"}, "");
    }
    const std::string command = Join(argc, argv);
    return ExecWithPath(kShell, {"sh", "-c", "--", command.c_str()}, "");
}

}  // namespace device
