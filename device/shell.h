// The device's shell, and how a program of the device is executed.
#pragma once

#include <string>
#include <vector>

namespace device {

// Marks this process and its children as the device's: its `ps` shows them. They use this root.
void EnterDevice();

// Replaces this process by a program that finds the device's commands and the tool before those of
// the machine. Returns 1, after a message, on failure.
int Exec(const std::string& program, std::vector<const char*> arguments);

// Replaces this process by the device's shell. The arguments, joined by spaces, are one command, as
// for `adb shell`; without any the shell reads its standard input. Returns 1, after a message, on
// failure.
int Shell(int argc, char** argv);

}  // namespace device
