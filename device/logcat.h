// The device's log, for people.
#pragma once

namespace device {

// Carries out `logcat` with its arguments, the name first. Returns the exit status.
int Logcat(int argc, char** argv);

}  // namespace device
