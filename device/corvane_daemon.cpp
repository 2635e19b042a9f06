// The simulated touch daemon: publishes its service on the vendor binder and answers commands.
// Properties make it fail; see properties.h and faults.h.
#include <android/log.h>
#include <sys/system_properties.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <optional>
#include <string>
#include <thread>

#include <binder/Binder.h>
#include <binder/IPCThreadState.h>
#include <binder/IServiceManager.h>
#include <binder/Parcel.h>
#include <binder/ProcessState.h>

#include "answers.h"
#include "faults.h"
#include "platform/events.h"
#include "platform/libbinder/vndbinder.h"
#include "properties.h"

namespace {

using device::FaultKind;
using device::GetProperty;
using std::chrono::milliseconds;

// The daemon's side of the interface. It shares no code with the tool, as on a phone.
constexpr char kServiceName[] = "service.corvaneinterfaceservice";
constexpr uint32_t kExecuteCommandCode = 0;
// The phone's commands. The spaces around each name let strstr() find whole names only.
constexpr char kCommands[] = " " TPD_DAEMON_COMMANDS " ";

const android::StaticString16 kDescriptor(
        u"android.CorvaneInterfaceServer.ICorvaneInterfaceService");

std::string Help() {
    std::string commands = TPD_DAEMON_COMMANDS;
    std::replace(commands.begin(), commands.end(), ' ', '\n');
    return "corvane_daemon commands:\n" + commands;
}

std::string Answer(const std::string& command, const std::string& params) {
    if (const std::optional<std::string> recorded = device::FindAnswer(command, params)) {
        return *recorded;
    }
    if (command == "help") {
        return Help();
    }
    if (command == "captest") {
        return "captest " + (params.empty() ? "idle_test" : params) + ": PASS";
    }
    if (command == "TSA_ExecuteCommand") {
        // The parameters are another command: its name, a space and its parameters.
        const std::string name = params.substr(0, params.find(' '));
        const std::string rest = params.substr(std::min(name.length() + 1, params.length()));
        return name.empty() || name == command ? command + ": missing or invalid command"
                                               : Answer(name, rest);
    }
    const bool isName = !command.empty() && command.find(' ') == std::string::npos;
    if (isName && strstr(kCommands, (" " + command + " ").c_str()) != nullptr) {
        return command + ": done" + (params.empty() ? "" : " (" + params + ")");
    }
    return "unknown command: " + command;
}

[[noreturn]] void Die() {
    raise(SIGKILL);
    abort();
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
        host::UpdateTracing();
        host::Event("command").Add("command", command).Add("params", params);
        const android::status_t status = Execute(command, params, reply);
        host::Event("answer")
                .Add("status", status)
                .Add("bytes", static_cast<int64_t>(reply->dataSize()));
        return status;
    }

  private:
    static android::status_t Execute(const std::string& command, const std::string& params,
                                     android::Parcel* reply) {
        const device::Fault fault = device::TakeFault();
        if (fault.kind == FaultKind::kDieBefore) {
            Die();
        }
        std::string text = Answer(command, params);
        switch (fault.kind) {
            case FaultKind::kNone:
            case FaultKind::kDieBefore:
                break;
            case FaultKind::kDieDuring:
                Die();
            case FaultKind::kDieAfter:
                host::AfterReply(Die);
                break;
            case FaultKind::kHang:
                std::this_thread::sleep_for(milliseconds(fault.argument));
                break;
            case FaultKind::kStatus:
                return static_cast<android::status_t>(fault.argument);
            case FaultKind::kNoText:
                return android::OK;
            case FaultKind::kHuge:
                text.assign(static_cast<size_t>(fault.argument), '#');
                break;
        }
        return reply->writeCString(text.c_str());
    }
};

}  // namespace

int main() {
    std::this_thread::sleep_for(milliseconds(device::GetPropertyNumber(device::kBootDelayKey)));
    while (GetProperty(device::kUpdatingFirmwareKey) == "true") {
        __system_property_set(device::kIsUpdatingFirmwareKey, "true");
        pause();
    }
    android::ProcessState::initWithDriver("/dev/vndbinder");
    const android::sp<android::IServiceManager> manager = android::defaultServiceManager();
    if (manager == nullptr ||
        manager->addService(android::String16(kServiceName), new DaemonService) != android::OK) {
        __android_log_print(ANDROID_LOG_ERROR, nullptr, "cannot publish %s", kServiceName);
        return 1;
    }
    host::Event("publish").Add("service", kServiceName);
    __system_property_set(device::kDaemonAliveKey, "true");
    __system_property_set(device::kDaemonBinderKey, "1");
    android::IPCThreadState::self()->joinThreadPool();
}
