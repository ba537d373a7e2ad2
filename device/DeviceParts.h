#pragma once

#include "device/files/FileTree.h"
#include "device/store/Store.h"
#include "platform/Error.h"

namespace device {

/// What makes a file tree and a store a device.

/// Makes the directories that every device has; those that are there stay as they are.
bool makeDeviceDirectories(FileTree& files, platform::ErrorRef* error);
/// Whether the store has the record that makes it a device's.
bool isDeviceStore(Store& store, platform::ErrorRef* error);
/// Makes them those of an empty device, durably, however much of that is done already.
bool fillDeviceParts(FileTree& files, Store& store, platform::ErrorRef* error);

}  // namespace device
