// What the simulated daemon answers to its commands.
#pragma once

#include <string>

namespace device {

// The answer to one command with its parameters; says so when it knows no such command.
std::string Answer(const std::string& command, const std::string& params);

}  // namespace device
