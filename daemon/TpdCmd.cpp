#include "daemon/TpdCmd.h"

#include <android/log.h>
#include <bounded_libc.h>
#include <time.h>

#include <cstdio>
#include <new>
#include <string>

#include "cmdline/CmdLine.h"
#include "property/Property.h"

namespace {

constexpr char kTag[] = "corvane_daemon";
constexpr char kGetenforce[] = "getenforce";
constexpr char kPermissive[] = "Permissive";
constexpr size_t kSelinuxModeBytes = 200;

// Returns true if the log is on by default for this user type ("ro.logsystem.usertype").
bool IsUserTypeWithLog(int userType) { return userType == 3 || userType == 5; }

}  // namespace

bool TpdCmd::Init() {
    tpd_client.reset(new (std::nothrow) TpdClient);
    if (tpd_client == nullptr) {
        printf("can NOT alloc memory for tpd_client");
        return false;
    }
    return true;
}

void TpdCmd::StartCorvane() {
    Property property;
    property.SetBootFlag(true);
    property.SetServiceEnable(1);
}

void TpdCmd::StopCorvane() {
    Property property;
    property.SetServiceEnable(0);
}

void TpdCmd::RebootCorvane() {
    StopCorvane();
    StartCorvane();
}

bool TpdCmd::IsThplogEnable() {
    std::string text;
    Property().GetThplogEnable(text);
    if (text.find("false") != std::string::npos) {
        return false;
    }
    if (text.find("true") != std::string::npos) {
        return true;
    }
    int userType = 0;
    if (Property().GetUserType(userType) < 0) {
        return false;
    }
    return IsUserTypeWithLog(userType);
}

void TpdCmd::EnableThplog() {
    if (CmdLine().IsUpgradeMode() || IsThplogEnable()) {
        return;
    }
    Property().SetThplogEnable(true);
    RebootCorvane();
}

void TpdCmd::DisableThplog() {
    if (CmdLine().IsUpgradeMode() || !IsThplogEnable()) {
        return;
    }
    Property property;
    property.SetPersistVerDae(true);
    property.SetVerDae(true);
    property.SetThplogEnable(false);
    RebootCorvane();
}

uint64_t TpdCmd::GetMonotonicTime() {
    timespec now = {};
    if (clock_gettime(CLOCK_MONOTONIC, &now) == -1) {
        return 0;
    }
    return static_cast<uint64_t>(now.tv_sec) * 1000 + static_cast<uint64_t>(now.tv_nsec) / 1000000;
}

bool TpdCmd::IsSelinuxPermissive() {
    Property property;
    const CmdLine cmdLine;
    if (property.GetPermissive() || cmdLine.IsUpgradeMode() || cmdLine.IsFactoryVersion()) {
        return true;
    }

    char mode[kSelinuxModeBytes];
    if (memset_s(mode, sizeof(mode), 0, sizeof(mode)) != 0) {
        __android_log_print(ANDROID_LOG_ERROR, kTag, "memset_s error");
        return false;
    }
    FILE* output = popen(kGetenforce, "r");
    if (output == nullptr) {
        return false;
    }
    const int scanned = fscanf_s(output, "%s", mode, sizeof(mode));
    const int closed = pclose(output);
    if (scanned < 0 || closed < 0) {
        return false;
    }
    if (std::string(mode).find(kPermissive) != 0) {
        return false;
    }
    property.SetPermissive(true);
    return true;
}

TpdClient* TpdCmd::GetTpdclient() const { return tpd_client.get(); }
