#pragma once

#include "device/install/InstallParts.h"

namespace device {

/// What an earlier process left, when a device is opened: open coordinators are there again and, if it `recovers`,
/// interrupted installs are finished or rolled back and leftovers removed. Tells nobody. Before anything else is done.
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
