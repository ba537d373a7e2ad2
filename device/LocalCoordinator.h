#pragma once

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "device/Boundary.h"
#include "device/CoordinatorRecord.h"
#include "platform/RVAppInstallCoordinator.h"

namespace device {

class InstallEngine;
class LocalTransferPromise;

/// What a coordinator is at the moment. Guarded by the records' guard.
struct CoordinatorState {
  CoordinatorRecord record;
  bool ended = false;
  bool takesPlaceholder = false;  // a placeholder's files are being written
  bool fractionUnsaved = false;   // the store has an older progress
  platform::ErrorRef failure;     // why the install failed
  std::weak_ptr<platform::RVAppInstallObserverDelegate> observer;
  std::shared_ptr<LocalTransferPromise> appAsset;  // the handle that answers for the record's promise
};

/// One app's coordinator: the handle that callers hold and what stands behind it, kept by the engine while it is open.
class LocalCoordinator final : public platform::RVAppInstallCoordinator,
                               public std::enable_shared_from_this<LocalCoordinator> {
 public:
  LocalCoordinator(InstallEngine& engine, Boundary& boundary, CoordinatorRecord record);

  const std::string app;
  const platform::RVCoordinatorKind kind;
  const platform::RVClientIdentifier creator;
  CoordinatorState state;

  /// The observer, if one was set and is alive.
  std::shared_ptr<platform::RVAppInstallObserverDelegate> observer() const;

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
  bool holds(const char* operation, bool (*piece)(const CoordinatorRecord&));

  InstallEngine& _engine;
  Boundary& _boundary;
};

}  // namespace device
