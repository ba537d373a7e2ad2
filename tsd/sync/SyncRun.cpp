#include "tsd/sync/SyncRun.h"

#include <algorithm>
#include <cstdlib>
#include <optional>
#include <utility>

#include "platform/DevicePaths.h"
#include "platform/TodoOperation.h"
#include "tsd/CommandError.h"
#include "tsd/conduit/FileConduit.h"
#include "tsd/stopping/QuietWatch.h"
#include "tsd/sync/SyncOpening.h"
#include "tsd/sync/SyncOutcomes.h"
#include "tsd/terminal/Output.h"

namespace tsd {

using platform::ErrorRef;

namespace {

constexpr auto displayInterval = std::chrono::milliseconds(100);
/// How long to wait for the next sign of an outcome: a base, plus the time that a slow device needs for the bytes.
constexpr auto outcomeBase = std::chrono::seconds(60);
constexpr std::uint64_t outcomeBytesPerSecond = std::uint64_t{4} << 20;

/// How long a wait for outcomes may last: it is over when so much time has passed without a sign of life.
class Patience {
 public:
  Patience(platform::Clock& clock, std::chrono::seconds time, std::uint64_t signs)
      : _clock(clock), _time(time), _signs(signs), _deadline(clock.now() + time) {}

  platform::Clock::Instant deadline() const { return _deadline; }
  bool isOver() const { return _clock.now() >= _deadline; }
  void see(std::uint64_t signs) {
    if (std::exchange(_signs, signs) != signs) _deadline = _clock.now() + _time;
  }

 private:
  platform::Clock& _clock;
  const std::chrono::seconds _time;
  std::uint64_t _signs;
  platform::Clock::Instant _deadline;
};

double secondsSince(std::chrono::steady_clock::time_point start, std::chrono::steady_clock::time_point end) {
  return std::chrono::duration<double>(end - start).count();
}

}  // namespace

SyncReport SyncRun::run() {
  _began = std::chrono::steady_clock::now();
  _parts.watch.restart();
  _parts.verdicts.restart();
  _before = appsOnDevice();
  if (pushHost()) sync();
  fillReport();
  _parts.progress.finish();
  return std::move(_report);
}

/// False, with the report's message, when the device cannot take the host's files; nothing has begun then.
bool SyncRun::pushHost() {
  _parts.progress.headline("Taking the host's files onto the device");
  try {
    FileConduit(_parts.session.files(), _parts.context.console, [this] {
      return _parts.stop.requested();
    }).pushStaging(_parts.options.host);
    return true;
  } catch (const CommandError& error) {
    _report.message = error.what();
    return false;
  }
}

void SyncRun::sync() {
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
  if (_deadlinePassed) return;
  _parts.session.device().events().drain();
  removeLeftPackages();
  ErrorRef error;
  if (!_parts.session.device().flush(&error) && _report.message.empty())
    _report.message = "not everything could be stored: " + textOf(error);
}

/// Everything up to the reconciliation. False when the plug-in refused a step.
bool SyncRun::begin() {
  auto opening = openSync(_parts.daemon);
  _report.deleted = std::move(opening.deleted);
  _report.message = std::move(opening.problem);
  if (!_report.message.empty()) return false;
  _isTaken = true;
  std::string problem;
  _todo = readTodoList(_parts.session.files(), &problem);
  if (!problem.empty()) _report.message = "the todo list on the device cannot be read: " + problem;
  return problem.empty();
}

void SyncRun::requestPackages() {
  _parts.progress.headline("Preparing the installs");
  recordPackagePaths();
  for (const auto& entry : _wanted) {
    if (entry.operation == platform::todo::install) _parts.progress.add(entry.identifier, entry.name);
  }
  _parts.queue.expect();
  _assets = _parts.daemon.outstandingAssetTransfers();
  // What was asked of the transfers meanwhile counts from the first package on.
  _parts.session.device().events().drain();
  for (const auto& asset : _assets) {
    _report.requested.push_back(asset->identifier());
    _parts.progress.add(asset->identifier(), asset->prettyName().value_or(""));
    // It is already there; the device's report may come later.
    auto app = _parts.session.device().app(asset->identifier());
    if (app && app->isOnDevice()) _parts.progress.placeholderShown(asset->identifier());
  }
  showOutcomes(true);
}

void SyncRun::recordPackagePaths() {
  for (const auto& reported : _parts.options.reports) {
    const std::string& id = reported.first;
    if (reported.second.path != AssetReport::Path::recorded) continue;
    auto entry = std::find_if(_wanted.begin(), _wanted.end(), [&](const auto& each) { return each.identifier == id; });
    auto app = _parts.session.device().app(id);
    std::string version = entry != _wanted.end() ? entry->version : app ? app->version : "";
    ErrorRef error;
    std::string path = std::string(platform::packagesDirectory) + "/" + id + ".pkg";
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
  _parts.queue.start(_assets);
  std::optional<Patience> patience;  // while nothing is sent
  while (true) {
    const auto now = _parts.queue.waitUntil(clock.now() + displayInterval);
    if (now == TransferQueue::Progression::ended) break;
    showOutcomes(false);
    if (now != TransferQueue::Progression::waits) {
      patience.reset();
      continue;
    }
    if (!patience) patience.emplace(clock, timeForOutcomes(), signsOfLife());
    patience->see(signsOfLife());
    // What never comes is found out at the end, whatever else is sent until then.
    if (patience->isOver()) _parts.queue.stopWaitingForOutcomes();
  }
  _parts.queue.finish();
}

/// The plug-in was told of a package that failed; only one that neither came nor failed leaves the phase unfinished.
bool SyncRun::transferPhaseSucceeded() const {
  return std::none_of(_assets.begin(), _assets.end(), [&](const auto& asset) {
    auto end = _parts.queue.result(asset->identifier()).end;
    return end == TransferQueue::End::stalled || end == TransferQueue::End::interrupted;
  });
}

std::chrono::seconds SyncRun::timeForOutcomes() const {
  std::uint64_t bytes = 0;
  for (const auto& asset : _assets) bytes += _parts.queue.result(asset->identifier()).bytes;
  return outcomeBase + std::chrono::seconds(bytes / outcomeBytesPerSecond);
}

void SyncRun::awaitOutcomes() {
  auto& events = _parts.session.device().events();
  Patience patience(events.clock(), timeForOutcomes(), signsOfLife());
  if (!_assets.empty()) _parts.progress.headline("Waiting for the outcomes");
  // On the heap, because a device that never goes quiet must not keep this thread waiting: see below.
  auto quiet = std::make_unique<QuietWatch>(events, _parts.stop);
  bool isQuiet = false;
  while (!isQuiet && !_parts.stop.requested() && !patience.isOver()) {
    isQuiet = quiet->waitUntil(std::min(patience.deadline(), events.clock().now() + displayInterval));
    showOutcomes(isQuiet);
    patience.see(signsOfLife());
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
    if (app && app->lastOutcome == device::InstallOutcome::installed && app->state == device::AppState::installed) {
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
  auto entries = files.list(platform::packagesDirectory);
  if (!entries) return;
  std::set<std::string> open;
  for (const auto& coordinator : _parts.session.device().status().coordinators) open.insert(coordinator.app + ".pkg");
  for (const auto& entry : *entries) {
    ErrorRef error;
    if (!open.count(entry.name) &&
        !files.removeItem(std::string(platform::packagesDirectory) + "/" + entry.name, &error))
      _parts.context.console.message("a package was left behind: " + textOf(error));
  }
}

std::set<std::string> SyncRun::appsOnDevice() const {
  std::set<std::string> ids;
  for (const auto& app : _parts.session.device().status().apps) {
    if (app.isOnDevice()) ids.insert(app.id);
  }
  return ids;
}

/// Whatever the device tells of an app, and every call between it and the plug-in: when all apps are installed, the
/// marks of thousands are still to be written.
std::uint64_t SyncRun::signsOfLife() const { return _parts.watch.changes() + _parts.verdicts.heard(); }

void SyncRun::showOutcomes(bool always) {
  for (const auto& ending : _parts.verdicts.takeEndings())
    _parts.progress.ended(ending.app, wordsOf(ending.outcome), ending.reason, false);
  if (!_isTaken) return;
  const std::uint64_t signs = signsOfLife();
  if (!always && signs == _signsShown) return;
  _signsShown = signs;
  _todo = readTodoList(_parts.session.files());
  for (const auto& entry : _todo) {
    if (entry.operation == platform::todo::installed) _parts.progress.ended(entry.identifier, "installed", "", true);
    if (entry.operation == platform::todo::failed) {
      auto app = _parts.session.device().app(entry.identifier);
      _parts.progress.ended(entry.identifier, "failed", app ? reasonForPeople(app->lastReason) : "", false);
    }
  }
}

void SyncRun::fillReport() {
  showOutcomes(true);
  const SyncFacts facts{
      .device = _parts.session.device(),
      .queue = _parts.queue,
      .verdicts = _parts.verdicts,
      .wanted = _wanted,
      .todo = _todo,
      .before = _before,
      .assets = _assets,
      .reportedReasons = _reportedReasons,
      .broken = whyBroken(),
  };
  const SyncOutcomes outcomes(facts);
  _report.apps = outcomes.all();
  _report.removed = outcomes.removed();
  for (const auto& app : _report.apps)
    _parts.progress.ended(app.id, wordsOf(app.outcome), app.reason, isInOrder(app.outcome));
  _report.todo = std::move(_todo);
  _report.seconds = secondsSince(_began, std::chrono::steady_clock::now());
  if (auto last = _parts.watch.lastPlaceholderSeen()) _report.placeholderSeconds = secondsSince(_began, *last);
  _report.code = code();
}

std::string SyncRun::whyBroken() const {
  if (_parts.stop.requested()) return "the sync was stopped before its turn";
  return _report.message.empty() ? "" : "the sync failed before its turn";
}

ExitCode SyncRun::code() const {
  if (_parts.stop.requested()) return ExitCode::cancelled;
  if (_deadlinePassed) return ExitCode::deadline;
  if (!_report.message.empty()) return ExitCode::failed;
  bool allGood =
      std::all_of(_report.apps.begin(), _report.apps.end(), [](const auto& app) { return isInOrder(app.outcome); });
  return allGood ? ExitCode::done : ExitCode::someFailed;
}

}  // namespace tsd
