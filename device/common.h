// What the programs of the virtual device share.
#pragma once

#include <cstdint>
#include <set>
#include <string>

namespace device {

// The file that init holds a record lock on for its life.
constexpr char kInitLock[] = "init.lock";
constexpr char kDaemonAliveKey[] = "odm.thp.dae_alive";
constexpr char kDaemonBinderKey[] = "odm.thp.binder";
constexpr char kServiceEnableKey[] = "odm.thp.service_enable";
constexpr char kUpdatingFirmwareKey[] = "sim.updating_fw";

// The property's value; empty when it is not set.
std::string GetProperty(const char* key);

// The property's value as a decimal number; 0 when it is none.
int64_t GetPropertyNumber(const char* key);

// Whether the daemon says that it lives and that its service is published.
bool IsDaemonAlive();

// Whether init is to keep the daemon running.
bool IsDaemonEnabled();

// The content of a file of the device root, which is not larger than an argument of a program can
// be; `missing` when it cannot be read.
std::string ReadText(const std::string& path, const std::string& missing);

// What `getenforce` prints: Enforcing, Permissive or Disabled.
std::string SelinuxMode();

// The names in a folder of the device root, sorted. Empty when there is no such folder.
std::set<std::string> FilesIn(const std::string& folder);

// The path of a file in the folder of the program that runs, links to which are resolved.
std::string PathBesideProgram(const std::string& name);

}  // namespace device
