#include "tsd/SyncReport.h"

#include <algorithm>
#include <cstdio>

#include "tsd/Console.h"
#include "tsd/Output.h"

namespace tsd {

using platform::Value;

namespace {

std::string lowered(std::string text) {
  for (char& c : text) {
    if (c >= 'A' && c <= 'Z') c = static_cast<char>(c - 'A' + 'a');
  }
  return text;
}

std::string secondsText(double seconds) {
  char text[32];
  std::snprintf(text, sizeof text, "%.2f s", seconds);
  return text;
}

std::string listLine(const std::string& title, const std::vector<std::string>& ids) {
  if (ids.empty()) return {};
  std::string line = title + ":\n";
  for (const auto& id : ids) line += "  " + printable(id) + "\n";
  return line;
}

Value appsValue(const std::vector<AppOutcome>& apps) {
  Value array = Value::makeArray();
  for (const auto& app : apps) {
    auto& item = array.array()->appendDictionary();
    item.set("id", app.id);
    item.set("name", app.name);
    item.set("version", app.version);
    item.set("outcome", app.outcome);
    item.set("reason", app.reason);
  }
  return array;
}

}  // namespace

Value SyncReport::document(const std::string& command) const {
  Value document = startDocument(command);
  auto& entries = *document.dictionary();
  entries.set("result", nameOfResult(code));
  entries.set("deleted", arrayOf(deleted));
  entries.set("removed", arrayOf(removed));
  entries.set("requested", arrayOf(requested));
  entries.set("apps", appsValue(apps));
  Value list = Value::makeArray();
  for (const auto& entry : todo) {
    auto& item = list.array()->appendDictionary();
    item.set("identifier", entry.identifier);
    item.set("operation", entry.operation);
  }
  entries.set("todo", list);
  if (placeholderSeconds) entries.set("placeholdersAfterSeconds", *placeholderSeconds);
  entries.set("seconds", seconds);
  if (!message.empty()) {
    Value error = Value::makeDictionary();
    error.dictionary()->set("exitCode", static_cast<int>(code));
    error.dictionary()->set("message", message);
    entries.set("error", error);
  }
  return document;
}

std::string SyncReport::text() const {
  std::string text;
  if (!apps.empty()) {
    Table table({{"APP"}, {"NAME", 12}, {"VERSION", 7}, {"OUTCOME"}});
    for (const auto& app : apps) table.add({app.id, app.name, app.version, lowered(app.outcome)});
    text += table.text();
    for (const auto& app : apps) {
      if (!app.reason.empty()) text += printable(app.id) + ": " + printable(app.reason) + "\n";
    }
  }
  text += listLine("Deleted on the device, told to the host", deleted);
  text += listLine("Removed from the device", removed);
  if (text.empty() && code == ExitCode::done) text = "Nothing to do.\n";
  if (placeholderSeconds) {
    text += "The last placeholder was on the home screen after " + secondsText(*placeholderSeconds) + ".\n";
  }
  auto good = std::count_if(apps.begin(), apps.end(), [](const AppOutcome& app) { return app.isGood(); });
  text += std::string("Sync ") + nameOfResult(code) + " after " + secondsText(seconds);
  if (!apps.empty()) text += ": " + std::to_string(good) + " of " + std::to_string(apps.size()) + " apps in order";
  text += ".\n";
  return text;
}

}  // namespace tsd
