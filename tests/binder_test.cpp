#include <binder/IServiceManager.h>
#include <binder/ProcessState.h>

#include "binder/ICorvaneInterfaceClient.h"
#include "binder/corvane_sys_binder_client.h"
#include "tests/unit_test.h"

namespace test {

using BinderTest = DeviceTest;
using android::DEAD_OBJECT;

constexpr char kServiceMissing[] = "0F_1F; failed to get binder service";
const Call kLookup = UntaggedLog(INFO, "ThpGetBinder");

TEST_F(BinderTest, WritesTheRequestAsTheDaemonReadsIt) {
    RunCmdParms("[TPD]TSA_ExecuteCommand", "captest");
    std::string expected("\0\0\0\x80\xFF\xFF\xFF\xFFRDNV\x37\0\0\0", 16);
    for (const char c : std::string("android.CorvaneInterfaceServer.ICorvaneInterfaceService")) {
        expected += {c, '\0'};
    }
    expected += std::string("\0\0TSA_ExecuteCommand\0\0\1\0\0\0captest\0", 34);
    EXPECT_EQ(device.request, expected);
}

TEST_F(BinderTest, SendsMarkedCommandsTwoWayAndNamedOnesOneWay) {
    const struct {
        const char* command;
        const char* parameters;
        Call call;
        const char* result;
    } kRows[] = {
            {"[TPD]c", "THP_SetFoldState 1", Transact("c, THP_SetFoldState 1"), "answer"},
            {"x[TPD]aftouch[TPD]z", "", Transact("aftouch[TPD]z"), "answer"},
            {"THP_SetAccData", "aftouch", Transact("THP_SetAccData, aftouch"), "answer"},
            {"an aftouches", "", TransactOneWay("an aftouches"), "OK"},
            {"[TPD", "THP_SetAccData7", TransactOneWay("[TPD, THP_SetAccData7"), "OK"},
    };
    for (const auto& row : kRows) {
        SCOPED_TRACE(row.command);
        EXPECT_EQ(RunCmdParms(row.command, row.parameters), row.result);
        EXPECT_EQ(device.calls().back(), row.call);
    }
}

TEST_F(BinderTest, LogsAOneWayCall) {
    RunCmdParms("aftouch", "");
    EXPECT_EQ(device.calls({kLog}).back(), UntaggedLog(ERROR, "Async"));
}

TEST_F(BinderTest, LooksTheServiceUpOnce) {
    RunCmdParms("[TPD]a", "");
    RunCmdParms("[TPD]b", "");
    EXPECT_THAT(
            device.calls(),
            ElementsAre(kLookup, GetService(), UntaggedLog(ERROR, "enter"), LinkToDeath(1),
                        UntaggedLog(ERROR, "ThpGetBinder ret = 0"), Transact("a"), Transact("b")));
    EXPECT_EQ(android::ProcessState::self()->getDriverName(), "/dev/vndbinder");
}

TEST_F(BinderTest, TakesAReplyWithoutATextForEmpty) {
    device.answers = {{android::OK, nullptr}};
    EXPECT_EQ(RunCmdParms("[TPD]c", ""), "");
}

TEST_F(BinderTest, TriesAFailedCallOnceMoreOnAFreshLookup) {
    device.lookups = {true, false, true};
    device.answers = {{DEAD_OBJECT}};
    EXPECT_EQ(RunCmdParms("[TPD]c", ""), "answer");
    EXPECT_THAT(device.calls({kGetService, kLinkToDeath, kTransact, kWrite}),
                ElementsAre(GetService(), LinkToDeath(1), Transact("c"), GetService(), GetService(),
                            LinkToDeath(2), Transact("c")));
    EXPECT_THAT(device.calls({kLog}), Contains(UntaggedLog(INFO, "retry = 1")));
}

TEST_F(BinderTest, RestartsTheDaemonAfterTwoFailedCalls) {
    device.answers = {{DEAD_OBJECT}, {DEAD_OBJECT}};
    EXPECT_EQ(RunCmdParms("aftouch", ""),
              "corvane_daemon binder server execute command return ERROR, may caused by "
              "processing timeout.");
    EXPECT_EQ(g_thpBinder, nullptr);
    EXPECT_THAT(device.calls({kGetService, kTransactOneWay, kWrite}),
                ElementsAre(GetService(), TransactOneWay("aftouch"), GetService(),
                            TransactOneWay("aftouch"), kStop, kStart));
}

TEST_F(BinderTest, RestartsTheDaemonWhoseServiceIsMissing) {
    device.lookups = {false, false};
    EXPECT_EQ(RunCmdParms("[TPD]c", ""), kServiceMissing);
    const Call notFound = UntaggedLog(ERROR, "ThpGetBinder, failed to get binder service\n");
    const std::string write = "retry:1, odm.thp.service_enable, ";
    EXPECT_THAT(device.calls({kGetService, kLog, kWrite}),
                ElementsAre(kLookup, GetService(), notFound, kLookup, GetService(), notFound,
                            UntaggedLog(WARN, "reboot"), kStop,
                            UntaggedLog(ERROR, write + "[new]0, [old]"), kStart,
                            UntaggedLog(ERROR, write + "[new]1, [old]0")));
}

TEST_F(BinderTest, TakesAMissingServiceManagerForAMissingService) {
    android::setDefaultServiceManager(nullptr);
    EXPECT_EQ(RunCmdParms("[TPD]c", ""), kServiceMissing);
    EXPECT_EQ(device.calls({kLog})[1],
              UntaggedLog(ERROR, "ThpGetBinder, failed to get defaultServiceManager\n"));
}

TEST_F(BinderTest, UnlinksFromTheFirstServiceWhenOneDies) {
    device.answers = {{DEAD_OBJECT}};
    RunCmdParms("[TPD]c", "");
    g_deathRecipient->binderDied(g_thpBinder);
    EXPECT_THAT(device.calls({kUnlinkToDeath}), ElementsAre(UnlinkToDeath(1)));
    EXPECT_EQ(device.calls({kLog}).back(), UntaggedLog(INFO, "binder died"));
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

TEST_F(BinderTest, GivesUpAScreenStateAfterSixRejectedWrites) {
    device.rejectedWrites = {"odm.thp.screen_status"};
    StoreScreenState("version:3+main");
    EXPECT_THAT(device.calls({kRead, kWrite}), SizeIs(12));
    EXPECT_EQ(device.calls().back(), Pause(100us));
}

}  // namespace test
