#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string_view>
#include <vector>

#include "platform/RVAppInstallCoordinator.h"

namespace platform {

/// The kinds of coordinator.
enum class RVCoordinatorKind : std::uint8_t {
  RVAppInstallCoordinator,  // any kind; can be looked up, not created
  RVInitiatingAppInstallCoordinator,
  RVUpdatingAppInstallCoordinator,
  RVRestoringAppInstallCoordinator,
  RVRestoringDemotedAppInstallCoordinator,
};

/// The install-coordination service. There is at most one coordinator per app. Callable from any thread.
/// A factory answers null when the object cannot be made.
class InstallCoordination {
 public:
  virtual ~InstallCoordination() = default;

  /// Finds the app's coordinator, or creates one of the kind. A look-up through a concrete kind finds only that
  /// kind (another one there: null, with an error), through `RVAppInstallCoordinator` any. Null without an
  /// error when there is none and none is to be created. `created`, when given, tells whether it was made just now.
  /// What comes back may belong to another client.
  virtual std::shared_ptr<RVAppInstallCoordinator> coordinatorForAppWithBundleID(
      RVCoordinatorKind kind, std::string_view bundleID, RVClientIdentifier clientID, bool createIfNotExisting,
      bool* created = nullptr, ErrorRef* error = nullptr) = 0;

  /// Removes the app or placeholder and cancels its coordinator. The completion runs later, on the service's thread,
  /// with the reason of a failure or none. An app that is not there is a failure.
  virtual void uninstallAppWithBundleID(std::string_view bundleID, bool requestUserConfirmation,
                                        std::function<void(ErrorRef)> completion) = 0;

  virtual std::shared_ptr<RVPromisedTransferToPath> makePromisedTransferToPath(std::string_view name,
                                                                               RVClientIdentifier client,
                                                                               std::string_view transferPath,
                                                                               std::uint64_t diskSpaceNeeded) = 0;
  virtual std::shared_ptr<RVPromisedTransferToPath> makePromisedTransferToPathWithoutPath(
      std::string_view name, RVClientIdentifier client, std::uint64_t diskSpaceNeeded) = 0;
  virtual std::shared_ptr<RVPromisedOutOfBandTransfer> makePromisedOutOfBandTransfer(std::string_view name,
                                                                                     RVClientIdentifier client,
                                                                                     std::uint64_t diskSpaceNeeded) = 0;
  virtual std::shared_ptr<RVPlaceholder> makeAppPlaceholder(std::string_view bundleName, std::string_view bundleID,
                                                            std::uint64_t installType, RVClientIdentifier client) = 0;
  virtual std::shared_ptr<RVPlaceholderAttributes> makePlaceholderAttributes() = 0;
  /// The manifest: a dictionary, or absent.
  virtual std::shared_ptr<RVPlaceholderAttributes> makePlaceholderAttributesWithInfoPlistDictionary(
      const Value& manifest) = 0;

  /// The delegate is held weakly.
  virtual std::unique_ptr<RVAppInstallObserver> makeAppInstallObserver(
      std::string_view machServiceName, const std::vector<RVClientIdentifier>& clients,
      std::weak_ptr<RVAppInstallObserverDelegate> delegate) = 0;

  /// An error that the service can show to the person.
  virtual ErrorRef RVCreateUserPresentableError(std::int64_t code, std::int64_t second, const ErrorRef& underlying) = 0;
};

}  // namespace platform
