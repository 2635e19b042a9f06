// What the setter of a property refuses.
#pragma once

#include <string>

namespace host {

// The rule that the name or the value of a property breaks, as a sentence, or nullptr.
const char* BrokenPropertyRule(const std::string& name, const std::string& value);

}  // namespace host
