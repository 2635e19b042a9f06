// The shipped tool on the virtual device: each road a command can take, told as what was given, the
// words typed, what is printed and what the device holds afterwards.
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/wait.h>

#include <cstdio>
#include <string>

namespace {

constexpr char kTimeout[] =
        "corvane_daemon binder server execute command return ERROR, may caused by processing "
        "timeout.\n";
constexpr char kNoService[] = "0F_1F; failed to get binder service\n";
constexpr char kRefused[] =
        "please exe 'adb shell setenforce 0' in g_tpdCmd to disable selinux\n\n";

// Shell words that wait for the daemon, for at most 5 s.
constexpr char kUp[] =
        "for i in $(seq 250); do [ \"$(getprop odm.thp.binder)\" = 1 ] && break; sleep 0.02; "
        "done; ";
// What the daemon and the switches it follows stand at, in one line.
constexpr char kState[] =
        "echo $(getprop odm.thp.dae_alive) $(getprop odm.thp.service_enable) "
        "$(getprop odm.thp.dae_reboot_times)";

struct Output {
    std::string text;
    int status;
};

Output Execute(const std::string& command) {
    Output output;
    FILE* const stream = popen(command.c_str(), "r");
    char part[4096];
    for (size_t size; (size = fread(part, 1, sizeof(part), stream)) > 0;) {
        output.text.append(part, size);
    }
    const int ended = pclose(stream);
    output.status = WIFEXITED(ended) ? WEXITSTATUS(ended) : -1;
    return output;
}

// What `adb shell` would print of these shell words.
Output Shell(const std::string& words) {
    return Execute(std::string(SOURCE_DIR "/scripts/device shell '") + words + "'");
}

class Device : public testing::Test {
  protected:
    void SetUp() override {
        char folder[] = "/tmp/tpd-device-XXXXXX";
        mRoot = mkdtemp(folder);
        setenv("TPD_DEVICE_ROOT", mRoot.c_str(), 1);
        setenv("TPD_BUILD_DIR", BUILD_DIR, 1);
        setenv("TPD_GET_SERVICE_MS", "300", 1);
        ASSERT_EQ(Execute(SOURCE_DIR "/scripts/device start 2>&1").status, 0);
    }

    void TearDown() override {
        EXPECT_EQ(Execute(SOURCE_DIR "/scripts/device stop 2>&1").status, 0);
        EXPECT_EQ(Execute("cd " + mRoot + " && ls tmp dev/vndbinder").text,
                  "dev/vndbinder:\n\ntmp:\n");
        Execute("rm -rf " + mRoot);
    }

    std::string mRoot;
};

struct Road {
    const char* name;
    const char* given;    // shell words that set the device up
    const char* typed;    // what the user types
    std::string printed;  // all of standard output
    std::string then;     // shell words that ask the device afterwards
    std::string holds;    // what they print
};

void PrintTo(const Road& road, std::ostream* out) { *out << road.name; }

class RoadTest : public Device, public testing::WithParamInterface<Road> {};

TEST_P(RoadTest, Holds) {
    const Road& road = GetParam();
    Shell(std::string("setenforce 0; ") + road.given);
    const Output output = Shell(road.typed);
    EXPECT_EQ(output.text, road.printed);
    EXPECT_EQ(output.status, 0);
    EXPECT_EQ(Shell(road.then).text, road.holds);
}

const Road kRoads[] = {
        {"Forwarded", "", "tpd THP_ResetBaseline", "THP_ResetBaseline: baseline reset\n",
         "getprop odm.thp.debug.selinux.permissive", "true\n"},
        {"ForwardedWithParameters", "", "tpd THP_SetFoldState 1",
         "THP_SetFoldState: fold state set (1)\n", kState, "true 1 0\n"},
        {"ForwardedLocalName", "", "tpd stop now", "unknown command: stop\n", kState, "true 1 0\n"},
        {"TsaOneWord", "", "tpd TSA_ExecuteCommand captest", "captest idle_test: PASS\n", kState,
         "true 1 0\n"},
        {"TsaTwoWords", "", "tpd TSA_ExecuteCommand captest running_test",
         "captest running_test: PASS\n", kState, "true 1 0\n"},
        {"TsaEmptyWord", "", "tpd TSA_ExecuteCommand \"\" x", "\n", kState, "true 1 0\n"},
        {"TooManyWords", "", "tpd stop a b c", "\n", kState, "true 1 0\n"},
        {"ScreenState", "", "tpd THP_UpdateViewsLocation version:3+main,1",
         "THP_UpdateViewsLocation: view locations updated (version:3+main,1)\n",
         "getprop odm.thp.screen_status", "version:3+main,1\n"},
        {"Enforcing", "setenforce 1", "tpd THP_GetVersion", kRefused,
         "getprop odm.thp.debug.selinux.permissive", "null\n"},
        {"UpgradeModePasses",
         "setenforce 1; mkdir $TPD_DEVICE_ROOT/proc; "
         "echo quiet enter_recovery=1 >$TPD_DEVICE_ROOT/proc/cmdline",
         "tpd captest", "captest idle_test: PASS\n", "tpd log_enable; getprop odm.thp.debug.afelog",
         "\n\n"},
        {"Stop", "", "tpd stop", "\n", std::string("sleep 0.3; ") + kState, "false 0 0\n"},
        {"StartAfterStop", "tpd stop", "tpd start", "\n", std::string(kUp) + kState, "true 1 0\n"},
        {"Reboot", "", "tpd reboot", "\n", std::string("sleep 0.3; ") + kUp + kState, "true 1 0\n"},
        {"LogOn", "", "tpd log_enable", "\n", "getprop persist.odm.thp.thplog_enabled", "true\n"},
        {"LogOff", "setprop persist.odm.thp.thplog_enabled true", "tpd log_disable", "\n",
         "getprop persist.odm.thp.thplog_enabled; getprop persist.sys.zelmor.debug.on; "
         "getprop odm.thp.ver_dae; getprop persist.odm.thp.ver_dae",
         "false\nfalse\ntrue\ntrue\n"},
        {"AfeLogShown", "tpd log_afe_enable >/dev/null; tpd debugRawEnable >/dev/null; sleep 0.3",
         "tpd THP_GetStatus", "thplog: unset\nafelog: true\nraw data: true\nrestarts: 0\n", "", ""},
        {"ShowTouch", "tpd showtouch", "tpd showtouch_close", "\n",
         "settings get system show_touches; settings get system pointer_location", "0\n0\n"},
        {"DaemonDown", "tpd stop; sleep 0.2", "tpd THP_GetStatus",
         "0P_1P; check_time: 10.thp.dae_alive : 0. thp.binder: 0 reboot_times: 0\n",
         "logcat -d | grep -c \"I corvane_daemon: CheckAlive\"", "11\n"},
        {"SlowBoot", "setprop sim.boot_delay_ms 700; tpd reboot; sleep 0.1", "tpd captest",
         "captest idle_test: PASS\n", kState, "true 1 0\n"},
        {"FirmwareUpdate", "setprop sim.updating_fw true; sleep 0.3", "tpd captest",
         "0P_1P; bypass-when-fw-updatingcheck_time: 0.thp.dae_alive : 0. thp.binder: 0\n",
         std::string("setprop sim.updating_fw false; ") + kUp + kState, "true 1 0\n"},
        {"ServiceMissing",
         "tpd stop; sleep 0.2; setprop odm.thp.dae_alive true; setprop odm.thp.binder 1",
         "tpd captest", kNoService, std::string("sleep 0.3; ") + kUp + kState, "true 1 0\n"},
        {"DiesBeforeTheCall", "setprop sim.fault_count 1; setprop sim.fault die_before",
         "tpd captest", "captest idle_test: PASS\n", kState, "true 1 1\n"},
        {"DiesDuringBothCalls", "setprop sim.fault die_during", "tpd captest", kTimeout,
         "logcat -d | grep -o -E \"retry = .|binder died|W tpd: reboot\"",
         "binder died\nretry = 1\nbinder died\nretry = 2\nW tpd: reboot\n"},
        {"DiesBetweenCalls", "setprop sim.fault_count 1; setprop sim.fault die_after; tpd captest",
         "sleep 0.3; tpd captest", "captest idle_test: PASS\n", kState, "true 1 1\n"},
        {"ErrorStatus", "setprop sim.fault_arg -22; setprop sim.fault status", "tpd captest",
         kTimeout, std::string("sleep 0.3; ") + kUp + kState, "true 1 0\n"},
        {"NoText", "setprop sim.fault no_text", "tpd captest", "\n", kState, "true 1 0\n"},
        {"SlowAnswer", "setprop sim.fault_arg 400; setprop sim.fault hang", "tpd captest",
         "captest idle_test: PASS\n", kState, "true 1 0\n"},
        {"HugeReply", "setprop sim.fault_arg 2000000; setprop sim.fault huge", "tpd captest",
         kTimeout, std::string("sleep 0.3; ") + kUp + kState, "true 1 0\n"},
        {"CaptestRestart", "setprop sim.fault captest_restart", "tpd captest running_test",
         "captest running_test: PASS\n", std::string("sleep 0.3; ") + kUp + kState, "true 1 1\n"},
};

INSTANTIATE_TEST_SUITE_P(Roads, RoadTest, testing::ValuesIn(kRoads),
                         [](const auto& each) { return std::string(each.param.name); });

TEST_F(Device, HelpListsTheDaemonsAndTheLocalCommands) {
    Shell("setenforce 0");
    const Output none = Shell("tpd");
    EXPECT_NE(none.text.find("corvane_daemon commands:\nTHP_GetScreenState\n"), std::string::npos);
    EXPECT_NE(none.text.find("THP_UpdateViewsLocation\naftouch\n\n//aaa special gTpdCmds\n"
                             "debugDifEnable\n"),
              std::string::npos);
    EXPECT_EQ(Shell("tpd help").text, none.text);
}

TEST_F(Device, KeepsADeadOnesLeftoversOutAndASecondStartOff) {
    EXPECT_EQ(Execute(SOURCE_DIR "/scripts/device start 2>&1").text,
              "device: runs already in " + mRoot + "\n");
    Execute("kill -KILL $(cat " + mRoot + "/init.pid); touch " + mRoot + "/tmp/1.2; sleep 0.1");
    EXPECT_EQ(Execute(SOURCE_DIR "/scripts/device status").status, 3);
    EXPECT_EQ(Execute(SOURCE_DIR "/scripts/device start 2>&1").status, 0);
    EXPECT_EQ(Shell("setenforce 0; tpd captest").text, "captest idle_test: PASS\n");
}

TEST_F(Device, ShellCommandsAnswerAsOnADevice) {
    EXPECT_EQ(Shell("getenforce; setprop a.b \"c  d\"; getprop a.b; getprop a.c; "
                    "settings get system x")
                      .text,
              "Enforcing\nc  d\n\nnull\n");
    EXPECT_EQ(Shell("setprop ro.build.display.id 2").status, 1);
    EXPECT_EQ(Shell("setprop a..b 2").status, 1);
    EXPECT_EQ(Shell("setprop a.b $(printf %92s | tr \" \" x)").status, 1);
    EXPECT_EQ(Shell("settings put system ../x 1").status, 1);
}

// Nobody refers to it, and it is in the tool all the same, built before main runs.
TEST(Binary, HoldsTheLogFacility) {
    EXPECT_EQ(Execute("nm -C " BUILD_DIR
                      "/tpd | grep -c -E ' [BD] gSysLog$| [tT] _GLOBAL__sub_I_gSysLog'")
                      .text,
              "2\n");
}

}  // namespace
