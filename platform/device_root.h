// The folder that stands for the device: its properties, its log, its binder driver.
#pragma once

#include <string>

namespace host {

// Its path: the environment variable TPD_DEVICE_ROOT, else a folder of the user's own state
// directory. Empty when the environment names neither.
std::string DeviceRootPath();

// A descriptor of that folder for the *at() calls; the process keeps it open. A missing folder is
// made. -1, after one message on standard error, when the path is not absolute, when the folder
// cannot be opened, or when it does not belong to this user alone.
int DeviceRoot();

}  // namespace host
