#include "device/LocalPlaceholder.h"

#include "device/LocalCoordinator.h"
#include "device/LocalPlaceholderAttributes.h"
#include "device/LocalPromise.h"
#include "device/LocalStoreMetadata.h"
#include "device/ServiceErrors.h"

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

bool LocalPlaceholder::attachTo(LocalCoordinator& coordinator, ErrorRef* error) {
  PlaceholderRecord record;
  std::shared_ptr<LocalTransferPromise> icon;
  {
    Lock lock(_mutex);
    if (_cancelled)
      return fail(error, coordinationError(CoordinationError::ended, "the placeholder of " + _app + " is cancelled"));
    if (!_coordinator.expired())
      return fail(error, coordinationError(CoordinationError::alreadySet,
                                           "the placeholder of " + _app + " is attached to a coordinator already"));
    record = _record;
    icon = _icon;
  }
  if (icon) {
    Lock lock(_engine.records().mutex);
    if (icon->record->complete) record.iconPath = icon->record->path;
  }
  if (!_engine.attachPlaceholder(coordinator, record, error)) return false;
  Lock lock(_mutex);
  _coordinator = coordinator.weak_from_this();
  return true;
}

template <class Edit>
bool LocalPlaceholder::change(ErrorRef* error, Edit&& edit) {
  platform::setError(error, nullptr);
  Lock lock(_mutex);
  if (_cancelled)
    return fail(error, coordinationError(CoordinationError::ended, "the placeholder of " + _app + " is cancelled"));
  if (_record.configured)
    return fail(error,
                coordinationError(CoordinationError::ended, "the placeholder of " + _app + " is configured already"));
  edit(_record, _icon);
  return true;
}

bool LocalPlaceholder::setIconPromise(const std::shared_ptr<platform::RVPromisedTransferToPath>& promise,
                                      ErrorRef* error) {
  return _boundary.call({className, "setIconPromise", _app}, error, {{"promise", promise}}, [&] {
    auto ours = std::dynamic_pointer_cast<LocalTransferPromise>(promise);
    if (!ours) return fail(error, coordinationError(CoordinationError::invalid, "no icon promise for " + _app));
    return change(error, [&](PlaceholderRecord&, auto& icon) { icon = ours; });
  });
}

bool LocalPlaceholder::setMetadata(const std::shared_ptr<platform::CVStoreMetadata>& metadata, ErrorRef* error) {
  return _boundary.call({className, "setMetadata", _app}, error, {{"metadata", metadata}}, [&] {
    auto ours = std::dynamic_pointer_cast<LocalStoreMetadata>(metadata);
    return change(error, [&](PlaceholderRecord& record, auto&) {
      record.metadata = ours ? ours->dictionary : platform::Value();
    });
  });
}

bool LocalPlaceholder::setPlaceholderAttributes(const std::shared_ptr<platform::RVPlaceholderAttributes>& attributes,
                                                ErrorRef* error) {
  return _boundary.call({className, "setPlaceholderAttributes", _app}, error, {{"attributes", attributes}}, [&] {
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
      {className, "setSinfData", _app}, error, {{"data", CallArgument::BytesCount{data.size()}}},
      [&] { return change(error, [&](PlaceholderRecord& record, auto&) { record.rights = platform::Bytes(data); }); });
}

bool LocalPlaceholder::setConfigurationCompleteWithError(ErrorRef* error) {
  return _boundary.call({className, "setConfigurationCompleteWithError", _app}, error, {}, [&] {
    return change(error, [](PlaceholderRecord& record, auto&) { record.configured = true; });
  });
}

bool LocalPlaceholder::cancelForReason(const ErrorRef& reason, platform::RVClientIdentifier client, ErrorRef* error) {
  return _boundary.call({className, "cancelForReason", _app}, error, {{"reason", reason}, {"client", client}}, [&] {
    platform::setError(error, nullptr);
    CoordinatorRef coordinator;
    {
      Lock lock(_mutex);
      if (_cancelled)
        return fail(error, coordinationError(CoordinationError::ended, "the placeholder of " + _app + " is cancelled"));
      _cancelled = true;
      coordinator = _coordinator.lock();
    }
    // What the home screen shows is the install's; it goes with it.
    return !coordinator || _engine.cancel(*coordinator, reason, client, error);
  });
}

std::string LocalPlaceholder::describe() const { return _describe; }

}  // namespace device
