// The daemon's controller: start, stop, restart, log switches, and who may forward commands.
#include "daemon/TpdCmd.h"

#include "tests/fake_device.h"

namespace test {

using Controller = Device;

TEST_F(Controller, SwitchesTheLogWhenItStandsOtherwise) {
    const std::string enabling = "persist.odm.thp.thplog_enabled=true; " + kRestart;
    const std::string disabling =
            "persist.odm.thp.ver_dae=true; odm.thp.ver_dae=true; "
            "persist.odm.thp.thplog_enabled=false; " +
            kRestart;
    const auto kCases = Table<4>(  // log property, user type, boot line, counts as on
            "true|0||1|false|3||0|truefalse|5||0|untrue|||1|1|3||1||5||1||4||0||||0||x5||0||35||0||"
            "4294967299||0|"
            "false||enter_recovery=1|0|true||enter_erecovery=2|1");
    for (const auto& [thplog, userType, line, counts] : kCases) {
        for (const bool enable : {true, false}) {
            StartsAfresh();
            holds = {{"persist.odm.thp.thplog_enabled", thplog},
                     {"ro.logsystem.usertype", userType}};
            bootLine = line;
            const bool on = counts == "1", switches = on != enable && line.empty();
            EXPECT_EQ(TpdCmd::IsThplogEnable(), on) << thplog << userType;
            enable ? TpdCmd().EnableThplog() : TpdCmd().DisableThplog();
            EXPECT_EQ(Trail("write"), !switches ? "" : enable ? enabling : disabling);
            EXPECT_EQ(TpdCmd::IsThplogEnable(), switches ? enable : on);
        }
    }
}

TEST_F(Controller, LetsCommandsThroughWhenSelinuxDoes) {
    const std::string fits = "Permissive" + std::string(189, 'x');
    const auto kCases = Table<5>(  // stored flag, boot line, getenforce, stored afterwards, passes
            "||Enforcing\n|null|0|||Permissive\n|true|1|0|| \nPermissively so|true|1|"
            "||Not Permissive\n|null|0|||xPermissive\n|null|0||| \n|null|0|1||Enforcing\n|1|1|"
            "true||Enforcing\n|true|1||enter_recovery=1|Enforcing\n|null|1|"
            "|androidboot.swtype=factory|Enforcing\n|null|1|||" +
            fits + "|true|1|||" + fits + "x|null|0");
    for (const auto& [stored, line, printed, storedAfter, passes] : kCases) {
        StartsAfresh();
        holds[kPermissive] = stored;
        bootLine = line;
        getenforce = printed;
        EXPECT_EQ(TpdCmd().IsSelinuxPermissive() ? "1" : "0", passes) << printed;
        const bool asks = stored != "true" && stored != "1" && line.empty();
        EXPECT_EQ(Trail("shell end"), asks ? "shell getenforce >r; end " : "");
        EXPECT_EQ(holds[kPermissive], storedAfter) << printed;
    }
}

TEST_F(Controller, StopsCommandsWhenItCannotFindOut) {
    getenforce = "Permissive\n";
    closeStatus = -1;
    bootLine.reset();
    EXPECT_FALSE(TpdCmd().IsSelinuxPermissive());
    holds.clear();
    getenforce.reset();
    EXPECT_FALSE(TpdCmd().IsSelinuxPermissive());
}

TEST_F(Controller, ReadsTheClockInMilliseconds) {
    timespec now;
    clock_gettime(CLOCK_MONOTONIC, &now);
    EXPECT_LE(TpdCmd::GetMonotonicTime() - static_cast<uint64_t>(now.tv_sec) * 1000, 2000U);
}

}  // namespace test
