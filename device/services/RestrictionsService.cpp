#include "device/services/RestrictionsService.h"

namespace device {

static int numberOf(bool isAllowed) { return isAllowed ? 1 : 2; }

int RestrictionsService::effectiveBoolValueForSetting(std::string_view setting) {
  return _boundary.call({{"DPProfileConnection", "effectiveBoolValueForSetting"}}, nullptr, {{"setting", setting}},
                        [&] {
                          auto settings = _settings();
                          if (setting == platform::DPFeatureAppInstallationAllowed)
                            return numberOf(settings.allowsInstallation);
                          if (setting == platform::DPFeatureAppRemovalAllowed) return numberOf(settings.allowsRemoval);
                          return 0;
                        });
}

}  // namespace device
