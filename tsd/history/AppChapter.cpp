#include "tsd/history/AppChapter.h"

#include <algorithm>
#include <cmath>
#include <utility>

#include "device/boundary/Journal.h"
#include "tsd/terminal/Output.h"

namespace tsd {

using platform::Value;

namespace {

/// In the line of a call that may be the end of a mark; it does not name the app.
constexpr const char* writeOfTodoList = "\"op\":\"writeAtomically\"";

bool isPartOfIdentifier(char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '.' || c == '-' || c == '_';
}

/// Whether the text names the app, and not another one whose identifier contains its own.
bool names(std::string_view text, std::string_view app) {
  for (std::size_t at = text.find(app); at != std::string_view::npos; at = text.find(app, at + 1)) {
    std::size_t end = at + app.size();
    bool isWhole = (at == 0 || !isPartOfIdentifier(text[at - 1])) &&
                   (end == text.size() || !isPartOfIdentifier(text[end]) ||
                    (text[end] == '.' && (end + 1 == text.size() || !isPartOfIdentifier(text[end + 1]))));
    if (isWhole) return true;
  }
  return false;
}

std::string withoutPrefix(std::string_view text) {
  std::size_t bar = text.find('|');
  return std::string(bar == std::string_view::npos ? text : text.substr(bar + 1));
}

/// What a command did by itself, without a call that a journal would hold.
std::string deedOf(const RunSummary& run, const std::string& app) {
  auto has = [&](const std::string& word) {
    return std::find(run.arguments.begin(), run.arguments.end(), word) != run.arguments.end();
  };
  if (!has(app) || (run.command != "uninstall" && run.command != "store")) return {};
  std::string deed = run.command == "uninstall" ? "the person removes it from the device"
                     : has("--finish")          ? "the store finishes its install"
                                                : "the store begins an install of it";
  return run.exitCode == 0 ? deed : deed + ", which fails";
}

}  // namespace

std::string AppChapter::answer() const {
  if (outcome) {
    std::string words = wordsOf(outcome->outcome) + (outcome->reason.empty() ? "" : ": " + outcome->reason);
    bool isRuns = outcome->outcome == Outcome::notReached && !run.message.empty();
    return isRuns ? words + ": " + run.message : words;
  }
  std::string last = lines.empty() ? "" : lines.back().text;
  if (!run.ended) return std::string(wordsOfNoEnd(run)) + "; last known: " + last;
  return run.message.empty() ? last : "the whole run failed: " + run.message;
}

AppChapter chapterOf(const RunSummary& run, const std::string& app) {
  AppChapter chapter{run, outcomeIn(run, app), {}};
  if (std::string deed = deedOf(run, app); !deed.empty()) chapter.lines.push_back({"person", deed});
  std::chrono::microseconds now{};
  AppStory story([&](const AppEvent& event) {
    if (event.app == app && event.kind != AppEvent::Kind::considered)
      chapter.lines.push_back({nameOfKind(event.kind),
                               (event.kind == AppEvent::Kind::skipped ? "not asked for: " : "") + event.line(),
                               event.time});
  });
  std::string inJson = device::jsonText(Value(app));
  const std::vector<std::string> texts{inJson.substr(1, inJson.size() - 2), writeOfTodoList};
  readJournal(run, texts, [&](const device::CallRecord& record) {
    now = record.time;
    if (story.hear(record) || record.service != "log" || record.operation != "error") return;
    std::string_view text = (*record.arguments.dictionary())["text"].string().value_or("");
    if (names(text, app)) chapter.lines.push_back({"message", "message: " + withoutPrefix(text), record.time});
  });
  if (auto fraction = story.fractionOf(app)) {
    std::string text = std::to_string(std::lround(*fraction * 100)) + " % of its package had come when the run ended";
    chapter.lines.push_back({"transferring", text, now});
  }
  return chapter;
}

}  // namespace tsd
