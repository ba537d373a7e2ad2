#include <algorithm>
#include <map>
#include <set>

#include "platform/TodoOperation.h"
#include "tsd/CommandError.h"
#include "tsd/command/Commands.h"
#include "tsd/conduit/FileConduit.h"
#include "tsd/daemon/Daemon.h"
#include "tsd/daemon/DeviceSession.h"
#include "tsd/daemon/TodoList.h"
#include "tsd/history/Outcome.h"
#include "tsd/history/Verdicts.h"
#include "tsd/host/PackageForecast.h"
#include "tsd/sync/HostTodo.h"
#include "tsd/sync/SyncOpening.h"
#include "tsd/terminal/Output.h"

namespace tsd {

using platform::Value;

namespace {

/// What a sync would do with one app.
struct Decision {
  std::string app;
  std::string name;
  std::string version;    // the host's
  std::string what;       // "new", "update", or the outcome in words
  Outcome outcome;        // as far as it can be foretold
  std::size_t place = 0;  // in the order in which packages are asked for, from 1; 0: its package is not
  std::string rule{};
  std::string fact{};  // that the rule saw; may be empty

  std::string why() const { return fact.empty() ? rule : rule + ": " + fact; }
};

/// A sync on a copy of the device, up to the packages that it asks for, and what the plug-in said of each app on the
/// way.
class Rehearsal {
 public:
  Rehearsal(const CommandContext& context, const PlanOptions& options)
      : _context(context), _options(options), _session(context, {.folder = options.device, .use = DeviceUse::copy}) {
    _session.device().boundary().addJournal({[this](const device::CallRecord& record) { _verdicts.hear(record); }});
  }

  /// `todo` is the host's list.
  void run(std::vector<TodoEntry> todo);
  const std::vector<Decision>& decisions() const { return _decisions; }
  const std::vector<std::string>& deleted() const { return _opening.deleted; }

 private:
  void decide();
  Decision decisionOf(const std::string& id, const TodoEntry* entry) const;
  Decision requested(const std::string& id, const TodoEntry* entry) const;
  Decision removal(const std::string& id) const;
  Decision other(const std::string& id, const TodoEntry* entry) const;

  const CommandContext& _context;
  const PlanOptions& _options;
  Verdicts _verdicts;
  std::map<std::string, device::AppStatus> _before;
  std::vector<TodoEntry> _todo;
  std::map<std::string, TodoWish> _wishes;
  std::vector<std::string> _asked;
  SyncOpening _opening;
  std::vector<Decision> _decisions;
  DeviceSession _session;  // last: the verdicts hear from it until it is destroyed
};

void Rehearsal::run(std::vector<TodoEntry> todo) {
  _todo = std::move(todo);
  _wishes = wishesOf(_todo);
  for (const auto& app : _session.device().status().apps) {
    if (app.isOnDevice()) _before[app.id] = app;
  }
  // All of it goes to memory. What a plan looks at, lists and icons, is never that large.
  constexpr std::uint64_t largestFile = std::uint64_t{64} << 20;
  FileConduit(_session.files(), _context.console, FileConduit::Limits{.fileBytes = largestFile})
      .pushStaging(_options.host);
  Daemon daemon(_session.device(), _session.loadPlugin());
  daemon.postStartupNotification();
  _opening = openSync(daemon);
  if (!_opening.problem.empty()) throw CommandError(_opening.problem);
  for (const auto& asset : daemon.outstandingAssetTransfers()) _asked.push_back(asset->identifier());
  // Uninstalls end later than the calls that ask for them.
  _session.device().events().drain();
  decide();
}

void Rehearsal::decide() {
  std::map<std::string, const TodoEntry*> entries;
  for (const auto& entry : _todo) entries.try_emplace(entry.identifier, &entry);
  std::set<std::string> told;
  auto tell = [&](const std::string& id, bool isAsked) {
    if (!told.insert(id).second) return;
    auto found = entries.find(id);
    const TodoEntry* entry = found == entries.end() ? nullptr : found->second;
    _decisions.push_back(isAsked ? requested(id, entry) : decisionOf(id, entry));
    if (isAsked) _decisions.back().place = _decisions.size();
    if (entry) {
      _decisions.back().name = entry->name;
      _decisions.back().version = entry->version;
    }
  };
  for (const auto& id : _asked) tell(id, true);
  for (const auto& entry : _todo) tell(entry.identifier, false);
  for (const auto& [id, app] : _before) {
    if (app.state != device::AppState::installed) tell(id, false);
  }
}

Decision Rehearsal::decisionOf(const std::string& id, const TodoEntry* entry) const {
  auto wish = _wishes.find(id);
  return wish != _wishes.end() && wish->second == TodoWish::removal ? removal(id) : other(id, entry);
}

Decision Rehearsal::requested(const std::string& id, const TodoEntry* entry) const {
  const auto verdict = _verdicts.of(id);
  const auto forecast = forecastOf(_options.host, id);
  auto before = _before.find(id);
  Decision decision{id, "", "", verdict.updates ? "update" : "new", Outcome::installed};
  if (!forecast.problem.empty()) {
    decision.what = wordsOf(decision.outcome = Outcome::failed);
    decision.rule = forecast.problem;
    return decision;
  }
  decision.rule = verdict.exception ? verdict.exception->text
                  : entry           ? "the host wants it"
                                    : "its placeholder waits for a package";
  if (verdict.updates) {
    decision.fact = updateText(entry ? entry->version : "", forecast.version,
                               before == _before.end() ? "" : before->second.version);
  } else {
    std::string version = updateText(entry ? entry->version : "", forecast.version, "");
    if (!version.empty()) decision.fact = "version " + version;
    if (before != _before.end() && entry)
      decision.fact += std::string(decision.fact.empty() ? "" : ", ") + "its placeholder is there";
  }
  return decision;
}

Decision Rehearsal::removal(const std::string& id) const {
  auto be = [&](Outcome outcome, const std::string& rule, const std::string& fact = "") {
    return Decision{id, "", "", wordsOf(outcome), outcome, 0, rule, fact};
  };
  if (!_before.count(id)) return be(Outcome::absent, "it is not on the device");
  const auto verdict = _verdicts.of(id).removal;
  if (verdict && verdict->kind == AppEvent::Kind::removed) return be(Outcome::removed, "the host wants it removed");
  if (verdict && verdict->kind == AppEvent::Kind::removalFailed)
    return be(Outcome::failed, verdict->text, verdict->fact);
  if (auto restricted = _verdicts.removalsRestricted(); !restricted.empty()) return be(Outcome::notAllowed, restricted);
  return be(Outcome::failed, "could not be removed");
}

Decision Rehearsal::other(const std::string& id, const TodoEntry* entry) const {
  Decision decision{id, "", "", "", Outcome::notRequested};
  const auto verdict = _verdicts.of(id).ofInstall();
  auto settled = verdict ? outcomeOf(verdict->kind) : std::nullopt;
  auto before = _before.find(id);
  auto wish = _wishes.find(id);
  if (wish != _wishes.end() && wish->second == TodoWish::other) {
    bool isInstalled = before != _before.end() && before->second.state == device::AppState::installed;
    decision.outcome =
        entry->operation == platform::todo::installed && isInstalled ? Outcome::installed : Outcome::unchanged;
    decision.rule = decision.outcome == Outcome::installed ? "it is installed, as its entry of the todo list says"
                                                           : "its entry of the todo list asks for nothing";
    if (decision.outcome == Outcome::unchanged)
      decision.fact = entry->operation.empty() ? "no operation" : entry->operation;
  } else if (settled) {
    decision.outcome = *settled;
    decision.rule = verdict->text;
    decision.fact = verdict->fact;
  } else if (entry && !isFileName(id)) {
    decision.outcome = Outcome::refused;
    decision.rule = "this cannot be an app's identifier";
  } else {
    decision.rule = entry ? "the plug-in did not ask for its package" : "the plug-in does not mention it";
  }
  decision.what = wordsOf(decision.outcome);
  return decision;
}

Value document(const CommandContext& context, const Rehearsal& rehearsal) {
  Value document = startDocument(context.options.command);
  auto& entries = *document.dictionary();
  entries.set("result", "done");
  entries.set("deleted", arrayOf(rehearsal.deleted()));
  Value apps = Value::makeArray();
  for (const auto& decision : rehearsal.decisions()) {
    auto& item = apps.array()->appendDictionary();
    item.set("id", decision.app);
    item.set("name", decision.name);
    item.set("version", decision.version);
    item.set("decision", decision.what);
    item.set("outcome", nameOf(decision.outcome));
    if (decision.place) item.set("place", decision.place);
    item.set("rule", decision.rule);
    item.set("fact", decision.fact);
  }
  entries.set("apps", apps);
  return document;
}

std::string text(const Rehearsal& rehearsal) {
  const auto& decisions = rehearsal.decisions();
  if (decisions.empty() && rehearsal.deleted().empty()) return "Nothing to do.\n";
  std::size_t whatWidth = 4, width = 3;
  for (const auto& decision : decisions) {
    whatWidth = std::max(whatWidth, columnsOf(decision.what));
    width = std::max(width, std::min<std::size_t>(36, columnsOf(printable(decision.app))));
  }
  auto front = [&](const std::string& place, const std::string& what, const std::string& app) {
    std::string padding(5 - std::min<std::size_t>(5, place.size()), ' ');
    std::string name = printable(app);
    return padding + place + "  " + fitted(what, whatWidth) + "  " +
           (columnsOf(name) > width ? name : fitted(name, width)) + "  ";
  };
  std::string text;
  if (!decisions.empty()) {
    text = front("PLACE", "WHAT", "APP") + "WHY";
    // Where the reasons begin on a line of their own, none stands below it.
    if (columnsOf(text) > lineWidth()) text = front("PLACE", "WHAT", "APP");
    text = text.substr(0, text.find_last_not_of(' ') + 1) + "\n";
  }
  std::map<std::string, std::size_t> counts;
  for (const auto& decision : decisions) {
    std::string place = decision.place ? std::to_string(decision.place) : "-";
    text += wrappedLine(front(place, decision.what, decision.app), decision.why());
    ++counts[decision.what];
  }
  if (!rehearsal.deleted().empty()) {
    text += "Deleted on the device, to be told to the host:\n";
    for (const auto& id : rehearsal.deleted()) text += "  " + printable(id) + "\n";
  }
  std::string sum;
  for (const auto& [what, count] : counts) sum += (sum.empty() ? "" : ", ") + std::to_string(count) + " " + what;
  return text + noteLine("", "A sync would do this" + (sum.empty() ? "" : ": " + sum) + ". The device is as it was.");
}

}  // namespace

ExitCode runPlan(const CommandContext& context, const PlanOptions& options) {
  requireHostFolder(options.host);
  auto wanted = readHostTodoList(options.host, context.console);
  Rehearsal rehearsal(context, options);
  rehearsal.run(std::move(wanted));
  if (context.options.json)
    writeDocument(document(context, rehearsal));
  else
    writeOutput(text(rehearsal));
  return ExitCode::done;
}

}  // namespace tsd
