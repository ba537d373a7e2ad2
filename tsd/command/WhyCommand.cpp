#include <algorithm>
#include <cmath>
#include <cstdio>

#include "tsd/CommandError.h"
#include "tsd/command/AppNames.h"
#include "tsd/command/Commands.h"
#include "tsd/daemon/DeviceView.h"
#include "tsd/history/AppChapter.h"
#include "tsd/history/InstallEnd.h"
#include "tsd/history/RunHistory.h"
#include "tsd/terminal/Output.h"

namespace tsd {

using platform::Value;

namespace {

/// What is known about the app now.
struct Present {
  std::optional<device::AppStatus> app;
  std::optional<device::CoordinatorStatus> install;
};

Present presentOf(const DeviceView& view, const std::string& id) {
  const auto& status = view.status();
  Present present;
  for (const auto& app : status.apps) {
    if (app.id == id) present.app = app;
  }
  for (const auto& coordinator : status.coordinators) {
    if (coordinator.app == id) present.install = coordinator;
  }
  return present;
}

/// What an open install waits for.
std::string waitOf(const device::CoordinatorStatus& install) {
  std::string whose =
      "an install by " + nameOfClient(install.client) + " (" + device::shortNameOfKind(install.kind) + ") is open";
  if (!install.promisesPackage) return whose + ", and nobody has promised its package";
  std::string wait = whose + ", and waits for its package, which " +
                     nameOfClient(install.packageClient ? install.packageClient : install.client) + " will deliver";
  if (install.fraction >= 1) {
    wait += ": all of it has come, but the device was not told where it is";
  } else if (install.fraction > 0) {
    wait += ": " + std::to_string(std::lround(install.fraction * 100)) + " % have come";
  }
  return wait + (install.hasPlaceholder ? "" : "; it has no placeholder yet");
}

std::string stateText(const Present& present) {
  if (!present.app || !present.app->isOnDevice()) return "not on the device";
  std::string state = present.app->state == device::AppState::placeholder ? "a placeholder"
                      : present.app->state == device::AppState::updating  ? "installed, with an install under way"
                                                                          : device::nameOfState(present.app->state);
  std::string name = present.app->name.empty() ? "" : present.app->name + " ";
  std::string version = present.app->version.empty() ? "" : present.app->version;
  return name + version + (name.empty() && version.empty() ? "" : ", ") + state;
}

std::string timeText(const AppChapter::Line& line) {
  char text[32];
  if (!line.time) return std::string(12, ' ');
  std::snprintf(text, sizeof text, "%9.3f s ", static_cast<double>(line.time->count()) / 1e6);
  return text;
}

std::string headOf(const RunSummary& run) {
  std::string words = "tsd " + run.command;
  for (const auto& argument : run.arguments) words += " " + argument;
  std::string end = endOf(run);
  return "\n" + wrappedLine("Run " + std::to_string(run.number) + ", ",
                            dayAndTime(run.began) + ": " + words + " (" + end + ")");
}

void describe(const AppChapter& chapter, platform::Dictionary& run) {
  run.set("number", chapter.run.number);
  run.set("command", chapter.run.command);
  run.set("arguments", arrayOf(chapter.run.arguments));
  run.set("began", chapter.run.began);
  if (chapter.run.ended) run.set("ended", *chapter.run.ended);
  if (chapter.run.ended) run.set("result", chapter.run.result);
  if (!chapter.run.message.empty()) run.set("message", chapter.run.message);
  if (chapter.outcome) {
    run.set("outcome", nameOf(chapter.outcome->outcome));
    run.set("reason", chapter.outcome->reason);
  }
  Value events = Value::makeArray();
  for (const auto& line : chapter.lines) {
    auto& event = events.array()->appendDictionary();
    if (line.time) event.set("t", line.time->count());
    event.set("kind", line.kind);
    event.set("text", line.text);
  }
  run.set("events", events);
}

Value document(const CommandContext& context, const std::string& id, const std::string& answer, const Present& present,
               const std::vector<AppChapter>& chapters) {
  Value document = startDocument(context.options.command);
  auto& entries = *document.dictionary();
  entries.set("result", "done");
  entries.set("app", id);
  entries.set("answer", answer);
  const auto app = present.app.value_or(device::AppStatus());
  entries.set("state", device::nameOfState(app.state));
  entries.set("name", app.name);
  entries.set("version", app.version);
  entries.set("lastOutcome", device::nameOfOutcome(app.lastOutcome));
  entries.set("lastReason", app.lastReason);
  if (present.install) {
    Value install = Value::makeDictionary();
    install.dictionary()->set("kind", device::shortNameOfKind(present.install->kind));
    install.dictionary()->set("client", present.install->client);
    install.dictionary()->set("fraction", present.install->fraction);
    install.dictionary()->set("waits", waitOf(*present.install));
    entries.set("install", install);
  }
  Value runs = Value::makeArray();
  for (const auto& chapter : chapters) describe(chapter, runs.array()->appendDictionary());
  entries.set("runs", runs);
  return document;
}

/// "Run 3, sync: failed: …"
std::string answerOf(const AppChapter& chapter) {
  return "run " + std::to_string(chapter.run.number) + " (" + chapter.run.command + "): " + chapter.answer();
}

/// The one sentence that whoever asks wants first.
std::string answerOf(const Present& present, const std::vector<AppChapter>& chapters,
                     const std::vector<RunSummary>& runs) {
  std::string answer = stateText(present);
  if (!chapters.empty()) answer += "; " + answerOf(chapters.back());
  // A later run that came to nothing as a whole concerns every app.
  if (!runs.empty() && (chapters.empty() || runs.back().number > chapters.back().run.number)) {
    const auto& last = runs.back();
    if (!last.message.empty() && last.counts.total() == 0)
      answer +=
          "; then run " + std::to_string(last.number) + " (" + last.command + ") failed as a whole: " + last.message;
  }
  return answer;
}

std::string nowText(const Present& present) {
  if (present.install) return "\n" + wrappedLine("Now: ", waitOf(*present.install) + ".");
  if (!present.app || present.app->lastOutcome == device::InstallOutcome::none ||
      present.app->lastOutcome == device::InstallOutcome::installed)
    return {};
  auto end = endOf(*present.app);
  return "\n" + wrappedLine("Now: ", "its last install: " + wordsOf(end.outcome) +
                                         (end.reason.empty() ? "" : ": " + end.reason) + ".");
}

std::string othersText(const std::vector<AppChapter>& chapters, std::size_t silent) {
  std::string text;
  if (chapters.size() > 1) {
    text += "\nOther runs that mention it (--all shows them, --run N one of them):\n";
    for (std::size_t i = 0; i + 1 < chapters.size(); ++i) text += noteLine("  ", answerOf(chapters[i]));
  }
  if (silent) {
    text += "\n" + std::to_string(silent) + (silent == 1 ? " other kept run does" : " other kept runs do") +
            " not mention it.\n";
  }
  return text;
}

std::string text(const std::string& id, const std::string& answer, const Present& present,
                 const std::vector<AppChapter>& chapters, bool all, std::size_t silent) {
  std::string text = noteLine("", id + ": " + answer + ".");
  for (std::size_t i = all || chapters.empty() ? 0 : chapters.size() - 1; i < chapters.size(); ++i) {
    text += headOf(chapters[i].run);
    for (const auto& line : chapters[i].lines) text += wrappedLine(timeText(line), line.text);
  }
  if (!all) text += othersText(chapters, silent);
  return text + nowText(present);
}

std::vector<RunSummary> runsOf(const CommandContext& context, const WhyOptions& options) {
  auto runs = runsOfDevice(options.device, context.console.problems());
  if (options.run == 0) return runs;
  for (auto& run : runs) {
    if (run.number == options.run) return {run};
  }
  throw CommandError(options.device + ": run " + std::to_string(options.run) + " is not kept" +
                     (runs.empty() ? ""
                                   : "; those from " + std::to_string(runs.front().number) + " to " +
                                         std::to_string(runs.back().number) + " are"));
}

std::vector<AppChapter> chaptersOf(const std::vector<RunSummary>& runs, const std::string& id) {
  std::vector<AppChapter> chapters;
  for (const auto& run : runs) {
    auto chapter = chapterOf(run, id);
    if (!chapter.isEmpty()) chapters.push_back(std::move(chapter));
  }
  return chapters;
}

}  // namespace

ExitCode runWhy(const CommandContext& context, const WhyOptions& options) {
  const auto runs = runsOf(context, options);
  const DeviceView view(context, options.device);
  std::string id = options.app;
  auto chapters = chaptersOf(runs, id);
  auto present = presentOf(view, id);
  if (chapters.empty() && !present.app && !present.install) {
    id = AppNames(view.status(), runs).identifierOf(options.app);
    chapters = chaptersOf(runs, id);
    present = presentOf(view, id);
  }
  std::string answer = answerOf(present, chapters, runs);
  if (context.options.json)
    writeDocument(document(context, id, answer, present, chapters));
  else
    writeOutput(text(id, answer, present, chapters, options.all || options.run != 0, runs.size() - chapters.size()));
  return ExitCode::done;
}

}  // namespace tsd
