// C library calls that the linker redirects here (--wrap). fopen() opens the device's kernel
// command line; the others are traced.
#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <optional>

#include "platform/device_root.h"
#include "platform/events.h"
#include "platform/files.h"

extern "C" {

FILE* __real_fopen(const char* path, const char* mode);
int __real_usleep(useconds_t us);
int __real_system(const char* command);
FILE* __real_popen(const char* command, const char* mode);
int __real_pclose(FILE* stream);

// Opens the kernel command line in the device root if there is one, otherwise the machine's.
FILE* __wrap_fopen(const char* path, const char* mode) {
    if (strcmp(path, "/proc/cmdline") != 0 || host::DeviceRoot() < 0) {
        return __real_fopen(path, mode);
    }
    host::UniqueFd file = host::OpenFile(host::kCommandLineFile, O_RDONLY);
    const bool isMissing = !file.ok() && errno == ENOENT;
    return isMissing ? __real_fopen(path, mode) : fdopen(file.release(), mode);
}

int __wrap_usleep(useconds_t us) {
    host::Event("pause").Add("us", us);
    return __real_usleep(us);
}

int __wrap_system(const char* command) {
    host::Event event("shell");
    const int status = __real_system(command);
    event.Add("command", command).Add("status", status);
    return status;
}

// The event of the open pipe. The tool is single-threaded and opens one pipe at a time.
static std::optional<host::Event> gPipe;

FILE* __wrap_popen(const char* command, const char* mode) {
    gPipe.emplace("shell").Add("command", command);
    return __real_popen(command, mode);
}

int __wrap_pclose(FILE* stream) {
    const int status = __real_pclose(stream);
    gPipe->Add("status", status);
    gPipe.reset();
    return status;
}

}  // extern "C"
