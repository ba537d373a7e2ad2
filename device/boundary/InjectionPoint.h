#pragma once

#include <cstddef>
#include <iterator>
#include <string_view>

namespace device {

/// A place at which calls cross the boundary, or single steps are taken, and to which rules of injection may refer. The
/// table below is their one home: a point that it lacks does not compile, so that no call can cross without one.
class InjectionPoint {
 public:
  struct Name {
    std::string_view operation;
    std::string_view
        service;  // "log" of a message, whose level is the operation; empty for what is no call: "step", "transfer"

    friend constexpr bool operator==(const Name& one, const Name& other) = default;
    friend constexpr bool operator<(const Name& one, const Name& other) {
      return one.operation != other.operation ? one.operation < other.operation : one.service < other.service;
    }
  };

  /// All of them, sorted by operation, then by service.
  static constexpr Name table[] = {
      {"CorvaneClearUninstalled", "Installer"},
      {"CorvaneLookupUninstalled", "Installer"},
      {"GYCreateDeviceAppropriateHomeScreenIconImageFromBundle", "IconRenderer"},
      {"KBBundleCreate", "IconRenderer"},
      {"KBNotificationCallback", "AppsClient"},
      {"KBNotificationCenterAddObserver", "NotificationCenter"},
      {"KBNotificationCenterRemoveObserver", "NotificationCenter"},
      {"KBURLCreateWithFileSystemPath", "IconRenderer"},
      {"PNGetFlattenedIconState", "HomeScreen"},
      {"PNSPanelloBlockableServerPort", "HomeScreen"},
      {"PNSetIconState", "HomeScreen"},
      {"QGImageDestinationAddImage", "QGImageDestination"},
      {"QGImageDestinationCreateWithData", "ImageEncoder"},
      {"QGImageDestinationFinalize", "QGImageDestination"},
      {"RVCreateUserPresentableError", "InstallCoordination"},
      {"_handleTSDStartupCompletedNotification", "AppsClient"},
      {"accountsForAssets", "AppsClient"},
      {"addObserver", "OBApplicationWorkspace"},
      {"appAssetPromiseResponsibleClientWithError", "RVAppInstallCoordinator"},
      {"appAssetPromiseWithError", "RVAppInstallCoordinator"},
      {"applicationInstallsArePrioritized", "AppsClient"},
      {"applicationInstallsDidCancel", "AppsClient"},
      {"applicationIsInstalled", "OBApplicationWorkspace"},
      {"applicationProxyForIdentifier", "OBApplicationWorkspace"},
      {"assetInstallFailed", "AppsClient"},
      {"assetInstallSucceeded", "AppsClient"},
      {"assetTransferEndedWithSuccess", "AppsClient"},
      {"assetTransferSucceeded", "AppsClient"},
      {"assetTransferUpdatedProgress", "AppsClient"},
      {"attributesOfItem", "FileSystem"},
      {"bundleID", "RVAppInstallCoordinator"},
      {"cancelAssetTransferForFailedAsset", "TSDeviceService"},
      {"cancelForReason", "RVAppInstallCoordinator"},
      {"cancelForReason", "RVPlaceholder"},
      {"cancelForReason", "RVPromise"},
      {"clearSyncData", "AppsClient"},
      {"coordinatorCanceledWithReason", "AppsClient"},
      {"coordinatorDidCompleteSuccessfully", "AppsClient"},
      {"coordinatorDidInstallPlaceholder", "AppsClient"},
      {"coordinatorForAppWithBundleID", "InstallCoordination"},
      {"coordinatorShouldPrioritize", "AppsClient"},
      {"copyItem", "FileSystem"},
      {"createDirectory", "FileSystem"},
      {"createFile", "FileSystem"},
      {"createHandle", "SystemLog"},
      {"creatorIdentifier", "RVAppInstallCoordinator"},
      {"currentSyncAnchor", "AppsClient"},
      {"dataWithPropertyList", "PropertyListSerialization"},
      {"deallocateMemory", "Process"},
      {"default", "log"},
      {"disabledAssetTypes", "AppsClient"},
      {"effectiveBoolValueForSetting", "DPProfileConnection"},
      {"enumerateBundlesOfType", "OBApplicationWorkspace"},
      {"error", "RVAppInstallCoordinator"},
      {"error", "log"},
      {"fileExists", "FileSystem"},
      {"hasAppAssetPromise", "RVAppInstallCoordinator"},
      {"hasInitialZDRAssetPromises", "RVAppInstallCoordinator"},
      {"hasInstallOptions", "RVAppInstallCoordinator"},
      {"hasPlaceholderPromise", "RVAppInstallCoordinator"},
      {"hasUserDataPromise", "RVAppInstallCoordinator"},
      {"infoDictionaryOfBundleAtPath", "Process"},
      {"initializeWithLog", "InstallTransactionLog"},
      {"installedAssetMetrics", "AppsClient"},
      {"installedAssets", "AppsClient"},
      {"isComplete", "RVPromise"},
      {"logScenario", "InstallTransactionLog"},
      {"logStep", "InstallTransactionLog"},
      {"mainBundleIdentifier", "Process"},
      {"makeAccountInfo", "TSSupport"},
      {"makeAppInstallObserver", "InstallCoordination"},
      {"makeAppPlaceholder", "InstallCoordination"},
      {"makeBackupManager", "BackupService"},
      {"makeInstallOptions", "Installer"},
      {"makePlaceholderAttributes", "InstallCoordination"},
      {"makePlaceholderAttributesWithInfoPlistDictionary", "InstallCoordination"},
      {"makePromisedOutOfBandTransfer", "InstallCoordination"},
      {"makePromisedTransferToPath", "InstallCoordination"},
      {"makePromisedTransferToPathWithoutPath", "InstallCoordination"},
      {"makeStoreMetadata", "Installer"},
      {"moveItem", "FileSystem"},
      {"notify_post", "NotificationCenter"},
      {"notify_register_check", "NotificationCenter"},
      {"notify_set_state", "NotificationCenter"},
      {"outstandingAssetTransfers", "AppsClient"},
      {"prepareForBackup", "AppsClient"},
      {"prepareForSyncWithHostAnchor", "AppsClient"},
      {"prioritizeAsset", "TSDeviceService"},
      {"prioritizeCompletion", "AppsClient"},
      {"promiseDidBeginFulfillmentWithIdentifier", "AppsClient"},
      {"propertyListWithData", "PropertyListSerialization"},
      {"readFile", "FileSystem"},
      {"reconcileRestoreOfType", "AppsClient"},
      {"reconcileSync", "AppsClient"},
      {"releaseAppInstallObserver", "InstallCoordination"},
      {"removeItem", "FileSystem"},
      {"removeObserver", "OBApplicationWorkspace"},
      {"respondsToCancelAssetTransferForFailedAsset", "TSDeviceService"},
      {"respondsToPrioritizeAsset", "TSDeviceService"},
      {"setAltDSID", "TSMutableAccountInfo"},
      {"setAppAssetPromise", "RVAppInstallCoordinator"},
      {"setAppAssetPromiseResponsibleClient", "RVAppInstallCoordinator"},
      {"setBundleVersion", "RVPlaceholderAttributes"},
      {"setComplete", "RVPromise"},
      {"setConfigurationCompleteWithError", "RVPlaceholder"},
      {"setDSID", "TSMutableAccountInfo"},
      {"setHarluneMetadata", "CVInstallOptions"},
      {"setIconPromise", "RVPlaceholder"},
      {"setInitialZDRAssetPromises", "RVAppInstallCoordinator"},
      {"setInstallOptions", "RVAppInstallCoordinator"},
      {"setInstallTargetType", "CVInstallOptions"},
      {"setLaunchProhibited", "RVPlaceholderAttributes"},
      {"setMetadata", "RVPlaceholder"},
      {"setObInstallType", "CVInstallOptions"},
      {"setObserver", "RVAppInstallCoordinator"},
      {"setPercentComplete", "RVPromise"},
      {"setPlaceholderAttributes", "RVPlaceholder"},
      {"setPlaceholderPromise", "RVAppInstallCoordinator"},
      {"setSinfData", "RVPlaceholder"},
      {"setTransferPath", "RVPromise"},
      {"setUserDataPromise", "RVAppInstallCoordinator"},
      {"setVantorID", "TSMutableAccountInfo"},
      {"step", ""},
      {"supportedDataclasses", "AppsClient"},
      {"syncEndedWithSuccess", "AppsClient"},
      {"temporaryDirectory", "Process"},
      {"tessaroShouldCreateAppPlaceholdersWithError", "CLManager"},
      {"textOfErrorNumber", "Process"},
      {"transfer", ""},
      {"uninstallAppWithBundleID", "InstallCoordination"},
      {"uninstallApplication", "OBApplicationWorkspace"},
      {"uninstallCompletion", "AppsClient"},
      {"utimes", "FileSystem"},
      {"vantorIDsForAssets", "AppsClient"},
      {"writeAtomically", "FileSystem"},
  };

  /// `service` is the receiver's class, "FileSystem" for file operations, "AppsClient" for a call into the plug-in,
  /// "log" for a message, whose level is the operation.
  consteval InjectionPoint(const char* service, const char* operation) : _service(service), _operation(operation) {
    if (!isKnown({operation, declaringClass(service)})) throw "InjectionPoint::table has no such point";
  }

  constexpr const char* service() const { return _service; }
  constexpr const char* operation() const { return _operation; }

  static constexpr bool isKnown(const Name& name) {
    for (const auto& each : table) {
      if (each == name) return true;
    }
    return false;
  }
  /// The classes of promises share their operations; a rule may name any of them.
  static constexpr std::string_view declaringClass(std::string_view service) {
    bool isPromise = service == "RVPromisedTransferToPath" || service == "RVPromisedOutOfBandTransfer";
    return isPromise ? "RVPromise" : service;
  }

 private:
  const char* _service;
  const char* _operation;
};
static_assert([] {
  for (std::size_t i = 1; i < std::size(InjectionPoint::table); ++i) {
    if (!(InjectionPoint::table[i - 1] < InjectionPoint::table[i])) return false;
  }
  return true;
}());

}  // namespace device
