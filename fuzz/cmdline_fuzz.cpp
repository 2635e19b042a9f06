// The parser of the kernel command line, with any bytes as that line.
#include "cmdline/CmdLine.h"
#include "fuzz.h"
#include "tests/fake_device.h"

int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    test::FakeDevice device;
    const std::string bytes = ToString(data, size);
    device.kernelCommandLine = bytes;
    const std::string line = bytes.substr(0, bytes.find_first_of(std::string("\n\0", 2)));
    Check(CmdLine::GetCmdLine() == line.substr(0, 8191));
    Check(!CmdLine().IsUpgradeMode() || line.find("enter_") != std::string::npos);
    return 0;
}
