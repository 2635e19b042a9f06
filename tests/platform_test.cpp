// Tests of the host implementation of the platform, on a temporary device root.
#include <binder/Binder.h>
#include <binder/Parcel.h>
#include <fcntl.h>
#include <gmock/gmock.h>
#include <sys/stat.h>
#include <sys/system_properties.h>
#include <unistd.h>

#include <atomic>
#include <filesystem>
#include <fstream>
#include <thread>

#include "platform/device_root.h"
#include "platform/files.h"
#include "platform/libbinder/vndbinder.h"

namespace {

using android::IBinder;
using android::Parcel;
using android::sp;

constexpr char kService[] = "dev/vndbinder/service";

// Shared by all tests of a process; every test uses its own names.
const struct TemporaryRoot {
    TemporaryRoot() { setenv("TPD_DEVICE_ROOT", mkdtemp(path.data()), 1); }
    ~TemporaryRoot() { std::filesystem::remove_all(path); }
    std::string path = testing::TempDir() + "tpd-XXXXXX";
} kRoot;

// For death tests: exits with 0 if DeviceRoot() refuses this root.
void ExpectRefusal(const std::string& root) {
    setenv("TPD_DEVICE_ROOT", root.c_str(), 1);
    _exit(host::DeviceRoot() == -1 ? 0 : 1);
}

TEST(DeviceRootDeathTest, RefusesUnsafePathsAndUnmarkedNonEmptyDirectories) {
    const std::string directory = kRoot.path + "/directory";
    const std::string link = kRoot.path + "/link";
    std::filesystem::create_directory(directory);
    chmod(directory.c_str(), 0750);
    std::filesystem::create_symlink(kRoot.path, link);
    const auto refused = testing::ExitedWithCode(0);
    EXPECT_EXIT(ExpectRefusal(directory), refused, "is open to other users; its mode must be 0700");
    EXPECT_EXIT(ExpectRefusal(link + "/"), refused, "link: Not a directory");
    EXPECT_EXIT(ExpectRefusal("relative"), refused, "absolute");
    chmod(directory.c_str(), 0700);
    std::ofstream(directory + "/letter") << "Dear";
    EXPECT_EXIT(ExpectRefusal(directory), refused, "files that do not belong to a device");
    std::ofstream(directory + "/.tpd-device");
    EXPECT_EXIT(ExpectRefusal(directory), testing::ExitedWithCode(1), "");
    if (geteuid() == 0 && chown(directory.c_str(), 1, 1) == 0) {
        EXPECT_EXIT(ExpectRefusal(directory), refused, "belongs to another user");
    }
}

TEST(DeviceRootPathTest, DefaultsToTheStateDirectory) {
    setenv("HOME", "/home/user", 1);
    setenv("XDG_STATE_HOME", "/state", 1);
    unsetenv("TPD_DEVICE_ROOT");
    EXPECT_EQ(host::DeviceRootPath(), "/state/tpd-device");
    unsetenv("XDG_STATE_HOME");
    EXPECT_EQ(host::DeviceRootPath(), "/home/user/.local/state/tpd-device");
}

TEST(FilesTest, RefusesSymbolicLinks) {
    const std::string outside = kRoot.path + "-outside";
    std::filesystem::create_directory(outside);
    std::ofstream(outside + "/file");
    host::MakeParents("links/");
    std::filesystem::create_symlink(outside, kRoot.path + "/links/directory");
    std::filesystem::create_symlink(outside + "/file", kRoot.path + "/links/file");
    EXPECT_FALSE(host::OpenFile("links/directory", O_RDONLY).ok());
    EXPECT_FALSE(host::OpenFile("links/file", O_WRONLY).ok());
    std::filesystem::remove_all(outside);
}

bool SetProperty(const std::string& name, const std::string& value) {
    return __system_property_set(name.c_str(), value.c_str()) == 0;
}

TEST(PropertiesTest, RejectsInvalidNames) {
    for (const char* name : {"", ".a", "a.", "a..b", "a/b", "a b", "a=b"}) {
        EXPECT_FALSE(SetProperty(name, "1")) << name;
    }
    EXPECT_TRUE(SetProperty("a.B_9@:-", "1"));
}

TEST(PropertiesTest, RejectsInvalidValues) {
    const std::string tooLong(92, 'v');
    for (const std::string value :
         {tooLong.c_str(), "\xff", "\xc3", "\xc0\xaf", "\xed\xa0\x80", "\xf4\x90\x80\x80"}) {
        EXPECT_FALSE(SetProperty("value", value)) << testing::PrintToString(value);
    }
    EXPECT_TRUE(SetProperty("value", tooLong.substr(1)));
    EXPECT_TRUE(SetProperty("value", "a\u00e9\u20ac\U0001f600"));
}

TEST(PropertiesTest, RejectsWritesToReadOnlyProperties) {
    EXPECT_TRUE(SetProperty("ro.once", "1"));
    EXPECT_FALSE(SetProperty("ro.once", "2"));
    EXPECT_TRUE(SetProperty("protected", "1"));
    chmod((kRoot.path + "/properties/protected").c_str(), 0400);
    EXPECT_FALSE(SetProperty("protected", "2"));
}

TEST(ParcelTest, RejectsAnotherInterfaceNameOfTheSameLength) {
    Parcel request;
    request.writeInterfaceToken(android::String16("interface.a"));
    EXPECT_FALSE(request.enforceInterface(android::String16("interface.b")));
    request.setDataPosition(0);
    EXPECT_TRUE(request.enforceInterface(android::String16("interface.a")));
}

// Expects one call at a time, and the numbers of each client in order. The code of a call is its
// client, 0 or 1.
class OneWayService : public android::BBinder {
  public:
    std::atomic<int32_t> finished[2] = {};

  private:
    android::status_t onTransact(uint32_t client, const Parcel& data, Parcel*, uint32_t) override {
        EXPECT_FALSE(mRunning.exchange(true));
        std::this_thread::sleep_for(std::chrono::microseconds(100));
        EXPECT_EQ(data.readInt32(), finished[client]);
        mRunning = false;
        ++finished[client];
        return android::OK;
    }

    std::atomic<bool> mRunning = false;
};

TEST(ServiceTest, ExecutesOneWayCallsInSequence) {
    const sp<OneWayService> service = new OneWayService;
    EXPECT_EQ(host::PublishService(kService, service), android::OK);
    const sp<IBinder> clients[] = {host::ConnectService(kService), host::ConnectService(kService)};
    for (int32_t number = 0; number < 50; ++number) {
        Parcel data;
        data.writeInt32(number);
        clients[0]->transact(0, data, nullptr, IBinder::FLAG_ONEWAY);
        clients[1]->transact(1, data, nullptr, IBinder::FLAG_ONEWAY);
    }
    while (service->finished[0] < 50 || service->finished[1] < 50) {
        std::this_thread::yield();
    }
}

}  // namespace
