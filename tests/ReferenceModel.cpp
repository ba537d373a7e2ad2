#include "tests/ReferenceModel.h"

#include <algorithm>
#include <set>

namespace tests {

namespace {

/// Knows which call is to fail, as the model comes by it.
class FailurePlan {
 public:
  explicit FailurePlan(const std::vector<Failure>& failures) : _failures(failures) {}

  void enter(const std::string& entry) { _entry = entry; }
  const std::string& entry() const { return _entry; }

  /// Whether the next call of the operation fails. `service` only where one name serves several.
  bool next(const std::string& operation, const std::string& app, const std::string& path = {},
            const std::string& service = {}) {
    std::uint64_t ordinal = ++_ordinals[_entry + operation + service + app + path];
    std::uint64_t match = ++_matches[operation + service + app];
    return std::any_of(_failures.begin(), _failures.end(), [&](const Failure& failure) {
      auto dot = failure.point.find('.');
      if (failure.point.substr(dot + 1) != operation) return false;
      if (!service.empty() && failure.point.substr(0, dot) != service) return false;
      return failure.app == app && matches(path, failure.path) && (failure.entry.empty() || failure.entry == _entry) &&
             (failure.ordinal == 0 ? failure.match == 0 || failure.match == match : failure.ordinal == ordinal);
    });
  }

 private:
  const std::vector<Failure>& _failures;
  std::string _entry;
  std::map<std::string, std::uint64_t> _ordinals;
  std::map<std::string, std::uint64_t> _matches;
};

/// What both kinds of runs do with the device.
class DeviceModel {
 public:
  DeviceModel(World& world, const std::vector<Failure>& failures) : _world(world), _plan(failures) {}

 protected:
  bool fails(const std::string& operation, const std::string& app = {}, const std::string& path = {},
             const std::string& service = {}) {
    return _plan.next(operation, app, path, service);
  }

  /// The plug-in hears that the app's coordinator was cancelled. True when that is news to it.
  bool tellCancelled(const std::string& id) {
    if (!_world.hears(id)) return false;
    std::string entry = _plan.entry();
    _plan.enter("coordinatorCanceledWithReason");
    bool known = !fails("bundleID", id);
    _plan.enter(entry);
    if (known) _world.awaited.erase(id);
    return known && _world.cancelled.insert(id).second;
  }

  /// True when the plug-in heard of it as news.
  bool endCancelled(const std::string& id) {
    bool isNews = tellCancelled(id);
    _world.endCoordinator(id);
    return isNews;
  }

  bool uninstall(const std::string& id) {
    auto known = _world.apps.find(id);
    if (known == _world.apps.end() || (!known->second.installed && !known->second.placeholder)) return false;
    bool isNews = !known->second.coordinator.empty() && tellCancelled(id);
    _world.uninstalled.insert(id);
    _world.remove(id);
    return isNews;
  }

  std::vector<std::string> open() const {
    std::vector<std::string> coordinators;
    for (const auto& [id, app] : _world.apps) {
      if (app.own && !app.coordinator.empty()) coordinators.push_back(id + ' ' + app.coordinator);
    }
    return coordinators;
  }

  World& _world;
  FailurePlan _plan;
};

class SyncModel : DeviceModel {
 public:
  SyncModel(const Scenario& scenario, World& world) : DeviceModel(world, scenario.failures), _scenario(scenario) {}

  Outcome run() {
    for (const auto& app : _scenario.apps) {
      if (!_scenario.continues) prepareDevice(app);
    }
    _plan.enter("installedAssets");
    reportDeleted();
    _plan.enter("reconcileSync");
    _outcome.reconciled = reconcile();
    if (_outcome.reconciled) {
      _plan.enter("outstandingAssetTransfers");
      request();
      for (const auto& id : _outcome.requested) transfer(*given(id));
      settleInstalls();
      for (const auto& id : _outcome.requested) report(*given(id));
    }
    _plan.enter("assetTransferEndedWithSuccess");
    endPhase(_outcome.reconciled && _scenario.phaseSucceeded);
    if (_scenario.syncSucceeded.value_or(_outcome.reconciled)) endSync();
    finish();
    return _outcome;
  }

 private:
  using App = ScenarioApp;
  const App* given(const std::string& id) const {
    for (const auto& app : _scenario.apps) {
      if (app.id == id) return &app;
    }
    return nullptr;
  }

  bool hasSetting(const std::string& key, const std::string& value) const {
    return std::count(_scenario.settings.begin(), _scenario.settings.end(), std::pair(key, value)) != 0;
  }

  void cancel(const std::string& object, const std::string& id, const std::string& reason) {
    _outcome.cancelled.push_back(object + ' ' + id + ' ' + reason);
    if (object == "coordinator" && !fails("cancelForReason", id, {}, "RVAppInstallCoordinator")) endCancelled(id);
  }

  void prepareDevice(const App& app) {
    if (!app.previousMark.empty()) {
      _world.hasList = true;
      _world.marks.try_emplace(app.id, app.previousMark);
    }
    if (app.lost) _world.uninstalled.insert(app.id);
    if (app.before == App::Before::absent) return;
    auto& known = _world.apps[app.id];
    known.installed = app.before == App::Before::installed;
    known.placeholder = app.before == App::Before::placeholder;
    if (known.placeholder) known.facts = app.store;
    if (known.placeholder && app.store.createsCoordinator) known.coordinator = "initiating";
    _world.show(app.id);
  }

  bool readsList() {
    return _world.hasList && !fails("readFile", {}, todoListPath) && !fails("propertyListWithData", {}, todoListPath);
  }

  void mark(const std::string& id, const std::string& operation) {
    if (!readsList() || !_world.marks.count(id)) return;
    if (fails("dataWithPropertyList", {}, todoListPath) || fails("writeAtomically", {}, todoListPath)) return;
    _world.marks[id] = operation;
  }

  void reportDeleted() {
    bool hasList = readsList();
    bool hasLastSync = !fails("readFile", {}, lastSyncPath) && !fails("propertyListWithData", {}, lastSyncPath);
    bool hasLost = !fails("CorvaneLookupUninstalled");
    for (const auto& app : _scenario.apps) {
      bool candidate = hasLost && _world.uninstalled.count(app.id);
      if (hasLastSync && app.inLastSync) {
        candidate |= fails("applicationIsInstalled", app.id) || !_world.installed(app.id);
      }
      auto known = _world.marks.find(app.id);
      const auto mark = known == _world.marks.end() ? std::string() : known->second;
      bool awaited = hasList && !mark.empty() && mark != "FAILED" && mark != "INSTALLED";
      if (candidate && !awaited) _outcome.deleted.push_back(app.id);
    }
    std::sort(_outcome.deleted.begin(), _outcome.deleted.end());
    if (hasLost) _world.lookedUp = _world.uninstalled;
  }

  bool reconcile() {
    bool keepsOld = _world.hasList && fails("removeItem", {}, workArea);
    if (!keepsOld) {
      _world.hasList = false;
      _world.marks.clear();
    }
    if (fails("createDirectory", {}, pluginDirectory)) return false;
    if (!_scenario.stages || fails("fileExists", {}, stagingDirectory)) return true;
    if (keepsOld || fails("moveItem", {}, workArea)) return false;
    _world.hasList = !_scenario.rawTodo;
    for (const auto& app : _scenario.apps) {
      if (_world.hasList && !app.operation.empty()) _world.marks.try_emplace(app.id, app.operation);
    }
    bool removes = readsList() && !hasSetting("app-removal", "forbidden");
    for (const auto& app : _scenario.apps) {
      bool safe = app.id.find("/..") == app.id.npos;
      if (removes && app.operation == "remove" && safe && !fails("uninstallAppWithBundleID", app.id)) uninstall(app.id);
    }
    std::string layoutPath = std::string(workArea) + "/PanelloIconState.plist";
    if (_scenario.layout.empty()) return true;
    if (!fails("readFile", {}, layoutPath) && !fails("PNSetIconState")) _world.layout = _scenario.layout;
    return true;
  }

  bool isUnderWay(const std::string& id) const {
    const auto& known = _world.apps.at(id);
    const auto& store = known.facts;
    if (!known.placeholder || !store.hasProgress || store.paused || store.installState != 1) return false;
    return (store.installType != 2 && store.installPhase == 1) || (store.installType == 1 && store.installPhase == 0);
  }

  std::vector<std::string> candidates(std::set<std::string>& requests, std::set<std::string>& systemPlaceholders) {
    std::vector<std::string> wanted;
    bool hasList = readsList();
    bool hasSystem = !fails("enumerateBundlesOfType");
    bool hasPlaceholders = !fails("enumerateBundlesOfType");
    for (const auto& [id, known] : _world.apps) {
      if (!known.placeholder) continue;
      if (hasSystem && known.facts.systemBundle) systemPlaceholders.insert(id);
      if (hasPlaceholders) wanted.push_back(id);
    }
    for (const auto& app : _scenario.apps) {
      if (!hasList || app.operation != "install" || app.id.find("/..") != app.id.npos) continue;
      requests.insert(app.id);
      if (std::find(wanted.begin(), wanted.end(), app.id) != wanted.end()) continue;
      wanted.push_back(app.id);
      _stagedFolder.insert(app.id);
    }
    bool isTold = !fails("addObserver") && std::count(_scenario.rules.begin(), _scenario.rules.end(),
                                                      "applicationInstallsArePrioritized=none") == 0;
    auto underWay = [&](const std::string& id) { return isTold && _world.apps.count(id) && isUnderWay(id); };
    wanted.erase(std::remove_if(wanted.begin(), wanted.end(), underWay), wanted.end());
    return wanted;
  }

  std::vector<std::string> inHomeOrder(std::vector<std::string> wanted) {
    std::vector<std::string> order = _world.layout;
    order.insert(order.end(), _world.shown.begin(), _world.shown.end());
    if (fails("PNGetFlattenedIconState") || fails("propertyListWithData", {}, todoListPath)) return wanted;
    std::vector<std::string> ordered;
    for (const auto* source : {&order, &wanted}) {
      for (const auto& id : *source) {
        bool isWanted = std::find(wanted.begin(), wanted.end(), id) != wanted.end();
        if (isWanted && std::find(ordered.begin(), ordered.end(), id) == ordered.end()) ordered.push_back(id);
      }
    }
    return ordered;
  }

  void request() {
    std::set<std::string> requests;
    std::set<std::string> systemPlaceholders;
    auto wanted = inHomeOrder(candidates(requests, systemPlaceholders));
    for (const auto& id : wanted) {
      bool ofStore = !_stagedFolder.count(id);
      const device::StoreInstall store = ofStore ? _world.apps[id].facts : device::StoreInstall();
      if (hasSetting("app-installation", "forbidden")) continue;
      if (ofStore && store.installType == 2) continue;
      if (ofStore && (store.applicationType == "System" || systemPlaceholders.count(id))) continue;
      if (ofStore && (store.installType == 7 || store.installType == 8) && !requests.count(id)) continue;
      bool existing = !fails("applicationProxyForIdentifier", id) && _world.apps[id].installed;
      if (prepare(id, existing)) {
        _outcome.requested.push_back(id);
        if (existing) _world.updating.insert(id);
      } else {
        mark(id, "FAILED");
        if (!_world.apps[id].installed && !_world.apps[id].placeholder && _world.apps[id].coordinator.empty())
          _world.remove(id);
      }
    }
  }

  bool prepare(const std::string& id, bool existing) {
    auto& app = _world.apps[id];
    if (fails("coordinatorForAppWithBundleID", id)) return false;
    std::string kind = existing ? "updating" : "initiating";
    if (app.coordinator.empty()) {
      app.coordinator = kind;
      app.own = true;
    }
    if (app.coordinator != kind || fails("creatorIdentifier", id) || !app.own) return false;
    app.observed |= !fails("setObserver", id);
    auto giveUp = [&] { return cancel("coordinator", id, "TSError 1"), false; };
    if (!app.options && (fails("makeInstallOptions") || fails("setInstallOptions", id))) return giveUp();
    app.options = true;
    if (!app.initialPromises && fails("setInitialZDRAssetPromises", id)) return giveUp();
    app.initialPromises = true;
    if (!app.asset && fails("makePromisedTransferToPathWithoutPath", id)) return giveUp();
    if (!app.asset && fails("setAppAssetPromise", id)) {
      _outcome.cancelled.push_back("promise " + id + " TSError 30");
      return giveUp();
    }
    app.asset = true;
    if (app.attached) return true;
    bool made = !fails("makeAppPlaceholder", id);
    bool hasIcon = _stagedFolder.count(id) && given(id)->hasFolder;
    if (made && hasIcon && fails("setIconPromise", id)) {
      _outcome.cancelled.push_back("promise " + id + " TSError 30");
    }
    if (!made || fails("setPlaceholderPromise", id)) {
      if (made) cancel("placeholder", id, "TSError 1");
      return giveUp();
    }
    _world.attach(id, 4, true);
    return true;
  }

  /// The plug-in's own coordinator for the app, as long as it is found.
  bool hasCoordinator(const std::string& id) {
    if (fails("coordinatorForAppWithBundleID", id)) return false;
    auto known = _world.apps.find(id);
    if (known == _world.apps.end() || known->second.coordinator.empty()) return false;
    std::string kind = _world.updating.count(id) ? "updating" : "initiating";
    return known->second.coordinator == kind && !fails("creatorIdentifier", id) && known->second.own;
  }

  /// The promise of the package; another one cannot be attached.
  bool hasPromise(const std::string& id) {
    if (!fails("appAssetPromiseWithError", id)) return true;
    _outcome.cancelled.push_back("promise " + id + " TSError 30");
    return false;
  }

  void progress(const App& app) {
    _plan.enter("assetTransferUpdatedProgress");
    if (hasCoordinator(app.id)) hasPromise(app.id);
    _outstanding.insert(app.id);
  }

  void transfer(const App& app) {
    if (app.transfer == App::Transfer::neverStarts) return;
    progress(app);
    bool isNews = false;
    if (app.person == App::Person::cancels) isNews = endCancelled(app.id);
    if (app.person == App::Person::uninstalls) isNews = uninstall(app.id);
    bool stops = isNews && !hasSetting("device-service-cancel", "no");
    if (!stops) {
      progress(app);
      if (app.transfer == App::Transfer::stalls) return;
    }
    _plan.enter("assetTransferSucceeded");
    _outstanding.erase(app.id);
    bool cancelled = _world.cancelled.erase(app.id) != 0;
    if (!stops && app.transfer == App::Transfer::arrives) {
      arrive(app);
    } else {
      bool installed = !fails("applicationIsInstalled", app.id) && _world.apps[app.id].installed;
      bool told = installed && !app.isRestore && !cancelled && hasCoordinator(app.id);
      if (told)
        cancel("coordinator", app.id, fails("RVCreateUserPresentableError") ? "none" : "RVUserPresentableError 1");
    }
    _world.updating.erase(app.id);
  }

  void arrive(const App& app) {
    bool recorded = app.path == App::Path::recorded && _stagedFolder.count(app.id) &&
                    !fails("readFile", {}, restoreStatePath) && !fails("propertyListWithData", {}, restoreStatePath);
    bool hasPath = app.path == App::Path::absolute || app.path == App::Path::relative || recorded;
    if (!hasPath) return;
    mark(app.id, app.isDownload ? "DOWNLOADED" : "SENT");
    if (!app.isDownload || app.isRestore || !hasCoordinator(app.id) || !hasPromise(app.id)) return;
    bool pathTold = !fails("setTransferPath", app.id);
    if (fails("setComplete", app.id)) return;
    _installs.emplace_back(app.id, pathTold && app.package == App::Package::good);
  }

  void settleInstalls() {
    _plan.enter("coordinatorDidCompleteSuccessfully");
    for (const auto& [id, succeeds] : _installs) {
      auto& app = _world.apps[id];
      bool heard = _world.hears(id);
      if (succeeds) {
        app.installed = true;
        app.placeholder = false;
        app.facts.installType = 4;
        _world.uninstalled.erase(id);
      }
      _world.endCoordinator(id);
      if (!heard || fails("bundleID", id)) continue;
      bool seemsFine = fails("error", id) || succeeds;
      mark(id, seemsFine ? "INSTALLED" : "FAILED");
    }
  }

  void report(const App& app) {
    _plan.enter(app.report == App::Report::succeeded ? "assetInstallSucceeded" : "assetInstallFailed");
    if (app.report == App::Report::succeeded) mark(app.id, "INSTALLED");
    if (app.report != App::Report::failed || app.isRestore) return;
    mark(app.id, "FAILED");
    if (!fails("uninstallAppWithBundleID", app.id)) uninstall(app.id);
  }

  void endPhase(bool succeeded) {
    std::vector<std::string> cancelled;
    for (const auto& id : _outstanding) {
      if (fails("coordinatorForAppWithBundleID", id) || succeeded) continue;
      auto known = _world.apps.find(id);
      if (known != _world.apps.end() && !known->second.coordinator.empty()) cancelled.push_back(id);
    }
    if (!_outstanding.empty()) {
      _world.updating.clear();
      _world.cancelled.clear();
    }
    // Heard of after the plug-in has forgotten whom the person cancelled.
    for (const auto& id : cancelled) cancel("coordinator", id, "TSError 30");
  }

  void endSync() {
    if (!_world.lookedUp || fails("CorvaneClearUninstalled")) return;
    for (const auto& id : *_world.lookedUp) _world.uninstalled.erase(id);
    _world.lookedUp.reset();
  }

  void finish() {
    _outcome.open = open();
    for (const auto& [id, app] : _world.apps) {
      if (auto state = app.state(); !state.empty()) _outcome.present[id] = state;
    }
    std::sort(_outcome.cancelled.begin(), _outcome.cancelled.end());
    if (_world.hasList) _outcome.marks = _world.marks;
  }

  const Scenario& _scenario;
  Outcome _outcome;
  std::set<std::string> _stagedFolder;  // candidates whose files are the host's
  std::set<std::string> _outstanding;
  std::vector<std::pair<std::string, bool>> _installs;  // and whether it will succeed
};

class RestoreModel : DeviceModel {
 public:
  RestoreModel(const RestoreScenario& scenario, World& world)
      : DeviceModel(world, scenario.failures), _scenario(scenario) {}

  RestoreOutcome run() {
    bool unmanaged = _plan.next("makeBackupManager", "");
    _plan.enter("reconcileRestoreOfType");
    bool asked = _scenario.type == 2 || _scenario.type == 3;
    bool unasked = asked && fails("tessaroShouldCreateAppPlaceholdersWithError");
    bool errs = hasSetting("backup-error", "yes");
    bool declines = unmanaged || unasked || errs || hasSetting("backup-placeholders", "no");
    bool agreesWithError = std::count(_scenario.rules.begin(), _scenario.rules.end(),
                                      "tessaroShouldCreateAppPlaceholdersWithError=error") != 0;
    if (asked && errs) _outcome.error = "BackupService";
    if (unasked || agreesWithError) _outcome.error = "Injection";
    if (asked && !declines && _scenario.hasList && !_plan.next("fileExists", "", restoreListPath)) {
      processList();
      _plan.enter("reconcileRestoreOfType");
      _outcome.filedAway = !_plan.next("moveItem", "", restoreLogPath);
    }
    std::sort(_outcome.cancelled.begin(), _outcome.cancelled.end());
    _outcome.open = open();
    for (const auto& [id, app] : _world.apps) {
      if (auto state = app.state(); !state.empty())
        _outcome.present[id] = state + ' ' + std::to_string(app.facts.installType);
    }
    return _outcome;
  }

 private:
  bool hasSetting(const std::string& key, const std::string& value) const {
    return std::count(_scenario.settings.begin(), _scenario.settings.end(), std::pair(key, value)) != 0;
  }

  void processList() {
    if (_scenario.rawList || fails("readFile", {}, restoreListPath) ||
        fails("propertyListWithData", {}, restoreListPath)) {
      return;
    }
    bool knowsDemoted = !_scenario.rawDemotedList && !fails("readFile", {}, demotedAppsPath) &&
                        !fails("propertyListWithData", {}, demotedAppsPath);
    for (const auto& app : _scenario.apps) {
      if (app.entry == RestoreApp::Entry::notADictionary || app.entry == RestoreApp::Entry::noMetadata) continue;
      int status = knowsDemoted && app.demotedAutomatically ? 2 : knowsDemoted && app.demotedByHand ? 1 : 0;
      restore(app, status);
    }
    _plan.enter("coordinatorDidInstallPlaceholder");
    auto awaited = static_cast<std::int64_t>(_world.awaited.size());
    for (const auto& app : _scenario.apps) {
      bool told = _told.count(app.id) && !app.neverReported && !fails("bundleID", app.id);
      if (told && !_world.finishedWaiting) _world.awaited.erase(app.id);
    }
    _world.finishedWaiting = true;
    _outcome.waited = _world.awaited.empty() ? 0 : 5 * awaited;
  }

  void cancel(const std::string& object, const RestoreApp& app) {
    _outcome.cancelled.push_back(object + ' ' + app.id + " TSError 29");
  }

  void restore(const RestoreApp& app, int status) {
    if (prepare(app, status)) return;
    // What was set up for it goes, and it is awaited no more, should an earlier restore have begun to.
    if (_acquired) {
      cancel("coordinator", app);
      endCancelled(app.id);
    }
    _world.awaited.erase(app.id);
  }

  bool prepare(const RestoreApp& app, int status) {
    _acquired = false;
    // Parsed from bytes: the file read last is the list of demoted apps.
    if (fails("propertyListWithData", {}, demotedAppsPath) || app.entry != RestoreApp::Entry::good) return false;
    if (fails("coordinatorForAppWithBundleID", app.id)) return false;
    auto& known = _world.apps[app.id];
    if (status == 0 && known.own && known.coordinator == "restoring") return true;  // the store's already
    if (!known.coordinator.empty()) return false;
    _acquired = known.own = true;
    known.coordinator = "restoring";
    known.observed = !fails("setObserver", app.id);
    if (!fails("makePromisedOutOfBandTransfer", app.id) && fails("setUserDataPromise", app.id)) return false;
    if (!buildPlaceholder(app)) return false;
    if (fails("setPlaceholderPromise", app.id)) return cancel("placeholder", app), false;
    _world.attach(app.id, status == 0 ? 2 : status == 1 ? 8 : 7, status == 0);
    _world.awaited.insert(app.id);
    if (_world.hears(app.id)) _told.insert(app.id);
    if (status == 0) return !fails("setAppAssetPromiseResponsibleClient", app.id);
    known.leaveCoordinator();
    return true;
  }

  bool buildPlaceholder(const RestoreApp& app) {
    std::string directory = "*/com.vantor.tsd.Apps/" + app.id + ".app";
    if (fails("createDirectory", {}, directory)) return false;
    bool hasIcon = app.hasIcon && !fails("createFile", {}, directory + "/Icon.png") &&
                   !fails("attributesOfItem", {}, directory + "/Icon.png");
    if (fails("makeAppPlaceholder", app.id)) return false;
    if (hasIcon && fails("makePromisedTransferToPath", app.id)) return cancel("placeholder", app), false;
    if (hasIcon && fails("setIconPromise", app.id)) {
      cancel("promise", app);
      return cancel("placeholder", app), false;
    }
    if (fails("makePlaceholderAttributes") || fails("setPlaceholderAttributes", app.id) ||
        fails("setMetadata", app.id) || (app.hasRights && fails("setSinfData", app.id)) ||
        fails("setConfigurationCompleteWithError", app.id)) {
      return cancel("placeholder", app), false;
    }
    return true;
  }

  const RestoreScenario& _scenario;
  RestoreOutcome _outcome;
  bool _acquired = false;       // by the app that is being prepared
  std::set<std::string> _told;  // whose placeholder the plug-in will hear of
};

}  // namespace

Outcome predict(const Scenario& scenario, World& world) { return SyncModel(scenario, world).run(); }
RestoreOutcome predict(const RestoreScenario& scenario, World& world) { return RestoreModel(scenario, world).run(); }

}  // namespace tests
