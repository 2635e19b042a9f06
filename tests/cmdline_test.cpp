// The boot command line: splitting, key/value pairs, and how the device was booted.
#include "cmdline/CmdLine.h"

#include "tests/fake_device.h"

namespace test {

using BootLine = Device;

TEST_F(BootLine, HoldsPairs) {
    StringPairParser pairs;
    pairs.Init("a=1  b==-2x a=3 flag quiet= =z x=y=w o=2147483648 t=true A=0x10 ", " ", "=");
    pairs.Init("b: 7;l: -7;u:-2147483648;f:-2147483649;n:2147483647;z:00", ";", ":");
    const auto kCases = Table<3>(
            "a|1|1|b|-2x|-2|flag|-|99|quiet|-|99||-|99|x|-|99|o|2147483648|99|t|true|99|A|0x10|0|"
            "l| -7|-7|u|-2147483648|-2147483648|f|-2147483649|99|n|2147483647|2147483647|z|00|0");
    for (const auto& [key, value, parsed] : kCases) {
        std::string text = "-";
        EXPECT_EQ(pairs.GetValue(key, text), value != "-") << key;
        EXPECT_EQ(text, value);
        int number = 99;
        EXPECT_EQ(pairs.GetIntValue(key, number), parsed != "99") << key;
        EXPECT_EQ(std::to_string(number), parsed);
        bool flag = false;
        EXPECT_EQ(pairs.GetBoolValue(key, flag), parsed != "99") << key;
        EXPECT_EQ(flag, parsed != "99" && parsed != "0");
    }
}

TEST_F(BootLine, TellsUpgradeModeAndFactoryBuild) {
    const auto kCases = Table<2>(  // u: upgrade mode, f: factory build
            "quiet enter_recovery=1 ro\n|u|enter_recovery=0 enter_erecovery=1|u|"
            "enter_recovery=0 enter_recovery=1||enter_recovery=1 enter_erecovery=0|u|"
            "enter_recovery=yes enter_erecovery=-1|u|Enter_recovery=1 enter_recovery||"
            "androidboot.swtype=a-factory_test enter_recovery=2|uf|androidboot.swtype=Factory||"
            "androidboot.swtype=x=factory a=1\tenter_recovery=1||"
            "androidboot.swtype=factory\nenter_recovery=1|f");
    for (const auto& [line, told] : kCases) {
        bootLine = line;
        const CmdLine device;
        EXPECT_EQ(std::string(device.IsUpgradeMode() ? "u" : "") +
                          (device.IsFactoryVersion() ? "f" : ""),
                  told)
                << line;
    }
}

}  // namespace test
