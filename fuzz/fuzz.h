// Shared by the fuzz targets.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstdlib>

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size);

// Aborts the run and keeps the input when the condition is false.
inline void Check(bool condition) {
    if (!condition) {
        abort();
    }
}
