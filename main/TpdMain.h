// The command-line front end: runs local commands and forwards all others to the daemon.
#pragma once

#include <functional>
#include <map>
#include <string>

class TpdCmd;

// A local command. The handler ignores its argument and returns a short confirmation.
struct Cmd {
    std::function<std::string(std::string)> handler;
};

// The daemon's controller. main() creates and deletes it; the pointer is null before and after.
extern TpdCmd* g_tpdCmd;

// The local commands by name. main() fills the table at startup and clears it before it returns.
extern std::map<std::string, Cmd> gTpdCmds;

// Add local commands to gTpdCmds. An existing entry keeps its handler.
void AddBasicTpdCmds();
void AddThplogTpdCmds();
void AddRawTpdCmds();
void AddAfelogTpdCmds();
void AddShowtouchTpdCmds();

// Runs the local command `name` and discards its confirmation. Returns false for an unknown name.
// The misspelling is part of the interface.
bool ExcuteTpdCmd(std::string name);

// Returns the help text that lists the local commands.
std::string CmdsToStr();

// Forwards "TSA_ExecuteCommand" with both arguments, joined by a space, as its parameters. Returns
// the result text. If `first` is empty, sends nothing and returns an empty string.
std::string Thp_runCommand(std::string first, std::string second);
