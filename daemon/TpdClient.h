// The daemon's client: waits for the daemon, sends it a command and judges the outcome. Every
// outcome, failures included, is a text for the user.
#pragma once

#include <cstdint>
#include <string>

class TpdClient {
  public:
    TpdClient();

    // Waits for the daemon, sends it `cmd` with `params` and returns its answer. If the daemon is
    // not alive or is updating its firmware, sends nothing and returns a text that begins with
    // "0P_1P; ". After two failed waits in a row, further waits check only once.
    std::string ThpExecuteCmdParams(std::string cmd, std::string params);

    // Sends a command without waiting first. If the daemon died or restarted during a capacity
    // test, a failure text is appended to the answer.
    std::string RunCmd(const char* cmd, const char* params);

    // Whether this is a capacity test in running-test mode.
    static bool IsCaptestInRt(std::string cmd, std::string params);

    // Whether the daemon is alive and its binder service is published. Appends both states to
    // `info`.
    static bool IsDaemonAlive(std::string& info);

    // Checks up to `checks` times, 200 ms apart, whether the daemon is alive, sets
    // daemonUnavailable and returns a report. Once the daemon was seen alive in this process, it is
    // not checked again until a command has failed.
    std::string WaitDaemonAlive(int checks);

    int32_t daemonUnavailable;  // 0 if the last wait or command found the daemon, otherwise 1
};

// Shared by all clients of the process, which has one thread.
extern bool aliveConfirmed;  // the daemon was seen alive and no command has failed since
extern int failedWaitCount;  // failed waits in a row, at most 2
