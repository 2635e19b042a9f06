// The log facility: which lines it writes and how they read.
#include "log/Log.h"

#include "tests/fake_device.h"

namespace test {

using LogFacility = Device;

TEST_F(LogFacility, WritesLevelsUpToItsThreshold) {
    for (int level = -1; level <= 5; ++level) {
        gSysLog.Printf(static_cast<LogLevel>(level), "static unsigned long A::B(int) const", level,
                       "%s", "m");
    }
    EXPECT_EQ(Trail("log"),
              "E corvane_daemon: A::B[1] m; W corvane_daemon: A::B[2] m; I corvane_daemon: A::B[3] "
              "m");
    EXPECT_EQ(gSysLog.GetName() + gSysLog.GetLog() + gSysLog.GetLogClear(), "sys");
}

TEST_F(LogFacility, SaysThatAMessageWasTooLong) {
    const std::string fits(2047, 'x');
    gSysLog.Printf(LOG_INFO, "f", 1, "%s", fits.c_str());
    gSysLog.Printf(LOG_INFO, "f", 2, "%sy", fits.c_str());
    EXPECT_EQ(Trail("log"), "I corvane_daemon: f[1] " + fits +
                                    "; I corvane_daemon: over size 0; I corvane_daemon: f[2] " +
                                    fits);
}

}  // namespace test
