#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "device/records/RecordsGuard.h"
#include "device/records/SharedValue.h"
#include "platform/InstallCoordination.h"
#include "platform/RVClient.h"
#include "platform/ThreadSafety.h"

namespace device {

class Coordinator;

/// A promised piece of an install. Shared by the promise's handles and the coordinator's record.
struct PromiseRecord {
  // Constant once the promise is made.
  std::uint64_t identifier = 0;
  std::string name;
  platform::RVClientIdentifier client = 0;
  std::uint64_t diskSpaceNeeded = 0;

  std::optional<std::string> path GUARDED_BY(recordsGuard);
  double fraction GUARDED_BY(recordsGuard) = 0;    // 0…1
  bool begun GUARDED_BY(recordsGuard) = false;     // has made progress, and observers know
  bool complete GUARDED_BY(recordsGuard) = false;  // what was promised is there
  bool cancelled GUARDED_BY(recordsGuard) = false;
  /// The coordinator whose app asset it is; null for any other promise.
  std::weak_ptr<Coordinator> coordinator GUARDED_BY(recordsGuard);
};
using PromiseRef = std::shared_ptr<PromiseRecord>;

struct InstallOptionsRecord {
  SharedValue metadata;  // a dictionary; absent: the app has none
  std::uint64_t installType = 0;
  std::uint64_t installTargetType = 0;
};

/// A placeholder as it was when it was attached, but for the manifest, which is in its files.
struct PlaceholderRecord {
  std::string name;
  std::string app;
  std::uint64_t installType = 0;
  platform::RVClientIdentifier client = 0;
  bool configured = false;  // false: nothing of what follows counts
  SharedValue manifest;     // a dictionary; absent: none, or the placeholder has been written
  std::optional<std::string> version;
  bool launchProhibited = false;
  SharedValue metadata;  // a dictionary; absent: none
  platform::Bytes rights;
  std::optional<std::string> iconPath;
};

/// What one app's coordinator holds.
struct CoordinatorRecord {
  std::string app;
  platform::RVCoordinatorKind kind = platform::RVCoordinatorKind::RVInitiatingAppInstallCoordinator;
  platform::RVClientIdentifier creator = 0;
  platform::RVClientIdentifier responsibleClient = 0;
  std::optional<InstallOptionsRecord> options;
  std::optional<PlaceholderRecord> placeholder;
  PromiseRef appAsset;
  PromiseRef userData;
  bool hasInitialZDRAssetPromises = false;  // an empty list counts
  std::vector<PromiseRef> initialZDRAssetPromises;
};

/// "RVInitiatingAppInstallCoordinator", …
const char* nameOfKind(platform::RVCoordinatorKind kind);

}  // namespace device
