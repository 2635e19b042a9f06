// The command logcat of the device's shell.
#pragma once

namespace device {

// What a command returns that was called with wrong arguments; its caller prints the usage.
constexpr int kUsageError = -1;

// Prints the log, empties it or writes it to a file, as the options say. Returns the exit status or
// kUsageError.
int Logcat(int argc, char** argv);

}  // namespace device
