// The boot command line reader over any file.
#include "cmdline/CmdLine.h"
#include "fuzz.h"

int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    const std::string bytes(reinterpret_cast<const char*>(data), size);
    WriteFile(UseDeviceRoot() + "/proc/cmdline", bytes);
    const size_t end = bytes.find_first_of(std::string("\n\0", 2));
    Check(CmdLine::GetCmdLine() == bytes.substr(0, std::min<size_t>(end, 8191)));
    Check(!CmdLine().IsUpgradeMode() || bytes.find("enter_") != std::string::npos);
    return 0;
}
