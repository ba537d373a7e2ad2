#include <cstdio>
#include <cstdlib>
#include <set>
#include <string>
#include <vector>

#include "record/Replay.h"
#include "tsd/CommandError.h"
#include "tsd/command/Commands.h"
#include "tsd/conduit/WholeFile.h"
#include "tsd/daemon/PluginLoader.h"
#include "tsd/terminal/Output.h"

namespace tsd {

using record::Difference;

namespace {

std::set<record::OperationClass> ignoredClasses(const std::vector<std::string>& names) {
  std::set<record::OperationClass> classes;
  for (const auto& name : names)
    classes.insert(name == "messages" ? record::OperationClass::message : record::OperationClass::step);
  return classes;
}

std::string page(const Difference& difference) {
  std::string text = "Event " + std::to_string(difference.event) + ", thread " + difference.thread;
  if (!difference.inside.empty()) text += ", in " + difference.inside;
  text += ": " + std::string(nameOf(difference.kind)) + "\n";
  text += "  expected  " + (difference.expected.empty() ? "nothing more" : difference.expected) + "\n";
  text += "  came      " + (difference.came.empty() ? "the end of the call" : difference.came) + "\n";
  if (!difference.message.empty()) text += "  then wrote  " + difference.message + "\n";
  if (!difference.app.empty()) text += "  of app    " + difference.app + "\n";
  for (const auto& call : difference.before) text += "  before    " + call + "\n";
  for (const auto& thread : difference.standing) text += "  thread    " + thread + "\n";
  return text;
}

platform::Value valueOf(const Difference& difference) {
  auto value = platform::Value::makeDictionary();
  auto& facts = *value.dictionary();
  facts.set("event", difference.event);
  facts.set("kind", nameOf(difference.kind));
  facts.set("thread", difference.thread);
  facts.set("inside", difference.inside);
  facts.set("expected", difference.expected);
  facts.set("came", difference.came);
  facts.set("app", difference.app);
  facts.set("message", difference.message);
  facts.set("before", arrayOf(difference.before));
  facts.set("threads", arrayOf(difference.standing));
  return value;
}

void show(const CommandContext& context, const record::ReplayResult& result, ExitCode code) {
  if (context.options.json) {
    auto document = startDocument(context.options.command);
    document.dictionary()->set("result", code == ExitCode::done ? "done" : "differs");
    document.dictionary()->set("events", result.events);
    document.dictionary()->set("whole", result.isWhole);
    auto differences = platform::Value::makeArray();
    for (const auto& difference : result.differences) differences.array()->append(valueOf(difference));
    document.dictionary()->set("differences", differences);
    return writeDocument(document);
  }
  std::string text;
  for (const auto& difference : result.differences) text += page(difference);
  if (code == ExitCode::differs) {
    writeOutput(text);
  } else {
    context.report(std::to_string(result.events) + " events replayed, as recorded" +
                   (result.isWhole ? ".\n" : ", up to where the recording was cut.\n"));
  }
}

}  // namespace

ExitCode runReplay(const CommandContext& context, const ReplayOptions& options) {
  const std::string recording = readWholeFile(options.file);
  const PluginLoader loader(context.options.plugin.empty() ? PluginLoader::defaultFile() : context.options.plugin);
  const auto result =
      record::replay(recording, [&](const platform::Platform& platform) { return loader.create(platform); },
                     {.goOn = options.goOn, .ignored = ignoredClasses(options.ignored)});
  if (!result.problem.empty()) throw CommandError(options.file + ": " + result.problem);
  const ExitCode code = result.differences.empty() ? ExitCode::done : ExitCode::differs;
  show(context, result, code);
  if (result.isStuck) {
    std::fflush(nullptr);
    std::_Exit(static_cast<int>(code));
  }
  return code;
}

}  // namespace tsd
