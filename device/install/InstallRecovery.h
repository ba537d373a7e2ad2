#pragma once

#include "device/install/InstallParts.h"
#include "platform/ThreadSafety.h"

namespace device {

/// Takes up what an earlier process left when a device is opened: its open coordinators are there again and, with
/// `recovers`, interrupted installs are finished or rolled back and leftovers removed. What an orderly end has made
/// sure of is not looked for, which would take as long as there are files. Reports nothing. Before all else.
class InstallRecovery {
 public:
  explicit InstallRecovery(const InstallParts& parts) : _parts(parts) {}

  void run(AppRecords::Loaded loaded, bool recovers) EXCLUDES(recordsGuard);

 private:
  /// A loss of power may leave a placeholder's record without its files.
  void removeLostPlaceholders() EXCLUDES(recordsGuard);
  bool isWhole(const AppRecord& placeholder);

  const InstallParts& _parts;
};

}  // namespace device
