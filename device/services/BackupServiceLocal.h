#pragma once

#include <memory>
#include <utility>

#include "device/boundary/Boundary.h"
#include "device/records/Settings.h"
#include "platform/BackupService.h"

namespace device {

/// The backup service, from the device's settings at each call: whether it wants placeholders, and whether it reports
/// an error, of the domain "BackupService". If only the error was set, it wants none.
class BackupServiceLocal final : public platform::BackupService {
 public:
  BackupServiceLocal(Boundary& boundary, CurrentSettings settings)
      : _boundary(boundary), _settings(std::move(settings)) {}

  /// The manager must not outlive the service.
  std::shared_ptr<platform::CLManager> makeBackupManager() override;

 private:
  class Manager;

  Boundary& _boundary;
  const CurrentSettings _settings;
};

}  // namespace device
