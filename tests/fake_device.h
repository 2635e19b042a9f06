// A device in memory: it stands behind the platform's and the C library's calls that the tool
// makes, and keeps one trail of everything done to it, in order.
#pragma once

#include <gtest/gtest.h>
#include <array>
#include <deque>
#include <functional>
#include <map>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "binder/ICorvaneInterfaceClient.h"

namespace test {

// Rows of N cells out of a text that has "|" between all cells.
template <size_t N>
std::vector<std::array<std::string, N>> Table(const std::string& text) {
    std::vector<std::array<std::string, N>> rows;
    for (size_t begin = 0, end, cell = 0; begin <= text.length(); begin = end + 1, ++cell) {
        end = std::min(text.find('|', begin), text.length());
        rows.resize(cell / N + 1);
        rows.back()[cell % N] = text.substr(begin, end - begin);
    }
    return rows;
}

constexpr char kAlive[] = "odm.thp.dae_alive";
constexpr char kEnable[] = "odm.thp.service_enable";
constexpr char kPermissive[] = "odm.thp.debug.selinux.permissive";
constexpr char kNoService[] = "0F_1F; failed to get binder service";
const std::string kRestart =
        "odm.thp.service_enable=0; odm.thp.dae_bootflag=true; odm.thp.service_enable=1";

// What the daemon makes of one call.
struct Answer {
    android::status_t status = android::OK;
    const char* text = "answer";                // null: the reply carries no text
    std::function<void()> meanwhile = nullptr;  // happens on the device during the call
};

// Each test finds a device that has just booted, and the tool's process as it is before main.
class Device : public testing::Test {
  public:
    Device();
    ~Device() override { StartsAfresh(); }

    // Given.
    void StartsAfresh();  // forgets the trail and what the process remembers
    void DaemonIs(const std::string& alive, const std::string& binder,
                  const std::string& updating = "0", const std::string& reboots = "0");
    std::map<std::string, std::string> holds;                    // properties
    std::set<std::string> refuses;                               // writes to these
    std::map<std::string, std::pair<int, std::string>> appears;  // at the n-th read from now
    std::optional<std::string> bootLine = "", getenforce = "";   // none: cannot be opened, run
    int closeStatus = 256;                                       // of getenforce
    std::deque<bool> lookups;    // whether the next ones find the service; then they all do
    std::deque<Answer> answers;  // to the next calls; then the standard one
    int failingAllocation = 0;   // the n-th from now of those that may fail

    // Then: the steps of these kinds, each with its kind when several are asked for. There are
    // read, write, log, pause (in microseconds), shell, end (of its output), find (the service),
    // tie (to its death), untie and call. A shape is their initials.
    std::string Trail(const std::string& kinds) const;
    std::string Shape(const std::string& kinds = "read write log pause find call") const;
    std::string request;  // the bytes of the last call
    std::vector<android::wp<android::IBinder::DeathRecipient>> tied;

    // For the calls that end here.
    void Note(const std::string& kind, const std::string& text) { mSteps.push_back({kind, text}); }
    int found = 0;

  private:
    std::vector<std::pair<std::string, std::string>> mSteps;
};

}  // namespace test
