#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "device/DeviceStatus.h"
#include "device/records/CoordinatorRecord.h"
#include "device/records/RecordsGuard.h"
#include "device/records/Settings.h"
#include "device/store/Store.h"
#include "platform/Mutex.h"
#include "platform/OBApplicationProxy.h"
#include "platform/TextTable.h"
#include "platform/ThreadSafety.h"
#include "platform/Value.h"

namespace device {

/// A running install, as the registry shows it.
struct InstallProgressRecord {
  std::uint64_t state = 1;  // active
  std::uint64_t phase = 0;  // loading
  bool paused = false;
  double fraction = 0;  // of the package's transfer, 0…1
};

/// One app the registry knows: installed, or a placeholder for one to come.
struct AppRecord {
  std::string id;
  std::string name;
  std::optional<std::string> version;
  std::string container;  // the directory around the bundle, without a trailing slash
  std::string bundle;     // name of the ".app" directory in it
  std::string applicationType = "User";
  bool isPlaceholder = false;
  bool systemBundle = false;
  bool launchProhibited = false;
  std::uint64_t installType = 0;
  std::uint64_t staticUsage = 0;  // bytes
  std::uint64_t filesSum = 0;     // of a placeholder's files (see Containers.h); 0: not known
  std::uint64_t homeOrder = 0;    // the order of apps that the layout does not name; 0: not shown yet
  std::optional<InstallProgressRecord> progress{};
  /// What the registry hands out; made anew whenever the record changes.
  platform::OBApplicationProxyRef proxy{};

  std::string bundlePath() const { return container + '/' + bundle; }
};

/// How an app's last install ended; outlives a placeholder that went with it.
struct OutcomeRecord {
  InstallOutcome outcome = InstallOutcome::none;
  std::string reason;
  std::uint64_t homeOrder = 0;  // of an app that was lost without anybody's doing, in case it comes back; 0: none
};

/// The pages of the home screen as the host set them. No identifier occurs twice.
struct HomeLayout {
  std::vector<std::vector<std::string>> pages;
  bool isPaged = false;  // false: one list, in pages[0]
};

/// Everything the services remember, except the coordinators.
struct DeviceState {
  std::map<std::string, AppRecord, std::less<>> apps;  // in order of identifier, which is every enumeration's order
  std::map<std::string, OutcomeRecord, std::less<>> outcomes;
  std::map<std::string, platform::Value, std::less<>> uninstalled;
  Settings settings;
  std::map<std::string, std::uint64_t, std::less<>> notificationStates;
  HomeLayout layout;
  platform::TextSet inLayout;
  std::uint64_t nextHomeOrder = 1;
  std::set<std::string> changedApps;  // put or removed since they were last taken

  const AppRecord* app(std::string_view id) const;
  /// The flattened order: the layout's identifiers, whether or not their apps are there yet, then the other apps in the
  /// order in which they came.
  std::vector<std::string> homeOrder() const;
  /// Null when neither an app nor an outcome is known.
  std::optional<AppStatus> status(std::string_view id) const;
};

/// Changes that take effect together: written to the store in one commit, then to the state in memory. One set changes
/// or removes one app.
class ChangeSet {
 public:
  /// A new app is shown on the home screen behind the others; one that was lost returns to its old place.
  void put(AppRecord app);
  /// The app leaves the home screen too; a lost one keeps its place in the layout in case it comes back.
  void removeApp(std::string_view id, bool isLost = false);
  void put(const CoordinatorRecord& coordinator) REQUIRES(recordsGuard);
  void removeCoordinator(std::string_view app);
  void setOutcome(std::string_view app, const OutcomeRecord& outcome);
  void removeOutcome(std::string_view app);
  void addUninstalled(std::string_view app, const platform::Value& facts);
  void removeUninstalled(std::string_view app);
  void setLayout(HomeLayout layout);
  /// One that `changeSetting` takes.
  void setSetting(std::string_view key, std::string_view text);
  void setNotificationState(std::string_view name, std::uint64_t state);
  /// A file that is to be removed once this is committed; if that does not happen, the next opening removes it.
  void addLeftover(std::string_view path);
  void removeLeftover(std::string_view path);
  /// The device is closed: nothing is half done, and every file that a record names is on disk. Goes with the next
  /// change after the next opening.
  void setClosed();

 private:
  friend class AppRecords;
  /// What the store gets, worked out once before it is asked; then the change of the state, which cannot fail.
  struct Step {
    std::function<void(const DeviceState& state, std::vector<StoreRecord>& records)> encode;
    std::function<void(DeviceState& state)> apply;
  };
  void add(StoreRecord record, std::function<void(DeviceState& state)> apply);

  std::vector<Step> _steps;
};

/// What the services remember: plain structs in memory under one device-wide guard, written through to the store.
/// The guard is never held during a callback or while a package is unpacked.
class AppRecords {
 public:
  /// Told why the store refused a change, since callers may ignore that silently; under the guard. May be null.
  using Refused = std::function<void(const platform::ErrorRef& reason)>;

  explicit AppRecords(Store& store, Refused refused = nullptr) : _store(store), _refused(std::move(refused)) {}
  AppRecords(const AppRecords&) = delete;
  AppRecords& operator=(const AppRecords&) = delete;

  /// Holds the guard for a scope.
  class SCOPED_CAPABILITY Lock {
   public:
    explicit Lock(AppRecords& records) ACQUIRE(recordsGuard) NO_THREAD_SAFETY_ANALYSIS : _lock(records._mutex) {}
    ~Lock() RELEASE() NO_THREAD_SAFETY_ANALYSIS {}
    Lock(const Lock&) = delete;
    Lock& operator=(const Lock&) = delete;

   private:
    platform::Mutex::Lock _lock;
  };
  const DeviceState& state() const REQUIRES(recordsGuard) { return _state; }

  struct Loaded {
    std::vector<CoordinatorRecord> coordinators;
    std::vector<std::string> leftovers;
    bool closed = false;  // the process before this one left nothing half done
  };
  /// Reads the store; once, before anything else. Nothing, with an error that names the record, when one cannot be
  /// understood.
  std::optional<Loaded> load(platform::ErrorRef* error = nullptr) EXCLUDES(recordsGuard);

  /// All of it or, with an error, nothing of it; durable on true.
  bool commit(ChangeSet&& changes, platform::ErrorRef* error = nullptr) REQUIRES(recordsGuard);
  /// The same for what a loss of power may take back, though not the death of the process: nothing that is on disk may
  /// be removed because of it.
  bool write(ChangeSet&& changes, platform::ErrorRef* error = nullptr) REQUIRES(recordsGuard);
  /// In memory at once, in the store with the next commit: what may be lost with the process.
  void commitLater(ChangeSet&& changes) REQUIRES(recordsGuard);
  /// Writes what `commitLater` kept back. False with an error when the store refuses; it is then still kept back.
  bool flush(platform::ErrorRef* error = nullptr) EXCLUDES(recordsGuard);
  /// Whether the store says that the device is closed: nothing was changed since it was opened.
  bool saysClosed() const REQUIRES(recordsGuard) { return _saysClosed; }
  /// Has the store say so no longer; what it refuses goes with the next change.
  void takeBackClosed() EXCLUDES(recordsGuard);
  /// How far a transfer has come. In memory only; goes to the store with the app's next change.
  void setFraction(std::string_view app, double fraction) REQUIRES(recordsGuard);
  /// The apps that were put or removed since this was last asked; for whoever keeps a view of them up to date.
  std::set<std::string> takeChangedApps() REQUIRES(recordsGuard) { return std::exchange(_state.changedApps, {}); }

 private:
  bool take(const StoreRecord& record, Loaded& loaded) REQUIRES(recordsGuard);
  using Keep = bool (Store::*)(const std::vector<StoreRecord>& changes, platform::ErrorRef* error);
  bool keep(Keep keep, const ChangeSet& changes, platform::ErrorRef* error) REQUIRES(recordsGuard);

  Store& _store;
  const Refused _refused;
  platform::Mutex _mutex;
  DeviceState _state GUARDED_BY(recordsGuard);
  std::vector<StoreRecord> _later GUARDED_BY(recordsGuard);
  bool _saysClosed GUARDED_BY(recordsGuard) = false;
};

}  // namespace device
