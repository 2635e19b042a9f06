#include "daemon/TpdCmd.h"

#include "tests/unit_test.h"

namespace test {

using TpdCmdTest = DeviceTest;

TEST_F(TpdCmdTest, KnowsWhetherTheThplogIsOn) {
    const struct {
        const char* thplog;
        const char* userType;
        bool on;
    } kRows[] = {{"untrue", "", true}, {"truefalse", "3", false}, {"1", "3", true},
                 {"", "5", true},      {"", "4", false},          {"", "", false}};
    for (const auto& row : kRows) {
        SCOPED_TRACE(std::string(row.thplog) + "/" + row.userType);
        device.properties = {{kThplogKey, row.thplog}, {"ro.logsystem.usertype", row.userType}};
        EXPECT_EQ(TpdCmd::IsThplogEnable(), row.on);
    }
}

TEST_F(TpdCmdTest, EnablesTheThplogOnce) {
    TpdCmd().EnableThplog();
    TpdCmd().EnableThplog();
    EXPECT_THAT(device.calls({kWrite}),
                ElementsAre(Write(kThplogKey, "true"), kStop, kSetBootFlag, kStart));
}

TEST_F(TpdCmdTest, DisablesTheThplogOnce) {
    device.properties["ro.logsystem.usertype"] = "3";
    TpdCmd().DisableThplog();
    TpdCmd().DisableThplog();
    EXPECT_THAT(
            device.calls({kWrite}),
            ElementsAre(Write("persist.odm.thp.ver_dae", "true"), Write("odm.thp.ver_dae", "true"),
                        Write(kThplogKey, "false"), kStop, kSetBootFlag, kStart));
}

TEST_F(TpdCmdTest, LeavesTheThplogAloneInUpgradeMode) {
    device.kernelCommandLine = "enter_recovery=1";
    TpdCmd().EnableThplog();
    device.properties[kThplogKey] = "true";
    TpdCmd().DisableThplog();
    EXPECT_THAT(device.calls({kWrite}), IsEmpty());
}

TEST_F(TpdCmdTest, ReadsTheMonotonicClockInMilliseconds) {
    const auto before = std::chrono::steady_clock::now().time_since_epoch();
    const std::chrono::milliseconds reading(TpdCmd::GetMonotonicTime());
    EXPECT_GT(reading, before - 1ms);
    EXPECT_LT(reading, before + 1s);
}

TEST_F(TpdCmdTest, StoresThatSelinuxIsPermissive) {
    device.getenforce = " \nPermissively so";
    EXPECT_TRUE(TpdCmd().IsSelinuxPermissive());
    EXPECT_TRUE(TpdCmd().IsSelinuxPermissive());
    EXPECT_THAT(device.calls({kShell, kWrite}),
                ElementsAre(Write(kPermissiveKey, "null"), Shell("getenforce"),
                            Write(kPermissiveKey, "true")));
}

TEST_F(TpdCmdTest, AsksNobodyInAFactoryVersion) {
    device.kernelCommandLine = "androidboot.swtype=factory";
    EXPECT_TRUE(TpdCmd().IsSelinuxPermissive());
    EXPECT_THAT(device.calls({kShell}), IsEmpty());
}

TEST_F(TpdCmdTest, AllowsCommandsOnlyWhenGetenforceSaysPermissive) {
    const std::string longest = "Permissive" + std::string(189, 'x');  // 200 bytes with its zero
    const struct {
        const char* name;
        std::optional<std::string> output;
        int status;
        bool allowed;
    } kRows[] = {{"enforcing", "Enforcing\n", 0, false},
                 {"within a word", "xPermissive\n", 0, false},
                 {"no output", " \n", 0, false},
                 {"cannot be run", std::nullopt, 0, false},
                 {"cannot be closed", "Permissive\n", -1, false},
                 {"fails afterwards", "Permissive\n", 256, true},
                 {"longest word", longest, 0, true},
                 {"word too long", longest + "x", 0, false}};
    for (const auto& row : kRows) {
        SCOPED_TRACE(row.name);
        device.properties.clear();
        device.getenforce = row.output;
        device.getenforceStatus = row.status;
        EXPECT_EQ(TpdCmd().IsSelinuxPermissive(), row.allowed);
    }
}

}  // namespace test
