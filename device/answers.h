// Answers that the simulated daemon gives in place of its own. A command is written as `adb shell`
// sends it: its name, then its parameters, separated by spaces.
#pragma once

#include <cstddef>
#include <optional>
#include <string>

namespace device {

// Returns the answer that was recorded for the command with these parameters, else the one for the
// command with any parameters.
std::optional<std::string> FindAnswer(const std::string& command, const std::string& params);

size_t CountAnswers();

// `device answer`: lists, records or removes answers. Returns the exit status: 2 for a usage error.
int ListOrRecordAnswers(int argc, char** argv);

}  // namespace device
