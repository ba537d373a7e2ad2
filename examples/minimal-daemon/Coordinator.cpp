#include "Coordinator.h"

#include "InstallService.h"

namespace tiny {

using platform::ErrorRef;

bool Coordinator::mayChange(bool possible, const char* problem, ErrorRef* error) const {
  const char* reason = _hasEnded ? "its install has ended" : possible ? nullptr : problem;
  platform::setError(error, reason ? platform::makeError("TinyInstalls", 2, app + ": " + reason) : nullptr);
  return !reason;
}

bool Coordinator::end(ErrorRef failure) {
  platform::Mutex::Lock lock(_mutex);
  if (_hasEnded) return false;
  _hasEnded = true;
  _failure = std::move(failure);
  return true;
}

std::weak_ptr<platform::RVAppInstallObserverDelegate> Coordinator::observer() {
  platform::Mutex::Lock lock(_mutex);
  return _observer;
}

std::shared_ptr<FilePromise> Coordinator::package() {
  platform::Mutex::Lock lock(_mutex);
  return _package;
}

ErrorRef Coordinator::error() {
  platform::Mutex::Lock lock(_mutex);
  return _failure;
}

void Coordinator::setObserver(std::weak_ptr<platform::RVAppInstallObserverDelegate> observer) {
  platform::Mutex::Lock lock(_mutex);
  _observer = std::move(observer);
}

std::shared_ptr<platform::RVPromisedTransferToPath> Coordinator::appAssetPromiseWithError(ErrorRef* error) {
  platform::Mutex::Lock lock(_mutex);
  platform::setError(error, _package ? nullptr : platform::makeError("TinyInstalls", 3, app + ": no package promised"));
  return _package;
}

bool Coordinator::setAppAssetPromise(const std::shared_ptr<platform::RVPromisedTransferToPath>& promise,
                                     ErrorRef* error) {
  auto ours = std::dynamic_pointer_cast<FilePromise>(promise);
  {
    platform::Mutex::Lock lock(_mutex);
    if (!mayChange(ours && !_package, "no promise, or a second one", error)) return false;
    _package = ours;
  }
  ours->attach([weak = weak_from_this(), &service = _service](PromiseEvent event) {
    auto coordinator = weak.lock();
    if (!coordinator) return;
    if (event == PromiseEvent::began) service.packageBegan(coordinator);
    if (event == PromiseEvent::completed) service.packageArrived(coordinator);
    if (event == PromiseEvent::cancelled) service.cancel(coordinator, nullptr, coordinator->_client);
  });
  if (ours->isComplete()) _service.packageArrived(shared_from_this());
  return true;
}

bool Coordinator::setPlaceholderPromise(const std::shared_ptr<platform::RVPlaceholder>& placeholder, ErrorRef* error) {
  auto ours = std::dynamic_pointer_cast<Placeholder>(placeholder);
  platform::Mutex::Lock changing(_service.changes());
  {
    platform::Mutex::Lock lock(_mutex);
    bool isGood = ours && ours->app == app && !ours->isCancelled() && !_placeholder;
    if (!mayChange(isGood, "no placeholder of this app, or a second one", error)) return false;
    _placeholder = ours;
  }
  _service.placeholderAttached(shared_from_this(), *ours);
  return true;
}

bool Coordinator::setUserDataPromise(const std::shared_ptr<platform::RVPromisedOutOfBandTransfer>& promise,
                                     ErrorRef* error) {
  platform::Mutex::Lock lock(_mutex);
  if (!mayChange(promise != nullptr, "no promise", error)) return false;
  _userData = promise;
  return true;
}

bool Coordinator::setInitialZDRAssetPromises(const std::vector<std::shared_ptr<platform::RVPromise>>&,
                                             ErrorRef* error) {
  platform::Mutex::Lock lock(_mutex);
  if (!mayChange(true, "", error)) return false;
  _hasInitialPromises = true;
  return true;
}

bool Coordinator::setInstallOptions(const std::shared_ptr<platform::CVInstallOptions>& options, ErrorRef* error) {
  platform::Mutex::Lock lock(_mutex);
  if (!mayChange(options != nullptr, "no options", error)) return false;
  _hasOptions = true;
  return true;
}

Coordinator::Client Coordinator::appAssetPromiseResponsibleClientWithError(ErrorRef* error) {
  platform::setError(error, nullptr);
  platform::Mutex::Lock lock(_mutex);
  return _responsible;
}

bool Coordinator::setAppAssetPromiseResponsibleClient(Client client, ErrorRef* error) {
  platform::Mutex::Lock lock(_mutex);
  if (!mayChange(true, "", error)) return false;
  _responsible = client;
  return true;
}

bool Coordinator::cancelForReason(const ErrorRef& reason, Client client, ErrorRef* error) {
  bool cancelled = _service.cancel(shared_from_this(), reason, client);
  platform::setError(error,
                     cancelled ? nullptr : platform::makeError("TinyInstalls", 4, app + ": its install has ended"));
  return cancelled;
}

}  // namespace tiny
