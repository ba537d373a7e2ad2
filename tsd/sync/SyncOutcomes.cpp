#include "tsd/sync/SyncOutcomes.h"

#include "platform/RVClient.h"
#include "platform/TodoOperation.h"
#include "tsd/CommandError.h"
#include "tsd/conduit/HostFile.h"
#include "tsd/terminal/Output.h"

namespace tsd {

SyncOutcomes::SyncOutcomes(const SyncFacts& facts) : _facts(facts), _wishes(wishesOf(facts.wanted)) {
  for (const auto& entry : facts.todo) _marks.try_emplace(entry.identifier, &entry);
  for (const auto& asset : facts.assets) _requested.insert(asset->identifier());
  for (const auto& each : facts.device.status().coordinators) _openInstalls[each.app] = each.client;
}

std::vector<AppOutcome> SyncOutcomes::all() const {
  std::vector<AppOutcome> apps;
  std::set<std::string> seen;
  auto add = [&](const std::string& id, const std::string& name, const std::string& version) {
    if (!seen.insert(id).second) return;
    auto entry = _marks.find(id);
    const TodoEntry* known = entry == _marks.end() ? nullptr : entry->second;
    auto what = told(id);
    apps.push_back({id, name.empty() && known ? known->name : name, version.empty() && known ? known->version : version,
                    what.outcome, std::move(what.reason)});
  };
  for (const auto& asset : _facts.assets) add(asset->identifier(), asset->prettyName().value_or(""), "");
  for (const auto& entry : _facts.wanted) add(entry.identifier, entry.name, entry.version);
  return apps;
}

std::vector<std::string> SyncOutcomes::removed() const {
  std::vector<std::string> gone;
  std::set<std::string> seen;
  for (const auto& entry : _facts.wanted) {
    bool isGone = entry.operation == platform::todo::remove && _facts.before.count(entry.identifier) &&
                  !isThere(entry.identifier);
    if (isGone && seen.insert(entry.identifier).second) gone.push_back(entry.identifier);
  }
  return gone;
}

SyncOutcomes::Told SyncOutcomes::told(const std::string& id) const {
  auto wish = _wishes.find(id);
  if (wish == _wishes.end() || wish->second == TodoWish::install) return toldOfInstall(id);
  if (wish->second == TodoWish::removal) return toldOfRemoval(id);
  return toldOfOther(id, markOf(id));
}

SyncOutcomes::Told SyncOutcomes::toldOfInstall(const std::string& id) const {
  const std::string mark = markOf(id);
  if (mark == platform::todo::installed || mark == platform::todo::failed) return toldOfMarked(id, mark);
  return _requested.count(id) ? toldOfTransferred(id, mark) : toldOfUnrequested(id);
}

SyncOutcomes::Told SyncOutcomes::toldOfMarked(const std::string& id, const std::string& mark) const {
  auto app = _facts.device.app(id);
  if (mark == platform::todo::installed) {
    if (app && app->isOnDevice() && app->state != device::AppState::placeholder) return {Outcome::installed, ""};
    return {Outcome::failed, "it was installed, but is no longer on the device"};
  }
  auto verdict = _facts.verdicts.of(id).ofInstall();
  if (!_requested.count(id)) {
    return {Outcome::failed,
            verdict && outcomeOf(verdict->kind) ? verdict->line() : "its install could not be prepared"};
  }
  // The device forgets an app that the report of its failure removes.
  auto reported = _facts.reportedReasons.find(id);
  std::string reason = reasonForPeople(reported != _facts.reportedReasons.end() ? reported->second
                                       : app                                    ? app->lastReason
                                                                                : "");
  return {Outcome::failed, reason.empty() ? "the install failed" : reason};
}

SyncOutcomes::Told SyncOutcomes::toldOfUnrequested(const std::string& id) const {
  auto verdict = _facts.verdicts.of(id).ofInstall();
  auto outcome = verdict ? outcomeOf(verdict->kind) : std::nullopt;
  if (outcome) return {*outcome, verdict->line()};
  if (!_facts.broken.empty()) return {Outcome::notReached, _facts.broken};
  if (!isFileName(id)) return {Outcome::refused, "this cannot be an app's identifier"};
  auto open = _openInstalls.find(id);
  if (open != _openInstalls.end())
    return {Outcome::skipped, "install under way: " + nameOfClient(open->second) + " is already installing it"};
  return {Outcome::notRequested, "the plug-in did not ask for its package"};
}

SyncOutcomes::Told SyncOutcomes::toldOfTransferred(const std::string& id, const std::string& mark) const {
  using End = TransferQueue::End;
  auto result = _facts.queue.result(id);
  auto app = _facts.device.app(id);
  if (result.end == End::failed) return {Outcome::failed, textOf(result.error)};
  if (result.end == End::cancelled) return {Outcome::cancelled, textOf(result.error)};
  if (result.end == End::interrupted || result.end == End::none) {
    return {Outcome::notReached, "its package had not arrived"};
  }
  if (app && app->lastOutcome == device::InstallOutcome::cancelled) {
    return {Outcome::cancelled,
            result.end == End::stalled ? "its package never arrived" : reasonForPeople(app->lastReason)};
  }
  if (result.end == End::stalled) return {Outcome::waiting, "its package never arrived"};
  if (mark == platform::todo::sent)
    return {Outcome::sent, "its package has arrived, and is not to be installed by this sync"};
  if (mark == platform::todo::downloaded && _facts.queue.report(id).isRestore.value_or(false))
    return {Outcome::downloaded, "its package has arrived, and is the restore's to install"};
  bool isOpen = _openInstalls.count(id) != 0;
  if (app && app->state == device::AppState::installed && !isOpen) {
    if (mark.empty()) return {Outcome::installed, ""};
    auto unwritten = _facts.verdicts.of(id).markFailed;
    return {Outcome::unrecorded,
            "it is installed, but " +
                (unwritten ? unwritten->line() : "nothing was reported of it: its entry of the todo list is " + mark)};
  }
  if (app && app->lastOutcome == device::InstallOutcome::failed)
    return {Outcome::failed, reasonForPeople(app->lastReason)};
  if (!isOpen) return {Outcome::failed, "its package has arrived, and no install of it is open any more"};
  if (auto refusal = _facts.verdicts.of(id).pathRefused) return {Outcome::waiting, refusal->line()};
  return {Outcome::waiting, "its package has arrived, and nothing was reported of its install"};
}

SyncOutcomes::Told SyncOutcomes::toldOfRemoval(const std::string& id) const {
  bool wasThere = _facts.before.count(id) != 0;
  if (!isThere(id)) {
    if (wasThere) return {Outcome::removed, ""};
    return {Outcome::absent, "it is not on the device"};
  }
  auto verdict = _facts.verdicts.of(id).removal;
  if (verdict && verdict->kind == AppEvent::Kind::removalFailed) return {Outcome::failed, verdict->line()};
  std::string restricted = _facts.verdicts.removalsRestricted();
  if (!restricted.empty()) return {Outcome::notAllowed, restricted};
  if (!_facts.broken.empty()) return {Outcome::notReached, _facts.broken};
  return {Outcome::failed, "could not be removed"};
}

SyncOutcomes::Told SyncOutcomes::toldOfOther(const std::string& id, const std::string& operation) const {
  auto app = _facts.device.app(id);
  if (operation == platform::todo::installed && app && app->state == device::AppState::installed)
    return {Outcome::installed, ""};
  return {Outcome::unchanged,
          "its entry of the todo list asks for nothing: " + (operation.empty() ? "no operation" : operation)};
}

bool SyncOutcomes::isThere(const std::string& id) const {
  auto app = _facts.device.app(id);
  return app && app->isOnDevice();
}

std::string SyncOutcomes::markOf(const std::string& id) const {
  auto entry = _marks.find(id);
  return entry == _marks.end() ? "" : entry->second->operation;
}

}  // namespace tsd
