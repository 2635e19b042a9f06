// The faults of the simulated daemon. The one that is set is the property sim.fault:
// NAME [ARGUMENT] [COUNT], as the arguments of `device fault`; anything else is no fault.
#pragma once

#include <cstdint>
#include <string>

namespace device {

enum class FaultKind {
    kNone,
    kDieBefore,
    kDieDuring,
    kDieAfter,
    kCaptestRestart,
    kHang,
    kStatus,
    kNoText,
    kHuge,
};

struct Fault {
    FaultKind kind = FaultKind::kNone;
    int64_t argument = 0;  // what it is depends on the kind
    int64_t count = 0;     // the number of calls that it affects; 0: all of them
};

// Returns the fault that affects a call of this command, and counts the call.
Fault TakeFault(const std::string& command);

// `device fault`: sets the fault that the arguments name, or lists all faults when there are none.
// Returns the exit status: 2 for a usage error.
int SetOrListFaults(int argc, char** argv);

}  // namespace device
