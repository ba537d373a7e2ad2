#include <utility>

#include "core/AppsClient.h"
#include "core/PropertyListFile.h"
#include "core/Say.h"
#include "platform/DevicePaths.h"
#include "platform/FileSystem.h"
#include "platform/PropertyListSerialization.h"
#include "platform/TextTable.h"
#include "restore/DemotionStatus.h"

namespace appsync {

using namespace platform;

namespace {

/// The demoted apps of the backup service's list; an absent or odd list has none.
class DemotedApps {
 public:
  DemotedApps() = default;
  explicit DemotedApps(const Value& list)
      : _automatic(identifiersOf(list, "AutomaticDowngrades")),
        _intentional(identifiersOf(list, "IntentionalDowngrades")) {}

  DemotionStatus statusOf(std::string_view identifier) const {
    if (_automatic.count(identifier)) return demotedAutomatically;
    return _intentional.count(identifier) ? demotedByHand : notDemoted;
  }

 private:
  using Identifiers = platform::BorrowedTextSet;  // of the list

  static Identifiers identifiersOf(const Value& list, std::string_view key) {
    Identifiers identifiers;
    const Array* elements = entryOf(list, key).array();
    if (!elements) return identifiers;
    for (const Value& element : *elements) {
      if (auto identifier = element.string()) identifiers.insert(*identifier);
    }
    return identifiers;
  }

  Identifiers _automatic;
  Identifiers _intentional;
};

bool createsPlaceholders(std::int32_t restoreType) { return restoreType == 2 || restoreType == 3; }

void fileRestoreListAway(const Platform& platform) {
  contained(platform, "removeItem", [&] { platform.fileSystem.removeItem(restoreListLogPath); });
  contained(platform, "moveItem", [&] {
    ErrorRef error;
    if (!platform.fileSystem.moveItem(restoreListPath, restoreListLogPath, &error)) {
      say(platform, "failed to copy harlune metadata. err=%{public}@", error);
    }
  });
}

}  // namespace

bool AppsClient::reconcileRestoreOfType(std::int32_t type, ErrorRef* error) {
  // There is no second call, so each piece is done whatever became of the one before.
  say(_platform, "reconcileRestoreOfType %d", type);
  contained(_platform, "_notifyPanello", [this] { _notifyPanello(_platform, true); });
  contained(_platform, "createDirectory", [this] { _platform.fileSystem.createDirectory(pluginDirectory, true, {}); });
  ErrorRef backupError;
  contained(_platform, "reconcileRestoreOfType", [&] {
    if (!createsPlaceholders(type)) return;
    if (_backupManager && _backupManager->tessaroShouldCreateAppPlaceholdersWithError(&backupError)) {
      _processHarluneRestoreInfo();
    } else {
      say(_platform, "Will not reconcile restore of type %d - error %{public}@", type, backupError);
    }
  });
  setError(error, backupError);
  return true;
}

bool AppsClient::_processHarluneRestoreInfo() {
  if (!_platform.fileSystem.fileExists(restoreListPath)) {
    say(_platform, "no harlune restore plist found - skipping processing of harlune restored apps");
    return true;
  }
  const bool result = contained(_platform, "_processHarluneRestoreInfo", [this] { return _restoreAppsOfFile(); });
  fileRestoreListAway(_platform);
  return result;
}

bool AppsClient::_restoreAppsOfFile() {
  ErrorRef error;
  auto bytes = _platform.fileSystem.readFile(restoreListPath, &error);
  if (!bytes) {
    say(_platform, "failed to read harlune app restore info. err=%{public}@", error);
    return false;
  }
  say(_platform, "processing harlune restore info");
  const Value list = _platform.propertyLists.propertyListWithData(std::move(*bytes), &error);
  if (!list.dictionary()) {
    say(_platform, "failed to parse harlune app restore info. err=%{public}@", error);
    return false;
  }
  return _restoreAppsOfList(*list.dictionary());
}

bool AppsClient::_restoreAppsOfList(const Dictionary& list) {
  Value demotedList;
  DemotedApps demoted;
  contained(_platform, "_loadDemotedAppsPlist", [&] {
    demotedList = _loadDemotedAppsPlist(_platform, demotedAppsPath);
    demoted = DemotedApps(demotedList);
  });
  say(_platform, LogCategory::summary, "Demoted Apps: %{public}@", demotedList);
  bool result = false;
  for (const auto& [identifier, entry] : list) {
    const std::uint64_t status = demoted.statusOf(identifier);
    say(_platform, "processing harlune restore info for '%{public}@' demotionStatus :%lu", identifier, status);
    if (!entry.dictionary()) {
      say(_platform, "no harlune restore info for '%{public}@' - skipping", identifier);
      continue;
    }
    const auto metadata = entryOf(entry, "HarluneMetadata").data();
    if (!metadata) {
      say(_platform, "no HarluneMetadata for '%{public}@' - ignoring", identifier);
      continue;
    }
    const RestoreInput input{identifier, *metadata, entryOf(entry, "ApplicationSINF").data(),
                             entryOf(entry, "PlaceholderIcon").data()};
    result = prepareAppForRestoreUsingCoordination(input, status);
  }
  _waitForPlaceholderInstalls();
  return result;
}

Value AppsClient::_loadDemotedAppsPlist(const Platform& platform, std::string_view path, ErrorRef* error) {
  return readList(platform, path, Value::Kind::dictionary, "couldn't parse demoted apps list",
                  "demoted apps list is not a dictionary", error);
}

}  // namespace appsync
