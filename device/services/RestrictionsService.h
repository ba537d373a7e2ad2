#pragma once

#include <string_view>
#include <utility>

#include "device/boundary/Boundary.h"
#include "device/records/Settings.h"
#include "platform/DPProfileConnection.h"

namespace device {

/// The device's restrictions, from its settings at each call.
class RestrictionsService final : public platform::DPProfileConnection {
 public:
  RestrictionsService(Boundary& boundary, CurrentSettings settings)
      : _boundary(boundary), _settings(std::move(settings)) {}

  /// 2 for what is forbidden, 1 for what is allowed, 0 for a restriction that is not known.
  int effectiveBoolValueForSetting(std::string_view setting) override;

 private:
  Boundary& _boundary;
  const CurrentSettings _settings;
};

}  // namespace device
