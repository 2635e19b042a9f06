// Recorded answers, which replace the simulated daemon's own. An answer is recorded for a command
// name, or for a command name and parameters separated by a space.
#pragma once

#include <optional>
#include <set>
#include <string>

namespace device {

// Returns the commands that have a recorded answer, with their parameters if any.
std::set<std::string> RecordedCommands();

// Returns the answer recorded for the command with these parameters or else for the command alone,
// or nullopt if there is neither.
std::optional<std::string> FindAnswer(const std::string& command, const std::string& params);

// `device answer`: lists, records or removes answers. Returns the exit status, 2 for a usage error.
int ListOrRecordAnswers(int argc, char** argv);

}  // namespace device
