// The daemon's client: waits for the daemon, sends it one command and judges the outcome. Every
// outcome is a text for the user; nothing here fails in another way.
#pragma once

#include <cstdint>
#include <string>

class TpdClient {
  public:
    TpdClient();

    // Waits for the daemon, has it execute `cmd` with `params` and returns its answer. A text that
    // begins with "0P_1P; " says that nothing was sent: the daemon is not alive, or its firmware is
    // being updated. After two failed waits in a row each further wait makes a single check.
    std::string ThpExecuteCmdParams(std::string cmd, std::string params);

    // Sends one command without waiting. For a capacity test the answer grows by a failure text
    // when the daemon is not alive afterwards or its reboot indicator changed meanwhile.
    std::string RunCmd(const char* cmd, const char* params);

    // Whether this is a capacity test in running-test mode.
    static bool IsCaptestInRt(std::string cmd, std::string params);

    // Whether the daemon is up and its binder service published; appends both states to `info`.
    static bool IsDaemonAlive(std::string& info);

    // Checks at most `checks` times, 200 ms apart, whether the daemon is alive, and returns a
    // report. The outcome itself is in daemonUnavailable. A daemon that was seen alive in this
    // process is not checked again until a command has failed.
    std::string WaitDaemonAlive(int checks);

    int32_t daemonUnavailable;  // 0: the last wait or command found the daemon, otherwise 1
};

// What all clients of the process remember of the daemon, for its single thread.
extern bool aliveConfirmed;  // a check found it alive, and no command has failed since
extern int failedWaitCount;  // waits in a row that did not find it, at most 2
