#pragma once

#include <string_view>

/// Names that only the plug-in uses. Those that others know too are in `platform/DevicePaths.h` and
/// `platform/DeviceNames.h`.
namespace appsync {

constexpr std::string_view constantSyncAnchor = "NO_APP_SYNC_ANCHOR";
constexpr std::string_view installObserverServiceName = "com.vantor.tsd.msg.rcappobserverdelegate";

/// Below the process's temporary directory: a directory for each placeholder, with its icon.
constexpr std::string_view placeholderDirectoryName = "com.vantor.tsd.Apps";
constexpr std::string_view iconFileName = "Icon.png";

}  // namespace appsync
