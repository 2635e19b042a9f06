#include "property/Property.h"

#include <climits>

#include "tests/unit_test.h"

namespace test {

class PropertyTest : public DeviceTest {
  protected:
    Property property;
    std::string value = "before";
};

TEST_F(PropertyTest, RereadsAnEmptyProperty) {
    device.changes[Pause(100us)] = {"k", "y"};
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

TEST_F(PropertyTest, GivesUpAfterSixRejectedWrites) {
    device.rejectedWrites = {"k"};
    property.Set("k", "v");
    EXPECT_THAT(device.calls({kRead, kWrite}), SizeIs(12));
    EXPECT_EQ(device.calls({kLog}).back(), Log(ERROR, "retry:1, i = 5, k, [new]v, [old]"));
    EXPECT_EQ(device.calls().back(), Pause(100us));
}

TEST_F(PropertyTest, DoesNotLogWritesOfTheInputTrigger) {
    property.Set("odm.thp.trigger_input", "1");
    EXPECT_THAT(device.calls({kWrite, kLog}), ElementsAre(Write("odm.thp.trigger_input", "1")));
}

TEST_F(PropertyTest, FindsItemsByExactAlias) {
    EXPECT_EQ(property.GetItem("Rotate").key, "odm.thp.rotate");
    EXPECT_EQ(property.GetItem("rotate").alias, "VerSys");
}

// A getter stores its default in an unset property. The callers' tests cover setters and flag
// getters.
TEST_F(PropertyTest, TextGettersUseTheirOwnProperty) {
    const Rows<const char*, const char*, int (Property::*)(std::string&)> rows = {
            {kThplogKey, "", &Property::GetThplogEnable},
            {"odm.thp.service_enable", "false", &Property::GetServiceEnable},
            {"odm.thp.dae_alive", "false", &Property::GetDaeAlive},
            {"odm.thp.dae_reboot_times", "0", &Property::GetRebootTimes},
            {"odm.thp.binder", "0", &Property::GetBinder},
            {"odm.thp.is_updating_fw", "false", &Property::GetUpdateFW},
            {kPermissiveKey, "null", &Property::GetPermissive},
    };
    for (const auto& [key, defaultValue, get] : rows) {
        device.properties.clear();
        (property.*get)(value);
        EXPECT_EQ(value, defaultValue) << key;
        EXPECT_THAT(device.properties, ElementsAre(Pair(key, defaultValue)));
    }
}

TEST_F(PropertyTest, OnlyTrueAndOneSetAFlag) {
    for (const std::string text : {"true", "1", "false", "0", "2", "11", "TRUE", " true"}) {
        device.properties["odm.thp.binder"] = text;
        EXPECT_EQ(property.GetBinder(), text == "true" || text == "1") << text;
    }
}

TEST_F(PropertyTest, AcceptsOnlyUserTypesWithinTheRangeOfInt) {
    constexpr int kBefore = 99;
    const Rows<std::string, int> rows = {{" -5x", -5},
                                         {"", kBefore},
                                         {"2147483647", INT_MAX},
                                         {"2147483648", kBefore},
                                         {"-2147483648", INT_MIN},
                                         {"-2147483649", kBefore}};
    for (const auto& [text, expected] : rows) {
        device.properties["ro.logsystem.usertype"] = text;
        int type = kBefore;
        EXPECT_EQ(property.GetUserType(type), static_cast<int>(text.size()));
        EXPECT_EQ(type, expected) << text;
    }
}

}  // namespace test
