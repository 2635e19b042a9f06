#include "main/TpdMain.h"

#include "daemon/TpdCmd.h"
#include "tests/unit_test.h"

int tpd_main(int argc, char** argv);

namespace test {

Call PutSetting(const std::string& arguments) { return Shell("settings put system " + arguments); }

// All local commands, with the calls that change the device.
const std::map<std::string, std::vector<Call>> kLocalCommands = {
        {"debugDifEnable", {Write("thp.debug.raw", "false")}},
        {"debugRawEnable", {Write("thp.debug.raw", "true")}},
        {"log_afe_disable", {Write("odm.thp.debug.afelog", "false"), kStop, kSetBootFlag, kStart}},
        {"log_afe_enable", {Write("odm.thp.debug.afelog", "true"), kStop, kSetBootFlag, kStart}},
        {"log_disable",
         {Write("persist.sys.zelmor.debug.on", "false"), Write("persist.odm.thp.ver_dae", "true"),
          Write("odm.thp.ver_dae", "true"), Write(kThplogKey, "false"), kStop, kSetBootFlag,
          kStart}},
        {"log_enable", {Write(kThplogKey, "true"), kStop, kSetBootFlag, kStart}},
        {"reboot", {kStop, kSetBootFlag, kStart}},
        {"showtouch", {PutSetting("show_touches 1"), PutSetting("pointer_location 1")}},
        {"showtouch_close", {PutSetting("show_touches 0"), PutSetting("pointer_location 0")}},
        {"start", {kSetBootFlag, kStart}},
        {"stop", {kStop}},
};

std::string HelpText() {
    std::string text = "\n\n//aaa special gTpdCmds\n";
    for (const auto& row : kLocalCommands) {
        text += row.first + "\n";
    }
    return text;
}

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
    const Rows<std::vector<std::string>, Call, std::string> rows = {
            {{"tpd"}, Transact("help"), HelpText()},
            {{"tpd", "help"}, Transact("help"), HelpText()},
            {{"tpd", "help", ""}, Transact("help"), ""},
            {{"tpd", "Start"}, Transact("Start"), ""},
            {{"tpd", "aftouch"}, Transact("aftouch"), ""},
            {{"tpd", "start", "x"}, Transact("start, x"), ""},
            {{"tpd", "TSA_ExecuteCommand", "a", "b"}, Transact("TSA_ExecuteCommand, a b"), ""},
    };
    for (const auto& [arguments, call, help] : rows) {
        SCOPED_TRACE(testing::PrintToString(arguments));
        FakeDevice device;
        device.getenforce = "Permissive\n";
        EXPECT_EQ(RunTool(arguments), "answer" + help + "\n");
        EXPECT_THAT(device.calls({kTransact}), ElementsAre(call));
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
    for (const auto& [command, calls] : kLocalCommands) {
        SCOPED_TRACE(command);
        FakeDevice device;
        device.properties[kThplogKey] = command == "log_disable" ? "true" : "";
        EXPECT_EQ(RunTool({"tpd", command}), "\n");
        EXPECT_THAT(device.calls({kWrite, kShell}), ElementsAreArray(calls));
        EXPECT_THAT(device.calls(),
                    Contains(Log(INFO, "ExcuteTpdCmd[145] Get cmd. " + command + "\n")));
    }
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
              "please exe 'adb shell setenforce 0' in g_tpdCmd to disable selinux\n" + HelpText() +
                      "\n");
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
