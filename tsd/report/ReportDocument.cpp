#include "tsd/report/ReportDocument.h"

#include <algorithm>
#include <map>
#include <string_view>

#include "device/records/Settings.h"
#include "platform/Plugin.h"
#include "tsd/history/LineFile.h"
#include "tsd/picture/HomePages.h"
#include "tsd/report/ReportApps.h"
#include "tsd/report/ReportJournal.h"
#include "tsd/terminal/Output.h"

namespace tsd {

using platform::Value;

namespace {

constexpr std::size_t pageSize = 20;
constexpr std::size_t pagesWithImages = 6;  // those that the page shows at first

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

/// What the run meant for each app, and the journal itself.
struct Reading {
  explicit Reading(const RunSummary& run) {
    isCut = readJournal(run, {""}, [this](const device::CallRecord& record) {
      apps.hear(record);
      journal.hear(record);
    });
    // The journal may have reached its size limit, and knows nothing of what is on the device's disk.
    for (const auto& told : outcomesIn(run)) apps.know(told);
  }

  ReportJournal journal;
  bool isCut = false;  // the journal has come to its size limit
  ReportApps apps;
};

Value valueOfApps(const Reading& reading, const ReportSubject& subject) {
  std::map<std::string_view, const device::AppStatus*> known;
  for (const auto& app : subject.now.apps) known.emplace(app.id, &app);
  return reading.apps.document([&](const std::string& id) {
    auto status = known.find(id);
    return status == known.end() ? std::string() : status->second->name;
  });
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
  const std::string end = endOfRun(subject);
  std::string text = "The " + subject.run.command;
  if (end == "failed")
    text += " failed";
  else
    text += (end == "done" || end == "not complete" ? " is " : " was ") + end;
  std::string apps = reading.apps.counts().text();
  return text + (apps.empty() ? "." : ": " + apps + ".");
}

Value valueOfFacts(const Reading& reading, const ReportSubject& subject) {
  std::string words = "tsd " + subject.run.command;
  for (const auto& argument : subject.run.arguments) words += " " + argument;
  Value facts = Value::makeArray();
  auto add = [&](const char* name, const std::string& value) { facts.array()->append(pairOf(name, value)); };
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
  entries.set("outcomes", toneOfOutcomes());
  entries.set("sentence", sentenceOf(reading, subject));
  entries.set("facts", valueOfFacts(reading, subject));
  entries.set("home", valueOfHome(subject, device));
  entries.set("apps", valueOfApps(reading, subject));
  entries.set("journal", reading.journal.document());
  entries.set("journalIsCut", reading.isCut);
  Value versions = Value::makeArray();
  versions.array()->append(pairOf("Program", Value("tsd " + subject.version)));
  versions.array()->append(pairOf("Plug-in interface", Value(std::to_string(platform::pluginInterfaceVersion))));
  entries.set("versions", versions);
  Value settings = Value::makeArray();
  for (const auto& key : device::settingKeys()) settings.array()->append(pairOf(key, Value(device.setting(key))));
  entries.set("settings", settings);
  return document;
}

}  // namespace tsd
