#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "device/DeviceErrors.h"
#include "device/DeviceStatus.h"
#include "device/boundary/Boundary.h"
#include "device/boundary/Injection.h"
#include "device/events/EventQueue.h"
#include "device/files/FileTree.h"
#include "device/store/Store.h"
#include "platform/DeviceNames.h"
#include "platform/Platform.h"
#include "platform/TSDeviceService.h"

namespace device {

/// What the owner of a device chooses when it is opened.
struct DeviceOptions {
  std::string mainBundleIdentifier{platform::daemonBundleIdentifier};
  /// Gets each message as it is written, under the log's own lock. Null: nobody listens, and messages are not
  /// formatted.
  std::function<void(const LogRecord&)> log;
  /// Told of every file operation of the plug-in that failed, and of every property list, or entry of one, that it
  /// could not read, since the plug-in ignores some silently: the operation, the path and the reason in one line. From
  /// any thread. May be null.
  std::function<void(std::string_view operation, std::string_view path, std::string_view reason)> fileFailed;
  std::vector<JournalListener> journals;
  std::vector<InjectionRule> rules;
  /// Decides which calls of the plug-in the device declines, and why. May be null.
  Boundary::Decliner declines;
  /// The daemon's device service; null: one that has neither operation. Calls of the plug-in cross the boundary on
  /// their way to it.
  platform::TSDeviceService* deviceService = nullptr;
  /// Whether what is half done is finished or rolled back. False for a copy of a device that somebody is working on.
  bool recovers = true;
  /// Told, on the registry lane, whenever an app's placeholder or progress or outcome changed. May be null.
  std::function<void(const AppStatus&)> changed;
};

/// A whole device: every platform service over one file tree, one store and one event queue.
///
/// Opening finishes or rolls back what an earlier process left half done, silently, before anything is handed out,
/// unless the options say not to.
/// Before the device is destroyed, the plug-in objects that use `platform()` must be gone, and `events().drain()` and
/// `events().stop()` must have returned.
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
  /// Nothing when neither the app nor its last outcome is known.
  virtual std::optional<AppStatus> app(std::string_view id) = 0;

  /// Settings that persist, with the values they take, the default first: "app-installation" and "app-removal"
  /// (allowed, forbidden), "icon-size" (120; 16 to 1024 pixels), "backup-placeholders" (yes, no), "backup-error"
  /// (no, yes), "device-service-prioritize" and "device-service-cancel" (yes, no). False with an error that names the
  /// key or the value.
  virtual bool set(std::string_view key, std::string_view value, platform::ErrorRef* error = nullptr) = 0;
  /// The default if nothing was set; empty for an unknown key.
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
  /// Puts an app on the device from a package, without a coordinator: what a device has before its first sync.
  virtual bool installFromPackage(std::string_view packagePath, platform::ErrorRef* error = nullptr) = 0;

  /// From now on no install of a package begins: apps whose package is there are installed when the device is opened
  /// next. Whoever waits for their outcomes is told nothing. From any thread; returns at once.
  virtual void putOffInstalls() = 0;

  /// Stores what is in memory only: that it is open, how far transfers have come, and the state of notifications that
  /// the store refused before. False with an error when it still refuses. Destroying a device does the same, and then
  /// notes that it is closed. To be called before anything is done to its files from outside.
  virtual bool flush(platform::ErrorRef* error = nullptr) = 0;
};

/// Makes an empty tree and an empty store those of an empty device.
bool makeDeviceParts(FileTree& files, Store& store, platform::ErrorRef* error = nullptr);

/// A file in a device's folder that its users lock, so that one process at a time has the device.
constexpr std::string_view lockName = "lock";

/// A device on a folder: `fs/` and `device.db`. `createDevice` makes an empty one in a folder that is not there, is
/// empty, or holds what an interrupted `createDevice` left.
bool createDevice(const std::string& folder, platform::ErrorRef* error = nullptr);
std::unique_ptr<LocalDevice> openDevice(const std::string& folder, std::unique_ptr<EventQueue> events,
                                        DeviceOptions options, platform::ErrorRef* error = nullptr);
/// A device in memory that begins as a copy of the one in the folder; it reads the files when they are asked for. The
/// folder is only read. Another process may be using it: then the store is as its last commit left it, files are as
/// they are when they are asked for, and the options should say that nothing is to be recovered.
std::unique_ptr<LocalDevice> openDeviceCopy(const std::string& folder, std::unique_ptr<EventQueue> events,
                                            DeviceOptions options, platform::ErrorRef* error = nullptr);
/// An empty device in memory.
std::unique_ptr<LocalDevice> makeMemoryDevice(std::unique_ptr<EventQueue> events, DeviceOptions options);

}  // namespace device
