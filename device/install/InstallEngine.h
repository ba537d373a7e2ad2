#pragma once

#include <atomic>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "device/events/EventQueue.h"
#include "device/files/FileTree.h"
#include "device/install/Containers.h"
#include "device/install/InstallParts.h"
#include "device/install/OpenCoordinators.h"
#include "device/records/AppRecords.h"
#include "device/reports/InstallReports.h"
#include "platform/ThreadSafety.h"

namespace device {

class InstallAhead;

/// Decides what becomes of apps and coordinators: every change of them, whichever service asks for it, below the
/// boundary. A change is one commit of the store; files come before it and go after it, so that a process that dies in
/// between leaves nothing but files that no record names. Callable from any thread.
///
/// What takes time is an object of its own that lives as long as it goes on: `PlaceholderInstall`,
/// `PackageInstall`, `StoreInstalls`, `InstallRecovery`.
class InstallEngine {
 public:
  using PlaceholderFailed = std::function<void(const std::string& app, const platform::ErrorRef& reason)>;

  InstallEngine(AppRecords& records, FileTree& files, EventQueue& events, RegistryReports& registry,
                CoordinatorReports& coordination, OpenCoordinators::Make makeCoordinator,
                PlaceholderFailed placeholderFailed);

  AppRecords& records() { return _records; }

  /// Continues what an earlier process left: see InstallRecovery. Once, before anything else.
  void begin(AppRecords::Loaded loaded, bool recovers) EXCLUDES(recordsGuard);
  /// Writes what only memory has.
  void flush() EXCLUDES(recordsGuard);

  // Coordinators.
  CoordinatorRef coordinatorForApp(platform::RVCoordinatorKind kind, std::string_view app,
                                   platform::RVClientIdentifier client, bool create, bool& created,
                                   platform::ErrorRef* error) EXCLUDES(recordsGuard);
  /// The app's open coordinator; null when there is none.
  CoordinatorRef openCoordinator(std::string_view app) EXCLUDES(recordsGuard);
  std::vector<CoordinatorStatus> openCoordinators() EXCLUDES(recordsGuard);
  /// Refused with an error when the coordinator has ended, and when `edit` answers false (with an error of its own).
  bool change(Coordinator& coordinator, const std::function<bool(CoordinatorRecord&)>& edit, platform::ErrorRef* error)
      EXCLUDES(recordsGuard);
  /// From now on `handle` stands for the promise.
  bool attachAppAsset(Coordinator& coordinator, const PromiseRef& promise,
                      std::shared_ptr<platform::RVPromisedTransferToPath> handle, platform::ErrorRef* error)
      EXCLUDES(recordsGuard);
  /// The placeholder is installed when this returns true; only the reports follow.
  bool attachPlaceholder(Coordinator& coordinator, const PlaceholderRecord& placeholder, platform::ErrorRef* error)
      EXCLUDES(recordsGuard);
  bool cancel(Coordinator& coordinator, const platform::ErrorRef& reason, platform::RVClientIdentifier client,
              platform::ErrorRef* error) EXCLUDES(recordsGuard);

  // Promises.
  PromiseRef makePromise(std::string_view name, platform::RVClientIdentifier client, std::uint64_t diskSpaceNeeded,
                         std::optional<std::string> path) EXCLUDES(recordsGuard);
  void setFraction(PromiseRecord& promise, double fraction) EXCLUDES(recordsGuard);
  void setPath(PromiseRecord& promise, std::string_view path) EXCLUDES(recordsGuard);
  bool isComplete(const PromiseRecord& promise) EXCLUDES(recordsGuard);
  /// Nothing until the promised piece is there.
  std::optional<std::string> deliveredPath(const PromiseRecord& promise) EXCLUDES(recordsGuard);
  /// The promised piece is there; an app asset's install begins, on the coordination lane.
  void deliver(PromiseRecord& promise) EXCLUDES(recordsGuard);
  bool cancel(PromiseRecord& promise, const platform::ErrorRef& reason, platform::RVClientIdentifier client,
              platform::ErrorRef* error) EXCLUDES(recordsGuard);

  // Apps.
  bool uninstall(std::string_view app, platform::ErrorRef* error) EXCLUDES(recordsGuard);
  bool cancelByPerson(std::string_view app, platform::ErrorRef* error) EXCLUDES(recordsGuard);
  bool prioritizeByPerson(std::string_view app, platform::ErrorRef* error) EXCLUDES(recordsGuard);
  bool beginStoreInstall(std::string_view app, const StoreInstall& install, platform::ErrorRef* error)
      EXCLUDES(recordsGuard);
  bool finishStoreInstall(std::string_view app, std::string_view packagePath, platform::ErrorRef* error)
      EXCLUDES(recordsGuard);
  bool installFromPackage(std::string_view packagePath, platform::ErrorRef* error) EXCLUDES(recordsGuard);
  /// See `LocalDevice`.
  void putOffInstalls() { _putsOff = true; }
  /// Whether everything that was begun has ended, so that no container is there which no record names.
  bool isSettled() const { return !_putsOff && _unpackedAhead == 0; }

 private:
  bool edit(Coordinator& coordinator, const std::function<bool(CoordinatorRecord&)>& edit, platform::ErrorRef* error)
      REQUIRES(recordsGuard);
  void beginInstall(const CoordinatorRef& coordinator) REQUIRES(recordsGuard);
  void unpackAhead(const CoordinatorRecord& record, const std::shared_ptr<InstallAhead>& install)
      REQUIRES(recordsGuard);

  AppRecords& _records;
  Containers _containers;
  OpenCoordinators _open;
  InstallReports _reports;
  const PlaceholderFailed _placeholderFailed;
  const InstallParts _parts;
  std::atomic<std::size_t> _unpackedAhead{0};
  std::atomic<bool> _putsOff{false};  // packages are left for the next opening
};

}  // namespace device
