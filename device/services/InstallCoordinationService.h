#pragma once

#include <memory>
#include <vector>

#include "device/boundary/Boundary.h"
#include "device/events/EventQueue.h"
#include "device/install/InstallEngine.h"
#include "device/reports/CoordinatorReports.h"
#include "platform/InstallCoordination.h"

namespace device {

/// The install-coordination service. What it hands out refers to the device and does not outlive it.
class InstallCoordinationService final : public platform::InstallCoordination {
 public:
  InstallCoordinationService(InstallEngine& engine, CoordinatorReports& reports, Boundary& boundary, EventQueue& events)
      : _engine(engine), _reports(reports), _boundary(boundary), _events(events) {}

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
  InstallEngine& _engine;
  CoordinatorReports& _reports;
  Boundary& _boundary;
  EventQueue& _events;
};

}  // namespace device
