// The property keys shared by the programs of the device.
#pragma once

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

}  // namespace device
