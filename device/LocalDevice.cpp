#include "device/LocalDevice.h"

#include <algorithm>
#include <filesystem>
#include <set>
#include <system_error>
#include <utility>

#include "device/AppRecords.h"
#include "device/BackupServiceLocal.h"
#include "device/Containers.h"
#include "device/CoordinatorReports.h"
#include "device/DeviceServiceBoundary.h"
#include "device/FileSystemService.h"
#include "device/HomeScreenService.h"
#include "device/IconService.h"
#include "device/InjectedSteps.h"
#include "device/InstallCoordinationService.h"
#include "device/InstallEngine.h"
#include "device/InstallerService.h"
#include "device/LocalProcess.h"
#include "device/NotificationService.h"
#include "device/OverlayFileTree.h"
#include "device/PropertyListService.h"
#include "device/RegistryReports.h"
#include "device/RegistryService.h"
#include "device/RestrictionsService.h"
#include "device/ServiceErrors.h"
#include "device/Settings.h"
#include "device/SystemLogService.h"
#include "device/TSSupportService.h"
#include "device/TransactionLogService.h"

namespace device {

namespace {

using platform::ErrorRef;
using platform::setError;
using Lock = platform::Mutex::Lock;

constexpr std::string_view syncNotification = "com.vantor.panello.tsd.wsyncnotify";
constexpr std::uint64_t storeVersion = 1;
constexpr const char* databaseName = "/device.db";
constexpr const char* treeName = "/fs";

constexpr std::string_view directories[] = {
    "/var/mobile/tmp",
    "/var/mobile/Library",
    "/var/mobile/Library/Preferences",
    "/var/mobile/Library/Logs/MediaServices",
    "/var/mobile/Media/PublicStaging",
    "/var/mobile/Media/PublicStaging/Packages",
    containersDirectory,
};

bool makeDirectories(FileTree& files, ErrorRef* error) {
  for (auto directory : directories) {
    if (!files.createDirectory(directory, true, {}, error)) return false;
  }
  return true;
}

/// Makes these directories durable, and the way to each of them.
bool syncDirectories(FileTree& files, ErrorRef* error) {
  std::set<std::string_view> parents{"/"};
  for (auto directory : directories) {
    for (auto slash = directory.rfind('/'); slash != 0; slash = directory.rfind('/', slash - 1))
      parents.insert(directory.substr(0, slash));
  }
  return std::all_of(parents.begin(), parents.end(), [&](auto parent) { return files.syncDirectory(parent, error); });
}

/// The record that makes a store a device's.
bool isDeviceStore(Store& store, ErrorRef* error) {
  for (const auto& record : store.load()) {
    if (record.kind != "device") continue;
    if (record.key == "version" && record.value.unsignedInteger() == storeVersion) return true;
    return fail(error, localDeviceError(LocalDeviceError::notADevice, "the device is one of another version"));
  }
  bool isEmpty = store.load().empty();
  return fail(error, localDeviceError(LocalDeviceError::notADevice,
                                      isEmpty ? "the device was never finished" : "the store is none of a device"));
}

/// The parts of a device in the order in which they stand on each other.
class WholeDevice final : public LocalDevice {
 public:
  WholeDevice(std::unique_ptr<FileTree> files, std::unique_ptr<Store> store, std::unique_ptr<EventQueue> events,
              DeviceOptions options)
      : _files(std::move(files)),
        _store(std::move(store)),
        _events(std::move(events)),
        _boundary(&_events->clock()),
        _records(*_store,
                 [failed = options.fileFailed](const ErrorRef& reason) {
                   if (failed) failed("commit", "device.db", reason ? reason->description() : "no reason given");
                 }),
        _registryReports(_records, _boundary, *_events, options.changed),
        _coordinatorReports(_boundary, *_events),
        _engine(_records, *_files, _boundary, *_events, _registryReports, _coordinatorReports,
                [failed = options.fileFailed](const std::string& app, const ErrorRef& reason) {
                  if (failed) failed("placeholder", app, reason ? reason->description() : "no reason given");
                }),
        _process(_boundary, *_files, options.mainBundleIdentifier),
        _fileSystem(_boundary, *_files, options.fileFailed),
        _propertyLists(_boundary),
        _systemLog(_boundary, options.log),
        _support(_boundary, _systemLog),
        _deviceService(
            _boundary, [this](std::string_view key) { return setting(key); }, options.deviceService),
        _installCoordination(_engine, _coordinatorReports, _boundary, *_events),
        _workspace(_records, _engine, _registryReports, _boundary),
        _installer(_records, _boundary),
        _backup(_boundary, [this](std::string_view key) { return backupSetting(key); }),
        _restrictions(_boundary, [this](std::string_view key) { return setting(key); }),
        _homeScreen(_records, _boundary),
        _iconRenderer(_records, *_files, _boundary),
        _imageEncoder(_boundary),
        _transactionLog(_boundary),
        _notifications(_boundary, *_events,
                       [this](const std::string& name, std::uint64_t state) { keepNotificationState(name, state); }) {
    for (auto& journal : options.journals) _boundary.addJournal(std::move(journal));
    _boundary.setRules(std::move(options.rules));
    _boundary.setBystander([this](InjectionRule::Action action, const std::string& app) { stepIn(action, app); });
  }

  ~WholeDevice() override {
    _events->stop();
    WholeDevice::flush(nullptr);
  }

  bool load(ErrorRef* error) {
    auto loaded = _records.load(error);
    if (!loaded || !makeDirectories(*_files, error)) return false;
    {
      Lock lock(_records.mutex);
      for (const auto& [name, state] : _records.state().notificationStates) _notifications.restoreState(name, state);
    }
    _engine.recover(std::move(*loaded));
    return true;
  }

  const platform::Platform& platform() override { return _platform; }
  Boundary& boundary() override { return _boundary; }
  EventQueue& events() override { return *_events; }
  FileTree& files() override { return *_files; }

  DeviceStatus status() override {
    DeviceStatus status;
    status.coordinators = _engine.openCoordinators();
    status.syncing = _notifications.state(syncNotification);
    Lock lock(_records.mutex);
    std::set<std::string_view> known;
    for (const auto& [id, app] : _records.state().apps) known.insert(id);
    for (const auto& [id, outcome] : _records.state().outcomes) known.insert(id);
    for (auto id : known) status.apps.push_back(*_records.state().status(id));
    status.home = _records.state().homeOrder();
    status.pages = _records.state().layout.pages;
    return status;
  }

  std::optional<AppStatus> app(std::string_view id) override {
    Lock lock(_records.mutex);
    return _records.state().status(id);
  }

  bool set(std::string_view key, std::string_view value, ErrorRef* error) override {
    if (!checkSetting(key, value, error)) return false;
    ChangeSet changes;
    changes.setSetting(key, value);
    Lock lock(_records.mutex);
    return _records.commit(std::move(changes), error);
  }
  std::string setting(std::string_view key) override {
    Lock lock(_records.mutex);
    return settingOf(_records.state(), key);
  }

  bool uninstallByPerson(std::string_view id, ErrorRef* error) override { return _engine.uninstall(id, error); }
  bool cancelByPerson(std::string_view id, ErrorRef* error) override { return _engine.cancelByPerson(id, error); }
  bool prioritizeByPerson(std::string_view id, ErrorRef* error) override {
    return _engine.prioritizeByPerson(id, error);
  }
  bool beginStoreInstall(std::string_view id, const StoreInstall& install, ErrorRef* error) override {
    return _engine.beginStoreInstall(id, install, error);
  }
  bool finishStoreInstall(std::string_view id, std::string_view packagePath, ErrorRef* error) override {
    return _engine.finishStoreInstall(id, packagePath, error);
  }
  bool installFromPackage(std::string_view packagePath, ErrorRef* error) override {
    return _engine.installFromPackage(packagePath, error);
  }

 private:
  /// What the backup service asks, in its words; empty for what nobody has set.
  std::string backupSetting(std::string_view key) {
    Lock lock(_records.mutex);
    auto set = _records.state().settings.find(key);
    if (set == _records.state().settings.end()) return {};
    bool yes = set->second == "yes";
    if (key == "backup-error") return yes ? "1:the backup service is set to fail" : "";
    return yes ? "wanted" : "declined";
  }

  bool flush(ErrorRef* error) override {
    _engine.flush();
    return _records.flush(error);
  }

  void keepNotificationState(const std::string& name, std::uint64_t state) {
    ChangeSet changes;
    changes.setNotificationState(name, state);
    Lock lock(_records.mutex);
    // Everybody has it already, so what the store refuses now is for its next commit.
    _records.commitLater(std::move(changes));
    _records.commit({});
  }

  /// Somebody else does something in the middle of a call. What cannot be done at that moment is not.
  void stepIn(InjectionRule::Action action, const std::string& app) {
    switch (action) {
      case InjectionRule::Action::cancel:
        cancelByPerson(app, nullptr);
        break;
      case InjectionRule::Action::prioritize:
        prioritizeByPerson(app, nullptr);
        break;
      case InjectionRule::Action::uninstall:
        uninstallByPerson(app, nullptr);
        break;
      case InjectionRule::Action::store:
        beginStoreInstall(app, {}, nullptr);
        break;
      default:
        break;
    }
  }

  const std::unique_ptr<FileTree> _files;
  const std::unique_ptr<Store> _store;
  const std::unique_ptr<EventQueue> _events;
  Boundary _boundary;
  AppRecords _records;
  RegistryReports _registryReports;
  CoordinatorReports _coordinatorReports;
  InstallEngine _engine;

  LocalProcess _process;
  FileSystemService _fileSystem;
  PropertyListService _propertyLists;
  SystemLogService _systemLog;
  TSSupportService _support;
  DeviceServiceBoundary _deviceService;
  InstallCoordinationService _installCoordination;
  RegistryService _workspace;
  InstallerService _installer;
  BackupServiceLocal _backup;
  RestrictionsService _restrictions;
  HomeScreenService _homeScreen;
  IconService _iconRenderer;
  PNGEncoder _imageEncoder;
  TransactionLogService _transactionLog;
  NotificationService _notifications;

  const platform::Platform _platform{
      _process,       _events->clock(),     _fileSystem,   _propertyLists,  _systemLog,    _support,
      _deviceService, _installCoordination, _workspace,    _installer,      _backup,       _restrictions,
      _homeScreen,    _iconRenderer,        _imageEncoder, _transactionLog, _notifications};
};

}  // namespace

platform::ErrorRef localDeviceError(LocalDeviceError code, std::string description, ErrorRef underlying) {
  return platform::makeError("LocalDevice", static_cast<std::int64_t>(code), std::move(description),
                             std::move(underlying));
}

std::unique_ptr<LocalDevice> LocalDevice::open(std::unique_ptr<FileTree> files, std::unique_ptr<Store> store,
                                               std::unique_ptr<EventQueue> events, DeviceOptions options,
                                               ErrorRef* error) {
  setError(error, nullptr);
  if (!isDeviceStore(*store, error)) return nullptr;
  auto device =
      std::make_unique<WholeDevice>(std::move(files), std::move(store), std::move(events), std::move(options));
  if (!device->load(error)) return nullptr;
  return device;
}

/// The record comes last: without it nothing is a device.
static bool fillDeviceParts(FileTree& files, Store& store, ErrorRef* error) {
  return makeDirectories(files, error) && syncDirectories(files, error) &&
         store.commit({{"device", "version", storeVersion}}, error);
}

bool makeDeviceParts(FileTree& files, Store& store, ErrorRef* error) {
  setError(error, nullptr);
  auto items = files.list("/", error);
  if (!items) return false;
  if (!items->empty() || !store.load().empty())
    return fail(error, localDeviceError(LocalDeviceError::notEmpty, "what is to become a device is not empty"));
  return fillDeviceParts(files, store, error);
}

/// Whether a folder holds no more than a `createDevice` that did not come to its end: directories, and a store without
/// a record. It is only read.
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
  // A journal like this one is there only until the store's file has been made.
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
  // Its files would come to lie in the system's root.
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

std::unique_ptr<LocalDevice> makeMemoryDevice(std::unique_ptr<EventQueue> events, DeviceOptions options) {
  auto files = makeMemoryFileTree();
  auto store = makeMemoryStore();
  if (!makeDeviceParts(*files, *store)) return nullptr;
  return LocalDevice::open(std::move(files), std::move(store), std::move(events), std::move(options));
}

}  // namespace device
