// The programs of the device, and the environment in which they run.
#pragma once

#include <string>
#include <vector>

namespace device {

// Returns the path of a file in the directory of the running executable. Without /proc, returns a
// path that does not exist.
std::string PathBesideProgram(const std::string& name);

// Makes this process and its children use the device root and appear in the device's `ps`.
void EnterDevice();

// Replaces this process with a program in the same directory, with the device's commands first in
// PATH. On failure, prints an error and returns 1.
int ExecSibling(const char* name, std::vector<const char*> arguments);

// Replaces this process with the device's shell. Like `adb shell`, joins the arguments with spaces
// into one command; without arguments, the shell reads standard input. On failure, prints an error
// and returns 1.
int ExecShell(int argc, char** argv);

}  // namespace device
