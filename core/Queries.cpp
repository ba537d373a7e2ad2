#include <functional>

#include "core/AppsClient.h"
#include "core/PathCheck.h"
#include "core/PropertyListFile.h"
#include "core/Say.h"
#include "platform/DeviceNames.h"
#include "platform/DevicePaths.h"
#include "platform/FileSystem.h"
#include "platform/OBApplicationWorkspace.h"
#include "platform/OBNumbers.h"
#include "platform/PropertyListSerialization.h"
#include "platform/TSSupport.h"

namespace appsync {

using namespace platform;

/// Of what kind a metadata entry must be.
enum class EntryKind { string, number, dictionary };

static bool isOfKind(const Value& value, EntryKind kind) {
  switch (kind) {
    case EntryKind::string:
      return value.kind() == Value::Kind::string;
    case EntryKind::number:
      return value.kind() == Value::Kind::integer || value.kind() == Value::Kind::real;
    case EntryKind::dictionary:
      return value.kind() == Value::Kind::dictionary;
  }
  return false;
}

static const Value absentValue{};

/// The value when it is of the kind; otherwise it counts as absent, and a message says so.
static const Value& typed(const Platform& platform, const Value& value, EntryKind kind, std::string_view label) {
  if (value.isAbsent() || isOfKind(value, kind)) return value;
  log(platform, LogCategory::unexpectedMetadata, LogLevel::error, {}, "unexpected type for %{public}@", label);
  return absentValue;
}

/// The entry of a dictionary, of the kind or absent; an absent dictionary has no entries.
static const Value& entryOf(const Platform& platform, const Value& dictionary, std::string_view key, EntryKind kind,
                            std::string_view label) {
  return typed(platform, entryOf(dictionary, key), kind, label);
}

static const Value& topLevelVantorID(const Platform& platform, const Value& metadata) {
  return entryOf(platform, metadata, "vantorId", EntryKind::string, "vantorID");
}

static const Value& accountInfoOf(const Platform& platform, const Value& metadata) {
  const Value& download =
      entryOf(platform, metadata, "com.vantor.HarluneStore.downloadInfo", EntryKind::dictionary, "downloadInfo");
  return entryOf(platform, download, "accountInfo", EntryKind::dictionary, "accountInfo");
}

static const Value& accountVantorID(const Platform& platform, const Value& accountInfo) {
  return entryOf(platform, accountInfo, "VantorID", EntryKind::string, "VantorID");
}

static std::optional<std::string> metadataPathOf(const OBApplicationProxy& proxy) {
  if (!proxy.bundleContainerURL) return std::nullopt;
  return joinedPath(*proxy.bundleContainerURL, storeMetadataFileName);
}

static void forEachApplication(const Platform& platform, const std::function<void(const OBApplicationProxy&)>& visit) {
  platform.workspace.enumerateBundlesOfType(bundleType::applications, [&](const OBBundleProxyRef& bundle, bool&) {
    if (auto* proxy = dynamic_cast<const OBApplicationProxy*>(bundle.get())) visit(*proxy);
  });
}

Value AppsClient::installedAssetMetrics() try {
  std::uint64_t count = 0;
  std::uint64_t bytes = 0;
  forEachApplication(_platform, [&](const OBApplicationProxy& proxy) {
    if (proxy.applicationType != "User") return;
    bytes += proxy.diskUsage.staticUsage;
    ++count;
  });
  say(_platform, "found %ld apps using %lld bytes (%lld purgeable)", count, bytes, 0);
  Value metrics = Value::makeDictionary();
  metrics.dictionary()->set("_Count", count);
  metrics.dictionary()->set("_PhysicalSize", bytes);
  metrics.dictionary()->set("_PurgeableSize", 0u);
  return metrics;
} catch (...) {
  swallowException(_platform, "installedAssetMetrics");
  return {};
}

static void addVantorIDs(const Platform& platform, const OBApplicationProxy& proxy, StringSet& identifiers) {
  const auto path = metadataPathOf(proxy);
  const Value metadata = readDictionary(platform, path);
  const Value& topLevel = topLevelVantorID(platform, metadata);
  const Value& account = accountVantorID(platform, accountInfoOf(platform, metadata));
  if (topLevel.isAbsent() && account.isAbsent()) {
    say(platform, "unknown VantorID for %{public}@ (plist at %{public}@)", proxy.applicationIdentifier, path);
    return;
  }
  if (!topLevel.isAbsent() && !account.isAbsent() && !(topLevel == account)) {
    say(platform, "mismatched VantorID keys for %{public}@: %{public}@ vs %{public}@", proxy.applicationIdentifier,
        topLevel, account);
  }
  for (const Value* identifier : {&topLevel, &account}) {
    if (!identifier->isAbsent()) identifiers.insert(*identifier->string());
  }
}

StringSet AppsClient::vantorIDsForAssets() try {
  say(_platform, "getting id's for assets");
  StringSet identifiers;
  forEachApplication(_platform, [&](const OBApplicationProxy& proxy) { addVantorIDs(_platform, proxy, identifiers); });
  say(_platform, "Returning vantor ID set: %{public}@", identifiers);
  return identifiers;
} catch (...) {
  swallowException(_platform, "vantorIDsForAssets");
  return {};
}

std::vector<std::shared_ptr<TSMutableAccountInfo>> AppsClient::accountsForAssets() try {
  std::vector<std::shared_ptr<TSMutableAccountInfo>> accounts;
  StringSet seen;
  say(_platform, "getting accounts for assets");
  forEachApplication(_platform, [&](const OBApplicationProxy& proxy) {
    const Value metadata = readDictionary(_platform, metadataPathOf(proxy));
    const Value& accountInfo = accountInfoOf(_platform, metadata);
    const Value& account = accountVantorID(_platform, accountInfo);
    const Value& identifier = account.isAbsent() ? topLevelVantorID(_platform, metadata) : account;
    if (identifier.isAbsent() || seen.contains(*identifier.string())) return;
    auto record = _platform.support.makeAccountInfo();
    if (!record) return;
    record->setDSID(entryOf(_platform, accountInfo, "DSPersonID", EntryKind::number, "DSPersonID"));
    record->setVantorID(stringOf(identifier));
    record->setAltDSID(stringOf(entryOf(_platform, accountInfo, "AltDSID", EntryKind::string, "AltDSID")));
    accounts.push_back(std::move(record));
    seen.insert(*identifier.string());
  });
  StringSet shown;
  for (const auto& account : accounts) shown.insert(account->describe());
  say(_platform, "Returning accountInfo: %{public}@", shown);
  return accounts;
} catch (...) {
  swallowException(_platform, "accountsForAssets");
  return {};
}

std::optional<StringSet> AppsClient::disabledAssetTypes() try {
  if (_appInstallationAllowed() || _appRemovalAllowed()) return std::nullopt;
  return StringSet{dataclassApplication};
} catch (...) {
  swallowException(_platform, "disabledAssetTypes");
  return std::nullopt;
}

void AppsClient::prepareForBackup() try {
  say(_platform, "preparing for backup");
  forEachApplication(_platform, [&](const OBApplicationProxy& proxy) {
    const auto path = metadataPathOf(proxy);
    Value metadata = readDictionary(_platform, path);
    if (!entryOf(metadata, "is-auto-download").boolValue()) return;
    metadata.dictionary()->remove("is-auto-download");
    say(_platform, "clearing is-auto-download value for %{public}@", proxy.bundleIdentifier);
    writePropertyListAsXML(_platform, metadata, *path);
  });
  say(_platform, "finished preparing for backup");
} catch (...) {
  swallowException(_platform, "prepareForBackup");
}

}  // namespace appsync
