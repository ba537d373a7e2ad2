#include "device/services/InstallCoordinationService.h"

#include <string>
#include <utility>

#include "device/coordination/LocalPlaceholder.h"
#include "device/coordination/LocalPlaceholderAttributes.h"
#include "device/coordination/LocalPromise.h"
#include "device/install/AppIdentifier.h"

namespace device {

namespace {

using platform::ErrorRef;
using platform::RVClientIdentifier;

constexpr const char* className = "InstallCoordination";

}  // namespace

std::string_view appOfPromise(std::string_view name) { return name.substr(0, name.rfind('-')); }

std::shared_ptr<platform::RVAppInstallCoordinator> InstallCoordinationService::coordinatorForAppWithBundleID(
    platform::RVCoordinatorKind kind, std::string_view bundleID, RVClientIdentifier clientID, bool createIfNotExisting,
    bool* created, ErrorRef* error) {
  bool isNew = false;
  auto coordinator =
      _boundary.call({{className, "coordinatorForAppWithBundleID"}, bundleID}, error,
                     {{"kind", nameOfKind(kind)},
                      {"bundleID", bundleID},
                      {"clientID", clientID},
                      {"createIfNotExisting", createIfNotExisting}},
                     [&]() -> std::shared_ptr<platform::RVAppInstallCoordinator> {
                       return _engine.coordinatorForApp(kind, bundleID, clientID, createIfNotExisting, isNew, error);
                     });
  if (created) *created = isNew;
  return coordinator;
}

void InstallCoordinationService::uninstallAppWithBundleID(std::string_view bundleID, bool requestUserConfirmation,
                                                          std::function<void(ErrorRef)> completion) {
  ErrorRef failure, outcome;
  _boundary.call({{className, "uninstallAppWithBundleID"}, bundleID}, &failure,
                 {{"bundleID", bundleID}, {"requestUserConfirmation", requestUserConfirmation}}, [&] {
                   _engine.uninstall(bundleID, &outcome);
                   return true;
                 });
  if (!completion) return;
  if (failure) outcome = failure;
  // The completion waits for the caller's next call, like everything that this call causes.
  EventQueue::InsideCall inside;
  _events.post(Lane::coordination, [this, app = std::string(bundleID), completion = std::move(completion), outcome] {
    _boundary.enter({{"AppsClient", "uninstallCompletion"}, app}, {{"error", outcome}}, [&] { completion(outcome); });
  });
}

std::shared_ptr<platform::RVPromisedTransferToPath> InstallCoordinationService::makePromisedTransferToPath(
    std::string_view name, RVClientIdentifier client, std::string_view transferPath, std::uint64_t diskSpaceNeeded) {
  return _boundary.call(
      {{className, "makePromisedTransferToPath"}, appOfPromise(name)}, nullptr,
      {{"name", name}, {"client", client}, {"transferPath", transferPath}, {"diskSpaceNeeded", diskSpaceNeeded}},
      [&]() -> std::shared_ptr<platform::RVPromisedTransferToPath> {
        return std::make_shared<LocalTransferPromise>(
            _engine, _boundary, _engine.makePromise(name, client, diskSpaceNeeded, std::string(transferPath)));
      });
}

std::shared_ptr<platform::RVPromisedTransferToPath> InstallCoordinationService::makePromisedTransferToPathWithoutPath(
    std::string_view name, RVClientIdentifier client, std::uint64_t diskSpaceNeeded) {
  return _boundary.call({{className, "makePromisedTransferToPathWithoutPath"}, appOfPromise(name)}, nullptr,
                        {{"name", name}, {"client", client}, {"diskSpaceNeeded", diskSpaceNeeded}},
                        [&]() -> std::shared_ptr<platform::RVPromisedTransferToPath> {
                          return std::make_shared<LocalTransferPromise>(
                              _engine, _boundary, _engine.makePromise(name, client, diskSpaceNeeded, std::nullopt));
                        });
}

std::shared_ptr<platform::RVPromisedOutOfBandTransfer> InstallCoordinationService::makePromisedOutOfBandTransfer(
    std::string_view name, RVClientIdentifier client, std::uint64_t diskSpaceNeeded) {
  return _boundary.call({{className, "makePromisedOutOfBandTransfer"}, appOfPromise(name)}, nullptr,
                        {{"name", name}, {"client", client}, {"diskSpaceNeeded", diskSpaceNeeded}},
                        [&]() -> std::shared_ptr<platform::RVPromisedOutOfBandTransfer> {
                          return std::make_shared<LocalOutOfBandPromise>(
                              _engine, _boundary, _engine.makePromise(name, client, diskSpaceNeeded, std::nullopt));
                        });
}

std::shared_ptr<platform::RVPlaceholder> InstallCoordinationService::makeAppPlaceholder(std::string_view bundleName,
                                                                                        std::string_view bundleID,
                                                                                        std::uint64_t installType,
                                                                                        RVClientIdentifier client) {
  return _boundary.call(
      {{className, "makeAppPlaceholder"}, bundleID}, nullptr,
      {{"bundleName", bundleName}, {"bundleID", bundleID}, {"installType", installType}, {"client", client}},
      [&]() -> std::shared_ptr<platform::RVPlaceholder> {
        if (!isAppIdentifier(bundleID)) return nullptr;
        PlaceholderRecord record;
        record.name = std::string(bundleName);
        record.app = std::string(bundleID);
        record.installType = installType;
        record.client = client;
        return std::make_shared<LocalPlaceholder>(_engine, _boundary, std::move(record));
      });
}

std::shared_ptr<platform::RVPlaceholderAttributes> InstallCoordinationService::makePlaceholderAttributes() {
  return _boundary.call({{className, "makePlaceholderAttributes"}}, nullptr, {},
                        [&]() -> std::shared_ptr<platform::RVPlaceholderAttributes> {
                          return std::make_shared<LocalPlaceholderAttributes>(_boundary, platform::Value());
                        });
}

std::shared_ptr<platform::RVPlaceholderAttributes>
InstallCoordinationService::makePlaceholderAttributesWithInfoPlistDictionary(const platform::Value& manifest) {
  return _boundary.call({{className, "makePlaceholderAttributesWithInfoPlistDictionary"}}, nullptr,
                        {{"manifest", manifest}}, [&]() -> std::shared_ptr<platform::RVPlaceholderAttributes> {
                          return std::make_shared<LocalPlaceholderAttributes>(_boundary, manifest);
                        });
}

std::unique_ptr<platform::RVAppInstallObserver> InstallCoordinationService::makeAppInstallObserver(
    std::string_view machServiceName, const std::vector<RVClientIdentifier>& clients,
    std::weak_ptr<platform::RVAppInstallObserverDelegate> delegate) {
  std::vector<std::string> numbers;
  for (auto client : clients) numbers.push_back(std::to_string(client));
  auto alive = delegate.lock();
  return _boundary.call({{className, "makeAppInstallObserver"}}, nullptr,
                        {{"machServiceName", machServiceName}, {"clients", numbers}, {"delegate", alive}},
                        [&] { return _reports.makeObserver(clients, delegate); });
}

ErrorRef InstallCoordinationService::RVCreateUserPresentableError(std::int64_t code, std::int64_t second,
                                                                  const ErrorRef& underlying) {
  return _boundary.call({{className, "RVCreateUserPresentableError"}}, nullptr,
                        {{"code", code}, {"second", second}, {"underlying", underlying}}, [&] {
                          return platform::makeError("RVUserPresentableError", code,
                                                     underlying ? underlying->description() : std::string(),
                                                     underlying);
                        });
}

}  // namespace device
