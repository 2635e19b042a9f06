// The faults that the simulated daemon can have.
#pragma once

#include <cstdint>
#include <string>

namespace device {

struct Fault {
    const char* name;
    const char* effect;
    const char* argument = nullptr;  // what it is, with its unit; null for a fault without one
    int64_t min = 0;                 // of the argument
    int64_t max = 0;
};

inline constexpr Fault kNoFault = {"none", "behaves"};
inline constexpr Fault kDieBefore = {"die_before", "dies before it works on the command"};
inline constexpr Fault kDieDuring = {"die_during", "works, then dies before it replies"};
inline constexpr Fault kDieAfter = {"die_after", "replies, then dies"};
inline constexpr Fault kRestart = {"captest_restart", "replies, then dies, for captest only"};
inline constexpr Fault kHang = {"hang", "replies late", "MILLISECONDS", 0, 1'000'000'000};
inline constexpr Fault kStatus = {"status", "replies with a status", "STATUS", INT32_MIN,
                                  INT32_MAX};
inline constexpr Fault kNoText = {"no_text", "replies without a text"};
inline constexpr Fault kHuge = {"huge", "replies with a long text", "BYTES", 0, 64 << 20};

inline constexpr const Fault* kFaults[] = {&kNoFault,  &kDieBefore, &kDieDuring,
                                           &kDieAfter, &kRestart,   &kHang,
                                           &kStatus,   &kNoText,    &kHuge};

// The fault of that name, or null.
inline const Fault* FindFault(const std::string& name) {
    for (const Fault* const fault : kFaults) {
        if (name == fault->name) {
            return fault;
        }
    }
    return nullptr;
}

}  // namespace device
