#include "faults.h"

#include <sys/system_properties.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>

namespace device {

namespace {

constexpr int64_t kMaxSleepMs = 1'000'000'000;
constexpr int64_t kMaxTextBytes = 64 << 20;
constexpr int kWrongUse = 2;

constexpr Fault kFaults[] = {
        {FaultKind::kDieBefore, "die_before", "dies before it works on the command", nullptr, 0, 0},
        {FaultKind::kDieDuring, "die_during", "works, then dies before it replies", nullptr, 0, 0},
        {FaultKind::kDieAfter, "die_after", "replies, then dies", nullptr, 0, 0},
        {FaultKind::kRestart, "captest_restart", "die_after, for captest only", nullptr, 0, 0},
        {FaultKind::kHang, "hang", "replies late", "MILLISECONDS", 0, kMaxSleepMs},
        {FaultKind::kStatus, "status", "replies with a status", "STATUS", INT32_MIN, INT32_MAX},
        {FaultKind::kNoText, "no_text", "replies without a text", nullptr, 0, 0},
        {FaultKind::kHuge, "huge", "replies with a long text", "BYTES", 0, kMaxTextBytes},
};

void ListFaults() {
    for (const Fault& fault : kFaults) {
        printf("%-16s the daemon %s", fault.name, fault.effect);
        if (fault.argument != nullptr) {
            printf("; %s: %jd to %jd", fault.argument, intmax_t{fault.min}, intmax_t{fault.max});
        }
        putchar('\n');
    }
}

bool IsNumberWithin(const char* text, int64_t min, int64_t max) {
    char* end = nullptr;
    errno = 0;
    const int64_t number = strtoll(text, &end, 10);
    return errno == 0 && end != text && *end == '\0' && number >= min && number <= max;
}

int Refuse(const char* what, const char* why) {
    fprintf(stderr, "device: fault %s: %s; `device fault` lists what there is\n", what, why);
    return kWrongUse;
}

// The fault comes last, so that no call meets it with another one's argument.
int SetFault(const char* name, const char* argument, const char* count) {
    const bool isSet = __system_property_set("sim.fault", "") == 0 &&
                       __system_property_set("sim.fault_arg", argument) == 0 &&
                       __system_property_set("sim.fault_count", count) == 0 &&
                       __system_property_set("sim.fault", name) == 0;
    if (!isSet) {
        fputs("device: fault: the property is refused\n", stderr);
    }
    return isSet ? 0 : 1;
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
        return Refuse(argv[0], "no such fault");
    }
    const int arguments = fault->argument != nullptr ? 1 : 0;
    if (argc <= arguments || argc > arguments + 2) {
        return Refuse(argv[0], arguments > 0 ? "takes an argument and a count" : "takes a count");
    }
    if (arguments > 0 && !IsNumberWithin(argv[1], fault->min, fault->max)) {
        return Refuse(argv[1], "not an argument of this fault");
    }
    const char* const count = argc > arguments + 1 ? argv[arguments + 1] : "";
    if (*count != '\0' && !IsNumberWithin(count, 1, INT32_MAX)) {
        return Refuse(count, "not a count of calls");
    }
    return SetFault(fault->name, arguments > 0 ? argv[1] : "", count);
}

}  // namespace device
