#pragma once

#include <memory>
#include <string>
#include <string_view>
#include <type_traits>

#include "device/boundary/Boundary.h"
#include "device/install/InstallEngine.h"
#include "device/records/CoordinatorRecord.h"
#include "platform/RVPromise.h"

namespace device {

/// The app that a promise of this name belongs to: the name without its last "-" and what follows.
std::string_view appOfPromise(std::string_view name);

/// A handle onto a promise. `Interface` says which sort of promise.
template <class Interface>
class LocalPromise : public Interface {
 public:
  LocalPromise(InstallEngine& engine, Boundary& boundary, PromiseRef promise)
      : record(std::move(promise)), _engine(engine), _boundary(boundary) {}

  const PromiseRef record;

  void setPercentComplete(double fraction) override {
    _boundary.call(crossing({className, "setPercentComplete"}), nullptr, {self(), {"fraction", fraction}},
                   [&] { _engine.setFraction(*record, fraction); });
  }
  void setComplete(bool complete) override {
    _boundary.call(crossing({className, "setComplete"}), nullptr, {self(), {"complete", complete}}, [&] {
      if (complete) _engine.deliver(*record);
    });
  }
  bool isComplete() override {
    return _boundary.call(crossing({className, "isComplete"}), nullptr, {self()},
                          [&] { return _engine.isComplete(*record); });
  }
  bool cancelForReason(const platform::ErrorRef& reason, platform::RVClientIdentifier client,
                       platform::ErrorRef* error) override {
    return _boundary.call(crossing({className, "cancelForReason"}), error,
                          {self(), {"reason", reason}, {"client", client}},
                          [&] { return _engine.cancel(*record, reason, client, error); });
  }
  std::string describe() const override { return std::string("<") + className + ' ' + record->name + '>'; }

 protected:
  static constexpr const char* className = std::is_same_v<Interface, platform::RVPromisedTransferToPath>
                                               ? "RVPromisedTransferToPath"
                                               : "RVPromisedOutOfBandTransfer";
  Crossing crossing(const InjectionPoint& point) const { return {point, appOfPromise(record->name)}; }
  CallArgument self() const { return CallArgument::object("self", "promise", wholeObject(this)); }

  InstallEngine& _engine;
  Boundary& _boundary;
};

class LocalTransferPromise final : public LocalPromise<platform::RVPromisedTransferToPath> {
 public:
  using LocalPromise::LocalPromise;
  void setTransferPath(std::string_view path) override {
    _boundary.call(crossing({className, "setTransferPath"}), nullptr, {self(), {"path", path}},
                   [&] { _engine.setPath(*record, path); });
  }
};

class LocalOutOfBandPromise final : public LocalPromise<platform::RVPromisedOutOfBandTransfer> {
 public:
  using LocalPromise::LocalPromise;
};

}  // namespace device
