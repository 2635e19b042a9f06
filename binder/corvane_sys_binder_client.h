// The way to the daemon over the vendor binder, for the rest of the tool.
#pragma once

#include <string>

// Has the daemon execute `cmd` with `params` and returns its answer ("OK" for a one-way call). A
// failed call is tried once more on a fresh service lookup. When the service cannot be obtained the
// answer begins with "0F_1F; ", when both calls fail it contains "ERROR"; either way the daemon has
// then been told to restart. Blocks until the daemon answers: the call has no time-out.
std::string RunCmdParms(std::string cmd, std::string params);

// Restarts the daemon by switching its service property off and on.
void ResetDaemon();

// Keeps a parameter text that carries a screen-state marker in the screen-state property.
void StoreScreenState(std::string params);
