#include "daemon/TpdCmd.h"

#include <gmock/gmock.h>

#include "tests/fake_device.h"

namespace test {

using testing::ElementsAre;
using testing::IsEmpty;

constexpr char kThplogKey[] = "persist.odm.thp.thplog_enabled";
constexpr char kUserTypeKey[] = "ro.logsystem.usertype";
constexpr char kPermissiveKey[] = "odm.thp.debug.selinux.permissive";
const Call kStop = Write("odm.thp.service_enable", "0");
const Call kSetBootFlag = Write("odm.thp.dae_bootflag", "true");
const Call kStart = Write("odm.thp.service_enable", "1");

TEST(TpdCmdTest, RestartsTheDaemonThroughItsProperties) {
    FakeDevice device;
    TpdCmd().RebootCorvane();
    EXPECT_THAT(device.calls({kWrite}), ElementsAre(kStop, kSetBootFlag, kStart));
}

TEST(TpdCmdTest, TellsWhetherTheThplogIsOn) {
    const struct {
        const char* thplog;
        const char* userType;
        bool on;
    } kRows[] = {
            {"true", "0", true},  {"false", "3", false}, {"truefalse", "3", false},
            {"untrue", "", true}, {"1", "3", true},      {"", "5", true},
            {"", "4", false},     {"", "", false},       {"", "4294967299", false},
    };
    for (const auto& row : kRows) {
        SCOPED_TRACE(std::string(row.thplog) + "/" + row.userType);
        FakeDevice device;
        device.properties = {{kThplogKey, row.thplog}, {kUserTypeKey, row.userType}};
        EXPECT_EQ(TpdCmd::IsThplogEnable(), row.on);
    }
}

TEST(TpdCmdTest, EnablesTheThplogOnce) {
    FakeDevice device;
    TpdCmd().EnableThplog();
    TpdCmd().EnableThplog();
    EXPECT_THAT(device.calls({kWrite}),
                ElementsAre(Write(kThplogKey, "true"), kStop, kSetBootFlag, kStart));
}

TEST(TpdCmdTest, DisablesTheThplogOnce) {
    FakeDevice device;
    device.properties[kUserTypeKey] = "3";
    TpdCmd().DisableThplog();
    TpdCmd().DisableThplog();
    EXPECT_THAT(
            device.calls({kWrite}),
            ElementsAre(Write("persist.odm.thp.ver_dae", "true"), Write("odm.thp.ver_dae", "true"),
                        Write(kThplogKey, "false"), kStop, kSetBootFlag, kStart));
}

TEST(TpdCmdTest, LeavesTheThplogAloneInUpgradeMode) {
    FakeDevice device;
    device.kernelCommandLine = "enter_recovery=1";
    TpdCmd().EnableThplog();
    device.properties[kThplogKey] = "true";
    TpdCmd().DisableThplog();
    EXPECT_THAT(device.calls({kWrite}), IsEmpty());
}

TEST(TpdCmdTest, ReadsTheMonotonicClockInMilliseconds) {
    FakeDevice device;
    device.monotonicClock = timespec{12, 345999999};
    EXPECT_EQ(TpdCmd::GetMonotonicTime(), 12345U);
    device.monotonicClock = std::nullopt;
    EXPECT_EQ(TpdCmd::GetMonotonicTime(), 0U);
}

TEST(TpdCmdTest, AllowsCommandsWithoutAskingSelinux) {
    const struct {
        const char* name;
        const char* storedFlag;
        const char* kernelCommandLine;
    } kRows[] = {
            {"stored flag", "1", ""},
            {"upgrade mode", "null", "enter_recovery=1"},
            {"factory build", "null", "androidboot.swtype=factory"},
    };
    for (const auto& row : kRows) {
        SCOPED_TRACE(row.name);
        FakeDevice device;
        device.properties[kPermissiveKey] = row.storedFlag;
        device.kernelCommandLine = row.kernelCommandLine;
        EXPECT_TRUE(TpdCmd().IsSelinuxPermissive());
        EXPECT_THAT(device.calls({kWrite, kShell}), IsEmpty());
    }
}

TEST(TpdCmdTest, StoresThatSelinuxIsPermissive) {
    FakeDevice device;
    device.getenforce = " \nPermissively so";
    EXPECT_TRUE(TpdCmd().IsSelinuxPermissive());
    EXPECT_TRUE(TpdCmd().IsSelinuxPermissive());
    EXPECT_THAT(device.calls({kShell, kCloseShell, kWrite}),
                ElementsAre(Write(kPermissiveKey, "null"), Shell("getenforce"), CloseShell(),
                            Write(kPermissiveKey, "true")));
}

TEST(TpdCmdTest, RefusesCommandsUnlessGetenforceSaysPermissive) {
    const std::string kLongest = "Permissive" + std::string(189, 'x');  // with its zero, 200 bytes
    const struct {
        const char* name;
        std::optional<std::string> getenforce;
        int getenforceStatus;
        bool allowed;
    } kRows[] = {
            {"enforcing", "Enforcing\n", 0, false},
            {"second word", "Not Permissive\n", 0, false},
            {"within a word", "xPermissive\n", 0, false},
            {"no output", " \n", 0, false},
            {"cannot be run", std::nullopt, 0, false},
            {"fails", "Permissive\n", 256, true},
            {"cannot be closed", "Permissive\n", -1, false},
            {"longest word", kLongest, 0, true},
            {"word too long", kLongest + "x", 0, false},
    };
    for (const auto& row : kRows) {
        SCOPED_TRACE(row.name);
        FakeDevice device;
        device.getenforce = row.getenforce;
        device.getenforceStatus = row.getenforceStatus;
        EXPECT_EQ(TpdCmd().IsSelinuxPermissive(), row.allowed);
    }
}

}  // namespace test
