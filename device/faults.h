// The faults of the simulated daemon. The property sim.fault holds the current one as
// NAME [ARGUMENT] [COUNT], like the arguments of `device fault`. An invalid value is ignored.
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
    int64_t argument = 0;  // the meaning depends on the kind
    int64_t count = 0;     // of calls that the fault affects; 0: all
};

// Returns the fault for a call of this command and decrements its remaining count.
Fault TakeFault(const std::string& command);

// `device fault`: sets the fault given by the arguments, or lists all faults without arguments.
// Returns the exit status, 2 for a usage error.
int SetOrListFaults(int argc, char** argv);

}  // namespace device
