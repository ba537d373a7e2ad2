#include "tsd/sync/SyncReport.h"

#include "tsd/terminal/Console.h"
#include "tsd/terminal/Output.h"

namespace tsd {

using platform::Value;

namespace {

std::string listLine(const std::string& title, const std::vector<std::string>& ids) {
  if (ids.empty()) return {};
  std::string line = title + ":\n";
  for (const auto& id : ids) line += "  " + printable(id) + "\n";
  return line;
}

}  // namespace

Value SyncReport::document(const std::string& command) const {
  Value document = startDocument(command);
  auto& entries = *document.dictionary();
  entries.set("result", nameOfResult(code));
  entries.set("deleted", arrayOf(deleted));
  entries.set("removed", arrayOf(removed));
  entries.set("requested", arrayOf(requested));
  entries.set("apps", documentOf(apps));
  entries.set("counts", OutcomeCounts(apps).document());
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
    Table table({{"APP", 12, true}, {"NAME", 6}, {"VERSION", 7}, {"OUTCOME"}});
    for (const auto& app : apps) table.add({app.id, app.name, app.version, wordsOf(app.outcome)});
    text += table.text();
    text += reasonsText(apps);
  }
  text += listLine("Deleted on the device, told to the host", deleted);
  text += listLine("Removed from the device", removed);
  if (text.empty() && code == ExitCode::done) text = "Nothing to do.\n";
  if (placeholderSeconds) {
    text +=
        noteLine("", "The last placeholder was on the home screen after " + durationText(*placeholderSeconds) + ".");
  }
  std::string counts = OutcomeCounts(apps).text();
  return text + noteLine("", "Sync " + wordsOfEnd(code) + " after " + durationText(seconds) +
                                 (counts.empty() ? "." : ": " + counts + "."));
}

}  // namespace tsd
