#include <fcntl.h>
#include <sys/stat.h>

#include <cerrno>
#include <filesystem>
#include <system_error>
#include <utility>

#include "device/DeviceErrors.h"
#include "device/DeviceParts.h"
#include "device/LocalDevice.h"
#include "device/boundary/DeviceSteps.h"
#include "device/files/DevicePath.h"
#include "device/files/DiskFileTree.h"
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

/// The device's own folder for its files. It is no link, even if somebody exchanges it for one just now.
static std::unique_ptr<FileTree> openTree(const std::string& folder, ErrorRef* error,
                                          std::shared_ptr<StepWatch> watch = nullptr,
                                          DiskFileTree::Use use = DiskFileTree::Use::shared) {
  FileDescriptor root(::open((folder + treeName).c_str(), O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  if (!answerFileOperation(root.isOpen() ? 0 : errno, folder + treeName, error)) return nullptr;
  return std::make_unique<DiskFileTree>(std::move(root), std::move(watch), use);
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
  auto files = openTree(folder, error);
  auto store = files ? openDatabaseStore(folder + databaseName, error) : nullptr;
  return store && fillDeviceParts(*files, *store, error);
}

/// What is wrong with a file of the store: it is to be a file of this folder alone, as it is written in its place.
static const char* flawOf(const struct stat& facts) {
  if (S_ISLNK(facts.st_mode)) return "a symbolic link";
  if (!S_ISREG(facts.st_mode)) return "no regular file";
  return facts.st_nlink > 1 ? "a file that has other names, too" : nullptr;
}

/// False with an error that says what is there instead.
static bool checkIsDevice(const std::string& folder, ErrorRef* error) {
  namespace fs = std::filesystem;
  setError(error, nullptr);
  std::error_code failure;
  auto refuse = [&](const std::string& why) {
    return fail(error, localDeviceError(LocalDeviceError::notADevice, folder + why));
  };
  struct stat facts {};
  const std::string database = folder + databaseName;
  if (::lstat((folder + treeName).c_str(), &facts) != 0 || !S_ISDIR(facts.st_mode) ||
      ::lstat(database.c_str(), &facts) != 0 || S_ISDIR(facts.st_mode))
    return refuse(fs::exists(folder, failure) ? ": not a device" : ": there is no such folder");
  // A pipe would be waited for.
  for (const char* ending : {"", "-journal", "-wal", "-shm"}) {
    if (::lstat((database + ending).c_str(), &facts) != 0) continue;
    if (const char* flaw = flawOf(facts)) return refuse(std::string(databaseName) + ending + ": " + flaw);
  }
  return true;
}

std::unique_ptr<LocalDevice> openDevice(const std::string& folder, std::unique_ptr<EventQueue> events,
                                        DeviceOptions options, ErrorRef* error) {
  if (!checkIsDevice(folder, error)) return nullptr;
  auto steps = DeviceSteps::of(options.rules, options.journals);
  auto files = openTree(folder, error, steps, DiskFileTree::Use::alone);
  auto store = files ? openDatabaseStore(folder + databaseName, error, steps) : nullptr;
  if (!store) return nullptr;
  return LocalDevice::open(std::move(files), std::move(store), std::move(events), std::move(options), error);
}

std::unique_ptr<LocalDevice> openDeviceCopy(const std::string& folder, std::unique_ptr<EventQueue> events,
                                            DeviceOptions options, ErrorRef* error) {
  if (!checkIsDevice(folder, error)) return nullptr;
  auto files = openTree(folder, error);
  auto store = files ? copyDatabaseStore(folder + databaseName, error) : nullptr;
  if (!store) return nullptr;
  return LocalDevice::open(std::make_unique<OverlayFileTree>(std::move(files)), std::move(store), std::move(events),
                           std::move(options), error);
}

}  // namespace device
