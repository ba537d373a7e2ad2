#include "device/records/AppRecords.h"

#include <algorithm>
#include <iterator>
#include <new>

#include "device/DeviceErrors.h"
#include "device/records/RecordCodec.h"

namespace device {

namespace {

using platform::Value;

constexpr char deviceKind[] = "device";
constexpr char closedKey[] = "closed";

platform::OBApplicationProxyRef makeProxy(const AppRecord& app) {
  auto proxy = std::make_shared<platform::OBApplicationProxy>();
  proxy->bundleIdentifier = app.id;
  proxy->applicationIdentifier = app.id;
  proxy->bundleVersion = app.version;
  proxy->bundleURL = app.bundlePath();
  proxy->bundleContainerURL = app.container;
  proxy->applicationType = app.applicationType;
  proxy->isInstalled = !app.isPlaceholder;
  proxy->isPlaceholder = app.isPlaceholder;
  proxy->appState = {!app.isPlaceholder, app.isPlaceholder};
  proxy->installType = app.installType;
  if (app.progress) proxy->installProgressSync = platform::OBInstallProgress{app.progress->state, app.progress->phase};
  proxy->diskUsage.staticUsage = app.staticUsage;
  return proxy;
}

void takeApp(DeviceState& state, AppRecord app) {
  app.proxy = makeProxy(app);
  state.nextHomeOrder = std::max(state.nextHomeOrder, app.homeOrder + 1);
  auto id = app.id;
  state.changedApps.insert(id);
  state.apps.insert_or_assign(std::move(id), std::move(app));
}

void takeOutcome(DeviceState& state, const std::string& app, OutcomeRecord outcome) {
  state.nextHomeOrder = std::max(state.nextHomeOrder, outcome.homeOrder + 1);
  state.outcomes.insert_or_assign(app, std::move(outcome));
}

std::uint64_t homeOrderOfNew(const DeviceState& state, const std::string& id) {
  auto outcome = state.outcomes.find(id);
  bool wasLost = outcome != state.outcomes.end() && outcome->second.homeOrder != 0;
  return wasLost ? outcome->second.homeOrder : state.nextHomeOrder;
}

void takeLayout(DeviceState& state, HomeLayout layout) {
  state.layout = std::move(layout);
  state.inLayout.clear();
  for (const auto& page : state.layout.pages) state.inLayout.insert(page.begin(), page.end());
}

HomeLayout without(const HomeLayout& layout, const std::string& id) {
  HomeLayout result = layout;
  for (auto& page : result.pages) page.erase(std::remove(page.begin(), page.end(), id), page.end());
  return result;
}

}  // namespace

const AppRecord* DeviceState::app(std::string_view id) const {
  auto found = apps.find(id);
  return found == apps.end() ? nullptr : &found->second;
}

std::vector<std::string> DeviceState::homeOrder() const {
  std::vector<std::string> order;
  for (const auto& page : layout.pages) order.insert(order.end(), page.begin(), page.end());
  std::vector<const AppRecord*> others;
  for (const auto& [id, app] : apps) {
    if (!inLayout.count(id)) others.push_back(&app);
  }
  std::sort(others.begin(), others.end(), [](auto* one, auto* other) { return one->homeOrder < other->homeOrder; });
  for (const auto* app : others) order.push_back(app->id);
  return order;
}

std::optional<AppStatus> DeviceState::status(std::string_view id) const {
  const auto* record = app(id);
  auto outcome = outcomes.find(id);
  if (!record && outcome == outcomes.end()) return std::nullopt;
  AppStatus status;
  status.id = std::string(id);
  if (record) {
    status.name = record->name;
    status.version = record->version.value_or("");
    status.state = record->isPlaceholder ? AppState::placeholder
                   : record->progress    ? AppState::updating
                                         : AppState::installed;
    status.installType = record->installType;
    status.type = record->applicationType;
    if (record->progress) status.progress = record->progress->fraction;
  }
  if (outcome != outcomes.end()) {
    status.lastOutcome = outcome->second.outcome;
    status.lastReason = outcome->second.reason;
  }
  return status;
}

void ChangeSet::add(StoreRecord record, std::function<void(DeviceState& state)> apply) {
  _steps.push_back({[record = std::move(record)](const DeviceState&, std::vector<StoreRecord>& records) mutable {
                      records.push_back(std::move(record));
                    },
                    std::move(apply)});
}

void ChangeSet::put(AppRecord app) {
  auto shared = std::make_shared<AppRecord>(std::move(app));
  _steps.push_back({[shared](const DeviceState& state, std::vector<StoreRecord>& records) {
                      if (!shared->homeOrder) shared->homeOrder = homeOrderOfNew(state, shared->id);
                      records.push_back({"app", shared->id, valueOfApp(*shared)});
                    },
                    [shared](DeviceState& state) { takeApp(state, *shared); }});
}

void ChangeSet::removeApp(std::string_view id, bool isLost) {
  _steps.push_back({[id = std::string(id), isLost](const DeviceState& state, std::vector<StoreRecord>& records) {
                      records.push_back({"app", id, {}});
                      if (!isLost && state.inLayout.count(id))
                        records.push_back({"home", "layout", valueOfLayout(without(state.layout, id))});
                    },
                    [id = std::string(id), isLost](DeviceState& state) {
                      state.apps.erase(id);
                      state.changedApps.insert(id);
                      if (!isLost && state.inLayout.count(id)) takeLayout(state, without(state.layout, id));
                    }});
}

void ChangeSet::put(const CoordinatorRecord& coordinator) {
  add({"coordinator", coordinator.app, valueOfCoordinator(coordinator)}, nullptr);
}
void ChangeSet::removeCoordinator(std::string_view app) { add({"coordinator", std::string(app), {}}, nullptr); }

void ChangeSet::setOutcome(std::string_view app, const OutcomeRecord& outcome) {
  add({"outcome", std::string(app), valueOfOutcome(outcome)},
      [app = std::string(app), outcome](DeviceState& state) { takeOutcome(state, app, outcome); });
}
void ChangeSet::removeOutcome(std::string_view app) {
  add({"outcome", std::string(app), {}}, [app = std::string(app)](DeviceState& state) { state.outcomes.erase(app); });
}

void ChangeSet::addUninstalled(std::string_view app, const Value& facts) {
  add({"uninstalled", std::string(app), facts},
      [app = std::string(app), facts](DeviceState& state) { state.uninstalled.insert_or_assign(app, facts); });
}
void ChangeSet::removeUninstalled(std::string_view app) {
  add({"uninstalled", std::string(app), {}},
      [app = std::string(app)](DeviceState& state) { state.uninstalled.erase(app); });
}

void ChangeSet::setLayout(HomeLayout layout) {
  auto value = valueOfLayout(layout);
  add({"home", "layout", std::move(value)},
      [layout = std::move(layout)](DeviceState& state) { takeLayout(state, layout); });
}

void ChangeSet::setSetting(std::string_view key, std::string_view text) {
  add({"setting", std::string(key), text}, [key = std::string(key), text = std::string(text)](DeviceState& state) {
    changeSetting(state.settings, key, text);
  });
}

void ChangeSet::setNotificationState(std::string_view name, std::uint64_t state) {
  add({"notification", std::string(name), state}, [name = std::string(name), state](DeviceState& device) {
    device.notificationStates.insert_or_assign(name, state);
  });
}

void ChangeSet::addLeftover(std::string_view path) { add({"leftover", std::string(path), true}, nullptr); }
void ChangeSet::removeLeftover(std::string_view path) { add({"leftover", std::string(path), {}}, nullptr); }
void ChangeSet::setClosed() { add({deviceKind, closedKey, true}, nullptr); }

std::optional<AppRecords::Loaded> AppRecords::load(platform::ErrorRef* error) {
  Loaded loaded;
  Lock lock(*this);
  platform::ErrorRef reason;
  _store.read([&](const StoreRecord& record) REQUIRES(recordsGuard) {
    if (!take(record, loaded))
      reason = localDeviceError(LocalDeviceError::notADevice, "device.db: the record " + record.kind + " \"" +
                                                                  record.key + "\" cannot be understood");
    return !reason;
  });
  platform::setError(error, reason);
  return reason ? std::nullopt : std::optional(std::move(loaded));
}

bool AppRecords::take(const StoreRecord& record, Loaded& loaded) {
  if (record.kind == "app") {
    auto app = appOfValue(record.key, record.value);
    if (app) takeApp(_state, std::move(*app));
    return app.has_value();
  }
  if (record.kind == "coordinator") {
    auto coordinator = coordinatorOfValue(record.key, record.value);
    if (coordinator) loaded.coordinators.push_back(std::move(*coordinator));
    return coordinator.has_value();
  }
  if (record.kind == "outcome") {
    auto outcome = outcomeOfValue(record.value);
    if (outcome) takeOutcome(_state, record.key, std::move(*outcome));
    return outcome.has_value();
  }
  if (record.kind == "home") {
    auto layout = layoutOfValue(record.value);
    if (layout) takeLayout(_state, std::move(*layout));
    return layout.has_value();
  }
  if (record.kind == "setting") {
    auto value = record.value.string();
    // One of another program's version stays in the store and counts as not set.
    if (value) changeSetting(_state.settings, record.key, *value);
    return value.has_value();
  }
  if (record.kind == "notification")
    _state.notificationStates.insert_or_assign(record.key, record.value.unsignedInteger().value_or(0));
  if (record.kind == "uninstalled") _state.uninstalled.insert_or_assign(record.key, record.value);
  if (record.kind == "leftover") loaded.leftovers.push_back(record.key);
  if (record.kind == deviceKind && record.key == closedKey) {
    loaded.closed = _saysClosed = true;
    _later.push_back({deviceKind, closedKey, {}});
  }
  return true;
}

bool AppRecords::commit(ChangeSet&& changes, platform::ErrorRef* error) { return keep(&Store::commit, changes, error); }
bool AppRecords::write(ChangeSet&& changes, platform::ErrorRef* error) { return keep(&Store::write, changes, error); }

bool AppRecords::keep(Keep keep, const ChangeSet& changes, platform::ErrorRef* error) {
  platform::ErrorRef reason;
  bool kept = false;
  try {
    std::vector<StoreRecord> records;
    records.reserve(_later.size() + 2 * changes._steps.size());  // records are costly to move
    records.insert(records.end(), _later.begin(), _later.end());
    for (const auto& step : changes._steps) step.encode(_state, records);
    kept = (_store.*keep)(records, &reason);
  } catch (const std::bad_alloc&) {
    reason = localDeviceError(LocalDeviceError::failed, "out of memory");
  }
  platform::setError(error, reason);
  if (!kept && _refused) _refused(reason);
  if (!kept) return false;
  // A process that cannot take over what it has stored must not go on with what it had before.
  const auto takeOver = [&]() REQUIRES(recordsGuard) noexcept {
    _later.clear();
    _saysClosed = false;
    for (const auto& step : changes._steps) {
      if (step.apply) step.apply(_state);
    }
  };
  takeOver();
  return true;
}

void AppRecords::commitLater(ChangeSet&& changes) {
  for (const auto& step : changes._steps) {
    step.encode(_state, _later);
    if (step.apply) step.apply(_state);
  }
}

bool AppRecords::flush(platform::ErrorRef* error) {
  platform::setError(error, nullptr);
  Lock lock(*this);
  return _later.empty() || commit({}, error);
}

void AppRecords::takeBackClosed() {
  Lock lock(*this);
  if (_saysClosed) commit({});
}

void AppRecords::setFraction(std::string_view app, double fraction) {
  auto found = _state.apps.find(app);
  if (found != _state.apps.end() && found->second.progress) found->second.progress->fraction = fraction;
}

}  // namespace device
