#pragma once

#include <string_view>

/// The fixed places on the device's file system that the plug-in, its host and the device have in common.
/// `docs/file-formats.md` describes the files.
namespace platform {

// The plug-in's own directory.
constexpr std::string_view pluginDirectory = "/var/mobile/Library/ApplicationSync";
constexpr std::string_view lastSyncListPath = "/var/mobile/Library/ApplicationSync/LastSyncAppState.plist";
constexpr std::string_view sortOrderPath = "/var/mobile/Library/ApplicationSync/AssetSortOrder.plist";
constexpr std::string_view iconScratchDirectory = "/var/mobile/Library/ApplicationSync/Icons";
constexpr std::string_view restoreStatePath = "/var/mobile/Library/ApplicationSync/RestoreState.plist";

// The work area in it: the host's files of the last sync.
constexpr std::string_view workArea = "/var/mobile/Library/ApplicationSync/HarluneStuff";
constexpr std::string_view todoListPath = "/var/mobile/Library/ApplicationSync/HarluneStuff/ApplicationsSync.plist";
constexpr std::string_view todoListDebugPath =
    "/var/mobile/Library/ApplicationSync/HarluneStuff/ApplicationsSync.plist-debug.plist";
constexpr std::string_view iconLayoutPath = "/var/mobile/Library/ApplicationSync/HarluneStuff/PanelloIconState.plist";

// Where the host's files arrive. A package's path is absolute, or relative to the public staging directory.
constexpr std::string_view publicStagingDirectory = "/var/mobile/Media/PublicStaging";
constexpr std::string_view stagingDirectory = "/var/mobile/Media/PublicStaging/ApplicationSync";
constexpr std::string_view packagesDirectory = "/var/mobile/Media/PublicStaging/Packages";

// A restore.
constexpr std::string_view restoreListPath = "/var/mobile/Media/HarluneRestore/RestoreApplications.plist";
constexpr std::string_view restoreListLogPath = "/var/mobile/Library/Logs/MediaServices/RestoreApplications.plist";
constexpr std::string_view demotedAppsPath = "/var/mobile/Library/Preferences/com.vantor.Cellarum.DemotedApps.plist";

// Names of files: in the staging directory and the work area, and in an app's folder there or its container.
constexpr std::string_view todoListName = "ApplicationsSync.plist";
constexpr std::string_view iconLayoutName = "PanelloIconState.plist";
constexpr std::string_view storeMetadataFileName = "HarluneMetadata.plist";
constexpr std::string_view artworkFileName = "HarluneArtwork";

// Names of a restore's files, wherever they lie.
constexpr std::string_view restoreListName = "RestoreApplications.plist";
constexpr std::string_view demotedListName = "com.vantor.Cellarum.DemotedApps.plist";

}  // namespace platform
