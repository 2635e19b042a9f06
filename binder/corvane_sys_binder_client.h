// Sends commands to the daemon over the vendor binder.
#pragma once

#include <string>

// Makes the call two-way when the command contains it. It is removed before the command is sent.
constexpr char kTwoWayMarker[] = "[TPD]";

// The prefix of a result when the service was not found.
constexpr char kNoServicePrefix[] = "0F_1F; ";

// Sends `cmd` with `params` to the daemon and returns its answer, "OK" for a one-way call. A failed
// call is retried once after a new service lookup. Returns a text that begins with kNoServicePrefix
// if the service is not found, or one that contains "ERROR" if both calls fail; in both cases the
// daemon is restarted. There is no time-out: blocks until the daemon answers.
std::string RunCmdParms(std::string cmd, std::string params);

// Restarts the daemon by setting its service property to "0" and then "1".
void ResetDaemon();

// Stores the parameters in the screen-state property if they contain a screen-state marker.
void StoreScreenState(std::string params);
