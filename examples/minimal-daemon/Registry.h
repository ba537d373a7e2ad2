#pragma once

#include <functional>
#include <map>
#include <string>
#include <vector>

#include "EventQueue.h"
#include "platform/Mutex.h"
#include "platform/OBApplicationWorkspace.h"

namespace tiny {

/// The apps of the device and who is told of their installs.
class Registry final : public platform::OBApplicationWorkspace {
 public:
  explicit Registry(EventQueue& queue) : _queue(queue) {}

  // What the install service does here; it tells the observers by `report…` afterwards.
  platform::OBApplicationProxyRef find(std::string_view app);
  void put(platform::OBApplicationProxy app);
  void remove(std::string_view app);
  void reportInstalls();
  void reportCancelled(const platform::OBApplicationProxyRef& app);
  void setUninstaller(std::function<bool(std::string_view)> uninstall) { _uninstall = std::move(uninstall); }

  void addObserver(std::weak_ptr<platform::OBApplicationWorkspaceObserverProtocol> observer) override;
  void removeObserver(const platform::OBApplicationWorkspaceObserverProtocol* observer) override;
  bool applicationIsInstalled(std::string_view bundleIdentifier) override;
  void enumerateBundlesOfType(
      std::uint64_t type,
      const std::function<void(const platform::OBBundleProxyRef& bundle, bool& stop)>& block) override;
  bool uninstallApplication(std::string_view bundleIdentifier) override { return _uninstall(bundleIdentifier); }
  platform::OBApplicationProxyRef applicationProxyForIdentifier(std::string_view bundleIdentifier,
                                                                bool placeholder) override;

 private:
  using Observer = platform::OBApplicationWorkspaceObserverProtocol;
  struct Registration {
    const Observer* address;
    std::weak_ptr<Observer> observer;
  };
  using Report = std::function<void(Observer&)>;

  void tell(const Observer* address, const Report& report);
  Report installsNow();

  EventQueue& _queue;
  std::function<bool(std::string_view)> _uninstall;
  platform::Mutex _mutex;
  // Guarded by _mutex.
  std::map<std::string, platform::OBApplicationProxyRef, std::less<>> _apps;
  std::vector<Registration> _observers;
};

}  // namespace tiny
