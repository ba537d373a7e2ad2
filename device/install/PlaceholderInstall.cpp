#include "device/install/PlaceholderInstall.h"

#include <utility>

#include "device/DeviceErrors.h"
#include "device/install/CoordinationError.h"

namespace device {

using platform::ErrorRef;
using platform::setError;
using Lock = AppRecords::Lock;

namespace {

/// The placeholder's Info.plist.
platform::Value infoOf(const PlaceholderRecord& placeholder) {
  platform::Value info = placeholder.configured && placeholder.manifest.dictionary()
                             ? placeholder.manifest.value()
                             : platform::Value::makeDictionary();
  auto& entries = *info.dictionary();
  entries.remove("KBBundleIconFile");  // names a file of the package
  entries.set("KBBundleIdentifier", placeholder.app);
  if (!placeholder.configured) return info;
  if (placeholder.version) entries.set("KBBundleVersion", *placeholder.version);
  if (!placeholder.name.empty()) entries.set("KBBundleDisplayName", placeholder.name);
  if (placeholder.launchProhibited) entries.set("OBApplicationLaunchProhibited", true);
  return info;
}

/// What a placeholder takes over from the one that stood there.
AppRecord inPlaceOf(const AppRecord* existing, AppRecord written) {
  if (!existing || !existing->isPlaceholder) return written;
  written.applicationType = existing->applicationType;
  written.systemBundle = existing->systemBundle;
  written.homeOrder = existing->homeOrder;
  return written;
}

/// What the home screen shows of an install that is under way: as much as has come of its package.
InstallProgressRecord progressSoFar(const CoordinatorRecord& record) REQUIRES(recordsGuard) {
  InstallProgressRecord progress;
  if (record.appAsset) progress.fraction = record.appAsset->fraction;
  return progress;
}

}  // namespace

std::optional<AppRecord> writePlaceholder(const InstallParts& parts, const PlaceholderRecord& placeholder,
                                          ErrorRef* error) {
  AppRecord app;
  app.id = placeholder.app;
  app.bundle = placeholder.app + ".app";
  app.isPlaceholder = true;
  app.installType = placeholder.installType;
  auto info = infoOf(placeholder);
  if (placeholder.configured) {
    app.name = placeholder.name;
    app.launchProhibited = placeholder.launchProhibited;
    if (auto version = (*info.dictionary())["KBBundleVersion"].string()) app.version = std::string(*version);
  }
  ErrorRef reason;
  if (auto container = parts.containers.makeFresh(&reason)) {
    app.container = *container;
    auto sum = parts.containers.writePlaceholder(
        app.container, app.bundle, std::move(info), placeholder.configured ? placeholder.iconPath : std::nullopt,
        placeholder.configured ? placeholder.metadata : SharedValue(), &reason);
    app.filesSum = sum.value_or(0);
    if (sum) return app;
    parts.containers.remove(app.container);
  }
  if (parts.placeholderFailed) parts.placeholderFailed(app.id, reason);
  setError(error, reason);
  return std::nullopt;
}

bool PlaceholderInstall::run(ErrorRef* error) {
  setError(error, nullptr);
  if (_placeholder.app != _coordinator->app)
    return fail(error, coordinationError(CoordinationError::invalid, "a placeholder of " + _placeholder.app +
                                                                         " is not one of " + _coordinator->app));
  bool isUpdate = false;
  {
    Lock lock(_parts.records);
    if (!claim(error)) return false;
    isUpdate = _isUpdate;
  }
  std::optional<AppRecord> written;
  if (!isUpdate) written = writePlaceholder(_parts, _placeholder, error);
  AbandonedContainer abandoned(_parts.containers, written ? written->container : "");
  Lock lock(_parts.records);
  _coordinator->state.takesPlaceholder = false;
  return (isUpdate || written) && put(std::move(written), abandoned, error);
}

bool PlaceholderInstall::claim(ErrorRef* error) {
  auto& state = _coordinator->state;
  if (state.ended) return fail(error, endedError(_coordinator->app));
  if (state.takesPlaceholder || state.record.placeholder)
    return fail(error, coordinationError(CoordinationError::alreadySet,
                                         _coordinator->app + " already has a placeholder promise"));
  state.takesPlaceholder = true;
  const auto* app = _parts.records.state().app(_coordinator->app);
  _isUpdate = app && !app->isPlaceholder;
  return true;
}

bool PlaceholderInstall::put(std::optional<AppRecord> written, AbandonedContainer& abandoned, ErrorRef* error) {
  const auto& id = _coordinator->app;
  auto& state = _coordinator->state;
  if (state.ended) return fail(error, endedError(id));
  const auto* existing = _parts.records.state().app(id);
  bool isInstalled = existing && !existing->isPlaceholder;
  if (isInstalled == written.has_value())
    return fail(error, coordinationError(CoordinationError::invalid,
                                         id + " was installed or removed by somebody else meanwhile"));
  // A demoted app waits for the person to ask for it, so no install is running.
  bool isDemoted = _coordinator->kind == platform::RVCoordinatorKind::RVRestoringDemotedAppInstallCoordinator;
  bool hadProgress = existing && existing->progress;
  std::string superfluous = existing && existing->isPlaceholder ? existing->container : "";
  auto app = written ? inPlaceOf(existing, *std::move(written)) : *existing;
  app.progress.reset();
  if (!isDemoted) app.progress = progressSoFar(state.record);
  auto record = state.record;
  record.placeholder = _placeholder;
  record.placeholder->manifest = {};  // in the placeholder's own file from here on
  ChangeSet changes;
  changes.put(std::move(app));
  changes.removeOutcome(id);
  if (isDemoted)
    changes.removeCoordinator(id);
  else
    changes.put(record);
  // What a loss of power takes of a placeholder the next sync restores, unless older files are removed because of it.
  bool kept = superfluous.empty() ? _parts.records.write(std::move(changes), error)
                                  : _parts.records.commit(std::move(changes), error);
  if (!kept) return false;
  // The old files go when no record names them any more; whoever is told finds the placeholder there.
  abandoned.become(std::move(superfluous));
  state.record = std::move(record);
  if (isDemoted) _parts.open.close(*_coordinator);
  _parts.reports.placeholderInstalled(_coordinator, !isDemoted || hadProgress);
  return true;
}

}  // namespace device
