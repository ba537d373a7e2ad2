#include "transfer/OutstandingTransfers.h"

#include <algorithm>
#include <utility>

#include "core/PathCheck.h"
#include "core/PropertyListFile.h"
#include "core/Say.h"
#include "platform/DeviceNames.h"
#include "platform/DevicePaths.h"
#include "platform/FileSystem.h"
#include "platform/OBNumbers.h"
#include "platform/Process.h"
#include "platform/TodoOperation.h"
#include "transfer/InProgressAssetQuery.h"

namespace appsync {

using namespace platform;

static CandidateRef candidateFromPlaceholder(const OBApplicationProxy& proxy) {
  auto candidate = std::make_shared<Candidate>();
  candidate->bundleVersion = proxy.bundleVersion;
  candidate->bundleIdentifier = *proxy.bundleIdentifier;
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

static void resetIconScratchDirectory(const Platform& platform) {
  platform.fileSystem.removeItem(iconScratchDirectory);
  ErrorRef error;
  if (!platform.fileSystem.createDirectory(iconScratchDirectory, false, {}, &error)) {
    sayError(platform, "Can't create icon scratch dir! %{public}@", error);
  }
}

std::vector<TSAssetRef> AppsClient::outstandingAssetTransfers() try {
  return OutstandingTransfers(*this).run();
} catch (...) {
  swallowException(_platform, "outstandingAssetTransfers");
  return {};
}

AppsClient::OutstandingTransfers::OutstandingTransfers(AppsClient& client)
    : _client(client),
      _platform(client._platform),
      _installationAllowed(client._appInstallationAllowed()),
      _todoList(_loadPlist(_platform, todoListPath)) {}

std::vector<TSAssetRef> AppsClient::OutstandingTransfers::run() {
  say(_platform, LogCategory::summary, "outstandingAssetTransfers starting with todoList %{public}@", _todoList);
  _systemAppPlaceholders = _client._getSystemAppPlaceholders();
  addPlaceholders();
  addRequests();
  removeInProgress();
  const auto ordered = _orderTheItems(_platform, _idsWeWant);
  resetIconScratchDirectory(_platform);

  // Room is made beforehand: an app that is prepared is in the answer, whatever fails.
  std::vector<TSAssetRef> transfers;
  transfers.reserve(ordered.size());
  for (const auto& candidate : ordered) {
    TSAssetRef asset;
    Verdict verdict = Verdict::failed;
    contained(_platform, "outstandingAssetTransfers", [&] { verdict = consider(*candidate, asset); });
    if (verdict == Verdict::prepared) transfers.push_back(std::move(asset));
    if (verdict == Verdict::failed) giveUp(candidate->bundleIdentifier);
  }
  return transfers;
}

void AppsClient::OutstandingTransfers::addPlaceholders() {
  _client._enumeratePlaceholdersWithBlock([this](const OBApplicationProxy& proxy, bool&) {
    if (!proxy.applicationIdentifier || !proxy.bundleIdentifier) return;
    _idsWeWant.set(*proxy.applicationIdentifier, candidateFromPlaceholder(proxy));
  });
  // At this moment the second list is a copy of the first.
  say(_platform, LogCategory::summary,
      "outstandingAssetTransfers preExistingPlaceHolders %{public}@, idsWeWant %{public}@", _idsWeWant, _idsWeWant);
}

void AppsClient::OutstandingTransfers::addRequests() {
  if (!_todoList.array()) return;
  for (const Value& element : *_todoList.array()) {
    const Dictionary* item = element.dictionary();
    if (!item || (*item)["operation"].string() != todo::install) continue;
    const Value& identifier = (*item)["identifier"];
    if (!isSafePathComponent(identifier)) {
      say(_platform, "Ignoring invalid path: %{public}@", identifier);
      continue;
    }
    _requestedIDs.insert(*identifier.string());
    if (_idsWeWant.find(*identifier.string())) {
      say(_platform, "%{public}@ already has a placeholder - skipping", identifier);
    } else {
      _idsWeWant.set(*identifier.string(), candidateFromRequest(*item, *identifier.string()));
    }
  }
}

void AppsClient::OutstandingTransfers::removeInProgress() {
  std::optional<std::vector<std::string>> inProgress;
  std::optional<std::vector<std::string>> restoring;
  InProgressAssetQuery::currentInProgressAssetIDs(_platform, inProgress, restoring);
  if (inProgress) {
    say(_platform, "Assets already in progress (not returning these): %{public}@", *inProgress);
    for (const auto& identifier : *inProgress) _idsWeWant.erase(identifier);
  } else {
    sayError(_platform, "Failed to get list of assets already in progress!");
  }
  if (restoring) {
    say(_platform, "Assets currently restoring: %{public}@", *restoring);
  } else {
    sayError(_platform, "Failed to get list of assets currently restoring!");
  }
}

AppsClient::OutstandingTransfers::Verdict AppsClient::OutstandingTransfers::consider(const Candidate& candidate,
                                                                                     TSAssetRef& asset) {
  if (!isWanted(candidate)) return Verdict::notWanted;
  asset = makeAsset(candidate);
  return prepare(asset) ? Verdict::prepared : Verdict::failed;
}

bool AppsClient::OutstandingTransfers::isWanted(const Candidate& candidate) const {
  const std::string& identifier = candidate.bundleIdentifier;
  if (!candidate.isRestore && !_installationAllowed) {
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
  if (_systemAppPlaceholders.contains(identifier)) {
    say(_platform, "%{public}@ is system app placeholder - skipping", identifier);
    return false;
  }
  if (!candidate.autoDemoted && !candidate.intentionallyDemoted) return true;
  if (_requestedIDs.contains(identifier)) {
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
  return candidate.bundleIdentifier;
}

static std::optional<std::string> pathBelow(const std::optional<std::string>& directory, std::string_view name) {
  return directory ? std::optional(joinedPath(*directory, name)) : std::nullopt;
}

static void sayRecoveredPath(const Platform& platform, const std::string& identifier, const Value& stored) {
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

TSAssetRef AppsClient::OutstandingTransfers::makeAsset(const Candidate& candidate) const {
  const std::string& identifier = candidate.bundleIdentifier;
  const std::string name = displayNameOf(_platform, candidate);
  std::optional<std::string> icon = joinedPath(iconScratchDirectory, identifier + ".png");
  if (!_makeIconFromBundlePath(_platform, candidate.path, *icon)) {
    icon = pathBelow(candidate.container, artworkFileName);
  }
  TSAssetRef asset = TSAsset::downloadAssetWithIdentifier(identifier, dataclassApplication, name);
  asset->setIcon(icon);
  asset->setIsRestore(false);
  sayRecoveredPath(_platform, identifier,
                   _client._restoreStatePropertyForKey("path", identifier, candidate.bundleVersion));
  asset->setVariantOptions(variantOptionsOf(candidate));
  asset->setStorePlist(pathBelow(candidate.container, storeMetadataFileName));
  asset->setInfoPlist(pathBelow(candidate.path, "Info.plist"));
  asset->setAssetType(std::string(dataclassApplication));
  say(_platform,
      "Asset %{public}@ (pretty=%{public}@, version=%{public}@) prepped with icon %{public}@, at %{public}@, meta at "
      "%{public}@, info at %{public}@, storePid=%lld, isRestore=%c",
      identifier, name, candidate.bundleVersion, asset->icon(), candidate.path, asset->storePlist(), asset->infoPlist(),
      asset->storePID(), yesOrNo(asset->isRestore()));
  return asset;
}

bool AppsClient::OutstandingTransfers::prepare(const TSAssetRef& asset) {
  const std::string& identifier = asset->identifier();
  const auto proxy = _platform.workspace.applicationProxyForIdentifier(identifier, false);
  const bool existingApp = proxy && proxy->isInstalled && !proxy->isPlaceholder;
  if (!existingApp) return _client.prepareAppForInstallUsingCoordination(asset, false);
  say(_platform, "App %{public}@ is already installed and will be updated.", identifier);
  // Before the preparation, so that nothing can fail after it.
  const bool added = _client._addUpdatingApp(identifier);
  const bool prepared = _client.prepareAppForInstallUsingCoordination(asset, true);
  if (!prepared && added) _client._removeUpdatingApp(identifier);
  return prepared;
}

void AppsClient::OutstandingTransfers::giveUp(const std::string& identifier) {
  sayError(_platform, "Not requesting app asset for %{public}@", identifier);
  contained(_platform, "changeAssetID", [&] { _client.changeAssetID(identifier, todo::failed); });
}

bool AppsClient::_addUpdatingApp(std::string_view identifier) {
  SerialQueue::Block block(_accessQueue, _platform.clock);
  return _updatingApps.insert(identifier);
}

bool AppsClient::_removeUpdatingApp(std::string_view identifier) {
  SerialQueue::Block block(_accessQueue, _platform.clock);
  return _updatingApps.erase(identifier);
}

}  // namespace appsync
