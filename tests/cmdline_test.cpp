#include "cmdline/CmdLine.h"

#include <climits>

#include "tests/unit_test.h"

namespace test {

TEST(SplitTest, SplitsOnlyAtWholeDelimiters) {
    EXPECT_THAT(Split("  a b  c ", " "), ElementsAre("a", "b", "c"));
    EXPECT_THAT(Split("a<>b<c>d", "<>"), ElementsAre("a", "b<c>d"));
    EXPECT_THAT(Split("", ""), ElementsAre(""));
}

TEST(StringPairParserTest, KeepsTheFirstValueOfAKey) {
    StringPairParser pairs;
    pairs.Init("a=1 a=2  b==3 ", " ", "=");
    pairs.Init("a:4;c: 5", ";", ":");
    std::string a, b, c;
    EXPECT_TRUE(pairs.GetValue("a", a) && pairs.GetValue("b", b) && pairs.GetValue("c", c));
    EXPECT_THAT(std::vector({a, b, c}), ElementsAre("1", "3", " 5"));
}

TEST(StringPairParserTest, IgnoresInvalidPairs) {
    StringPairParser pairs;
    pairs.Init("flag quiet= =value x=y=z", " ", "=");
    std::string value = "before";
    for (const char* key : {"flag", "quiet", "value", "x", "y", ""}) {
        EXPECT_FALSE(pairs.GetValue(key, value)) << key;
    }
    EXPECT_EQ(value, "before");
    int number = 0;
    EXPECT_FALSE(pairs.GetIntValue("x", number));
}

TEST(StringPairParserTest, AcceptsOnlyNumbersWithinTheRangeOfInt) {
    constexpr int kBefore = 99;
    const Rows<std::string, bool, int> rows = {{"12abc", true, 12},
                                               {"\t-7", true, -7},
                                               {"true", false, kBefore},
                                               {"2147483647", true, INT_MAX},
                                               {"2147483648", false, kBefore},
                                               {"-2147483648", true, INT_MIN},
                                               {"-2147483649", false, kBefore}};
    for (const auto& [text, found, expected] : rows) {
        SCOPED_TRACE(text);
        StringPairParser pairs;
        pairs.Init("key=" + text, " ", "=");
        int number = kBefore;
        EXPECT_EQ(pairs.GetIntValue("key", number), found);
        EXPECT_EQ(number, expected);
        bool flag = true;
        EXPECT_EQ(pairs.GetBoolValue("key", flag), found);
        EXPECT_EQ(flag, expected != 0);
    }
}

using CmdLineTest = DeviceTest;

TEST_F(CmdLineTest, ReportsTheBootMode) {
    const Rows<const char*, bool, bool> rows = {
            {"", false, false},
            {"quiet enter_recovery=-1 ro", true, false},
            {"enter_recovery=0 enter_erecovery=1", true, false},
            {"enter_recovery=1 enter_erecovery=0", true, false},
            {"enter_recovery=0 enter_recovery=1", false, false},
            {"androidboot.swtype=a-factory_test enter_recovery=1", true, true},
            {"androidboot.swtype=Factory", false, false}};
    for (const auto& [line, upgradeMode, factoryVersion] : rows) {
        device.kernelCommandLine = line;
        EXPECT_EQ(CmdLine().IsUpgradeMode(), upgradeMode) << line;
        EXPECT_EQ(CmdLine().IsFactoryVersion(), factoryVersion) << line;
    }
}

TEST_F(CmdLineTest, ReadsTheFirstLineUpToTheLimitAndClosesTheFile) {
    device.kernelCommandLine = "first\nsecond";
    EXPECT_EQ(CmdLine::GetCmdLine(), "first");
    device.kernelCommandLine = std::string(9000, 'x');
    EXPECT_EQ(CmdLine::GetCmdLine(), std::string(8191, 'x'));
    EXPECT_THAT(device.openStreams, IsEmpty());
    for (const auto& noLine : {std::optional<std::string>(""), std::optional<std::string>()}) {
        device.kernelCommandLine = noLine;
        EXPECT_EQ(CmdLine::GetCmdLine(), "");
    }
}

}  // namespace test
