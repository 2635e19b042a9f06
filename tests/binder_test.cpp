#include <binder/IServiceManager.h>
#include <binder/ProcessState.h>

#include <algorithm>

#include "binder/corvane_sys_binder_client.h"
#include "cmdline/StringPairParser.h"
#include "tests/unit_test.h"

namespace test {

using BinderTest = DeviceTest;
using android::DEAD_OBJECT;

constexpr char kServiceMissing[] = "0F_1F; failed to get binder service";
const Call kLookup = UntaggedLog(INFO, "ThpGetBinder");
const Call kNotFound = UntaggedLog(ERROR, "ThpGetBinder, failed to get binder service\n");
const Call kNewRecipient = UntaggedLog(ERROR, "enter");
const Call kLinked = UntaggedLog(ERROR, "ThpGetBinder ret = 0");

TEST_F(BinderTest, SendsOnlyUnmarkedListedCommandsOneWay) {
    const Rows<std::string, const char*, Call, std::string> rows = {
            {"[TPD]c", "THP_SetFoldState", Transact("c, THP_SetFoldState"), "answer"},
            {"x[TPD]aftouch[TPD]z", "", Transact("aftouch[TPD]z"), "answer"},
            {"THP_SetAccData", "aftouch", Transact("THP_SetAccData, aftouch"), "answer"},
            {"an aftouches", "", TransactOneWay("an aftouches"), "OK"},
            {"[TPD", "THP_SetAccData7", TransactOneWay("[TPD, THP_SetAccData7"), "OK"},
    };
    for (const auto& [command, parameters, call, result] : rows) {
        EXPECT_EQ(RunCmdParms(command, parameters), result);
        EXPECT_EQ(device.calls().back(), call);
    }
    EXPECT_EQ(device.calls({kLog}).back(), UntaggedLog(ERROR, "Async"));
}

TEST_F(BinderTest, ListsThePhonesCommandsAsOneWay) {
    std::vector<std::string> names = Split(TPD_DAEMON_COMMANDS, " ");
    names.erase(std::find(names.begin(), names.end(), "TSA_ExecuteCommand"), names.end());
    EXPECT_EQ(g_asyncThpCmds, names);
    EXPECT_THAT(g_asyncCmds, ElementsAre("aftouch"));
}

TEST_F(BinderTest, LooksUpTheServiceOnce) {
    RunCmdParms("[TPD]a", "");
    RunCmdParms("[TPD]b", "");
    EXPECT_THAT(device.calls(), ElementsAre(kLookup, GetService(), kNewRecipient, LinkToDeath(1),
                                            kLinked, Transact("a"), Transact("b")));
    EXPECT_EQ(android::ProcessState::self()->getDriverName(), "/dev/vndbinder");
}

TEST_F(BinderTest, TreatsAReplyWithoutTextAsEmpty) {
    device.answers = {{android::OK, nullptr}, {android::OK, ""}};
    EXPECT_EQ(RunCmdParms("[TPD]c", ""), "");
    EXPECT_EQ(RunCmdParms("[TPD]c", ""), "");
    EXPECT_THAT(device.calls({kTransact}), SizeIs(2));
}

TEST_F(BinderTest, RetriesAFailedCallOnceAfterANewLookup) {
    device.lookups = {true, false, true};
    device.answers = {{DEAD_OBJECT}};
    EXPECT_EQ(RunCmdParms("[TPD]c", ""), "answer");
    EXPECT_THAT(device.calls(),
                ElementsAre(kLookup, GetService(), kNewRecipient, LinkToDeath(1), kLinked,
                            Transact("c"), UntaggedLog(INFO, "binder died"), UnlinkToDeath(1),
                            UntaggedLog(INFO, "retry = 1"), kLookup, GetService(), kNotFound,
                            kLookup, GetService(), LinkToDeath(2), kLinked, Transact("c")));
}

TEST_F(BinderTest, RestartsTheDaemonAfterTwoFailedCalls) {
    device.answers = {{DEAD_OBJECT}, {DEAD_OBJECT}};
    EXPECT_EQ(RunCmdParms("aftouch", ""),
              "corvane_daemon binder server execute command return ERROR, "
              "may caused by processing timeout.");
    EXPECT_EQ(g_thpBinder, nullptr);
    const Call call = TransactOneWay("aftouch");
    EXPECT_THAT(device.calls({kTransactOneWay, kUnlinkToDeath, kWrite}),
                ElementsAre(call, UnlinkToDeath(1), call, UnlinkToDeath(1), kStop, kStart));
}

TEST_F(BinderTest, RestartsTheDaemonWhenItsServiceIsMissing) {
    device.lookups = {false, false};
    EXPECT_EQ(RunCmdParms("[TPD]c", ""), kServiceMissing);
    const std::string write = "retry:1, odm.thp.service_enable, ";
    EXPECT_THAT(device.calls({kLog, kWrite}),
                ElementsAre(kLookup, kNotFound, kLookup, kNotFound, UntaggedLog(WARN, "reboot"),
                            kStop, UntaggedLog(ERROR, write + "[new]0, [old]"), kStart,
                            UntaggedLog(ERROR, write + "[new]1, [old]0")));
}

TEST_F(BinderTest, TreatsAMissingServiceManagerAsAMissingService) {
    android::setDefaultServiceManager(nullptr);
    EXPECT_EQ(RunCmdParms("[TPD]c", ""), kServiceMissing);
    EXPECT_EQ(device.calls({kLog})[1],
              UntaggedLog(ERROR, "ThpGetBinder, failed to get defaultServiceManager\n"));
}

TEST_F(BinderTest, StoresAScreenStateBeforeTheLookup) {
    RunCmdParms("[TPD]c", "version:3+main");
    for (const char* parameters : {"version:3", "version:3+Main", "", "a version:3+whole,1"}) {
        StoreScreenState(parameters);
    }
    EXPECT_THAT(device.calls({kWrite, kGetService}),
                ElementsAre(Write("odm.thp.screen_status", "version:3+main"), GetService(),
                            Write("odm.thp.screen_status", "a version:3+whole,1")));
}

TEST_F(BinderTest, GivesUpStoringAScreenStateAfterSixRejectedWrites) {
    device.rejectedWrites = {"odm.thp.screen_status"};
    StoreScreenState("version:3+main");
    EXPECT_THAT(device.calls({kRead, kWrite}), SizeIs(12));
    EXPECT_EQ(device.calls().back(), Pause(100us));
}

}  // namespace test
