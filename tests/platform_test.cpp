// Tests of the host implementation of the platform, on a temporary device root.
#include <binder/Binder.h>
#include <binder/Parcel.h>
#include <fcntl.h>
#include <gmock/gmock.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/system_properties.h>
#include <unistd.h>

#include <atomic>
#include <filesystem>
#include <fstream>
#include <thread>
#include <vector>

#include "platform/device_root.h"
#include "platform/files.h"
#include "platform/libbinder/vndbinder.h"
#include "platform/unique_fd.h"

namespace {

using android::IBinder;
using android::Parcel;
using android::sp;
using android::wp;

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

TEST(DeviceRootDeathTest, RefusesUnsafePaths) {
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
    if (geteuid() == 0 && chown(directory.c_str(), 1, 1) == 0) {
        EXPECT_EXIT(ExpectRefusal(directory), refused, "belongs to another user");
    }
}

TEST(DeviceRootDeathTest, RefusesUnmarkedNonEmptyDirectories) {
    const std::string root = kRoot.path + "/other";
    std::filesystem::create_directory(root);
    chmod(root.c_str(), 0700);
    std::ofstream(root + "/letter") << "Dear";
    const auto refused = testing::ExitedWithCode(0);
    EXPECT_EXIT(ExpectRefusal(root), refused, "contains files that do not belong to a device");
    std::ofstream(root + "/.tpd-device");
    EXPECT_EXIT(ExpectRefusal(root), testing::ExitedWithCode(1), "");
}

TEST(DeviceRootPathTest, DefaultsToTheStateDirectory) {
    setenv("HOME", "/home/user", 1);
    setenv("XDG_STATE_HOME", "/state", 1);
    unsetenv("TPD_DEVICE_ROOT");
    EXPECT_EQ(host::DeviceRootPath(), "/state/tpd-device");
    unsetenv("XDG_STATE_HOME");
    EXPECT_EQ(host::DeviceRootPath(), "/home/user/.local/state/tpd-device");
    setenv("TPD_DEVICE_ROOT", kRoot.path.c_str(), 1);
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

// Records the number in each call. The code of a call is its client, 0 or 1.
class OneWayService : public android::BBinder {
  public:
    std::vector<int32_t> numbers[2];
    std::atomic<size_t> finished = 0;
    std::atomic<bool> overlapped = false;

  private:
    android::status_t onTransact(uint32_t client, const Parcel& data, Parcel*, uint32_t) override {
        if (mRunning.exchange(true)) {
            overlapped = true;
        }
        std::this_thread::sleep_for(std::chrono::microseconds(100));
        numbers[client].push_back(data.readInt32());
        mRunning = false;
        ++finished;
        return android::OK;
    }

    std::atomic<bool> mRunning = false;
};

TEST(ServiceTest, ExecutesOneWayCallsInSequence) {
    const sp<OneWayService> service = new OneWayService;
    EXPECT_EQ(host::PublishService(kService, service), android::OK);
    const sp<IBinder> clients[] = {host::ConnectService(kService),
                                   host::ConnectService(kService)};
    std::vector<int32_t> sent;
    for (int32_t number = 0; number < 50; ++number) {
        Parcel data;
        data.writeInt32(number);
        clients[0]->transact(0, data, nullptr, IBinder::FLAG_ONEWAY);
        clients[1]->transact(1, data, nullptr, IBinder::FLAG_ONEWAY);
        sent.push_back(number);
    }
    while (service->finished < 2 * sent.size()) {
        std::this_thread::yield();
    }
    EXPECT_FALSE(service->overlapped);
    EXPECT_EQ(service->numbers[0], sent);
    EXPECT_EQ(service->numbers[1], sent);
}

// A proxy and the service's end of its connection.
class ProxyTest : public testing::Test {
  protected:
    ProxyTest() {
        int ends[2];
        EXPECT_EQ(socketpair(AF_UNIX, SOCK_STREAM, 0, ends), 0);
        owner.reset(ends[0]);
        proxy = host::NewProxy(host::UniqueFd(ends[1]));
    }

    host::UniqueFd owner;
    sp<IBinder> proxy;
    Parcel request, reply;
};

TEST_F(ProxyTest, RefusesAReplyLargerThanTheReceiveBuffer) {
    const uint32_t header[] = {android::OK, 0, 1040385};
    EXPECT_EQ(write(owner.get(), header, sizeof(header)), ssize_t{sizeof(header)});
    EXPECT_EQ(proxy->transact(0, request, &reply), android::DEAD_OBJECT);
}

struct TestRecipient : IBinder::DeathRecipient {
    void binderDied(const wp<IBinder>&) override { ++deaths; }
    int deaths = 0;
};

TEST_F(ProxyTest, NotifiesLinkedRecipientsOnce) {
    const sp<TestRecipient> linked = new TestRecipient;
    const sp<TestRecipient> unlinked = new TestRecipient;
    proxy->linkToDeath(linked);
    proxy->linkToDeath(unlinked);
    EXPECT_EQ(proxy->unlinkToDeath(unlinked), android::OK);
    owner.reset();
    EXPECT_EQ(proxy->transact(0, request, &reply), android::DEAD_OBJECT);
    EXPECT_EQ(proxy->transact(0, request, &reply), android::DEAD_OBJECT);
    EXPECT_EQ(linked->deaths, 1);
    EXPECT_EQ(unlinked->deaths, 0);
}

}  // namespace
