#include "device/DeviceParts.h"

#include <algorithm>
#include <set>
#include <string_view>

#include "device/DeviceErrors.h"
#include "device/LocalDevice.h"
#include "device/install/Containers.h"
#include "platform/DevicePaths.h"

namespace device {

using platform::ErrorRef;
using platform::setError;

namespace {

constexpr std::uint64_t storeVersion = 1;

constexpr std::string_view directories[] = {
    "/var/mobile/tmp",
    "/var/mobile/Library",
    "/var/mobile/Library/Preferences",
    "/var/mobile/Library/Logs/MediaServices",
    platform::publicStagingDirectory,
    platform::packagesDirectory,
    containersDirectory,
};

/// Makes these directories durable, and those that lead to them.
bool syncDirectories(FileTree& files, ErrorRef* error) {
  std::set<std::string_view> parents{"/"};
  for (auto directory : directories) {
    for (auto slash = directory.rfind('/'); slash != 0; slash = directory.rfind('/', slash - 1))
      parents.insert(directory.substr(0, slash));
  }
  return std::all_of(parents.begin(), parents.end(), [&](auto parent) { return files.syncDirectory(parent, error); });
}

}  // namespace

bool makeDeviceDirectories(FileTree& files, ErrorRef* error) {
  for (auto directory : directories) {
    if (!files.createDirectory(directory, true, {}, error)) return false;
  }
  return true;
}

bool isDeviceStore(Store& store, ErrorRef* error) {
  const char* reason = "the device was never finished";
  store.read([&](const StoreRecord& record) {
    const bool isDevice = record.kind == "device";
    if (!isDevice)
      reason = "the store is not a device's";
    else if (record.key == "version" && record.value.unsignedInteger() == storeVersion)
      reason = nullptr;
    else
      reason = "the device is of another version";
    return !isDevice;
  });
  return !reason || fail(error, localDeviceError(LocalDeviceError::notADevice, reason));
}

bool fillDeviceParts(FileTree& files, Store& store, ErrorRef* error) {
  // The record comes last: only with it the parts are a device.
  return makeDeviceDirectories(files, error) && syncDirectories(files, error) &&
         store.commit({{"device", "version", storeVersion}, {"device", "closed", true}}, error);
}

bool makeDeviceParts(FileTree& files, Store& store, ErrorRef* error) {
  setError(error, nullptr);
  auto items = files.list("/", error);
  if (!items) return false;
  if (!items->empty() || !store.load().empty())
    return fail(error, localDeviceError(LocalDeviceError::notEmpty, "the place for the new device is not empty"));
  return fillDeviceParts(files, store, error);
}

}  // namespace device
