// Commands to the daemon over the vendor binder, for the rest of the tool.
#pragma once

#include <string>

// Makes the call of a command that carries it two-way; sent without it and all that precedes it.
constexpr char kTwoWayMarker[] = "[TPD]";

// How an answer begins when the service could not be obtained.
constexpr char kNoServicePrefix[] = "0F_1F; ";

// Has the daemon execute `cmd` with `params` and returns its answer ("OK" for a one-way call). A
// failed call is tried once more on a fresh service lookup. When the service cannot be obtained the
// answer begins with kNoServicePrefix, when both calls fail it contains "ERROR"; either way a
// restart of the daemon was requested. Blocks until the daemon answers: the call has no time-out.
std::string RunCmdParms(std::string cmd, std::string params);

// Restarts the daemon by switching its service property off and on.
void ResetDaemon();

// Keeps parameters that carry a screen-state marker in the screen-state property.
void StoreScreenState(std::string params);
