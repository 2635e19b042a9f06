#include "main/TpdMain.h"

#include <android/log.h>

#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <new>

#include "binder/ICorvaneInterfaceClient.h"
#include "daemon/TpdCmd.h"
#include "property/Property.h"

TpdCmd* g_tpdCmd = nullptr;
std::map<std::string, Cmd> gTpdCmds;

namespace {

constexpr char kTag[] = "corvane_daemon";
constexpr char kHelp[] = "help";
constexpr char kTsaExecuteCommand[] = "TSA_ExecuteCommand";

// Log lines and result texts are part of the interface, including the constant numbers in brackets
// and "g_tpdCmd" in a message. Do not correct them.
void LogEnter(const char* function, int line) {
    __android_log_print(ANDROID_LOG_INFO, kTag, "%s[%d] +\n", function, line);
}

void AddTpdCmd(const char* name, std::string (*handler)(std::string)) {
    gTpdCmds.emplace(name, Cmd{handler});
}

// Ignores the exit status: local commands do not report failures.
void RunShell(const char* command) { [[maybe_unused]] const int status = system(command); }

void InitTpdCmds() {
    LogEnter("InitTpdCmds", 120);
    AddBasicTpdCmds();
    AddThplogTpdCmds();
    AddRawTpdCmds();
    AddAfelogTpdCmds();
    AddShowtouchTpdCmds();
}

// Forwards a command to the daemon if SELinux permits it. Returns the result text.
std::string ThpDebugExecuteCmd(std::string cmd, std::string params) {
    __android_log_print(ANDROID_LOG_INFO, kTag, "corvane_daemon %s[%d] cmd %s\n",
                        "ThpDebugExecuteCmd", 156, cmd.c_str());
    if (!g_tpdCmd->IsSelinuxPermissive()) {
        return "please exe 'adb shell setenforce 0' in g_tpdCmd to disable selinux\n";
    }
    std::string ret = g_tpdCmd->GetTpdclient()->ThpExecuteCmdParams(kTwoWayMarker + cmd, params);
    __android_log_print(ANDROID_LOG_INFO, kTag, "ret = %s", ret.c_str());
    return ret;
}

std::string Dispatch(int argc, char** argv) {
    std::string ret;
    switch (argc) {
        case 1:
            ret = ThpDebugExecuteCmd(kHelp, "");
            ret += CmdsToStr();
            break;
        case 2: {
            const std::string cmd = argv[1];
            if (!ExcuteTpdCmd(cmd)) {
                ret = ThpDebugExecuteCmd(cmd, "");
            }
            if (cmd == kHelp) {
                ret += CmdsToStr();
            }
            break;
        }
        case 3:
            ret = ThpDebugExecuteCmd(argv[1], argv[2]);
            break;
        case 4:
            if (argv[1] == std::string(kTsaExecuteCommand)) {
                ret = Thp_runCommand(argv[2], argv[3]);
            }
            break;
        default:
            break;
    }
    return ret;
}

}  // namespace

void AddBasicTpdCmds() {
    AddTpdCmd("start", [](std::string) -> std::string {
        g_tpdCmd->StartCorvane();
        return "start corvane_daemon done\n";
    });
    AddTpdCmd("stop", [](std::string) -> std::string {
        g_tpdCmd->StopCorvane();
        return "stop corvane_daemon done\n";
    });
    AddTpdCmd("reboot", [](std::string) -> std::string {
        g_tpdCmd->RebootCorvane();
        return "reboot corvane_daemon done\n";
    });
}

void AddThplogTpdCmds() {
    AddTpdCmd("log_enable", [](std::string) -> std::string {
        g_tpdCmd->EnableThplog();
        return "enable thplog\n";
    });
    AddTpdCmd("log_disable", [](std::string) -> std::string {
        Property().SetDebugOn(false);
        g_tpdCmd->DisableThplog();
        return "disable thplog\n";
    });
}

void AddRawTpdCmds() {
    AddTpdCmd("debugRawEnable", [](std::string) -> std::string {
        Property().SetRawData(true);
        return "set thp.debug.raw as 1\n";
    });
    AddTpdCmd("debugDifEnable", [](std::string) -> std::string {
        Property().SetRawData(false);
        return "set thp.debug.raw as 0\n";
    });
}

void AddAfelogTpdCmds() {
    AddTpdCmd("log_afe_enable", [](std::string) -> std::string {
        Property().SetAfeLog(true);
        g_tpdCmd->RebootCorvane();
        return "enable afehal log\n";
    });
    AddTpdCmd("log_afe_disable", [](std::string) -> std::string {
        Property().SetAfeLog(false);
        g_tpdCmd->RebootCorvane();
        return "disable afehal log\n";
    });
}

void AddShowtouchTpdCmds() {
    AddTpdCmd("showtouch", [](std::string) -> std::string {
        RunShell("settings put system show_touches 1");
        RunShell("settings put system pointer_location 1");
        return "show touch done\n";
    });
    AddTpdCmd("showtouch_close", [](std::string) -> std::string {
        RunShell("settings put system show_touches 0");
        RunShell("settings put system pointer_location 0");
        return "close touch show done\n";
    });
}

bool ExcuteTpdCmd(std::string name) {
    LogEnter("ExcuteTpdCmd", 142);
    const auto entry = gTpdCmds.find(name);
    if (entry == gTpdCmds.end()) {
        __android_log_print(ANDROID_LOG_INFO, kTag, "%s[%d] -\n", "ExcuteTpdCmd", 150);
        return false;
    }
    __android_log_print(ANDROID_LOG_INFO, kTag, "%s[%d] Get cmd. %s\n", "ExcuteTpdCmd", 145,
                        name.c_str());
    entry->second.handler("");
    return true;
}

std::string CmdsToStr() {
    LogEnter("CmdsToStr", 130);
    std::string text = "\n\n//aaa special gTpdCmds\n";
    for (const auto& entry : gTpdCmds) {
        text += entry.first + "\n";
    }
    return text;
}

std::string Thp_runCommand(std::string first, std::string second) {
    if (first.empty()) {
        return "";
    }
    return ThpDebugExecuteCmd(kTsaExecuteCommand, first + " " + second);
}

// Always returns 0; callers read the result text. After a failed allocation, returns at once and
// leaves the cleanup to the kernel.
int main(int argc, char** argv) {
    g_tpdCmd = new (std::nothrow) TpdCmd;
    if (g_tpdCmd == nullptr) {
        printf("can NOT alloc memory for g_tpdCmd");
        return 0;
    }
    if (!g_tpdCmd->Init()) {
        printf("can NOT Init g_tpdCmd");
        return 0;
    }
    InitTpdCmds();

    const std::string ret = Dispatch(argc, argv);
    // Survive a closed pipe. Set only now, because the commands run above would inherit it.
    signal(SIGPIPE, SIG_IGN);
    printf("%s", ret.c_str());
    putchar('\n');

    delete g_tpdCmd;
    g_tpdCmd = nullptr;
    gTpdCmds.clear();
    return 0;
}
