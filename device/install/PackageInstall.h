#pragma once

#include <optional>
#include <string>
#include <utility>

#include "device/install/InstallOutcomes.h"
#include "platform/ThreadSafety.h"

namespace device {

/// What is installed, and what comes with it.
struct InstallRequest {
  std::string app;  // empty: whatever app the package holds
  std::string packagePath;
  std::optional<InstallOptionsRecord> options;
  SharedValue metadata;  // if the options have none
  /// The container of the app that is to be finished, for an install without a coordinator: an app that is removed or
  /// replaced meanwhile is not finished, and nothing is done to what is there instead.
  std::optional<std::string> continues;
};

/// A package on its way to an app in the registry: unpacked into a fresh container without the guard, then recorded if
/// nobody has ended the install meanwhile, then removed.
class PackageInstall {
 public:
  /// `coordinator` may be null.
  PackageInstall(const InstallParts& parts, CoordinatorRef coordinator, InstallRequest request)
      : _parts(parts), _coordinator(std::move(coordinator)), _request(std::move(request)) {}

  /// False when there is no new app; the install has then failed, if it is known of which app. Once.
  bool run(platform::ErrorRef* error) EXCLUDES(recordsGuard);

 private:
  /// The files of the app, and what the registry is to say of it, except for what only the present record knows.
  std::optional<AppRecord> unpack(platform::ErrorRef* error) EXCLUDES(recordsGuard);
  std::optional<AppRecord> unpackInto(const std::string& container, platform::ErrorRef* error) EXCLUDES(recordsGuard);
  bool record(AppRecord app, platform::ErrorRef* reason) EXCLUDES(recordsGuard);
  /// Why the install has to end without an app; null while it may go on.
  platform::ErrorRef ending(const std::string& app) const REQUIRES(recordsGuard);
  void fail(const std::string& app, const platform::ErrorRef& reason) EXCLUDES(recordsGuard);

  const InstallParts& _parts;
  const CoordinatorRef _coordinator;
  const InstallRequest _request;
};

/// Installs what the coordinator's app asset promise brought, or fails its install. Does nothing when it has ended.
void installAppAsset(const InstallParts& parts, const CoordinatorRef& coordinator) EXCLUDES(recordsGuard);

/// Removes the package's file, and the note in the store that it is to be removed.
void removePackage(const InstallParts& parts, const std::string& path) EXCLUDES(recordsGuard);

}  // namespace device
