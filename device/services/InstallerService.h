#pragma once

#include <memory>
#include <string>
#include <vector>

#include "device/boundary/Boundary.h"
#include "device/records/AppRecords.h"
#include "platform/Installer.h"

namespace device {

/// The installer service: the list of uninstalled apps, and the makers of store metadata and install options.
class InstallerService final : public platform::Installer {
 public:
  InstallerService(AppRecords& records, Boundary& boundary) : _records(records), _boundary(boundary) {}

  platform::Value CorvaneLookupUninstalled() override;
  int CorvaneClearUninstalled(const std::vector<std::string>& bundleIdentifiers) override;
  std::shared_ptr<platform::CVStoreMetadata> makeStoreMetadata(const platform::Value& dictionary) override;
  std::shared_ptr<platform::CVInstallOptions> makeInstallOptions() override;

 private:
  AppRecords& _records;
  Boundary& _boundary;
};

}  // namespace device
