#include "device/services/RestrictionsService.h"

namespace device {

static std::string_view keyOfRestriction(std::string_view setting) {
  if (setting == platform::DPFeatureAppInstallationAllowed) return "app-installation";
  if (setting == platform::DPFeatureAppRemovalAllowed) return "app-removal";
  return {};
}

int RestrictionsService::effectiveBoolValueForSetting(std::string_view setting) {
  return _boundary.call({"DPProfileConnection", "effectiveBoolValueForSetting"}, nullptr, {{"setting", setting}}, [&] {
    auto key = keyOfRestriction(setting);
    auto value = key.empty() ? std::string() : _setting(key);
    return value == "forbidden" ? 2 : value == "allowed" ? 1 : 0;
  });
}

}  // namespace device
