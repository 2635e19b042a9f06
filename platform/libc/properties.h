// The rules for names and values of properties.
#pragma once

#include <string>

namespace host {

// Returns a sentence that says why the name or the value is invalid, or nullptr if both are valid.
const char* PropertyError(const std::string& name, const std::string& value);

}  // namespace host
