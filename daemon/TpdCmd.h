// The daemon's controller: starts, stops and restarts it, switches its log, and checks whether
// SELinux lets commands through to it. It never handles the process itself; it writes the daemon's
// control properties and the platform acts on them.
#pragma once

#include <cstdint>
#include <memory>

#include "daemon/TpdClient.h"

class TpdCmd {
  public:
    // Creates the client. False, with a message on standard output, when there is no memory for it.
    bool Init();

    void StartCorvane();
    void StopCorvane();
    void RebootCorvane();

    // Whether the touch-processing log counts as on: as its property says, else by the user type.
    static bool IsThplogEnable();

    // Switch the touch-processing log and restart the daemon so that it takes effect. They do
    // nothing in upgrade mode or when the log is in that state already.
    void EnableThplog();
    void DisableThplog();

    // Reading of the monotonic clock in milliseconds; 0 when it cannot be read.
    static uint64_t GetMonotonicTime();

    // Whether commands may be forwarded to the daemon: when a stored flag, upgrade mode, a factory
    // build or a permissive SELinux says so. A permissive SELinux is stored in a property for later
    // runs. Any failure to find out means no.
    bool IsSelinuxPermissive();

    // The client, null before Init() succeeded. The controller owns it.
    TpdClient* GetTpdclient() const;

  private:
    std::unique_ptr<TpdClient> tpd_client;
};
