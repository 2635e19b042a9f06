// Runs the device's shell and other programs in the device's environment.
#pragma once

#include <string>
#include <vector>

namespace device {

// Makes this process and its children use the device root and appear in the device's `ps`.
void EnterDevice();

// Replaces this process with a program, with the device's commands first in PATH. `arguments`
// includes argv[0] but no final null pointer. On failure, prints an error and returns 1.
int Exec(const std::string& program, std::vector<const char*> arguments);

// Replaces this process with the device's shell. Like `adb shell`, joins the arguments with spaces
// into one command; without arguments, the shell reads standard input. On failure, prints an error
// and returns 1.
int Shell(int argc, char** argv);

}  // namespace device
