#pragma once

#include <memory>
#include <string>
#include <utility>

#include "device/records/CoordinatorRecord.h"
#include "device/records/RecordsGuard.h"
#include "platform/RVAppInstallCoordinator.h"
#include "platform/ThreadSafety.h"

namespace device {

/// The present state of a coordinator.
struct CoordinatorState {
  CoordinatorRecord record;
  bool ended = false;
  bool takesPlaceholder = false;  // a placeholder's files are being written
  bool fractionUnsaved = false;   // the store has an older progress
  platform::ErrorRef failure;     // why the install failed
  std::weak_ptr<platform::RVAppInstallObserverDelegate> observer;
  /// The handle of the record's promise; null for a promise that an earlier process left and nobody has asked for yet.
  std::shared_ptr<platform::RVPromisedTransferToPath> appAsset;
};

/// One app's coordinator without the operations of its handle (`LocalCoordinator`): what installs and reports are
/// about. `OpenCoordinators` keeps it until it has ended.
class Coordinator : public platform::RVAppInstallCoordinator, public std::enable_shared_from_this<Coordinator> {
 public:
  const std::string app;
  const platform::RVCoordinatorKind kind;
  const platform::RVClientIdentifier creator;
  CoordinatorState state GUARDED_BY(recordsGuard);

 protected:
  explicit Coordinator(CoordinatorRecord record) : app(record.app), kind(record.kind), creator(record.creator) {
    state.record = std::move(record);
  }
};
using CoordinatorRef = std::shared_ptr<Coordinator>;

}  // namespace device
