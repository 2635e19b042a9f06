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
const Call kNotFound = UntaggedLog(ERROR, "ThpGetBinder, failed to get binder service\n");

// The bytes of a value in a parcel.
std::string Padded(std::string bytes) {
    bytes.resize((bytes.size() + 3) / 4 * 4);
    return bytes;
}
std::string Int32(int32_t value) { return {reinterpret_cast<const char*>(&value), sizeof(value)}; }
std::string CString(const std::string& text) { return Padded(text + '\0'); }
std::string Utf16(const std::u16string& text) {
    const size_t bytes = (text.size() + 1) * sizeof(char16_t);
    return Padded({reinterpret_cast<const char*>(text.c_str()), bytes});
}

TEST_F(BinderTest, WritesTheRequestInTheDaemonsFormat) {
    RunCmdParms("[TPD]TSA_ExecuteCommand", "captest");
    const std::string strictMode = Int32(INT32_MIN), workSource = Int32(-1);
    const std::string descriptor =
            Int32(55) + Utf16(u"android.CorvaneInterfaceServer.ICorvaneInterfaceService");
    EXPECT_EQ(device.request, strictMode + workSource + "RDNV" + descriptor +
                                      CString("TSA_ExecuteCommand") + Int32(1) +
                                      CString("captest"));
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
    EXPECT_EQ(device.calls({kLog}).back(), UntaggedLog(ERROR, "Async"));
}

TEST_F(BinderTest, SendsListedNamesOneWay) {
    EXPECT_THAT(g_asyncCmds, ElementsAre("aftouch"));
    EXPECT_THAT(
            g_asyncThpCmds,
            ElementsAre("THP_ASA_EnableFreqShift", "THP_ASA_ForceSetToNewFreq",
                        "THP_ASA_SetTpPenMatchCode", "THP_DisableBaselineUpdate",
                        "THP_DisableFeature", "THP_DisableScenario", "THP_EnableBaselineUpdate",
                        "THP_EnableFeature", "THP_EnableScenario", "THP_InformTypingStatus",
                        "THP_InformUserAppCrash", "THP_Log_Commander", "THP_Log_GhostTouch",
                        "THP_ResetBaseline", "THP_Ring_AddSideGesture", "THP_Ring_EnterBetaTask",
                        "THP_Ring_EnterSpecialBeta", "THP_Ring_ExitBetaTask",
                        "THP_Ring_ExitSpecialBeta", "THP_Ring_ExposeSideArea",
                        "THP_Ring_MapSideArea", "THP_Ring_MapSideGestureToKeyCode",
                        "THP_Ring_MapSideGestureToTPEvent", "THP_Ring_RemoveSideArea",
                        "THP_Ring_ResetSideGesture", "THP_Ring_SetGestureTag",
                        "THP_Ring_SetVolumeGUIInfo", "THP_SetAccData",
                        "THP_SetEnvironmentTemperature", "THP_SetFoldState",
                        "THP_SetPressureGesture", "THP_SetRunTimePrmt", "THP_SetSensorData",
                        "THP_SetSensorGesture", "THP_SetSensorGestureWithTimeStamp",
                        "THP_SetSupportedSensorGesture", "THP_SetTuneTimePrmt", "THP_SetVirtualKey",
                        "THP_SetVolumeGUIInfo", "THP_SetXCoreArea", "THP_UpdateViewsLocation"));
}

TEST_F(BinderTest, LooksUpTheServiceOnce) {
    RunCmdParms("[TPD]a", "");
    RunCmdParms("[TPD]b", "");
    EXPECT_THAT(
            device.calls(),
            ElementsAre(kLookup, GetService(), UntaggedLog(ERROR, "enter"), LinkToDeath(1),
                        UntaggedLog(ERROR, "ThpGetBinder ret = 0"), Transact("a"), Transact("b")));
    EXPECT_EQ(android::ProcessState::self()->getDriverName(), "/dev/vndbinder");
}

TEST_F(BinderTest, TreatsAReplyWithoutTextAsEmpty) {
    device.answers = {{android::OK, nullptr}};
    EXPECT_EQ(RunCmdParms("[TPD]c", ""), "");
}

TEST_F(BinderTest, RetriesAFailedCallOnceAfterANewLookup) {
    device.lookups = {true, false, true};
    device.answers = {{DEAD_OBJECT}};
    EXPECT_EQ(RunCmdParms("[TPD]c", ""), "answer");
    EXPECT_THAT(device.calls(),
                ElementsAre(kLookup, GetService(), UntaggedLog(ERROR, "enter"), LinkToDeath(1),
                            UntaggedLog(ERROR, "ThpGetBinder ret = 0"), Transact("c"),
                            UntaggedLog(INFO, "binder died"), UnlinkToDeath(1),
                            UntaggedLog(INFO, "retry = 1"), kLookup, GetService(), kNotFound,
                            kLookup, GetService(), LinkToDeath(2),
                            UntaggedLog(ERROR, "ThpGetBinder ret = 0"), Transact("c")));
}

TEST_F(BinderTest, RestartsTheDaemonAfterTwoFailedCalls) {
    device.answers = {{DEAD_OBJECT}, {DEAD_OBJECT}};
    EXPECT_EQ(RunCmdParms("aftouch", ""),
              "corvane_daemon binder server execute command return ERROR, may caused by "
              "processing timeout.");
    EXPECT_EQ(g_thpBinder, nullptr);
    EXPECT_THAT(device.calls({kGetService, kTransactOneWay, kUnlinkToDeath, kWrite}),
                ElementsAre(GetService(), TransactOneWay("aftouch"), UnlinkToDeath(1), GetService(),
                            TransactOneWay("aftouch"), UnlinkToDeath(1), kStop, kStart));
}

TEST_F(BinderTest, RestartsTheDaemonWhenItsServiceIsMissing) {
    device.lookups = {false, false};
    EXPECT_EQ(RunCmdParms("[TPD]c", ""), kServiceMissing);
    const std::string write = "retry:1, odm.thp.service_enable, ";
    EXPECT_THAT(device.calls({kGetService, kLog, kWrite}),
                ElementsAre(kLookup, GetService(), kNotFound, kLookup, GetService(), kNotFound,
                            UntaggedLog(WARN, "reboot"), kStop,
                            UntaggedLog(ERROR, write + "[new]0, [old]"), kStart,
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

TEST_F(BinderTest, GivesUpAScreenStateAfterSixRejectedWrites) {
    device.rejectedWrites = {"odm.thp.screen_status"};
    StoreScreenState("version:3+main");
    EXPECT_THAT(device.calls({kRead, kWrite}), SizeIs(12));
    EXPECT_EQ(device.calls().back(), Pause(100us));
}

}  // namespace test
