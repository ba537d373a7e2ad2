#pragma once

#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "device/AppRecords.h"
#include "device/Boundary.h"
#include "device/Containers.h"
#include "device/CoordinatorRecord.h"
#include "device/CoordinatorReports.h"
#include "device/EventQueue.h"
#include "device/FileTree.h"
#include "device/RegistryReports.h"

namespace device {

class LocalCoordinator;
class LocalTransferPromise;
using CoordinatorRef = std::shared_ptr<LocalCoordinator>;

/// Where an install comes from and what it brings along.
struct InstallRequest {
  std::string app;          // empty: whatever app the package holds
  std::string packagePath;  // empty: the placeholder's own files become the app
  std::optional<InstallOptionsRecord> options;
  platform::Value metadata;  // where the options have none
};

/// What becomes of apps and coordinators: every change of theirs, by whichever service it is asked for, below the
/// boundary. A change is one commit of the store; files come before it and go after it, so that a process that dies in
/// between leaves nothing but files that no record names. Operations from any thread.
class InstallEngine {
 public:
  /// Told why an app's placeholder could not be written, as the plug-in passes over that in silence. May be null.
  using PlaceholderFailed = std::function<void(const std::string& app, const platform::ErrorRef& reason)>;

  InstallEngine(AppRecords& records, FileTree& files, Boundary& boundary, EventQueue& events, RegistryReports& registry,
                CoordinatorReports& coordination, PlaceholderFailed placeholderFailed);
  ~InstallEngine();

  AppRecords& records() { return _records; }

  /// What an earlier process left: open coordinators are there again, interrupted installs are finished or rolled back,
  /// leftovers are removed. Tells nobody. Once, before anything else.
  void recover(AppRecords::Loaded loaded);
  /// Writes what only memory has.
  void flush();

  // Coordinators.
  CoordinatorRef coordinatorForApp(platform::RVCoordinatorKind kind, std::string_view app,
                                   platform::RVClientIdentifier client, bool create, bool& created,
                                   platform::ErrorRef* error);
  /// The app's open coordinator; null when there is none.
  CoordinatorRef openCoordinator(std::string_view app);
  std::vector<CoordinatorStatus> openCoordinators();
  /// Refused with an error when the coordinator has ended, and when `edit` answers false (with an error of its own).
  bool change(LocalCoordinator& coordinator, const std::function<bool(CoordinatorRecord&)>& edit,
              platform::ErrorRef* error);
  bool attachAppAsset(LocalCoordinator& coordinator, const std::shared_ptr<LocalTransferPromise>& promise,
                      platform::ErrorRef* error);
  /// The placeholder is installed when this returns true; only the reports follow.
  bool attachPlaceholder(LocalCoordinator& coordinator, const PlaceholderRecord& placeholder,
                         platform::ErrorRef* error);
  bool cancel(LocalCoordinator& coordinator, const platform::ErrorRef& reason, platform::RVClientIdentifier client,
              platform::ErrorRef* error);

  // Promises.
  PromiseRef makePromise(std::string_view name, platform::RVClientIdentifier client, std::uint64_t diskSpaceNeeded,
                         std::optional<std::string> path);
  void setFraction(PromiseRecord& promise, double fraction);
  void setPath(PromiseRecord& promise, std::string_view path);
  bool isComplete(PromiseRecord& promise);
  /// The promised piece is there; an app asset's install begins, on the coordination lane.
  void deliver(PromiseRecord& promise);
  bool cancel(PromiseRecord& promise, const platform::ErrorRef& reason, platform::RVClientIdentifier client,
              platform::ErrorRef* error);

  // Apps.
  bool uninstall(std::string_view app, platform::ErrorRef* error);
  bool cancelByPerson(std::string_view app, platform::ErrorRef* error);
  bool prioritizeByPerson(std::string_view app, platform::ErrorRef* error);
  bool beginStoreInstall(std::string_view app, const StoreInstall& install, platform::ErrorRef* error);
  bool finishStoreInstall(std::string_view app, std::string_view packagePath, platform::ErrorRef* error);
  bool installFromPackage(std::string_view packagePath, platform::ErrorRef* error);

 private:
  enum class Ending : std::uint8_t { cancelled, failed };

  CoordinatorRef adopt(CoordinatorRecord record) REQUIRES(_records.mutex);
  void close(LocalCoordinator& coordinator) REQUIRES(_records.mutex);
  /// Tells the owner how the app stands now.
  void tellChanged(const std::string& app) REQUIRES(_records.mutex);

  std::optional<AppRecord> writePlaceholder(const PlaceholderRecord& placeholder, platform::ErrorRef* error)
      EXCLUDES(_records.mutex);
  /// `written` is the record of a placeholder whose files are there; nothing for an app that stays installed. The
  /// container that this makes superfluous goes into `abandoned`.
  bool putPlaceholder(const CoordinatorRef& coordinator, const PlaceholderRecord& placeholder,
                      std::optional<AppRecord> written, std::string& abandoned, platform::ErrorRef* error)
      REQUIRES(_records.mutex);
  /// Ends an install that is not to be: a placeholder goes, an installed app stays as it was. `coordinator` may be
  /// null.
  bool endInstall(const CoordinatorRef& coordinator, const std::string& app, Ending ending,
                  const platform::ErrorRef& reason, platform::RVClientIdentifier client, std::string& abandoned,
                  platform::ErrorRef* error) REQUIRES(_records.mutex);

  void beginInstall(const CoordinatorRef& coordinator) REQUIRES(_records.mutex);
  void installAppAsset(const CoordinatorRef& coordinator) EXCLUDES(_records.mutex);
  /// `coordinator` may be null.
  bool install(const CoordinatorRef& coordinator, const InstallRequest& request, platform::ErrorRef* error)
      EXCLUDES(_records.mutex);
  /// The files of the app that the request makes, and what the registry is to say of it; but for what only the record
  /// that is there then knows.
  std::optional<AppRecord> unpack(const InstallRequest& request, platform::ErrorRef* error) EXCLUDES(_records.mutex);
  bool finishInstall(const CoordinatorRef& coordinator, AppRecord installed, const InstallRequest& request,
                     std::string& abandoned, platform::ErrorRef* error) REQUIRES(_records.mutex);
  void failInstall(const CoordinatorRef& coordinator, const std::string& app, const platform::ErrorRef& reason)
      EXCLUDES(_records.mutex);
  void removePackage(const std::string& path) EXCLUDES(_records.mutex);
  /// A loss of power may leave a placeholder's record without its files.
  void removeLostPlaceholders() EXCLUDES(_records.mutex);

  AppRecords& _records;
  FileTree& _files;
  Boundary& _boundary;
  EventQueue& _events;
  RegistryReports& _registry;
  CoordinatorReports& _coordination;
  Containers _containers;
  const PlaceholderFailed _placeholderFailed;
  std::map<std::string, CoordinatorRef, std::less<>> _open GUARDED_BY(_records.mutex);
  std::uint64_t _nextPromise GUARDED_BY(_records.mutex) = 1;
  bool _tells GUARDED_BY(_records.mutex) = false;  // false while the device is being opened
};

/// Whether an app can be called that: not empty, of a length a file name may have, without "/" and control characters.
bool isAppIdentifier(std::string_view text);

}  // namespace device
