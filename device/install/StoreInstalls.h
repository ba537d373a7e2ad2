#pragma once

#include <string_view>

#include "device/install/InstallParts.h"
#include "platform/ThreadSafety.h"

namespace device {

/// The store's own installs, which it begins with a registry entry and, mostly, a coordinator, and finishes with a
/// package or without one. See `LocalDevice` for what each does.
class StoreInstalls {
 public:
  explicit StoreInstalls(const InstallParts& parts) : _parts(parts) {}

  bool begin(std::string_view id, const StoreInstall& install, platform::ErrorRef* error) EXCLUDES(recordsGuard);
  bool finish(std::string_view id, std::string_view packagePath, platform::ErrorRef* error) EXCLUDES(recordsGuard);

 private:
  bool isBusy(const std::string& app, const StoreInstall& install, platform::ErrorRef* error) const
      REQUIRES(recordsGuard);
  /// Records the app; `written` is the record of its placeholder's files if it was not there before.
  bool record(const std::string& app, const StoreInstall& install, PlaceholderRecord placeholder,
              const AppRecord* written, platform::ErrorRef* error) REQUIRES(recordsGuard);
  /// What the placeholder's container holds becomes the app.
  bool finishAsItIs(const CoordinatorRef& coordinator, const std::string& app, const std::string& container,
                    const std::optional<InstallOptionsRecord>& options, platform::ErrorRef* error)
      EXCLUDES(recordsGuard);

  const InstallParts& _parts;
};

}  // namespace device
