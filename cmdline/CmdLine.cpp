#include "cmdline/CmdLine.h"

#include <cstdio>
#include <cstring>

namespace {

constexpr char kCmdLinePath[] = "/proc/cmdline";
constexpr size_t kCmdLineBufferBytes = 8192;
constexpr char kRecoveryKey[] = "enter_recovery";
constexpr char kErecoveryKey[] = "enter_erecovery";
constexpr char kSoftwareTypeKey[] = "androidboot.swtype";

}  // namespace

CmdLine::CmdLine() {
    Init(GetCmdLine(), " ", "=");
    GetBoolValue(kRecoveryKey, upgradeMode);
    if (!upgradeMode) {
        GetBoolValue(kErecoveryKey, upgradeMode);
    }
}

std::string CmdLine::GetCmdLine() {
    FILE* file = fopen(kCmdLinePath, "r");
    if (file == nullptr) {
        return "";
    }
    char line[kCmdLineBufferBytes] = {};
    const char* read = fgets(line, sizeof(line), file);
    fclose(file);
    return read != nullptr ? std::string(line, strcspn(line, "\n")) : "";
}

bool CmdLine::IsUpgradeMode() const { return upgradeMode; }

bool CmdLine::IsFactoryVersion() const {
    std::string softwareType;
    GetValue(kSoftwareTypeKey, softwareType);
    return softwareType.find("factory") != std::string::npos;
}
