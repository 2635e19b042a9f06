#include "log/Log.h"

#include <gmock/gmock.h>

#include "tests/fake_device.h"

namespace test {

using testing::ElementsAre;

// Writes debug lines, too, and keeps texts in memory.
class DebugLog : public LogBase {
  public:
    DebugLog() : LogBase("debug") {}
    int GetLogLevel() const override { return LOG_DEBUG; }
    void Append(std::string text) const override { mLog += text; }
};

TEST(LogTest, WritesLevelsUpToItsThreshold) {
    FakeDevice device;
    for (int level = -1; level <= 5; ++level) {
        gSysLog.Printf(static_cast<LogLevel>(level), "f", level, "%s", "text");
    }
    EXPECT_THAT(device.calls(), ElementsAre(Log(ERROR, "f[1] text"), Log(WARN, "f[2] text"),
                                            Log(INFO, "f[3] text")));
}

TEST(LogTest, AppliesTheThresholdToReadyLines) {
    FakeDevice device;
    for (const unsigned level : {0U, 3U, 4U, 5U}) {
        gSysLog.AndroidLog(level, "f", 1, "text");
    }
    EXPECT_THAT(device.calls(), ElementsAre(Log(INFO, "f[1] text")));
}

TEST(LogTest, WritesDebugLinesAsInformation) {
    FakeDevice device;
    DebugLog log;
    log.Printf(LOG_DEBUG, "f", 1, "%d", 7);
    log.AndroidLog(LOG_DEBUG + 1, "f", 2, "text");
    EXPECT_THAT(device.calls(), ElementsAre(Log(INFO, "f[1] 7")));
}

TEST(LogTest, NamesTheFunctionWithoutItsSignature) {
    FakeDevice device;
    gSysLog.Printf(LOG_ERROR, "virtual unsigned long A::B(int, bool) const", 120, "failed");
    EXPECT_THAT(device.calls(), ElementsAre(Log(ERROR, "A::B[120] failed")));
    EXPECT_EQ(gSysLog.PrettyTrim("Name"), "Name");
    EXPECT_EQ(gSysLog.PrettyTrim("int (anonymous)"), "");
}

TEST(LogTest, SaysThatAMessageIsTooLong) {
    FakeDevice device;
    const std::string longest(2047, 'x');
    gSysLog.Printf(LOG_INFO, "f", 1, "%s", longest.c_str());
    gSysLog.Printf(LOG_INFO, "f", 2, "%sy", longest.c_str());
    EXPECT_THAT(device.calls(), ElementsAre(Log(INFO, "f[1] " + longest), Log(INFO, "over size 0"),
                                            Log(INFO, "f[2] " + longest)));
}

TEST(LogTest, EmptiesItsMemory) {
    DebugLog log;
    log.Append("kept");
    EXPECT_EQ(log.GetLog(), "kept");
    EXPECT_EQ(log.GetLogClear(), "kept");
    EXPECT_EQ(log.GetLogClear(), "");
}

TEST(LogTest, KeepsNothingInMemoryByItself) {
    gSysLog.Append("text");
    EXPECT_EQ(gSysLog.GetLog(), "");
    EXPECT_EQ(gSysLog.GetName(), "sys");
}

}  // namespace test
