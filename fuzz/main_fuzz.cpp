// The front end with any words, against a scripted daemon: the input's first byte is what the
// daemon does, then come the words, each ended by a zero byte. Shell commands and pauses are left
// out.
#include <binder/IServiceManager.h>
#include <binder/Parcel.h>
#include <sys/system_properties.h>

#include <cstdio>
#include <vector>

#include "daemon/TpdClient.h"
#include "fuzz.h"

extern int tpd_main(int argc, char** argv);
extern "C" int __wrap_usleep(unsigned /* us */) { return 0; }
extern "C" int __wrap_system(const char* /* command */) { return 0; }
extern "C" FILE* __wrap_popen(const char* /* command */, const char* /* mode */) { return nullptr; }

namespace {

uint8_t gScript;

class Daemon : public android::BBinder {
  protected:
    android::status_t onTransact(uint32_t /* code */, const android::Parcel& data,
                                 android::Parcel* reply, uint32_t /* flags */) override {
        if (gScript % 4 == 0) {
            return android::DEAD_OBJECT;
        }
        Check(data.enforceInterface(
                android::String16("android.CorvaneInterfaceServer.ICorvaneInterfaceService")));
        const char* const command = data.readCString();
        Check(command != nullptr && (data.readInt32() == 0 || data.readCString() != nullptr));
        return gScript % 4 == 1 ? android::OK : reply->writeCString(command);
    }
};

class Manager : public android::IServiceManager {
  public:
    android::sp<android::IBinder> getService(const android::String16& /* name */) const override {
        return gScript % 8 == 7 ? nullptr : android::sp<android::IBinder>(new Daemon);
    }
    android::sp<android::IBinder> checkService(const android::String16& name) const override {
        return getService(name);
    }
    android::status_t addService(const android::String16& /* name */,
                                 const android::sp<android::IBinder>& /* service */,
                                 bool /* allowIsolated */, int /* dumpsysFlags */) override {
        return android::INVALID_OPERATION;
    }

  protected:
    android::IBinder* onAsBinder() override { return nullptr; }
};

}  // namespace

int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    static const bool ready = [] {
        UseDeviceRoot();
        android::setDefaultServiceManager(new Manager);
        return __system_property_set("odm.thp.debug.selinux.permissive", "1") == 0 &&
               freopen("/dev/null", "w", stdout) != nullptr;
    }();
    Check(ready);
    if (size < 1) {
        return 0;
    }
    gScript = data[0];
    aliveConfirmed = gScript % 2 != 0;
    std::vector<std::string> words(1, "tpd");
    for (size_t at = 1; at < size && words.size() < 6;) {
        words.emplace_back(std::string(data + at, data + size).c_str());
        at += words.back().size() + 1;
    }
    std::vector<char*> argv;
    for (std::string& word : words) {
        argv.push_back(word.data());
    }
    argv.push_back(nullptr);
    Check(tpd_main(static_cast<int>(words.size()), argv.data()) == 0);
    return 0;
}
