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

const Value& entryOf(const Value& list, std::string_view key) {
  static const Value absent{};
  return list.dictionary() ? (*list.dictionary())[key] : absent;
}

bool isOfKind(const Value& value, Value::Kind kind) {
  // A number may be of either kind.
  return value.isAbsent() || value.kind() == kind ||
         (kind == Value::Kind::integer && value.kind() == Value::Kind::real);
}

}  // namespace

std::string problemOfStoreMetadata(const Value& metadata) {
  using Kind = Value::Kind;
  constexpr std::string_view downloadKey = "com.vantor.HarluneStore.downloadInfo";
  const Value& download = entryOf(metadata, downloadKey);
  const Value& account = entryOf(download, "accountInfo");
  struct Place {
    const Value& list;
    std::string_view key;
    Kind kind;
  };
  for (const Place& each : {Place{metadata, "title", Kind::string}, Place{metadata, "itemName", Kind::string},
                            Place{metadata, "bundleVersion", Kind::string}, Place{metadata, "vantorId", Kind::string},
                            Place{metadata, downloadKey, Kind::dictionary},
                            Place{download, "accountInfo", Kind::dictionary}, Place{account, "VantorID", Kind::string},
                            Place{account, "DSPersonID", Kind::integer}, Place{account, "AltDSID", Kind::string}}) {
    if (isOfKind(entryOf(each.list, each.key), each.kind)) continue;
    const char* wanted = each.kind == Kind::string ? "text" : each.kind == Kind::dictionary ? "dictionary" : "number";
    return '"' + std::string(each.key) + "\" is no " + wanted;
  }
  return {};
}

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

std::string problemOfEntry(std::string_view path, const Value& list) {
  return nameOf(path) == platform::storeMetadataFileName ? problemOfStoreMetadata(list) : "";
}

bool maySeemMissing(std::string_view path) {
  return isOneOf(path, {platform::todoListPath, platform::iconLayoutPath, platform::demotedAppsPath});
}

}  // namespace device
