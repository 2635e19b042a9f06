// The host implementation of the platform, on this process's own device root.
#include <android/log.h>
#include <binder/IServiceManager.h>
#include <binder/Parcel.h>
#include <binder/ProcessState.h>
#include <fcntl.h>
#include <gmock/gmock.h>
#include <sys/file.h>
#include <sys/socket.h>
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
#include "platform/log_file.h"
#include "platform/trace.h"
#include "platform/unique_fd.h"

namespace {

using android::IBinder;
using android::Parcel;
using android::sp;
using android::wp;

constexpr char kDriver[] = "/dev/vndbinder";

// Shared by all tests of a process; every test uses its own names.
const struct TemporaryRoot {
    TemporaryRoot() { setenv("TPD_DEVICE_ROOT", mkdtemp(path.data()), 1); }
    ~TemporaryRoot() { std::filesystem::remove_all(path); }
    std::string path = testing::TempDir() + "tpd-XXXXXX";
} kRoot;

// Exits with 0 when this root is refused; for a death test's child process.
void ExpectRefusal(const std::string& root) {
    setenv("TPD_DEVICE_ROOT", root.c_str(), 1);
    _exit(host::DeviceRoot() == -1 ? 0 : 1);
}

TEST(DeviceRootDeathTest, RefusesDirectoriesThatAreNotPrivate) {
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

TEST(DeviceRootDeathTest, RefusesUnmarkedDirectoriesWithFiles) {
    const std::string root = kRoot.path + "/other";
    std::filesystem::create_directory(root);
    chmod(root.c_str(), 0700);
    std::ofstream(root + "/letter") << "Dear";
    const auto refused = testing::ExitedWithCode(0);
    EXPECT_EXIT(ExpectRefusal(root), refused, "contains files that do not belong to a device");
    std::ofstream(root + "/.tpd-device");
    EXPECT_EXIT(ExpectRefusal(root), testing::ExitedWithCode(1), "");
}

TEST(DeviceRootPathTest, ComesFromTheEnvironment) {
    setenv("HOME", "/home/user", 1);
    setenv("XDG_STATE_HOME", "/state", 1);
    EXPECT_EQ(host::DeviceRootPath(), kRoot.path);
    unsetenv("TPD_DEVICE_ROOT");
    EXPECT_EQ(host::DeviceRootPath(), "/state/tpd-device");
    unsetenv("XDG_STATE_HOME");
    EXPECT_EQ(host::DeviceRootPath(), "/home/user/.local/state/tpd-device");
    unsetenv("HOME");
    EXPECT_EQ(host::DeviceRootPath(), "");
    setenv("TPD_DEVICE_ROOT", kRoot.path.c_str(), 1);
}

TEST(FilesTest, RefusesLinksAtAnyDepth) {
    const std::string outside = kRoot.path + "-outside";
    std::filesystem::create_directory(outside);
    EXPECT_TRUE(host::OpenDirectory("links", host::IfMissing::kMake).ok());
    std::filesystem::create_directory_symlink(outside, kRoot.path + "/links/link");
    EXPECT_FALSE(host::ReplaceFile("links/link/file", "text"));
    EXPECT_FALSE(host::ReplaceFile("links/link/below/file", "text"));
    EXPECT_TRUE(std::filesystem::remove(outside));  // fails when it is not empty
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

TEST(PropertiesTest, AcceptsValuesUpTo91Bytes) {
    const std::string longest(91, 'v');
    EXPECT_TRUE(SetProperty("limited", longest));
    EXPECT_FALSE(SetProperty("limited", longest + "v"));
    char value[PROP_VALUE_MAX];
    EXPECT_EQ(__system_property_get("limited", value), 91);
    EXPECT_EQ(value, longest);
}

TEST(PropertiesTest, AcceptsOnlyUtf8) {
    for (const char* value : {"\xff", "\xc3", "\xc0\xaf", "\xed\xa0\x80", "\xf4\x90\x80\x80"}) {
        EXPECT_FALSE(SetProperty("text", value)) << testing::PrintToString(value);
    }
    EXPECT_TRUE(SetProperty("text", "a\u00e9\u20ac\U0001f600"));
}

TEST(PropertiesTest, RejectsWritesToReadOnlyProperties) {
    EXPECT_TRUE(SetProperty("ro.once", "1"));
    EXPECT_FALSE(SetProperty("ro.once", "2"));
    EXPECT_TRUE(SetProperty("protected", "1"));
    chmod((kRoot.path + "/properties/protected").c_str(), 0400);
    EXPECT_FALSE(SetProperty("protected", "2"));
}

// Reads the next record and returns its text without the header.
std::string ReadLogRecord(std::istream& log) {
    host::LogEntryHeader header = {};
    log.read(reinterpret_cast<char*>(&header), sizeof(header));
    EXPECT_EQ(header.pid, getpid());
    EXPECT_EQ(header.tid, getpid());
    EXPECT_NEAR(header.seconds, static_cast<double>(time(nullptr)), 60);
    std::string content(header.size, '\0');
    log.read(content.data(), header.size);
    return content;
}

TEST(LogTest, AppendsARecord) {
    const std::string zero(1, '\0');
    __android_log_print(ANDROID_LOG_ERROR, "tag", "%d\n", 7);
    __android_log_print(ANDROID_LOG_INFO, nullptr, "%s", std::string(2000, 'x').c_str());
    std::ifstream log(kRoot.path + "/log", std::ios::binary);
    EXPECT_EQ(ReadLogRecord(log), "\6tag" + zero + "7\n" + zero);
    EXPECT_EQ(ReadLogRecord(log), "\4platform_test" + zero + std::string(1023, 'x') + zero);
}

// Returns the call's code as the status. A call takes some time.
class TestService : public android::BBinder {
  public:
    std::atomic<int> running = 0;
    std::atomic<int> overlaps = 0;
    std::atomic<int> calls = 0;

  private:
    android::status_t onTransact(uint32_t code, const Parcel&, Parcel* reply, uint32_t) override {
        overlaps += ++running > 1 ? 1 : 0;
        std::this_thread::sleep_for(std::chrono::microseconds(100));
        --running;
        ++calls;
        reply->writeCString("answer");
        return static_cast<android::status_t>(code);
    }
};

TEST(TraceTest, EscapesTextAndKeepsErrno) {
    EXPECT_TRUE(host::ReplaceFile(host::kTraceFile, ""));
    const host::UniqueFd recorder = host::OpenFile(host::kTraceFile, O_RDONLY);
    ASSERT_EQ(flock(recorder.get(), LOCK_EX), 0);
    errno = E2BIG;
    host::TraceEvent("test").Add("text", "a\"\\\n\xff");
    EXPECT_EQ(errno, E2BIG);
    std::string line;
    std::getline(std::ifstream(kRoot.path + "/trace"), line);
    EXPECT_THAT(line, testing::HasSubstr(R"("text":"a\"\\\u000a\u00ff"})"));
}

TEST(ServiceManagerTest, WaitsFiveSecondsForAService) {
    android::ProcessState::initWithDriver(kDriver);
    const int64_t start = host::MonotonicUs();
    EXPECT_EQ(android::defaultServiceManager()->getService(android::String16("none")), nullptr);
    EXPECT_GE(host::MonotonicUs() - start, 4900000);
}

// The code of a call is the size of its reply in bytes.
class LongReplyService : public android::BBinder {
    android::status_t onTransact(uint32_t code, const Parcel&, Parcel* reply, uint32_t) override {
        reply->resize(code);
        return android::OK;
    }
};

struct TestRecipient : IBinder::DeathRecipient {
    void binderDied(const wp<IBinder>&) override { ++deaths; }
    int deaths = 0;
};

TEST(VndBinderTest, TreatsAPositiveStatusAsSuccessWithoutAReply) {
    Parcel request, reply;
    EXPECT_EQ(host::PublishService(kDriver, "status", new TestService), android::OK);
    const sp<IBinder> proxy = host::ConnectService(kDriver, "status");
    EXPECT_EQ(proxy->transact(1, request, &reply), android::OK);
    EXPECT_EQ(reply.dataSize(), 0U);
}

TEST(VndBinderTest, ReplacesOnlyTheSocketOfAnEarlierService) {
    EXPECT_EQ(host::PublishService(kDriver, "again", new TestService), android::OK);
    EXPECT_EQ(host::PublishService(kDriver, "again", new TestService), android::OK);
    std::ofstream(kRoot.path + kDriver + "/file") << "kept";
    EXPECT_EQ(host::PublishService(kDriver, "file", new TestService), -EADDRINUSE);
}

TEST(VndBinderTest, RefusesLinks) {
    EXPECT_EQ(host::PublishService(kDriver, "target", new TestService), android::OK);
    std::filesystem::create_symlink("target", kRoot.path + kDriver + "/link");
    std::filesystem::create_symlink("vndbinder", kRoot.path + "/dev/linked");
    EXPECT_NE(host::ConnectService(kDriver, "target"), nullptr);
    EXPECT_EQ(host::ConnectService(kDriver, "link"), nullptr);
    EXPECT_EQ(host::ConnectService("/dev/linked", "target"), nullptr);
}

TEST(VndBinderTest, LimitsTheSizeOfRequests) {
    EXPECT_EQ(host::PublishService(kDriver, "limits", new TestService), android::OK);
    const sp<IBinder> proxy = host::ConnectService(kDriver, "limits");
    Parcel request;
    request.resize(1040384);
    EXPECT_EQ(proxy->transact(0, request, nullptr), android::OK);
    request.resize(1040388);
    EXPECT_EQ(proxy->transact(0, request, nullptr), android::FAILED_TRANSACTION);
    request.resize(520192);
    EXPECT_EQ(proxy->transact(0, request, nullptr, IBinder::FLAG_ONEWAY), android::OK);
    request.resize(520196);
    EXPECT_EQ(proxy->transact(0, request, nullptr, IBinder::FLAG_ONEWAY),
              android::FAILED_TRANSACTION);
}

TEST(VndBinderTest, LimitsTheSizeOfReplies) {
    EXPECT_EQ(host::PublishService(kDriver, "replies", new LongReplyService), android::OK);
    const sp<IBinder> proxy = host::ConnectService(kDriver, "replies");
    Parcel request, reply;
    EXPECT_EQ(proxy->transact(1040384, request, &reply), android::OK);
    EXPECT_EQ(reply.dataSize(), 1040384U);
    EXPECT_EQ(proxy->transact(1040388, request, &reply), android::FAILED_TRANSACTION);
    EXPECT_EQ(reply.dataSize(), 0U);
}

TEST(VndBinderTest, NotifiesLinkedRecipientsOfTheOwnersDeath) {
    int ends[2];
    ASSERT_EQ(socketpair(AF_UNIX, SOCK_STREAM, 0, ends), 0);
    const sp<IBinder> proxy = host::NewProxy(host::UniqueFd(ends[0]));
    const sp<TestRecipient> linked = new TestRecipient;
    const sp<TestRecipient> unlinked = new TestRecipient;
    EXPECT_EQ(proxy->linkToDeath(linked), android::OK);
    EXPECT_EQ(proxy->linkToDeath(unlinked), android::OK);
    EXPECT_EQ(proxy->unlinkToDeath(unlinked), android::OK);

    close(ends[1]);
    Parcel request, reply;
    EXPECT_EQ(proxy->transact(0, request, &reply), android::DEAD_OBJECT);
    EXPECT_EQ(proxy->transact(0, request, &reply), android::DEAD_OBJECT);

    EXPECT_EQ(linked->deaths, 1);
    EXPECT_EQ(unlinked->deaths, 0);
    EXPECT_EQ(proxy->linkToDeath(unlinked), android::DEAD_OBJECT);
}

TEST(VndBinderTest, RejectsAnInterfaceNameOfTheSameLength) {
    Parcel request;
    request.writeInterfaceToken(android::String16("interface.a"));
    EXPECT_FALSE(request.enforceInterface(android::String16("interface.b")));
    request.setDataPosition(0);
    EXPECT_TRUE(request.enforceInterface(android::String16("interface.a")));
}

TEST(VndBinderTest, ExecutesOneWayCallsOfAllClientsInSequence) {
    const sp<TestService> service = new TestService;
    EXPECT_EQ(host::PublishService(kDriver, "queue", service), android::OK);
    const sp<IBinder> first = host::ConnectService(kDriver, "queue");
    const sp<IBinder> second = host::ConnectService(kDriver, "queue");
    Parcel request;
    for (int i = 0; i < 50; ++i) {
        EXPECT_EQ(first->transact(0, request, nullptr, IBinder::FLAG_ONEWAY), android::OK);
        EXPECT_EQ(second->transact(0, request, nullptr, IBinder::FLAG_ONEWAY), android::OK);
    }
    while (service->calls < 100) {
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
    }
    EXPECT_EQ(service->overlaps, 0);
}

}  // namespace
