// The daemon's client: how long it waits, what it reports, and how it judges a command's outcome.
#include "daemon/TpdClient.h"

#include "tests/fake_device.h"

namespace test {

class Client : public Device {
  public:
    TpdClient client;
};

TEST_F(Client, WaitsForTheDaemonAndRemembersIt) {
    DaemonIs("false", "1");
    appears[kAlive] = {4, "true"};
    EXPECT_EQ(client.WaitDaemonAlive(11), "check_time: 3.thp.dae_alive : 1. thp.binder: 1");
    EXPECT_EQ(Shape() + "; " + Trail("log pause"),
              "rrrlrrrlprrrlprr; log I corvane_daemon: CheckAlive 0; log I corvane_daemon: "
              "CheckAlive 1; pause 200000; log I corvane_daemon: CheckAlive 2; pause 200000");
    EXPECT_EQ(TpdClient().WaitDaemonAlive(1), "check_time: 0.");
    EXPECT_EQ(Shape(), "rrrlrrrlprrrlprr");
}

TEST_F(Client, ReportsADaemonThatStaysDown) {
    const auto kCases = Table<7>(
            "false|1|false|1|11|check_time: 10.thp.dae_alive : 0. thp.binder: 1 reboot_times: 1|"
            "rrrlrrrlprrrlprrrlprrrlprrrlprrrlprrrlprrrlprrrlprrrlpr|"
            "true|0|0|2|2|check_time: 1.thp.dae_alive : 1. thp.binder: 0 reboot_times: "
            "0|rrrlrrrlpr|"
            "true|1|0|1|0| reboot_times: 1|r|true|1|0|0|-1| reboot_times: 0|r|0|true|1|1|11|"
            "bypass-when-fw-updatingcheck_time: 0.thp.dae_alive : 0. thp.binder: 1|rrr");
    for (const auto& [alive, binder, updating, reboots, checks, report, shape] : kCases) {
        StartsAfresh();
        DaemonIs(alive, binder, updating, reboots);
        client.daemonUnavailable = 0;
        EXPECT_EQ(client.WaitDaemonAlive(atoi(checks.c_str())), "0P_1P; " + report);
        EXPECT_EQ(client.daemonUnavailable, 1);
        EXPECT_EQ(Shape(), shape);
    }
}

TEST_F(Client, LosesPatienceAfterTwoFailedWaits) {
    std::string story;  // of each command: how many checks failed, whether the daemon is trusted
    for (const std::string answer :
         {"", "", "", "", "an ERROR", "", "fine", "0F_1", "error 0f_1f", "x0F_1F; y", "", "", ""}) {
        const size_t before = Shape("pause").length();
        DaemonIs(answer.empty() ? "false" : "true", "1");
        answers = {{0, answer.c_str()}};
        const std::string result = client.ThpExecuteCmdParams("[TPD]c", "p");
        EXPECT_EQ(answer.empty() ? result.substr(0, 7) : result,
                  answer.empty() ? "0P_1P; " : answer);
        EXPECT_EQ(client.daemonUnavailable, answer.empty() ? 1 : 0);
        story += std::to_string(Shape("pause").length() - before) + (aliveConfirmed ? "+ " : " ");
    }
    EXPECT_EQ(story, "10 10 0 0 0 10 0+ 0+ 0+ 0 10 10 0 ");
}

TEST_F(Client, JudgesACapacityTest) {
    const std::string why =
            "captest fail due to corvane_daemon is not alive or unexpected reboot. before: ";
    const auto kCases = Table<6>(
            "captest|running_test|0|0|true||captest|test|2|3|true||"
            "captest|running_test_lasttime|0|1|true|thp.dae_alive : 1. thp.binder: 1" +
            why +
            "0, after: 1|"
            "captest|testrunning|1|2|0|thp.dae_alive : 0. thp.binder: 1" +
            why +
            "1, after: 0|"
            "captest|_|1|1|0|thp.dae_alive : 0. thp.binder: 1" +
            why + "1, after: 1");
    for (const auto& row : kCases) {
        StartsAfresh();
        DaemonIs("true", "1", "0", row[2]);
        answers = {{0, "answer", [&] { DaemonIs(row[4], "1", "0", row[3]); }}};
        EXPECT_EQ(client.RunCmd(row[0].c_str(), row[1].c_str()), "answer" + row[5]);
        EXPECT_EQ(Shape("read call") + std::to_string(client.daemonUnavailable), "rcrrr0");
    }
    StartsAfresh();
    lookups = {false, false};
    EXPECT_EQ(client.RunCmd("c", ""), kNoService);
    const std::string trail = Trail("log");
    EXPECT_EQ(trail.substr(trail.find("; E corvane")) + std::to_string(client.daemonUnavailable),
              "; E corvane_daemon: RunCmd, failed to Get binder service. "
              "thp.service_enable: 1\n1");
    EXPECT_FALSE(TpdClient::IsCaptestInRt("captest", "lasttimerunning"));
    EXPECT_FALSE(TpdClient::IsCaptestInRt("captest", "") || TpdClient::IsCaptestInRt("", "test"));
}

}  // namespace test
