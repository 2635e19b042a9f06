// Shared by the fuzz targets: a check that stops the run, and the run's device root.
#pragma once

#include <fcntl.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstddef>
#include <cstdint>
#include <string>

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size);

inline void Check(bool holds) {
    if (!holds) {
        abort();
    }
}

// The run's device root, which its log is kept out of by a folder of that name.
inline const std::string& UseDeviceRoot() {
    static const std::string root = [] {
        const char* const made = getenv("TPD_DEVICE_ROOT");
        Check(made != nullptr);
        for (const char* const each : {"/log", "/proc", "/properties"}) {
            mkdir((std::string(made) + each).c_str(), 0700);
        }
        return made;
    }();
    return root;
}

inline void WriteFile(const std::string& path, const std::string& bytes) {
    const int file = open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0600);
    Check(write(file, bytes.data(), bytes.size()) == static_cast<ssize_t>(bytes.size()));
    close(file);
}
