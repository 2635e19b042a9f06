// The logcat command of the device's shell.
#pragma once

#include <string>

namespace device {

// Returned by a command for a usage error; its caller prints the usage.
constexpr int kUsageError = -1;

// Returns the log priority for the letter, or -1 when it is unknown.
int PriorityOf(const std::string& letter);

// Prints or clears the log, or appends it to a file. Returns the exit status or kUsageError.
int Logcat(int argc, char** argv);

}  // namespace device
