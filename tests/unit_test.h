// Shared by the unit tests: GoogleMock matchers and a fixture with a fake device.
#pragma once

#include <gmock/gmock.h>

#include <tuple>
#include <vector>

#include "tests/fake_device.h"

namespace test {

using namespace std::chrono_literals;
using testing::Contains;
using testing::ElementsAre;
using testing::ElementsAreArray;
using testing::IsEmpty;
using testing::Pair;
using testing::SizeIs;

// The rows of a table, which a test reads with a structured binding.
template <typename... Columns>
using Rows = std::vector<std::tuple<Columns...>>;

class DeviceTest : public testing::Test {
  protected:
    FakeDevice device;
};

const Call kStop = Write("odm.thp.service_enable", "0");
const Call kSetBootFlag = Write("odm.thp.dae_bootflag", "true");
const Call kStart = Write("odm.thp.service_enable", "1");
constexpr char kThplogKey[] = "persist.odm.thp.thplog_enabled";
constexpr char kPermissiveKey[] = "odm.thp.debug.selinux.permissive";

}  // namespace test
