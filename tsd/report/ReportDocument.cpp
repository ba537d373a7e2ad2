#include "tsd/report/ReportDocument.h"

#include <algorithm>
#include <map>
#include <string_view>

#include "device/records/Settings.h"
#include "platform/Plugin.h"
#include "tsd/history/AppStory.h"
#include "tsd/history/LineFile.h"
#include "tsd/history/Outcome.h"
#include "tsd/history/Verdicts.h"
#include "tsd/picture/HomePages.h"
#include "tsd/report/ReportJournal.h"
#include "tsd/terminal/Output.h"

namespace tsd {

using platform::Value;
using Kind = AppEvent::Kind;

namespace {

constexpr std::size_t pageSize = 20;
constexpr std::size_t pagesWithImages = 6;  // those that the page shows at first

/// What an outcome means: as wanted, wrong, not at its end, or none of these.
const char* toneOf(Outcome outcome) {
  if (isInOrder(outcome)) return "good";
  switch (outcome) {
    case Outcome::failed:
    case Outcome::refused:
    case Outcome::unrecorded:
      return "bad";
    case Outcome::waiting:
    case Outcome::cancelled:
    case Outcome::sent:
    case Outcome::downloaded:
    case Outcome::notReached:
      return "wait";
    default:
      return "still";
  }
}

/// The outcome that the event decides, as far as the run's journal tells; provisional for what is still running.
std::optional<Outcome> outcomeFor(Kind kind) {
  switch (kind) {
    case Kind::installed:
      return Outcome::installed;
    case Kind::restored:
    case Kind::leftToStore:
      return Outcome::placed;
    case Kind::failed:
    case Kind::transferFailed:
      return Outcome::failed;
    case Kind::cancelled:
      return Outcome::cancelled;
    case Kind::deleted:
      return Outcome::removed;
    case Kind::preparing:
    case Kind::prepared:
    case Kind::restoring:
    case Kind::transferring:
    case Kind::arrived:
    case Kind::installing:
      return Outcome::waiting;
    default:
      return outcomeOf(kind);
  }
}

/// Whether the event names the rule that decided about the app.
bool isVerdict(Kind kind) {
  auto outcome = outcomeFor(kind);
  bool isWay = !outcome || *outcome == Outcome::waiting || *outcome == Outcome::installed || kind == Kind::restored;
  return kind == Kind::chosen || kind == Kind::prepared || !isWay;
}

struct App {
  std::vector<AppEvent> events;
  Outcome outcome = Outcome::notReached;
  std::string rule;
};

std::string base64(platform::BytesView bytes) {
  constexpr std::string_view digits = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
  std::string text;
  text.reserve((bytes.size() + 2) / 3 * 4);
  for (std::size_t at = 0; at < bytes.size(); at += 3) {
    std::uint32_t three = 0;
    for (std::size_t i = 0; i < 3; ++i)
      three = three << 8 | (at + i < bytes.size() ? static_cast<unsigned char>(bytes[at + i]) : 0U);
    for (std::size_t i = 0; i < 4; ++i) text += at + i <= bytes.size() ? digits[three >> (18 - 6 * i) & 0x3f] : '=';
  }
  return text;
}

Value pair(std::string_view one, const Value& other) {
  Value item = Value::makeArray();
  item.array()->append(one);
  item.array()->append(other);
  return item;
}

/// What the run meant for each app, and the journal itself.
class Reading {
 public:
  explicit Reading(const RunSummary& run) : _story([this](const AppEvent& event) { take(event); }) {
    isCut = readJournal(run, {""}, [this](const device::CallRecord& record) {
      _story.hear(record);
      journal.hear(record);
    });
    // The journal may have reached its size limit, and knows nothing of what is on the device's disk.
    for (const auto& told : outcomesIn(run)) {
      App& app = apps[told.id];
      if (app.outcome != told.outcome && !told.reason.empty()) app.rule = told.reason;
      app.outcome = told.outcome;
    }
  }

  ReportJournal journal;
  bool isCut = false;  // the journal has come to its size limit
  std::map<std::string, App> apps;

 private:
  void take(const AppEvent& event) {
    if (event.app.empty()) return;
    App& app = apps[event.app];
    if (event.kind == Kind::considered) return;
    if (auto outcome = outcomeFor(event.kind)) app.outcome = *outcome;
    if (isVerdict(event.kind)) app.rule = event.line();
    app.events.push_back(event);
  }

  AppStory _story;
};

Value valueOfApps(const Reading& reading, const ReportSubject& subject) {
  std::map<std::string_view, const device::AppStatus*> known;
  for (const auto& app : subject.now.apps) known.emplace(app.id, &app);
  Value apps = Value::makeArray();
  for (const auto& [id, app] : reading.apps) {
    auto& item = apps.array()->appendDictionary();
    auto status = known.find(id);
    item.set("id", id);
    item.set("name", status == known.end() ? "" : status->second->name);
    item.set("outcome", wordsOf(app.outcome));
    item.set("rule", app.rule);
    Value events = Value::makeArray();
    for (const auto& event : app.events) {
      Value each = Value::makeArray();
      each.array()->append(event.time.count());
      each.array()->append(nameOfKind(event.kind));
      each.array()->append(event.line());
      events.array()->append(each);
    }
    item.set("events", events);
  }
  return apps;
}

Value valueOfHome(const ReportSubject& subject, device::LocalDevice& device) {
  HomePages home = readHomePages(device, subject.now, pageSize, pagesWithImages);
  Value result = Value::makeDictionary();
  Value pages = Value::makeArray();
  for (const auto& page : home.pages) {
    Value icons = Value::makeArray();
    for (const auto& icon : page) {
      auto& item = icons.array()->appendDictionary();
      item.set("id", icon.id);
      item.set("name", icon.name);
      item.set("look", nameOfLook(icon.look));
      item.set("failed", icon.failed);
      item.set("progress", icon.progress);
      if (!icon.image.empty()) item.set("image", base64(icon.image));
    }
    pages.array()->append(icons);
  }
  result.dictionary()->set("pages", pages);
  Value failedApps = Value::makeArray();
  for (const auto& app : home.failed) {
    auto& item = failedApps.array()->appendDictionary();
    item.set("id", app.id);
    item.set("reason", app.reason);
  }
  result.dictionary()->set("failed", failedApps);
  result.dictionary()->set(
      "note", subject.isRunning ? "As it was when this report was made, while a process was working on the device."
              : subject.isLast  ? "As the run left it."
                                : "As it was when this report was made; later runs have "
                                  "changed it since this one.");
  return result;
}

std::string inUTC(const std::string& moment) { return dayAndTime(moment) + " UTC"; }

std::string endOfRun(const ReportSubject& subject) {
  if (subject.run.ended) return endOf(subject.run);
  return subject.isRunning && subject.isLast ? "still running" : "killed";
}

/// "The sync is not complete: 5 of 8 apps in order, 2 failed, 1 not allowed."
std::string sentenceOf(const Reading& reading, const ReportSubject& subject) {
  OutcomeCounts counts;
  for (const auto& [id, app] : reading.apps) counts.add(app.outcome);
  const std::string end = endOfRun(subject);
  std::string text = "The " + subject.run.command;
  if (end == "failed")
    text += " failed";
  else
    text += (end == "done" || end == "not complete" ? " is " : " was ") + end;
  std::string apps = counts.text();
  return text + (apps.empty() ? "." : ": " + apps + ".");
}

Value valueOfFacts(const Reading& reading, const ReportSubject& subject) {
  std::string words = "tsd " + subject.run.command;
  for (const auto& argument : subject.run.arguments) words += " " + argument;
  Value facts = Value::makeArray();
  auto add = [&](const char* name, const std::string& value) { facts.array()->append(pair(name, value)); };
  add("Command", words);
  add("Began", inUTC(subject.run.began));
  add("Ended", subject.run.ended ? inUTC(*subject.run.ended) : "");
  add("Result", endOfRun(subject));
  add("Exit code", subject.run.exitCode ? std::to_string(*subject.run.exitCode) : "");
  if (!reading.isCut) add("Took", durationText(static_cast<double>(reading.journal.end().count()) / 1e6));
  return facts;
}

}  // namespace

Value reportDocument(const ReportSubject& subject, device::LocalDevice& device) {
  Reading reading(subject.run);
  Value document = Value::makeDictionary();
  auto& entries = *document.dictionary();
  entries.set("device", subject.deviceName);
  entries.set("title", "run " + std::to_string(subject.run.number) + ", " + subject.run.command);
  entries.set("made", inUTC(currentTimeText()));
  entries.set("maker", "tsd " + subject.version);
  Value run = Value::makeDictionary();
  run.dictionary()->set("command", subject.run.command);
  run.dictionary()->set("began", inUTC(subject.run.began));
  run.dictionary()->set("result", endOfRun(subject));
  run.dictionary()->set("micros", reading.journal.end().count());
  entries.set("run", run);
  Value words = Value::makeArray();
  for (int i = 0; i <= static_cast<int>(Outcome::notReached); ++i) {
    auto outcome = static_cast<Outcome>(i);
    words.array()->append(pair(wordsOf(outcome), Value(toneOf(outcome))));
  }
  entries.set("outcomes", words);
  entries.set("sentence", sentenceOf(reading, subject));
  entries.set("facts", valueOfFacts(reading, subject));
  entries.set("home", valueOfHome(subject, device));
  entries.set("apps", valueOfApps(reading, subject));
  entries.set("journal", reading.journal.document());
  entries.set("journalIsCut", reading.isCut);
  Value versions = Value::makeArray();
  versions.array()->append(pair("Program", Value("tsd " + subject.version)));
  versions.array()->append(pair("Plug-in interface", Value(std::to_string(platform::pluginInterfaceVersion))));
  entries.set("versions", versions);
  Value settings = Value::makeArray();
  for (const auto& key : device::settingKeys()) settings.array()->append(pair(key, Value(device.setting(key))));
  entries.set("settings", settings);
  return document;
}

}  // namespace tsd
