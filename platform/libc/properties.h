// The rules for names and values of properties.
#pragma once

#include <string>

namespace host {

// Returns the rule that the name or the value breaks, as a sentence, or nullptr.
const char* BrokenPropertyRule(const std::string& name, const std::string& value);

}  // namespace host
