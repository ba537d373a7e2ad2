#include "tests/ScriptedServices.h"

#include <cstdlib>
#include <cstring>
#include <stdexcept>

#include "platform/OBNumbers.h"

namespace tests {

void ScriptedRegistry::addObserver(std::weak_ptr<Observer> observer) {
  if (!isSilent) _registry.addObserver(observer);
  if (auto alive = observer.lock()) {
    for (const auto& [prioritized, paused] : reports) alive->applicationInstallsArePrioritized(prioritized, paused);
  }
}

void ScriptedRegistry::removeObserver(const Observer* observer) {
  if (!isSilent) _registry.removeObserver(observer);
}

void ScriptedRegistry::enumerateBundlesOfType(
    std::uint64_t type, const std::function<void(const platform::OBBundleProxyRef&, bool&)>& block) {
  _registry.enumerateBundlesOfType(type, block);
  if (type == platform::bundleType::systemBundles && !areOfTheSystem) return;
  bool stop = false;
  for (const auto& bundle : bundles) block(bundle, stop);
}

platform::OBApplicationProxyRef ScriptedRegistry::applicationProxyForIdentifier(std::string_view identifier,
                                                                                bool placeholder) {
  auto found = proxies.find(std::string(identifier));
  return found == proxies.end() ? _registry.applicationProxyForIdentifier(identifier, placeholder) : found->second;
}

int ScriptedHomeScreen::PNGetFlattenedIconState(Port, int, void** buffer, std::size_t* length) {
  *buffer = std::malloc(_order.size() + 1);
  std::memcpy(*buffer, _order.data(), _order.size());
  *length = _order.size();
  return 0;
}

void HastyDaemon::prioritizeAsset(const platform::TSAssetRef& asset,
                                  std::function<void(platform::ErrorRef)> completion) {
  asked.push_back(asset->identifier());
  completion(nullptr);
}

void HastyDaemon::cancelAssetTransferForFailedAsset(const platform::TSAssetRef& asset) {
  asked.push_back(asset->identifier());
  if (cancelled) cancelled(asset);
}

bool BrokenClock::waitUntil(platform::Mutex&, platform::Condition&, Instant, const std::function<bool()>&) {
  throw std::runtime_error("a clock that throws");
}

platform::Platform scripted(const platform::Platform& whole, const Scripted& services) {
  return {whole.process,
          services.clock ? *services.clock : whole.clock,
          whole.fileSystem,
          whole.propertyLists,
          whole.systemLog,
          whole.support,
          services.deviceService ? *services.deviceService : whole.deviceService,
          whole.installCoordination,
          services.workspace ? *services.workspace : whole.workspace,
          whole.installer,
          whole.backup,
          whole.restrictions,
          services.homeScreen ? *services.homeScreen : whole.homeScreen,
          whole.iconRenderer,
          whole.imageEncoder,
          whole.transactionLog,
          whole.notifications};
}

}  // namespace tests
