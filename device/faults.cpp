#include "faults.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/system_properties.h>

#include <algorithm>
#include <iterator>
#include <sstream>

#include "platform/events.h"
#include "platform/files.h"
#include "platform/unique_fd.h"
#include "properties.h"

namespace device {

namespace {

bool ReadNumber(std::istream& words, int64_t min, int64_t max, int64_t& number) {
    return words >> number && number >= min && number <= max;
}

// Locks the properties directory, so that only one process or thread at a time changes the fault.
// Closing the descriptor releases the lock.
host::UniqueFd LockFault() {
    host::UniqueFd lock = host::OpenFile(host::kPropertiesDirectory, O_RDONLY);
    flock(lock.get(), LOCK_EX);
    return lock;
}

}  // namespace

std::optional<Fault> ParseFault(const std::string& text) {
    std::istringstream words(text);
    std::string name;
    words >> name;
    const auto* const type =
            std::find_if(std::begin(kFaultTypes), std::end(kFaultTypes),
                         [&name](const FaultType& known) { return name == known.name; });
    if (type == std::end(kFaultTypes)) {
        return std::nullopt;
    }
    Fault fault = {type->kind};
    const bool hasArgument = type->argument != nullptr;
    if (hasArgument && !ReadNumber(words, type->min, type->max, fault.argument)) {
        return std::nullopt;
    }
    if (!(words >> std::ws).eof() && !ReadNumber(words, 1, INT32_MAX, fault.count)) {
        return std::nullopt;
    }
    return (words >> std::ws).eof() ? std::optional(fault) : std::nullopt;
}

bool SetFault(const std::string& text) {
    const host::UniqueFd lock = LockFault();
    return __system_property_set(kFaultKey, text.c_str()) == 0;
}

Fault TakeFault() {
    const host::UniqueFd lock = LockFault();
    const std::string text = GetProperty(kFaultKey);
    const Fault fault = ParseFault(text).value_or(Fault());
    if (fault.kind == FaultKind::kNone) {
        return fault;
    }
    if (fault.count > 0) {
        constexpr char kSpace[] = " \t\n";
        const size_t count = text.find_last_of(kSpace, text.find_last_not_of(kSpace)) + 1;
        const std::string rest = text.substr(0, count) + std::to_string(fault.count - 1);
        __system_property_set(kFaultKey, fault.count > 1 ? rest.c_str() : "none");
    }
    host::Event("fault").Add("name", text);
    return fault;
}

}  // namespace device
