#include "log/Log.h"

#include "tests/unit_test.h"

namespace test {

using LogTest = DeviceTest;

// A log that also writes debug lines and keeps appended texts in memory.
class DebugLog : public LogBase {
  public:
    DebugLog() : LogBase("debug") {}
    int GetLogLevel() const override { return LOG_DEBUG; }
    void Append(std::string text) const override { mLog += text; }
};

TEST_F(LogTest, WritesLevelsUpToItsThreshold) {
    for (int level = -1; level <= 5; ++level) {
        gSysLog.Printf(static_cast<LogLevel>(level), "f", level, "%s", "text");
    }
    gSysLog.AndroidLog(LOG_DEBUG, "f", 4, "text");
    EXPECT_THAT(device.calls(), ElementsAre(Log(ERROR, "f[1] text"), Log(WARN, "f[2] text"),
                                            Log(INFO, "f[3] text")));
}

TEST_F(LogTest, NamesTheFunctionWithoutItsSignature) {
    gSysLog.Printf(LOG_ERROR, "unsigned long A::B(int (*)(int)) const", 120, "%s", "");
    EXPECT_THAT(device.calls(), ElementsAre(Log(ERROR, "A::B[120] ")));
}

TEST_F(LogTest, TruncatesAndReportsAnOverlongMessage) {
    const std::string longest(2047, 'x');
    gSysLog.Printf(LOG_INFO, "f", 1, "%s", longest.c_str());
    gSysLog.Printf(LOG_INFO, "f", 2, "%sy", longest.c_str());
    EXPECT_THAT(device.calls(), ElementsAre(Log(INFO, "f[1] " + longest), Log(INFO, "over size 0"),
                                            Log(INFO, "f[2] " + longest)));
}

TEST_F(LogTest, KeepsOnlyAppendedMessages) {
    DebugLog log;
    log.Printf(LOG_DEBUG, "f", 1, "%d", 7);
    EXPECT_THAT(device.calls(), ElementsAre(Log(INFO, "f[1] 7")));
    EXPECT_EQ(log.GetLog(), "");
    log.Append("kept");
    EXPECT_EQ(log.GetLog(), "kept");
    EXPECT_EQ(log.GetLogClear(), "kept");
    EXPECT_EQ(log.GetLogClear(), "");
    gSysLog.Append("not kept");
    EXPECT_EQ(gSysLog.GetLog(), "");
}

}  // namespace test
