#include "device/records/Settings.h"

#include <algorithm>
#include <charconv>

#include "device/DeviceErrors.h"

namespace device {

namespace {

constexpr int smallestIcon = 16;
constexpr int largestIcon = 1024;

bool isOneOf(std::string_view value, std::initializer_list<std::string_view> values) {
  return std::find(values.begin(), values.end(), value) != values.end();
}
bool isPermission(std::string_view value) { return isOneOf(value, {"allowed", "forbidden"}); }
bool isYesOrNo(std::string_view value) { return isOneOf(value, {"yes", "no"}); }
bool isIconSize(std::string_view value) {
  int size = 0;
  auto [end, failure] = std::from_chars(value.data(), value.data() + value.size(), size);
  return failure == std::errc() && end == value.data() + value.size() && size >= smallestIcon && size <= largestIcon;
}
struct Setting {
  std::string_view key;
  std::string_view byDefault;
  std::string_view takes;  // for people
  bool (*accepts)(std::string_view value);
};

constexpr Setting settings[] = {
    {"app-installation", "allowed", "\"allowed\" or \"forbidden\"", isPermission},
    {"app-removal", "allowed", "\"allowed\" or \"forbidden\"", isPermission},
    {"icon-size", "120", "a number of pixels from 16 to 1024", isIconSize},
    {"backup-placeholders", "yes", "\"yes\" or \"no\"", isYesOrNo},
    {"backup-error", "no", "\"yes\" or \"no\"", isYesOrNo},
    {"device-service-prioritize", "yes", "\"yes\" or \"no\"", isYesOrNo},
    {"device-service-cancel", "yes", "\"yes\" or \"no\"", isYesOrNo},
};

const Setting* findSetting(std::string_view key) {
  auto found = std::find_if(std::begin(settings), std::end(settings), [&](auto& each) { return each.key == key; });
  return found == std::end(settings) ? nullptr : found;
}

}  // namespace

std::vector<std::string> settingKeys() {
  std::vector<std::string> keys;
  for (const auto& each : settings) keys.emplace_back(each.key);
  return keys;
}

std::string settingOf(const DeviceState& state, std::string_view key) {
  auto set = state.settings.find(key);
  const auto* known = findSetting(key);
  // Somebody else may have written to the store.
  if (set != state.settings.end() && (!known || known->accepts(set->second))) return set->second;
  return known ? std::string(known->byDefault) : std::string();
}

bool checkSetting(std::string_view key, std::string_view value, platform::ErrorRef* error) {
  platform::setError(error, nullptr);
  const auto* setting = findSetting(key);
  if (!setting) {
    std::string known;
    for (const auto& each : settings) known += (known.empty() ? "" : ", ") + std::string(each.key);
    return fail(error, localDeviceError(LocalDeviceError::unknownSetting,
                                        "there is no setting \"" + std::string(key) + "\"; the settings are " + known));
  }
  if (setting->accepts(value)) return true;
  return fail(error, localDeviceError(LocalDeviceError::unknownSetting, std::string(key) + " takes " +
                                                                            std::string(setting->takes) + ", not \"" +
                                                                            std::string(value) + '"'));
}

}  // namespace device
