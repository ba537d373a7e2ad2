#pragma once

#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/Error.h"

namespace device {

/// What a device's settings say. They are written as texts, by key, on command lines, in documents and in the store.
struct Settings {
  bool allowsInstallation = true;
  bool allowsRemoval = true;
  int iconSize = 120;  // pixels of a side
  /// Whether the backup service wants placeholders; nothing was set: unless it fails.
  std::optional<bool> wantsPlaceholders;
  bool backupFails = false;
  bool prioritizesTransfers = true;
  bool cancelsTransfers = true;
};

/// Answers the settings as they are now. From any thread.
using CurrentSettings = std::function<Settings()>;

/// Every key that there is.
std::vector<std::string> settingKeys();

/// The value as text; empty for an unknown key.
std::string textOfSetting(const Settings& settings, std::string_view key);

/// Changes the setting. False, with an error that names the key or the value and without a change, when there is no
/// such key or it takes no such value.
bool changeSetting(Settings& settings, std::string_view key, std::string_view text,
                   platform::ErrorRef* error = nullptr);

}  // namespace device
