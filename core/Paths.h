#pragma once

#include <string_view>

/// The fixed places and names of the plug-in. `docs/file-formats.md` describes the files.
namespace appsync {

constexpr std::string_view dataclassApplication = "Application";
constexpr std::string_view constantSyncAnchor = "NO_APP_SYNC_ANCHOR";
constexpr std::string_view daemonBundleIdentifier = "com.vantor.tsd";
constexpr std::string_view startupNotificationName = "com.vantor.tsd.TSStartupCompleteNotification";
constexpr std::string_view installObserverServiceName = "com.vantor.tsd.msg.rcappobserverdelegate";
constexpr std::string_view syncNotificationName = "com.vantor.panello.tsd.wsyncnotify";

constexpr std::string_view pluginDirectory = "/var/mobile/Library/ApplicationSync";
constexpr std::string_view workArea = "/var/mobile/Library/ApplicationSync/HarluneStuff";
constexpr std::string_view todoListPath = "/var/mobile/Library/ApplicationSync/HarluneStuff/ApplicationsSync.plist";
constexpr std::string_view todoListDebugPath =
    "/var/mobile/Library/ApplicationSync/HarluneStuff/ApplicationsSync.plist-debug.plist";
constexpr std::string_view iconLayoutPath = "/var/mobile/Library/ApplicationSync/HarluneStuff/PanelloIconState.plist";
constexpr std::string_view lastSyncListPath = "/var/mobile/Library/ApplicationSync/LastSyncAppState.plist";
constexpr std::string_view sortOrderPath = "/var/mobile/Library/ApplicationSync/AssetSortOrder.plist";
constexpr std::string_view iconScratchDirectory = "/var/mobile/Library/ApplicationSync/Icons";
constexpr std::string_view restoreStatePath = "/var/mobile/Library/ApplicationSync/RestoreState.plist";

constexpr std::string_view publicStagingDirectory = "/var/mobile/Media/PublicStaging";
constexpr std::string_view stagingDirectory = "/var/mobile/Media/PublicStaging/ApplicationSync";

constexpr std::string_view restoreListPath = "/var/mobile/Media/HarluneRestore/RestoreApplications.plist";
constexpr std::string_view restoreListLogPath = "/var/mobile/Library/Logs/MediaServices/RestoreApplications.plist";
constexpr std::string_view demotedAppsPath = "/var/mobile/Library/Preferences/com.vantor.Cellarum.DemotedApps.plist";

constexpr std::string_view placeholderDirectoryName = "com.vantor.tsd.Apps";
constexpr std::string_view iconFileName = "Icon.png";
constexpr std::string_view storeMetadataFileName = "HarluneMetadata.plist";

/// Values of a todo-list entry's "operation".
namespace operation {
constexpr std::string_view install = "install";
constexpr std::string_view remove = "remove";
constexpr std::string_view sent = "SENT";
constexpr std::string_view downloaded = "DOWNLOADED";
constexpr std::string_view installed = "INSTALLED";
constexpr std::string_view failed = "FAILED";
}  // namespace operation

/// Install types of the application registry that the plug-in gives or tests.
namespace installType {
constexpr unsigned long restore = 2;
constexpr unsigned long sync = 4;
constexpr unsigned long downgrade = 7;             // demoted automatically
constexpr unsigned long intentionalDowngrade = 8;  // demoted by hand
}  // namespace installType

}  // namespace appsync
