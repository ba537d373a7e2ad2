#include <filesystem>

#include "tsd/CommandError.h"
#include "tsd/command/Commands.h"
#include "tsd/sample/SampleHost.h"
#include "tsd/terminal/Output.h"

namespace tsd {

using platform::Value;

namespace {

const char* restoreSort(std::size_t place) {
  const auto [byHand, automatically] = SampleHost::demotionAt(place);
  return byHand && automatically ? "demoted, both lists"
         : byHand                ? "demoted by hand"
         : automatically         ? "demoted automatically"
                                 : "plain";
}

Value document(const CommonOptions& common, const SampleHost& host) {
  Value document = startDocument(common.command);
  document.dictionary()->set("result", "done");
  Value apps = Value::makeArray();
  for (const auto& entry : host.entries()) {
    auto& item = apps.array()->appendDictionary();
    item.set("id", entry.app.id);
    item.set("name", entry.app.name);
    item.set("version", entry.app.version);
    item.set("role", nameOfRole(entry.role));
  }
  document.dictionary()->set("apps", apps);
  Value restored = Value::makeArray();
  auto restoredApps = host.restored();
  for (std::size_t place = 0; place < restoredApps.size(); ++place) {
    auto& item = restored.array()->appendDictionary();
    item.set("id", restoredApps[place]->id);
    item.set("kind", restoreSort(place));
  }
  document.dictionary()->set("restore", restored);
  return document;
}

}  // namespace

ExitCode runSample(const CommandContext& context, const SampleOptions& options) {
  std::error_code problem;
  if (std::filesystem::exists(options.host, problem) && !std::filesystem::is_empty(options.host, problem)) {
    throw CommandError(options.host + ": " + (problem ? problem.message() : "there is something already"));
  }
  if (options.demo && options.apps < 5) {
    throw CommandError(ExitCode::usage, "--demo: needs at least 5 apps, but --apps is " + std::to_string(options.apps));
  }
  SampleHost host(options);
  host.write();
  if (context.options.json) {
    writeDocument(document(context.options, host));
    return ExitCode::done;
  }
  Table table({{"APP", 12, true}, {"NAME", 6}, {"VERSION"}, {"TODO"}});
  for (const auto& entry : host.entries()) {
    table.add({entry.app.id, entry.app.name, entry.app.version, nameOfRole(entry.role)});
  }
  constexpr std::size_t shownEntries = 40;
  if (host.entries().size() <= shownEntries) context.report(table.text());
  context.report(options.host + ": a host folder with " + std::to_string(host.entries().size()) +
                 " apps in its todo list and " + std::to_string(host.restored().size()) + " in its restore list\n");
  return ExitCode::done;
}

}  // namespace tsd
