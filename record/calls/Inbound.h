#pragma once

#include "record/Operation.h"

/// The calls into the plug-in: what the daemon asks, and what services call back. A recording and its replay name them
/// alike; the first parameter is who is called.
namespace record::inbound {

inline constexpr Operation create{"Plugin", "create", "-> client"};

namespace client {
inline constexpr const char* service = "TSClient";
inline constexpr Operation release{service, "release", "client"};
inline constexpr Operation supportedDataclasses{service, "supportedDataclasses", "client"};
inline constexpr Operation currentSyncAnchor{service, "currentSyncAnchor", "client"};
inline constexpr Operation prepareForSyncWithHostAnchor{service, "prepareForSyncWithHostAnchor",
                                                        "client hostAnchor progressCallback -> error"};
inline constexpr Operation reconcileSync{service, "reconcileSync",
                                         "client syncType newAnchor progressCallback -> error"};
inline constexpr Operation syncEndedWithSuccess{service, "syncEndedWithSuccess", "client success"};
inline constexpr Operation installedAssets{service, "installedAssets", "client"};
inline constexpr Operation outstandingAssetTransfers{service, "outstandingAssetTransfers", "client"};
inline constexpr Operation assetTransferUpdatedProgress{service, "assetTransferUpdatedProgress",
                                                        "client asset progress"};
inline constexpr Operation assetTransferSucceeded{service, "assetTransferSucceeded", "client asset succeeded error"};
inline constexpr Operation assetInstallSucceeded{service, "assetInstallSucceeded", "client asset"};
inline constexpr Operation assetInstallFailed{service, "assetInstallFailed", "client asset error"};
inline constexpr Operation assetTransferEndedWithSuccess{service, "assetTransferEndedWithSuccess", "client success"};
inline constexpr Operation clearSyncData{service, "clearSyncData", "client"};
inline constexpr Operation reconcileRestoreOfType{service, "reconcileRestoreOfType", "client type -> error"};
inline constexpr Operation installedAssetMetrics{service, "installedAssetMetrics", "client"};
inline constexpr Operation vantorIDsForAssets{service, "vantorIDsForAssets", "client"};
inline constexpr Operation accountsForAssets{service, "accountsForAssets", "client"};
inline constexpr Operation disabledAssetTypes{service, "disabledAssetTypes", "client"};
inline constexpr Operation prepareForBackup{service, "prepareForBackup", "client"};
}  // namespace client

namespace delegate {
inline constexpr const char* service = "RVAppInstallObserverDelegate";
inline constexpr Operation promiseDidBeginFulfillmentWithIdentifier{service, "promiseDidBeginFulfillmentWithIdentifier",
                                                                    "observer identifier"};
inline constexpr Operation coordinatorDidInstallPlaceholder{service, "coordinatorDidInstallPlaceholder",
                                                            "observer coordinator"};
inline constexpr Operation coordinatorDidCompleteSuccessfully{service, "coordinatorDidCompleteSuccessfully",
                                                              "observer coordinator"};
inline constexpr Operation coordinatorShouldPrioritize{service, "coordinatorShouldPrioritize", "observer coordinator"};
inline constexpr Operation coordinatorCanceledWithReason{service, "coordinatorCanceledWithReason",
                                                         "observer coordinator reason client"};
}  // namespace delegate

namespace workspace {
inline constexpr const char* service = "OBApplicationWorkspaceObserverProtocol";
inline constexpr Operation applicationInstallsArePrioritized{service, "applicationInstallsArePrioritized",
                                                             "observer prioritized paused"};
inline constexpr Operation applicationInstallsDidCancel{service, "applicationInstallsDidCancel",
                                                        "observer applications"};
}  // namespace workspace

inline constexpr Operation notification{"NotificationCenter", "callback", "observer name userInfo"};
inline constexpr Operation block{"OBApplicationWorkspace", "block", "callback bundle -> stop"};
inline constexpr Operation completion{"Completion", "call", "callback error"};
inline constexpr Operation releaseCompletion{"Completion", "release", "callback"};

/// The one that goes the other way: the plug-in tells the daemon how far it is.
inline constexpr Operation progress{"TSProgressCallback", "call", "callback fraction"};

}  // namespace record::inbound
