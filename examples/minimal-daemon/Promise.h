#pragma once

#include <functional>
#include <string>

#include "platform/Mutex.h"
#include "platform/RVPromise.h"

namespace tiny {

enum class PromiseEvent { began, completed, cancelled };

/// What the kinds of promise share. What happens to it is told to whatever it was attached to.
template <class Interface>
class Promise : public Interface {
 public:
  using Listener = std::function<void(PromiseEvent)>;

  explicit Promise(std::string name) : _name(std::move(name)) {}

  void attach(Listener listener) {
    platform::Mutex::Lock lock(_mutex);
    _listener = std::move(listener);
  }

  void setPercentComplete(double) override { tell(PromiseEvent::began, _began); }
  void setComplete(bool complete) override {
    if (complete) tell(PromiseEvent::completed, _complete);
  }
  bool isComplete() override {
    platform::Mutex::Lock lock(_mutex);
    return _complete;
  }
  bool cancelForReason(const platform::ErrorRef&, platform::RVClientIdentifier, platform::ErrorRef* error) override {
    platform::setError(error, nullptr);
    tell(PromiseEvent::cancelled, _cancelled);
    return true;
  }
  std::string describe() const override { return "<promise " + _name + '>'; }

 protected:
  platform::Mutex _mutex;

 private:
  /// Each event happens once, and none after the promise was cancelled.
  void tell(PromiseEvent event, bool& happened) {
    Listener listener;
    {
      platform::Mutex::Lock lock(_mutex);
      if (happened || _cancelled) return;
      happened = true;
      listener = _listener;
    }
    if (listener) listener(event);
  }

  const std::string _name;
  // Guarded by _mutex.
  Listener _listener;
  bool _began = false;
  bool _complete = false;
  bool _cancelled = false;
};

using DataPromise = Promise<platform::RVPromisedOutOfBandTransfer>;

class FilePromise final : public Promise<platform::RVPromisedTransferToPath> {
 public:
  FilePromise(std::string name, std::string path) : Promise(std::move(name)), _path(std::move(path)) {}

  void setTransferPath(std::string_view path) override {
    platform::Mutex::Lock lock(_mutex);
    _path = path;
  }
  std::string path() {
    platform::Mutex::Lock lock(_mutex);
    return _path;
  }

 private:
  std::string _path;  // guarded by _mutex; empty: not known yet
};

}  // namespace tiny
