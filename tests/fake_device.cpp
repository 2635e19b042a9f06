#include "tests/fake_device.h"

#include <binder/IServiceManager.h>
#include <binder/Parcel.h>
#include <sys/system_properties.h>
#include <unistd.h>

#include <algorithm>
#include <cstdarg>
#include <cstring>
#include <new>

#include "binder/ICorvaneInterfaceClient.h"
#include "binder/corvane_sys_binder_client.h"
#include "daemon/TpdCmd.h"
#include "main/TpdMain.h"
#include "platform/device_root.h"

using namespace android;

namespace test {

namespace {

FakeDevice* gDevice;
const bool kAliveConfirmedAtStart = aliveConfirmed;
const int kFailedWaitCountAtStart = failedWaitCount;

template <typename T>
T TakeFirst(std::deque<T>& queue, T whenEmpty) {
    if (queue.empty()) {
        return whenEmpty;
    }
    T first = std::move(queue.front());
    queue.pop_front();
    return first;
}

class FakeService : public IBinder {
  public:
    explicit FakeService(int number) : mNumber(number) {}

    status_t transact(uint32_t code, const Parcel& data, Parcel* reply, uint32_t flags) override {
        data.setDataPosition(0);
        const bool known = data.enforceInterface(ICorvaneInterfaceClient::descriptor) && code == 0;
        std::string request = known ? data.readCString() : "not of this interface";
        if (data.readInt32() != 0) {
            request += std::string(", ") + data.readCString();
        }
        request += data.readCString() == nullptr ? "" : ", and more";
        gDevice->Record({flags == FLAG_ONEWAY ? kTransactOneWay : kTransact, request});
        const Answer answer = TakeFirst(gDevice->answers, {});
        const sp<DeathRecipient> recipient = mRecipient.promote();
        if (answer.status == DEAD_OBJECT && recipient != nullptr) {
            recipient->binderDied(this);
        }
        reply->writeCString(answer.text);
        reply->setDataPosition(0);
        return answer.status;
    }

    status_t linkToDeath(const sp<DeathRecipient>& recipient, void* cookie,
                         uint32_t flags) override {
        gDevice->Record(LinkToDeath(cookie == nullptr && flags == 0 ? mNumber : -1));
        mRecipient = recipient;
        return OK;
    }

    status_t unlinkToDeath(const wp<DeathRecipient>& recipient, void* cookie, uint32_t flags,
                           wp<DeathRecipient>* /* out */) override {
        const bool linked = recipient == mRecipient && cookie == nullptr && flags == 0;
        gDevice->Record(UnlinkToDeath(linked ? mNumber : -1));
        return OK;
    }

  private:
    const int mNumber;
    wp<DeathRecipient> mRecipient;
};

class FakeServiceManager : public IServiceManager {
    sp<IBinder> getService(const String16& name) const override {
        gDevice->Record({kGetService, std::string(name.string(), name.string() + name.size())});
        const bool found = TakeFirst(gDevice->lookups, true);
        return found ? new FakeService(++gDevice->servicesFound) : nullptr;
    }
    status_t addService(const String16&, const sp<IBinder>&) override { return INVALID_OPERATION; }
};

}  // namespace

FakeDevice::FakeDevice() {
    gDevice = this;
    aliveConfirmed = kAliveConfirmedAtStart;
    failedWaitCount = kFailedWaitCountAtStart;
    g_thpBinder = nullptr;
    g_deathRecipient = nullptr;
    delete g_tpdCmd;
    g_tpdCmd = nullptr;
    gTpdCmds.clear();
    setDefaultServiceManager(new FakeServiceManager);
}

FakeDevice::~FakeDevice() { gDevice = nullptr; }

std::vector<Call> FakeDevice::calls(const std::set<std::string>& functions) const {
    std::vector<Call> selected;
    std::copy_if(mCalls.begin(), mCalls.end(), std::back_inserter(selected), [&](const Call& call) {
        return functions.empty() || functions.count(call.first) != 0;
    });
    return selected;
}

void FakeDevice::Record(const Call& call) {
    mCalls.push_back(call);
    const auto change = changes.find(call);
    if (change != changes.end()) {
        properties[change->second.first] = change->second.second;
    }
}

}  // namespace test

using test::gDevice;

static FILE* OpenString(std::optional<std::string>& content, const char* mode) {
    if (!content) {
        return nullptr;
    }
    FILE* const stream = fmemopen(content->data(), content->size(), mode);
    gDevice->openStreams.insert(stream);
    return stream;
}

// Unit tests must not use a device on disk.
int host::DeviceRoot() { return -1; }

int __system_property_get(const char* name, char* value) {
    gDevice->Record(test::Read(name));
    return snprintf(value, PROP_VALUE_MAX, "%s", gDevice->properties[name].c_str());
}

int __system_property_set(const char* name, const char* value) {
    gDevice->Record(test::Write(name, value));
    if (gDevice->rejectedWrites.count(name) != 0) {
        return -1;
    }
    gDevice->properties[name] = value;
    return 0;
}

int __android_log_print(int priority, const char* tag, const char* format, ...) {
    char text[4096];
    va_list args;
    va_start(args, format);
    const int length = vsnprintf(text, sizeof(text), format, args);
    va_end(args);
    gDevice->Record(test::Log(priority, text, tag));
    return length;
}

void* operator new(size_t size, const std::nothrow_t& /* tag */) noexcept {
    const bool fails = gDevice != nullptr && gDevice->failingAllocation > 0 &&
                       --gDevice->failingAllocation == 0;
    return fails ? nullptr : operator new(size);
}

// The linker redirects these C library calls here (--wrap).
extern "C" {

FILE* __real_fopen(const char* path, const char* mode);

FILE* __wrap_fopen(const char* path, const char* mode) {
    if (strcmp(path, "/proc/cmdline") != 0) {
        return __real_fopen(path, mode);
    }
    return OpenString(gDevice->kernelCommandLine, mode);
}

int __real_fclose(FILE* stream);

int __wrap_fclose(FILE* stream) {
    if (gDevice != nullptr) {
        gDevice->openStreams.erase(stream);
    }
    return __real_fclose(stream);
}

FILE* __wrap_popen(const char* command, const char* mode) {
    gDevice->Record(test::Shell(command));
    return strcmp(mode, "r") == 0 ? OpenString(gDevice->getenforce, mode) : nullptr;
}

int __wrap_pclose(FILE* stream) {
    fclose(stream);
    return gDevice->getenforceStatus;
}

int __wrap_system(const char* command) {
    gDevice->Record(test::Shell(command));
    return 0;
}

int __wrap_usleep(useconds_t time) {
    gDevice->Record(test::Pause(std::chrono::microseconds(time)));
    return 0;
}
}
