#include "property/Property.h"

#include <climits>
#include <cstring>

#include "tests/unit_test.h"

namespace test {

class PropertyTest : public DeviceTest {
  protected:
    Property property;
    std::string value = "before";
};

TEST_F(PropertyTest, ReadsAnEmptyPropertyASecondTime) {
    device.duringCall = [&](const Call& call) {
        if (call == Pause(100us)) {
            device.properties["k"] = "y";
        }
    };
    EXPECT_EQ(property.Get("k", value, "default"), 1);
    EXPECT_EQ(value, "y");
    EXPECT_THAT(device.calls(), ElementsAre(Read("k"), Pause(100us), Read("k"),
                                            Log(INFO, "ret = 1, i = 1, k mBuf = y")));
}

TEST_F(PropertyTest, StoresTheDefaultOfAnEmptyProperty) {
    EXPECT_EQ(property.Get("k", value, "no"), 3);
    EXPECT_EQ(value, "no");
    EXPECT_THAT(
            device.calls(),
            ElementsAre(Read("k"), Pause(100us), Read("k"), Read("k"), Write("k", "no"),
                        Log(ERROR, "retry:1, i = 0, k, [new]no, [old]"), Pause(100us), Read("k")));
}

TEST_F(PropertyTest, ReadsAnEmptyPropertyWithoutADefaultAsEmpty) {
    EXPECT_EQ(property.Get("k", value, ""), 0);
    EXPECT_EQ(value, "");
    EXPECT_THAT(device.calls({kWrite}), IsEmpty());
}

TEST_F(PropertyTest, WritesOnlyAnotherValue) {
    device.properties["k"] = "old";
    property.Set("k", "new");
    property.Set("k", "new");
    EXPECT_THAT(device.calls(), ElementsAre(Read("k"), Write("k", "new"),
                                            Log(ERROR, "retry:1, i = 0, k, [new]new, [old]old"),
                                            Pause(100us), Read("k"), Read("k")));
}

TEST_F(PropertyTest, GivesUpAfterSixRejectedWrites) {
    device.rejectedWrites = {"k"};
    property.Set("k", "v");
    EXPECT_THAT(device.calls({kRead, kWrite}), SizeIs(12));
    EXPECT_EQ(device.calls({kLog}).back(), Log(ERROR, "retry:1, i = 5, k, [new]v, [old]"));
    EXPECT_EQ(device.calls().back(), Pause(100us));
}

TEST_F(PropertyTest, WritesTheInputTriggerWithoutALogLine) {
    property.Set("odm.thp.trigger_input", "1");
    EXPECT_THAT(device.calls({kWrite, kLog}), ElementsAre(Write("odm.thp.trigger_input", "1")));
}

TEST_F(PropertyTest, FindsARowByItsExactAlias) {
    EXPECT_EQ(property.GetItem("Rotate").key, "odm.thp.rotate");
    EXPECT_EQ(property.GetItem("rotate").alias, "VerSys");
}

// Without properties, each accessor leaves its value or its default in the property of its row.
TEST_F(PropertyTest, AccessorsUseTheirOwnProperty) {
    static std::string text;
    static int number;
    const struct {
        const char* key;
        const char* value;
        void (*access)(Property&);
    } kRows[] = {
            {"persist.sys.zelmor.debug.on", "true", [](Property& p) { p.SetDebugOn(true); }},
            {"thp.debug.raw", "false", [](Property& p) { p.SetRawData(false); }},
            {kThplogKey, "true", [](Property& p) { p.SetThplogEnable(true); }},
            {"persist.odm.thp.ver_dae", "true", [](Property& p) { p.SetPersistVerDae(true); }},
            {"odm.thp.dae_bootflag", "true", [](Property& p) { p.SetBootFlag(true); }},
            {"odm.thp.ver_dae", "true", [](Property& p) { p.SetVerDae(true); }},
            {"odm.thp.debug.afelog", "true", [](Property& p) { p.SetAfeLog(true); }},
            {kPermissiveKey, "true", [](Property& p) { p.SetPermissive(true); }},
            {"odm.thp.service_enable", "-12", [](Property& p) { p.SetServiceEnable(-12); }},
            {kThplogKey, "", [](Property& p) { p.GetThplogEnable(text); }},
            {"odm.thp.service_enable", "false", [](Property& p) { p.GetServiceEnable(text); }},
            {"odm.thp.service_enable", "false", [](Property& p) { p.GetServiceEnable(); }},
            {"odm.thp.dae_alive", "false", [](Property& p) { p.GetDaeAlive(text); }},
            {"odm.thp.dae_alive", "false", [](Property& p) { p.GetDaeAlive(); }},
            {"odm.thp.dae_reboot_times", "0", [](Property& p) { p.GetRebootTimes(text); }},
            {"odm.thp.dae_reboot_times", "0", [](Property& p) { p.GetRebootTimes(); }},
            {"odm.thp.binder", "0", [](Property& p) { p.GetBinder(text); }},
            {"odm.thp.binder", "0", [](Property& p) { p.GetBinder(); }},
            {"odm.thp.is_updating_fw", "false", [](Property& p) { p.GetUpdateFW(text); }},
            {"odm.thp.is_updating_fw", "false", [](Property& p) { p.GetUpdateFW(); }},
            {kPermissiveKey, "null", [](Property& p) { p.GetPermissive(text); }},
            {kPermissiveKey, "null", [](Property& p) { p.GetPermissive(); }},
            {"ro.logsystem.usertype", "", [](Property& p) { p.GetUserType(number); }},
    };
    for (const auto& row : kRows) {
        SCOPED_TRACE(std::string(row.key) + ", row " + std::to_string(&row - kRows));
        device.properties.clear();
        row.access(property);
        EXPECT_THAT(device.properties, ElementsAre(Pair(row.key, row.value)));
    }
}

TEST_F(PropertyTest, OnlyTrueAndOneSetAFlag) {
    for (const char* text : {"true", "1", "false", "0", "2", "11", "TRUE", " true", "1\n"}) {
        device.properties["odm.thp.dae_reboot_times"] = text;
        const bool isSet = strcmp(text, "true") == 0 || strcmp(text, "1") == 0;
        EXPECT_EQ(property.GetRebootTimes(), isSet) << text;
    }
}

TEST_F(PropertyTest, ReadsTheUserTypeWithinTheRangeOfInt) {
    constexpr int kBefore = 99;
    const struct {
        const char* text;
        int type;
    } kRows[] = {{" -5x", -5},
                 {"x5", kBefore},
                 {"", kBefore},
                 {"2147483647", INT_MAX},
                 {"2147483648", kBefore},
                 {"-2147483648", INT_MIN},
                 {"-2147483649", kBefore}};
    for (const auto& row : kRows) {
        SCOPED_TRACE(row.text);
        device.properties["ro.logsystem.usertype"] = row.text;
        int type = kBefore;
        EXPECT_EQ(property.GetUserType(type), static_cast<int>(strlen(row.text)));
        EXPECT_EQ(type, row.type);
    }
}

}  // namespace test
