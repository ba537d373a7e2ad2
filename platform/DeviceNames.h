#pragma once

#include <string_view>

/// The fixed names by which the plug-in, its host and the device know one another.
namespace platform {

/// The data class that the plug-in serves.
constexpr std::string_view dataclassApplication = "Application";

/// Main-bundle identifiers of the processes that host the plug-in: the sync daemon's, and the data-migration
/// component's, which runs restores.
constexpr std::string_view daemonBundleIdentifier = "com.vantor.tsd";
constexpr std::string_view migrationBundleIdentifier = "com.vantor.shiftwell";

/// Notifications: the daemon has started; a sync runs (state 1) or not (state 0).
constexpr std::string_view startupNotificationName = "com.vantor.tsd.TSStartupCompleteNotification";
constexpr std::string_view syncNotificationName = "com.vantor.panello.tsd.wsyncnotify";

}  // namespace platform
