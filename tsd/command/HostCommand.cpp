#include <array>

#include "tsd/CommandError.h"
#include "tsd/command/Commands.h"
#include "tsd/host/HostCheck.h"
#include "tsd/host/HostEditor.h"
#include "tsd/terminal/Output.h"

namespace tsd {

using platform::Value;
using Weight = Finding::Weight;

namespace {

void requireSense(const HostOptions& options) {
  const bool adds = options.action == "add", removes = options.action == "remove";
  auto refuse = [&](const std::string& why) {
    throw CommandError(ExitCode::usage, "host " + options.action + ": " + why);
  };
  if ((adds || removes) && options.items.empty())
    refuse(adds ? "a package or a folder is expected" : "an app's identifier is expected");
  if (!adds && !removes && !options.items.empty()) refuse("nothing is expected after HOST");
  if (!adds && (options.restore || options.replace || !options.demoted.empty()))
    refuse("--restore, --demoted and --replace belong to 'host add'");
  if (!removes && options.uninstall) refuse("--uninstall belongs to 'host remove'");
}

Value startedDocument(const CommandContext& context, const HostOptions& options) {
  Value document = startDocument(context.options.command);
  document.dictionary()->set("result", "done");
  document.dictionary()->set("action", options.action);
  document.dictionary()->set("host", options.host);
  return document;
}

ExitCode makeNew(const CommandContext& context, const HostOptions& options) {
  makeHost(options.host);
  if (context.options.json)
    writeDocument(startedDocument(context, options));
  else
    context.report(noteLine("", options.host + ": a host without apps; 'tsd host add' puts some into it"));
  return ExitCode::done;
}

ExitCode addApps(const CommandContext& context, const HostOptions& options) {
  HostAddition addition;
  addition.demotion = {options.demoted == "by-hand" || options.demoted == "both",
                       options.demoted == "automatically" || options.demoted == "both"};
  addition.restores = options.restore || addition.demotion.isAny();
  addition.replaces = options.replace;
  auto added = addToHost(options.host, options.items, addition);
  if (context.options.json) {
    Value document = startedDocument(context, options);
    Value apps = Value::makeArray();
    for (const auto& app : added) {
      auto& item = apps.array()->appendDictionary();
      item.set("id", app.id);
      item.set("name", app.name);
      item.set("version", app.version);
      item.set("hasIcon", !app.icon.empty() || !app.artwork.empty());
      item.set("hasMetadata", !app.metadata.empty());
    }
    document.dictionary()->set("added", apps);
    writeDocument(document);
    return ExitCode::done;
  }
  for (const auto& app : added) {
    std::string text = app.id + ": added" + (app.version.empty() ? "" : ", version " + app.version);
    if (addition.restores) text += ", also to the restore list";
    if (app.icon.empty() && app.artwork.empty()) text += "; it has no icon";
    if (app.metadata.empty()) text += "; it has no store metadata";
    context.report(noteLine("", text));
  }
  return ExitCode::done;
}

ExitCode removeApps(const CommandContext& context, const HostOptions& options) {
  removeFromHost(options.host, options.items, options.uninstall);
  if (context.options.json) {
    Value document = startedDocument(context, options);
    document.dictionary()->set("removed", arrayOf(options.items));
    writeDocument(document);
    return ExitCode::done;
  }
  for (const auto& app : options.items)
    context.report(noteLine("", app + ": removed" + (options.uninstall ? "; the next sync uninstalls it" : "")));
  return ExitCode::done;
}

std::string counted(std::size_t count, const std::string& what) {
  return std::to_string(count) + " " + what + (count == 1 ? "" : "s");
}

Value valueOf(const std::vector<Finding>& findings) {
  Value list = Value::makeArray();
  for (const auto& finding : findings) {
    auto& item = list.array()->appendDictionary();
    item.set("weight", nameOf(finding.weight));
    item.set("file", finding.file);
    if (finding.line > 0) item.set("line", finding.line);
    if (!finding.app.empty()) item.set("app", finding.app);
    item.set("text", finding.text);
    item.set("remedy", finding.remedy);
  }
  return list;
}

/// "host/Packages/a.pkg:3: error: ... (what to do)"
std::string lineOf(const Finding& finding) {
  std::string place = finding.file + (finding.line > 0 ? ":" + std::to_string(finding.line) : "");
  bool isNamed = finding.app.empty() || finding.file.find("/" + finding.app) != std::string::npos ||
                 finding.text.find('"' + finding.app + '"') != std::string::npos;
  std::string app = isNamed ? "" : finding.app + ": ";
  return noteLine("", place + ": " + nameOf(finding.weight) + ": " + app + finding.text + " (" + finding.remedy + ")");
}

ExitCode check(const CommandContext& context, const HostOptions& options) {
  HostCheck hostCheck(options.host);
  const auto& findings = hostCheck.run();
  std::array<std::size_t, 3> counts{};
  for (const auto& finding : findings) ++counts[static_cast<std::size_t>(finding.weight)];
  const auto [errors, problems, notes] = counts;
  const ExitCode code = errors > 0 ? ExitCode::failed : problems > 0 ? ExitCode::someFailed : ExitCode::done;
  if (context.options.json) {
    Value document = startedDocument(context, options);
    auto& entries = *document.dictionary();
    entries.set("result", nameOfResult(code));
    entries.set("exitCode", static_cast<int>(code));
    entries.set("findings", valueOf(findings));
    entries.set("installs", hostCheck.installs());
    entries.set("removals", hostCheck.removals());
    writeDocument(document);
    return code;
  }
  for (const auto& finding : findings) writeOutput(lineOf(finding));
  std::string sum = options.host + ": " + counted(hostCheck.installs(), "app") + " to install, " +
                    std::to_string(hostCheck.removals()) + " to remove; ";
  sum += findings.empty()
             ? "a sync has nothing to stumble over"
             : counted(errors, "error") + ", " + counted(problems, "problem") + ", " + counted(notes, "note");
  context.report(noteLine("", sum));
  return code;
}

}  // namespace

ExitCode runHost(const CommandContext& context, const HostOptions& options) {
  requireSense(options);
  if (options.action == "new") return makeNew(context, options);
  if (options.action == "add") return addApps(context, options);
  if (options.action == "remove") return removeApps(context, options);
  return check(context, options);
}

}  // namespace tsd
