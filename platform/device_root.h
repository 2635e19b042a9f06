// The directory that stands for the device: its properties, its log, its binder driver.
#pragma once

#include <string>

namespace host {

// Its path: the environment variable TPD_DEVICE_ROOT, otherwise a directory in the user's state
// directory. Empty when the environment defines neither.
std::string DeviceRootPath();

// Returns a descriptor of that directory for the *at() calls; the process keeps it open. Makes a
// missing directory and marks an empty one. Prints one message and returns -1 when the path is not
// absolute or the directory cannot be opened, is not private to this user, or contains files but no
// mark. Sets the process's umask, so that other users cannot access new files.
int DeviceRoot();

}  // namespace host
