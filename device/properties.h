// The device's state, as its programs share it: properties and the SELinux mode.
#pragma once

#include <sys/system_properties.h>

#include <cstdint>
#include <cstdlib>
#include <string>

#include "platform/files.h"

namespace device {

// The same as on a phone.
constexpr char kAdbPortKey[] = "service.adb.tcp.port";  // empty unless adbd is up
constexpr char kBootCompletedKey[] = "sys.boot_completed";
constexpr char kDaemonAliveKey[] = "odm.thp.dae_alive";
constexpr char kDaemonBinderKey[] = "odm.thp.binder";
constexpr char kIsUpdatingFirmwareKey[] = "odm.thp.is_updating_fw";
constexpr char kPermissiveFlagKey[] = "odm.thp.debug.selinux.permissive";
constexpr char kPowerControlKey[] = "sys.powerctl";  // "reboot" makes init reboot the device
constexpr char kRestartCountKey[] = "odm.thp.dae_reboot_times";
constexpr char kUsbConfigKey[] = "persist.sys.usb.config";  // with "adb", adbd starts at boot
constexpr char kServiceEnableKey[] = "odm.thp.service_enable";

// Requests to init, whose values are names of services: ctl.start, ctl.stop and ctl.restart.
constexpr char kControlPrefix[] = "ctl.";
// The state of a service is init.svc.NAME.
constexpr char kServiceStatePrefix[] = "init.svc.";
constexpr char kDaemonStateKey[] = "init.svc.corvane_daemon";

// Control the simulated daemon: its startup delay in milliseconds, a firmware update ("true" while
// in progress) and its fault (see faults.h).
constexpr char kBootDelayKey[] = "sim.boot_delay_ms";
constexpr char kUpdatingFirmwareKey[] = "sim.updating_fw";
constexpr char kFaultKey[] = "sim.fault";

// Returns the property's value, or an empty string if it is not set.
inline std::string GetProperty(const std::string& key) {
    char value[PROP_VALUE_MAX];
    __system_property_get(key.c_str(), value);
    return value;
}

// Returns the decimal number at the start of the property's value, or 0 if it has none.
inline int64_t GetPropertyNumber(const char* key) {
    return strtoll(GetProperty(key).c_str(), nullptr, 10);
}

// Returns true if the daemon reports that it is alive and has published its service.
inline bool IsDaemonAlive() {
    return GetProperty(kDaemonAliveKey) == "true" && GetProperty(kDaemonBinderKey) == "1";
}

// Returns what `getenforce` prints: Enforcing, Permissive or Disabled.
inline std::string SelinuxMode() {
    return host::ReadFile(host::kSelinuxFile).value_or("Enforcing");
}

}  // namespace device
