#include "tsd/sync/SyncOpening.h"

#include <algorithm>
#include <cstdint>

#include "platform/DeviceNames.h"
#include "tsd/CommandError.h"

namespace tsd {

using platform::ErrorRef;
using platform::Value;

namespace {

constexpr std::uint32_t ordinarySync = 0;

std::vector<std::string> deletedIn(const Value& installed) {
  std::vector<std::string> ids;
  const auto* answer = installed.dictionary();
  const auto* deleted = answer ? (*answer)["_Deleted"].array() : nullptr;
  if (!deleted) return ids;
  for (const auto& each : *deleted) {
    const auto* app = each.dictionary();
    if (auto id = app ? (*app)["KBBundleIdentifier"].string() : std::nullopt) ids.emplace_back(*id);
  }
  return ids;
}

}  // namespace

SyncOpening openSync(Daemon& daemon) {
  SyncOpening opening;
  auto classes = daemon.supportedDataclasses();
  if (std::find(classes.begin(), classes.end(), platform::dataclassApplication) == classes.end()) {
    opening.problem = "the plug-in does not serve the data class Application";
    return opening;
  }
  std::string anchor = daemon.currentSyncAnchor();
  ErrorRef error;
  if (!daemon.prepareForSync(anchor, &error)) {
    opening.problem = "the plug-in could not prepare for the sync" + (error ? ": " + textOf(error) : "");
    return opening;
  }
  opening.deleted = deletedIn(daemon.installedAssets());
  if (!daemon.reconcileSync(ordinarySync, anchor, &error)) {
    opening.problem = "the plug-in could not take over the host's files" + (error ? ": " + textOf(error) : "");
  }
  return opening;
}

}  // namespace tsd
