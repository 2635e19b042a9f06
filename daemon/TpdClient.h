// Waits for the daemon and sends it commands. Every result, including a failure, is a text for the
// user.
#pragma once

#include <cstdint>
#include <string>

class TpdClient {
  public:
    TpdClient();

    // Waits for the daemon, sends it `cmd` with `params` and returns the result text. If the daemon
    // is not alive, sends nothing and returns a text that begins with "0P_1P; ". After two
    // consecutive failed waits, checks only once.
    std::string ThpExecuteCmdParams(std::string cmd, std::string params);

    // Sends a command without waiting for the daemon and returns the result text. Appends a failure
    // text if the daemon died or restarted during a capacity test.
    std::string RunCmd(const char* cmd, const char* params);

    // Returns true for a capacity test in running-test mode.
    static bool IsCaptestInRt(std::string cmd, std::string params);

    // Returns true if the daemon is alive and its binder service is published. Appends both states
    // to `info`.
    static bool IsDaemonAlive(std::string& info);

    // Checks up to `checks` times whether the daemon is alive, with a pause of 200 ms after each
    // failed check but the first. Gives up early during a firmware update. Sets daemonUnavailable
    // and returns a report. Once the daemon has been seen alive, skips the check until a command
    // fails.
    std::string WaitDaemonAlive(int checks);

    int32_t daemonUnavailable;  // 0 if the last wait or command found the daemon, otherwise 1
};

// Shared by all clients in the process. Not thread-safe.
extern bool aliveConfirmed;  // the daemon was seen alive and no command has failed since
extern int failedWaitCount;  // consecutive failed waits, at most 2
