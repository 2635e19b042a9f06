// The way to the daemon: one transaction's form, which calls do not wait, and the runner around it.
#include "binder/corvane_sys_binder_client.h"

#include <binder/IServiceManager.h>
#include <binder/ProcessState.h>

#include "tests/fake_device.h"

namespace test {

class Binder : public Device {
  public:
    android::status_t Execute(const std::string& cmd, const std::string& params) {
        RunCmdParms("[TPD]first", "");
        const auto service = ICorvaneInterfaceClient::asInterface(g_thpBinder);
        StartsAfresh();
        return service->ExecuteCommand(reply, cmd, params);
    }
    std::string reply;
};

TEST_F(Binder, SendsTheseBytes) {
    Execute("[TPD]TSA_ExecuteCommand", "captest");
    std::string golden("\0\0\0\x80\xFF\xFF\xFF\xFFRDNV\x37\0\0\0", 16);
    for (const char c : std::string("android.CorvaneInterfaceServer.ICorvaneInterfaceService")) {
        golden += {c, '\0'};
    }
    EXPECT_EQ(request, golden + std::string("\0\0TSA_ExecuteCommand\0\0\1\0\0\0captest\0", 34));
}

TEST_F(Binder, SendsCommandsTwoWayOrOneWay) {
    const auto kCases = Table<3>(
            "[TPD]TSA|THP_SetFoldState 1|1 two-way [TSA] [THP_SetFoldState 1]|"
            "TSA|THP_SetFoldState 1|1 one-way [TSA] [THP_SetFoldState 1]|"
            "THP_ResetBaseline||1 two-way [THP_ResetBaseline]|x[TPD]y[TPD]z||1 two-way [y[TPD]z]|"
            "[TPD]||1 two-way []|[TPD|THP_SetAccData7|1 one-way [[TPD] [THP_SetAccData7]|"
            "an aftouches|p|1 one-way [an aftouches] [p]|"
            "Aftouch|aftouch|1 two-way [Aftouch] [aftouch]");
    for (const auto& [cmd, params, call] : kCases) {
        const bool oneWay = call[2] == 'o';
        EXPECT_EQ(Execute(cmd, params), android::OK);
        EXPECT_EQ(Trail("call"), call);
        EXPECT_EQ(reply + Trail("log"), oneWay ? "OKE (null): Async" : "answer") << cmd;
    }
    EXPECT_EQ(g_asyncThpCmds.size(), 41U);
    EXPECT_EQ(g_asyncCmds, std::vector<std::string>{"aftouch"});
    EXPECT_TRUE(!IsAsync({}, "") && IsAsync({"a", ""}, "") && !IsAsync({"abcde", "B"}, "abcd"));
}

TEST_F(Binder, FindsTheServiceOnceForAllCallsAndNotesItsDeath) {
    EXPECT_EQ(RunCmdParms("[TPD]help", "x"), "answer");
    EXPECT_EQ(Trail("read write log pause find tie call"),
              "log I (null): ThpGetBinder; find service.corvaneinterfaceservice; log E (null): "
              "enter; tie 1; log E (null): ThpGetBinder ret = -38; call 1 two-way [help] [x]");
    EXPECT_EQ(RunCmdParms("aftouch", ""), "OK");
    EXPECT_EQ(android::ProcessState::self()->getDriverName(), "/dev/vndbinder");
    answers = {{-32}, {0, nullptr}};
    EXPECT_EQ(RunCmdParms("[TPD]c", ""), "");  // on a second service, tied to the same
    ASSERT_TRUE(tied.size() == 2 && tied[0] == tied[1]);
    tied[1].promote()->binderDied(g_thpBinder);
    MyDeathRecipient(nullptr).binderDied(nullptr);
    EXPECT_EQ(Trail("tie untie"), "tie 1; tie 2; untie 1");
    EXPECT_NE(Trail("log").find("ret = -38; I (null): binder died; I (null): b"),
              std::string::npos);
}

TEST_F(Binder, TriesAgainThenRestartsTheDaemon) {
    const std::string none = kNoService, timeout =
                                                 "corvane_daemon binder server execute command "
                                                 "return ERROR, may caused by processing "
                                                 "timeout.";
    const auto kCases = Table<5>("[TPD]c|01||answer|ffc|[TPD]c|00||" + none +
                                 "|ffww|"
                                 "[TPD]c||0|answer|fcfc|[TPD]c|101|0|answer|fcffc|[TPD]c|100|0|" +
                                 none +
                                 "|fcffww|"
                                 "[TPD]c||00|" +
                                 timeout + "|fcfcww|aftouch||00|" + timeout + "|fcfcww");
    for (const auto& [cmd, finds, failures, result, shape] : kCases) {
        StartsAfresh();
        holds[kEnable] = "true";
        for (const char find : finds) {
            lookups.push_back(find == '1');
        }
        answers.resize(failures.length(), {-32});
        EXPECT_EQ(RunCmdParms(cmd, ""), result);
        EXPECT_EQ(Shape("find call write"), shape);
        EXPECT_EQ(g_thpBinder == nullptr, shape.back() == 'w');
    }
    const std::string log = Trail("log call write");
    EXPECT_EQ(log.substr(log.find("call 2")),
              "call 2 one-way [aftouch]; log I (null): retry = 2; log W (null): reboot; write "
              "odm.thp.service_enable=0; log E (null): retry:1, odm.thp.service_enable, [new]0, "
              "[old]true; write odm.thp.service_enable=1; log E (null): retry:1, "
              "odm.thp.service_enable, [new]1, [old]0");
    android::setDefaultServiceManager(nullptr);
    EXPECT_EQ(RunCmdParms("[TPD]c", ""), kNoService);
}

TEST_F(Binder, StoresAScreenStateBeforeTheCall) {
    RunCmdParms("[TPD]c", "version:3+main");
    for (const char* state : {"a version:3+whole,1", "version:3", "version:3+Main", ""}) {
        StoreScreenState(state);
    }
    EXPECT_EQ(Trail("write find"),
              "write odm.thp.screen_status=version:3+main; find service.corvaneinterfaceservice; "
              "write odm.thp.screen_status=a version:3+whole,1");
    StartsAfresh();
    refuses = {"odm.thp.screen_status"};
    StoreScreenState("version:3+main");
    EXPECT_EQ(Shape() + Trail("pause"), "rwlprwlprwlprwlprwlprwlp100; 100; 100; 100; 100; 100");
}

}  // namespace test
