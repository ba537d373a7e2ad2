#pragma once

#include <string_view>

namespace platform {

constexpr std::string_view DPFeatureAppInstallationAllowed = "DPFeatureAppInstallationAllowed";
constexpr std::string_view DPFeatureAppRemovalAllowed = "DPFeatureAppRemovalAllowed";

/// The device's restrictions. Callable from any thread.
class DPProfileConnection {
 public:
  virtual ~DPProfileConnection() = default;
  /// What is in force for the setting: 2 forbids the action; every other number does not.
  virtual int effectiveBoolValueForSetting(std::string_view setting) = 0;
};

}  // namespace platform
