// The directory that stands for the device: its properties, its log, its binder driver.
#pragma once

#include <string>

namespace host {

// Its path: the environment variable TPD_DEVICE_ROOT, else a directory of the user's own state
// directory. Empty when the environment names neither.
std::string DeviceRootPath();

// A descriptor of that directory for the *at() calls; the process keeps it open. A missing
// directory is made. One that is empty is marked as a device's. -1, after one message on standard
// error, when the path is not absolute, when the directory cannot be opened, does not belong to
// this user alone, or contains files without being marked. Sets the process's umask, so that other
// users are kept out of new files.
int DeviceRoot();

}  // namespace host
