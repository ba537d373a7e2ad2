#include <filesystem>

#include "tsd/command/Commands.h"
#include "tsd/host/HostPackage.h"
#include "tsd/terminal/Output.h"

namespace tsd {

ExitCode runPack(const CommandContext& context, const PackOptions& options) {
  auto app = packFolder(options.folder, options.file, options.replace);
  std::error_code problem;
  auto bytes = std::filesystem::file_size(options.file, problem);
  if (context.options.json) {
    auto document = startDocument(context.options.command);
    auto& entries = *document.dictionary();
    entries.set("result", "done");
    entries.set("file", options.file);
    entries.set("bytes", bytes);
    entries.set("id", app.id);
    entries.set("name", app.name);
    entries.set("version", app.version);
    writeDocument(document);
    return ExitCode::done;
  }
  context.report(noteLine("", options.file + ": " + app.id + (app.version.empty() ? "" : " " + app.version) + ", " +
                                  std::to_string(bytes) + " bytes"));
  return ExitCode::done;
}

}  // namespace tsd
