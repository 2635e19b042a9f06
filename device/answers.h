// The store of recorded answers, which replace the simulated daemon's own. An answer is recorded
// for a command name, or for a command name and parameters separated by a space. A command name
// contains no space.
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

// Replace or remove the answer recorded for the command with its parameters, if any. Return false
// and set errno on failure.
bool RecordAnswer(const std::string& command, const std::string& answer);
bool RemoveAnswer(const std::string& command);

}  // namespace device
