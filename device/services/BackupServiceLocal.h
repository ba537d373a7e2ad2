#pragma once

#include <functional>
#include <string>
#include <string_view>

#include "device/boundary/Boundary.h"
#include "platform/BackupService.h"

namespace device {

/// The backup service, from the device's settings:
/// - "backup-placeholders": "wanted" or "declined". Not set: wanted, unless there is an error.
/// - "backup-error": the error that comes with the answer, `CODE` or `CODE:TEXT`, in the domain "BackupService". A text
///   that begins with no number is code 1.
class BackupServiceLocal final : public platform::BackupService {
 public:
  /// Empty for a setting that nobody has set. Asked at every call.
  using Setting = std::function<std::string(std::string_view key)>;

  BackupServiceLocal(Boundary& boundary, Setting setting) : _boundary(boundary), _setting(std::move(setting)) {}

  /// The manager must not outlive the service.
  std::shared_ptr<platform::CLManager> makeBackupManager() override;

 private:
  class Manager;

  Boundary& _boundary;
  const Setting _setting;
};

}  // namespace device
