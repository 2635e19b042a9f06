// Sends commands to the daemon over the vendor binder.
#pragma once

#include <string>

#include <binder/IBinder.h>
#include <utils/StrongPointer.h>

#include "binder/ICorvaneInterfaceClient.h"

// The prefix of a result if the service is not found.
constexpr char kNoServicePrefix[] = "0F_1F; ";

// Sends `cmd` with `params` to the daemon and returns its answer, or "OK" for a one-way call.
// Blocks until the daemon answers; there is no time-out. Retries a failed call once, after a new
// service lookup. On failure, restarts the daemon and returns a text that begins with
// kNoServicePrefix if the service is not found, or contains "ERROR" if both calls fail.
std::string RunCmdParms(std::string cmd, std::string params);

// Restarts the daemon by setting its service property to "0" and then to "1".
void ResetDaemon();

// Stores `params` in the screen-state property if they contain a screen-state marker.
void StoreScreenState(std::string params);

// The service's binder. Null before the first successful lookup and after a failed call.
extern android::sp<android::IBinder> g_thpBinder;

// The death recipient, linked to every binder that a lookup returns. Null before the first one.
extern android::sp<MyDeathRecipient> g_deathRecipient;
