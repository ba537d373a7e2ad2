#include <algorithm>
#include <map>
#include <set>

#include "tsd/AppStory.h"
#include "tsd/CommandError.h"
#include "tsd/Commands.h"
#include "tsd/Daemon.h"
#include "tsd/DeviceSession.h"
#include "tsd/FileConduit.h"
#include "tsd/Output.h"
#include "tsd/SyncOpening.h"
#include "tsd/TodoList.h"

namespace tsd {

using platform::Value;
using Kind = AppEvent::Kind;

namespace {

/// What a sync would do with one app.
struct Decision {
  std::string app;
  std::string name;
  std::string version;    // that the host has
  std::string what;       // "new", "update", "removed", "kept", "skipped", "refused", "failed" or "nothing"
  std::size_t place = 0;  // in the order in which packages are asked for, from 1; 0: its package is not
  std::string rule{};
  std::string fact{};  // that the rule saw; may be empty

  std::string why() const { return fact.empty() ? rule : rule + ": " + fact; }
};

/// A sync on a copy of the device as far as to the packages that it asks for, and what the plug-in said of each app
/// meanwhile.
class Rehearsal {
 public:
  Rehearsal(const CommandContext& context, const PlanOptions& options)
      : _context(context),
        _options(options),
        _story([this](const AppEvent& event) { hear(event); }),
        _session(context, {options.device, "com.vantor.tsd", nullptr, nullptr, DeviceUse::copy}) {
    _session.device().boundary().addJournal({[this](const device::CallRecord& record) { _story.hear(record); }});
  }

  void run();
  const std::vector<Decision>& decisions() const { return _decisions; }
  const std::vector<std::string>& deleted() const { return _opening.deleted; }

 private:
  struct Seen {
    std::optional<AppEvent> verdict;
    std::optional<AppEvent> exception;  // the rule that it passed though it might have been stopped
    bool updates = false;
  };

  void hear(const AppEvent& event);
  void decide();
  Decision requested(const std::string& id, const TodoEntry* entry) const;
  Decision other(const std::string& id, const TodoEntry* entry) const;

  const CommandContext& _context;
  const PlanOptions& _options;
  AppStory _story;
  std::map<std::string, device::AppStatus> _before;
  std::vector<TodoEntry> _todo;
  std::vector<std::string> _asked;
  std::map<std::string, Seen> _seen;
  std::string _noRemovals;  // why none are made; empty: they are
  SyncOpening _opening;
  std::vector<Decision> _decisions;
  DeviceSession _session;  // the last, as the story hears of it until it has gone
};

void Rehearsal::run() {
  for (const auto& app : _session.device().status().apps) {
    if (!app.state.empty()) _before[app.id] = app;
  }
  FileConduit(_session.files(), _context.console).pushStaging(_options.host);
  Daemon daemon(_session.device(), _session.loadPlugin());
  daemon.postStartupNotification();
  _opening = openSync(daemon);
  if (!_opening.problem.empty()) throw CommandError(_opening.problem);
  std::string problem;
  _todo = readTodoList(_session.files(), &problem);
  if (!problem.empty()) _context.console.message("the host's todo list cannot be read: " + problem);
  for (const auto& asset : daemon.outstandingAssetTransfers()) _asked.push_back(asset->identifier());
  // Uninstalls end later than the calls that ask for them.
  _session.device().events().drain();
  decide();
}

void Rehearsal::hear(const AppEvent& event) {
  switch (event.kind) {
    case Kind::removalsRestricted:
      _noRemovals = event.text;
      break;
    case Kind::chosen:
      _seen[event.app].exception = event;
      break;
    case Kind::updates:
      _seen[event.app].updates = true;
      break;
    case Kind::removed:
    case Kind::removalFailed:
    case Kind::refused:
    case Kind::skipped:
    case Kind::prepared:
    case Kind::preparationFailed:
      _seen[event.app].verdict = event;
      break;
    default:
      break;
  }
}

void Rehearsal::decide() {
  std::map<std::string, const TodoEntry*> entries;
  for (const auto& entry : _todo) entries.try_emplace(entry.identifier, &entry);
  auto entryOf = [&](const std::string& id) {
    auto found = entries.find(id);
    return found == entries.end() ? nullptr : found->second;
  };
  std::set<std::string> told;
  for (const auto& id : _asked) {
    if (!told.insert(id).second) continue;
    _decisions.push_back(requested(id, entryOf(id)));
    _decisions.back().place = _decisions.size();
  }
  for (const auto& entry : _todo) {
    if (told.insert(entry.identifier).second) _decisions.push_back(other(entry.identifier, entryOf(entry.identifier)));
  }
  for (const auto& [id, app] : _before) {
    if (app.state != "installed" && told.insert(id).second) _decisions.push_back(other(id, nullptr));
  }
}

Decision Rehearsal::requested(const std::string& id, const TodoEntry* entry) const {
  auto seen = _seen.find(id);
  bool updates = seen != _seen.end() && seen->second.updates;
  Decision decision{id, "", "", updates ? "update" : "new"};
  auto before = _before.find(id);
  if (entry) {
    decision.name = entry->name;
    decision.version = entry->version;
    decision.rule = "the host wants it";
    if (!entry->version.empty()) decision.fact = "version " + entry->version;
  } else {
    decision.rule = "its placeholder waits for a package";
  }
  if (seen != _seen.end() && seen->second.exception) {
    decision.rule = seen->second.exception->text;
  } else if (before != _before.end() && updates) {
    if (entry && !entry->version.empty()) decision.fact = entry->version + " over " + before->second.version;
  } else if (before != _before.end() && entry) {
    decision.fact += std::string(decision.fact.empty() ? "" : ", ") + "its placeholder is there";
  }
  return decision;
}

Decision Rehearsal::other(const std::string& id, const TodoEntry* entry) const {
  Decision decision{id, entry ? entry->name : "", entry ? entry->version : "", "nothing"};
  auto seen = _seen.find(id);
  if (seen != _seen.end() && seen->second.verdict) {
    const AppEvent& verdict = *seen->second.verdict;
    decision.what = verdict.kind == Kind::removed   ? "removed"
                    : verdict.kind == Kind::refused ? "refused"
                    : verdict.kind == Kind::skipped ? "skipped"
                                                    : "failed";
    decision.rule = verdict.kind == Kind::removed ? "the host wants it removed" : verdict.text;
    decision.fact = verdict.fact;
  } else if (entry && entry->operation == "remove" && !_noRemovals.empty()) {
    decision.what = "kept";
    decision.rule = _noRemovals;
  } else if (entry) {
    decision.rule = "nothing is to be done for its entry of the todo list";
    decision.fact = entry->operation;
  } else {
    decision.rule = "nothing was said of it";
  }
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
  std::size_t width = 3;
  for (const auto& decision : decisions)
    width = std::max(width, std::min<std::size_t>(36, columnsOf(printable(decision.app))));
  auto front = [&](const std::string& place, const std::string& what, const std::string& app) {
    std::string padding(5 - std::min<std::size_t>(5, place.size()), ' ');
    std::string name = printable(app);
    return padding + place + "  " + fitted(what, 7) + "  " + (columnsOf(name) > width ? name : fitted(name, width)) +
           "  ";
  };
  std::string text;
  if (!decisions.empty()) text = front("PLACE", "WHAT", "APP") + "WHY\n";
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
  for (const char* what : {"new", "update", "removed", "kept", "skipped", "refused", "failed", "nothing"}) {
    if (counts[what]) sum += (sum.empty() ? "" : ", ") + std::to_string(counts[what]) + " " + what;
  }
  return text +
         wrappedLine("", "A sync would do this" + (sum.empty() ? "" : ": " + sum) + ". The device is as it was.");
}

}  // namespace

ExitCode runPlan(const CommandContext& context, const PlanOptions& options) {
  requireHostFolder(options.host);
  Rehearsal rehearsal(context, options);
  rehearsal.run();
  if (context.options.json)
    writeDocument(document(context, rehearsal));
  else
    writeOutput(text(rehearsal));
  return ExitCode::done;
}

}  // namespace tsd
