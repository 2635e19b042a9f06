// The property store: its rows, reads with defaults, confirmed writes, typed accessors.
#include "property/Property.h"

#include "tests/fake_device.h"

namespace test {

using PropertyStore = Device;

TEST_F(PropertyStore, ReadsAValueOrItsDefault) {
    const struct {
        int presentAtRead, result;
        const char *fallback, *out, *shape, *log;
    } kCases[] = {
            {1, 3, "no", "yes", "r", ""},
            {2, 3, "no", "yes", "rprl", "I corvane_daemon: ret = 3, i = 1, k mBuf = yes"},
            {9, 3, "no", "no", "rprrwlpr", "E corvane_daemon: retry:1, i = 0, k, [new]no, [old]"},
            {9, 0, "", "", "rpr", ""},
    };
    for (const auto& each : kCases) {
        StartsAfresh();
        holds.clear();
        appears["k"] = {each.presentAtRead, "yes"};
        std::string out = "before";
        EXPECT_EQ(Property().Get("k", out, each.fallback), each.result);
        EXPECT_TRUE(out == each.out && holds["k"] == each.out) << out;
        EXPECT_EQ(Shape(), each.shape);
        EXPECT_EQ(Trail("log"), each.log);
    }
}

TEST_F(PropertyStore, ConfirmsAWriteOrGivesUpAfterTheSixth) {
    holds["k"] = "old";
    Property().Set("k", "new");
    Property().Set("k", "new");
    EXPECT_EQ(Trail("read write log pause"),
              "read k; write k=new; log E corvane_daemon: retry:1, i = 0, k, [new]new, [old]old; "
              "pause 100; read k; read k");
    refuses = {"k", "odm.thp.trigger_input"};
    StartsAfresh();
    Property().Set("k", "other");
    const std::string log = Trail("log");
    EXPECT_EQ(Shape() + log.substr(log.rfind(" i = ")),
              "rwlprwlprwlprwlprwlprwlp i = 5, k, [new]other, [old]new");
    StartsAfresh();
    Property().Set("odm.thp.trigger_input", "1");
    EXPECT_EQ(Shape(), "rwprwprwprwprwprwp");
}

TEST_F(PropertyStore, TakesTrueAndOneForAFlag) {
    for (const std::string text : {"true", "1", "false", "2", "11", "TRUE", " true", "1\n", ""}) {
        holds = {{kAlive, text}};
        EXPECT_EQ(Property().GetDaeAlive(), text == "true" || text == "1") << text;
        EXPECT_EQ(holds[kAlive], text.empty() ? "false" : text);
    }
    EXPECT_EQ(Property().GetItem("Rotate").key + Property().GetItem("rotate").alias,
              "odm.thp.rotateVerSys");
}

}  // namespace test
