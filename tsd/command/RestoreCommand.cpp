#include <algorithm>
#include <optional>

#include "device/services/ListProblem.h"
#include "platform/DeviceNames.h"
#include "platform/DevicePaths.h"
#include "platform/OBNumbers.h"
#include "plist/PropertyList.h"
#include "tsd/CommandError.h"
#include "tsd/command/Commands.h"
#include "tsd/conduit/FileConduit.h"
#include "tsd/daemon/AppWatch.h"
#include "tsd/daemon/Daemon.h"
#include "tsd/daemon/DeviceSession.h"
#include "tsd/history/Outcome.h"
#include "tsd/history/Verdicts.h"
#include "tsd/stopping/StopSignal.h"
#include "tsd/terminal/Output.h"
#include "tsd/terminal/Progress.h"

namespace tsd {

using platform::Value;

namespace {

struct RestoredApp : AppOutcome {
  std::string state;  // of its placeholder, in words; empty while it is missing
  std::uint64_t installType = 0;
};

/// What the host wants restored.
struct RestoreList {
  bool exists = false;
  std::vector<RestoredApp> apps;
};

/// Adds what is passed over in silence in its metadata to the problems.
RestoredApp readEntry(std::string_view id, const Value& entry, std::vector<std::string>& problems) {
  RestoredApp app;
  app.id = id;
  app.name = id;
  const auto* fields = entry.dictionary();
  auto bytes = fields ? (*fields)["HarluneMetadata"].data() : std::nullopt;
  Value metadata = bytes ? plist::read(platform::Bytes(*bytes)) : Value();
  if (const auto* facts = metadata.dictionary()) {
    if (auto problem = device::problemOfStoreMetadata(metadata); !problem.empty())
      problems.push_back(app.id + ": its \"HarluneMetadata\": " + problem);
    if (auto title = (*facts)["title"].string()) app.name = *title;
    if (auto version = (*facts)["bundleVersion"].string()) app.version = *version;
  }
  return app;
}

RestoreList readRestoreList(const std::string& folder, Console& console) {
  constexpr std::size_t mostNamed = 5;
  RestoreList list;
  std::vector<std::string> problems;
  const std::string path = folder + "/" + std::string(restoreListName);
  const Value root = readHostList(path, Value::Kind::dictionary);
  const auto* entries = root.dictionary();
  list.exists = entries != nullptr;
  if (!entries) return list;
  for (const auto& entry : *entries) list.apps.push_back(readEntry(entry.key, entry.value, problems));
  for (std::size_t place = 0; place < std::min(problems.size(), mostNamed); ++place)
    console.message(path + ": " + problems[place]);
  if (problems.size() > mostNamed)
    console.message(path + ": " + std::to_string(problems.size() - mostNamed) + " more apps have such metadata");
  return list;
}

const char* nameOfState(const device::AppStatus& app) {
  if (app.state != device::AppState::placeholder) return device::nameOfState(app.state);
  switch (app.installType) {
    case platform::installType::restore:
      return "restoring";
    case platform::installType::downgrade:
      return "demoted automatically";
    case platform::installType::intentionalDowngrade:
      return "demoted by hand";
    default:
      return device::nameOfState(app.state);
  }
}

/// One restore, from the host's lists to its report.
class Restore {
 public:
  Restore(const CommandContext& context, const RestoreOptions& options)
      : _context(context),
        _options(options),
        _folder(options.host + "/" + std::string(restoreName)),
        _list(readRestoreList(_folder, context.console)) {}

  ExitCode run();

 private:
  void pushLists(FileConduit& conduit);
  void reconcile(DeviceSession& session, const StopSignal& stop, EarlyEnd& earlyEnd, Progress& progress);
  void look(DeviceSession& session, bool stopped);
  void judge(RestoredApp& app, const device::AppStatus& status, bool stopped) const;
  void tell() const;
  ExitCode code(bool stopped) const;
  Value document(ExitCode code) const;
  std::string text(ExitCode code) const;
  std::vector<std::string> missing() const;
  std::string problem() const;  // the most serious one; empty: none
  bool restoresApps() const { return _options.type == 2 || _options.type == 3; }

  const CommandContext& _context;
  const RestoreOptions& _options;
  const std::string _folder;
  RestoreList _list;
  Verdicts _verdicts;
  platform::ErrorRef _besides;   // what the backup service reported, whether or not it agreed
  platform::ErrorRef _unstored;  // why the device could not store everything
};

ExitCode Restore::run() {
  StopSignal stop;
  Progress progress(_context.console, _context.options.progress, Progress::Goal::placeholder);
  AppWatch watch(progress);
  const auto process = _options.inDaemon ? platform::daemonBundleIdentifier : platform::migrationBundleIdentifier;
  {
    EarlyEnd earlyEnd(stop);
    DeviceSession session(_context, {.folder = _options.device,
                                     .mainBundleIdentifier = std::string(process),
                                     .changed = watch.listener(),
                                     .use = DeviceUse::kept,
                                     .earlyEnd = &earlyEnd});
    session.device().boundary().addJournal(
        {[this](const device::CallRecord& record) { _verdicts.hear(record); }, device::JournalDetail::brief});
    FileConduit conduit(session.files(), _context.console);
    pushLists(conduit);
    if (!restoresApps()) _list.apps.clear();
    for (const auto& app : _list.apps) progress.add(app.id, app.name);
    StopSignal::Subscription told(stop, [this] { _context.console.message("stopping; a second signal ends at once"); });
    reconcile(session, stop, earlyEnd, progress);
    session.device().events().drain();
    session.device().flush(&_unstored);
    look(session, stop.requested());
    for (const auto& app : _list.apps) {
      bool isGood = isInOrder(app.outcome);
      progress.ended(app.id, isGood ? app.state : wordsOf(app.outcome), isGood ? "" : app.reason, isGood);
    }
    progress.finish();
  }
  stop.letFinish();
  ExitCode result = code(stop.requested());
  _context.kept->conclude({_list.apps.begin(), _list.apps.end()}, problem());
  tell();
  if (_context.options.json)
    writeDocument(document(result));
  else
    _context.report(text(result), result);
  return result;
}

void Restore::pushLists(FileConduit& conduit) {
  // The list not read yet goes first: if it cannot be read, the device stays as it is.
  std::string demoted = _folder + "/" + std::string(demotedListName);
  if (isThere(demoted)) conduit.pushFile(demoted, platform::demotedAppsPath);
  if (_list.exists) conduit.pushFile(_folder + "/" + std::string(restoreListName), platform::restoreListPath);
}

void Restore::reconcile(DeviceSession& session, const StopSignal& stop, EarlyEnd& earlyEnd, Progress& progress) {
  auto waiting = [&](long long seconds) { progress.countdown("Waiting for placeholders", seconds); };
  Daemon daemon(session.device(), session.loadPlugin(stop, waiting), &earlyEnd);
  if (_options.inDaemon) daemon.postStartupNotification();
  progress.headline("Preparing the restore");
  daemon.reconcileRestoreOfType(_options.type, &_besides);
  session.unloadPlugin();
}

void Restore::look(DeviceSession& session, bool stopped) {
  for (auto& app : _list.apps) {
    auto status = session.device().app(app.id).value_or(device::AppStatus());
    if (status.isOnDevice()) {
      app.state = nameOfState(status);
      app.installType = status.installType;
      if (!status.name.empty()) app.name = status.name;
    }
    judge(app, status, stopped);
  }
}

void Restore::judge(RestoredApp& app, const device::AppStatus& status, bool stopped) const {
  auto be = [&](Outcome outcome, const std::string& reason) {
    app.outcome = outcome;
    app.reason = reason;
  };
  const auto verdict = _verdicts.of(app.id);
  auto settled = verdict.last ? outcomeOf(verdict.last->kind) : std::nullopt;
  if (auto declined = _verdicts.restoreDeclined()) return be(Outcome::notAllowed, declined->line());
  if (settled) return be(*settled, verdict.last->line());
  if (status.lastOutcome == device::InstallOutcome::cancelled)
    return be(Outcome::cancelled, reasonForPeople(status.lastReason));
  if (verdict.isAwaited)
    return be(stopped ? Outcome::notReached : Outcome::waiting,
              stopped ? "the restore was stopped before its placeholder was reported"
                      : "its placeholder was not reported before the deadline");
  if (!app.state.empty())
    return be(status.state == device::AppState::placeholder ? Outcome::placed : Outcome::installed, "");
  if (stopped) return be(Outcome::notReached, "the restore was stopped before its turn");
  be(Outcome::failed, "its placeholder is not on the home screen");
}

void Restore::tell() const {
  auto declined = _verdicts.restoreDeclined();
  if (declined) _context.console.message(declined->line());
  if (!declined && _besides)
    _context.console.message("the backup service wants placeholders, and also reported: " + textOf(_besides));
  if (_unstored) _context.console.message("not everything could be stored: " + textOf(_unstored));
}

std::string Restore::problem() const {
  if (_unstored) return "not everything could be stored: " + textOf(_unstored);
  if (auto declined = _verdicts.restoreDeclined()) return declined->line();
  return _besides ? "the backup service wants placeholders, and also reported: " + textOf(_besides) : "";
}

std::vector<std::string> Restore::missing() const {
  std::vector<std::string> ids;
  for (const auto& app : _list.apps) {
    if (app.state.empty()) ids.push_back(app.id);
  }
  return ids;
}

ExitCode Restore::code(bool stopped) const {
  auto any = [this](auto is) { return std::any_of(_list.apps.begin(), _list.apps.end(), is); };
  if (stopped) return ExitCode::cancelled;
  if (_unstored) return ExitCode::failed;
  if (any([](const auto& app) { return app.outcome == Outcome::waiting; })) return ExitCode::deadline;
  if (any([](const auto& app) { return !isInOrder(app.outcome); })) return ExitCode::someFailed;
  return ExitCode::done;
}

Value Restore::document(ExitCode code) const {
  Value document = startDocument(_context.options.command);
  auto& entries = *document.dictionary();
  entries.set("result", nameOfResult(code));
  entries.set("type", _options.type);
  Value apps = Value::makeArray();
  for (const auto& app : _list.apps) {
    auto& item = apps.array()->appendDictionary();
    item.set("id", app.id);
    item.set("name", app.name);
    item.set("version", app.version);
    item.set("state", app.state.empty() ? "missing" : app.state);
    item.set("installType", app.installType);
    item.set("outcome", nameOf(app.outcome));
    item.set("reason", app.reason);
  }
  entries.set("apps", apps);
  entries.set("counts", OutcomeCounts({_list.apps.begin(), _list.apps.end()}).document());
  entries.set("missing", arrayOf(missing()));
  std::string message = problem();
  if (!message.empty()) {
    Value error = Value::makeDictionary();
    if (code != ExitCode::done) error.dictionary()->set("exitCode", static_cast<int>(code));
    error.dictionary()->set("message", message);
    entries.set("error", error);
  }
  return document;
}

std::string Restore::text(ExitCode code) const {
  if (!_list.exists) return "Nothing to do: the host has no restore list.\n";
  if (!restoresApps()) {
    return "Nothing to do: a restore of type " + std::to_string(_options.type) + " brings no apps back.\n";
  }
  const std::vector<AppOutcome> outcomes(_list.apps.begin(), _list.apps.end());
  std::string text;
  if (!_list.apps.empty()) {
    Table table({{"APP", 8, true}, {"NAME", 4}, {"VERSION", 3, false, true}, {"STATE", 6, false, true}, {"OUTCOME"}});
    for (const auto& app : _list.apps) {
      table.add({app.id, app.name, app.version, app.state.empty() ? "missing" : app.state, wordsOf(app.outcome)});
    }
    text += table.text() + reasonsText(outcomes);
  }
  auto gone = missing();
  if (!gone.empty()) {
    text += "Placeholders missing at the end:\n";
    for (const auto& id : gone) text += "  " + printable(id) + "\n";
  }
  std::string counts = OutcomeCounts(outcomes).text();
  return text + noteLine("", "Restore " + wordsOfEnd(code) + (counts.empty() ? "." : ": " + counts + "."));
}

}  // namespace

ExitCode runRestore(const CommandContext& context, const RestoreOptions& options) {
  requireHostFolder(options.host);
  return Restore(context, options).run();
}

}  // namespace tsd
