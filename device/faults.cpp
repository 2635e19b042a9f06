#include "faults.h"

#include <sys/system_properties.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>

namespace device {

namespace {

constexpr int64_t kMaxSleepMs = 1'000'000'000;  // eleven days
constexpr int64_t kMaxTextBytes = 64 << 20;
constexpr int kWrongUse = 2;

constexpr Fault kFaults[] = {
        {FaultKind::kDieBefore, "die_before", nullptr, 0, 0,
         "the daemon dies before it works on the command; no reply"},
        {FaultKind::kDieDuring, "die_during", nullptr, 0, 0,
         "the daemon works on the command, then dies; no reply"},
        {FaultKind::kDieAfter, "die_after", nullptr, 0, 0, "the daemon replies, then dies"},
        {FaultKind::kRestart, "captest_restart", nullptr, 0, 0,
         "as die_after, for the command captest only"},
        {FaultKind::kHang, "hang", "MILLISECONDS", 0, kMaxSleepMs, "the reply comes late"},
        {FaultKind::kStatus, "status", "STATUS", INT32_MIN, INT32_MAX,
         "a status and no reply text"},
        {FaultKind::kNoText, "no_text", nullptr, 0, 0, "a reply without a text"},
        {FaultKind::kHuge, "huge", "BYTES", 0, kMaxTextBytes, "a reply text of that size"},
};

void ListFaults() {
    for (const Fault& fault : kFaults) {
        const std::string name =
                std::string(fault.name) + " " + (fault.argument != nullptr ? fault.argument : "");
        printf("%-18s %s", name.c_str(), fault.effect);
        if (fault.argument != nullptr) {
            printf(" (%lld to %lld)", static_cast<long long>(fault.min),
                   static_cast<long long>(fault.max));
        }
        putchar('\n');
    }
    printf("%-18s the daemon behaves\n", "none");
}

bool IsNumberWithin(const char* text, int64_t min, int64_t max) {
    char* end = nullptr;
    errno = 0;
    const int64_t number = strtoll(text, &end, 10);
    return errno == 0 && end != text && *end == '\0' && number >= min && number <= max;
}

int Refuse(const char* what, const char* why) {
    fprintf(stderr, "device: fault %s: %s\n", what, why);
    return kWrongUse;
}

// The fault comes last, so that no call meets it with another one's argument.
int SetFault(const char* name, const char* argument, const char* count) {
    const bool set = __system_property_set("sim.fault", "") == 0 &&
                     __system_property_set("sim.fault_arg", argument) == 0 &&
                     __system_property_set("sim.fault_count", count) == 0 &&
                     __system_property_set("sim.fault", name) == 0;
    if (!set) {
        fprintf(stderr, "device: fault: the device refuses the property\n");
    }
    return set ? 0 : 1;
}

}  // namespace

const Fault* FindFault(const std::string& name) {
    for (const Fault& fault : kFaults) {
        if (name == fault.name) {
            return &fault;
        }
    }
    return nullptr;
}

int FaultCommand(int argc, char** argv) {
    if (argc == 0) {
        ListFaults();
        return 0;
    }
    if (argc == 1 && argv[0] == std::string("none")) {
        return SetFault("", "", "");
    }
    const Fault* const fault = FindFault(argv[0]);
    if (fault == nullptr) {
        return Refuse(argv[0], "no such fault; `device fault` lists them");
    }
    const int countAt = fault->argument != nullptr ? 2 : 1;
    if (argc < countAt || argc > countAt + 1) {
        return Refuse(argv[0], fault->argument != nullptr ? "takes an argument, then a count"
                                                          : "takes nothing but a count");
    }
    if (fault->argument != nullptr && !IsNumberWithin(argv[1], fault->min, fault->max)) {
        return Refuse(argv[1], "no number that this fault takes; `device fault` tells which");
    }
    const char* const count = argc > countAt ? argv[countAt] : "";
    if (*count != '\0' && !IsNumberWithin(count, 1, INT32_MAX)) {
        return Refuse(count, "no count of calls");
    }
    return SetFault(fault->name, fault->argument != nullptr ? argv[1] : "", count);
}

}  // namespace device
