#include <map>
#include <string>
#include <vector>

#include "device/boundary/Journal.h"
#include "platform/Describe.h"
#include "record/Redact.h"
#include "record/Replay.h"
#include "record/Show.h"
#include "tsd/CommandError.h"
#include "tsd/command/Commands.h"
#include "tsd/conduit/WholeFile.h"
#include "tsd/daemon/PluginLoader.h"
#include "tsd/host/NewItem.h"
#include "tsd/report/RecordingDocument.h"
#include "tsd/terminal/Output.h"

namespace tsd {

namespace {

ExitCode showRecording(const CommandContext& context, const RecordingOptions& options) {
  const std::string recording = readWholeFile(options.file);
  std::string text;
  const auto facts = record::show(recording, [&](std::string_view line) {
    if (context.options.json) return;
    text.append(line) += '\n';
    if (text.size() < 1 << 16) return;
    writeOutput(text);
    text.clear();
  });
  writeOutput(text);
  if (context.options.json) {
    auto document = startDocument(context.options.command);
    document.dictionary()->set("events", facts.events);
    document.dictionary()->set("threads", facts.threads);
    document.dictionary()->set("whole", facts.isWhole);
    document.dictionary()->set("apps", arrayOf(facts.apps));
    writeDocument(document);
  }
  if (!facts.problem.empty()) throw CommandError(options.file + ": " + facts.problem);
  return ExitCode::done;
}

/// A recording's calls as lines of the journal.
class JournalLines {
 public:
  /// Empty of what no journal tells.
  std::string of(const record::RecordedCall& call) {
    const auto& arguments = *call.arguments.dictionary();
    if (call.operation == "TSGetLogCategory") _categories[platform::describe(call.result)] = arguments["category"];
    if (isPreparation(call)) return {};
    device::CallRecord record = journalRecordOf(call);
    record.number = ++_number;
    if (record.service == "log") {
      record.app.clear();
      record.arguments.dictionary()->set("category",
                                         platform::describe(_categories[platform::describe(arguments["log"])]));
    }
    std::vector<std::string> names;
    for (const auto& entry : *record.arguments.dictionary()) names.emplace_back(entry.key);
    for (const auto& name : names) record.argumentNames.push_back(name.c_str());
    return device::journalLine(record) + '\n';
  }

 private:
  std::uint64_t _number = 0;
  std::map<std::string, platform::Value> _categories;  // of the log's handles
};

ExitCode showJournal(const RecordingOptions& options) {
  JournalLines lines;
  const std::string recording = readWholeFile(options.file);
  std::string text;
  const auto facts = record::readCalls(recording, [&](const record::RecordedCall& call) {
    text += lines.of(call);
    if (text.size() < 1 << 16) return;
    writeOutput(text);
    text.clear();
  });
  writeOutput(text);
  if (!facts.problem.empty()) throw CommandError(options.file + ": " + facts.problem);
  return ExitCode::done;
}

/// Throws when that plug-in does something else than is recorded.
void checkReplay(const std::string& file, const std::string& plugin) {
  const PluginLoader loader(plugin);
  const auto result =
      record::replay(readWholeFile(file), [&](const platform::Platform& platform) { return loader.create(platform); });
  if (!result.problem.empty()) throw CommandError(result.problem);
  if (result.differences.empty()) return;
  const auto& first = result.differences.front();
  throw CommandError("event " + std::to_string(first.event) + ": redacted, the plug-in answers differently: expected " +
                     first.expected + ", came " + first.came);
}

ExitCode redactRecording(const CommandContext& context, const RecordingOptions& options) {
  if (options.output.empty())
    throw CommandError(ExitCode::usage, "redact: where the redacted recording goes is missing");
  const std::string recording = readWholeFile(options.file);
  NewItem file(options.output, NewItem::Kind::file, false);
  platform::ErrorRef error;
  auto sink = record::makeFileSink(file.temporary(), &error);
  if (!sink) throw CommandError(options.output + ": " + error->description());
  const auto facts = record::redact(recording, std::move(sink));
  if (!facts.problem.empty()) throw CommandError(options.file + ": " + facts.problem);
  if (!context.options.plugin.empty()) checkReplay(file.temporary(), context.options.plugin);
  file.putInPlace();
  if (context.options.json) {
    auto document = startDocument(context.options.command);
    document.dictionary()->set("result", "done");
    document.dictionary()->set("events", facts.events);
    document.dictionary()->set("whole", facts.isWhole);
    document.dictionary()->set("replaced", facts.replaced);
    writeDocument(document);
    return ExitCode::done;
  }
  context.report(options.output + ": " + std::to_string(facts.events) + " events, " + std::to_string(facts.replaced) +
                 " texts replaced.\n");
  return ExitCode::done;
}

}  // namespace

ExitCode runRecording(const CommandContext& context, const RecordingOptions& options) {
  if (options.action == "journal") return showJournal(options);
  return options.action == "redact" ? redactRecording(context, options) : showRecording(context, options);
}

}  // namespace tsd
