#include "device/install/OpenCoordinators.h"

#include <algorithm>
#include <utility>

namespace device {

CoordinatorRef OpenCoordinators::find(std::string_view app) const {
  auto found = _open.find(app);
  return found == _open.end() ? nullptr : found->second;
}

std::vector<CoordinatorStatus> OpenCoordinators::statuses() const {
  std::vector<CoordinatorStatus> result;
  result.reserve(_open.size());
  for (const auto& [app, coordinator] : _open) {
    const auto& held = coordinator->state.record;
    CoordinatorStatus status{app, coordinator->kind, coordinator->creator};
    status.hasPlaceholder = held.placeholder.has_value();
    status.promisesPackage = held.appAsset || held.responsibleClient != 0;
    status.packageClient = held.responsibleClient != coordinator->creator ? held.responsibleClient : 0;
    if (held.appAsset) status.fraction = held.appAsset->fraction;
    result.push_back(std::move(status));
  }
  return result;
}

CoordinatorRef OpenCoordinators::open(CoordinatorRecord record) {
  for (const auto& promise : {record.appAsset, record.userData}) {
    if (promise) _nextPromise = std::max(_nextPromise, promise->identifier + 1);
  }
  auto coordinator = _make(std::move(record));
  const auto& appAsset = coordinator->state.record.appAsset;
  if (appAsset) appAsset->coordinator = coordinator;
  _open.insert_or_assign(coordinator->app, coordinator);
  return coordinator;
}

void OpenCoordinators::close(Coordinator& coordinator) {
  coordinator.state.ended = true;
  _open.erase(coordinator.app);
}

bool OpenCoordinators::putUnsaved(const DeviceState& state, ChangeSet& changes) {
  bool any = false;
  for (const auto& [app, coordinator] : _open) {
    if (!std::exchange(coordinator->state.fractionUnsaved, false)) continue;
    changes.put(coordinator->state.record);
    if (const auto* record = state.app(app)) changes.put(*record);
    any = true;
  }
  return any;
}

}  // namespace device
