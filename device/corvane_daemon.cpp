// The simulated touch daemon: publishes its service on the vendor binder, answers commands, and
// misbehaves on request. Its faults are properties, read afresh for every call:
//
//   sim.boot_delay_ms  time it takes to come up
//   sim.updating_fw    "true": it updates its firmware and publishes nothing until that changes
//   sim.fault          one of the faults below; anything else is none
//   sim.fault_arg      the fault's number
//   sim.fault_count    how many more calls have the fault; unset: all of them
#include <sys/prctl.h>
#include <sys/system_properties.h>
#include <unistd.h>

#include <csignal>
#include <cstdio>
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

namespace {

constexpr char kDriver[] = "/dev/vndbinder";
constexpr char kServiceName[] = "service.corvaneinterfaceservice";
constexpr uint32_t kExecuteCommandCode = 0;
constexpr useconds_t kFirmwarePollUs = 20000;
// Long enough for a reply to be on its way, far too short for anything else.
constexpr useconds_t kDieAfterReplyUs = 2000;

const android::StaticString16 kDescriptor(
        u"android.CorvaneInterfaceServer.ICorvaneInterfaceService");

std::string PropertyText(const char* key) {
    char value[PROP_VALUE_MAX];
    __system_property_get(key, value);
    return value;
}

long PropertyNumber(const char* key) { return strtol(PropertyText(key).c_str(), nullptr, 10); }

void Sleep(long ms) { usleep(static_cast<useconds_t>(ms > 0 ? ms : 0) * 1000); }

[[noreturn]] void Die() {
    raise(SIGKILL);
    abort();
}

void DieAfterReply() {
    std::thread([] {
        usleep(kDieAfterReplyUs);
        Die();
    }).detach();
}

// The fault that this call has, counted down.
std::string TakeFault() {
    static std::mutex counting;
    const std::lock_guard<std::mutex> lock(counting);
    std::string fault = PropertyText("sim.fault");
    if (fault.empty() || PropertyText("sim.fault_count").empty()) {
        return fault;
    }
    const long count = PropertyNumber("sim.fault_count");
    if (count <= 0) {
        return "";
    }
    __system_property_set("sim.fault_count", std::to_string(count - 1).c_str());
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
        return Execute(command, params, reply);
    }

  private:
    static android::status_t Execute(const std::string& command, const std::string& params,
                                     android::Parcel* reply) {
        const std::string fault = TakeFault();
        const long argument = PropertyNumber("sim.fault_arg");
        if (fault == "die_before") {
            Die();
        }
        std::string text = device::Answer(command, params);
        if (fault == "die_during") {
            Die();
        } else if (fault == "die_after" || (fault == "captest_restart" && command == "captest")) {
            DieAfterReply();
        } else if (fault == "hang") {
            Sleep(argument);
        } else if (fault == "status") {
            return static_cast<android::status_t>(argument);
        } else if (fault == "no_text") {
            return android::OK;
        } else if (fault == "huge") {
            text.assign(static_cast<size_t>(argument > 0 ? argument : 0), '#');
        }
        return reply->writeCString(text.c_str());
    }
};

// Stays until the update is over, with the firmware flag up.
void UpdateFirmware() {
    __system_property_set("odm.thp.is_updating_fw", "true");
    while (PropertyText("sim.updating_fw") == "true") {
        usleep(kFirmwarePollUs);
    }
    __system_property_set("odm.thp.is_updating_fw", "false");
}

}  // namespace

int main() {
    // Whatever becomes of init, its daemon goes with it.
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    Sleep(PropertyNumber("sim.boot_delay_ms"));
    if (PropertyText("sim.updating_fw") == "true") {
        UpdateFirmware();
    }
    android::ProcessState::initWithDriver(kDriver);
    const android::sp<android::IServiceManager> manager = android::defaultServiceManager();
    if (manager == nullptr ||
        manager->addService(android::String16(kServiceName), new DaemonService) != android::OK) {
        fprintf(stderr, "corvane_daemon: cannot publish %s\n", kServiceName);
        return 1;
    }
    __system_property_set("odm.thp.dae_alive", "true");
    __system_property_set("odm.thp.binder", "1");
    android::IPCThreadState::self()->joinThreadPool();
}
