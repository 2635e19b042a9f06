// The simulated touch daemon: publishes its service on the vendor binder, answers commands, and
// misbehaves on request. Its faults are properties, read for every call:
//
//   sim.boot_delay_ms  time it takes to come up
//   sim.updating_fw    "true": it updates its firmware and publishes nothing until that changes
//   sim.fault          the name of a fault; anything else is none
//   sim.fault_arg      the fault's argument
//   sim.fault_count    how many more calls have the fault; unset: all of them
#include <android/log.h>
#include <sys/system_properties.h>

#include <chrono>
#include <csignal>
#include <cstdlib>
#include <mutex>
#include <string>
#include <thread>

#include <binder/Binder.h>
#include <binder/IPCThreadState.h>
#include <binder/IServiceManager.h>
#include <binder/Parcel.h>
#include <binder/ProcessState.h>

#include "answers.h"
#include "common.h"
#include "faults.h"
#include "platform/trace.h"

namespace {

using device::FaultKind;
using device::GetProperty;
using device::GetPropertyNumber;
using std::chrono::milliseconds;

constexpr char kDriver[] = "/dev/vndbinder";
constexpr char kServiceName[] = "service.corvaneinterfaceservice";
constexpr uint32_t kExecuteCommandCode = 0;
constexpr milliseconds kFirmwarePollPause(20);
// Long enough for a reply to be on its way, far too short for anything else.
constexpr milliseconds kDieAfterReplyDelay(2);

const android::StaticString16 kDescriptor(
        u"android.CorvaneInterfaceServer.ICorvaneInterfaceService");

[[noreturn]] void Die() {
    raise(SIGKILL);
    abort();
}

void DieAfterReply() {
    std::thread([] {
        std::this_thread::sleep_for(kDieAfterReplyDelay);
        Die();
    }).detach();
}

// The fault that a call of this command has, counted down; null when it has none.
const device::Fault* TakeFault(const std::string& command) {
    static std::mutex counting;
    const std::lock_guard<std::mutex> lock(counting);
    const device::Fault* const fault = device::FindFault(GetProperty("sim.fault"));
    if (fault == nullptr || (fault->kind == FaultKind::kRestart && command != "captest")) {
        return nullptr;
    }
    const std::string count = GetProperty("sim.fault_count");
    if (!count.empty()) {
        const int64_t left = strtoll(count.c_str(), nullptr, 10);
        if (left <= 0) {
            return nullptr;
        }
        __system_property_set("sim.fault_count", std::to_string(left - 1).c_str());
    }
    host::TraceEvent("fault")
            .Add("name", fault->name)
            .Add("argument", GetProperty("sim.fault_arg"));
    return fault;
}

class DaemonService : public android::BBinder {
  protected:
    android::status_t onTransact(uint32_t code, const android::Parcel& data, android::Parcel* reply,
                                 uint32_t /* flags */) override {
        if (code != kExecuteCommandCode) {
            return android::UNKNOWN_TRANSACTION;
        }
        if (!data.enforceInterface(kDescriptor)) {
            return android::PERMISSION_DENIED;
        }
        const char* const command = data.readCString();
        const char* const params = data.readInt32() != 0 ? data.readCString() : "";
        if (command == nullptr || params == nullptr) {
            return android::BAD_VALUE;
        }
        host::LookForTrace();
        host::TraceEvent("command").Add("command", command).Add("params", params);
        const android::status_t status = Execute(command, params, reply);
        host::TraceEvent("answer")
                .Add("status", status)
                .Add("bytes", static_cast<int64_t>(reply->dataSize()));
        return status;
    }

  private:
    static android::status_t Execute(const std::string& command, const std::string& params,
                                     android::Parcel* reply) {
        const device::Fault* const fault = TakeFault(command);
        if (fault == nullptr) {
            return reply->writeCString(device::Answer(command, params).c_str());
        }
        const int64_t argument = GetPropertyNumber("sim.fault_arg");
        if (fault->kind == FaultKind::kDieBefore) {
            Die();
        }
        std::string text = device::Answer(command, params);
        switch (fault->kind) {
            case FaultKind::kDieBefore:
            case FaultKind::kDieDuring:
                Die();
            case FaultKind::kDieAfter:
            case FaultKind::kRestart:
                DieAfterReply();
                break;
            case FaultKind::kHang:
                std::this_thread::sleep_for(milliseconds(argument));
                break;
            case FaultKind::kStatus:
                return static_cast<android::status_t>(argument);
            case FaultKind::kNoText:
                return android::OK;
            case FaultKind::kHuge:
                text.assign(static_cast<size_t>(argument > 0 ? argument : 0), '#');
                break;
        }
        return reply->writeCString(text.c_str());
    }
};

// Stays until the update is over, with the firmware flag up.
void UpdateFirmware() {
    __system_property_set("odm.thp.is_updating_fw", "true");
    while (GetProperty("sim.updating_fw") == "true") {
        std::this_thread::sleep_for(kFirmwarePollPause);
    }
    __system_property_set("odm.thp.is_updating_fw", "false");
}

}  // namespace

int main() {
    std::this_thread::sleep_for(milliseconds(GetPropertyNumber("sim.boot_delay_ms")));
    if (GetProperty("sim.updating_fw") == "true") {
        UpdateFirmware();
    }
    android::ProcessState::initWithDriver(kDriver);
    const android::sp<android::IServiceManager> manager = android::defaultServiceManager();
    if (manager == nullptr ||
        manager->addService(android::String16(kServiceName), new DaemonService) != android::OK) {
        __android_log_print(ANDROID_LOG_ERROR, nullptr, "cannot publish %s", kServiceName);
        return 1;
    }
    host::TraceEvent("publish").Add("service", kServiceName);
    __system_property_set(device::kDaemonAliveKey, "true");
    __system_property_set(device::kDaemonBinderKey, "1");
    android::IPCThreadState::self()->joinThreadPool();
}
