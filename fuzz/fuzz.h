// Shared by the fuzz targets.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstdlib>

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size);

// Aborts if the condition is false; libFuzzer then saves the input.
inline void Check(bool condition) {
    if (!condition) {
        abort();
    }
}
