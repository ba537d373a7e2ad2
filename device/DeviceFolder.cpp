#include <filesystem>
#include <system_error>
#include <utility>

#include "device/DeviceErrors.h"
#include "device/DeviceParts.h"
#include "device/LocalDevice.h"
#include "device/boundary/InjectedSteps.h"
#include "device/files/OverlayFileTree.h"

namespace device {

using platform::ErrorRef;
using platform::setError;

constexpr const char* databaseName = "/device.db";
constexpr const char* treeName = "/fs";

/// Whether a folder holds only what an interrupted `createDevice` leaves: directories, and a store without a record.
/// The folder is only read.
static bool isUnfinished(const std::string& folder) {
  namespace fs = std::filesystem;
  const std::string database = folder + databaseName;
  std::error_code failure;
  for (fs::directory_iterator entry(folder, failure), end; !failure && entry != end; entry.increment(failure)) {
    const std::string name = entry->path().filename().string();
    const std::string path = folder + '/' + name;
    bool isOurs = path == folder + treeName || path.compare(0, database.size(), database) == 0;
    if ((!isOurs && name != lockName) || entry->is_symlink(failure)) return false;
  }
  fs::recursive_directory_iterator entry(folder + treeName, failure), end;
  for (; !failure && entry != end; entry.increment(failure)) {
    if (entry->symlink_status(failure).type() != fs::file_type::directory) return false;
  }
  if (failure) return false;
  // Such a journal exists only until the store's file has been made.
  if (!fs::exists(database, failure) || fs::exists(database + "-journal", failure)) return true;
  auto store = copyDatabaseStore(database);
  return store && store->load().empty();
}

bool createDevice(const std::string& folder, ErrorRef* error) {
  namespace fs = std::filesystem;
  setError(error, nullptr);
  std::error_code failure;
  auto refuse = [&](LocalDeviceError code, const std::string& why) {
    return fail(error, localDeviceError(code, folder + ": " + why));
  };
  // Its files would end up in the system's root.
  if (folder.empty()) return fail(error, localDeviceError(LocalDeviceError::failed, "a folder without a name"));
  if (fs::exists(folder, failure)) {
    if (!fs::is_directory(folder, failure)) return refuse(LocalDeviceError::notEmpty, "not a folder");
    bool isEmpty = fs::is_empty(folder, failure);
    if (failure) return refuse(LocalDeviceError::failed, failure.message());
    if (!isEmpty && !isUnfinished(folder)) return refuse(LocalDeviceError::notEmpty, "the folder is not empty");
  }
  fs::create_directories(folder + treeName, failure);
  if (failure) return refuse(LocalDeviceError::failed, failure.message());
  auto files = openDiskFileTree(folder + treeName, error);
  auto store = files ? openDatabaseStore(folder + databaseName, error) : nullptr;
  return store && fillDeviceParts(*files, *store, error);
}

/// False with an error that says what is there instead.
static bool checkIsDevice(const std::string& folder, ErrorRef* error) {
  namespace fs = std::filesystem;
  setError(error, nullptr);
  std::error_code failure;
  if (fs::is_regular_file(folder + databaseName, failure) && fs::is_directory(folder + treeName, failure)) return true;
  return fail(
      error, localDeviceError(LocalDeviceError::notADevice,
                              folder + (fs::exists(folder, failure) ? ": not a device" : ": there is no such folder")));
}

std::unique_ptr<LocalDevice> openDevice(const std::string& folder, std::unique_ptr<EventQueue> events,
                                        DeviceOptions options, ErrorRef* error) {
  if (!checkIsDevice(folder, error)) return nullptr;
  auto steps = InjectedSteps::of(options.rules);
  auto files = openDiskFileTree(folder + treeName, error, steps);
  auto store = files ? openDatabaseStore(folder + databaseName, error, steps) : nullptr;
  if (!store) return nullptr;
  return LocalDevice::open(std::move(files), std::move(store), std::move(events), std::move(options), error);
}

std::unique_ptr<LocalDevice> openDeviceCopy(const std::string& folder, std::unique_ptr<EventQueue> events,
                                            DeviceOptions options, ErrorRef* error) {
  if (!checkIsDevice(folder, error)) return nullptr;
  auto files = openDiskFileTree(folder + treeName, error);
  auto store = files ? copyDatabaseStore(folder + databaseName, error) : nullptr;
  if (!store) return nullptr;
  return LocalDevice::open(std::make_unique<OverlayFileTree>(std::move(files)), std::move(store), std::move(events),
                           std::move(options), error);
}

}  // namespace device
