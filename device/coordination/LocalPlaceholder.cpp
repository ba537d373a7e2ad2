#include "device/coordination/LocalPlaceholder.h"

#include "device/DeviceErrors.h"
#include "device/coordination/LocalPlaceholderAttributes.h"
#include "device/coordination/LocalPromise.h"
#include "device/coordination/LocalStoreMetadata.h"
#include "device/install/CoordinationError.h"

namespace device {

namespace {

using platform::ErrorRef;
using Lock = platform::Mutex::Lock;

constexpr const char* className = "RVPlaceholder";

}  // namespace

LocalPlaceholder::LocalPlaceholder(InstallEngine& engine, Boundary& boundary, PlaceholderRecord record)
    : _engine(engine),
      _boundary(boundary),
      _app(record.app),
      _describe("<RVPlaceholder " + record.app + " type " + std::to_string(record.installType) + '>'),
      _record(std::move(record)) {}

bool LocalPlaceholder::take(Coordinator& coordinator, PlaceholderRecord& record,
                            std::shared_ptr<LocalTransferPromise>& icon, ErrorRef* error) {
  Lock lock(_mutex);
  if (_cancelled)
    return fail(error, coordinationError(CoordinationError::ended, "the placeholder of " + _app + " is cancelled"));
  if (!_coordinator.expired())
    return fail(error, coordinationError(CoordinationError::alreadySet,
                                         "the placeholder of " + _app + " is already attached to a coordinator"));
  record = _record;
  icon = _icon;
  // Set from the beginning: a placeholder cancelled while its files are written has to end the right coordinator.
  _coordinator = coordinator.weak_from_this();
  return true;
}

bool LocalPlaceholder::attachTo(Coordinator& coordinator, ErrorRef* error) {
  PlaceholderRecord record;
  std::shared_ptr<LocalTransferPromise> icon;
  if (!take(coordinator, record, icon, error)) return false;
  if (icon) record.iconPath = _engine.deliveredPath(*icon->record);
  if (_engine.attachPlaceholder(coordinator, record, error)) return true;
  Lock lock(_mutex);
  _coordinator.reset();
  return false;
}

template <class Edit>
bool LocalPlaceholder::change(ErrorRef* error, Edit&& edit) {
  platform::setError(error, nullptr);
  Lock lock(_mutex);
  if (_cancelled)
    return fail(error, coordinationError(CoordinationError::ended, "the placeholder of " + _app + " is cancelled"));
  if (_record.configured)
    return fail(error,
                coordinationError(CoordinationError::ended, "the placeholder of " + _app + " is already configured"));
  edit(_record, _icon);
  return true;
}

bool LocalPlaceholder::setIconPromise(const std::shared_ptr<platform::RVPromisedTransferToPath>& promise,
                                      ErrorRef* error) {
  return _boundary.call({{className, "setIconPromise"}, _app}, error, {{"promise", promise}}, [&] {
    auto ours = std::dynamic_pointer_cast<LocalTransferPromise>(promise);
    if (!ours) return fail(error, coordinationError(CoordinationError::invalid, "no icon promise for " + _app));
    return change(error, [&](PlaceholderRecord&, auto& icon) { icon = ours; });
  });
}

bool LocalPlaceholder::setMetadata(const std::shared_ptr<platform::CVStoreMetadata>& metadata, ErrorRef* error) {
  return _boundary.call({{className, "setMetadata"}, _app}, error, {{"metadata", metadata}}, [&] {
    auto ours = std::dynamic_pointer_cast<LocalStoreMetadata>(metadata);
    return change(error,
                  [&](PlaceholderRecord& record, auto&) { record.metadata = ours ? ours->dictionary : SharedValue(); });
  });
}

bool LocalPlaceholder::setPlaceholderAttributes(const std::shared_ptr<platform::RVPlaceholderAttributes>& attributes,
                                                ErrorRef* error) {
  return _boundary.call({{className, "setPlaceholderAttributes"}, _app}, error, {{"attributes", attributes}}, [&] {
    auto ours = std::dynamic_pointer_cast<LocalPlaceholderAttributes>(attributes);
    if (!ours) return fail(error, coordinationError(CoordinationError::invalid, "no attributes for " + _app));
    auto facts = ours->facts();
    return change(error, [&](PlaceholderRecord& record, auto&) {
      record.manifest = facts.manifest;
      record.version = facts.version;
      record.launchProhibited = facts.launchProhibited;
    });
  });
}

bool LocalPlaceholder::setSinfData(platform::BytesView data, ErrorRef* error) {
  return _boundary.call(
      {{className, "setSinfData"}, _app}, error, {{"data", CallArgument::BytesCount{data.size()}}},
      [&] { return change(error, [&](PlaceholderRecord& record, auto&) { record.rights = platform::Bytes(data); }); });
}

bool LocalPlaceholder::setConfigurationCompleteWithError(ErrorRef* error) {
  return _boundary.call({{className, "setConfigurationCompleteWithError"}, _app}, error, {}, [&] {
    return change(error, [](PlaceholderRecord& record, auto&) { record.configured = true; });
  });
}

bool LocalPlaceholder::cancelForReason(const ErrorRef& reason, platform::RVClientIdentifier client, ErrorRef* error) {
  return _boundary.call({{className, "cancelForReason"}, _app}, error, {{"reason", reason}, {"client", client}}, [&] {
    platform::setError(error, nullptr);
    CoordinatorRef coordinator;
    {
      Lock lock(_mutex);
      if (_cancelled)
        return fail(error, coordinationError(CoordinationError::ended, "the placeholder of " + _app + " is cancelled"));
      _cancelled = true;
      coordinator = _coordinator.lock();
    }
    // What the home screen shows belongs to the install and goes with it.
    return !coordinator || _engine.cancel(*coordinator, reason, client, error);
  });
}

std::string LocalPlaceholder::describe() const { return _describe; }

}  // namespace device
