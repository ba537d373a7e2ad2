#include <utility>

#include "core/AppsClient.h"
#include "core/Candidate.h"
#include "core/PathCheck.h"
#include "core/Paths.h"
#include "core/PropertyListFile.h"
#include "core/Say.h"
#include "platform/FileSystem.h"
#include "platform/Process.h"
#include "transfer/InProgressAssetQuery.h"

namespace appsync {

using namespace platform;

static CandidateRef candidateFromPlaceholder(const OBApplicationProxy& proxy) {
  auto candidate = std::make_shared<Candidate>();
  candidate->bundleVersion = proxy.bundleVersion;
  candidate->bundleIdentifier = proxy.bundleIdentifier;
  candidate->container = proxy.bundleContainerURL;
  candidate->isRestore = proxy.installType == installType::restore;
  candidate->intentionallyDemoted = proxy.installType == installType::intentionalDowngrade;
  candidate->autoDemoted = proxy.installType == installType::downgrade;
  candidate->isSystemApp = proxy.applicationType == "System";
  candidate->path = proxy.bundleURL;
  return candidate;
}

static CandidateRef candidateFromRequest(const Dictionary& item, std::string_view identifier) {
  auto candidate = std::make_shared<Candidate>();
  candidate->path = joinedPath(workArea, identifier);
  candidate->bundleIdentifier = identifier;
  candidate->container = candidate->path;
  candidate->bundleVersion = stringOf(item["version"]);
  candidate->nameFromHarlune = stringOf(item["name"]);
  return candidate;
}

Candidates AppsClient::_placeholderCandidates() {
  Candidates candidates;
  _enumeratePlaceholdersWithBlock([&](const OBApplicationProxy& proxy, bool&) {
    if (proxy.applicationIdentifier) candidates.set(*proxy.applicationIdentifier, candidateFromPlaceholder(proxy));
  });
  return candidates;
}

void AppsClient::_addRequests(const Value& todoList, Candidates& idsWeWant, StringSet& requestedIDs) {
  if (!todoList.array()) return;
  for (const Value& element : *todoList.array()) {
    const Dictionary* item = element.dictionary();
    if (!item || (*item)["operation"].string() != operation::install) continue;
    const Value& identifier = (*item)["identifier"];
    if (!isSafePathComponent(identifier)) {
      say(_platform, "Ignoring invalid path: %{public}@", identifier);
      continue;
    }
    requestedIDs.insert(*identifier.string());
    if (idsWeWant.find(*identifier.string())) {
      say(_platform, "%{public}@ already has a placeholder - skipping", identifier);
    } else {
      idsWeWant.set(*identifier.string(), candidateFromRequest(*item, *identifier.string()));
    }
  }
}

void AppsClient::_removeInProgress(Candidates& idsWeWant) {
  std::optional<std::vector<std::string>> inProgress;
  std::optional<std::vector<std::string>> restoring;
  InProgressAssetQuery::currentInProgressAssetIDs(_platform, inProgress, restoring);
  if (inProgress) {
    say(_platform, "Assets already in progress (not returning these): %{public}@", *inProgress);
    for (const auto& identifier : *inProgress) idsWeWant.erase(identifier);
  } else {
    sayError(_platform, "Failed to get list of assets already in progress!");
  }
  if (restoring) {
    say(_platform, "Assets currently restoring: %{public}@", *restoring);
  } else {
    sayError(_platform, "Failed to get list of assets currently restoring!");
  }
}

static void resetIconScratchDirectory(const Platform& platform) {
  platform.fileSystem.removeItem(iconScratchDirectory);
  ErrorRef error;
  if (!platform.fileSystem.createDirectory(iconScratchDirectory, false, {}, &error)) {
    sayError(platform, "Can't create icon scratch dir! %{public}@", error);
  }
}

std::vector<TSAssetRef> AppsClient::outstandingAssetTransfers() try {
  std::vector<TSAssetRef> transfers;
  transfers.reserve(16);
  const bool installationAllowed = _appInstallationAllowed();
  const Value todoList = _loadPlist(_platform, todoListPath);
  StringSet requestedIDs;
  say(_platform, LogCategory::summary, "outstandingAssetTransfers starting with todoList %{public}@", todoList);

  const StringSet systemAppPlaceholders = _getSystemAppPlaceholders();
  const Candidates preExistingPlaceHolders = _placeholderCandidates();
  Candidates idsWeWant = preExistingPlaceHolders;
  say(_platform, LogCategory::summary,
      "outstandingAssetTransfers preExistingPlaceHolders %{public}@, idsWeWant %{public}@", preExistingPlaceHolders,
      idsWeWant);
  _addRequests(todoList, idsWeWant, requestedIDs);
  _removeInProgress(idsWeWant);
  const auto ordered = _orderTheItems(_platform, idsWeWant);
  resetIconScratchDirectory(_platform);

  for (const auto& candidate : ordered) {
    if (!_isWanted(*candidate, installationAllowed, systemAppPlaceholders, requestedIDs)) continue;
    TSAssetRef asset = _makeAsset(*candidate);
    if (_prepareTransfer(asset)) transfers.push_back(std::move(asset));
  }
  return transfers;
} catch (...) {
  swallowException(_platform, "outstandingAssetTransfers");
  return {};
}

bool AppsClient::_isWanted(const Candidate& candidate, bool installationAllowed, const StringSet& systemAppPlaceholders,
                           const StringSet& requestedIDs) {
  const auto& identifier = candidate.bundleIdentifier;
  if (!candidate.isRestore && !installationAllowed) {
    say(_platform, "skipping %{public}@ - its not a restore and app installation is disabled", identifier);
    return false;
  }
  if (candidate.isRestore) {
    say(_platform, "%{public}@ is currenlty marked to be restored and will be handled by tillerd - skipping",
        identifier);
    return false;
  }
  if (candidate.isSystemApp) {
    say(_platform, "%{public}@ is auto demoted: %d, manual demoted: %d, system app:%d - skipping", identifier,
        candidate.autoDemoted, candidate.intentionallyDemoted, 1);
    return false;
  }
  if (identifier && systemAppPlaceholders.contains(*identifier)) {
    say(_platform, "%{public}@ is system app placeholder - skipping", identifier);
    return false;
  }
  if (!candidate.autoDemoted && !candidate.intentionallyDemoted) return true;
  if (identifier && requestedIDs.contains(*identifier)) {
    say(_platform,
        "%{public}@ is currenlty demoted (manual:%d, auto:%d) - but will be installed as it's requested by client",
        identifier, candidate.intentionallyDemoted, candidate.autoDemoted);
    return true;
  }
  say(_platform, "%{public}@ is currenlty demoted (manual:%d, auto:%d) - skipping", identifier,
      candidate.intentionallyDemoted, candidate.autoDemoted);
  return false;
}

/// The bundle's display name, else the host's name for the app, else the identifier.
static std::string displayNameOf(const Platform& platform, const Candidate& candidate) {
  if (candidate.path) {
    const Value info = platform.process.infoDictionaryOfBundleAtPath(*candidate.path);
    if (auto name = stringOf(entryOf(info, "KBBundleDisplayName"))) return *name;
  }
  if (candidate.nameFromHarlune) return *candidate.nameFromHarlune;
  return candidate.bundleIdentifier.value_or("");
}

static std::optional<std::string> pathBelow(const std::optional<std::string>& directory, std::string_view name) {
  return directory ? std::optional(joinedPath(*directory, name)) : std::nullopt;
}

static void sayRecoveredPath(const Platform& platform, const std::optional<std::string>& identifier,
                             const Value& stored) {
  auto path = stored.string();
  if (!path) return;
  if (platform.fileSystem.fileExists(*path)) {
    say(platform, "Recovered download path for %{public}@ at %{public}@", identifier, *path);
  } else {
    say(platform, "Download path recovered for %{public}@ but the file is missing: %{public}@", identifier, *path);
  }
}

static Value variantOptionsOf(const Candidate& candidate) {
  Value options = Value::makeDictionary();
  options.dictionary()->set("AssetParts", kTSAssetPartApplication);
  if (candidate.bundleVersion) options.dictionary()->set("Version", *candidate.bundleVersion);
  return options;
}

TSAssetRef AppsClient::_makeAsset(const Candidate& candidate) {
  const std::string identifier = candidate.bundleIdentifier.value_or("");
  const std::string name = displayNameOf(_platform, candidate);
  std::optional<std::string> icon = joinedPath(iconScratchDirectory, identifier + ".png");
  if (!_makeIconFromBundlePath(_platform, candidate.path, *icon)) {
    icon = pathBelow(candidate.container, "HarluneArtwork");
  }
  TSAssetRef asset = TSAsset::downloadAssetWithIdentifier(identifier, dataclassApplication, name);
  asset->setIcon(icon);
  asset->setIsRestore(false);
  sayRecoveredPath(_platform, candidate.bundleIdentifier,
                   _restoreStatePropertyForKey("path", identifier, candidate.bundleVersion));
  asset->setVariantOptions(variantOptionsOf(candidate));
  asset->setStorePlist(pathBelow(candidate.container, storeMetadataFileName));
  asset->setInfoPlist(pathBelow(candidate.path, "Info.plist"));
  asset->setAssetType(std::string(dataclassApplication));
  say(_platform,
      "Asset %{public}@ (pretty=%{public}@, version=%{public}@) prepped with icon %{public}@, at %{public}@, meta at "
      "%{public}@, info at %{public}@, storePid=%lld, isRestore=%c",
      candidate.bundleIdentifier, name, candidate.bundleVersion, asset->icon(), candidate.path, asset->storePlist(),
      asset->infoPlist(), asset->storePID(), yesOrNo(asset->isRestore()));
  return asset;
}

bool AppsClient::_prepareTransfer(const TSAssetRef& asset) {
  const std::string& identifier = asset->identifier();
  const auto proxy = _platform.workspace.applicationProxyForIdentifier(identifier, false);
  const bool existingApp = proxy && proxy->isInstalled && !proxy->isPlaceholder;
  if (existingApp) say(_platform, "App %{public}@ is already installed and will be updated.", identifier);
  if (!prepareAppForInstallUsingCoordination(asset, existingApp)) {
    sayError(_platform, "Not requesting app asset for %{public}@", identifier);
    changeAssetID(identifier, operation::failed);
    return false;
  }
  if (existingApp) {
    SerialQueue::Block block(_accessQueue);
    _updatingApps.insert(identifier);
  }
  return true;
}

}  // namespace appsync
