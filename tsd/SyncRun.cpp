#include "tsd/SyncRun.h"

#include <algorithm>
#include <cstdlib>
#include <optional>

#include "tsd/CommandError.h"
#include "tsd/FileConduit.h"
#include "tsd/Output.h"
#include "tsd/QuietWatch.h"
#include "tsd/SyncOpening.h"

namespace tsd {

using platform::ErrorRef;
using platform::Value;

namespace {

constexpr auto displayInterval = std::chrono::milliseconds(100);
/// How long the outcomes are waited for: a base, and as long as a slow device needs for the bytes.
constexpr auto outcomeBase = std::chrono::seconds(60);
constexpr std::uint64_t outcomeBytesPerSecond = std::uint64_t{4} << 20;

double secondsSince(std::chrono::steady_clock::time_point start, std::chrono::steady_clock::time_point end) {
  return std::chrono::duration<double>(end - start).count();
}

}  // namespace

SyncReport SyncRun::run() {
  _began = std::chrono::steady_clock::now();
  _parts.watch.restart();
  _parts.progress.headline("Taking the host's files onto the device");
  _before = appsOnDevice();
  FileConduit(_parts.session.files(), _parts.context.console).pushStaging(_parts.options.host);
  bool began = begin();
  if (began && !_parts.stop.requested()) {
    requestPackages();
    transferPackages();
    _phase = !_parts.stop.requested() && _parts.options.endPhase.value_or(transferPhaseSucceeded());
  }
  _parts.daemon.assetTransferEndedWithSuccess(_phase);
  if (began && !_parts.stop.requested()) awaitOutcomes();
  if (_parts.stop.requested()) _phase = false;
  if (began && _parts.options.daemonReports && !_parts.stop.requested()) sendInstallReports();
  _parts.daemon.syncEndedWithSuccess(_phase);
  if (!_deadlinePassed) {
    _parts.session.device().events().drain();
    removeLeftPackages();
    ErrorRef error;
    if (!_parts.session.device().flush(&error) && _report.message.empty())
      _report.message = "not everything could be stored: " + textOf(error);
  }
  fillReport();
  _parts.progress.finish();
  return std::move(_report);
}

/// Everything up to the reconciliation. False when the plug-in refused a step.
bool SyncRun::begin() {
  auto opening = openSync(_parts.daemon);
  _report.deleted = std::move(opening.deleted);
  _report.message = std::move(opening.problem);
  if (!_report.message.empty()) return false;
  std::string problem;
  _todo = readTodoList(_parts.session.files(), &problem);
  if (!problem.empty()) _parts.context.console.message("the host's todo list cannot be read: " + problem);
  _wanted = _todo;
  return true;
}

void SyncRun::requestPackages() {
  _parts.progress.headline("Preparing the installs");
  recordPackagePaths();
  for (const auto& entry : _wanted) {
    if (entry.operation == "install") _parts.progress.add(entry.identifier, entry.name);
  }
  _assets = _parts.daemon.outstandingAssetTransfers();
  for (const auto& asset : _assets) {
    _report.requested.push_back(asset->identifier());
    _requested.insert(asset->identifier());
    _parts.progress.add(asset->identifier(), asset->prettyName().value_or(""));
    // It is there already; the device's report may come later.
    auto app = _parts.session.device().app(asset->identifier());
    if (app && !app->state.empty()) _parts.progress.placeholderShown(asset->identifier());
  }
  showOutcomes(true);
  for (const auto& entry : _wanted) {
    if (entry.operation != "install" || _requested.count(entry.identifier)) continue;
    _parts.progress.ended(entry.identifier, isFileName(entry.identifier) ? "not asked for" : "refused", "", false);
  }
}

void SyncRun::recordPackagePaths() {
  for (const auto& reported : _parts.options.reports) {
    const std::string& id = reported.first;
    if (reported.second.path != AssetReport::Path::recorded) continue;
    auto entry = std::find_if(_wanted.begin(), _wanted.end(), [&](const auto& each) { return each.identifier == id; });
    auto app = _parts.session.device().app(id);
    std::string version = entry != _wanted.end() ? entry->version : app ? app->version : "";
    ErrorRef error;
    std::string path = std::string(packagesDirectory) + "/" + id + ".pkg";
    if (!recordPackagePath(_parts.session.files(), id, version, path, &error)) {
      _parts.context.console.message("the restore state: " + textOf(error));
    }
  }
}

void SyncRun::transferPackages() {
  if (_assets.empty() || _parts.stop.requested()) return;
  _parts.progress.headline("Sending " + std::to_string(_assets.size()) +
                           (_assets.size() == 1 ? " package" : " packages"));
  auto& clock = _parts.session.device().events().clock();
  _parts.queue.start(_parts.session.device(), _parts.daemon, _assets);
  while (!_parts.queue.waitUntil(clock.now() + displayInterval)) showOutcomes(false);
  _parts.queue.finish();
}

/// A package that failed has told the plug-in so; only one that neither came nor failed leaves the phase unfinished.
bool SyncRun::transferPhaseSucceeded() const {
  return std::none_of(_assets.begin(), _assets.end(), [&](const auto& asset) {
    auto end = _parts.queue.result(asset->identifier()).end;
    return end == TransferQueue::End::stalled || end == TransferQueue::End::interrupted;
  });
}

void SyncRun::awaitOutcomes() {
  std::uint64_t bytes = 0;
  for (const auto& asset : _assets) bytes += _parts.queue.result(asset->identifier()).bytes;
  auto& events = _parts.session.device().events();
  auto deadline = events.clock().now() + outcomeBase + std::chrono::seconds(bytes / outcomeBytesPerSecond);
  if (!_assets.empty()) _parts.progress.headline("Waiting for the outcomes");
  // On the heap, as a device that never goes quiet must not keep this thread: see below.
  auto quiet = std::make_unique<QuietWatch>(events, _parts.stop);
  bool isQuiet = false;
  while (!isQuiet && !_parts.stop.requested() && events.clock().now() < deadline) {
    isQuiet = quiet->waitUntil(std::min(deadline, events.clock().now() + displayInterval));
    showOutcomes(isQuiet);
  }
  if (isQuiet || _parts.stop.requested()) return;
  _deadlinePassed = true;
  _report.message = "the device did not report every outcome in time";
  static_cast<void>(quiet.release());  // its thread waits for the device; the process ends without either
}

void SyncRun::sendInstallReports() {
  for (const auto& asset : _assets) {
    if (_parts.queue.result(asset->identifier()).end != TransferQueue::End::arrived) continue;
    auto app = _parts.session.device().app(asset->identifier());
    if (app && app->lastOutcome == "INSTALLED" && app->state == "installed") {
      _parts.daemon.assetInstallSucceeded(asset);
    } else {
      std::string reason = app && !app->lastReason.empty() ? app->lastReason : "not installed";
      _reportedReasons[asset->identifier()] = reason;
      _parts.daemon.assetInstallFailed(asset, platform::makeError("Install", 1, reason));
    }
  }
}

/// Packages that the installer refused stay until the daemon removes them; those of open installs may still be wanted.
void SyncRun::removeLeftPackages() {
  auto& files = _parts.session.files();
  auto entries = files.list(packagesDirectory);
  if (!entries) return;
  std::set<std::string> open;
  for (const auto& coordinator : _parts.session.device().status().coordinators) open.insert(coordinator.app + ".pkg");
  for (const auto& entry : *entries) {
    ErrorRef error;
    if (!open.count(entry.name) && !files.removeItem(std::string(packagesDirectory) + "/" + entry.name, &error))
      _parts.context.console.message("a package was left: " + textOf(error));
  }
}

std::set<std::string> SyncRun::appsOnDevice() const {
  std::set<std::string> ids;
  for (const auto& app : _parts.session.device().status().apps) {
    if (!app.state.empty()) ids.insert(app.id);
  }
  return ids;
}

void SyncRun::showOutcomes(bool always) {
  std::uint64_t changes = _parts.watch.changes();
  if (!always && changes == _changesRead) return;
  _changesRead = changes;
  _todo = readTodoList(_parts.session.files());
  for (const auto& entry : _todo) {
    if (entry.operation == "INSTALLED") _parts.progress.ended(entry.identifier, "installed", "", true);
    if (entry.operation == "FAILED") {
      auto app = _parts.session.device().app(entry.identifier);
      _parts.progress.ended(entry.identifier, "failed", app ? reasonForPeople(app->lastReason) : "", false);
    }
  }
}

void SyncRun::fillReport() {
  showOutcomes(true);
  _report.todo = _todo;
  for (const auto& each : _parts.session.device().status().coordinators) _openInstalls[each.app] = each.client;
  std::map<std::string, const TodoEntry*> marks;
  for (const auto& entry : _todo) marks.try_emplace(entry.identifier, &entry);
  std::set<std::string> told;
  auto tell = [&](const std::string& id, const std::string& name, const std::string& version) {
    if (!told.insert(id).second) return;
    auto mark = marks.find(id);
    AppOutcome outcome = outcomeOf(id, mark == marks.end() ? "" : mark->second->operation);
    outcome.name = name.empty() && mark != marks.end() ? mark->second->name : name;
    outcome.version = version.empty() && mark != marks.end() ? mark->second->version : version;
    _report.apps.push_back(std::move(outcome));
  };
  for (const auto& asset : _assets) tell(asset->identifier(), asset->prettyName().value_or(""), "");
  auto after = appsOnDevice();
  for (const auto& entry : _wanted) {
    if (entry.operation == "install") tell(entry.identifier, entry.name, entry.version);
    if (entry.operation != "remove" || !_before.count(entry.identifier)) continue;
    if (!after.count(entry.identifier))
      _report.removed.push_back(entry.identifier);
    else if (told.insert(entry.identifier).second)
      _report.apps.push_back(outcomeOfKept(entry));
  }
  auto ended = std::chrono::steady_clock::now();
  _report.seconds = secondsSince(_began, ended);
  if (auto last = _parts.watch.lastPlaceholderSeen()) _report.placeholderSeconds = secondsSince(_began, *last);

  bool allGood = std::all_of(_report.apps.begin(), _report.apps.end(), [](const auto& app) { return app.isGood(); });
  _report.code = _parts.stop.requested()    ? ExitCode::cancelled
                 : _deadlinePassed          ? ExitCode::deadline
                 : !_report.message.empty() ? ExitCode::failed
                 : !allGood                 ? ExitCode::someFailed
                                            : ExitCode::done;
}

AppOutcome SyncRun::outcomeOf(const std::string& id, const std::string& mark) const {
  using End = TransferQueue::End;
  AppOutcome outcome{id, "", "", "", ""};
  auto app = _parts.session.device().app(id);
  bool requested = _requested.count(id) != 0;
  auto result = _parts.queue.result(id);
  auto be = [&](const char* word, const std::string& reason) {
    outcome.outcome = word;
    outcome.reason = reason;
  };
  if (mark == "INSTALLED") {
    be("INSTALLED", "");
  } else if (mark == "FAILED") {
    // The device forgets an app that the report of its failure removes.
    auto reported = _reportedReasons.find(id);
    std::string reason = reasonForPeople(reported != _reportedReasons.end() ? reported->second
                                         : app                              ? app->lastReason
                                                                            : "");
    be("FAILED", !requested ? "its install could not be prepared" : !reason.empty() ? reason : "the install failed");
  } else if (!requested) {
    if (isFileName(id))
      be("SKIPPED", reasonForSkipping(id));
    else
      be("REFUSED", "this cannot be an app's identifier");
  } else if (result.end == End::failed) {
    be("FAILED", textOf(result.error));
  } else if (result.end == End::cancelled) {
    be("CANCELLED", textOf(result.error));
  } else if (result.end == End::interrupted || result.end == End::none) {
    be("INTERRUPTED", "its package had not arrived");
  } else if (app && app->lastOutcome == "CANCELED") {
    be("CANCELLED", result.end == End::stalled ? "its package never arrived" : reasonForPeople(app->lastReason));
  } else if (result.end == End::stalled) {
    be("PENDING", "its package never arrived");
  } else if (mark == "SENT") {
    be("SENT", "");
  } else if (mark == "DOWNLOADED" && _parts.queue.report(id).isRestore.value_or(false)) {
    be("DOWNLOADED", "");
  } else {
    be("PENDING", "its package arrived, and nothing was reported of its install");
  }
  return outcome;
}

/// Of an app that the host wants removed, and that is still there.
AppOutcome SyncRun::outcomeOfKept(const TodoEntry& entry) const {
  bool restricted = _parts.session.device().setting("app-removal") == "forbidden";
  return {entry.identifier, entry.name, entry.version, restricted ? "SKIPPED" : "FAILED",
          restricted ? "removing apps is restricted" : "it could not be removed"};
}

std::string SyncRun::reasonForSkipping(const std::string& id) const {
  auto& device = _parts.session.device();
  if (device.setting("app-installation") == "forbidden") return "installing apps is restricted";
  auto open = _openInstalls.find(id);
  if (open != _openInstalls.end()) {
    return open->second == platform::RVClientMercato ? "the store installs it" : "its install is under way";
  }
  return "the plug-in did not ask for its package";
}

}  // namespace tsd
