#include "device/services/RegistryService.h"

#include <vector>

#include "platform/OBNumbers.h"

namespace device {

namespace bundleType = platform::bundleType;

namespace {

constexpr const char* className = "OBApplicationWorkspace";
using Lock = AppRecords::Lock;

}  // namespace

void RegistryService::addObserver(std::weak_ptr<platform::OBApplicationWorkspaceObserverProtocol> observer) {
  auto alive = observer.lock();
  _boundary.call({{className, "addObserver"}}, nullptr, {{"observer", alive}}, [&] { _reports.addObserver(observer); });
}

void RegistryService::removeObserver(const platform::OBApplicationWorkspaceObserverProtocol* observer) {
  _boundary.call({{className, "removeObserver"}}, nullptr,
                 {CallArgument::object("observer", "observer", wholeObject(observer))},
                 [&] { _reports.removeObserver(observer); });
}

bool RegistryService::applicationIsInstalled(std::string_view bundleIdentifier) {
  return _boundary.call({{className, "applicationIsInstalled"}, bundleIdentifier}, nullptr,
                        {{"bundleIdentifier", bundleIdentifier}}, [&] {
                          Lock lock(_records);
                          const auto* app = _records.state().app(bundleIdentifier);
                          return app && !app->isPlaceholder;
                        });
}

void RegistryService::enumerateBundlesOfType(
    std::uint64_t type, const std::function<void(const platform::OBBundleProxyRef& bundle, bool& stop)>& block) {
  auto bundles = _boundary.call({{className, "enumerateBundlesOfType"}}, nullptr, {{"type", type}}, [&] {
    std::vector<platform::OBBundleProxyRef> listed;
    Lock lock(_records);
    for (const auto& [id, app] : _records.state().apps) {
      // Every bundle of this device is an application.
      bool isMeant = type == bundleType::every || type == bundleType::applications ||
                     (type == bundleType::systemBundles && app.systemBundle);
      if (isMeant) listed.push_back(app.proxy);
    }
    return listed;
  });
  // The block is the caller's own, on its own thread; what it does is not part of the call.
  bool stop = false;
  for (const auto& bundle : bundles) {
    block(bundle, stop);
    if (stop) break;
  }
}

bool RegistryService::uninstallApplication(std::string_view bundleIdentifier) {
  return _boundary.call({{className, "uninstallApplication"}, bundleIdentifier}, nullptr,
                        {{"bundleIdentifier", bundleIdentifier}},
                        [&] { return _engine.uninstall(bundleIdentifier, nullptr); });
}

platform::OBApplicationProxyRef RegistryService::applicationProxyForIdentifier(std::string_view bundleIdentifier,
                                                                               bool placeholder) {
  return _boundary.call({{className, "applicationProxyForIdentifier"}, bundleIdentifier}, nullptr,
                        {{"bundleIdentifier", bundleIdentifier}, {"placeholder", placeholder}},
                        [&]() -> platform::OBApplicationProxyRef {
                          Lock lock(_records);
                          const auto* app = _records.state().app(bundleIdentifier);
                          return app && app->isPlaceholder == placeholder ? app->proxy : nullptr;
                        });
}

}  // namespace device
