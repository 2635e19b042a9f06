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
    const char* effect;
    const char* argument;  // what it is, with its unit; null for a fault that takes none
    int64_t min;           // of the argument
    int64_t max;
};

// The fault of that name, or null.
const Fault* FindFault(const std::string& name);

// Gives the daemon a fault as `device fault` is asked to: [NAME [ARGUMENT] [COUNT] | none]; nothing
// lists them. Returns the exit status: 1 when a property was refused, 2 for wrong use.
int FaultCommand(int argc, char** argv);

}  // namespace device
