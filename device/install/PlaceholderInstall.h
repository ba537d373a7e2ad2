#pragma once

#include <optional>

#include "device/install/AbandonedContainer.h"
#include "device/install/InstallParts.h"
#include "platform/ThreadSafety.h"

namespace device {

/// The record of an app whose placeholder's files are written into a fresh container, which is the caller's to keep or
/// to remove. Nothing, with an error, when the files cannot be written.
std::optional<AppRecord> writePlaceholder(const InstallParts& parts, const PlaceholderRecord& placeholder,
                                          platform::ErrorRef* error) EXCLUDES(recordsGuard);

/// A coordinator's placeholder on its way onto the home screen. Its files are written without the guard; then the
/// record is put if the app is still what it was: one that is installed stays so and only shows that an install runs.
class PlaceholderInstall {
 public:
  PlaceholderInstall(const InstallParts& parts, CoordinatorRef coordinator, const PlaceholderRecord& placeholder)
      : _parts(parts), _coordinator(std::move(coordinator)), _placeholder(placeholder) {}

  /// The placeholder is there when this returns true; only the reports follow. Once.
  bool run(platform::ErrorRef* error) EXCLUDES(recordsGuard);

 private:
  /// Whether the coordinator takes this placeholder; it then takes no other until `put`.
  bool claim(platform::ErrorRef* error) REQUIRES(recordsGuard);
  /// `written` is the record of the files; nothing for an app that stays installed.
  bool put(std::optional<AppRecord> written, AbandonedContainer& abandoned, platform::ErrorRef* error)
      REQUIRES(recordsGuard);

  const InstallParts& _parts;
  const CoordinatorRef _coordinator;
  const PlaceholderRecord& _placeholder;
  bool _isUpdate GUARDED_BY(recordsGuard) = false;
};

}  // namespace device
