// The daemon's controller: starts, stops and restarts the daemon, switches its log, and decides
// whether commands may be forwarded. It only writes the daemon's control properties; the platform's
// init acts on them.
#pragma once

#include <cstdint>
#include <memory>

#include "daemon/TpdClient.h"

class TpdCmd {
  public:
    // Creates the client. Prints a message on standard output and returns false if out of memory.
    bool Init();

    void StartCorvane();
    void StopCorvane();
    void RebootCorvane();

    // Whether the touch-processing log is on. The user type decides if the log's property is
    // neither true nor false.
    static bool IsThplogEnable();

    // Switch the touch-processing log and restart the daemon for the change to take effect. Do
    // nothing in upgrade mode or if the log is already in that state.
    void EnableThplog();
    void DisableThplog();

    // The monotonic clock in milliseconds, or 0 if it cannot be read.
    static uint64_t GetMonotonicTime();

    // Whether commands may be forwarded: a stored flag is set, the device is in upgrade mode or
    // runs a factory build, or SELinux is permissive. The last is stored in the flag for later
    // runs. If it cannot be determined, the answer is no.
    bool IsSelinuxPermissive();

    // The client, owned by the controller. Null before Init() succeeds.
    TpdClient* GetTpdclient() const;

  private:
    std::unique_ptr<TpdClient> tpd_client;
};
