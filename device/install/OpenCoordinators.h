#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <string>
#include <string_view>
#include <vector>

#include "device/DeviceStatus.h"
#include "device/records/AppRecords.h"
#include "device/reports/Coordinator.h"
#include "platform/ThreadSafety.h"

namespace device {

/// The coordinators that are open, at most one for an app. Storing them is the callers' business.
class OpenCoordinators {
 public:
  /// Makes the handle of a coordinator.
  using Make = std::function<CoordinatorRef(CoordinatorRecord record)>;

  explicit OpenCoordinators(Make make) : _make(std::move(make)) {}

  /// Null when the app has none.
  CoordinatorRef find(std::string_view app) const REQUIRES(recordsGuard);
  std::vector<CoordinatorStatus> statuses() const REQUIRES(recordsGuard);

  CoordinatorRef open(CoordinatorRecord record) REQUIRES(recordsGuard);
  /// The coordinator has ended.
  void close(Coordinator& coordinator) REQUIRES(recordsGuard);

  /// Puts the coordinators whose progress in the store is out of date; false when there are none.
  bool putUnsaved(const DeviceState& state, ChangeSet& changes) REQUIRES(recordsGuard);

  /// A number that no promise has, neither of this process nor of coordinators that an earlier one left.
  std::uint64_t newPromiseNumber() REQUIRES(recordsGuard) { return _nextPromise++; }

 private:
  const Make _make;
  std::map<std::string, CoordinatorRef, std::less<>> _open GUARDED_BY(recordsGuard);
  std::uint64_t _nextPromise GUARDED_BY(recordsGuard) = 1;
};

}  // namespace device
