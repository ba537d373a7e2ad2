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

  /// What the app's store metadata will be; absent: what the app that is there has.
  const SharedValue& storeMetadata() const {
    return options && !options->metadata.isAbsent() ? options->metadata : metadata;
  }
  /// Whether the other request's files are this one's too.
  bool needsTheSame(const InstallRequest& other) const {
    return app == other.app && packagePath == other.packagePath && storeMetadata().isSame(other.storeMetadata());
  }
};

/// A package's files in a container of their own, and what the registry is to say of the app, except for what only the
/// record at its install knows; or why there are none.
struct UnpackedApp {
  std::optional<AppRecord> app;
  platform::ErrorRef reason;
};

/// A package on its way to an app in the registry: unpacked into a fresh container without the guard, then recorded if
/// nobody has ended the install meanwhile, then removed.
class PackageInstall {
 public:
  /// `coordinator` may be null.
  PackageInstall(const InstallParts& parts, CoordinatorRef coordinator, InstallRequest request)
      : _parts(parts), _coordinator(std::move(coordinator)), _request(std::move(request)) {}

  /// False when there is no new app; the install has then failed, if it is known of which app. Once.
  bool run(platform::ErrorRef* error) EXCLUDES(recordsGuard) { return finish(unpack(), error); }

  /// The two halves of it. What is unpacked and never finished is left for the caller to remove.
  UnpackedApp unpack() EXCLUDES(recordsGuard);
  bool finish(UnpackedApp unpacked, platform::ErrorRef* error) EXCLUDES(recordsGuard);

 private:
  std::optional<AppRecord> unpackFresh(platform::ErrorRef* error) EXCLUDES(recordsGuard);
  std::optional<AppRecord> unpackInto(const std::string& container, platform::ErrorRef* error) EXCLUDES(recordsGuard);
  platform::ErrorRef outOfMemory() const;
  bool record(AppRecord app, platform::ErrorRef* reason) EXCLUDES(recordsGuard);
  /// Why the install has to end without an app; null while it may go on.
  platform::ErrorRef ending(const std::string& app) const REQUIRES(recordsGuard);
  void fail(const std::string& app, const platform::ErrorRef& reason) EXCLUDES(recordsGuard);

  const InstallParts& _parts;
  const CoordinatorRef _coordinator;
  const InstallRequest _request;
};

/// What its app asset promise asks to be installed. Nothing when the coordinator has ended, or ends now as the promise
/// has no path.
std::optional<InstallRequest> requestOf(const InstallParts& parts, const CoordinatorRef& coordinator)
    EXCLUDES(recordsGuard);

/// The request for what an app asset promise with a path brought.
InstallRequest requestIn(const CoordinatorRecord& record) REQUIRES(recordsGuard);

/// Installs what the coordinator's app asset promise brought, or fails its install. Does nothing when it has ended.
void installAppAsset(const InstallParts& parts, const CoordinatorRef& coordinator) EXCLUDES(recordsGuard);

/// Removes the package's file, and the note in the store that it is to be removed.
void removePackage(const InstallParts& parts, const std::string& path) EXCLUDES(recordsGuard);

}  // namespace device
