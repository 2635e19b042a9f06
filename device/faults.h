// The faults of the simulated daemon. The property sim.fault holds the current fault in the form
// NAME [ARGUMENT] [COUNT]. An invalid value is ignored.
#pragma once

#include <cstdint>
#include <optional>
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

constexpr struct FaultType {
    FaultKind kind;
    const char* name;
    const char* effect;              // what the daemon does
    const char* argument = nullptr;  // its name, or null if there is none
    int64_t min = 0;
    int64_t max = 0;
} kFaultTypes[] = {
        {FaultKind::kNone, "none", "works normally"},
        {FaultKind::kDieBefore, "die_before", "dies before it processes the command"},
        {FaultKind::kDieDuring, "die_during", "processes the command, then dies before it replies"},
        {FaultKind::kDieAfter, "die_after", "replies, then dies"},
        {FaultKind::kHang, "hang", "replies late", "MILLISECONDS", 0, 1'000'000'000},
        {FaultKind::kStatus, "status", "replies with a status", "STATUS", INT32_MIN, INT32_MAX},
        {FaultKind::kNoText, "no_text", "replies without a text"},
        {FaultKind::kHuge, "huge", "replies with a long text", "BYTES", 0, 64 << 20},
};

struct Fault {
    FaultKind kind = FaultKind::kNone;
    int64_t argument = 0;  // milliseconds, a status or bytes, depending on the kind
    int64_t count = 0;     // number of calls that the fault affects, 0 for all
};

// Parses NAME [ARGUMENT] [COUNT]. Returns nullopt if it is invalid.
std::optional<Fault> ParseFault(const std::string& text);

// Sets the fault, given in valid form. Returns false and sets errno on failure.
bool SetFault(const std::string& text);

// Returns the fault that affects this call, and decrements the fault's count.
Fault TakeFault();

}  // namespace device
