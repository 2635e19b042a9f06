// The platform's stand-in itself, over a device root of this process's own.
#include <android/log.h>
#include <binder/Parcel.h>
#include <gtest/gtest.h>
#include <regex.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/system_properties.h>
#include <unistd.h>

#include <fstream>
#include <thread>

#include "platform/device_root.h"
#include "platform/vndbinder.h"

using android::Parcel;

// Tests take turns in this folder; each uses names of its own.
static const struct Root : std::string {
    Root() : std::string("/tmp/tpd-platform-XXXXXX") {
        setenv("TPD_DEVICE_ROOT", mkdtemp(data()), 1);
    }
    ~Root() { EXPECT_EQ(system(("rm -rf " + *this).c_str()), 0); }
} kRoot;

static std::string Get(const char* name) {
    char value[PROP_VALUE_MAX];
    const int length = __system_property_get(name, value);
    return std::string(value) + " " + std::to_string(length);
}

TEST(Properties, KeepTheirLimits) {
    const std::string longest(91, 'v'), tooLong(92, 'w');
    for (const char* name : {"", ".a", "a.", "a..b", "a/b", "a b", "a=b"}) {
        EXPECT_TRUE(__system_property_set(name, "1") == -1 && Get(name) == " 0") << name;
    }
    EXPECT_EQ(__system_property_set("a.B_9@:-", longest.c_str()), 0);
    EXPECT_EQ(__system_property_set("a.B_9@:-", tooLong.c_str()), -1);
    EXPECT_EQ(Get("a.B_9@:-"), longest + " 91");
    EXPECT_EQ(__system_property_set("ro.once", tooLong.c_str()), 0);
    EXPECT_EQ(__system_property_set("ro.once", "2"), -1);
    EXPECT_EQ(Get("ro.once"), std::string(91, 'w') + " 91");
    chmod((kRoot + "/properties/a.B_9@:-").c_str(), 0400);
    EXPECT_EQ(__system_property_set("a.B_9@:-", ""), -1);
    EXPECT_EQ(rmdir((kRoot + "/tmp").c_str()), 0);  // nothing half-written is left there
}

TEST(Log, PrintsALineForALine) {
    __android_log_print(ANDROID_LOG_ERROR, "tag", "one\n\n%d\n", 2);
    __android_log_print(ANDROID_LOG_INFO, nullptr, "%s", std::string(2000, 'x').c_str());
    std::ifstream log(kRoot + "/log");
    const std::string text((std::istreambuf_iterator<char>(log)), {});
    const std::string head =
            "[0-9-]{5} [0-9:]{8}\\.[0-9]{3} +" + std::to_string(getpid()) + " +[0-9]+ ";
    const std::string tag = head + "E tag: ";
    const std::string all =
            "^" + tag + "one\n" + tag + "\n" + tag + "2\n" + head + "I platform_test: x+\n$";
    regex_t form;
    ASSERT_EQ(regcomp(&form, all.c_str(), REG_EXTENDED), 0);
    EXPECT_EQ(regexec(&form, text.c_str(), 0, nullptr, 0), 0) << text;
    regfree(&form);
    EXPECT_EQ(std::count(text.begin(), text.end(), 'x'), 1023);
}

// Answers with the flags it was called with; code 1 ends the connection.
struct FlagService : android::BBinder {
    explicit FlagService(int connection) : mConnection(connection) {}
    android::status_t onTransact(uint32_t code, const Parcel& /* data */, Parcel* reply,
                                 uint32_t flags) override {
        mSeen += std::to_string(flags) + " ";
        reply->writeCString(mSeen.c_str());
        return code == 0 ? android::OK : shutdown(mConnection, SHUT_RDWR);
    }
    const int mConnection;
    std::string mSeen;
};

struct Mourner : android::IBinder::DeathRecipient {
    void binderDied(const android::wp<android::IBinder>& /* who */) override { ++mTimes; }
    int mTimes = 0;
};

TEST(VndBinder, CarriesCallsUntilTheOwnerDies) {
    int ends[2];
    ASSERT_EQ(socketpair(AF_UNIX, SOCK_STREAM, 0, ends), 0);
    std::thread serving(host::ServeClient, ends[1], new FlagService(ends[1]));
    const auto proxy = host::NewProxy(ends[0]);
    const android::sp<Mourner> mourner(new Mourner), other(new Mourner);
    EXPECT_EQ(proxy->linkToDeath(mourner) + proxy->linkToDeath(other), android::OK);
    EXPECT_EQ(proxy->unlinkToDeath(other), android::OK);
    EXPECT_EQ(proxy->unlinkToDeath(other), android::NAME_NOT_FOUND);
    Parcel request, reply;
    EXPECT_EQ(proxy->transact(0, request, &reply, android::IBinder::FLAG_ONEWAY), android::OK);
    EXPECT_EQ(reply.dataSize(), 0U);
    EXPECT_EQ(proxy->transact(0, request, &reply), android::OK);
    EXPECT_STREQ(reply.readCString(), "17 16 ");
    request.resizeForOverwrite(host::kMaxTransactionBytes + 1);
    EXPECT_EQ(proxy->transact(0, request, &reply), android::FAILED_TRANSACTION);
    request.resizeForOverwrite(0);
    EXPECT_EQ(proxy->transact(1, request, &reply), android::DEAD_OBJECT);
    EXPECT_EQ(proxy->transact(0, request, &reply), android::DEAD_OBJECT);
    EXPECT_EQ(std::to_string(mourner->mTimes) + std::to_string(other->mTimes), "10");
    serving.join();
}

TEST(DeviceRoot, MustBeThisUsersOwn) {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    const std::string open = kRoot + "/open", link = kRoot + "/link";
    mkdir(open.c_str(), 0700);
    chmod(open.c_str(), 0750);
    EXPECT_EQ(symlink(open.c_str(), link.c_str()), 0);
    const auto use = [](const std::string& path) {
        setenv("TPD_DEVICE_ROOT", path.c_str(), 1);
        exit(host::DeviceRoot() == -1 && __system_property_set("k", "v") == -1 ? 0 : 1);
    };
    EXPECT_EXIT(use(open), testing::ExitedWithCode(0),
                "open to other users; its mode must be 0700");
    EXPECT_EXIT(use(link + "/"), testing::ExitedWithCode(0), "link: (Not a dir|Too many)");
}
