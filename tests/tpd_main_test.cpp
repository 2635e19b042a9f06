#include "main/TpdMain.h"

#include "daemon/TpdCmd.h"
#include "tests/unit_test.h"

int tpd_main(int argc, char** argv);

namespace test {

constexpr char kHelpText[] =
        "\n\n//aaa special gTpdCmds\n"
        "debugDifEnable\ndebugRawEnable\nlog_afe_disable\nlog_afe_enable\nlog_disable\n"
        "log_enable\nreboot\nshowtouch\nshowtouch_close\nstart\nstop\n";

// Runs the tool with these arguments and returns its output.
std::string RunTool(std::vector<std::string> arguments) {
    std::vector<char*> argv;
    for (std::string& argument : arguments) {
        argv.push_back(argument.data());
    }
    testing::internal::CaptureStdout();
    EXPECT_EQ(tpd_main(static_cast<int>(argv.size()), argv.data()), 0);
    return testing::internal::GetCapturedStdout();
}

TEST(TpdMainTest, MarksForwardedCommandsAsTwoWay) {
    const struct {
        std::vector<std::string> arguments;
        Call call;
        const char* help;
    } kRows[] = {
            {{"tpd"}, Transact("help"), kHelpText},
            {{"tpd", "help"}, Transact("help"), kHelpText},
            {{"tpd", "help", ""}, Transact("help"), ""},
            {{"tpd", "Start"}, Transact("Start"), ""},
            {{"tpd", "aftouch"}, Transact("aftouch"), ""},
            {{"tpd", "start", "x"}, Transact("start, x"), ""},
            {{"tpd", "TSA_ExecuteCommand", "a", "b"}, Transact("TSA_ExecuteCommand, a b"), ""},
    };
    for (const auto& row : kRows) {
        SCOPED_TRACE(testing::PrintToString(row.arguments));
        FakeDevice device;
        device.getenforce = "Permissive\n";
        EXPECT_EQ(RunTool(row.arguments), std::string("answer") + row.help + "\n");
        EXPECT_THAT(device.calls({kTransact}), ElementsAre(row.call));
    }
}

TEST(TpdMainTest, IgnoresInvalidArguments) {
    const std::vector<std::string> kRows[] = {
            {},
            {"tpd", "TSA_ExecuteCommand", "", "b"},
            {"tpd", "TSA_ExecuteCommands", "a", "b"},
            {"tpd", "TSA_ExecuteCommand", "a", "b", "c"},
    };
    for (const auto& arguments : kRows) {
        SCOPED_TRACE(testing::PrintToString(arguments));
        FakeDevice device;
        EXPECT_EQ(RunTool(arguments), "\n");
        EXPECT_THAT(device.calls({kRead, kWrite, kGetService}), IsEmpty());
    }
}

TEST(TpdMainTest, ExecutesLocalCommands) {
    const std::string show = "settings put system show_touches ";
    const std::string point = "settings put system pointer_location ";
    const std::string afeKey = "odm.thp.debug.afelog";
    const Call debugOff = Write("persist.sys.zelmor.debug.on", "false");
    const Call storeVersion = Write("persist.odm.thp.ver_dae", "true");
    const Call setVersion = Write("odm.thp.ver_dae", "true");
    const Call logOff = Write(kThplogKey, "false");
    const struct {
        const char* command;
        std::vector<Call> calls;
    } kRows[] = {
            {"start", {kSetBootFlag, kStart}},
            {"stop", {kStop}},
            {"reboot", {kStop, kSetBootFlag, kStart}},
            {"log_enable", {Write(kThplogKey, "true"), kStop, kSetBootFlag, kStart}},
            {"log_disable",
             {debugOff, storeVersion, setVersion, logOff, kStop, kSetBootFlag, kStart}},
            {"debugRawEnable", {Write("thp.debug.raw", "true")}},
            {"debugDifEnable", {Write("thp.debug.raw", "false")}},
            {"log_afe_enable", {Write(afeKey, "true"), kStop, kSetBootFlag, kStart}},
            {"log_afe_disable", {Write(afeKey, "false"), kStop, kSetBootFlag, kStart}},
            {"showtouch", {Shell(show + "1"), Shell(point + "1")}},
            {"showtouch_close", {Shell(show + "0"), Shell(point + "0")}},
    };
    for (const auto& row : kRows) {
        SCOPED_TRACE(row.command);
        FakeDevice device;
        device.properties[kThplogKey] = row.command == std::string("log_disable") ? "true" : "";
        EXPECT_EQ(RunTool({"tpd", row.command}), "\n");
        EXPECT_THAT(device.calls({kWrite, kShell}), ElementsAreArray(row.calls));
    }
}

TEST(TpdMainTest, LogsALocalCommand) {
    FakeDevice device;
    RunTool({"tpd", "showtouch"});
    EXPECT_EQ(device.calls({kLog}).back(), Log(INFO, "ExcuteTpdCmd[145] Get cmd. showtouch\n"));
}

TEST(TpdMainTest, LogsAForwardedCommand) {
    FakeDevice device;
    device.properties[kPermissiveKey] = "1";
    RunTool({"tpd", "help"});
    EXPECT_THAT(device.calls({kLog}),
                ElementsAre(Log(INFO, "InitTpdCmds[120] +\n"), Log(INFO, "ExcuteTpdCmd[142] +\n"),
                            Log(INFO, "ExcuteTpdCmd[150] -\n"),
                            Log(INFO, "corvane_daemon ThpDebugExecuteCmd[156] cmd help\n"),
                            UntaggedLog(INFO, "ThpGetBinder"), UntaggedLog(ERROR, "enter"),
                            UntaggedLog(ERROR, "ThpGetBinder ret = 0"), Log(INFO, "ret = answer"),
                            Log(INFO, "CmdsToStr[130] +\n")));
}

TEST(TpdMainTest, SendsNothingWhileSelinuxIsEnforcing) {
    FakeDevice device;
    EXPECT_EQ(RunTool({"tpd"}),
              std::string("please exe 'adb shell setenforce 0' in g_tpdCmd to disable selinux\n") +
                      kHelpText + "\n");
    EXPECT_THAT(device.calls({kGetService}), IsEmpty());
    EXPECT_EQ(g_tpdCmd, nullptr);
    EXPECT_THAT(gTpdCmds, IsEmpty());
}

TEST(TpdMainTest, ReportsFailedAllocations) {
    FakeDevice device;
    device.failingAllocation = 1;
    EXPECT_EQ(RunTool({"tpd", "start"}), "can NOT alloc memory for g_tpdCmd");
    device.failingAllocation = 2;
    EXPECT_EQ(RunTool({"tpd", "start"}),
              "can NOT alloc memory for tpd_clientcan NOT Init g_tpdCmd");
}

}  // namespace test
