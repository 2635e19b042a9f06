#include "daemon/TpdClient.h"

#include <android/log.h>
#include <unistd.h>

#include <algorithm>
#include <cstring>

#include "binder/corvane_sys_binder_client.h"
#include "property/Property.h"

namespace {

constexpr char kTag[] = "corvane_daemon";
constexpr int kMaxChecks = 11;
constexpr int kChecksAfterFailures = 1;
constexpr int kMaxFailedWaits = 2;
constexpr useconds_t kCheckPauseUs = 200000;

constexpr char kNotSentPrefix[] = "0P_1P; ";
constexpr char kNoServiceMark[] = "0F_1F";
constexpr char kErrorMark[] = "ERROR";

constexpr char kCaptest[] = "captest";
// The names of both test modes, concatenated. Any substring selects running-test mode.
constexpr char kRunningTestModes[] =
        "running_test"
        "running_test_lasttime";

bool Contains(const std::string& text, const char* part) {
    return text.find(part) != std::string::npos;
}

const char* Digit(bool flag) { return flag ? "1" : "0"; }

}  // namespace

bool aliveConfirmed = false;
int failedWaitCount = 0;

TpdClient::TpdClient() : daemonUnavailable(1) {}

std::string TpdClient::ThpExecuteCmdParams(std::string cmd, std::string params) {
    const int checks = failedWaitCount < kMaxFailedWaits ? kMaxChecks : kChecksAfterFailures;
    failedWaitCount = std::min(failedWaitCount + 1, kMaxFailedWaits);
    std::string report = WaitDaemonAlive(checks);
    if (daemonUnavailable != 0) {
        return report;
    }
    failedWaitCount = 0;
    std::string result = RunCmd(cmd.c_str(), params.c_str());
    if (Contains(result, kNoServiceMark) || Contains(result, kErrorMark)) {
        aliveConfirmed = false;
    }
    return result;
}

std::string TpdClient::RunCmd(const char* cmd, const char* params) {
    Property property;
    const bool before = property.GetRebootTimes();
    daemonUnavailable = 0;
    std::string reply = RunCmdParms(cmd, params);
    if (reply.compare(0, sizeof(kNoServicePrefix) - 1, kNoServicePrefix) == 0) {
        daemonUnavailable = 1;
        __android_log_print(ANDROID_LOG_ERROR, kTag,
                            "%s, failed to Get binder service. thp.service_enable: %d\n", "RunCmd",
                            property.GetServiceEnable() ? 1 : 0);
        return reply;
    }
    const bool after = property.GetRebootTimes();
    if (!IsCaptestInRt(cmd, params)) {
        return reply;
    }
    std::string status;
    if (IsDaemonAlive(status) && before == after) {
        return reply;
    }
    return reply + status +
           "captest fail due to corvane_daemon is not alive or unexpected reboot. before: " +
           Digit(before) + ", after: " + Digit(after);
}

bool TpdClient::IsCaptestInRt(std::string cmd, std::string params) {
    return cmd == kCaptest && !params.empty() &&
           strstr(kRunningTestModes, params.c_str()) != nullptr;
}

bool TpdClient::IsDaemonAlive(std::string& info) {
    Property property;
    const bool alive = property.GetDaeAlive();
    const bool binder = property.GetBinder();
    info += std::string("thp.dae_alive : ") + Digit(alive) + ". thp.binder: " + Digit(binder);
    return alive && binder;
}

std::string TpdClient::WaitDaemonAlive(int checks) {
    std::string report;
    daemonUnavailable = 1;
    Property property;
    for (int i = 0; i < checks; ++i) {
        report = "check_time: " + std::to_string(i) + ".";
        if (aliveConfirmed || IsDaemonAlive(report)) {
            aliveConfirmed = true;
            daemonUnavailable = 0;
            return report;
        }
        if (property.GetUpdateFW()) {
            return std::string(kNotSentPrefix) + "bypass-when-fw-updating" + report;
        }
        __android_log_print(ANDROID_LOG_INFO, kTag, "CheckAlive %d", i);
        if (i != 0) {
            usleep(kCheckPauseUs);
        }
    }
    return kNotSentPrefix + report + " reboot_times: " + Digit(property.GetRebootTimes());
}
