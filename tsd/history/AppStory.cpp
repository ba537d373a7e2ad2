#include "tsd/history/AppStory.h"

#include <cstdio>
#include <cstdlib>
#include <iterator>

#include "platform/RVClient.h"
#include "tsd/history/MessagePattern.h"
#include "tsd/terminal/Output.h"

namespace tsd {

using platform::Dictionary;
using platform::Value;
using Kind = AppEvent::Kind;

namespace {

constexpr std::string_view messagePrefix = "com.vantor.tsd.appsync|";

/// A message of the plug-in, and the event it stands for.
struct MessageRow {
  const char* pattern;
  std::size_t app;  // the number of the pattern's gap that holds the app
  Kind kind;
  const char* text;
  int fact = -1;  // the number of the gap that holds the fact; -1: none
};

// The first match counts.
constexpr MessageRow messageRows[] = {
    {"{} not installed, but is in our todo list. Not marking deleted", 0, Kind::goneUntold,
     "gone from the device, still to be installed: the host is not told"},
    {"{} not installed, and no todo ({}) Marking as deleted", 0, Kind::deleted,
     "removed on the device, the host is told"},
    {"{} targeted for termination", 0, Kind::removing, "the host wants it removed"},
    {"Uninstall of {} with install coordinator succeeded wiht error (null).", 0, Kind::removed, "removed"},
    {"Uninstall of {} with install coordinator succeeded wiht error {}.", 0, Kind::removalFailed,
     "could not be removed", 1},
    {"Uninstall {} = y", 0, Kind::removed, "its placeholder is removed, as all sync data is forgotten"},
    {"Uninstall {} = n", 0, Kind::removalFailed, "its placeholder could not be removed"},
    {"prioritize {}", 0, Kind::considered, "its place is that on the home screen"},
    {"lastly {}", 0, Kind::considered, "its place is after those on the home screen"},
    {"{} is currenlty marked to be restored and will be handled by tillerd - skipping", 0, Kind::skipped,
     "being restored: the restore brings its package"},
    {"skipping {} - its not a restore and app installation is disabled", 0, Kind::notAllowed,
     "installing apps is restricted"},
    {"{} is auto demoted: {}, manual demoted: {}, system app:1 - skipping", 0, Kind::skipped,
     "the placeholder of a system app"},
    {"{} is system app placeholder - skipping", 0, Kind::skipped, "the placeholder of a system app"},
    {"{} is currenlty demoted (manual:0, auto:1) - skipping", 0, Kind::skipped, "auto demoted and not requested"},
    {"{} is currenlty demoted (manual:{}, auto:{}) - skipping", 0, Kind::skipped, "demoted by hand and not requested"},
    {"{} is currenlty demoted (manual:0, auto:1) - but will be installed as it's requested by client", 0, Kind::chosen,
     "auto demoted, but requested"},
    {"{} is currenlty demoted (manual:{}, auto:{}) - but will be installed as it's requested by client", 0,
     Kind::chosen, "demoted by hand, but requested"},
    {"App {} is already installed and will be updated.", 0, Kind::updates, "already installed, to be updated"},
    {"processing app install for bundle {} finished with status 1 error {}", 0, Kind::prepared,
     "its package is asked for"},
    {"processing app install for bundle {} finished with status {} error {}", 0, Kind::preparationFailed,
     "its install could not be prepared", 2},
    {"added placeholder promise to coordinator for {}", 0, Kind::attached, "its placeholder is handed to the device"},
    {"coordinator for {} has a placeholder promise", 0, Kind::attached, "its placeholder is there from before"},
    {"coordinatorDidInstallPlaceholder for {} with error (null)", 0, Kind::shown,
     "its placeholder is on the home screen"},
    {"Satisfying asset promise for {}", 0, Kind::installing, "the device has its package, and installs it"},
    {"coordinatorDidCompleteSuccessfully for {} with error (null)", 0, Kind::installed, "installed"},
    {"coordinatorDidCompleteSuccessfully for {} with error {}", 0, Kind::failed, "the install failed", 1},
    {"processing app restore for demoted bundle '{}' with install coordination", 0, Kind::restoring,
     "its restore as a demoted app is being prepared"},
    {"processing app restore for non demoted bundle '{}' with install coordination", 0, Kind::restoring,
     "its restore is being prepared"},
    {"processing app restore for demoted app {} finished with status 1 error {}", 0, Kind::restored,
     "prepared, as a demoted app"},
    {"processing app restore for demoted app {} finished with status {} error {}", 0, Kind::restoreFailed,
     "its restore could not be prepared", 2},
    {"processing app restore for {} finished with status 1 error {}", 0, Kind::restored, "prepared"},
    {"processing app restore for {} finished with status {} error {}", 0, Kind::restoreFailed,
     "its restore could not be prepared", 2},
    {"set RVClientMercato to satisfy app asset promise for {}", 0, Kind::leftToStore,
     "the store is to deliver its package"},
    {"App asset DRI for {} is set to {} - nothing more for tsd to do", 0, Kind::leftToStore,
     "the store is to deliver its package, since an earlier run"},
    {"Shiftwell will wait for RC to install placeholder for {}, _restoringPlaceholderCount {}", 0, Kind::awaited,
     "the restore waits for its placeholder"},
    {"RC finished installing placeholder for {}, _restoringPlaceholderCount {}", 0, Kind::awaitEnded,
     "the restore has its placeholder"},
    {"Shiftwell cancelled coordinator for restoring app bundle {} _restoringPlaceholderCount {}", 0, Kind::awaitEnded,
     "the restore no longer waits for its placeholder"},
    {"no HarluneMetadata for '{}' - ignoring", 0, Kind::refused, "the restore list has no store metadata of it"},
    {"no harlune restore info for '{}' - skipping", 0, Kind::refused,
     "its entry of the restore list is not a dictionary"},
};

/// "OBInstallTypeStoreDownload" as "store download".
std::string wordsOf(std::string_view name) {
  for (std::string_view prefix : {"OBInstallType", "OBInstallState", "OBInstallPhase"}) {
    if (name.substr(0, prefix.size()) == prefix) name.remove_prefix(prefix.size());
  }
  std::string words;
  for (char c : name) {
    bool isCapital = c >= 'A' && c <= 'Z';
    if (isCapital && !words.empty() && words.back() != ' ') words += ' ';
    words += isCapital ? static_cast<char>(c - 'A' + 'a') : c;
  }
  return words;
}

/// An error as the journal and the messages show it, in words.
std::string reasonIn(std::string_view described) {
  if (described == "(null)") return {};
  return reasonForPeople(described);
}

std::string reasonOfError(const Value& error) {
  const Dictionary* facts = error.dictionary();
  if (!facts) return {};
  if (auto text = (*facts)["description"].string()) return std::string(*text);
  if (!(*facts)["underlying"].isAbsent()) return reasonOfError((*facts)["underlying"]);
  return reasonIn(std::string((*facts)["domain"].string().value_or("")) + ' ' +
                  std::to_string((*facts)["code"].integer().value_or(0)));
}

std::string percent(double fraction) {
  char text[16];
  std::snprintf(text, sizeof text, "%.0f %%", fraction * 100);
  return text;
}

}  // namespace

const char* nameOfKind(Kind kind) {
  static const char* const names[] = {
      "goneUntold",     "deleted",     "removing",     "removed",    "removalFailed",
      "considered",     "refused",     "pathRefused",  "skipped",    "notAllowed",
      "chosen",         "updates",     "preparing",    "prepared",   "preparationFailed",
      "attached",       "shown",       "transferring", "arrived",    "transferFailed",
      "installing",     "installed",   "failed",       "cancelled",  "prioritized",
      "reported",       "marked",      "markFailed",   "restoring",  "restored",
      "restoreFailed",  "leftToStore", "awaited",      "awaitEnded", "removalsRestricted",
      "restoreDeclined"};
  static_assert(std::size(names) == static_cast<std::size_t>(Kind::restoreDeclined) + 1);
  return names[static_cast<std::size_t>(kind)];
}

std::string nameOfClient(std::uint64_t client) {
  if (client == 0) return "the person";
  if (client == platform::RVClientMercato) return "the store";
  if (client == platform::RVClientSync) return "the sync";
  return "client " + std::to_string(client);
}

bool AppStory::hear(const device::CallRecord& record) {
  _now = record.time;
  _told = false;
  const Dictionary* arguments = record.arguments.dictionary();
  if (record.service == "AppsClient") {
    hearCall(record);
  } else if (record.service == "FileSystem" && record.operation == "writeAtomically") {
    hearWrite(record);
  } else if (record.service == "log" && arguments) {
    _thread = record.thread;
    std::string_view text = (*arguments)["text"].string().value_or("");
    if (text.substr(0, messagePrefix.size()) == messagePrefix) hearMessage(text.substr(messagePrefix.size()));
  }
  return _told;
}

std::optional<double> AppStory::fractionOf(const std::string& app) const {
  auto found = _fractions.find(app);
  return found == _fractions.end() ? std::nullopt : std::optional(found->second);
}

void AppStory::tell(Kind kind, std::string_view app, std::string text, std::string fact) {
  _told = true;
  _listener({kind, std::string(app), _now, std::move(text), std::move(fact)});
}

std::string AppStory::takeFact(std::string_view app) {
  auto found = _facts.find(app);
  if (found == _facts.end()) return {};
  std::string fact = std::move(found->second);
  _facts.erase(found);
  return fact;
}

void AppStory::hearCall(const device::CallRecord& record) {
  if (record.operation == "assetTransferSucceeded") {
    if (record.end)
      _called.erase(record.thread);
    else
      _called[record.thread] = record.app;
  }
  const Dictionary* arguments = record.arguments.dictionary();
  if (record.end || record.app.empty() || !arguments) return;
  if (record.operation == "assetTransferUpdatedProgress") {
    auto [entry, isFirst] = _fractions.try_emplace(record.app, 0.0);
    const Value& progress = (*arguments)["progress"];
    entry->second = progress.real().value_or(static_cast<double>(progress.integer().value_or(0)));
    if (isFirst) tell(Kind::transferring, record.app, "its package is on the way");
    _told = true;
  } else if (record.operation == "assetTransferSucceeded") {
    std::string stood = fractionOf(record.app) ? " after " + percent(*fractionOf(record.app)) : "";
    _fractions.erase(record.app);
    if ((*arguments)["succeeded"].boolValue())
      tell(Kind::arrived, record.app, "its package has arrived");
    else
      tell(Kind::transferFailed, record.app, "its package did not arrive" + stood,
           reasonOfError((*arguments)["error"]));
  } else if (record.operation == "coordinatorCanceledWithReason") {
    std::uint64_t client = (*arguments)["client"].unsignedInteger().value_or(0);
    // The person gives no reason.
    tell(Kind::cancelled, record.app, "cancelled by " + nameOfClient(client),
         client == 0 ? "" : reasonOfError((*arguments)["reason"]));
  } else if (record.operation == "coordinatorShouldPrioritize") {
    tell(Kind::prioritized, record.app, "the person wants it first");
  } else if (record.operation == "assetInstallSucceeded") {
    tell(Kind::reported, record.app, "the daemon reports that it is installed");
  } else if (record.operation == "assetInstallFailed") {
    tell(Kind::reported, record.app, "the daemon reports that its install failed",
         reasonOfError((*arguments)["error"]));
  }
}

void AppStory::hearMessage(std::string_view text) {
  std::vector<std::string_view> gaps;
  if (matches(text, "Got install type={} state={} phase={} for {}", gaps)) {
    _facts[std::string(gaps[3])] = wordsOf(gaps[0]) + ", " + wordsOf(gaps[1]) + ", " + wordsOf(gaps[2]);
    return;
  }
  if (matches(text, "Assets already in progress (not returning these): ({})", gaps)) return hearInProgress(gaps[0]);
  if (matches(text, "RC returned {} creatorIdentifier={}) for {} with error {} - Will not perform {}", gaps)) {
    std::uint64_t client = std::strtoull(std::string(gaps[1]).c_str(), nullptr, 10);
    _facts[std::string(gaps[2])] = nameOfClient(client) + " is already installing it";
    return;
  }
  if (matches(text, "processing app install for bundle '{}', title {}", gaps))
    return tell(Kind::preparing, gaps[0], "its install is being prepared");
  // The list is written next, by the same thread.
  if (matches(text, "Changing {} from {} to {}", gaps)) {
    _marks[_thread] = {std::string(gaps[0]), std::string(gaps[2])};
    return;
  }
  if (text == "Not processing deletes because app removal is restricted")
    return tell(Kind::removalsRestricted, "", "removing apps is restricted");
  if (matches(text, "Will not reconcile restore of type {} - error {}", gaps))
    return tell(Kind::restoreDeclined, "", "the backup service wants no placeholders", reasonIn(gaps[1]));
  if (matches(text, "Ignoring invalid path: {}", gaps)) {
    auto called = _called.find(_thread);
    if (called == _called.end())
      tell(Kind::refused, gaps[0], "its identifier would lead out of its folder");
    else
      tell(Kind::pathRefused, called->second,
           gaps[0] == "(null)" ? "its package came without a path" : "the path of its package is refused",
           gaps[0] == "(null)" ? "" : std::string(gaps[0]));
    return;
  }
  for (const auto& row : messageRows) {
    if (!matches(text, row.pattern, gaps)) continue;
    std::string_view app = gaps[row.app];
    std::string fact = row.fact < 0 ? "" : reasonIn(gaps[static_cast<std::size_t>(row.fact)]);
    std::string seen = row.kind == Kind::preparationFailed || row.kind == Kind::prepared ? takeFact(app) : "";
    return tell(row.kind, app, row.text, !fact.empty() || row.kind == Kind::prepared ? fact : seen);
  }
}

void AppStory::hearWrite(const device::CallRecord& record) {
  auto mark = _marks.find(record.thread);
  if (mark == _marks.end()) return;
  if (record.result.boolValue()) {
    tell(Kind::marked, mark->second.app, "its entry of the todo list becomes", mark->second.word);
  } else {
    tell(Kind::markFailed, mark->second.app, "its entry of the todo list could not become " + mark->second.word,
         record.error ? reasonForPeople(record.error->describe()) : "");
  }
  _marks.erase(mark);
}

void AppStory::hearInProgress(std::string_view list) {
  while (!list.empty()) {
    std::size_t comma = list.find(", ");
    std::string_view app = list.substr(0, comma);
    tell(Kind::skipped, app, "install under way", takeFact(app));
    list.remove_prefix(comma == std::string_view::npos ? list.size() : comma + 2);
  }
}

}  // namespace tsd
