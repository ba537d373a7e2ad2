#pragma once

#include <optional>
#include <string>
#include <utility>

#include "device/install/InstallOutcomes.h"

namespace device {

/// Where an install comes from and what it brings along.
struct InstallRequest {
  std::string app;  // empty: whatever app the package holds
  std::string packagePath;
  std::optional<InstallOptionsRecord> options;
  platform::Value metadata;  // where the options have none
  /// The container of the app that is to be finished, for an install that no coordinator answers for: one that is
  /// removed or replaced meanwhile is not finished, and nothing is done to what is there instead.
  std::optional<std::string> continues;
};

/// A package on its way to an app in the registry: unpacked into a fresh container without the guard, then recorded if
/// nobody has ended the install meanwhile, then removed.
class PackageInstall {
 public:
  /// `coordinator` may be null.
  PackageInstall(const InstallParts& parts, CoordinatorRef coordinator, InstallRequest request)
      : _parts(parts), _coordinator(std::move(coordinator)), _request(std::move(request)) {}

  /// False when there is no new app; its install has failed then, where it is known whose it was. Once.
  bool run(platform::ErrorRef* error) EXCLUDES(recordsGuard);

 private:
  /// The files of the app, and what the registry is to say of it; but for what only the record that is there then
  /// knows.
  std::optional<AppRecord> unpack(platform::ErrorRef* error) EXCLUDES(recordsGuard);
  std::optional<AppRecord> unpackInto(const std::string& container, platform::ErrorRef* error) EXCLUDES(recordsGuard);
  bool record(AppRecord app, platform::ErrorRef* reason) EXCLUDES(recordsGuard);
  /// Why nothing is to come of the install any more; null while something is.
  platform::ErrorRef ending(const std::string& app) const REQUIRES(recordsGuard);
  void fail(const std::string& app, const platform::ErrorRef& reason) EXCLUDES(recordsGuard);

  const InstallParts& _parts;
  const CoordinatorRef _coordinator;
  const InstallRequest _request;
};

/// Installs what the coordinator's app asset promise has brought, or fails its install. Nothing when it has ended.
void installAppAsset(const InstallParts& parts, const CoordinatorRef& coordinator) EXCLUDES(recordsGuard);

/// The package's file, and the note in the store that it is to go.
void removePackage(const InstallParts& parts, const std::string& path) EXCLUDES(recordsGuard);

}  // namespace device
