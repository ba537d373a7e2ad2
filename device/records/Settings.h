#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "device/records/AppRecords.h"
#include "platform/Error.h"

namespace device {

/// Every setting that a device has.
std::vector<std::string> settingKeys();

/// What was set for the key, otherwise its default; empty for an unknown key.
std::string settingOf(const DeviceState& state, std::string_view key);

/// False, with an error that names the key or the value, when there is no such key or it takes no such value.
bool checkSetting(std::string_view key, std::string_view value, platform::ErrorRef* error = nullptr);

}  // namespace device
