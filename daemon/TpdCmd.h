// The daemon's controller: starts, stops and restarts the daemon, switches its log on and off, and
// decides whether commands may be forwarded. It only writes control properties; init acts on them.
#pragma once

#include <cstdint>
#include <memory>

#include "daemon/TpdClient.h"

class TpdCmd {
  public:
    // Creates the client. If out of memory, prints a message to standard output and returns false.
    bool Init();

    // Request a start, stop or restart of the daemon without waiting for it.
    void StartCorvane();
    void StopCorvane();
    void RebootCorvane();

    // Returns true if the touch-processing log is on. If its property contains neither "true" nor
    // "false", the user type decides.
    static bool IsThplogEnable();

    // Switch the touch-processing log on or off and restart the daemon to apply the change. Do
    // nothing in upgrade mode or if the log is already in the requested state.
    void EnableThplog();
    void DisableThplog();

    // Returns the monotonic clock in milliseconds, or 0 if it cannot be read.
    static uint64_t GetMonotonicTime();

    // Returns true if commands may be forwarded: a stored flag is set, the device is in upgrade
    // mode or runs a factory build, or SELinux is permissive. In the last case, sets the flag.
    // Returns false if the SELinux mode cannot be determined.
    bool IsSelinuxPermissive();

    // Returns the client, owned by this object. Null before Init() succeeds.
    TpdClient* GetTpdclient() const;

  private:
    std::unique_ptr<TpdClient> tpd_client;
};
