#include "binder/corvane_sys_binder_client.h"

#include <android/log.h>
#include <binder/IServiceManager.h>
#include <binder/ProcessState.h>
#include <sys/system_properties.h>
#include <unistd.h>

#include <vector>

using android::IBinder;
using android::sp;
using android::status_t;
using android::String16;

sp<IBinder> g_thpBinder;
sp<MyDeathRecipient> g_deathRecipient;

namespace {

constexpr char kDriver[] = "/dev/vndbinder";
constexpr char kServiceName[] = "service.corvaneinterfaceservice";
constexpr int kLookupTries = 2;
constexpr int kExecuteAttempts = 2;

constexpr char kServiceEnableKey[] = "odm.thp.service_enable";
constexpr char kScreenStatusKey[] = "odm.thp.screen_status";
constexpr size_t kPropertyBufferBytes = 128;
constexpr int kPropertyWrites = 6;
constexpr useconds_t kPropertyPauseUs = 100;

constexpr char kTimeoutText[] =
        "corvane_daemon binder server execute command return ERROR, may caused by processing "
        "timeout.";

// The log lines are part of the interface. They have a null tag, shown as the program's name; ERROR
// does not mean a failure; "retry:" is always followed by 1.
constexpr const char* kNoTag = nullptr;

// Writes the property up to six times, until it reads back as `value`. A failure shows only in the
// log. Does not use Property::Set(), which logs other lines and which binder/ must not include.
void SetProperty(std::string key, std::string value) {
    char current[kPropertyBufferBytes] = {};
    for (int writes = 0; writes < kPropertyWrites; ++writes) {
        __system_property_get(key.c_str(), current);
        if (value == current) {
            return;
        }
        __system_property_set(key.c_str(), value.c_str());
        __android_log_print(ANDROID_LOG_ERROR, kNoTag, "retry:%d, %s, [new]%s, [old]%s", 1,
                            key.c_str(), value.c_str(), current);
        usleep(kPropertyPauseUs);
    }
}

// Looks the service up once and links the death recipient to it. Returns its binder, or null if it
// is not found.
sp<IBinder> LookUpService() {
    constexpr char kName[] = "ThpGetBinder";
    __android_log_print(ANDROID_LOG_INFO, kNoTag, "%s", kName);
    android::ProcessState::initWithDriver(kDriver);
    const sp<android::IServiceManager> manager = android::defaultServiceManager();
    if (manager == nullptr) {
        __android_log_print(ANDROID_LOG_ERROR, kNoTag, "%s, failed to get defaultServiceManager\n",
                            kName);
        return nullptr;
    }
    sp<IBinder> binder = manager->getService(String16(kServiceName));
    if (binder == nullptr) {
        __android_log_print(ANDROID_LOG_ERROR, kNoTag, "%s, failed to get binder service\n", kName);
        return nullptr;
    }
    if (g_deathRecipient == nullptr) {
        __android_log_print(ANDROID_LOG_ERROR, kNoTag, "enter");
        g_deathRecipient = new MyDeathRecipient(binder);
    }
    const status_t status = binder->linkToDeath(g_deathRecipient, nullptr, 0);
    __android_log_print(ANDROID_LOG_ERROR, kNoTag, "%s ret = %d", kName, status);
    return binder;
}

}  // namespace

std::string RunCmdParms(std::string cmd, std::string params) {
    StoreScreenState(params);
    std::string result;
    for (int attempt = 1; attempt <= kExecuteAttempts; ++attempt) {
        for (int lookup = 0; lookup < kLookupTries && g_thpBinder == nullptr; ++lookup) {
            g_thpBinder = LookUpService();
        }
        if (g_thpBinder == nullptr) {
            ResetDaemon();
            return std::string(kNoServicePrefix) + "failed to get binder service";
        }
        const status_t status = ICorvaneInterfaceClient::asInterface(g_thpBinder)
                                        ->ExecuteCommand(result, cmd, params);
        if (status == android::OK) {
            return result;
        }
        __android_log_print(ANDROID_LOG_INFO, kNoTag, "retry = %d", attempt);
        g_thpBinder = nullptr;
    }
    ResetDaemon();
    return kTimeoutText;
}

void ResetDaemon() {
    __android_log_print(ANDROID_LOG_WARN, kNoTag, "reboot");
    SetProperty(kServiceEnableKey, "0");
    SetProperty(kServiceEnableKey, "1");
}

void StoreScreenState(std::string params) {
    static const std::vector<std::string> kMarkers = {"version:3+whole", "version:3+main"};
    for (const std::string& marker : kMarkers) {
        if (params.find(marker) != std::string::npos) {
            SetProperty(kScreenStatusKey, params);
            return;
        }
    }
}
