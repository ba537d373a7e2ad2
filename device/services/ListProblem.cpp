#include "device/services/ListProblem.h"

#include <algorithm>

#include "platform/DevicePaths.h"

namespace device {

using platform::Value;

namespace {

std::string_view nameOf(std::string_view path) { return path.substr(path.rfind('/') + 1); }

bool isOneOf(std::string_view path, std::initializer_list<std::string_view> paths) {
  return std::find(paths.begin(), paths.end(), path) != paths.end();
}

std::string problemOfDemotedApps(const platform::Dictionary& list) {
  for (std::string_view key : {"AutomaticDowngrades", "IntentionalDowngrades"}) {
    const Value& apps = list[key];
    const std::string quoted = '"' + std::string(key) + '"';
    if (apps.isAbsent()) continue;
    if (!apps.array()) return quoted + " is not an array";
    for (std::size_t place = 0; place < apps.array()->size(); ++place) {
      if (!(*apps.array())[place].string())
        return quoted + ": entry " + std::to_string(place + 1) + " is no identifier";
    }
  }
  return {};
}

}  // namespace

std::string problemOfList(std::string_view path, const Value& list) {
  if (isOneOf(path, {platform::todoListPath, platform::lastSyncListPath}))
    return list.array() ? "" : "it is not an array";
  const bool isDictionary =
      isOneOf(path, {platform::restoreListPath, platform::restoreStatePath, platform::demotedAppsPath}) ||
      isOneOf(nameOf(path), {"Info.plist", platform::storeMetadataFileName});
  if (!isDictionary) return {};
  if (!list.dictionary()) return "it is not a dictionary";
  return path == platform::demotedAppsPath ? problemOfDemotedApps(*list.dictionary()) : "";
}

bool maySeemMissing(std::string_view path) {
  return isOneOf(path, {platform::todoListPath, platform::iconLayoutPath, platform::demotedAppsPath});
}

}  // namespace device
