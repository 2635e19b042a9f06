#include "daemon/TpdClient.h"

#include "tests/unit_test.h"

namespace test {

constexpr char kAliveKey[] = "odm.thp.dae_alive";
constexpr char kBinderKey[] = "odm.thp.binder";
constexpr char kUpdatingKey[] = "odm.thp.is_updating_fw";
constexpr char kRebootTimesKey[] = "odm.thp.dae_reboot_times";

class TpdClientTest : public DeviceTest {
  protected:
    TpdClientTest() {
        device.properties[kUpdatingKey] = "false";
        device.properties[kRebootTimesKey] = "0";
    }
    void StopDaemon() { device.properties[kAliveKey] = "false"; }
    void StartDaemon() { device.properties[kAliveKey] = "true"; }
    size_t ChecksWhileDaemonIsDown() {
        StopDaemon();
        const size_t before = device.calls({kLog}).size();
        client.ThpExecuteCmdParams("[TPD]c", "");
        return device.calls({kLog}).size() - before;
    }

    TpdClient client;
};

TEST_F(TpdClientTest, ChecksALivingDaemonOnceForAllCommands) {
    EXPECT_EQ(client.WaitDaemonAlive(11), "check_time: 0.thp.dae_alive : 1. thp.binder: 1");
    EXPECT_EQ(client.daemonUnavailable, 0);
    TpdClient another;
    EXPECT_EQ(another.WaitDaemonAlive(1), "check_time: 0.");
    EXPECT_EQ(another.daemonUnavailable, 0);
    EXPECT_THAT(device.calls(), ElementsAre(Read(kAliveKey), Read(kBinderKey)));
}

TEST_F(TpdClientTest, WaitsForADaemonThatStarts) {
    device.properties[kBinderKey] = "0";
    device.duringCall = [&](const Call& call) {
        if (call == Log(INFO, "CheckAlive 2")) {
            device.properties[kBinderKey] = "1";
        }
    };
    EXPECT_EQ(client.WaitDaemonAlive(11), "check_time: 3.thp.dae_alive : 1. thp.binder: 1");
    EXPECT_THAT(device.calls({kLog, kPause}),
                ElementsAre(Log(INFO, "CheckAlive 0"), Log(INFO, "CheckAlive 1"), Pause(200ms),
                            Log(INFO, "CheckAlive 2"), Pause(200ms)));
}

TEST_F(TpdClientTest, ReportsADaemonThatStaysDown) {
    StopDaemon();
    device.properties[kRebootTimesKey] = "1";
    client.daemonUnavailable = 0;
    EXPECT_EQ(client.WaitDaemonAlive(2),
              "0P_1P; check_time: 1.thp.dae_alive : 0. thp.binder: 1 reboot_times: 1");
    EXPECT_EQ(client.daemonUnavailable, 1);
}

TEST_F(TpdClientTest, DoesNotWaitForAFirmwareUpdate) {
    StopDaemon();
    device.properties[kUpdatingKey] = "true";
    EXPECT_EQ(client.ThpExecuteCmdParams("[TPD]c", "p"),
              "0P_1P; bypass-when-fw-updatingcheck_time: 0.thp.dae_alive : 0. thp.binder: 1");
    EXPECT_THAT(device.calls({kLog, kPause, kTransact}), IsEmpty());
}

TEST_F(TpdClientTest, ChecksOnlyOnceAfterTwoFailedWaits) {
    EXPECT_EQ(ChecksWhileDaemonIsDown(), 11U);
    EXPECT_EQ(ChecksWhileDaemonIsDown(), 11U);
    EXPECT_EQ(ChecksWhileDaemonIsDown(), 1U);
    EXPECT_EQ(ChecksWhileDaemonIsDown(), 1U);
    StartDaemon();
    device.answers = {{android::OK, "an ERROR"}};
    EXPECT_EQ(client.ThpExecuteCmdParams("[TPD]c", ""), "an ERROR");
    EXPECT_EQ(ChecksWhileDaemonIsDown(), 11U);
}

TEST_F(TpdClientTest, TrustsTheDaemonUntilAnAnswerTellsAFailure) {
    const struct {
        const char* answer;
        bool trusted;
    } kRows[] = {{"an ERROR", false}, {"an error", true}, {"x0F_1F; y", false}, {"0f_1F", true}};
    for (const auto& row : kRows) {
        SCOPED_TRACE(row.answer);
        device.answers = {{android::OK, row.answer}};
        EXPECT_EQ(client.ThpExecuteCmdParams("[TPD]c", "p"), row.answer);
        EXPECT_EQ(aliveConfirmed, row.trusted);
    }
}

TEST_F(TpdClientTest, LogsTheServiceSwitchWhenTheServiceIsMissing) {
    device.rejectedWrites = {"odm.thp.service_enable"};
    for (const std::string enabled : {"0", "1"}) {
        device.properties["odm.thp.service_enable"] = enabled;
        device.lookups = {false, false};
        EXPECT_EQ(client.RunCmd("c", ""), "0F_1F; failed to get binder service");
        EXPECT_EQ(client.daemonUnavailable, 1);
        EXPECT_EQ(device.calls({kLog}).back(),
                  Log(ERROR, "RunCmd, failed to Get binder service. thp.service_enable: " +
                                     enabled + "\n"));
    }
}

TEST_F(TpdClientTest, JudgesACapacityTestByTheDaemonAfterwards) {
    const std::string failure =
            "captest fail due to corvane_daemon is not alive or unexpected reboot. ";
    const std::string died = "thp.dae_alive : 0. thp.binder: 1" + failure;
    const std::string restarted = "thp.dae_alive : 1. thp.binder: 1" + failure;
    const struct {
        const char* command;
        const char* parameters;
        const char* alive;
        const char* rebootTimes;
        std::string failure;
    } kRows[] = {
            {"captest", "running_test", "true", "2", ""},
            {"captest", "running_testrunning", "false", "0", died + "before: 0, after: 0"},
            {"captest", "running_test_lasttime", "true", "1", restarted + "before: 0, after: 1"},
            {"captest", "lasttimerunning", "false", "1", ""},
            {"captest", "", "false", "1", ""},
            {"[TPD]captest", "running_test", "false", "1", ""}};
    for (const auto& row : kRows) {
        SCOPED_TRACE(std::string(row.command) + " " + row.parameters);
        StartDaemon();
        device.properties[kRebootTimesKey] = "0";
        device.duringCall = [&](const Call& call) {
            if (call.first == kTransact) {
                device.properties[kAliveKey] = row.alive;
                device.properties[kRebootTimesKey] = row.rebootTimes;
            }
        };
        client.daemonUnavailable = 1;
        EXPECT_EQ(client.RunCmd(row.command, row.parameters), "answer" + row.failure);
        EXPECT_EQ(client.daemonUnavailable, 0);
    }
}

}  // namespace test
