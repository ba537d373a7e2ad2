#pragma once

#include <functional>
#include <memory>
#include <string_view>

#include "device/boundary/Boundary.h"
#include "device/install/InstallEngine.h"
#include "device/records/AppRecords.h"
#include "device/reports/RegistryReports.h"
#include "platform/OBApplicationWorkspace.h"

namespace device {

/// The application registry: what the records say of apps, and who wants to hear of their installs.
class RegistryService final : public platform::OBApplicationWorkspace {
 public:
  RegistryService(AppRecords& records, InstallEngine& engine, RegistryReports& reports, Boundary& boundary)
      : _records(records), _engine(engine), _reports(reports), _boundary(boundary) {}

  void addObserver(std::weak_ptr<platform::OBApplicationWorkspaceObserverProtocol> observer) override;
  void removeObserver(const platform::OBApplicationWorkspaceObserverProtocol* observer) override;
  bool applicationIsInstalled(std::string_view bundleIdentifier) override;
  void enumerateBundlesOfType(
      std::uint64_t type,
      const std::function<void(const platform::OBBundleProxyRef& bundle, bool& stop)>& block) override;
  bool uninstallApplication(std::string_view bundleIdentifier) override;
  platform::OBApplicationProxyRef applicationProxyForIdentifier(std::string_view bundleIdentifier,
                                                                bool placeholder) override;

 private:
  AppRecords& _records;
  InstallEngine& _engine;
  RegistryReports& _reports;
  Boundary& _boundary;
};

}  // namespace device
