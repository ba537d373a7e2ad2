#pragma once

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "device/boundary/Boundary.h"
#include "device/install/InstallEngine.h"
#include "device/reports/Coordinator.h"
#include "platform/RVAppInstallCoordinator.h"

namespace device {

/// A coordinator as its callers hold it: every operation crosses the boundary and asks the engine.
class LocalCoordinator final : public Coordinator {
 public:
  LocalCoordinator(InstallEngine& engine, Boundary& boundary, CoordinatorRecord record)
      : Coordinator(std::move(record)), _engine(engine), _boundary(boundary) {}

  std::optional<std::string> bundleID() override;
  platform::RVClientIdentifier creatorIdentifier() override;
  platform::ErrorRef error() override;
  void setObserver(std::weak_ptr<platform::RVAppInstallObserverDelegate> observer) override;

  bool hasAppAssetPromise() override;
  bool hasInitialZDRAssetPromises() override;
  bool hasInstallOptions() override;
  bool hasPlaceholderPromise() override;
  bool hasUserDataPromise() override;

  std::shared_ptr<platform::RVPromisedTransferToPath> appAssetPromiseWithError(platform::ErrorRef* error) override;
  bool setAppAssetPromise(const std::shared_ptr<platform::RVPromisedTransferToPath>& promise,
                          platform::ErrorRef* error) override;
  bool setPlaceholderPromise(const std::shared_ptr<platform::RVPlaceholder>& placeholder,
                             platform::ErrorRef* error) override;
  bool setUserDataPromise(const std::shared_ptr<platform::RVPromisedOutOfBandTransfer>& promise,
                          platform::ErrorRef* error) override;
  bool setInitialZDRAssetPromises(const std::vector<std::shared_ptr<platform::RVPromise>>& promises,
                                  platform::ErrorRef* error) override;
  bool setInstallOptions(const std::shared_ptr<platform::CVInstallOptions>& options,
                         platform::ErrorRef* error) override;

  platform::RVClientIdentifier appAssetPromiseResponsibleClientWithError(platform::ErrorRef* error) override;
  bool setAppAssetPromiseResponsibleClient(platform::RVClientIdentifier client, platform::ErrorRef* error) override;

  bool cancelForReason(const platform::ErrorRef& reason, platform::RVClientIdentifier client,
                       platform::ErrorRef* error) override;

  std::string describe() const override;

 private:
  bool holds(const InjectionPoint& point, bool (*piece)(const CoordinatorRecord&));

  InstallEngine& _engine;
  Boundary& _boundary;
};

}  // namespace device
