// A device in memory. It implements and records the tool's calls to the platform and the C library.
#pragma once

#include <android/log.h>
#include <utils/Errors.h>

#include <chrono>
#include <cstdio>
#include <deque>
#include <map>
#include <optional>
#include <set>
#include <string>
#include <utility>
#include <vector>

namespace test {

// A recorded call: the function and its arguments. The functions below construct expected calls.
using Call = std::pair<std::string, std::string>;

constexpr char kRead[] = "Read", kWrite[] = "Write", kLog[] = "Log", kPause[] = "Pause",
               kShell[] = "Shell", kGetService[] = "GetService", kLinkToDeath[] = "LinkToDeath",
               kUnlinkToDeath[] = "UnlinkToDeath", kTransact[] = "Transact",
               kTransactOneWay[] = "TransactOneWay";

constexpr int INFO = ANDROID_LOG_INFO;
constexpr int WARN = ANDROID_LOG_WARN;
constexpr int ERROR = ANDROID_LOG_ERROR;

inline Call Log(int priority, const std::string& text, const char* tag = "corvane_daemon") {
    const std::string letter(1, "??VDIWE"[priority]);
    return {kLog, letter + ", " + (tag != nullptr ? tag : "no tag") + ", " + text};
}
inline Call UntaggedLog(int priority, const std::string& text) {
    return Log(priority, text, nullptr);
}
inline Call Read(const std::string& key) { return {kRead, key}; }
inline Call Write(const std::string& key, const std::string& value) {
    return {kWrite, key + ", " + value};
}
inline Call Pause(std::chrono::microseconds time) {
    return {kPause, std::to_string(time.count()) + " us"};
}
inline Call Shell(const std::string& command) { return {kShell, command}; }

// Services are numbered in the order in which they are found.
inline Call GetService() { return {kGetService, "service.corvaneinterfaceservice"}; }
inline Call LinkToDeath(int service) { return {kLinkToDeath, std::to_string(service)}; }
inline Call UnlinkToDeath(int service) { return {kUnlinkToDeath, std::to_string(service)}; }

// `request` is "COMMAND" or "COMMAND, PARAMETERS".
inline Call Transact(const std::string& request) { return {kTransact, request}; }
inline Call TransactOneWay(const std::string& request) { return {kTransactOneWay, request}; }

// The daemon's answer to a call.
struct Answer {
    android::status_t status = android::OK;
    const char* text = "answer";  // null: the reply has no text
};

// A device whose daemon is alive. Only one instance may exist at a time, because the constructor
// resets the tool's global variables.
class FakeDevice {
  public:
    FakeDevice();
    ~FakeDevice();

    std::map<std::string, std::string> properties = {
            {"odm.thp.dae_alive", "true"},
            {"odm.thp.binder", "1"},
            {"odm.thp.dae_reboot_times", "0"},
            {"odm.thp.is_updating_fw", "false"},
    };
    std::set<std::string> rejectedWrites;                   // properties that reject writes
    std::optional<std::string> kernelCommandLine = "";      // nullopt: cannot be opened
    std::optional<std::string> getenforce = "Enforcing\n";  // output; nullopt: cannot be run
    int getenforceStatus = 0;                               // what pclose() returns
    int failingAllocation = 0;  // which nothrow allocation fails, from 1; 0: none
    std::deque<bool> lookups;   // results of the first lookups; later ones succeed
    // Answers to the first calls; later calls get the default answer. DEAD_OBJECT also notifies the
    // death recipient.
    std::deque<Answer> answers;
    // Properties that change during a call, and their new values.
    std::map<Call, std::pair<std::string, std::string>> changes;

    // Returns the recorded calls of these functions, or all calls if none is named.
    std::vector<Call> calls(const std::set<std::string>& functions = {}) const;
    std::set<FILE*> openStreams;  // the kernel command line and getenforce

    // Used by the redirected functions.
    void Record(const Call& call);
    int servicesFound = 0;

  private:
    std::vector<Call> mCalls;
};

}  // namespace test
