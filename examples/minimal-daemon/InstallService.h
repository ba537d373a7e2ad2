#pragma once

#include <functional>
#include <map>
#include <string>
#include <vector>

#include "Coordinator.h"
#include "EventQueue.h"
#include "InstallerService.h"
#include "MemoryFiles.h"
#include "Registry.h"
#include "platform/InstallCoordination.h"
#include "platform/Mutex.h"

namespace tiny {

/// Installs apps: from the first placeholder to what the registry says afterwards.
///
/// A package of this device is the app's "Info.plist", a property list, and nothing else: an app that is installed is
/// one that is listed. New apps and updates are what it does; it restores nothing.
class InstallService final : public platform::InstallCoordination {
 public:
  InstallService(EventQueue& queue, MemoryFiles& files, Registry& registry, InstallerService& installer);

  /// Held over a change of an install and of what the registry shows of it, so that the two agree.
  platform::Mutex& changes() { return _changes; }

  // What coordinators tell; of a placeholder while they hold `changes()`.
  void placeholderAttached(const std::shared_ptr<Coordinator>& coordinator, Placeholder& placeholder);
  void packageBegan(const std::shared_ptr<Coordinator>& coordinator);
  void packageArrived(const std::shared_ptr<Coordinator>& coordinator);
  bool cancel(const std::shared_ptr<Coordinator>& coordinator, const platform::ErrorRef& reason,
              platform::RVClientIdentifier client);

  std::shared_ptr<platform::RVAppInstallCoordinator> coordinatorForAppWithBundleID(
      platform::RVCoordinatorKind kind, std::string_view bundleID, platform::RVClientIdentifier clientID,
      bool createIfNotExisting, bool* created, platform::ErrorRef* error) override;
  void uninstallAppWithBundleID(std::string_view bundleID, bool requestUserConfirmation,
                                std::function<void(platform::ErrorRef)> completion) override;
  std::shared_ptr<platform::RVPromisedTransferToPath> makePromisedTransferToPath(
      std::string_view name, platform::RVClientIdentifier client, std::string_view transferPath,
      std::uint64_t diskSpaceNeeded) override;
  std::shared_ptr<platform::RVPromisedTransferToPath> makePromisedTransferToPathWithoutPath(
      std::string_view name, platform::RVClientIdentifier client, std::uint64_t diskSpaceNeeded) override;
  std::shared_ptr<platform::RVPromisedOutOfBandTransfer> makePromisedOutOfBandTransfer(
      std::string_view name, platform::RVClientIdentifier client, std::uint64_t diskSpaceNeeded) override;
  std::shared_ptr<platform::RVPlaceholder> makeAppPlaceholder(std::string_view bundleName, std::string_view bundleID,
                                                              std::uint64_t installType,
                                                              platform::RVClientIdentifier client) override;
  std::shared_ptr<platform::RVPlaceholderAttributes> makePlaceholderAttributes() override;
  std::shared_ptr<platform::RVPlaceholderAttributes> makePlaceholderAttributesWithInfoPlistDictionary(
      const platform::Value& manifest) override;
  std::unique_ptr<platform::RVAppInstallObserver> makeAppInstallObserver(
      std::string_view machServiceName, const std::vector<platform::RVClientIdentifier>& clients,
      std::weak_ptr<platform::RVAppInstallObserverDelegate> delegate) override;
  platform::ErrorRef RVCreateUserPresentableError(std::int64_t code, std::int64_t second,
                                                  const platform::ErrorRef& underlying) override;

 private:
  using Delegate = platform::RVAppInstallObserverDelegate;
  struct Registration;
  class ObserverHandle;

  /// Tells the coordinator's observer, or who observes its client, as an event.
  void tell(const std::shared_ptr<Coordinator>& coordinator, std::function<void(Delegate&)> callback);
  void install(const std::shared_ptr<Coordinator>& coordinator);
  platform::ErrorRef unpack(Coordinator& coordinator);
  /// With _changes held.
  bool endByCancelling(const std::shared_ptr<Coordinator>& coordinator, const platform::ErrorRef& reason,
                       platform::RVClientIdentifier client);
  std::shared_ptr<Coordinator> openCoordinator(std::string_view app);
  void forget(const Coordinator& coordinator);
  void showNothingOfInstall(const std::string& app);
  bool uninstall(std::string_view app);

  EventQueue& _queue;
  MemoryFiles& _files;
  Registry& _registry;
  InstallerService& _installer;
  platform::Mutex _changes;  // before _mutex
  platform::Mutex _mutex;
  // Guarded by _mutex.
  std::map<std::string, std::shared_ptr<Coordinator>, std::less<>> _open;
  std::vector<std::shared_ptr<Registration>> _registrations;
};

}  // namespace tiny
