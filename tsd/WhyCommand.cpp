#include <algorithm>
#include <cmath>
#include <cstdio>
#include <set>

#include "device/Journal.h"
#include "tsd/AppStory.h"
#include "tsd/CommandError.h"
#include "tsd/Commands.h"
#include "tsd/DeviceSession.h"
#include "tsd/Output.h"
#include "tsd/RunHistory.h"

namespace tsd {

using platform::Value;

namespace {

/// What one kept run had to do with the app.
struct Chapter {
  RunSummary run;
  struct Line {
    std::string kind;  // of the event; "message" for an error that is none, "person" for what no journal has
    std::string text;
    std::optional<std::chrono::microseconds> time{};  // since the device was opened
  };
  std::vector<Line> lines;
};

/// What is known of the app now; nothing where another process has the device.
struct Present {
  std::optional<device::AppStatus> app;
  std::optional<device::CoordinatorStatus> install;
};

bool isPartOfIdentifier(char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '.' || c == '-' || c == '_';
}

/// Whether the text names the app, and not one whose identifier has this one's in it.
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

/// What a command did by itself, without a call that a journal would have.
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

Chapter chapterOf(const RunSummary& run, const std::string& app) {
  Chapter chapter{run, {}};
  if (std::string deed = deedOf(run, app); !deed.empty()) chapter.lines.push_back({"person", deed});
  std::chrono::microseconds now{};
  AppStory story([&](const AppEvent& event) {
    if (event.app == app && event.kind != AppEvent::Kind::considered)
      chapter.lines.push_back({nameOfKind(event.kind),
                               (event.kind == AppEvent::Kind::skipped ? "not asked for: " : "") + event.line(),
                               event.time});
  });
  std::string inJson = device::jsonText(Value(app));
  readJournal(run, std::string_view(inJson).substr(1, inJson.size() - 2), [&](const device::CallRecord& record) {
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

/// From a copy of the device. What is missing when another process is busy with it, is told.
std::optional<Present> presentOf(const CommandContext& context, const WhyOptions& options) {
  try {
    DeviceSession session(context, {options.device, "com.vantor.tsd", nullptr, nullptr, DeviceUse::copy});
    Present present{session.device().app(options.app), std::nullopt};
    for (const auto& coordinator : session.device().status().coordinators) {
      if (coordinator.app == options.app) present.install = coordinator;
    }
    return present;
  } catch (const CommandError& error) {
    if (error.code() != ExitCode::busy) throw;
    context.console.message(std::string(error.what()) + "; how the app is now cannot be told");
    return std::nullopt;
  }
}

/// What an open install waits for.
std::string waitOf(const device::CoordinatorStatus& install) {
  std::string whose = "an install of " + nameOfClient(install.client) + "'s (" + install.kind + ") is open";
  if (!install.promisesPackage) return whose + ", and nobody has promised its package";
  std::string wait = whose + ", and waits for its package, which " +
                     nameOfClient(install.packageClient ? install.packageClient : install.client) + " is to deliver";
  if (install.fraction > 0) wait += ": " + std::to_string(std::lround(install.fraction * 100)) + " % have come";
  return wait + (install.hasPlaceholder ? "" : "; it has no placeholder yet");
}

std::string stateText(const Present& present) {
  if (!present.app || present.app->state.empty()) return "not on the device";
  std::string state = present.app->state == "placeholder" ? "a placeholder"
                      : present.app->state == "updating"  ? "installed, with an install under way"
                                                          : present.app->state;
  std::string name = present.app->name.empty() ? "" : present.app->name + " ";
  std::string version = present.app->version.empty() ? "" : present.app->version;
  return name + version + (name.empty() && version.empty() ? "" : ", ") + state;
}

std::string timeText(const Chapter::Line& line) {
  char text[32];
  if (!line.time) return std::string(12, ' ');
  std::snprintf(text, sizeof text, "%9.3f s ", static_cast<double>(line.time->count()) / 1e6);
  return text;
}

/// "2024-02-29 12:34:56"
std::string dayAndTime(const std::string& moment) {
  std::string text = moment.substr(0, 19);
  std::replace(text.begin(), text.end(), 'T', ' ');
  return text;
}

std::string headOf(const RunSummary& run, bool mayRunStill) {
  std::string words = "tsd " + run.command;
  for (const auto& argument : run.arguments) words += " " + argument;
  std::string end = run.ended ? run.result : mayRunStill ? "killed, or still running" : "killed";
  return "\n" + wrappedLine("Run " + std::to_string(run.number) + ", ",
                            dayAndTime(run.began) + ": " + words + " (" + end + ")");
}

Value document(const CommandContext& context, const WhyOptions& options, const std::optional<Present>& present,
               const std::vector<Chapter>& chapters) {
  Value document = startDocument(context.options.command);
  auto& entries = *document.dictionary();
  entries.set("result", "done");
  entries.set("app", options.app);
  if (present) {
    const auto app = present->app.value_or(device::AppStatus());
    entries.set("state", app.state);
    entries.set("name", app.name);
    entries.set("version", app.version);
    entries.set("lastOutcome", app.lastOutcome);
    entries.set("lastReason", app.lastReason);
    if (present->install) {
      Value install = Value::makeDictionary();
      install.dictionary()->set("kind", present->install->kind);
      install.dictionary()->set("client", present->install->client);
      install.dictionary()->set("fraction", present->install->fraction);
      install.dictionary()->set("waits", waitOf(*present->install));
      entries.set("install", install);
    }
  }
  Value runs = Value::makeArray();
  for (const auto& chapter : chapters) {
    auto& run = runs.array()->appendDictionary();
    run.set("number", chapter.run.number);
    run.set("command", chapter.run.command);
    run.set("arguments", arrayOf(chapter.run.arguments));
    run.set("began", chapter.run.began);
    if (chapter.run.ended) run.set("ended", *chapter.run.ended);
    if (chapter.run.ended) run.set("result", chapter.run.result);
    Value events = Value::makeArray();
    for (const auto& line : chapter.lines) {
      auto& event = events.array()->appendDictionary();
      if (line.time) event.set("t", line.time->count());
      event.set("kind", line.kind);
      event.set("text", line.text);
    }
    run.set("events", events);
  }
  entries.set("runs", runs);
  return document;
}

std::string text(const WhyOptions& options, const std::optional<Present>& present, const std::vector<Chapter>& chapters,
                 std::size_t others) {
  std::string text = wrappedLine("", options.app + (present ? ": " + stateText(*present) : ""));
  for (const auto& chapter : chapters) {
    text += headOf(chapter.run, !present);
    for (const auto& line : chapter.lines) text += wrappedLine(timeText(line), line.text);
  }
  if (others) {
    text += "\n" + std::to_string(others) +
            (others == 1 ? " other run that is kept says" : " other runs that are kept say") + " nothing of it.\n";
  }
  if (!present) return text;
  if (present->install) {
    text += "\n" + wrappedLine("Now: ", waitOf(*present->install) + ".");
  } else if (present->app && !present->app->lastOutcome.empty() && present->app->lastOutcome != "INSTALLED") {
    bool failed = present->app->lastOutcome == "FAILED";
    std::string reason = reasonForPeople(present->app->lastReason);
    if (reason == options.app + " was cancelled by the person") reason = "by the person";
    text += "\n" + wrappedLine("Now: ", std::string("its last install ") + (failed ? "failed" : "was cancelled") +
                                            (reason.empty() ? "" : ": " + reason) + ".");
  }
  return text;
}

}  // namespace

ExitCode runWhy(const CommandContext& context, const WhyOptions& options) {
  auto present = presentOf(context, options);
  std::vector<Chapter> chapters;
  auto runs = keptRuns(options.device + "/runs");
  for (const auto& run : runs) {
    auto chapter = chapterOf(run, options.app);
    if (!chapter.lines.empty()) chapters.push_back(std::move(chapter));
  }
  if (chapters.empty() && present && !present->app && !present->install) {
    throw CommandError(options.app + ": the device does not know this app, and " +
                       (runs.empty()
                            ? "has no kept run"
                            : "none of the " + std::to_string(runs.size()) + " kept runs says anything of it"));
  }
  if (context.options.json)
    writeDocument(document(context, options, present, chapters));
  else
    writeOutput(text(options, present, chapters, runs.size() - chapters.size()));
  return ExitCode::done;
}

}  // namespace tsd
