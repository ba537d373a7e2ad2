#include "tests/Scenario.h"

#include <gtest/gtest.h>

#include <algorithm>

#include "platform/Describe.h"
#include "plist/PropertyList.h"

namespace tests {

using device::CallRecord;

std::string Failure::rule() const {
  std::string text = point;
  if (!app.empty()) text += ':' + app;
  if (match != 0) text += '@' + std::to_string(match);
  return text + "=fail";
}

PluginRig::Options optionsOf(const Scenario& scenario) {
  PluginRig::Options options;
  options.process = scenario.process;
  options.rules = scenario.rules;
  for (const auto& failure : scenario.failures) options.rules.push_back(failure.rule());
  return options;
}

namespace {

class SyncPlayer {
 public:
  SyncPlayer(PluginRig& rig, const Scenario& scenario) : _rig(rig), _scenario(scenario) {
    if (scenario.chooser) rig.events().setChooser(scenario.chooser);
  }

  Outcome play() {
    for (const auto& [key, value] : _scenario.settings) EXPECT_TRUE(_rig.device().set(key, value));
    for (const auto& app : _scenario.apps) {
      if (!_scenario.continues) prepare(app);
    }
    _rig.write(lastSyncPath, binaryList(lastSync()));
    _rig.write(restoreStatePath, binaryList(restoreState()));
    if (!_scenario.continues && hasPreviousList())
      _rig.write(todoListPath, binaryList(todoList(&ScenarioApp::previousMark)));
    _rig.postStartup();

    Outcome outcome;
    outcome.deleted = deletedBy(_rig.daemon().installedAssets());
    if (_scenario.stages) stage();
    outcome.reconciled = _rig.reconcileSync();
    _rig.deliver();
    if (outcome.reconciled) transferAll(outcome);
    _rig.daemon().assetTransferEndedWithSuccess(outcome.reconciled && _scenario.phaseSucceeded);
    _rig.deliver();
    _rig.daemon().syncEndedWithSuccess(_scenario.syncSucceeded.value_or(outcome.reconciled));
    _rig.deliver();
    observe(outcome);
    return outcome;
  }

 private:
  using App = ScenarioApp;

  /// Where anything may be injected, the store or the person may have been faster.
  void prepare(const App& app) {
    bool prepared = true;
    if (app.before == App::Before::installed || app.lost) {
      const std::string package = _rig.receivePackage(app.id, packageOf(app.id, "1.0", app.content));
      prepared = _rig.device().installFromPackage(package);
    }
    if (app.lost) prepared = _rig.device().uninstallByPerson(app.id) && prepared;
    if (app.before == App::Before::placeholder) prepared = _rig.device().beginStoreInstall(app.id, app.store);
    EXPECT_TRUE(prepared || !_scenario.rules.empty()) << app.id;
    _rig.deliver();
  }

  Value lastSync() const {
    std::vector<std::string> identifiers;
    for (const auto& app : _scenario.apps) {
      if (app.inLastSync) identifiers.push_back(app.id);
    }
    return arrayOf(identifiers);
  }

  Value restoreState() const {
    Value root = Value::makeDictionary();
    for (const auto& app : _scenario.apps) {
      if (app.path != App::Path::recorded) continue;
      Value version = dictionaryOf({{"path", packagePath(app)}});
      root.dictionary()->set(app.id, dictionaryOf({{"2.0", version}}));
    }
    return root;
  }

  static std::string packagePath(const App& app) { return std::string(packagesDirectory) + '/' + app.id + ".pkg"; }

  bool hasPreviousList() const {
    return std::any_of(_scenario.apps.begin(), _scenario.apps.end(),
                       [](const App& app) { return !app.previousMark.empty(); });
  }

  Value todoList(std::string App::*operation) const {
    Value list = Value::makeArray();
    for (const auto& app : _scenario.apps) {
      if (!(app.*operation).empty()) list.array()->append(entryOf(app, app.*operation));
    }
    return list;
  }

  void stage() {
    std::string staging = stagingDirectory;
    _rig.write(staging + "/ApplicationsSync.plist",
               _scenario.rawTodo ? *_scenario.rawTodo : binaryList(todoList(&App::operation)));
    if (!_scenario.layout.empty()) {
      _rig.write(staging + "/PanelloIconState.plist", plist::writeXML(arrayOf(_scenario.layout)).value());
    }
    for (const auto& app : _scenario.apps) {
      if (app.operation.empty() || !app.hasFolder || app.id.find('/') != app.id.npos) continue;
      Value manifest = dictionaryOf({{"KBBundleIdentifier", app.id}, {"KBBundleVersion", "2.0"}});
      if (app.hasIcon) {
        manifest.dictionary()->set("KBBundleIconFile", "icon.png");
        _rig.write(staging + '/' + app.id + "/icon.png", iconImage());
      }
      const auto& content = app.content;
      manifest = filledOut(manifest, content.manifestKeys, content.seed);
      const Value metadata = filledOut(dictionaryOf({{"vantorId", "me"}}), content.metadataKeys, content.seed);
      _rig.write(staging + '/' + app.id + "/Info.plist", binaryList(manifest));
      _rig.write(staging + '/' + app.id + "/HarluneMetadata.plist", plist::writeXML(metadata).value());
      _rig.write(staging + '/' + app.id + "/HarluneArtwork", iconImage());
    }
  }

  static std::vector<std::string> deletedBy(const Value& assets) {
    std::vector<std::string> identifiers;
    if (!assets.dictionary()) return identifiers;
    const Value& list = (*assets.dictionary())["_Deleted"];
    for (const Value& entry : *list.array()) {
      identifiers.emplace_back(*(*entry.dictionary())["KBBundleIdentifier"].string());
    }
    std::sort(identifiers.begin(), identifiers.end());
    return identifiers;
  }

  void transferAll(Outcome& outcome) {
    auto assets = _rig.daemon().outstandingAssetTransfers();
    for (const auto& asset : assets) outcome.requested.push_back(asset->identifier());
    _rig.deliver();
    transferInAnyOrder(assets);
    _rig.deliver();
    for (const auto& asset : assets) {
      if (const App* app = appOf(asset->identifier())) report(*app, asset);
    }
    _rig.deliver();
  }

  const App* appOf(const std::string& identifier) const {
    for (const auto& app : _scenario.apps) {
      if (app.id == identifier) return &app;
    }
    return nullptr;
  }

  std::size_t choose(std::size_t count) { return _scenario.chooser ? _scenario.chooser(count) : 0; }

  /// All are in flight, and something else may be delivered in between.
  void transferInAnyOrder(const std::vector<TSAssetRef>& assets) {
    std::vector<std::pair<TSAssetRef, bool>> inFlight;  // and whether it has begun
    for (const auto& asset : assets) {
      inFlight.emplace_back(asset, false);
      const App* app = appOf(asset->identifier());
      if (!app) continue;
      asset->setIsDownload(app->isDownload);
      asset->setIsRestore(app->isRestore);
      asset->setCompletedAssetParts(app->parts);
    }
    while (!inFlight.empty()) {
      std::size_t chosen = choose(inFlight.size());
      auto& [asset, hasBegun] = inFlight[chosen];
      const App* app = appOf(asset->identifier());
      if (app && !hasBegun && app->transfer != App::Transfer::neverStarts) {
        beginTransfer(*app, asset);
        hasBegun = true;
      } else {
        if (app && hasBegun) endTransfer(*app, asset);
        inFlight.erase(inFlight.begin() + static_cast<std::ptrdiff_t>(chosen));
      }
      if (choose(3) == 1) _rig.events().deliverNext();
    }
  }

  void beginTransfer(const App& app, const TSAssetRef& asset) {
    _rig.progress(asset, 0.25);
    act(app);
  }

  void endTransfer(const App& app, const TSAssetRef& asset) {
    if (_rig.transfers().wasCancelled(app.id)) {
      _rig.transferEnded(asset, false, platform::makeError("Daemon", 7, "cancelled"));
      return;
    }
    _rig.progress(asset, 0.75);
    if (app.transfer == App::Transfer::stalls) return;
    bool arrives = app.transfer == App::Transfer::arrives;
    if (arrives) receive(app, *asset);
    _rig.transferEnded(asset, arrives, arrives ? nullptr : platform::makeError("Daemon", 5, "connection lost"));
  }

  void act(const App& app) {
    // Somebody else may have been there before.
    if (app.person == App::Person::cancels) _rig.device().cancelByPerson(app.id);
    if (app.person == App::Person::prioritizes) _rig.device().prioritizeByPerson(app.id);
    if (app.person == App::Person::uninstalls) _rig.device().uninstallByPerson(app.id);
    if (app.person != App::Person::nothing) _rig.deliver();
  }

  void receive(const App& app, platform::TSAsset& asset) {
    _rig.device().files().removeItem(packagePath(app));
    if (app.package != App::Package::missing) _rig.receivePackage(app.id, packageOfApp(app));
    if (app.path == App::Path::absolute) asset.setPath(packagePath(app));
    if (app.path == App::Path::relative) asset.setPath("Packages/" + app.id + ".pkg");
    if (app.path == App::Path::climbing) asset.setPath("Packages/../Packages/" + app.id + ".pkg");
  }

  static Bytes packageOfApp(const App& app) {
    auto package = packageOf(app.package == App::Package::ofAnotherApp ? "app.other" : app.id, "2.0", app.content);
    return app.package == App::Package::damaged ? package.substr(0, package.size() / 2) : package;
  }

  void report(const App& app, const TSAssetRef& asset) {
    if (app.report == App::Report::succeeded) _rig.daemon().assetInstallSucceeded(asset);
    if (app.report == App::Report::failed)
      _rig.daemon().assetInstallFailed(asset, platform::makeError("Daemon", 9, "no room"));
  }

  void observe(Outcome& outcome) {
    const Value list = _rig.readList(todoListPath);
    if (list.array()) {
      for (const Value& element : *list.array()) {
        const auto* entry = element.dictionary();
        if (!entry) continue;
        outcome.marks.try_emplace(platform::describe((*entry)["identifier"]),
                                  platform::describe((*entry)["operation"]));
      }
    }
    outcome.cancelled = cancellationsIn(_rig.records());
    auto status = _rig.device().status();
    outcome.open = openCoordinators(status);
    for (const auto& app : status.apps) {
      if (app.isOnDevice()) outcome.present[app.id] = device::nameOfState(app.state);
    }
  }

  PluginRig& _rig;
  const Scenario& _scenario;
};

/// "title item item; ", or nothing.
template <class Items, class Show>
std::string items(const char* title, const Items& items, Show show) {
  if (items.empty()) return {};
  std::string text = title;
  for (const auto& item : items) text += ' ' + show(item);
  return text + "; ";
}

}  // namespace

Value entryOf(const ScenarioApp& app, const std::string& operation) {
  const Value entry =
      dictionaryOf({{"identifier", app.id}, {"operation", operation}, {"version", "2.0"}, {"name", nameOf(app.id)}});
  return filledOut(entry, app.content.entryKeys, app.content.seed);
}

Outcome run(PluginRig& rig, const Scenario& scenario) { return SyncPlayer(rig, scenario).play(); }

std::string Outcome::text() const {
  auto itself = [](const std::string& text) { return text; };
  auto pair = [](const auto& entry) { return entry.first + '=' + entry.second; };
  auto quoted = [](const std::string& text) { return '[' + text + ']'; };
  return std::string(reconciled ? "" : "not reconciled; ") + items("deleted", deleted, itself) +
         items("requested", requested, itself) + items("marks", marks, pair) + items("cancelled", cancelled, quoted) +
         items("open", open, quoted) + items("present", present, pair);
}

std::string cancellationOf(const CallRecord& record) {
  const auto& arguments = *record.arguments.dictionary();
  const auto* reason = arguments["reason"].dictionary();
  std::string what = record.service == "RVPlaceholder"             ? "placeholder"
                     : record.service == "RVAppInstallCoordinator" ? "coordinator"
                                                                   : "promise";
  std::string text = what + ' ' + record.app + ' ';
  text += reason ? platform::describe((*reason)["domain"]) + ' ' + platform::describe((*reason)["code"]) : "none";
  if (arguments["client"].integer() != 3) text += " by client " + platform::describe(arguments["client"]);
  return text;
}

std::vector<std::string> cancellationsIn(const std::vector<CallRecord>& records) {
  std::vector<std::string> cancellations;
  for (const auto& record : records) {
    if (record.operation == "cancelForReason") cancellations.push_back(cancellationOf(record));
  }
  std::sort(cancellations.begin(), cancellations.end());
  return cancellations;
}

std::vector<std::string> openCoordinators(const device::DeviceStatus& status) {
  std::vector<std::string> open;
  for (const auto& coordinator : status.coordinators) {
    if (coordinator.client == 3) open.push_back(coordinator.app + ' ' + device::shortNameOfKind(coordinator.kind));
  }
  return open;
}

std::vector<Failure> failuresOf(const std::vector<CallRecord>& records) {
  std::vector<Failure> failures;
  std::map<std::string, std::uint64_t> matches;
  std::map<std::string, std::uint64_t> ordinals;
  std::map<std::string, std::string> entries;  // by thread
  std::map<std::string, std::string> lastRead;
  for (const auto& record : records) {
    if (record.service == "AppsClient") {
      entries[record.thread] = record.end ? std::string() : record.operation;
      continue;
    }
    if (record.service == "log" || record.service == "InstallTransactionLog") continue;
    Failure failure{record.service + '.' + record.operation, record.app};
    // A rule without an app matches those of every app.
    failure.match = ++matches[failure.point + (record.app.empty() ? std::string() : ':' + record.app)];
    if (!record.app.empty()) ++matches[failure.point];
    failure.entry = entries[record.thread];
    if (record.service == "PropertyListSerialization") failure.path = lastRead[record.thread];
    for (const auto& [key, value] : *record.arguments.dictionary()) {
      if (record.service == "FileSystem" && value.string()) failure.path = *value.string();
    }
    if (record.operation == "readFile") lastRead[record.thread] = failure.path;
    failure.ordinal = ++ordinals[failure.entry + failure.point + failure.app + failure.path];
    failures.push_back(std::move(failure));
  }
  return failures;
}

static std::string joined(const std::vector<std::string>& lines) {
  std::string text;
  for (const auto& line : lines) text += "  " + line + '\n';
  return text;
}

::testing::AssertionResult inOrder(const std::vector<std::string>& lines, const std::vector<std::string>& patterns) {
  auto line = lines.begin();
  for (const auto& pattern : patterns) {
    line = std::find_if(line, lines.end(), [&](const std::string& text) { return matches(pattern, text); });
    if (line == lines.end()) {
      return ::testing::AssertionFailure() << "missing in its place: " << pattern << "\nof\n" << joined(lines);
    }
    ++line;
  }
  return ::testing::AssertionSuccess();
}

::testing::AssertionResult exactly(const std::vector<std::string>& lines, const std::vector<std::string>& patterns) {
  for (std::size_t i = 0; i < std::max(lines.size(), patterns.size()); ++i) {
    if (i < lines.size() && i < patterns.size() && matches(patterns[i], lines[i])) continue;
    return ::testing::AssertionFailure() << "line " << i + 1 << " should be\n  "
                                         << (i < patterns.size() ? patterns[i] : "(nothing)") << "\nin\n"
                                         << joined(lines);
  }
  return ::testing::AssertionSuccess();
}

}  // namespace tests
