#include <string>

#include "record/Show.h"
#include "tsd/CommandError.h"
#include "tsd/command/Commands.h"
#include "tsd/conduit/WholeFile.h"
#include "tsd/terminal/Output.h"

namespace tsd {

ExitCode runRecording(const CommandContext& context, const RecordingOptions& options) {
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

}  // namespace tsd
