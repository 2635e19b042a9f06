#include <binder/IServiceManager.h>
#include <binder/ProcessState.h>
#include <gmock/gmock.h>

#include "binder/ICorvaneInterfaceClient.h"
#include "binder/corvane_sys_binder_client.h"
#include "tests/fake_device.h"

namespace test {

using namespace std::chrono_literals;
using testing::Contains;
using testing::ElementsAre;
using testing::IsEmpty;

constexpr char kServiceMissing[] = "0F_1F; failed to get binder service";
constexpr char kTimeout[] =
        "corvane_daemon binder server execute command return ERROR, may caused by processing "
        "timeout.";
const Call kStop = Write("odm.thp.service_enable", "0");
const Call kStart = Write("odm.thp.service_enable", "1");

TEST(BinderTest, WritesTheRequestAsTheDaemonReadsIt) {
    FakeDevice device;
    RunCmdParms("[TPD]TSA_ExecuteCommand", "captest");
    std::string expected("\0\0\0\x80\xFF\xFF\xFF\xFFRDNV\x37\0\0\0", 16);
    for (const char c : std::string("android.CorvaneInterfaceServer.ICorvaneInterfaceService")) {
        expected += {c, '\0'};
    }
    expected += std::string("\0\0TSA_ExecuteCommand\0\0\1\0\0\0captest\0", 34);
    EXPECT_EQ(device.request, expected);
}

TEST(BinderTest, WaitsForTheAnswerToAMarkedCommand) {
    const struct {
        const char* command;
        const char* parameters;
        Call call;
    } kRows[] = {
            {"[TPD]c", "THP_SetFoldState 1", Transact(1, kTwoWay, "c", "THP_SetFoldState 1")},
            {"[TPD]aftouch", "", Transact(1, kTwoWay, "aftouch")},
            {"x[TPD]y[TPD]z", "", Transact(1, kTwoWay, "y[TPD]z")},
            {"[TPD]", "", Transact(1, kTwoWay, "")},
            {"THP_SetAccData", "thp_setaccdata",
             Transact(1, kTwoWay, "THP_SetAccData", "thp_setaccdata")},
    };
    for (const auto& row : kRows) {
        SCOPED_TRACE(row.command);
        FakeDevice device;
        EXPECT_EQ(RunCmdParms(row.command, row.parameters), "answer");
        EXPECT_THAT(device.calls({kTransact}), ElementsAre(row.call));
    }
}

TEST(BinderTest, SendsNamedCommandsOneWay) {
    const struct {
        const char* command;
        const char* parameters;
        Call call;
    } kRows[] = {
            {"an aftouches", "", Transact(1, kOneWay, "an aftouches")},
            {"[TPD", "THP_SetAccData7", Transact(1, kOneWay, "[TPD", "THP_SetAccData7")},
    };
    for (const auto& row : kRows) {
        SCOPED_TRACE(row.command);
        FakeDevice device;
        EXPECT_EQ(RunCmdParms(row.command, row.parameters), "OK");
        EXPECT_THAT(device.calls({kTransact}), ElementsAre(row.call));
        EXPECT_THAT(device.calls({kLog}), Contains(UntaggedLog(ERROR, "Async")));
    }
}

TEST(BinderTest, MatchesEachEntryOfAList) {
    EXPECT_FALSE(IsAsync({}, ""));
    EXPECT_FALSE(IsAsync({"abcde", "B"}, "abcd"));
    EXPECT_TRUE(IsAsync({"x", "bc"}, "abcd"));
    EXPECT_TRUE(IsAsync({""}, ""));
}

TEST(BinderTest, LeavesTheReplyOfAFailedCallUntouched) {
    FakeDevice device;
    RunCmdParms("[TPD]c", "");
    const auto service = ICorvaneInterfaceClient::asInterface(g_thpBinder);
    std::string reply = "before";
    device.answers = {{android::DEAD_OBJECT}};
    EXPECT_EQ(service->ExecuteCommand(reply, "c", ""), android::DEAD_OBJECT);
    EXPECT_EQ(reply, "before");
    EXPECT_EQ(ICorvaneInterfaceClient::asInterface(nullptr), nullptr);
}

TEST(BinderTest, TakesAReplyWithoutATextAsEmpty) {
    FakeDevice device;
    device.answers = {{android::OK, nullptr}};
    EXPECT_EQ(RunCmdParms("[TPD]c", ""), "");
}

TEST(BinderTest, LooksTheServiceUpOnce) {
    FakeDevice device;
    device.linkStatus = android::INVALID_OPERATION;
    RunCmdParms("[TPD]a", "");
    RunCmdParms("[TPD]b", "");
    EXPECT_THAT(device.calls(), ElementsAre(UntaggedLog(INFO, "ThpGetBinder"), GetService(),
                                            UntaggedLog(ERROR, "enter"), LinkToDeath(1),
                                            UntaggedLog(ERROR, "ThpGetBinder ret = -38"),
                                            Transact(1, kTwoWay, "a"), Transact(1, kTwoWay, "b")));
    EXPECT_EQ(android::ProcessState::self()->getDriverName(), "/dev/vndbinder");
}

TEST(BinderTest, TriesAFailedCallOnceMoreOnAFreshLookup) {
    FakeDevice device;
    device.lookups = {true, false, true};
    device.answers = {{android::DEAD_OBJECT}};
    EXPECT_EQ(RunCmdParms("[TPD]c", ""), "answer");
    EXPECT_THAT(device.calls({kGetService, kLinkToDeath, kTransact, kWrite}),
                ElementsAre(GetService(), LinkToDeath(1), Transact(1, kTwoWay, "c"), GetService(),
                            GetService(), LinkToDeath(2), Transact(2, kTwoWay, "c")));
    EXPECT_THAT(device.calls({kLog}), Contains(UntaggedLog(INFO, "retry = 1")));
}

TEST(BinderTest, RestartsTheDaemonAfterTwoFailedCalls) {
    FakeDevice device;
    device.properties["odm.thp.service_enable"] = "true";
    device.answers = {{android::DEAD_OBJECT}, {android::FAILED_TRANSACTION}};
    EXPECT_EQ(RunCmdParms("aftouch", ""), kTimeout);
    EXPECT_EQ(g_thpBinder, nullptr);
    EXPECT_THAT(device.calls({kGetService, kTransact, kWrite}),
                ElementsAre(GetService(), Transact(1, kOneWay, "aftouch"), GetService(),
                            Transact(2, kOneWay, "aftouch"), kStop, kStart));
}

TEST(BinderTest, RestartsTheDaemonWhoseServiceIsMissing) {
    FakeDevice device;
    device.lookups = {false, false};
    EXPECT_EQ(RunCmdParms("[TPD]c", ""), kServiceMissing);
    const Call kLookup = UntaggedLog(INFO, "ThpGetBinder");
    const Call kNotFound = UntaggedLog(ERROR, "ThpGetBinder, failed to get binder service\n");
    EXPECT_THAT(device.calls({kGetService, kLog, kWrite}),
                ElementsAre(kLookup, GetService(), kNotFound, kLookup, GetService(), kNotFound,
                            UntaggedLog(WARN, "reboot"), kStop,
                            UntaggedLog(ERROR, "retry:1, odm.thp.service_enable, [new]0, [old]"),
                            kStart,
                            UntaggedLog(ERROR, "retry:1, odm.thp.service_enable, [new]1, [old]0")));
}

TEST(BinderTest, MissesTheServiceOnTheRetry) {
    FakeDevice device;
    device.lookups = {true, false, false};
    device.answers = {{android::DEAD_OBJECT}};
    EXPECT_EQ(RunCmdParms("[TPD]c", ""), kServiceMissing);
}

TEST(BinderTest, TakesAMissingServiceManagerForAMissingService) {
    FakeDevice device;
    android::setDefaultServiceManager(nullptr);
    EXPECT_EQ(RunCmdParms("[TPD]c", ""), kServiceMissing);
    EXPECT_THAT(device.calls({kLog}),
                Contains(UntaggedLog(ERROR, "ThpGetBinder, failed to get defaultServiceManager\n"))
                        .Times(2));
}

TEST(BinderTest, UnlinksFromTheFirstServiceWhenOneDies) {
    FakeDevice device;
    device.answers = {{android::DEAD_OBJECT}};
    RunCmdParms("[TPD]c", "");
    g_deathRecipient->binderDied(g_thpBinder);
    EXPECT_THAT(device.calls({kUnlinkToDeath}), ElementsAre(UnlinkToDeath(1)));
    EXPECT_THAT(device.calls({kLog}), Contains(UntaggedLog(INFO, "binder died")));
    MyDeathRecipient(nullptr).binderDied(nullptr);
}

TEST(BinderTest, StoresAScreenStateBeforeTheLookup) {
    for (const char* state : {"a version:3+whole,1", "version:3+main"}) {
        FakeDevice device;
        RunCmdParms("[TPD]c", state);
        EXPECT_THAT(device.calls({kWrite, kGetService}),
                    ElementsAre(Write("odm.thp.screen_status", state), GetService()));
    }
}

TEST(BinderTest, StoresNoOtherParameters) {
    FakeDevice device;
    for (const char* parameters : {"version:3", "version:3+Main", ""}) {
        StoreScreenState(parameters);
    }
    EXPECT_THAT(device.calls(), IsEmpty());
}

TEST(BinderTest, GivesUpAScreenStateAfterSixRejectedWrites) {
    FakeDevice device;
    device.readOnly = {"odm.thp.screen_status"};
    StoreScreenState("version:3+main");
    EXPECT_THAT(device.calls({kWrite}), testing::SizeIs(6));
    EXPECT_THAT(device.calls({kPause}),
                testing::AllOf(testing::SizeIs(6), testing::Each(Pause(100us))));
}

}  // namespace test
