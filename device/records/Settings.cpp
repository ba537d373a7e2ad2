#include "device/records/Settings.h"

#include <algorithm>
#include <charconv>
#include <iterator>
#include <type_traits>

#include "device/DeviceErrors.h"

namespace device {

namespace {

constexpr int smallestIcon = 16;
constexpr int largestIcon = 1024;

/// A setting of two values, the first of which is meant by true.
template <class Value>
bool readEither(std::string_view text, const char* yes, const char* no, Value& value) {
  if (text != yes && text != no) return false;
  value = text == yes;
  return true;
}
std::string either(bool value, const char* yes, const char* no) { return value ? yes : no; }

template <bool Settings::*member>
struct Permission {
  static constexpr const char* takes = "\"allowed\" or \"forbidden\"";
  static bool read(std::string_view text, Settings& settings) {
    return readEither(text, "allowed", "forbidden", settings.*member);
  }
  static std::string write(const Settings& settings) { return either(settings.*member, "allowed", "forbidden"); }
};

template <auto member>
struct YesOrNo {
  static constexpr const char* takes = "\"yes\" or \"no\"";
  static bool read(std::string_view text, Settings& settings) {
    return readEither(text, "yes", "no", settings.*member);
  }
  static std::string write(const Settings& settings) {
    if constexpr (std::is_same_v<decltype(member), std::optional<bool> Settings::*>)
      return either((settings.*member).value_or(true), "yes", "no");
    else
      return either(settings.*member, "yes", "no");
  }
};

struct IconSize {
  static constexpr const char* takes = "a number of pixels from 16 to 1024";
  static bool read(std::string_view text, Settings& settings) {
    int size = 0;
    auto [end, failure] = std::from_chars(text.data(), text.data() + text.size(), size);
    if (failure != std::errc() || end != text.data() + text.size()) return false;
    if (size < smallestIcon || size > largestIcon) return false;
    settings.iconSize = size;
    return true;
  }
  static std::string write(const Settings& settings) { return std::to_string(settings.iconSize); }
};

struct Setting {
  std::string_view key;
  std::string_view takes;  // for people
  bool (*read)(std::string_view text, Settings& settings);
  std::string (*write)(const Settings& settings);
};

template <class Kind>
constexpr Setting setting(std::string_view key) {
  return {key, Kind::takes, Kind::read, Kind::write};
}

constexpr Setting known[] = {
    setting<Permission<&Settings::allowsInstallation>>("app-installation"),
    setting<Permission<&Settings::allowsRemoval>>("app-removal"),
    setting<IconSize>("icon-size"),
    setting<YesOrNo<&Settings::wantsPlaceholders>>("backup-placeholders"),
    setting<YesOrNo<&Settings::backupFails>>("backup-error"),
    setting<YesOrNo<&Settings::prioritizesTransfers>>("device-service-prioritize"),
    setting<YesOrNo<&Settings::cancelsTransfers>>("device-service-cancel"),
};

const Setting* find(std::string_view key) {
  auto found = std::find_if(std::begin(known), std::end(known), [&](auto& each) { return each.key == key; });
  return found == std::end(known) ? nullptr : found;
}

}  // namespace

std::vector<std::string> settingKeys() {
  std::vector<std::string> keys;
  for (const auto& each : known) keys.emplace_back(each.key);
  return keys;
}

std::string textOfSetting(const Settings& settings, std::string_view key) {
  const auto* found = find(key);
  return found ? found->write(settings) : std::string();
}

bool changeSetting(Settings& settings, std::string_view key, std::string_view text, platform::ErrorRef* error) {
  platform::setError(error, nullptr);
  const auto* found = find(key);
  if (!found) {
    std::string keys;
    for (const auto& each : known) keys += (keys.empty() ? "" : ", ") + std::string(each.key);
    return fail(error, localDeviceError(LocalDeviceError::unknownSetting,
                                        "there is no setting \"" + std::string(key) + "\"; the settings are " + keys));
  }
  if (found->read(text, settings)) return true;
  return fail(error, localDeviceError(LocalDeviceError::unknownSetting, std::string(key) + " takes " +
                                                                            std::string(found->takes) + ", not \"" +
                                                                            std::string(text) + '"'));
}

}  // namespace device
