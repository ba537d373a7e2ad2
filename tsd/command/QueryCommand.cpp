#include "device/services/LocalAccountInfo.h"
#include "platform/Describe.h"
#include "tsd/command/Commands.h"
#include "tsd/daemon/Daemon.h"
#include "tsd/daemon/DeviceSession.h"
#include "tsd/terminal/Output.h"

namespace tsd {

using platform::Value;

namespace {

Value answerTo(const std::string& question, Daemon& daemon) {
  if (question == "metrics") return daemon.installedAssetMetrics();
  if (question == "vantor-ids") return arrayOf(daemon.vantorIDsForAssets().members());
  if (question == "disabled-asset-types") {
    auto types = daemon.disabledAssetTypes();
    return types ? arrayOf(types->members()) : Value();
  }
  Value accounts = Value::makeArray();
  for (const auto& account : daemon.accountsForAssets()) {
    const auto* facts = dynamic_cast<const device::LocalAccountInfo*>(account.get());
    auto& item = accounts.array()->appendDictionary();
    if (!facts) continue;
    if (facts->vantorID()) item.set("vantorID", *facts->vantorID());
    if (!facts->dsid().isAbsent()) item.set("DSID", facts->dsid());
    if (facts->altDSID()) item.set("altDSID", *facts->altDSID());
  }
  return accounts;
}

std::string text(const Value& answer) {
  std::string text;
  if (const auto* entries = answer.dictionary()) {
    for (const auto& entry : *entries) text += std::string(entry.key) + " " + describe(entry.value) + "\n";
  } else if (const auto* items = answer.array()) {
    for (const auto& item : *items) text += noteLine("", describe(item));
  }
  return text.empty() ? "none\n" : text;
}

}  // namespace

ExitCode runQuery(const CommandContext& context, const QueryOptions& options) {
  DeviceSession session(context, {.folder = options.device, .use = DeviceUse::copy});
  Daemon daemon(session.device(), session.loadPlugin());
  daemon.postStartupNotification();
  Value answer = answerTo(options.question, daemon);
  if (!context.options.json) {
    writeOutput(text(answer));
    return ExitCode::done;
  }
  auto document = startDocument(context.options.command);
  document.dictionary()->set("result", "done");
  document.dictionary()->set("question", options.question);
  // No answer at all differs from an empty one by its absence.
  document.dictionary()->set("answer", answer);
  writeDocument(document);
  return ExitCode::done;
}

}  // namespace tsd
