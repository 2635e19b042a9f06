// The command logcat of the device's shell.
#pragma once

#include <string>

namespace device {

// What a command returns that was called with wrong arguments; its caller prints the usage.
constexpr int kUsageError = -1;

// The priority of the log with this letter, or -1.
int PriorityOf(const std::string& letter);

// Prints the log, empties it or writes it to a file, as the options say. Returns the exit status or
// kUsageError.
int Logcat(int argc, char** argv);

}  // namespace device
