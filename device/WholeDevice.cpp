#include <exception>
#include <set>
#include <utility>

#include "device/DeviceParts.h"
#include "device/LocalDevice.h"
#include "device/boundary/DeviceServiceBoundary.h"
#include "device/coordination/LocalCoordinator.h"
#include "device/install/Containers.h"
#include "device/install/InstallEngine.h"
#include "device/records/AppRecords.h"
#include "device/records/Settings.h"
#include "device/reports/CoordinatorReports.h"
#include "device/reports/RegistryReports.h"
#include "device/screen/HomeScreenService.h"
#include "device/screen/IconService.h"
#include "device/services/BackupServiceLocal.h"
#include "device/services/FileSystemService.h"
#include "device/services/InstallCoordinationService.h"
#include "device/services/InstallerService.h"
#include "device/services/LocalProcess.h"
#include "device/services/NotificationService.h"
#include "device/services/PropertyListService.h"
#include "device/services/RegistryService.h"
#include "device/services/RestrictionsService.h"
#include "device/services/SystemLogService.h"
#include "device/services/TSSupportService.h"
#include "device/services/TransactionLogService.h"
#include "platform/DeviceNames.h"
#include "platform/DevicePaths.h"

namespace device {

namespace {

using platform::ErrorRef;
using platform::setError;
using Lock = AppRecords::Lock;

/// The parts of a device, in the order in which they build on each other.
class WholeDevice final : public LocalDevice {
 public:
  WholeDevice(std::unique_ptr<FileTree> files, std::unique_ptr<Store> store, std::unique_ptr<EventQueue> events,
              DeviceOptions options)
      : _recovers(options.recovers),
        _files(std::move(files)),
        _store(std::move(store)),
        _events(std::move(events)),
        _boundary(&_events->clock()),
        _records(*_store,
                 [failed = options.fileFailed](const ErrorRef& reason) {
                   if (failed) failed("commit", "device.db", reason ? reason->description() : "no reason given");
                 }),
        _registryReports(_records, _boundary, *_events, options.changed),
        _coordinatorReports(_records, _boundary, *_events),
        _engine(
            _records, *_files, *_events, _registryReports, _coordinatorReports,
            [this](CoordinatorRecord record) {
              return std::make_shared<LocalCoordinator>(_engine, _boundary, std::move(record));
            },
            [failed = options.fileFailed](const std::string& app, const ErrorRef& reason) {
              if (failed) failed("placeholder", app, reason ? reason->description() : "no reason given");
            }),
        _process(_boundary, *_files, options.mainBundleIdentifier),
        _fileSystem(_boundary, *_files, options.fileFailed),
        _propertyLists(_boundary, options.fileFailed),
        _systemLog(_boundary, options.log),
        _support(_boundary, _systemLog),
        _deviceService(
            _boundary, [this] { return settings().prioritizesTransfers; },
            [this] { return settings().cancelsTransfers; }, options.deviceService),
        _installCoordination(_engine, _coordinatorReports, _boundary, *_events),
        _workspace(_records, _engine, _registryReports, _boundary),
        _installer(_records, _boundary),
        _backup(_boundary, [this] { return settings(); }),
        _restrictions(_boundary, [this] { return settings(); }),
        _homeScreen(_records, _boundary,
                    [failed = options.fileFailed](const std::string& reason) {
                      if (failed) failed("setting the icon layout", platform::iconLayoutPath, reason);
                    }),
        _iconRenderer(_records, *_files, _boundary),
        _imageEncoder(_boundary),
        _transactionLog(_boundary),
        _notifications(_boundary, *_events,
                       [this](const std::string& name, std::uint64_t state) { keepNotificationState(name, state); }) {
    for (auto& journal : options.journals) _boundary.addJournal(std::move(journal));
    _boundary.setRules(std::move(options.rules));
    _boundary.setDecliner(std::move(options.declines));
    _boundary.setBystander([this](InjectionRule::Action action, const std::string& app) { stepIn(action, app); });
  }

  ~WholeDevice() override {
    _events->stop();
    WholeDevice::flush(nullptr);
    if (_recovers && _engine.isSettled()) noteClosed();
  }

  bool load(ErrorRef* error) {
    auto loaded = _records.load(error);
    if (!loaded || !makeDeviceDirectories(*_files, error)) return false;
    {
      Lock lock(_records);
      for (const auto& [name, state] : _records.state().notificationStates) _notifications.restoreState(name, state);
    }
    _engine.begin(std::move(*loaded), _recovers);
    return true;
  }

  const platform::Platform& platform() override { return _platform; }
  Boundary& boundary() override { return _boundary; }
  EventQueue& events() override { return *_events; }
  FileTree& files() override { return *_files; }

  DeviceStatus status() override {
    DeviceStatus status;
    status.coordinators = _engine.openCoordinators();
    status.syncing = _notifications.state(platform::syncNotificationName);
    Lock lock(_records);
    std::set<std::string_view> known;
    for (const auto& [id, app] : _records.state().apps) known.insert(id);
    for (const auto& [id, outcome] : _records.state().outcomes) known.insert(id);
    status.apps.reserve(known.size());
    for (auto id : known) status.apps.push_back(*_records.state().status(id));
    status.home = _records.state().homeOrder();
    status.pages = _records.state().layout.pages;
    return status;
  }

  std::optional<AppStatus> app(std::string_view id) override {
    Lock lock(_records);
    return _records.state().status(id);
  }

  bool set(std::string_view key, std::string_view value, ErrorRef* error) override {
    Settings checked;
    if (!changeSetting(checked, key, value, error)) return false;
    ChangeSet changes;
    changes.setSetting(key, value);
    Lock lock(_records);
    return _records.commit(std::move(changes), error);
  }
  std::string setting(std::string_view key) override { return textOfSetting(settings(), key); }

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
  void putOffInstalls() override { _engine.putOffInstalls(); }

 private:
  Settings settings() {
    Lock lock(_records);
    return _records.state().settings;
  }

  bool flush(ErrorRef* error) override {
    _engine.flush();
    return _records.flush(error);
  }

  /// What the next opening need not look after, if everything is on disk.
  void noteClosed() noexcept try {
    {
      Lock lock(_records);
      if (_records.saysClosed()) return;
    }
    ErrorRef error;
    if (!_files->isTidy() || !_files->syncItem(containersDirectory, &error)) return;
    ChangeSet changes;
    changes.setClosed();
    Lock lock(_records);
    _records.commit(std::move(changes), &error);
  } catch (const std::exception&) {
    // It is looked after, then.
  }

  void keepNotificationState(const std::string& name, std::uint64_t state) {
    ChangeSet changes;
    changes.setNotificationState(name, state);
    Lock lock(_records);
    // Everybody has been told already, so what the store refuses now goes into its next commit.
    _records.commitLater(std::move(changes));
    _records.commit({});
  }

  /// Somebody else does something in the middle of a call. What cannot be done at that moment is left out.
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

  const bool _recovers;
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
      .process = _process,
      .clock = _events->clock(),
      .fileSystem = _fileSystem,
      .propertyLists = _propertyLists,
      .systemLog = _systemLog,
      .support = _support,
      .deviceService = _deviceService,
      .installCoordination = _installCoordination,
      .workspace = _workspace,
      .installer = _installer,
      .backup = _backup,
      .restrictions = _restrictions,
      .homeScreen = _homeScreen,
      .iconRenderer = _iconRenderer,
      .imageEncoder = _imageEncoder,
      .transactionLog = _transactionLog,
      .notifications = _notifications,
  };
};

}  // namespace

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

std::unique_ptr<LocalDevice> makeMemoryDevice(std::unique_ptr<EventQueue> events, DeviceOptions options) {
  auto files = makeMemoryFileTree();
  auto store = makeMemoryStore();
  if (!makeDeviceParts(*files, *store)) return nullptr;
  return LocalDevice::open(std::move(files), std::move(store), std::move(events), std::move(options));
}

}  // namespace device
