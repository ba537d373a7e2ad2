#pragma once

#include <memory>
#include <string>

#include "Placeholder.h"
#include "Promise.h"
#include "platform/InstallCoordination.h"
#include "platform/Mutex.h"

namespace tiny {

class InstallService;

/// One app's install. Handles are shared, so there is one object for a record; the service forgets it when it ends.
class Coordinator final : public platform::RVAppInstallCoordinator, public std::enable_shared_from_this<Coordinator> {
 public:
  using Kind = platform::RVCoordinatorKind;
  using Client = platform::RVClientIdentifier;
  using ErrorRef = platform::ErrorRef;

  Coordinator(InstallService& service, Kind kind, std::string app, Client client)
      : kind(kind), app(std::move(app)), _service(service), _client(client) {}

  const Kind kind;
  const std::string app;

  /// Ends it; false when it had ended before.
  bool end(ErrorRef failure);
  std::weak_ptr<platform::RVAppInstallObserverDelegate> observer();
  std::shared_ptr<FilePromise> package();

  std::optional<std::string> bundleID() override { return app; }
  Client creatorIdentifier() override { return _client; }
  ErrorRef error() override;
  void setObserver(std::weak_ptr<platform::RVAppInstallObserverDelegate> observer) override;
  bool hasAppAssetPromise() override { return has(_package); }
  bool hasInitialZDRAssetPromises() override { return has(_hasInitialPromises); }
  bool hasInstallOptions() override { return has(_hasOptions); }
  bool hasPlaceholderPromise() override { return has(_placeholder); }
  bool hasUserDataPromise() override { return has(_userData); }
  std::shared_ptr<platform::RVPromisedTransferToPath> appAssetPromiseWithError(ErrorRef* error) override;
  bool setAppAssetPromise(const std::shared_ptr<platform::RVPromisedTransferToPath>& promise, ErrorRef* error) override;
  bool setPlaceholderPromise(const std::shared_ptr<platform::RVPlaceholder>& placeholder, ErrorRef* error) override;
  bool setUserDataPromise(const std::shared_ptr<platform::RVPromisedOutOfBandTransfer>& promise,
                          ErrorRef* error) override;
  bool setInitialZDRAssetPromises(const std::vector<std::shared_ptr<platform::RVPromise>>& promises,
                                  ErrorRef* error) override;
  bool setInstallOptions(const std::shared_ptr<platform::CVInstallOptions>& options, ErrorRef* error) override;
  Client appAssetPromiseResponsibleClientWithError(ErrorRef* error) override;
  bool setAppAssetPromiseResponsibleClient(Client client, ErrorRef* error) override;
  bool cancelForReason(const ErrorRef& reason, Client client, ErrorRef* error) override;
  std::string describe() const override { return "<coordinator of " + app + '>'; }

 private:
  template <class Field>
  bool has(const Field& field) {
    platform::Mutex::Lock lock(_mutex);
    return static_cast<bool>(field);
  }
  /// Success when `possible` and it has not ended; to be asked with _mutex held.
  bool mayChange(bool possible, const char* problem, ErrorRef* error) const;

  InstallService& _service;
  const Client _client;
  platform::Mutex _mutex;
  // Guarded by _mutex.
  std::weak_ptr<platform::RVAppInstallObserverDelegate> _observer;
  std::shared_ptr<FilePromise> _package;
  std::shared_ptr<Placeholder> _placeholder;
  std::shared_ptr<platform::RVPromisedOutOfBandTransfer> _userData;
  bool _hasInitialPromises = false;
  bool _hasOptions = false;
  bool _hasEnded = false;
  Client _responsible = 0;
  ErrorRef _failure;
};

}  // namespace tiny
