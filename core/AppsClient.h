#pragma once

#include <atomic>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/BackupService.h"
#include "platform/InstallCoordination.h"
#include "platform/Mutex.h"
#include "platform/NotificationCenter.h"
#include "platform/OBApplicationWorkspace.h"
#include "platform/Platform.h"
#include "platform/SerialQueue.h"
#include "platform/StringSet.h"
#include "platform/TSClient.h"
#include "platform/ThreadSafety.h"
#include "platform/WaitGroup.h"

namespace appsync {

class Candidates;
struct Candidate;

using platform::Bytes;
using platform::BytesView;
using platform::ErrorRef;
using platform::Platform;
using platform::StringSet;
using platform::TSAssetRef;
using platform::Value;
using CoordinatorRef = std::shared_ptr<platform::RVAppInstallCoordinator>;
using PlaceholderRef = std::shared_ptr<platform::RVPlaceholder>;
using TransferPromiseRef = std::shared_ptr<platform::RVPromisedTransferToPath>;

/// The plug-in of the data class "Application": one object for the life of the daemon's process.
///
/// It is passive: it starts no thread and waits only in `outstandingAssetTransfers` (for the registry's
/// first report) and at the end of a restore (for placeholders). Calls come from the daemon's threads,
/// callbacks from the services' threads, at the same time. Nothing is thrown out of a public operation.
///
/// Life: `init` makes the object, registers it with the application registry and, in the daemon's own process, for the
/// daemon's start-up notification; that notification makes it listen to the install-coordination service. Destruction
/// takes the registrations back and only reports unfinished work. The platform outlives the object.
///
/// Contents, in the order of the protocol:
///   life cycle                        core/Lifecycle.cpp
///   list files                        core/ListFiles.cpp
///   preparation and installed assets  core/SyncPreparation.cpp
///   reconciliation                    core/Reconcile.cpp
///   end of a sync, clearing           core/SyncEnd.cpp
///   queries, backup                   core/Queries.cpp
///   outstanding transfers             transfer/OutstandingTransfers.cpp
///   progress and completion           transfer/TransferCompletion.cpp
///   install outcomes                  transfer/InstallOutcomes.cpp
///   restore state                     transfer/RestoreState.cpp
///   AppInstallUsingCoordination       coordination/ (a file per heading below)
///   restore from a backup             restore/RestoreInfo.cpp, CoordinatedRestore.cpp, PlaceholderWait.cpp
///   placeholders and icons            placeholder/
class AppsClient final : public platform::TSClient,
                         public platform::OBApplicationWorkspaceObserverProtocol,
                         public platform::RVAppInstallObserverDelegate,
                         public std::enable_shared_from_this<AppsClient> {
  struct Creation {};

 public:
  // ---- Life cycle (core/Lifecycle.cpp) ----

  /// The plug-in object; null when it cannot be made.
  static std::shared_ptr<AppsClient> init(const Platform& platform);
  /// `init` only.
  AppsClient(const Platform& platform, Creation);
  ~AppsClient() override;
  AppsClient(const AppsClient&) = delete;
  AppsClient& operator=(const AppsClient&) = delete;

  /// Listens to the install-coordination service from now on; does nothing when it already does.
  void setupInstallCoordinatorObserver();
  /// One line for the log.
  std::string describe() const { return "<AppsClient>"; }

  // ---- TSClient: a sync from its preparation to its end (core/) ----

  std::vector<std::string> supportedDataclasses() override;
  std::string currentSyncAnchor() override;
  bool prepareForSyncWithHostAnchor(std::string_view hostAnchor, const platform::TSProgressCallback& progressCallback,
                                    ErrorRef* error) override;
  /// The apps that the device lost and the host should forget: `{_Deleted = ({KBBundleIdentifier = …}, …)}`.
  Value installedAssets() override;
  /// Takes the staging directory over, removes what the host no longer wants, hands the icon layout on. False when
  /// the work area could not be prepared; the error may be present although the answer is true.
  bool reconcileSync(std::uint32_t syncType, std::string_view newAnchor,
                     const platform::TSProgressCallback& progressCallback, ErrorRef* error) override;
  void assetTransferEndedWithSuccess(bool success) override;
  void syncEndedWithSuccess(bool success) override;
  void clearSyncData() override;

  // ---- TSClient: queries (core/Queries.cpp) ----

  /// `{_Count, _PhysicalSize, _PurgeableSize}` of the person's apps, in bytes.
  Value installedAssetMetrics() override;
  StringSet vantorIDsForAssets() override;
  std::vector<std::shared_ptr<platform::TSMutableAccountInfo>> accountsForAssets() override;
  std::optional<StringSet> disabledAssetTypes() override;
  void prepareForBackup() override;

  // ---- TSClient: asset transfers (transfer/) ----

  std::vector<TSAssetRef> outstandingAssetTransfers() override;
  void assetTransferUpdatedProgress(const TSAssetRef& asset, double progress) override;
  void assetTransferSucceeded(const TSAssetRef& asset, bool succeeded, const ErrorRef& error) override;
  void assetInstallSucceeded(const TSAssetRef& asset) override;
  void assetInstallFailed(const TSAssetRef& asset, const ErrorRef& error) override;

  // ---- TSClient: restore (restore/RestoreInfo.cpp) ----

  /// Always true; the error is the backup service's.
  bool reconcileRestoreOfType(std::int32_t type, ErrorRef* error) override;

  // ---- Callbacks of the services (coordination/CoordinatorCallbacks.cpp) ----

  void promiseDidBeginFulfillmentWithIdentifier(std::uint64_t identifier) override;
  void coordinatorDidInstallPlaceholder(const CoordinatorRef& coordinator) override;
  void coordinatorDidCompleteSuccessfully(const CoordinatorRef& coordinator) override;
  void coordinatorShouldPrioritize(const CoordinatorRef& coordinator) override;
  void coordinatorCanceledWithReason(const CoordinatorRef& coordinator, const ErrorRef& reason,
                                     platform::RVClientIdentifier client) override;
  void applicationInstallsDidCancel(const std::vector<platform::OBApplicationProxyRef>& applications) override;

 private:
  // ---- Restriction tests (core/Lifecycle.cpp) ----

  bool _appInstallationAllowed() const;
  bool _appRemovalAllowed() const;

  // ---- List files (core/ListFiles.cpp) ----

  /// The array in the property list at the path; absent when there is none.
  static Value _loadPlist(const Platform& platform, std::string_view path, ErrorRef* error = nullptr);
  /// Sets the operation of the identifier's first entry in the todo list. Without an identifier nothing is changed.
  void changeAssetID(std::optional<std::string_view> identifier, std::string_view toDo) EXCLUDES(_listFilesQueue);
  /// The items in home-screen order, then the others. Those that the home screen names are taken out of `items`.
  static std::vector<std::shared_ptr<const Candidate>> _orderTheItems(const Platform& platform, Candidates& items);

  // ---- Preparation (core/SyncPreparation.cpp) ----

  /// The array in the answer of `installedAssets`.
  Value _deletions() EXCLUDES(_transferStateGuard);

  // ---- Reconciliation (core/Reconcile.cpp) ----

  enum class StagingArea { taken, nothingThere, failed };
  StagingArea _takeStagingArea(ErrorRef* error) EXCLUDES(_listFilesQueue);
  void _removeUnwantedApps(const Value& todoList, bool removalAllowed);
  static void _notifyPanello(const Platform& platform, bool starting);

  // ---- Outstanding transfers (transfer/OutstandingTransfers.cpp) ----

  class OutstandingTransfers;
  /// False when the app counted as one already (did not count as one).
  bool _addUpdatingApp(std::string_view identifier) EXCLUDES(_accessQueue);
  bool _removeUpdatingApp(std::string_view identifier) EXCLUDES(_accessQueue);

  // ---- Transfer completion, outcomes, restore state (transfer/) ----

  void _transferArrived(const TSAssetRef& asset, bool existingApp);
  void _transferFailed(const TSAssetRef& asset, const ErrorRef& error, bool existingApp, bool userCancelled);
  bool _isRecoverableError(const ErrorRef& error);
  /// The stored value; absent when any level of it is missing.
  Value _restoreStatePropertyForKey(std::string_view key, std::string_view identifier,
                                    const std::optional<std::string>& version);
  /// Removes the app's records of all versions, and with the last record the file; a file that is no property list goes
  /// too. Without an identifier nothing is removed.
  void cleanRestoreStateForIdentifier(std::optional<std::string_view> identifier) EXCLUDES(_listFilesQueue);

  // ---- AppInstallUsingCoordination ----
  // Acquisition (coordination/CoordinatorAcquisition.cpp)

  /// The plug-in's own coordinator for the app; null when there is none or somebody else's.
  CoordinatorRef _initiatingOrUpdatingAppInstallCoordinatorForBundleIdentifier(std::string_view bundleIdentifier,
                                                                               bool existingApp,
                                                                               bool createIfNotExisting,
                                                                               ErrorRef* error = nullptr);

  // Promises and placeholders (coordination/Promises.cpp). Null when the object cannot be made or attached; one that
  // was made but not attached has been cancelled.

  TransferPromiseRef _createAppAssetPromiseForBundleIdentifier(std::string_view bundleIdentifier,
                                                               const std::optional<std::string>& atPath,
                                                               const CoordinatorRef& andAddToCoordinatinator);
  TransferPromiseRef _createIconPromiseForBundleIdentifier(std::string_view bundleIdentifier,
                                                           std::string_view transferPath, std::uint64_t diskSpaceNeeded,
                                                           const PlaceholderRef& andAddToPlaceHolder,
                                                           bool forAppInstall);
  std::shared_ptr<platform::RVPromisedOutOfBandTransfer> _userDataPromiseForBundleIdentifier(
      std::string_view bundleIdentifier);
  PlaceholderRef _placeHolderForBundleIdentifier(std::string_view bundleIdentifier, std::string_view name,
                                                 std::uint64_t installType);

  // Preparing an install (coordination/CoordinatedInstall.cpp)

  class CoordinatedInstall;
  /// True when the app's coordinator holds a placeholder promise. Otherwise the plug-in's coordinator for the app, if
  /// it got one, is cancelled, and so is a placeholder that could not be attached; files in the placeholder's directory
  /// stay. Throws nothing.
  bool prepareAppForInstallUsingCoordination(const TSAssetRef& asset, bool existingApp);

  // Progress, completion, end of the phase (coordination/CoordinatedTransfer.cpp)

  bool updateTransferProgressForApp(const TSAssetRef& asset, bool existingApp);
  void transferCompleteForApp(const TSAssetRef& asset, const ErrorRef& withError, bool isExistingApp);
  void assetSyncFinishedWithStatus(bool status, const StringSet& outstandingItems);

  // The daemon's answer to a request of a callback (coordination/CoordinatorCallbacks.cpp)

  void _prioritizeEnded(std::string_view bundleIdentifier, const ErrorRef& error);

  // Removal (coordination/Uninstall.cpp)

  /// Returns before the app is gone; the completion only tells how it went.
  void uninstallAppUsingCoordination(std::string_view bundleIdentifier);
  void _uninstallEnded(std::string_view bundleIdentifier, const ErrorRef& error);

  // ---- Restore from a backup (restore/) ----

  bool _processHarluneRestoreInfo();
  bool _restoreAppsOfFile();
  bool _restoreAppsOfList(const platform::Dictionary& list);
  static Value _loadDemotedAppsPlist(const Platform& platform, std::string_view path, ErrorRef* error = nullptr);

  class CoordinatedRestore;
  /// What the restore list holds about one app; absent pieces are empty.
  struct RestoreInput {
    std::string_view bundleIdentifier;
    BytesView harluneMetadata;  // a serialised property list
    std::optional<BytesView> sinfData;
    std::optional<BytesView> iconData;
  };
  /// True when the app is prepared, or was already. Otherwise what was set up is cancelled and the app is not awaited.
  /// Throws nothing.
  bool prepareAppForRestoreUsingCoordination(const RestoreInput& input, std::uint64_t demotionStatus);
  bool _prepareDemotedAppForRestoreWithBundleId(const RestoreInput& input, std::uint64_t demotionStatus);
  bool _prepareNonDemotedAppForRestoreWithBundleId(const RestoreInput& input);
  PlaceholderRef _placeHolderForBundleIdentifierWithHarluneMetadata(const RestoreInput& input, const Value& metadata,
                                                                    std::uint64_t demotionStatus);

  // Awaited placeholders (restore/PlaceholderWait.cpp). From any thread.

  void shiftwellSetPlaceHolderPromiseForRestoreAppBundle(std::string_view bundleIdentifier) EXCLUDES(_restoreQueue);
  void shiftwellCancelledCoordinatorForRestoreAppBundle(std::string_view bundleIdentifier) EXCLUDES(_restoreQueue);
  /// No identifier: the service does not know the app; such a report is ignored, like one about an app nobody awaits.
  void rcDidInstallPlaceHolderForAppBundle(std::optional<std::string_view> bundleIdentifier) EXCLUDES(_restoreQueue);
  /// Blocks until every awaited placeholder is installed or cancelled, for at most 5 seconds of the clock for each.
  void _waitForPlaceholderInstalls() EXCLUDES(_restoreQueue);
  /// False when the app is not awaited.
  bool _stopAwaitingPlaceholder(std::string_view bundleIdentifier) REQUIRES(_restoreQueue);

  // ---- Placeholders and icons (placeholder/) ----

  std::string placeholderAppPathForBundleIdentifier(std::string_view bundleIdentifier) const;
  bool createPlaceHolderPath(std::string_view path, std::string_view forBundleIdentifier, const Value& withAttributes);
  bool writeIconData(std::optional<BytesView> iconData, std::string_view atPath, std::uint64_t* returningFileSize,
                     std::string_view forBundleIdentifier, const Value& withAttributes);
  /// What the plug-in's directories and files are created with.
  static Value ownerAttributes();

  using PlaceholderBlock = std::function<void(const platform::OBApplicationProxy& proxy, bool& stop)>;
  void _enumeratePlaceholdersWithBlock(const PlaceholderBlock& block);
  StringSet _getSystemAppPlaceholders();
  static bool _makeIconFromBundlePath(const Platform& platform, const std::optional<std::string>& bundlePath,
                                      std::string_view saveTo);

  // ---- State ----

  const Platform _platform;

  std::optional<std::vector<std::string>> _uninstalledApps GUARDED_BY(_transferStateGuard);
  platform::WaitGroup _restorePlaceHoldersWaitGroup;
  StringSet _outstandingDuctoTransfers GUARDED_BY(_transferStateGuard);
  const std::shared_ptr<platform::CLManager> _backupManager;
  StringSet _updatingApps GUARDED_BY(_accessQueue);
  StringSet _userCancelledApps GUARDED_BY(_accessQueue);
  StringSet _placeholdersForRestoringApps GUARDED_BY(_restoreQueue);
  const bool _useInstallCoordinator = true;
  bool _finishedWaitingForPlaceHolderInstalls GUARDED_BY(_restoreQueue) = false;
  platform::SerialQueue _accessQueue{"com.vantor.mxs.Tessaro.AppSync"};
  platform::SerialQueue _restoreQueue{"com.vantor.mxs.Tessaro.AppRestore"};
  std::unique_ptr<platform::RVAppInstallObserver> _appInstallObserver;
  /// Written on `_restoreQueue` only; atomic so that a waiter reads a whole number outside it.
  std::atomic<std::int64_t> _restoringPlaceholderCount{0};

  /// False after an `installedAssets` that failed: the apps of the last sync have to be looked through once more.
  bool _deletionsReported GUARDED_BY(_transferStateGuard) = true;
  /// Guards the three fields that the daemon's calls share; held for the field alone.
  platform::Mutex _transferStateGuard;
  /// The work area, the todo list in it and the restore state are read, changed and replaced on this queue, so that no
  /// edit is lost and none that began on an old list lands on a new one.
  platform::SerialQueue _listFilesQueue{"com.vantor.mxs.Tessaro.AppListFiles"};
  /// Whoever sets it makes `_appInstallObserver`.
  std::atomic<bool> _observesInstalls{false};
};

/// What the notification center calls when the daemon has started; `observer` is the plug-in object, or null.
void _handleTSDStartupCompletedNotification(platform::NotificationCenter& center, void* observer, std::string_view name,
                                            const void* object, const Value& userInfo);

}  // namespace appsync
