#pragma once

#include <string>

#include "device/records/AppRecords.h"
#include "device/reports/Coordinator.h"
#include "device/reports/CoordinatorReports.h"
#include "device/reports/RegistryReports.h"
#include "platform/ThreadSafety.h"

namespace device {

/// Who is told of a change, and in which order: coordinators' observers, the registry's, the device's owner. Nobody
/// before `start`: what is settled while a device is opened is not reported. The operations only post.
class InstallReports {
 public:
  InstallReports(AppRecords& records, RegistryReports& registry, CoordinatorReports& coordination)
      : _records(records), _registry(registry), _coordination(coordination) {}

  void start() REQUIRES(recordsGuard) { _tells = true; }
  bool hasStarted() const REQUIRES(recordsGuard) { return _tells; }

  /// Tells the owner alone how the app stands now.
  void appChanged(const std::string& app) REQUIRES(recordsGuard);
  void transferBegan(const CoordinatorRef& coordinator, std::uint64_t promise) REQUIRES(recordsGuard);
  /// An install began or entered another phase.
  void installsChanged(const std::string& app) REQUIRES(recordsGuard);
  void placeholderInstalled(const CoordinatorRef& coordinator, bool installsChanged) REQUIRES(recordsGuard);
  void installed(const CoordinatorRef& coordinator, const std::string& app) REQUIRES(recordsGuard);
  /// `shown` is the proxy of an install that the registry showed until now. It and the coordinator may be null.
  void cancelled(const CoordinatorRef& coordinator, const std::string& app,
                 const platform::OBApplicationProxyRef& shown, const platform::ErrorRef& reason,
                 platform::RVClientIdentifier client) REQUIRES(recordsGuard);
  void failed(const std::string& app, bool wasShown) REQUIRES(recordsGuard);
  /// The coordinator's own last report of an install that failed; its `error` says so.
  void completedInError(const CoordinatorRef& coordinator) REQUIRES(recordsGuard);
  void shouldPrioritize(const CoordinatorRef& coordinator) { _coordination.shouldPrioritize(coordinator); }

 private:
  AppRecords& _records;
  RegistryReports& _registry;
  CoordinatorReports& _coordination;
  bool _tells GUARDED_BY(recordsGuard) = false;
};

}  // namespace device
