#include "cmdline/CmdLine.h"

#include <gmock/gmock.h>

#include <climits>

#include "tests/fake_device.h"

namespace test {

using testing::ElementsAre;
using testing::IsEmpty;

StringPairParser Parse(const std::string& text) {
    StringPairParser pairs;
    pairs.Init(text, " ", "=");
    return pairs;
}

TEST(SplitTest, DropsEmptyFields) {
    EXPECT_THAT(Split("  a b  c ", " "), ElementsAre("a", "b", "c"));
    EXPECT_THAT(Split("", " "), IsEmpty());
    EXPECT_THAT(Split("  ", " "), IsEmpty());
}

TEST(SplitTest, TakesTheDelimiterAsAWhole) {
    EXPECT_THAT(Split("a<>b<c>d", "<>"), ElementsAre("a", "b<c>d"));
    EXPECT_THAT(Split("aaa", "aa"), ElementsAre("a"));
}

TEST(SplitTest, LeavesATextWithoutDelimiterWhole) {
    EXPECT_THAT(Split("a b", ""), ElementsAre("a b"));
    EXPECT_THAT(Split("", ""), ElementsAre(""));
}

TEST(StringPairParserTest, KeepsTheFirstValueOfAKey) {
    StringPairParser pairs = Parse("a=1 a=2  b==3 ");
    pairs.Init("a:4;c: 5", ";", ":");
    std::string value;
    EXPECT_TRUE(pairs.GetValue("a", value));
    EXPECT_EQ(value, "1");
    EXPECT_TRUE(pairs.GetValue("b", value));
    EXPECT_EQ(value, "3");
    EXPECT_TRUE(pairs.GetValue("c", value));
    EXPECT_EQ(value, " 5");
}

TEST(StringPairParserTest, IgnoresWhatIsNoPair) {
    const StringPairParser pairs = Parse("flag quiet= =value x=y=z");
    std::string value = "before";
    for (const char* key : {"flag", "quiet", "value", "x", "y", ""}) {
        EXPECT_FALSE(pairs.GetValue(key, value)) << key;
    }
    EXPECT_EQ(value, "before");
}

TEST(StringPairParserTest, ReadsNumbersWithinTheRangeOfInt) {
    constexpr int kBefore = 99;
    const struct {
        const char* text;
        bool found;
        int number;
    } kRows[] = {
            {"12abc", true, 12},
            {"0x10", true, 0},
            {"\t-7", true, -7},
            {"+010", true, 10},
            {"2147483647", true, INT_MAX},
            {"2147483648", false, kBefore},
            {"-2147483648", true, INT_MIN},
            {"-2147483649", false, kBefore},
            {"true", false, kBefore},
            {"-", false, kBefore},
    };
    for (const auto& row : kRows) {
        SCOPED_TRACE(row.text);
        const StringPairParser pairs = Parse(std::string("k=") + row.text);
        int number = kBefore;
        EXPECT_EQ(pairs.GetIntValue("k", number), row.found);
        EXPECT_EQ(number, row.number);
    }
}

TEST(StringPairParserTest, ReadsAnyOtherNumberThanZeroAsTrue) {
    const StringPairParser pairs = Parse("zero=00 minus=-1 word=true");
    bool flag = true;
    EXPECT_TRUE(pairs.GetBoolValue("zero", flag));
    EXPECT_FALSE(flag);
    EXPECT_TRUE(pairs.GetBoolValue("minus", flag));
    EXPECT_TRUE(flag);
    EXPECT_FALSE(pairs.GetBoolValue("word", flag));
    EXPECT_TRUE(flag);
}

TEST(CmdLineTest, TellsHowTheDeviceWasBooted) {
    const struct {
        const char* kernelCommandLine;
        bool upgradeMode;
        bool factoryVersion;
    } kRows[] = {
            {"", false, false},
            {"quiet enter_recovery=1 ro", true, false},
            {"enter_recovery=-1", true, false},
            {"enter_recovery=0 enter_erecovery=1", true, false},
            {"enter_recovery=1 enter_erecovery=0", true, false},
            {"enter_recovery=0 enter_recovery=1", false, false},
            {"enter_recovery=yes enter_erecovery", false, false},
            {"androidboot.swtype=factory", false, true},
            {"androidboot.swtype=a-factory_test enter_recovery=1", true, true},
            {"androidboot.swtype=Factory", false, false},
            {"a=1\tenter_recovery=1", false, false},
    };
    for (const auto& row : kRows) {
        SCOPED_TRACE(row.kernelCommandLine);
        FakeDevice device;
        device.kernelCommandLine = row.kernelCommandLine;
        EXPECT_EQ(CmdLine().IsUpgradeMode(), row.upgradeMode);
        EXPECT_EQ(CmdLine().IsFactoryVersion(), row.factoryVersion);
    }
}

TEST(CmdLineTest, ReadsTheFirstLineUpToItsLimit) {
    FakeDevice device;
    device.kernelCommandLine = "first\nsecond";
    EXPECT_EQ(CmdLine::GetCmdLine(), "first");
    device.kernelCommandLine = std::string(9000, 'x');
    EXPECT_EQ(CmdLine::GetCmdLine(), std::string(8191, 'x'));
    device.kernelCommandLine = std::nullopt;
    EXPECT_EQ(CmdLine::GetCmdLine(), "");
}

}  // namespace test
