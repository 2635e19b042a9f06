#include "daemon/TpdClient.h"

#include "tests/unit_test.h"

namespace test {

constexpr char kAliveKey[] = "odm.thp.dae_alive";
constexpr char kBinderKey[] = "odm.thp.binder";
constexpr char kRebootTimesKey[] = "odm.thp.dae_reboot_times";

class TpdClientTest : public DeviceTest {
  protected:
    TpdClient client;
};

TEST_F(TpdClientTest, ChecksALivingDaemonOncePerProcess) {
    EXPECT_EQ(client.daemonUnavailable, 1);
    EXPECT_EQ(client.WaitDaemonAlive(11), "check_time: 0.thp.dae_alive : 1. thp.binder: 1");
    EXPECT_EQ(client.daemonUnavailable, 0);
    TpdClient another;
    EXPECT_EQ(another.WaitDaemonAlive(1), "check_time: 0.");
    EXPECT_EQ(another.daemonUnavailable, 0);
    EXPECT_THAT(device.calls(), ElementsAre(Read(kAliveKey), Read(kBinderKey)));
}

TEST_F(TpdClientTest, WaitsForAStartingDaemon) {
    device.properties[kBinderKey] = "0";
    device.changes[Log(INFO, "CheckAlive 2")] = {kBinderKey, "1"};
    EXPECT_EQ(client.WaitDaemonAlive(11), "check_time: 3.thp.dae_alive : 1. thp.binder: 1");
    EXPECT_THAT(device.calls({kLog, kPause}),
                ElementsAre(Log(INFO, "CheckAlive 0"), Log(INFO, "CheckAlive 1"), Pause(200ms),
                            Log(INFO, "CheckAlive 2"), Pause(200ms)));
}

TEST_F(TpdClientTest, ReportsADaemonThatStaysDown) {
    device.properties[kAliveKey] = "false";
    device.properties[kRebootTimesKey] = "1";
    client.daemonUnavailable = 0;
    EXPECT_EQ(client.WaitDaemonAlive(2),
              "0P_1P; check_time: 1.thp.dae_alive : 0. thp.binder: 1 reboot_times: 1");
    EXPECT_EQ(client.daemonUnavailable, 1);
}

TEST_F(TpdClientTest, DoesNotWaitDuringAFirmwareUpdate) {
    device.properties[kAliveKey] = "false";
    device.properties["odm.thp.is_updating_fw"] = "true";
    EXPECT_EQ(client.ThpExecuteCmdParams("[TPD]c", "p"),
              "0P_1P; bypass-when-fw-updatingcheck_time: 0.thp.dae_alive : 0. thp.binder: 1");
    EXPECT_THAT(device.calls({kLog, kPause, kTransact}), IsEmpty());
}

TEST_F(TpdClientTest, ChecksOnlyOnceAfterTwoFailedWaits) {
    device.properties[kAliveKey] = "false";
    for (const char* lastCheck : {"10", "10", "0", "0"}) {
        EXPECT_EQ(client.ThpExecuteCmdParams("[TPD]c", ""),
                  std::string("0P_1P; check_time: ") + lastCheck +
                          ".thp.dae_alive : 0. thp.binder: 1 reboot_times: 0");
    }
}

TEST_F(TpdClientTest, ForgetsFailedWaitsWhenTheDaemonIsAlive) {
    failedWaitCount = 2;
    EXPECT_EQ(client.ThpExecuteCmdParams("[TPD]c", ""), "answer");
    EXPECT_EQ(failedWaitCount, 0);
}

TEST_F(TpdClientTest, TrustsTheDaemonUntilAnAnswerReportsAFailure) {
    const Rows<const char*, bool> rows = {
            {"an ERROR", false}, {"an error", true}, {"x0F_1F; y", false}, {"0f_1F", true}};
    for (const auto& [answer, trusted] : rows) {
        device.answers = {{android::OK, answer}};
        EXPECT_EQ(client.ThpExecuteCmdParams("[TPD]c", "p"), answer);
        EXPECT_EQ(aliveConfirmed, trusted) << answer;
    }
}

TEST_F(TpdClientTest, LogsTheServiceSwitchWhenTheServiceIsMissing) {
    device.lookups = {false, false};
    EXPECT_EQ(client.RunCmd("c", ""), "0F_1F; failed to get binder service");
    EXPECT_EQ(client.daemonUnavailable, 1);
    EXPECT_EQ(device.calls({kLog}).back(),
              Log(ERROR, "RunCmd, failed to Get binder service. thp.service_enable: 1\n"));
}

const std::string kCaptestFailure =
        "captest fail due to corvane_daemon is not alive or unexpected reboot. ";

TEST(IsCaptestInRtTest, AcceptsAnySubstringOfTheModeNames) {
    for (const char* fragment : {"running_testrunning", "running_test_lasttime", "g"}) {
        EXPECT_TRUE(TpdClient::IsCaptestInRt("captest", fragment)) << fragment;
    }
    EXPECT_FALSE(TpdClient::IsCaptestInRt("captest", "lasttimerunning"));
    EXPECT_FALSE(TpdClient::IsCaptestInRt("captest", ""));
    EXPECT_FALSE(TpdClient::IsCaptestInRt("[TPD]captest", "running_test"));
}

TEST_F(TpdClientTest, ReportsThatTheDaemonDiedDuringACapacityTest) {
    device.properties[kAliveKey] = "false";
    EXPECT_EQ(client.RunCmd("captest", "running_test"),
              "answerthp.dae_alive : 0. thp.binder: 1" + kCaptestFailure + "before: 0, after: 0");
    EXPECT_EQ(client.RunCmd("captest", "other"), "answer");
}

TEST_F(TpdClientTest, ReportsThatTheDaemonRestartedDuringACapacityTest) {
    device.changes[Transact("captest, running_test")] = {kRebootTimesKey, "1"};
    EXPECT_EQ(client.RunCmd("captest", "running_test"),
              "answerthp.dae_alive : 1. thp.binder: 1" + kCaptestFailure + "before: 0, after: 1");
    EXPECT_EQ(client.RunCmd("captest", "running_test"), "answer");
    EXPECT_EQ(client.daemonUnavailable, 0);
}

}  // namespace test
