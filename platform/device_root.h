// The folder that stands for the device: its properties, its log, its binder driver.
#pragma once

#include <string>

namespace host {

// Its path: the environment variable TPD_DEVICE_ROOT, else a folder of the user's own state
// directory. Empty when the environment names neither.
std::string DeviceRootPath();

// A descriptor of it for the *at() calls, which the process keeps. The folder is made when it is
// missing. -1, after one message on standard error, when it cannot be made or is not a folder of
// this user's own, closed to everybody else and named by an absolute path.
int DeviceRoot();

}  // namespace host
