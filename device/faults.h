// The faults that the simulated daemon can be given.
#pragma once

#include <cstdint>
#include <string>

namespace device {

enum class FaultKind {
    kDieBefore,
    kDieDuring,
    kDieAfter,
    kRestart,
    kHang,
    kStatus,
    kNoText,
    kHuge
};

struct Fault {
    FaultKind kind;
    const char* name;
    const char* argument;  // what it is, with its unit; null for a fault that takes none
    int64_t min;           // of the argument
    int64_t max;
    const char* effect;  // what a call meets
};

// The fault of that name, or null.
const Fault* FindFault(const std::string& name);

// Carries out `device fault` with these arguments: [NAME [ARGUMENT] [COUNT] | none]. Returns the
// exit status: 0; 1 when the property was refused; 2 for wrong use.
int FaultCommand(int argc, char** argv);

}  // namespace device
