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
    return std::any_of(_failures.begin(), _failures.end(), [&](const Failure& failure) {
      auto dot = failure.point.find('.');
      if (failure.point.substr(dot + 1) != operation) return false;
      if (!service.empty() && failure.point.substr(0, dot) != service) return false;
      return failure.app == app && matches(path, failure.path) && (failure.entry.empty() || failure.entry == _entry) &&
             (failure.ordinal == 0 || failure.ordinal == ordinal);
    });
  }

 private:
  const std::vector<Failure>& _failures;
  std::string _entry;
  std::map<std::string, std::uint64_t> _ordinals;
};

class SyncModel {
 public:
  explicit SyncModel(const Scenario& scenario) : _scenario(scenario), _plan(scenario.failures) {}

  Outcome run() {
    for (const auto& app : _scenario.apps) prepareDevice(app);
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
    if (!_outcome.reconciled || !_scenario.phaseSucceeded) cancelOutstanding();
    finish();
    return _outcome;
  }

 private:
  using App = ScenarioApp;
  /// What the device knows about an app.
  struct Known {
    bool installed = false;
    bool placeholder = false;
    bool ofStore = false;  // its facts are the scenario's
    std::string coordinator{};
    bool ownCoordinator = false;
    bool attached = false;  // the coordinator's placeholder is shown
  };

  bool fails(const std::string& operation, const std::string& app = {}, const std::string& path = {},
             const std::string& service = {}) {
    return _plan.next(operation, app, path, service);
  }

  const App* given(const std::string& id) const {
    for (const auto& app : _scenario.apps) {
      if (app.id == id) return &app;
    }
    return nullptr;
  }

  bool hasSetting(const std::string& key, const std::string& value) const {
    return std::count(_scenario.settings.begin(), _scenario.settings.end(), std::pair(key, value)) != 0;
  }

  void show(const std::string& id) {
    if (std::find(_shown.begin(), _shown.end(), id) == _shown.end()) _shown.push_back(id);
  }

  void remove(const std::string& id) {
    _known.erase(id);
    _shown.erase(std::remove(_shown.begin(), _shown.end(), id), _shown.end());
  }

  void endCoordinator(const std::string& id) {
    auto& app = _known[id];
    app.coordinator.clear();
    if (!app.installed && (app.attached || !app.placeholder)) remove(id);
  }

  void cancel(const std::string& object, const std::string& id, const std::string& reason) {
    _outcome.cancelled.push_back(object + ' ' + id + ' ' + reason);
    if (object == "coordinator" && !fails("cancelForReason", id, {}, "RVAppInstallCoordinator")) endCoordinator(id);
  }

  void prepareDevice(const App& app) {
    if (!app.previousMark.empty()) {
      _hasList = true;
      _marks.try_emplace(app.id, app.previousMark);
    }
    if (app.before == App::Before::absent) return;
    auto& known = _known[app.id];
    known.installed = app.before == App::Before::installed;
    known.placeholder = app.before == App::Before::placeholder;
    known.ofStore = known.placeholder;
    if (known.placeholder && app.store.createsCoordinator) known.coordinator = "initiating";
    show(app.id);
  }

  bool readsList() {
    return _hasList && !fails("readFile", {}, todoListPath) && !fails("propertyListWithData", {}, todoListPath);
  }

  void mark(const std::string& id, const std::string& operation) {
    if (!readsList() || !_marks.count(id)) return;
    if (fails("dataWithPropertyList", {}, todoListPath) || fails("writeAtomically", {}, todoListPath)) return;
    _marks[id] = operation;
  }

  void reportDeleted() {
    bool hasList = readsList();
    bool hasLastSync = !fails("readFile", {}, lastSyncPath) && !fails("propertyListWithData", {}, lastSyncPath);
    bool hasLost = !fails("CorvaneLookupUninstalled");
    for (const auto& app : _scenario.apps) {
      bool candidate = hasLost && app.lost;
      if (hasLastSync && app.inLastSync) {
        candidate |= fails("applicationIsInstalled", app.id) || app.before != App::Before::installed;
      }
      const auto& mark = app.previousMark;
      bool awaited = hasList && !mark.empty() && mark != "FAILED" && mark != "INSTALLED";
      if (candidate && !awaited) _outcome.deleted.push_back(app.id);
    }
    std::sort(_outcome.deleted.begin(), _outcome.deleted.end());
  }

  bool reconcile() {
    bool keepsOld = _hasList && fails("removeItem", {}, workArea);
    if (!keepsOld) {
      _hasList = false;
      _marks.clear();
    }
    if (fails("createDirectory", {}, pluginDirectory)) return false;
    if (!_scenario.stages || fails("fileExists", {}, stagingDirectory)) return true;
    if (keepsOld || fails("moveItem", {}, workArea)) return false;
    _hasList = !_scenario.rawTodo;
    for (const auto& app : _scenario.apps) {
      if (_hasList && !app.operation.empty()) _marks.try_emplace(app.id, app.operation);
    }
    bool removes = readsList() && !hasSetting("app-removal", "forbidden");
    for (const auto& app : _scenario.apps) {
      bool safe = app.id.find("/..") == app.id.npos;
      if (removes && app.operation == "remove" && safe && !fails("uninstallAppWithBundleID", app.id)) remove(app.id);
    }
    std::string layoutPath = std::string(workArea) + "/PanelloIconState.plist";
    if (!fails("readFile", {}, layoutPath) && !fails("PNSetIconState")) _layout = _scenario.layout;
    return true;
  }

  bool isUnderWay(const std::string& id) const {
    const auto& store = given(id)->store;
    if (!_known.at(id).ofStore || !store.hasProgress || store.paused || store.installState != 1) return false;
    return (store.installType != 2 && store.installPhase == 1) || (store.installType == 1 && store.installPhase == 0);
  }

  std::vector<std::string> candidates(std::set<std::string>& requests, std::set<std::string>& systemPlaceholders) {
    std::vector<std::string> wanted;
    bool hasList = readsList();
    bool hasSystem = !fails("enumerateBundlesOfType");
    bool hasPlaceholders = !fails("enumerateBundlesOfType");
    for (const auto& [id, known] : _known) {
      if (!known.placeholder) continue;
      if (hasSystem && given(id)->store.systemBundle) systemPlaceholders.insert(id);
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
    auto underWay = [&](const std::string& id) { return isTold && _known.count(id) && isUnderWay(id); };
    wanted.erase(std::remove_if(wanted.begin(), wanted.end(), underWay), wanted.end());
    return wanted;
  }

  std::vector<std::string> inHomeOrder(std::vector<std::string> wanted) {
    std::vector<std::string> order = _layout;
    order.insert(order.end(), _shown.begin(), _shown.end());
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
      const auto& store = given(id)->store;
      bool ofStore = !_stagedFolder.count(id);
      if (hasSetting("app-installation", "forbidden")) continue;
      if (ofStore && store.installType == 2) continue;
      if (ofStore && (store.applicationType == "System" || systemPlaceholders.count(id))) continue;
      if (ofStore && (store.installType == 7 || store.installType == 8) && !requests.count(id)) continue;
      bool existing = !fails("applicationProxyForIdentifier", id) && _known[id].installed;
      if (prepare(id, existing)) {
        _outcome.requested.push_back(id);
        if (existing) _updating.insert(id);
      } else {
        mark(id, "FAILED");
        if (!_known[id].installed && !_known[id].placeholder && _known[id].coordinator.empty()) remove(id);
      }
    }
  }

  bool prepare(const std::string& id, bool existing) {
    auto& app = _known[id];
    if (fails("coordinatorForAppWithBundleID", id)) return false;
    std::string kind = existing ? "updating" : "initiating";
    bool foreign = !app.coordinator.empty();
    if (!foreign) {
      app.coordinator = kind;
      app.ownCoordinator = true;
    }
    if (fails("creatorIdentifier", id) || foreign) return false;
    // Nobody hears of the coordinator, unless the process listens to all of them.
    if (fails("setObserver", id) && _scenario.process != "com.vantor.tsd") _unheard.insert(id);
    if (fails("makeInstallOptions") || fails("setInstallOptions", id) || fails("setInitialZDRAssetPromises", id) ||
        fails("makePromisedTransferToPathWithoutPath", id)) {
      cancel("coordinator", id, "TSError 1");
      return false;
    }
    if (fails("setAppAssetPromise", id)) {
      _outcome.cancelled.push_back("promise " + id + " TSError 30");
      cancel("coordinator", id, "TSError 1");
      return false;
    }
    bool made = !fails("makeAppPlaceholder", id);
    bool hasIcon = _stagedFolder.count(id) && given(id)->hasFolder;
    if (made && hasIcon && fails("setIconPromise", id)) {
      _outcome.cancelled.push_back("promise " + id + " TSError 30");
    }
    if (!made || fails("setPlaceholderPromise", id)) {
      if (made) cancel("placeholder", id, "TSError 1");
      cancel("coordinator", id, "TSError 1");
      return false;
    }
    if (!app.installed) app.placeholder = true;
    app.attached = true;
    show(id);
    return true;
  }

  /// The plug-in's own coordinator for the app, as long as it is found.
  bool hasCoordinator(const std::string& id) {
    if (fails("coordinatorForAppWithBundleID", id)) return false;
    auto known = _known.find(id);
    if (known == _known.end() || known->second.coordinator.empty()) return false;
    std::string kind = _updating.count(id) ? "updating" : "initiating";
    return !fails("creatorIdentifier", id) && known->second.coordinator == kind;
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
    bool cancelled = app.person == App::Person::cancels || app.person == App::Person::uninstalls;
    if (cancelled) {
      endCoordinator(app.id);
      if (app.person == App::Person::uninstalls) remove(app.id);
    }
    bool stops = cancelled && !_unheard.count(app.id) && !hasSetting("device-service-cancel", "no");
    if (!stops) {
      progress(app);
      if (app.transfer == App::Transfer::stalls) return;
    }
    _plan.enter("assetTransferSucceeded");
    _outstanding.erase(app.id);
    if (!stops && app.transfer == App::Transfer::arrives) {
      arrive(app);
    } else {
      bool installed = !fails("applicationIsInstalled", app.id) && _known[app.id].installed;
      bool told = installed && !app.isRestore && !cancelled && hasCoordinator(app.id);
      if (told)
        cancel("coordinator", app.id, fails("RVCreateUserPresentableError") ? "none" : "RVUserPresentableError 1");
    }
    _updating.erase(app.id);
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
      auto& app = _known[id];
      if (succeeds) app.installed = true;
      if (succeeds) app.placeholder = false;
      endCoordinator(id);
      if (_unheard.count(id) || fails("bundleID", id)) continue;
      bool seemsFine = fails("error", id) || succeeds;
      mark(id, seemsFine ? "INSTALLED" : "FAILED");
    }
  }

  void report(const App& app) {
    _plan.enter(app.report == App::Report::succeeded ? "assetInstallSucceeded" : "assetInstallFailed");
    if (app.report == App::Report::succeeded) mark(app.id, "INSTALLED");
    if (app.report != App::Report::failed || app.isRestore) return;
    mark(app.id, "FAILED");
    if (!fails("uninstallAppWithBundleID", app.id)) remove(app.id);
  }

  void cancelOutstanding() {
    for (const auto& id : _outstanding) {
      if (fails("coordinatorForAppWithBundleID", id)) continue;
      auto known = _known.find(id);
      if (known != _known.end() && !known->second.coordinator.empty()) cancel("coordinator", id, "TSError 30");
    }
  }

  void finish() {
    for (const auto& [id, app] : _known) {
      if (app.ownCoordinator && !app.coordinator.empty()) _outcome.open.push_back(id + ' ' + app.coordinator);
      if (app.installed) _outcome.present[id] = app.coordinator.empty() || !app.attached ? "installed" : "updating";
      if (!app.installed && app.placeholder) _outcome.present[id] = "placeholder";
    }
    std::sort(_outcome.cancelled.begin(), _outcome.cancelled.end());
    if (_hasList) _outcome.marks = _marks;
  }

  const Scenario& _scenario;
  FailurePlan _plan;
  Outcome _outcome;
  std::map<std::string, Known> _known;
  std::map<std::string, std::string> _marks;
  bool _hasList = false;
  std::vector<std::string> _layout;
  std::vector<std::string> _shown;
  std::set<std::string> _stagedFolder;  // candidates whose files are the host's
  std::set<std::string> _unheard;
  std::set<std::string> _updating;
  std::set<std::string> _outstanding;
  std::vector<std::pair<std::string, bool>> _installs;  // and whether it will succeed
};

class RestoreModel {
 public:
  explicit RestoreModel(const RestoreScenario& scenario) : _scenario(scenario), _plan(scenario.failures) {}

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
    std::sort(_outcome.open.begin(), _outcome.open.end());
    return _outcome;
  }

 private:
  bool hasSetting(const std::string& key, const std::string& value) const {
    return std::count(_scenario.settings.begin(), _scenario.settings.end(), std::pair(key, value)) != 0;
  }

  bool fails(const std::string& operation, const std::string& app = {}, const std::string& path = {}) {
    return _plan.next(operation, app, path);
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
    std::int64_t awaited = static_cast<std::int64_t>(_awaited.size());
    for (const auto& app : _scenario.apps) {
      bool told = !app.neverReported && !fails("bundleID", app.id);
      if (told && !_untold.count(app.id) && _scenario.process != "com.vantor.tsd") _awaited.erase(app.id);
    }
    _outcome.waited = _awaited.empty() ? 0 : 5 * awaited;
  }

  void cancel(const std::string& object, const RestoreApp& app) {
    _outcome.cancelled.push_back(object + ' ' + app.id + " TSError 29");
  }

  void restore(const RestoreApp& app, int status) {
    // Parsed from bytes: the file read last is the list of demoted apps.
    if (fails("propertyListWithData", {}, demotedAppsPath) || app.entry != RestoreApp::Entry::good) return;
    if (fails("coordinatorForAppWithBundleID", app.id)) return;
    if (fails("setObserver", app.id)) _untold.insert(app.id);
    bool made = true;
    bool attached = false;
    if (!fails("makePromisedOutOfBandTransfer", app.id) && fails("setUserDataPromise", app.id))
      return cancel("coordinator", app);
    made = buildPlaceholder(app);
    if (made) attached = !fails("setPlaceholderPromise", app.id);
    if (made && !attached) cancel("placeholder", app);
    if (!attached || (status == 0 && fails("setAppAssetPromiseResponsibleClient", app.id))) {
      return cancel("coordinator", app);
    }
    _awaited.insert(app.id);
    _outcome.present[app.id] = status == 0 ? "placeholder 2" : status == 1 ? "placeholder 8" : "placeholder 7";
    if (status == 0) _outcome.open.push_back(app.id + " restoring");
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
  FailurePlan _plan;
  RestoreOutcome _outcome;
  std::set<std::string> _awaited;
  std::set<std::string> _untold;  // nobody observes their coordinators
};

}  // namespace

Outcome predict(const Scenario& scenario) { return SyncModel(scenario).run(); }
RestoreOutcome predict(const RestoreScenario& scenario) { return RestoreModel(scenario).run(); }

}  // namespace tests
