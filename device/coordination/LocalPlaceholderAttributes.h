#pragma once

#include <optional>
#include <string>
#include <utility>

#include "device/boundary/Boundary.h"
#include "device/records/SharedValue.h"
#include "platform/Mutex.h"
#include "platform/RVPlaceholder.h"
#include "platform/ThreadSafety.h"

namespace device {

/// Placeholder attributes in the making; a placeholder copies them when they are handed to it.
class LocalPlaceholderAttributes final : public platform::RVPlaceholderAttributes {
 public:
  struct Facts {
    SharedValue manifest;  // a dictionary, or absent
    std::optional<std::string> version;
    bool launchProhibited = false;
  };

  /// The manifest's values hold until others are set.
  LocalPlaceholderAttributes(Boundary& boundary, const platform::Value& manifest) : _boundary(boundary) {
    if (!manifest.dictionary()) return;
    _facts.manifest = manifest;
    _facts.launchProhibited = (*manifest.dictionary())["OBApplicationLaunchProhibited"].boolValue();
  }

  Facts facts() const {
    platform::Mutex::Lock lock(_mutex);
    return _facts;
  }

  void setBundleVersion(std::optional<std::string> version) override {
    _boundary.call({{"RVPlaceholderAttributes", "setBundleVersion"}}, nullptr, {{"version", version}}, [&] {
      platform::Mutex::Lock lock(_mutex);
      _facts.version = version;
    });
  }
  void setLaunchProhibited(bool prohibited) override {
    _boundary.call({{"RVPlaceholderAttributes", "setLaunchProhibited"}}, nullptr, {{"prohibited", prohibited}}, [&] {
      platform::Mutex::Lock lock(_mutex);
      _facts.launchProhibited = prohibited;
    });
  }

  std::string describe() const override {
    platform::Mutex::Lock lock(_mutex);
    return "<RVPlaceholderAttributes version " + _facts.version.value_or("(null)") + '>';
  }

 private:
  Boundary& _boundary;
  mutable platform::Mutex _mutex;
  Facts _facts GUARDED_BY(_mutex);
};

}  // namespace device
