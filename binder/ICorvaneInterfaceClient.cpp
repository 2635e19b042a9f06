#include "binder/ICorvaneInterfaceClient.h"

#include <android/log.h>
#include <binder/Parcel.h>

#include <algorithm>

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

namespace {

constexpr uint32_t kExecuteCommandCode = 0;

// The log shows the program's name for a null tag.
constexpr const char* kNoTag = nullptr;

const android::StaticString16 kDescriptor(
        u"android.CorvaneInterfaceServer.ICorvaneInterfaceService");

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
