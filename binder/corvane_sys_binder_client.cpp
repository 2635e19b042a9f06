#include "binder/corvane_sys_binder_client.h"

#include <android/log.h>
#include <binder/IServiceManager.h>
#include <binder/Parcel.h>
#include <binder/ProcessState.h>
#include <sys/system_properties.h>
#include <unistd.h>

#include <algorithm>

#include "binder/ICorvaneInterfaceClient.h"

using android::IBinder;
using android::Parcel;
using android::sp;
using android::status_t;
using android::String16;
using android::wp;

const std::vector<std::string> g_asyncCmds = {"aftouch"};
const std::vector<std::string> g_asyncThpCmds = {
        "THP_ASA_EnableFreqShift",
        "THP_ASA_ForceSetToNewFreq",
        "THP_ASA_SetTpPenMatchCode",
        "THP_DisableBaselineUpdate",
        "THP_DisableFeature",
        "THP_DisableScenario",
        "THP_EnableBaselineUpdate",
        "THP_EnableFeature",
        "THP_EnableScenario",
        "THP_InformTypingStatus",
        "THP_InformUserAppCrash",
        "THP_Log_Commander",
        "THP_Log_GhostTouch",
        "THP_ResetBaseline",
        "THP_Ring_AddSideGesture",
        "THP_Ring_EnterBetaTask",
        "THP_Ring_EnterSpecialBeta",
        "THP_Ring_ExitBetaTask",
        "THP_Ring_ExitSpecialBeta",
        "THP_Ring_ExposeSideArea",
        "THP_Ring_MapSideArea",
        "THP_Ring_MapSideGestureToKeyCode",
        "THP_Ring_MapSideGestureToTPEvent",
        "THP_Ring_RemoveSideArea",
        "THP_Ring_ResetSideGesture",
        "THP_Ring_SetGestureTag",
        "THP_Ring_SetVolumeGUIInfo",
        "THP_SetAccData",
        "THP_SetEnvironmentTemperature",
        "THP_SetFoldState",
        "THP_SetPressureGesture",
        "THP_SetRunTimePrmt",
        "THP_SetSensorData",
        "THP_SetSensorGesture",
        "THP_SetSensorGestureWithTimeStamp",
        "THP_SetSupportedSensorGesture",
        "THP_SetTuneTimePrmt",
        "THP_SetVirtualKey",
        "THP_SetVolumeGUIInfo",
        "THP_SetXCoreArea",
        "THP_UpdateViewsLocation",
};

sp<IBinder> g_thpBinder;
sp<MyDeathRecipient> g_deathRecipient;

namespace {

constexpr char kDriver[] = "/dev/vndbinder";
constexpr char kServiceName[] = "service.corvaneinterfaceservice";
constexpr uint32_t kExecuteCommandCode = 0;
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

// The interface fixes all log lines below: without a tag, so that readers show the program's name;
// many at ERROR though nothing failed; and with a 1 behind "retry:", whichever write it is.
constexpr const char* kNoTag = nullptr;

const android::StaticString16 kDescriptor(
        u"android.CorvaneInterfaceServer.ICorvaneInterfaceService");

// Writes until the value reads back, a bounded number of times. Of a rejected write only its log
// lines remain.
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

// One lookup: the service's binder with the death recipient linked to it, or null.
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

const String16 ICorvaneInterfaceClient::descriptor(kDescriptor);

ICorvaneInterfaceClient::ICorvaneInterfaceClient() = default;

ICorvaneInterfaceClient::~ICorvaneInterfaceClient() = default;

sp<ICorvaneInterfaceClient> ICorvaneInterfaceClient::asInterface(const sp<IBinder>& binder) {
    if (binder == nullptr) {
        return nullptr;
    }
    const sp<android::IInterface> local = binder->queryLocalInterface(descriptor);
    if (local != nullptr) {
        return static_cast<ICorvaneInterfaceClient*>(local.get());
    }
    return new BpCorvaneInterfaceClient(binder);
}

const String16& ICorvaneInterfaceClient::getInterfaceDescriptor() const { return descriptor; }

BpCorvaneInterfaceClient::BpCorvaneInterfaceClient(const sp<IBinder>& remote)
    : BpInterface<ICorvaneInterfaceClient>(remote) {}

BpCorvaneInterfaceClient::~BpCorvaneInterfaceClient() = default;

status_t BpCorvaneInterfaceClient::ExecuteCommand(std::string& reply, std::string cmd,
                                                  std::string params) {
    Parcel request;
    Parcel answer;
    request.writeInterfaceToken(descriptor);
    const size_t marker = cmd.find(kTwoWayMarker);
    const bool marked = marker != std::string::npos;
    if (marked) {
        cmd.erase(0, marker + sizeof(kTwoWayMarker) - 1);
    }
    request.writeCString(cmd.c_str());
    request.writeInt32(params.empty() ? 0 : 1);
    if (!params.empty()) {
        request.writeCString(params.c_str());
    }

    if (!marked && (IsAsync(g_asyncCmds, cmd) || IsAsync(g_asyncThpCmds, params))) {
        __android_log_print(ANDROID_LOG_ERROR, kNoTag, "Async");
        const status_t status =
                remote()->transact(kExecuteCommandCode, request, &answer, IBinder::FLAG_ONEWAY);
        reply = "OK";
        return status;
    }

    const status_t status = remote()->transact(kExecuteCommandCode, request, &answer, 0);
    if (status != android::OK) {
        return status;
    }
    const char* text = answer.readCString();
    reply = text != nullptr ? text : "";
    return android::OK;
}

MyDeathRecipient::MyDeathRecipient(const sp<IBinder>& binder) : mBinder(binder) {}

MyDeathRecipient::~MyDeathRecipient() = default;

void MyDeathRecipient::binderDied(const wp<IBinder>& /* who */) {
    __android_log_print(ANDROID_LOG_INFO, kNoTag, "binder died");
    if (mBinder != nullptr) {
        mBinder->unlinkToDeath(wp<IBinder::DeathRecipient>(this), nullptr, 0, nullptr);
    }
}

bool IsAsync(const std::vector<std::string>& list, std::string text) {
    return std::any_of(list.begin(), list.end(), [&text](const std::string& entry) {
        return text.find(entry) != std::string::npos;
    });
}

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
    if (IsAsync(kMarkers, params)) {
        SetProperty(kScreenStatusKey, params);
    }
}
