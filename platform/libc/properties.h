// The files of properties, and the rules for their names and values.
#pragma once

#include <string>

namespace host {

// Returns a sentence that says why the name or the value is invalid, or nullptr if both are valid.
const char* PropertyError(const std::string& name, const std::string& value);

// Returns the path of the property's file in the device root.
std::string PropertyFile(const std::string& name);

}  // namespace host
