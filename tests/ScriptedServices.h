#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "platform/Clock.h"
#include "platform/HomeScreen.h"
#include "platform/OBApplicationProxy.h"
#include "platform/OBApplicationWorkspace.h"
#include "platform/Platform.h"
#include "platform/TSDeviceService.h"

namespace tests {

/// The device's registry, which says besides what the device would not.
class ScriptedRegistry final : public platform::OBApplicationWorkspace {
 public:
  using Proxies = std::vector<platform::OBApplicationProxyRef>;
  using Observer = platform::OBApplicationWorkspaceObserverProtocol;

  explicit ScriptedRegistry(platform::OBApplicationWorkspace& registry) : _registry(registry) {}

  std::vector<platform::OBBundleProxyRef> bundles{};                 // of every type, after the device's own
  bool areOfTheSystem = true;                                        // listed among the system's, too
  std::map<std::string, platform::OBApplicationProxyRef> proxies{};  // in place of the device's
  std::vector<std::pair<Proxies, Proxies>> reports{};                // made to an observer while it is added
  bool isSilent = false;                                             // the device's own reports do not come

  void addObserver(std::weak_ptr<Observer> observer) override;
  void removeObserver(const Observer* observer) override;
  bool applicationIsInstalled(std::string_view identifier) override {
    return _registry.applicationIsInstalled(identifier);
  }
  void enumerateBundlesOfType(std::uint64_t type,
                              const std::function<void(const platform::OBBundleProxyRef&, bool&)>& block) override;
  bool uninstallApplication(std::string_view identifier) override { return _registry.uninstallApplication(identifier); }
  platform::OBApplicationProxyRef applicationProxyForIdentifier(std::string_view identifier, bool placeholder) override;

 private:
  platform::OBApplicationWorkspace& _registry;
};

/// The device's home screen, whose order is the bytes that are given here.
class ScriptedHomeScreen final : public platform::HomeScreen {
 public:
  ScriptedHomeScreen(platform::HomeScreen& screen, std::string order) : _screen(screen), _order(std::move(order)) {}

  Port PNSPanelloBlockableServerPort() override { return _screen.PNSPanelloBlockableServerPort(); }
  int PNGetFlattenedIconState(Port port, int form, void** buffer, std::size_t* length) override;
  int PNSetIconState(Port port, platform::BytesView layout) override { return _screen.PNSetIconState(port, layout); }

 private:
  platform::HomeScreen& _screen;
  const std::string _order;
};

/// A daemon that is done with an asset before its call for it returns.
class HastyDaemon final : public platform::TSDeviceService {
 public:
  bool respondsToPrioritizeAsset() const override { return true; }
  void prioritizeAsset(const platform::TSAssetRef& asset, std::function<void(platform::ErrorRef)> completion) override;
  bool respondsToCancelAssetTransferForFailedAsset() const override { return true; }
  void cancelAssetTransferForFailedAsset(const platform::TSAssetRef& asset) override;

  std::function<void(const platform::TSAssetRef&)> cancelled{};
  std::vector<std::string> asked{};
};

/// A clock with which nobody can wait.
class BrokenClock final : public platform::Clock {
 public:
  Instant now() override { return {}; }
  bool waitUntil(platform::Mutex& mutex, platform::Condition& changed, Instant deadline,
                 const std::function<bool()>& satisfied) override;
};

/// The platform with others in the place of four services; absent ones stay.
struct Scripted {
  platform::Clock* clock = nullptr;
  platform::OBApplicationWorkspace* workspace = nullptr;
  platform::HomeScreen* homeScreen = nullptr;
  platform::TSDeviceService* deviceService = nullptr;
};
platform::Platform scripted(const platform::Platform& whole, const Scripted& services);

}  // namespace tests
