#include "faults.h"

#include <sys/file.h>
#include <sys/system_properties.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <iterator>
#include <sstream>

#include "common.h"
#include "platform/events.h"
#include "platform/files.h"
#include "platform/unique_fd.h"

namespace device {

namespace {

struct Range {
    const char* name;  // null if the fault has no argument
    int64_t min;
    int64_t max;
};

constexpr Range kNoArgument = {nullptr, 0, 0};
constexpr Range kCount = {"COUNT", 1, INT32_MAX};

constexpr struct FaultRow {
    FaultKind kind;
    const char* name;
    const char* effect;
    Range argument;
} kFaults[] = {
        {FaultKind::kNone, "none", "works normally", kNoArgument},
        {FaultKind::kDieBefore, "die_before", "dies before it processes the command", kNoArgument},
        {FaultKind::kDieDuring, "die_during", "processes the command, then dies before it replies",
         kNoArgument},
        {FaultKind::kDieAfter, "die_after", "replies, then dies", kNoArgument},
        {FaultKind::kHang, "hang", "replies late", {"MILLISECONDS", 0, 1'000'000'000}},
        {FaultKind::kStatus, "status", "replies with a status", {"STATUS", INT32_MIN, INT32_MAX}},
        {FaultKind::kNoText, "no_text", "replies without a text", kNoArgument},
        {FaultKind::kHuge, "huge", "replies with a long text", {"BYTES", 0, 64 << 20}},
};

// Stores the value of `word` in `number`. Returns an empty string, or an error message if the word
// is invalid.
std::string ParseNumber(const std::string& word, const Range& range, int64_t& number) {
    char* end = nullptr;
    number = strtoll(word.c_str(), &end, 10);
    if (!word.empty() && *end == '\0' && number >= range.min && number <= range.max) {
        return "";
    }
    const std::string name = range.name;
    return (word.empty() ? "missing " + name : "invalid " + name + " '" + word + "'") + "; use " +
           std::to_string(range.min) + " to " + std::to_string(range.max);
}

// Parses NAME [ARGUMENT] [COUNT]. Returns an empty string, or an error message that names the
// invalid word.
std::string ParseFault(const std::string& text, Fault& fault) {
    std::istringstream words(text);
    const auto nextWord = [&words] {
        std::string word;
        words >> word;
        return word;
    };
    const std::string name = nextWord();
    const auto* const row =
            std::find_if(std::begin(kFaults), std::end(kFaults),
                         [&](const FaultRow& candidate) { return name == candidate.name; });
    if (row == std::end(kFaults)) {
        return "unknown fault '" + name + "'; " + Command("fault") + " lists them";
    }
    fault.kind = row->kind;
    std::string error;
    std::string word = nextWord();
    if (row->argument.name != nullptr) {
        error = ParseNumber(word, row->argument, fault.argument);
        word = nextWord();
    }
    if (error.empty() && !word.empty() && row->kind != FaultKind::kNone) {
        error = ParseNumber(word, kCount, fault.count);
        word = nextWord();
    }
    if (error.empty() && !word.empty()) {
        error = "unexpected argument '" + word + "'";
    }
    return error.empty() ? "" : "fault " + name + ": " + error;
}

// Locks the properties directory, so that only one process or thread at a time changes the fault.
// Closing the descriptor releases the lock.
host::UniqueFd LockFault() {
    host::UniqueFd lock = host::OpenDirectory(host::kPropertiesDirectory);
    if (lock.ok() && flock(lock.get(), LOCK_EX) != 0) {
        lock.reset();
    }
    return lock;
}

int ListFaults() {
    for (const FaultRow& fault : kFaults) {
        printf("%-16s the daemon %s", fault.name, fault.effect);
        if (fault.argument.name != nullptr) {
            printf("; %s: %jd to %jd", fault.argument.name, intmax_t{fault.argument.min},
                   intmax_t{fault.argument.max});
        }
        puts("");
    }
    return 0;
}

}  // namespace

Fault TakeFault() {
    const host::UniqueFd lock = LockFault();
    const std::string text = GetProperty(kFaultKey);
    Fault fault;
    const bool isValid = lock.ok() && ParseFault(text, fault).empty();
    if (!isValid || fault.kind == FaultKind::kNone) {
        return {};
    }
    if (fault.count > 0) {
        const std::string left = std::to_string(fault.count - 1);
        const std::string rest = text.substr(0, text.rfind(' ') + 1) + left;
        __system_property_set(kFaultKey, fault.count > 1 ? rest.c_str() : "none");
    }
    host::Event("fault").Add("name", text);
    return fault;
}

int SetOrListFaults(int argc, char** argv) {
    if (argc == 0) {
        return ListFaults();
    }
    const std::string text = Join(argc, argv);
    Fault fault;
    if (const std::string error = ParseFault(text, fault); !error.empty()) {
        return Fail(error, kUsageError);
    }
    const host::UniqueFd lock = LockFault();
    if (!lock.ok() || __system_property_set(kFaultKey, text.c_str()) != 0) {
        return FailForErrno("cannot set the fault");
    }
    return 0;
}

}  // namespace device
