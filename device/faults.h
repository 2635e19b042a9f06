// The faults of the simulated daemon. The property sim.fault holds the current fault in the form of
// the arguments of `device fault`: NAME [ARGUMENT] [COUNT]. An invalid value is ignored.
#pragma once

#include <cstdint>
#include <string>

namespace device {

enum class FaultKind {
    kNone,
    kDieBefore,
    kDieDuring,
    kDieAfter,
    kHang,
    kStatus,
    kNoText,
    kHuge,
};

struct Fault {
    FaultKind kind = FaultKind::kNone;
    int64_t argument = 0;  // milliseconds, a status or bytes, depending on the kind
    int64_t count = 0;     // number of calls that the fault affects, 0 for all
};

// Returns the fault that affects this call, and decrements the fault's count.
Fault TakeFault();

// `device fault`: sets the fault given by the arguments or, without arguments, lists all faults.
// Returns the exit status, 2 for a usage error.
int SetOrListFaults(int argc, char** argv);

}  // namespace device
