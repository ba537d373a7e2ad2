#include "InstallService.h"

#include <algorithm>

#include "plist/PropertyList.h"

namespace tiny {

using platform::ErrorRef;
using platform::OBApplicationProxy;
using Kind = platform::RVCoordinatorKind;
using Client = platform::RVClientIdentifier;

namespace {

std::string containerOf(const std::string& app) { return "/var/containers/" + app; }
std::string bundleOf(const std::string& app) { return containerOf(app) + '/' + app + ".app"; }

constexpr std::uint64_t active = 1, loading = 0, installing = 1;

bool isFileName(std::string_view app) { return !app.empty() && app.find('/') == app.npos && app.front() != '.'; }

}  // namespace

struct InstallService::Registration {
  std::vector<Client> clients;
  std::weak_ptr<Delegate> delegate;
};

/// Takes its registration away, and lets a callback that runs end first.
class InstallService::ObserverHandle final : public platform::RVAppInstallObserver {
 public:
  ObserverHandle(InstallService& service, std::shared_ptr<Registration> registration)
      : _service(service), _registration(std::move(registration)) {}
  ~ObserverHandle() override {
    {
      platform::Mutex::Lock lock(_service._mutex);
      auto& all = _service._registrations;
      all.erase(std::remove(all.begin(), all.end(), _registration), all.end());
    }
    EventQueue::NoneRuns noneRuns(_service._queue);
  }

 private:
  InstallService& _service;
  std::shared_ptr<Registration> _registration;
};

InstallService::InstallService(EventQueue& queue, MemoryFiles& files, Registry& registry, InstallerService& installer)
    : _queue(queue), _files(files), _registry(registry), _installer(installer) {
  registry.setUninstaller([this](std::string_view app) { return uninstall(app); });
}

void InstallService::tell(const std::shared_ptr<Coordinator>& coordinator, std::function<void(Delegate&)> callback) {
  _queue.post([this, coordinator, callback = std::move(callback)] {
    if (auto observer = coordinator->observer().lock()) return callback(*observer);
    std::vector<std::shared_ptr<Delegate>> delegates;
    {
      platform::Mutex::Lock lock(_mutex);
      for (const auto& each : _registrations) {
        bool isMeant = std::count(each->clients.begin(), each->clients.end(), coordinator->creatorIdentifier()) > 0;
        if (auto delegate = isMeant ? each->delegate.lock() : nullptr) delegates.push_back(delegate);
      }
    }
    for (const auto& delegate : delegates) callback(*delegate);
  });
}

void InstallService::placeholderAttached(const std::shared_ptr<Coordinator>& coordinator, Placeholder& placeholder) {
  const std::string& app = coordinator->app;
  OBApplicationProxy shown;
  if (auto known = _registry.find(app)) {
    shown = *known;
  } else {
    shown.applicationIdentifier = shown.bundleIdentifier = app;
    shown.bundleVersion = placeholder.version();
    shown.applicationType = "User";
    shown.isPlaceholder = true;
    shown.installType = placeholder.installType;
    shown.bundleContainerURL = containerOf(app);
    shown.bundleURL = bundleOf(app);
  }
  shown.installProgressSync = platform::OBInstallProgress{active, loading};
  _registry.put(std::move(shown));
  _registry.reportInstalls();
  tell(coordinator, [coordinator](Delegate& delegate) { delegate.coordinatorDidInstallPlaceholder(coordinator); });
}

void InstallService::packageBegan(const std::shared_ptr<Coordinator>& coordinator) {
  tell(coordinator, [](Delegate& delegate) { delegate.promiseDidBeginFulfillmentWithIdentifier(1); });
}

void InstallService::packageArrived(const std::shared_ptr<Coordinator>& coordinator) {
  platform::Mutex::Lock changing(_changes);
  if (auto known = _registry.find(coordinator->app)) {
    OBApplicationProxy shown = *known;
    shown.installProgressSync = platform::OBInstallProgress{active, installing};
    _registry.put(std::move(shown));
    _registry.reportInstalls();
  }
  _queue.post([this, coordinator] { install(coordinator); });
}

/// The reason when the package is not what it should be.
ErrorRef InstallService::unpack(Coordinator& coordinator) {
  const std::string& app = coordinator.app;
  ErrorRef error;
  auto bytes = _files.readFile(coordinator.package()->path(), &error);
  if (!bytes) return error;
  platform::Value manifest = plist::read(*bytes, &error);
  if (!manifest.dictionary()) return error ? error : platform::makeError("TinyInstalls", 5, app + ": no manifest");
  if ((*manifest.dictionary())["KBBundleIdentifier"].string() != app) {
    return platform::makeError("TinyInstalls", 6, app + ": the package of another app");
  }
  if (!_files.createDirectory(bundleOf(app), true, {}, &error)) return error;
  if (!_files.writeAtomically(bundleOf(app) + "/Info.plist", *bytes, &error)) return error;
  OBApplicationProxy installed;
  installed.applicationIdentifier = installed.bundleIdentifier = app;
  if (auto version = (*manifest.dictionary())["KBBundleVersion"].string()) installed.bundleVersion = *version;
  installed.applicationType = "User";
  installed.isInstalled = true;
  if (auto known = _registry.find(app)) installed.installType = known->installType;
  installed.bundleContainerURL = containerOf(app);
  installed.bundleURL = bundleOf(app);
  installed.diskUsage.staticUsage = bytes->size();
  _registry.put(std::move(installed));
  _files.removeItem(coordinator.package()->path());
  _installer.forget(app);
  return nullptr;
}

void InstallService::install(const std::shared_ptr<Coordinator>& coordinator) {
  platform::Mutex::Lock changing(_changes);
  if (openCoordinator(coordinator->app) != coordinator) return;  // cancelled meanwhile
  ErrorRef failure = unpack(*coordinator);
  if (!coordinator->end(failure)) return;
  forget(*coordinator);
  if (failure) showNothingOfInstall(coordinator->app);
  _registry.reportInstalls();
  tell(coordinator, [coordinator](Delegate& delegate) { delegate.coordinatorDidCompleteSuccessfully(coordinator); });
}

std::shared_ptr<Coordinator> InstallService::openCoordinator(std::string_view app) {
  platform::Mutex::Lock lock(_mutex);
  auto open = _open.find(app);
  return open == _open.end() ? nullptr : open->second;
}

void InstallService::forget(const Coordinator& coordinator) {
  platform::Mutex::Lock lock(_mutex);
  auto open = _open.find(coordinator.app);
  if (open != _open.end() && open->second.get() == &coordinator) _open.erase(open);
}

/// What was shown of an install that came to nothing: a placeholder goes, an app stays as it was.
void InstallService::showNothingOfInstall(const std::string& app) {
  auto known = _registry.find(app);
  if (!known) return;
  if (known->isPlaceholder) return _registry.remove(app);
  OBApplicationProxy shown = *known;
  shown.installProgressSync.reset();
  _registry.put(std::move(shown));
}

bool InstallService::cancel(const std::shared_ptr<Coordinator>& coordinator, const ErrorRef& reason, Client client) {
  platform::Mutex::Lock changing(_changes);
  return endByCancelling(coordinator, reason, client);
}

bool InstallService::endByCancelling(const std::shared_ptr<Coordinator>& coordinator, const ErrorRef& reason,
                                     Client client) {
  auto failure = reason ? reason : platform::makeError("TinyInstalls", 7, coordinator->app + ": cancelled");
  if (!coordinator->end(failure)) return false;
  forget(*coordinator);
  auto known = _registry.find(coordinator->app);
  if (known && known->installProgressSync) {
    showNothingOfInstall(coordinator->app);
    _registry.reportCancelled(known);
    _registry.reportInstalls();
  }
  tell(coordinator, [coordinator, failure, client](Delegate& delegate) {
    delegate.coordinatorCanceledWithReason(coordinator, failure, client);
  });
  return true;
}

std::shared_ptr<platform::RVAppInstallCoordinator> InstallService::coordinatorForAppWithBundleID(
    Kind kind, std::string_view bundleID, Client clientID, bool createIfNotExisting, bool* created, ErrorRef* error) {
  auto refuse = [&](const char* reason) {
    platform::setError(error, platform::makeError("TinyInstalls", 8, std::string(bundleID) + ": " + reason));
    return nullptr;
  };
  if (created) *created = false;
  platform::setError(error, nullptr);
  platform::Mutex::Lock lock(_mutex);
  auto open = _open.find(bundleID);
  if (open != _open.end()) {
    bool isMeant = kind == Kind::RVAppInstallCoordinator || kind == open->second->kind;
    if (!isMeant) return refuse("its coordinator is of another kind");
    return open->second;
  }
  if (!createIfNotExisting) return nullptr;
  if (kind != Kind::RVInitiatingAppInstallCoordinator && kind != Kind::RVUpdatingAppInstallCoordinator) {
    return refuse("this device installs and updates apps, nothing else");
  }
  if (!isFileName(bundleID)) return refuse("no app's identifier");
  auto coordinator = std::make_shared<Coordinator>(*this, kind, std::string(bundleID), clientID);
  _open.emplace(bundleID, coordinator);
  if (created) *created = true;
  return coordinator;
}

bool InstallService::uninstall(std::string_view id) {
  std::string app(id);
  platform::Mutex::Lock changing(_changes);
  if (!_registry.find(app)) return false;
  if (auto coordinator = openCoordinator(app)) endByCancelling(coordinator, nullptr, 0);
  _registry.remove(app);
  _files.removeItem(containerOf(app));
  _installer.note(app);
  return true;
}

void InstallService::uninstallAppWithBundleID(std::string_view bundleID, bool,
                                              std::function<void(ErrorRef)> completion) {
  ErrorRef failure;
  if (!uninstall(bundleID)) failure = platform::makeError("TinyInstalls", 9, std::string(bundleID) + ": no such app");
  _queue.post([completion = std::move(completion), failure] { completion(failure); });
}

std::shared_ptr<platform::RVPromisedTransferToPath> InstallService::makePromisedTransferToPath(
    std::string_view name, Client, std::string_view transferPath, std::uint64_t) {
  return std::make_shared<FilePromise>(std::string(name), std::string(transferPath));
}

std::shared_ptr<platform::RVPromisedTransferToPath> InstallService::makePromisedTransferToPathWithoutPath(
    std::string_view name, Client, std::uint64_t) {
  return std::make_shared<FilePromise>(std::string(name), "");
}

std::shared_ptr<platform::RVPromisedOutOfBandTransfer> InstallService::makePromisedOutOfBandTransfer(
    std::string_view name, Client, std::uint64_t) {
  return std::make_shared<DataPromise>(std::string(name));
}

std::shared_ptr<platform::RVPlaceholder> InstallService::makeAppPlaceholder(std::string_view bundleName,
                                                                            std::string_view bundleID,
                                                                            std::uint64_t installType, Client) {
  return std::make_shared<Placeholder>(std::string(bundleName), std::string(bundleID), installType);
}

std::shared_ptr<platform::RVPlaceholderAttributes> InstallService::makePlaceholderAttributes() {
  return std::make_shared<Attributes>();
}

std::shared_ptr<platform::RVPlaceholderAttributes> InstallService::makePlaceholderAttributesWithInfoPlistDictionary(
    const platform::Value&) {
  return std::make_shared<Attributes>();
}

std::unique_ptr<platform::RVAppInstallObserver> InstallService::makeAppInstallObserver(
    std::string_view, const std::vector<Client>& clients, std::weak_ptr<Delegate> delegate) {
  auto registration = std::make_shared<Registration>(Registration{clients, std::move(delegate)});
  platform::Mutex::Lock lock(_mutex);
  _registrations.push_back(registration);
  return std::make_unique<ObserverHandle>(*this, std::move(registration));
}

ErrorRef InstallService::RVCreateUserPresentableError(std::int64_t code, std::int64_t, const ErrorRef& underlying) {
  return platform::makeError("TinyInstalls", code, "the app was not installed", underlying);
}

}  // namespace tiny
