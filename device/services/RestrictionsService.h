#pragma once

#include <functional>
#include <string>
#include <string_view>

#include "device/boundary/Boundary.h"
#include "platform/DPProfileConnection.h"

namespace device {

/// The device's restrictions, from its settings "app-installation" and "app-removal".
class RestrictionsService final : public platform::DPProfileConnection {
 public:
  /// Empty for a setting that nobody has set.
  using Setting = std::function<std::string(std::string_view key)>;

  RestrictionsService(Boundary& boundary, Setting setting) : _boundary(boundary), _setting(std::move(setting)) {}

  /// 2 for "forbidden", 1 for "allowed", 0 for a restriction that is not set or not known.
  int effectiveBoolValueForSetting(std::string_view setting) override;

 private:
  Boundary& _boundary;
  const Setting _setting;
};

}  // namespace device
