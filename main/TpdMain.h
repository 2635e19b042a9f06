// The command front end: the local command table, and the dispatch of a command to it or to the
// daemon.
#pragma once

#include <functional>
#include <map>
#include <string>

class TpdCmd;

// A local command. Its handler returns a short confirmation.
struct Cmd {
    std::function<std::string(std::string)> handler;
};

// The controller. main creates and destroys it; null before and after.
extern TpdCmd* g_tpdCmd;

// The local commands by name. main fills the table before it dispatches and empties it at the end.
extern std::map<std::string, Cmd> gTpdCmds;

// Add local commands to the table. A name that is already there keeps its handler.
void AddBasicTpdCmds();
void AddThplogTpdCmds();
void AddRawTpdCmds();
void AddAfelogTpdCmds();
void AddShowtouchTpdCmds();

// Runs the local command of that name and discards its confirmation. Returns false if there is no
// such command. The misspelt name is part of the interface.
bool ExcuteTpdCmd(std::string name);

// Returns the help text that lists the local commands.
std::string CmdsToStr();

// Forwards "TSA_ExecuteCommand" with the two arguments, joined by a space, as its parameters and
// returns the result text. Sends nothing and returns an empty string if `first` is empty.
std::string Thp_runCommand(std::string first, std::string second);
