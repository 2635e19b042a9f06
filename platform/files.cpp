// Programs of the device open files by the device's paths. The linker leads their fopen() here.
#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>

#include "device_root.h"

extern "C" FILE* __real_fopen(const char* path, const char* mode);

// The device's own boot command line when the device root has one, else the machine's.
extern "C" FILE* __wrap_fopen(const char* path, const char* mode) {
    const int root = strcmp(path, "/proc/cmdline") == 0 ? host::DeviceRoot() : -1;
    if (root < 0) {
        return __real_fopen(path, mode);
    }
    const int file = openat(root, "proc/cmdline", O_RDONLY | O_NONBLOCK | O_CLOEXEC);
    if (file < 0) {
        return errno == ENOENT ? __real_fopen(path, mode) : nullptr;
    }
    FILE* const stream = fdopen(file, mode);
    if (stream == nullptr) {
        close(file);
    }
    return stream;
}
