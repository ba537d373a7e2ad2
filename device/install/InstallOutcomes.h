#pragma once

#include <optional>
#include <string>

#include "device/install/AbandonedContainer.h"
#include "device/install/InstallParts.h"
#include "platform/ThreadSafety.h"

namespace device {

/// How an install ends: in the records, in one commit, and then in the reports. An app may have no coordinator, which
/// is null then.

/// The app whose files lie in the container that the record names is installed. `options` and `packagePath`, which may
/// be empty, are the install's. What the registry has of the app decides what the new record keeps. `abandoned` becomes
/// the container of what was there before.
bool recordInstalled(const InstallParts& parts, const CoordinatorRef& coordinator, AppRecord installed,
                     const std::optional<InstallOptionsRecord>& options, const std::string& packagePath,
                     AbandonedContainer& abandoned, platform::ErrorRef* error) REQUIRES(recordsGuard);

/// An install that comes to nothing, `failed` or `cancelled` (by `client`): a placeholder is removed, an installed app
/// stays as it was.
struct InstallEnding {
  InstallOutcome outcome;
  platform::ErrorRef reason;
  platform::RVClientIdentifier client = 0;
};
bool recordEnded(const InstallParts& parts, const CoordinatorRef& coordinator, const std::string& app,
                 const InstallEnding& ending, AbandonedContainer& abandoned, platform::ErrorRef* error)
    REQUIRES(recordsGuard);

/// The install has failed for that reason; does nothing when its coordinator has already ended.
void failInstall(const InstallParts& parts, const CoordinatorRef& coordinator, const std::string& app,
                 const platform::ErrorRef& reason, AbandonedContainer& abandoned) REQUIRES(recordsGuard);

}  // namespace device
