#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string_view>
#include <vector>

#include "platform/OBApplicationProxy.h"

namespace platform {

/// What the registry reports. Calls arrive on the registry's thread, to one observer one at a time, none while
/// the registry holds a lock. Every operation is optional.
class OBApplicationWorkspaceObserverProtocol {
 public:
  virtual ~OBApplicationWorkspaceObserverProtocol() = default;

  /// Every install that runs, and every one that is paused. A newly added observer gets a first report of its own.
  virtual void applicationInstallsArePrioritized(const std::vector<OBApplicationProxyRef>& /*prioritized*/,
                                                 const std::vector<OBApplicationProxyRef>& /*paused*/) {}
  virtual void applicationInstallsDidCancel(const std::vector<OBApplicationProxyRef>& /*applications*/) {}
};

/// Base of observers that want only some of the reports.
class OBApplicationWorkspaceObserver : public OBApplicationWorkspaceObserverProtocol {};

/// The application registry. Callable from any thread; an enumeration hands out a snapshot, so that its block may
/// call the registry.
class OBApplicationWorkspace {
 public:
  virtual ~OBApplicationWorkspace() = default;

  /// Held weakly, known by its address. The first report comes after this has returned.
  virtual void addObserver(std::weak_ptr<OBApplicationWorkspaceObserverProtocol> observer) = 0;
  /// When this has returned, no report to the observer runs or starts; called from the thread that is delivering
  /// to it, it returns without waiting for itself. An unknown observer is ignored.
  virtual void removeObserver(const OBApplicationWorkspaceObserverProtocol* observer) = 0;

  virtual bool applicationIsInstalled(std::string_view bundleIdentifier) = 0;
  /// Calls the block once per registered bundle of the type, on the caller's thread, until it sets `stop`.
  /// Type 0 is everything, type 1 applications of every application type, type 7 system bundles.
  virtual void enumerateBundlesOfType(std::uint64_t type,
                                      const std::function<void(const OBBundleProxyRef& bundle, bool& stop)>& block) = 0;
  /// Removes the app or placeholder. True when it is gone. There are no options.
  virtual bool uninstallApplication(std::string_view bundleIdentifier) = 0;
  /// Null when the registry has no such app, or none of that sort.
  virtual OBApplicationProxyRef applicationProxyForIdentifier(std::string_view bundleIdentifier, bool placeholder) = 0;
};

}  // namespace platform
