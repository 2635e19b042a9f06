// The command front end: the local command table, and the dispatch of a command to it or to the
// daemon.
#pragma once

#include <functional>
#include <map>
#include <string>

class TpdCmd;

// A local command. Its handler answers with a short confirmation.
struct Cmd {
    std::function<std::string(std::string)> handler;
};

// The one controller, which main creates and destroys; null outside of it.
extern TpdCmd* g_tpdCmd;

// The local commands by name; main fills it first and empties it last.
extern std::map<std::string, Cmd> gTpdCmds;

// Put their commands into the table; a name that is already there keeps its handler.
void AddBasicTpdCmds();
void AddThplogTpdCmds();
void AddRawTpdCmds();
void AddAfelogTpdCmds();
void AddShowtouchTpdCmds();

// Runs the local command of exactly this name and drops its confirmation. False when there is none.
// The interface fixes this spelling.
bool ExcuteTpdCmd(std::string name);

// The help text that lists the local commands.
std::string CmdsToStr();

// Has the daemon run "TSA_ExecuteCommand" with both arguments, joined by a space, as its parameters
// and returns the result text. Empty, with nothing sent, when the first argument is empty.
std::string Thp_runCommand(std::string first, std::string second);
