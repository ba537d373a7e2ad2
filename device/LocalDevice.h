#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "device/Boundary.h"
#include "device/EventQueue.h"
#include "device/FileTree.h"
#include "device/Injection.h"
#include "device/Store.h"
#include "platform/Platform.h"
#include "platform/SystemLog.h"
#include "platform/TSDeviceService.h"
#include "platform/Value.h"

namespace device {

/// Codes of the errors of this interface; their domain is "LocalDevice".
enum class LocalDeviceError : std::int64_t {
  failed = 1,
  notADevice = 2,      // the folder or the parts are none of a device, or a record in it makes no sense
  notEmpty = 3,        // a device is to be made where something else is
  unknownSetting = 4,  // no such key, or no such value of the key
  noSuchApp = 5,
  busyApp = 6,  // another install of the app is under way
};
platform::ErrorRef localDeviceError(LocalDeviceError code, std::string description,
                                    platform::ErrorRef underlying = nullptr);

/// One message of the system log as it was written.
struct LogRecord {
  platform::LogLevel level;
  std::string category;  // "8", "15", "0"; the category's name for handles of a subsystem
  std::string message;
};

/// What an install of the store's own looks like from outside; every fact can be set, also to numbers nobody has a name
/// for.
struct StoreInstall {
  std::uint64_t installType = 1;
  std::uint64_t installState = 1;
  std::uint64_t installPhase = 0;
  bool paused = false;
  bool hasProgress = true;
  bool createsCoordinator = true;
  bool systemBundle = false;
  std::string applicationType = "User";
};

/// One app as the device shows it.
struct AppStatus {
  std::string id;
  std::string name;
  std::string version;  // empty when not known
  std::string state;    // "installed", "placeholder" or "updating"; empty when only its last outcome is left of it
  std::uint64_t installType = 0;
  std::string type;         // "User" or "System"
  double progress = 0;      // 0…1 of a running install
  std::string lastOutcome;  // "", "INSTALLED", "FAILED", "CANCELED"
  std::string lastReason;   // text of the failure, if any

  bool operator==(const AppStatus&) const = default;
};
struct CoordinatorStatus {
  std::string app;
  std::string kind;  // "initiating", "updating", "restoring", "restoring-demoted"
  std::uint64_t client = 0;
  bool hasPlaceholder = false;
  bool promisesPackage = false;     // somebody is to deliver the package
  std::uint64_t packageClient = 0;  // who, where that is not the coordinator's own client; else 0
  double fraction = 0;              // of the package that has come

  bool operator==(const CoordinatorStatus&) const = default;
};
/// The canonical state of a device: the same for two devices that differ only in container names.
struct DeviceStatus {
  std::vector<AppStatus> apps;                  // sorted by id; those that only an outcome is left of, too
  std::vector<CoordinatorStatus> coordinators;  // sorted by app
  std::vector<std::string> home;                // flattened, in order
  /// The home screen's pages as the host set them, one for a layout without pages. Apps that it does not name stand
  /// in `home` alone.
  std::vector<std::vector<std::string>> pages;
  std::uint64_t syncing = 0;  // state of the home screen's sync notification

  bool operator==(const DeviceStatus&) const = default;
};

/// What the owner of a device chooses when it is opened.
struct DeviceOptions {
  std::string mainBundleIdentifier = "com.vantor.tsd";
  /// Each message as it is written; under the log's own lock. Null: nobody listens (and messages are not formatted).
  std::function<void(const LogRecord&)> log;
  /// Told of every file operation of the plug-in that failed, as the plug-in passes over some in silence: the
  /// operation, the path and the reason in one line. From any thread. May be null.
  std::function<void(std::string_view operation, std::string_view path, std::string_view reason)> fileFailed;
  std::vector<JournalListener> journals;
  std::vector<InjectionRule> rules;
  /// The daemon's device service; null: one that has neither operation. Calls of the plug-in cross the boundary on
  /// their way to it.
  platform::TSDeviceService* deviceService = nullptr;
  /// Told, on the registry lane, whenever an app's placeholder or progress or outcome changed. May be null.
  std::function<void(const AppStatus&)> changed;
};

/// A whole device: every platform service over one file tree, one store and one event queue.
///
/// Opening finishes or rolls back what an earlier process left half done, silently, before anything is handed out.
/// The plug-in objects that use `platform()` are gone, and `events().drain()` and `events().stop()` have returned,
/// before the device is destroyed.
class LocalDevice {
 public:
  /// Null with an error when the parts are not those of a device.
  static std::unique_ptr<LocalDevice> open(std::unique_ptr<FileTree> files, std::unique_ptr<Store> store,
                                           std::unique_ptr<EventQueue> events, DeviceOptions options,
                                           platform::ErrorRef* error = nullptr);
  virtual ~LocalDevice() = default;

  virtual const platform::Platform& platform() = 0;
  virtual Boundary& boundary() = 0;
  virtual EventQueue& events() = 0;
  /// Below the boundary: nothing done here is in the journal.
  virtual FileTree& files() = 0;

  virtual DeviceStatus status() = 0;
  /// Nothing when neither the app nor an outcome of it is known.
  virtual std::optional<AppStatus> app(std::string_view id) = 0;

  /// Settings that persist, with the values they take, the default first: "app-installation" and "app-removal"
  /// (allowed, forbidden), "icon-size" (120; 16 to 1024 pixels), "backup-placeholders" (yes, no), "backup-error"
  /// (no, yes), "device-service-prioritize" and "device-service-cancel" (yes, no). False with an error that names the
  /// key or the value.
  virtual bool set(std::string_view key, std::string_view value, platform::ErrorRef* error = nullptr) = 0;
  /// The default where nothing was set; empty for an unknown key.
  virtual std::string setting(std::string_view key) = 0;

  /// As the person on the device would.
  virtual bool uninstallByPerson(std::string_view id, platform::ErrorRef* error = nullptr) = 0;
  virtual bool cancelByPerson(std::string_view id, platform::ErrorRef* error = nullptr) = 0;
  virtual bool prioritizeByPerson(std::string_view id, platform::ErrorRef* error = nullptr) = 0;
  /// The store starts an install of its own (a coordinator of client 1 and a registry entry), and finishes it. Package
  /// paths are the device's; a package that was installed is deleted, one that was refused is kept. Without a package
  /// (an empty path) what the placeholder's container holds becomes the app. Finishing runs inside the call; callbacks
  /// follow.
  virtual bool beginStoreInstall(std::string_view id, const StoreInstall& install,
                                 platform::ErrorRef* error = nullptr) = 0;
  virtual bool finishStoreInstall(std::string_view id, std::string_view packagePath,
                                  platform::ErrorRef* error = nullptr) = 0;
  /// An app that is simply there, from a package: what a device has before the first sync.
  virtual bool installFromPackage(std::string_view packagePath, platform::ErrorRef* error = nullptr) = 0;

  /// Stores what is in memory only: how far transfers have come, and the state of notifications where the store refused
  /// it before. False with an error when it refuses still. A device that goes does the same.
  virtual bool flush(platform::ErrorRef* error = nullptr) = 0;
};

/// Makes an empty tree and an empty store those of an empty device.
bool makeDeviceParts(FileTree& files, Store& store, platform::ErrorRef* error = nullptr);

/// A file in a device's folder that is its users', to keep it to one process at a time.
constexpr std::string_view lockName = "lock";

/// A device on a folder: `fs/` and `device.db`. `create` makes an empty one in a folder that is not there, or is empty,
/// or holds what an earlier `create` left that did not come to its end.
bool createDevice(const std::string& folder, platform::ErrorRef* error = nullptr);
std::unique_ptr<LocalDevice> openDevice(const std::string& folder, std::unique_ptr<EventQueue> events,
                                        DeviceOptions options, platform::ErrorRef* error = nullptr);
/// A device in memory that begins as the one in the folder is, and of whose files it reads those that are asked for.
/// The folder is only read; nobody changes it as long as the copy is used.
std::unique_ptr<LocalDevice> openDeviceCopy(const std::string& folder, std::unique_ptr<EventQueue> events,
                                            DeviceOptions options, platform::ErrorRef* error = nullptr);
/// An empty device in memory.
std::unique_ptr<LocalDevice> makeMemoryDevice(std::unique_ptr<EventQueue> events, DeviceOptions options);

}  // namespace device
