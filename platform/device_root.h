// The device root: the directory that contains the device's properties, log and binder driver.
#pragma once

#include <string>

namespace host {

// Returns the path of the device root: $TPD_DEVICE_ROOT or a directory in the user's state
// directory. Empty if the environment defines neither.
std::string DeviceRootPath();

// Returns a descriptor of the device root for the *at() calls; it stays open until exec(). A
// program that is executed gets a duplicate, which dup() leaves open. Creates a missing directory
// and marks an empty one. Prints a message and returns -1 if the path is not absolute or the
// directory cannot be opened, is not private to this user, or contains files but no mark. Sets the
// umask, so that other users cannot access new files, and ignores SIGXFSZ.
int DeviceRoot();

}  // namespace host
