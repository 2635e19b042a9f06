// The front end, called like the program: words in, what it prints and does to the device out.
#include "main/TpdMain.h"

#include "tests/fake_device.h"

int tpd_main(int argc, char** argv);

namespace test {

const std::string kHelpText =
        "\n\n//aaa special gTpdCmds\ndebugDifEnable\ndebugRawEnable\nlog_afe_disable\n"
        "log_afe_enable\nlog_disable\nlog_enable\nreboot\nshowtouch\nshowtouch_"
        "close\nstart\nstop\n";

class Tool : public Device {
  public:
    // What the tool prints for these words, its own name the first, with "," between them.
    std::string Prints(std::string words) {
        std::vector<char*> arguments = {words.data()};
        for (size_t at = 0; (at = words.find(',', at)) != std::string::npos;) {
            words[at] = '\0';
            arguments.push_back(&words[++at]);
        }
        testing::internal::CaptureStdout();
        EXPECT_EQ(tpd_main(static_cast<int>(arguments.size()), arguments.data()), 0);
        return testing::internal::GetCapturedStdout();
    }
};

TEST_F(Tool, DispatchesOnTheNumberOfWords) {
    const auto kCases = Table<3>(  // words, call, whether the help text follows
            "tpd|[help]|y|tpd,help|[help]|y|tpd,Start|[Start]||tpd,|[]||tpd,help,|[help]||"
            "tpd,start,x|[start] [x]||tpd,TSA_ExecuteCommand,a|[TSA_ExecuteCommand] [a]||"
            "tpd,TSA_ExecuteCommand,a,b|[TSA_ExecuteCommand] [a b]||"
            "tpd,TSA_ExecuteCommand,a,|[TSA_ExecuteCommand] [a ]||tpd,TSA_ExecuteCommand,,b|||"
            "tpd,TSA_ExecuteCommands,a,b|||tpd,tsa_ExecuteCommand,a,b|||tpd,TSA_ExecuteCommand,a,b,"
            "c||");
    getenforce = "Permissive\n";
    DaemonIs("true", "1");
    for (const auto& [words, call, help] : kCases) {
        StartsAfresh();
        EXPECT_EQ(Prints(words),
                  (call.empty() ? "" : "answer") + (help == "y" ? kHelpText : "") + "\n");
        EXPECT_EQ(Trail("call"), call.empty() ? "" : "1 two-way " + call);
        EXPECT_TRUE(g_tpdCmd == nullptr && gTpdCmds.empty() && holds.count(kEnable) == 0);
    }
}

TEST_F(Tool, RunsItsOwnCommands) {
    const auto kCases = Table<2>(
            "start|odm.thp.dae_bootflag=true; "
            "odm.thp.service_enable=1|stop|odm.thp.service_enable=0|"
            "log_enable|persist.odm.thp.thplog_enabled=true; " +
            kRestart + "|reboot|" + kRestart +
            "|log_disable|persist.sys.zelmor.debug.on=false|debugRawEnable|thp.debug.raw=true|"
            "debugDifEnable|thp.debug.raw=false|log_afe_enable|odm.thp.debug.afelog=true; " +
            kRestart + "|log_afe_disable|odm.thp.debug.afelog=false; " + kRestart +
            "|showtouch|settings put system show_touches 1; settings put system pointer_location 1|"
            "showtouch_close|settings put system show_touches 0; settings put system "
            "pointer_location 0");
    for (const auto& [name, steps] : kCases) {
        StartsAfresh();
        holds.clear();
        EXPECT_EQ(Prints("tpd," + name), "\n");
        EXPECT_EQ(Trail("write") + Trail("shell") + Trail("find"), steps);
        EXPECT_NE(Trail("log").find("Cmd[145] Get cmd. " + name + "\n"), std::string::npos);
    }
}

TEST_F(Tool, TracesAForwardedCommand) {
    const std::string refused =
            "please exe 'adb shell setenforce 0' in g_tpdCmd to disable selinux\n";
    EXPECT_EQ(Prints("tpd"), refused + kHelpText + "\n");
    StartsAfresh();
    DaemonIs("0", "0", "1");
    holds[kPermissive] = "true";
    const std::string report =
            "0P_1P; bypass-when-fw-updatingcheck_time: 0.thp.dae_alive : 0. thp.binder: 0";
    EXPECT_EQ(Prints("tpd,help"), report + kHelpText + "\n");
    EXPECT_EQ(Trail("log"),
              "I corvane_daemon: InitTpdCmds[120] +\n; I corvane_daemon: ExcuteTpdCmd[142] +\n; I "
              "corvane_daemon: ExcuteTpdCmd[150] -\n; I corvane_daemon: corvane_daemon "
              "ThpDebugExecuteCmd[156] cmd help\n; I corvane_daemon: ret = " +
                      report + "; I corvane_daemon: CmdsToStr[130] +\n");
}

TEST_F(Tool, SaysThatItHasNoMemory) {
    failingAllocation = 1;
    EXPECT_EQ(Prints("tpd,start"), "can NOT alloc memory for g_tpdCmd");
    failingAllocation = 2;
    EXPECT_EQ(Prints("tpd,start"), "can NOT alloc memory for tpd_clientcan NOT Init g_tpdCmd");
}

}  // namespace test
