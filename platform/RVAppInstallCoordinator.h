#pragma once

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/CVInstallOptions.h"
#include "platform/Error.h"
#include "platform/RVClient.h"
#include "platform/RVPlaceholder.h"
#include "platform/RVPromise.h"

namespace platform {

class RVAppInstallObserverDelegate;

/// The coordinator of one app's install. The service owns the record; this is a shared handle onto it, and two
/// handles of one record answer alike. After the coordinator has ended, its setters fail with an error and its
/// queries answer what it last held. Callable from any thread; none calls back before it has returned.
class RVAppInstallCoordinator {
 public:
  virtual ~RVAppInstallCoordinator() = default;

  /// Nothing when the service does not know which app this is about.
  virtual std::optional<std::string> bundleID() = 0;
  virtual RVClientIdentifier creatorIdentifier() = 0;
  /// Why the install failed; absent while it has not.
  virtual ErrorRef error() = 0;

  /// Held weakly. Callbacks for this coordinator go to it while it lives, otherwise to the install observers of
  /// the creator's client.
  virtual void setObserver(std::weak_ptr<RVAppInstallObserverDelegate> observer) = 0;

  virtual bool hasAppAssetPromise() = 0;
  virtual bool hasInitialZDRAssetPromises() = 0;
  virtual bool hasInstallOptions() = 0;
  virtual bool hasPlaceholderPromise() = 0;
  virtual bool hasUserDataPromise() = 0;

  /// Null, with an error, when there is no such promise.
  virtual std::shared_ptr<RVPromisedTransferToPath> appAssetPromiseWithError(ErrorRef* error = nullptr) = 0;
  virtual bool setAppAssetPromise(const std::shared_ptr<RVPromisedTransferToPath>& promise,
                                  ErrorRef* error = nullptr) = 0;
  /// From here on the app shows on the home screen. Null is refused with an error.
  virtual bool setPlaceholderPromise(const std::shared_ptr<RVPlaceholder>& placeholder, ErrorRef* error = nullptr) = 0;
  virtual bool setUserDataPromise(const std::shared_ptr<RVPromisedOutOfBandTransfer>& promise,
                                  ErrorRef* error = nullptr) = 0;
  virtual bool setInitialZDRAssetPromises(const std::vector<std::shared_ptr<RVPromise>>& promises,
                                          ErrorRef* error = nullptr) = 0;
  virtual bool setInstallOptions(const std::shared_ptr<CVInstallOptions>& options, ErrorRef* error = nullptr) = 0;

  /// Who delivers the package; 0 when nobody was named.
  virtual RVClientIdentifier appAssetPromiseResponsibleClientWithError(ErrorRef* error = nullptr) = 0;
  virtual bool setAppAssetPromiseResponsibleClient(RVClientIdentifier client, ErrorRef* error = nullptr) = 0;

  /// Ends the coordinator; the service reports the cancellation to observers later.
  virtual bool cancelForReason(const ErrorRef& reason, RVClientIdentifier client, ErrorRef* error = nullptr) = 0;

  virtual std::string describe() const = 0;
};

/// What becomes of coordinators. All calls arrive on the service's threads, none while the service holds a lock.
class RVAppInstallObserverDelegate {
 public:
  virtual ~RVAppInstallObserverDelegate() = default;

  virtual void promiseDidBeginFulfillmentWithIdentifier(std::uint64_t) {}
  virtual void coordinatorDidInstallPlaceholder(const std::shared_ptr<RVAppInstallCoordinator>&) {}
  /// The install ended; the coordinator's `error` says whether it succeeded.
  virtual void coordinatorDidCompleteSuccessfully(const std::shared_ptr<RVAppInstallCoordinator>&) {}
  virtual void coordinatorShouldPrioritize(const std::shared_ptr<RVAppInstallCoordinator>&) {}
  virtual void coordinatorCanceledWithReason(const std::shared_ptr<RVAppInstallCoordinator>&,
                                             const ErrorRef& /*reason*/, RVClientIdentifier /*client*/) {}
};

/// A standing registration for the callbacks of some clients' coordinators. When its release has returned, no callback
/// to the delegate through it runs or starts; released on the very thread that is delivering, it does not wait for
/// itself.
class RVAppInstallObserver {
 public:
  virtual ~RVAppInstallObserver() = default;
};

}  // namespace platform
