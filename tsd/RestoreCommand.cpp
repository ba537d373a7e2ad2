#include <filesystem>
#include <optional>

#include "plist/PropertyList.h"
#include "tsd/AppWatch.h"
#include "tsd/CommandError.h"
#include "tsd/Commands.h"
#include "tsd/Daemon.h"
#include "tsd/DeviceSession.h"
#include "tsd/FileConduit.h"
#include "tsd/Output.h"
#include "tsd/Progress.h"
#include "tsd/StopSignal.h"

namespace tsd {

using platform::Value;

namespace {

constexpr const char* listPath = "/var/mobile/Media/HarluneRestore/RestoreApplications.plist";
constexpr const char* demotedPath = "/var/mobile/Library/Preferences/com.vantor.Cellarum.DemotedApps.plist";
constexpr std::size_t maximumList = std::size_t{1} << 30;

struct RestoredApp {
  std::string id;
  std::string name;
  std::string version;
  std::string state;  // of its placeholder, in words; empty while it is missing
  std::uint64_t installType = 0;
};

/// What the host wants restored; with `problem`, why that cannot be told.
struct RestoreList {
  bool exists = false;
  std::string problem;
  std::vector<RestoredApp> apps;
};

RestoredApp readEntry(std::string_view id, const Value& entry) {
  RestoredApp app;
  app.id = id;
  app.name = id;
  const auto* fields = entry.dictionary();
  auto bytes = fields ? (*fields)["HarluneMetadata"].data() : std::nullopt;
  Value metadata = bytes ? plist::read(platform::Bytes(*bytes)) : Value();
  if (const auto* facts = metadata.dictionary()) {
    if (auto title = (*facts)["title"].string()) app.name = *title;
    if (auto version = (*facts)["bundleVersion"].string()) app.version = *version;
  }
  return app;
}

/// False for what is not there; throws when that cannot be told.
bool isThere(const std::string& path) {
  std::error_code problem;
  auto facts = std::filesystem::symlink_status(path, problem);
  if (facts.type() == std::filesystem::file_type::none) throw CommandError(path + ": " + problem.message());
  return std::filesystem::exists(facts);
}

RestoreList readRestoreList(const std::string& path) {
  RestoreList list;
  list.exists = isThere(path);
  if (!list.exists) return list;
  platform::ErrorRef error;
  auto file = HostFile::open("", path, &error);
  auto bytes = file ? file->readRest(maximumList, &error) : std::nullopt;
  if (!bytes) throw CommandError(path + ": " + textOf(error));
  Value root = plist::read(std::move(*bytes), &error);
  const auto* entries = root.dictionary();
  if (!entries) {
    list.problem = path + ": " + (root.isAbsent() ? textOf(error) : "not a dictionary");
    return list;
  }
  for (const auto& entry : *entries) list.apps.push_back(readEntry(entry.key, entry.value));
  return list;
}

const char* nameOfState(const device::AppStatus& app) {
  if (app.state != "placeholder") return app.state == "updating" ? "updating" : "installed";
  switch (app.installType) {
    case 2:
      return "restoring";
    case 7:
      return "demoted automatically";
    case 8:
      return "demoted by hand";
    default:
      return "placeholder";
  }
}

/// One restore, from the host's lists to its report.
class Restore {
 public:
  Restore(const CommandContext& context, const RestoreOptions& options)
      : _context(context),
        _options(options),
        _list(readRestoreList(options.host + "/Restore/RestoreApplications.plist")) {}

  ExitCode run();

 private:
  void pushLists(FileConduit& conduit);
  void reconcile(DeviceSession& session, const StopSignal& stop, Progress& progress);
  void look(DeviceSession& session);
  ExitCode code(bool stopped) const;
  Value document(ExitCode code) const;
  std::string text(ExitCode code) const;
  std::vector<std::string> missing() const;
  std::string problem() const;  // the gravest one; empty: none
  bool restoresApps() const { return _options.type == 2 || _options.type == 3; }

  const CommandContext& _context;
  const RestoreOptions& _options;
  RestoreList _list;
  platform::ErrorRef _declined;
  platform::ErrorRef _unstored;  // why the device could not store everything
};

ExitCode Restore::run() {
  StopSignal stop;
  Progress progress(_context.console, _context.options.progress, Progress::Goal::placeholder);
  AppWatch watch(progress);
  const char* process = _options.inDaemon ? "com.vantor.tsd" : "com.vantor.shiftwell";
  {
    DeviceSession session(_context, {_options.device, process, nullptr, watch.listener(), DeviceUse::kept});
    FileConduit conduit(session.files(), _context.console);
    pushLists(conduit);
    if (!restoresApps()) _list.apps.clear();
    for (const auto& app : _list.apps) progress.add(app.id, app.name);
    StopSignal::Subscription told(stop, [this] { _context.console.message("stopping; a second signal ends at once"); });
    reconcile(session, stop, progress);
    session.device().events().drain();
    session.device().flush(&_unstored);
    look(session);
    for (const auto& app : _list.apps) {
      progress.ended(app.id, app.state.empty() ? "missing" : app.state, "", !app.state.empty());
    }
    progress.finish();
  }
  stop.letFinish();
  ExitCode result = code(stop.requested());
  if (!_list.problem.empty()) _context.console.message(_list.problem);
  if (_declined) _context.console.message("the backup service declined: " + textOf(_declined));
  if (_unstored) _context.console.message("not everything could be stored: " + textOf(_unstored));
  if (_context.options.json)
    writeDocument(document(result));
  else
    writeOutput(text(result));
  return result;
}

void Restore::pushLists(FileConduit& conduit) {
  std::string folder = _options.host + "/Restore";
  // The one that has not been read yet goes first, as the device stays as it is when it cannot be.
  std::string demoted = folder + "/com.vantor.Cellarum.DemotedApps.plist";
  if (isThere(demoted)) conduit.pushFile(demoted, demotedPath);
  if (_list.exists) conduit.pushFile(folder + "/RestoreApplications.plist", listPath);
}

void Restore::reconcile(DeviceSession& session, const StopSignal& stop, Progress& progress) {
  auto waiting = [&](long long seconds) { progress.countdown("Waiting for placeholders", seconds); };
  Daemon daemon(session.device(), session.loadPlugin(stop, waiting));
  if (_options.inDaemon) daemon.postStartupNotification();
  progress.headline("Preparing the restore");
  daemon.reconcileRestoreOfType(_options.type, &_declined);
  session.unloadPlugin();
}

void Restore::look(DeviceSession& session) {
  for (auto& app : _list.apps) {
    auto status = session.device().app(app.id);
    if (!status || status->state.empty()) continue;
    app.state = nameOfState(*status);
    app.installType = status->installType;
    if (!status->name.empty()) app.name = status->name;
  }
}

std::string Restore::problem() const {
  if (_unstored) return "not everything could be stored: " + textOf(_unstored);
  return _declined ? "the backup service declined: " + textOf(_declined) : _list.problem;
}

std::vector<std::string> Restore::missing() const {
  std::vector<std::string> ids;
  for (const auto& app : _list.apps) {
    if (app.state.empty()) ids.push_back(app.id);
  }
  return ids;
}

ExitCode Restore::code(bool stopped) const {
  if (stopped) return ExitCode::cancelled;
  if (_unstored) return ExitCode::failed;
  if (!restoresApps()) return ExitCode::done;
  if (!_list.problem.empty()) return ExitCode::failed;
  return missing().empty() ? ExitCode::done : ExitCode::deadline;
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
  }
  entries.set("apps", apps);
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
  std::string text;
  if (!_list.apps.empty()) {
    Table table({{"APP"}, {"NAME", 12}, {"VERSION", 7}, {"STATE"}});
    for (const auto& app : _list.apps) {
      table.add({app.id, app.name, app.version, app.state.empty() ? "missing" : app.state});
    }
    text += table.text();
  }
  auto gone = missing();
  if (!gone.empty()) {
    text += "Placeholders missing at the end:\n";
    for (const auto& id : gone) text += "  " + printable(id) + "\n";
  }
  text += std::string("Restore ") + (code == ExitCode::done        ? "done"
                                     : code == ExitCode::cancelled ? "cancelled"
                                                                   : "not complete");
  return text + ": " + std::to_string(_list.apps.size() - gone.size()) + " of " + std::to_string(_list.apps.size()) +
         " placeholders on the home screen.\n";
}

}  // namespace

ExitCode runRestore(const CommandContext& context, const RestoreOptions& options) {
  requireHostFolder(options.host);
  return Restore(context, options).run();
}

}  // namespace tsd
