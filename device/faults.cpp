#include "faults.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/system_properties.h>

#include <algorithm>
#include <cstdlib>
#include <iterator>
#include <sstream>

#include "platform/events.h"
#include "platform/files.h"
#include "platform/unique_fd.h"
#include "properties.h"

namespace device {

namespace {

constexpr Range kCount = {"COUNT", 1, INT32_MAX};

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

// Locks the properties directory, so that only one process or thread at a time changes the fault.
// Closing the descriptor releases the lock.
host::UniqueFd LockFault() {
    host::UniqueFd lock = host::OpenFile(host::kPropertiesDirectory, O_RDONLY);
    if (lock.ok() && flock(lock.get(), LOCK_EX) != 0) {
        lock.reset();
    }
    return lock;
}

}  // namespace

std::string ParseFault(const std::string& text, Fault& fault) {
    std::istringstream words(text);
    const auto nextWord = [&words] {
        std::string word;
        words >> word;
        return word;
    };
    const std::string name = nextWord();
    const auto* const type =
            std::find_if(std::begin(kFaultTypes), std::end(kFaultTypes),
                         [&name](const FaultType& known) { return name == known.name; });
    if (type == std::end(kFaultTypes)) {
        return "unknown fault '" + name + "'";
    }
    fault.kind = type->kind;
    std::string error;
    std::string word = nextWord();
    if (type->argument.name != nullptr) {
        error = ParseNumber(word, type->argument, fault.argument);
        word = nextWord();
    }
    if (error.empty() && !word.empty() && type->kind != FaultKind::kNone) {
        error = ParseNumber(word, kCount, fault.count);
        word = nextWord();
    }
    if (error.empty() && !word.empty()) {
        error = "unexpected argument '" + word + "'";
    }
    return error.empty() ? "" : "fault " + name + ": " + error;
}

bool SetFault(const std::string& text) {
    const host::UniqueFd lock = LockFault();
    return lock.ok() && __system_property_set(kFaultKey, text.c_str()) == 0;
}

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

}  // namespace device
