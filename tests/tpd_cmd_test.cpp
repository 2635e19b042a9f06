#include "daemon/TpdCmd.h"

#include "tests/unit_test.h"

namespace test {

using TpdCmdTest = DeviceTest;

TEST_F(TpdCmdTest, ReportsWhetherTheThplogIsOn) {
    const Rows<std::string, std::string, bool> rows = {
            {"untrue", "", true}, {"truefalse", "3", false}, {"1", "3", true},
            {"", "5", true},      {"", "4", false},          {"", "", false}};
    for (const auto& [thplog, userType, on] : rows) {
        device.properties = {{kThplogKey, thplog}, {"ro.logsystem.usertype", userType}};
        EXPECT_EQ(TpdCmd::IsThplogEnable(), on) << thplog << "/" << userType;
    }
}

TEST_F(TpdCmdTest, DoesNotSwitchTheThplogUnnecessarilyOrInUpgradeMode) {
    TpdCmd().DisableThplog();
    device.properties[kThplogKey] = "true";
    TpdCmd().EnableThplog();
    device.kernelCommandLine = "enter_recovery=1";
    TpdCmd().DisableThplog();
    device.properties[kThplogKey] = "false";
    TpdCmd().EnableThplog();
    EXPECT_THAT(device.calls({kWrite}), IsEmpty());
}

TEST_F(TpdCmdTest, ReadsTheMonotonicClockInMilliseconds) {
    const auto before = std::chrono::steady_clock::now().time_since_epoch();
    const std::chrono::milliseconds reading(TpdCmd::GetMonotonicTime());
    const auto after = std::chrono::steady_clock::now().time_since_epoch();
    EXPECT_GT(reading, before - 1ms);
    EXPECT_LE(reading, after);
}

TEST_F(TpdCmdTest, StoresThatSelinuxIsPermissive) {
    device.getenforce = " \nPermissively so";
    EXPECT_TRUE(TpdCmd().IsSelinuxPermissive());
    EXPECT_TRUE(TpdCmd().IsSelinuxPermissive());
    EXPECT_THAT(device.calls({kShell, kWrite}),
                ElementsAre(Write(kPermissiveKey, "null"), Shell("getenforce"),
                            Write(kPermissiveKey, "true")));
}

TEST_F(TpdCmdTest, ChecksTheStoredFlagBeforeTheBootMode) {
    for (const char* line : {"enter_recovery=1", "androidboot.swtype=factory"}) {
        device.kernelCommandLine = line;
        device.properties.erase(kPermissiveKey);
        EXPECT_TRUE(TpdCmd().IsSelinuxPermissive()) << line;
    }
    const Call storeDefault = Write(kPermissiveKey, "null");
    EXPECT_THAT(device.calls({kShell, kWrite}), ElementsAre(storeDefault, storeDefault));
}

TEST_F(TpdCmdTest, AllowsCommandsOnlyIfGetenforcePrintsPermissive) {
    const std::string longest = "Permissive" + std::string(189, 'x');  // 200 bytes with the NUL
    const Rows<const char*, std::optional<std::string>, int, bool> rows = {
            {"enforcing", "Enforcing\n", 0, false},
            {"within a word", "xPermissive\n", 0, false},
            {"no output", " \n", 0, false},
            {"cannot be run", std::nullopt, 0, false},
            {"cannot be closed", "Permissive\n", -1, false},
            {"fails afterwards", "Permissive\n", 256, true},
            {"longest word", longest, 0, true},
            {"word too long", longest + "x", 0, false}};
    for (const auto& [name, output, status, allowed] : rows) {
        device.properties.clear();
        device.getenforce = output;
        device.getenforceStatus = status;
        EXPECT_EQ(TpdCmd().IsSelinuxPermissive(), allowed) << name;
        EXPECT_THAT(device.openStreams, IsEmpty());
    }
}

}  // namespace test
