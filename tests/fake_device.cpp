#include "tests/fake_device.h"

#include <android/log.h>
#include <binder/IServiceManager.h>
#include <binder/Parcel.h>
#include <sys/system_properties.h>
#include <unistd.h>

#include <cstdarg>
#include <cstring>

#include "daemon/TpdCmd.h"
#include "main/TpdMain.h"
#include "platform/device_root.h"

using namespace android;

namespace test {

static Device* gDevice;

template <typename T>
static T Next(std::deque<T>& queue, T standard) {
    if (!queue.empty()) {
        standard = queue.front();
        queue.pop_front();
    }
    return standard;
}

// The daemon's service, named by the number of the lookup that found it.
class Service : public IBinder {
  public:
    explicit Service(int number) : mName(std::to_string(number)) {}
    status_t transact(uint32_t code, const Parcel& data, Parcel* reply, uint32_t flags) override {
        gDevice->request.assign(reinterpret_cast<const char*>(data.data()), data.dataSize());
        data.setDataPosition(0);
        const bool known = data.enforceInterface(ICorvaneInterfaceClient::descriptor) && code == 0;
        std::string text = known ? mName : "of another's";
        text += flags == 0 ? " two-way" : flags == FLAG_ONEWAY ? " one-way" : " odd";
        text += std::string(" [") + data.readCString() + "]";
        if (data.readInt32() == 1) {
            text += std::string(" [") + data.readCString() + "]";
        }
        gDevice->Note("call", text + (data.dataPosition() == data.dataSize() ? "" : " and more"));
        const Answer answer = Next(gDevice->answers, {});
        if (answer.meanwhile) {
            answer.meanwhile();
        }
        reply->writeCString(answer.text);
        reply->setDataPosition(0);
        return answer.status;
    }
    status_t linkToDeath(const sp<DeathRecipient>& recipient, void* cookie,
                         uint32_t flags) override {
        gDevice->Note("tie", mName + (cookie == nullptr && flags == 0 ? "" : " oddly"));
        return gDevice->tied.push_back(recipient), -38;
    }
    status_t unlinkToDeath(const wp<DeathRecipient>& recipient, void* cookie, uint32_t flags,
                           wp<DeathRecipient>* out) override {
        const bool plain = cookie == nullptr && flags + (out != nullptr) == 0;
        gDevice->Note("untie", mName + (plain && gDevice->tied[0] == recipient ? "" : " oddly"));
        return OK;
    }

  private:
    const std::string mName;
};

class ServiceManager : public IServiceManager {
    sp<IBinder> getService(const String16& name) const override {
        gDevice->Note("find", std::string(name.string(), name.string() + name.size()));
        return Next(gDevice->lookups, true) ? new Service(++gDevice->found) : nullptr;
    }
    sp<IBinder> checkService(const String16& /* name */) const override { return nullptr; }
    status_t addService(const String16&, const sp<IBinder>&, bool, int) override { return -1; }
    IBinder* onAsBinder() override { return nullptr; }
};

Device::Device() {
    gDevice = this;
    StartsAfresh();
    setDefaultServiceManager(new ServiceManager);
}

void Device::StartsAfresh() {
    mSteps.clear();
    aliveConfirmed = false;
    failedWaitCount = found = 0;
    g_thpBinder = nullptr;
    g_deathRecipient = nullptr;
    delete g_tpdCmd;
    g_tpdCmd = nullptr;
    gTpdCmds.clear();
}

void Device::DaemonIs(const std::string& alive, const std::string& binder,
                      const std::string& updating, const std::string& reboots) {
    holds[kAlive] = alive;
    holds["odm.thp.binder"] = binder;
    holds["odm.thp.is_updating_fw"] = updating;
    holds["odm.thp.dae_reboot_times"] = reboots;
}

std::string Device::Trail(const std::string& kinds) const {
    std::string trail;
    for (const auto& [kind, text] : mSteps) {
        if ((" " + kinds + " ").find(" " + kind + " ") != std::string::npos) {
            trail += (trail.empty() ? "" : "; ") + (kind == kinds ? text : kind + " " + text);
        }
    }
    return trail;
}

std::string Device::Shape(const std::string& kinds) const {
    std::string shape;
    for (const auto& step : mSteps) {
        shape.append(step.first, 0, (" " + kinds).find(" " + step.first) != std::string::npos);
    }
    return shape;
}

}  // namespace test

using test::gDevice;

int host::DeviceRoot() { return -1; }  // no test reaches a device on disk

int __system_property_get(const char* name, char* value) {
    gDevice->Note("read", name);
    const auto soon = gDevice->appears.find(name);
    if (soon != gDevice->appears.end() && --soon->second.first == 0) {
        gDevice->holds[name] = soon->second.second;
    }
    return snprintf(value, PROP_VALUE_MAX, "%s", gDevice->holds[name].c_str());
}

int __system_property_set(const char* name, const char* value) {
    gDevice->Note("write", std::string(name) + "=" + value);
    const bool taken = gDevice->refuses.count(name) == 0 && strlen(value) < PROP_VALUE_MAX;
    gDevice->holds[name] = taken ? value : gDevice->holds[name];
    return taken ? 0 : -1;
}

int __android_log_print(int priority, const char* tag, const char* format, ...) {
    char text[4096];
    va_list args;
    va_start(args, format);
    vsnprintf(text, sizeof(text), format, args);
    va_end(args);
    const std::string letter(1, "??VDIWEFS"[priority]);
    gDevice->Note("log", letter + " " + (tag != nullptr ? tag : "(null)") + ": " + text);
    return 1;
}

void* operator new(size_t size, const std::nothrow_t& /* tag */) noexcept {
    int none = 0;
    int& left = gDevice != nullptr ? gDevice->failingAllocation : none;
    return left > 0 && --left == 0 ? nullptr : operator new(size);
}

extern "C" {

FILE* __real_fopen(const char* path, const char* mode);

static FILE* OpenText(std::optional<std::string>& text) {
    return text ? fmemopen(text->data(), text->size(), "r") : nullptr;
}

FILE* __wrap_fopen(const char* path, const char* mode) {
    return strcmp(path, "/proc/cmdline") == 0 ? OpenText(gDevice->bootLine)
                                              : __real_fopen(path, mode);
}

FILE* __wrap_popen(const char* command, const char* mode) {
    gDevice->Note("shell", std::string(command) + " >" + mode);
    return OpenText(gDevice->getenforce);
}

int __wrap_pclose(FILE* stream) {
    return gDevice->Note("end", ""), fclose(stream) + gDevice->closeStatus;
}

int __wrap_system(const char* command) { return gDevice->Note("shell", command), 1; }

int __wrap_usleep(useconds_t pause) { return gDevice->Note("pause", std::to_string(pause)), 0; }
}
