#include "daemon/TpdClient.h"

#include <gmock/gmock.h>

#include "tests/fake_device.h"

namespace test {

using namespace std::chrono_literals;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;
using testing::StartsWith;

constexpr char kAliveKey[] = "odm.thp.dae_alive";
constexpr char kBinderKey[] = "odm.thp.binder";
constexpr char kUpdatingKey[] = "odm.thp.is_updating_fw";
constexpr char kRebootTimesKey[] = "odm.thp.dae_reboot_times";

// A device on which every property that the client reads has a value.
class TpdClientTest : public testing::Test {
  protected:
    TpdClientTest() {
        device.StartDaemon();
        device.properties[kUpdatingKey] = "false";
        device.properties[kRebootTimesKey] = "0";
        device.properties["odm.thp.service_enable"] = "1";
    }
    void StopDaemon() { device.properties[kAliveKey] = "false"; }
    // Executes a command; returns how many checks of the daemon it made first.
    size_t ChecksBeforeCommand() {
        const size_t before = device.calls({kPause}).size();
        const bool trusted = aliveConfirmed;
        client.ThpExecuteCmdParams("[TPD]c", "");
        return trusted ? 0 : device.calls({kPause}).size() - before + 1;
    }

    FakeDevice device;
    TpdClient client;
};

TEST_F(TpdClientTest, FindsALivingDaemonAtOnce) {
    EXPECT_EQ(client.daemonUnavailable, 1);
    EXPECT_EQ(client.WaitDaemonAlive(11), "check_time: 0.thp.dae_alive : 1. thp.binder: 1");
    EXPECT_EQ(client.daemonUnavailable, 0);
    EXPECT_THAT(device.calls(), ElementsAre(Read(kAliveKey), Read(kBinderKey)));
}

TEST_F(TpdClientTest, TrustsADaemonThatWasAlive) {
    client.WaitDaemonAlive(1);
    TpdClient another;
    EXPECT_EQ(another.WaitDaemonAlive(1), "check_time: 0.");
    EXPECT_EQ(another.daemonUnavailable, 0);
    EXPECT_THAT(device.calls({kRead}), SizeIs(2));
}

TEST_F(TpdClientTest, WaitsForADaemonThatStarts) {
    device.properties[kBinderKey] = "0";
    device.delayedValues[kBinderKey] = {4, "1"};
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
    EXPECT_THAT(device.calls({kPause}), SizeIs(1));
}

TEST_F(TpdClientTest, ReportsWithoutACheckWhenNoneIsAskedFor) {
    EXPECT_EQ(client.WaitDaemonAlive(0), "0P_1P;  reboot_times: 0");
    EXPECT_THAT(device.calls(), ElementsAre(Read(kRebootTimesKey)));
}

TEST_F(TpdClientTest, DoesNotWaitForAFirmwareUpdate) {
    StopDaemon();
    device.properties[kUpdatingKey] = "true";
    EXPECT_EQ(client.WaitDaemonAlive(11),
              "0P_1P; bypass-when-fw-updatingcheck_time: 0.thp.dae_alive : 0. thp.binder: 1");
    EXPECT_EQ(client.daemonUnavailable, 1);
    EXPECT_THAT(device.calls({kLog, kPause}), IsEmpty());
}

TEST_F(TpdClientTest, ChecksOnlyOnceAfterTwoFailedWaits) {
    StopDaemon();
    EXPECT_EQ(ChecksBeforeCommand(), 11U);
    EXPECT_EQ(ChecksBeforeCommand(), 11U);
    EXPECT_EQ(ChecksBeforeCommand(), 1U);
    EXPECT_EQ(ChecksBeforeCommand(), 1U);
    device.StartDaemon();
    ChecksBeforeCommand();
    StopDaemon();
    aliveConfirmed = false;
    EXPECT_EQ(ChecksBeforeCommand(), 11U);
}

TEST_F(TpdClientTest, SendsNothingToADaemonThatIsDown) {
    StopDaemon();
    EXPECT_THAT(client.ThpExecuteCmdParams("[TPD]c", "p"), StartsWith("0P_1P; check_time: 10."));
    EXPECT_THAT(device.calls({kTransact}), IsEmpty());
}

TEST_F(TpdClientTest, ForgetsADaemonWhoseAnswerTellsAFailure) {
    const struct {
        const char* answer;
        bool stillTrusted;
    } kRows[] = {
            {"fine", true},     {"an ERROR", false}, {"an error", true},
            {"x 0F_1F", false}, {"0f_1f", true},     {"0F_1", true},
    };
    for (const auto& row : kRows) {
        SCOPED_TRACE(row.answer);
        device.answers = {{android::OK, row.answer}};
        EXPECT_EQ(client.ThpExecuteCmdParams("[TPD]c", "p"), row.answer);
        EXPECT_EQ(aliveConfirmed, row.stillTrusted);
        EXPECT_EQ(client.daemonUnavailable, 0);
    }
}

TEST_F(TpdClientTest, LogsTheServiceSwitchWhenTheServiceIsMissing) {
    for (const char* enabled : {"0", "1"}) {
        device.readOnly = {"odm.thp.service_enable"};
        device.properties["odm.thp.service_enable"] = enabled;
        device.lookups = {false, false};
        EXPECT_EQ(client.RunCmd("c", ""), "0F_1F; failed to get binder service");
        EXPECT_EQ(client.daemonUnavailable, 1);
        const std::string text = "RunCmd, failed to Get binder service. thp.service_enable: ";
        EXPECT_THAT(device.calls({kLog}), testing::Contains(Log(ERROR, text + enabled + "\n")));
    }
}

TEST_F(TpdClientTest, JudgesACapacityTestByTheDaemonAfterwards) {
    const std::string kFailure =
            "captest fail due to corvane_daemon is not alive or unexpected reboot. ";
    const struct {
        const char* name;
        const char* command;
        const char* parameters;
        const char* aliveAfter;
        const char* rebootTimesAfter;
        std::string failure;
    } kRows[] = {
            {"nothing happened", "captest", "running_test", "true", "0", ""},
            {"count is no flag", "captest", "running_test", "true", "2", ""},
            {"restarted", "captest", "running_test_lasttime", "true", "1",
             "thp.dae_alive : 1. thp.binder: 1" + kFailure + "before: 0, after: 1"},
            {"died", "captest", "testrunning", "false", "0",
             "thp.dae_alive : 0. thp.binder: 1" + kFailure + "before: 0, after: 0"},
            {"not in running-test mode", "captest", "lasttimerunning", "false", "1", ""},
            {"no mode", "captest", "", "false", "1", ""},
            {"another command", "[TPD]captest", "running_test", "false", "1", ""},
    };
    for (const auto& row : kRows) {
        SCOPED_TRACE(row.name);
        device.StartDaemon();
        device.properties[kRebootTimesKey] = "0";
        device.answers = {{android::OK, "answer", [&] {
                               device.properties[kAliveKey] = row.aliveAfter;
                               device.properties[kRebootTimesKey] = row.rebootTimesAfter;
                           }}};
        EXPECT_EQ(client.RunCmd(row.command, row.parameters), "answer" + row.failure);
    }
}

}  // namespace test
