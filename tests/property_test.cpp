#include "property/Property.h"

#include <gmock/gmock.h>

#include <climits>
#include <cstring>

#include "tests/fake_device.h"

namespace test {

using namespace std::chrono_literals;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::Pair;

TEST(PropertyTest, ReadsAValueAtOnce) {
    FakeDevice device;
    device.properties["k"] = "yes";
    std::string value;
    EXPECT_EQ(Property().Get("k", value, "default"), 3);
    EXPECT_EQ(value, "yes");
    EXPECT_THAT(device.calls(), ElementsAre(Read("k")));
}

TEST(PropertyTest, ReadsAnEmptyPropertyASecondTime) {
    FakeDevice device;
    device.delayedValues["k"] = {2, "y"};
    std::string value;
    EXPECT_EQ(Property().Get("k", value, "default"), 1);
    EXPECT_EQ(value, "y");
    EXPECT_THAT(device.calls(), ElementsAre(Read("k"), Pause(100us), Read("k"),
                                            Log(INFO, "ret = 1, i = 1, k mBuf = y")));
}

TEST(PropertyTest, StoresTheDefaultOfAnEmptyProperty) {
    FakeDevice device;
    std::string value;
    EXPECT_EQ(Property().Get("k", value, "no"), 3);
    EXPECT_EQ(value, "no");
    EXPECT_THAT(
            device.calls(),
            ElementsAre(Read("k"), Pause(100us), Read("k"), Read("k"), Write("k", "no"),
                        Log(ERROR, "retry:1, i = 0, k, [new]no, [old]"), Pause(100us), Read("k")));
}

TEST(PropertyTest, ReadsAnEmptyPropertyWithoutADefaultAsEmpty) {
    FakeDevice device;
    std::string value = "before";
    EXPECT_EQ(Property().Get("k", value, ""), 0);
    EXPECT_EQ(value, "");
    EXPECT_THAT(device.calls({kWrite}), IsEmpty());
}

TEST(PropertyTest, ConfirmsAWriteByReadingItBack) {
    FakeDevice device;
    device.properties["k"] = "old";
    Property().Set("k", "new");
    EXPECT_THAT(device.calls(), ElementsAre(Read("k"), Write("k", "new"),
                                            Log(ERROR, "retry:1, i = 0, k, [new]new, [old]old"),
                                            Pause(100us), Read("k")));
}

TEST(PropertyTest, DoesNotWriteTheValueThatIsThere) {
    FakeDevice device;
    device.properties["k"] = "same";
    Property().Set("k", "same");
    EXPECT_THAT(device.calls(), ElementsAre(Read("k")));
}

TEST(PropertyTest, GivesUpAfterSixRejectedWrites) {
    FakeDevice device;
    device.readOnly = {"k"};
    Property().Set("k", "v");
    std::vector<Call> expected;
    for (const char* i : {"0", "1", "2", "3", "4", "5"}) {
        const std::string text = std::string("retry:1, i = ") + i + ", k, [new]v, [old]";
        for (const Call& call : {Read("k"), Write("k", "v"), Log(ERROR, text), Pause(100us)}) {
            expected.push_back(call);
        }
    }
    EXPECT_EQ(device.calls(), expected);
}

TEST(PropertyTest, WritesTheInputTriggerWithoutLogLines) {
    FakeDevice device;
    Property().Set("odm.thp.trigger_input", "1");
    EXPECT_THAT(device.calls({kWrite, kLog}), ElementsAre(Write("odm.thp.trigger_input", "1")));
}

TEST(PropertyTest, FindsRowsByTheirExactAlias) {
    Property property;
    EXPECT_EQ(property.GetItem("Rotate").key, "odm.thp.rotate");
    EXPECT_EQ(property.GetItem("rotate").alias, "VerSys");
    EXPECT_EQ(property.GetItem("").alias, "VerSys");
}

// On a device without properties each accessor leaves its value, or its default, in its own row's.
TEST(PropertyTest, AccessorsUseTheirOwnProperty) {
    static std::string text;
    static int number;
    const struct {
        const char* key;
        const char* value;
        void (*access)(Property&);
    } kRows[] = {
            {"persist.sys.zelmor.debug.on", "true", [](Property& p) { p.SetDebugOn(true); }},
            {"thp.debug.raw", "true", [](Property& p) { p.SetRawData(true); }},
            {"persist.odm.thp.thplog_enabled", "true",
             [](Property& p) { p.SetThplogEnable(true); }},
            {"persist.odm.thp.ver_dae", "true", [](Property& p) { p.SetPersistVerDae(true); }},
            {"odm.thp.dae_bootflag", "true", [](Property& p) { p.SetBootFlag(true); }},
            {"odm.thp.ver_dae", "true", [](Property& p) { p.SetVerDae(true); }},
            {"odm.thp.debug.afelog", "true", [](Property& p) { p.SetAfeLog(true); }},
            {"odm.thp.debug.selinux.permissive", "true",
             [](Property& p) { p.SetPermissive(true); }},
            {"odm.thp.service_enable", "-12", [](Property& p) { p.SetServiceEnable(-12); }},
            {"odm.thp.service_enable", "false", [](Property& p) { p.GetServiceEnable(); }},
            {"odm.thp.dae_alive", "false", [](Property& p) { p.GetDaeAlive(); }},
            {"odm.thp.dae_reboot_times", "0", [](Property& p) { p.GetRebootTimes(); }},
            {"odm.thp.binder", "0", [](Property& p) { p.GetBinder(); }},
            {"odm.thp.is_updating_fw", "false", [](Property& p) { p.GetUpdateFW(); }},
            {"odm.thp.debug.selinux.permissive", "null", [](Property& p) { p.GetPermissive(); }},
            {"persist.odm.thp.thplog_enabled", "", [](Property& p) { p.GetThplogEnable(text); }},
            {"odm.thp.service_enable", "false", [](Property& p) { p.GetServiceEnable(text); }},
            {"odm.thp.dae_alive", "false", [](Property& p) { p.GetDaeAlive(text); }},
            {"odm.thp.dae_reboot_times", "0", [](Property& p) { p.GetRebootTimes(text); }},
            {"odm.thp.binder", "0", [](Property& p) { p.GetBinder(text); }},
            {"odm.thp.is_updating_fw", "false", [](Property& p) { p.GetUpdateFW(text); }},
            {"odm.thp.debug.selinux.permissive", "null",
             [](Property& p) { p.GetPermissive(text); }},
            {"ro.logsystem.usertype", "", [](Property& p) { p.GetUserType(number); }},
    };
    for (const auto& row : kRows) {
        SCOPED_TRACE(row.key);
        FakeDevice device;
        Property property;
        row.access(property);
        EXPECT_THAT(device.properties, ElementsAre(Pair(row.key, row.value)));
    }
}

TEST(PropertyTest, WritesAFlagAsAWord) {
    FakeDevice device;
    Property().SetRawData(false);
    EXPECT_EQ(device.properties["thp.debug.raw"], "false");
}

TEST(PropertyTest, OnlyTrueAndOneSetAFlag) {
    FakeDevice device;
    for (const char* text : {"true", "1"}) {
        device.properties["odm.thp.dae_reboot_times"] = text;
        EXPECT_TRUE(Property().GetRebootTimes()) << text;
    }
    for (const char* text : {"false", "0", "2", "11", "TRUE", " true", "1\n", "null"}) {
        device.properties["odm.thp.dae_reboot_times"] = text;
        EXPECT_FALSE(Property().GetRebootTimes()) << text;
    }
}

TEST(PropertyTest, ReadsTheUserTypeAsANumber) {
    constexpr int kBefore = 99;
    const struct {
        const char* text;
        int type;
    } kRows[] = {
            {"3", 3},
            {" -5x", -5},
            {"", kBefore},
            {"x5", kBefore},
            {"2147483647", INT_MAX},
            {"2147483648", kBefore},
            {"-2147483648", INT_MIN},
            {"-2147483649", kBefore},
    };
    for (const auto& row : kRows) {
        SCOPED_TRACE(row.text);
        FakeDevice device;
        device.properties["ro.logsystem.usertype"] = row.text;
        int type = kBefore;
        EXPECT_EQ(Property().GetUserType(type), static_cast<int>(strlen(row.text)));
        EXPECT_EQ(type, row.type);
    }
}

}  // namespace test
