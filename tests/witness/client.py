"""The plug-in's object: its life, its state, and everything that is asked of it."""

from witness import coordination, files, restoring, transfers
from witness.engine import ANY, Difference, call, complain, describe, describe_error, log, some, step

DAEMON = "com.vantor.tsd"
STARTED = "com.vantor.tsd.TSStartupCompleteNotification"
SYNCING = "com.vantor.panello.tsd.wsyncnotify"


class Client:
    def __init__(self, others_call_too=False):
        """`others_call_too`: whoever plays the daemon's part makes calls to the services of its own."""
        self.others_call_too = others_call_too
        self.me, self.registration, self.query = None, None, None
        self.uninstalled = None
        # Sets, in the order in which their members came.
        self.updating, self.cancelled, self.outstanding, self.awaited = {}, {}, {}, {}
        self.has_finished_waiting = False

    # What the journal shows without a call into the plug-in.

    def unasked(self, record):
        if record["op"] == "makeBackupManager":
            self.__init__(self.others_call_too)
            return self.create()
        if record["op"] == "removeObserver" or "getting dealloc'd" in record.get("text", ""):
            return self.destroy()
        return None

    def is_foreign(self, record):
        if record["op"] == "notify_post":
            return record["args"]["name"] == STARTED
        is_own = record["op"] == "makeBackupManager" or (
            record["op"] == "removeObserver" and record["args"]["observer"] == self.me)
        return self.others_call_too and record["service"] != "log" and not is_own

    def end(self):
        if self.me:
            raise Difference("the object was not let go as it has to be")

    def create(self):
        self.manager = (yield from call("BackupService.makeBackupManager")).result
        self.me = (yield from call("OBApplicationWorkspace.addObserver", observer=ANY)).arguments["observer"]
        handle = (yield from call("SystemLog.createHandle", subsystem="com.vantor.appinstallation",
                                  category="tsd.appsync")).result
        yield from call("InstallTransactionLog.initializeWithLog", log=handle)
        if (yield from call("Process.mainBundleIdentifier")).result == DAEMON:
            self.has_finished_waiting = True
            yield from call("NotificationCenter.KBNotificationCenterAddObserver", observer=self.me, name=STARTED,
                            suspension=0)

    def destroy(self):
        if self.outstanding:
            yield from complain(f"<AppsClient> getting dealloc'd with {len(self.outstanding)} outstanding Ducto transfers!")
        if self.awaited:
            yield from complain("<AppsClient> getting dealloc'd with {" + describe(sorted(self.awaited)) +
                                "}pending placeholder install complete notifications")
        yield from call("OBApplicationWorkspace.removeObserver", observer=self.me)
        if (yield from call("Process.mainBundleIdentifier")).result == DAEMON:
            yield from call("NotificationCenter.KBNotificationCenterRemoveObserver", observer=self.me, name=STARTED)
            if self.registration:
                yield from call("InstallCoordination.releaseAppInstallObserver")
        self.me = None

    def on_uninstallCompletion(self, app, error):
        yield from log(f"Uninstall of {app} with install coordinator succeeded wiht error {describe_error(error)}.")
        yield from step(7, 2, error is None, app, "Uninstall app")

    def on_prioritizeCompletion(self, app, error):
        yield from log(f"Prioritize {app} finished with error {describe_error(error)}")

    # What is called.

    def enter(self, op, arguments, app):
        method = getattr(self, "on_" + op, None)
        if method is None:
            raise Difference(f"there is no operation {op}")
        return method(app, **arguments) if op.endswith("Completion") else method(**arguments)

    def check_result(self, op, result, record):
        shown = record["result"]
        if op == "outstandingAssetTransfers":
            shown = [{name: value for name, value in asset.items() if name != "object"} for asset in shown]
        if shown != result:
            raise Difference(f"{op}:\n  expected the answer {result}\n  there is {shown}")

    def is_allowed(self, what):
        answer = yield from call("DPProfileConnection.effectiveBoolValueForSetting", setting=f"DPFeatureApp{what}Allowed")
        return answer.result != 2

    def on__handleTSDStartupCompletedNotification(self, name):
        if not self.registration:
            self.registration = (yield from call(
                "InstallCoordination.makeAppInstallObserver", machServiceName="com.vantor.tsd.msg.rcappobserverdelegate",
                clients=["3"], delegate=self.me)).result

    def on_supportedDataclasses(self):
        yield from ()
        return ["Application"]

    def on_currentSyncAnchor(self):
        yield from ()
        return "NO_APP_SYNC_ANCHOR"

    def on_prepareForSyncWithHostAnchor(self, hostAnchor):
        yield from ()
        return True

    def on_installedAssets(self):
        yield from log("getting installed assets")
        todo = yield from files.load_list(files.TODO)
        last = yield from files.load_list(files.LAST_SYNC)
        candidates = {}
        found = (yield from call("Installer.CorvaneLookupUninstalled")).result
        if isinstance(found, dict):
            self.uninstalled = list(found)
            candidates = dict.fromkeys(found)
        else:
            yield from complain("CorvaneLookupUninstalled returned NULL")
        for app in last or []:
            if isinstance(app, str) and not (yield from call("OBApplicationWorkspace.applicationIsInstalled",
                                                             bundleIdentifier=app)):
                candidates[app] = None
        deleted = []
        for app in candidates:
            entry = files.first_entry(todo, app)
            operation = entry.get("operation") if entry else None
            if entry is None or operation in ("FAILED", "INSTALLED"):
                yield from log(f"{app} not installed, and no todo (found={entry is not None:d} "
                               f"pi={operation == 'INSTALLED':d} failed={operation == 'FAILED':d}) Marking as deleted")
                deleted.append({"KBBundleIdentifier": app})
            else:
                yield from log(f"{app} not installed, but is in our todo list. Not marking deleted")
        yield from log(f"finished getting installed assets toDoList:{describe(todo)}, uninstalled apps "
                       f"{describe(self.uninstalled)}, last synced apps{describe(last)}", category="15")
        return {"_Deleted": deleted}

    def on_reconcileSync(self, syncType, newAnchor):
        yield from log(f"starting to reconcile sync with new anchor {newAnchor}")
        done = yield from self.take_over()
        yield from log("finished reconcile sync")
        return done

    def take_over(self):
        yield from call("FileSystem.removeItem", path=files.WORK)
        if not (yield from call("FileSystem.createDirectory", path=files.ROOT, withIntermediateDirectories=True)):
            yield from log("can't create work area")
            return False
        if not (yield from call("FileSystem.fileExists", path=files.STAGING)):
            yield from log("Nothing to do")
            return True
        if not (yield from call("FileSystem.moveItem", {"from": files.STAGING, "to": files.WORK})):
            yield from log("Can't move staging area")
            return False
        allowed = yield from self.is_allowed("Removal")
        todo = yield from files.load_list(files.TODO)
        if todo is None:
            yield from log("Nothing to do from Harlune")
        elif allowed:
            yield from self.remove_apps(todo)
        else:
            yield from log("Not processing deletes because app removal is restricted")
        yield from self.notify(True)
        layout = (yield from call("FileSystem.readFile", path=files.WORK + "/PanelloIconState.plist")).result
        if layout:
            yield from log("Sending iconlayout to PN")
            port = (yield from call("HomeScreen.PNSPanelloBlockableServerPort")).result
            yield from call("HomeScreen.PNSetIconState", port=port, layout=layout)
        if todo is not None:
            yield from files.write(files.TODO + "-debug.plist", todo, files.BINARY)
        return True

    def remove_apps(self, todo):
        removed = []
        for entry in todo:
            if isinstance(entry, dict) and entry.get("operation") == "remove" and files.is_path_component(
                    entry.get("identifier")):
                yield from log(f"{entry['identifier']} targeted for termination")
                removed.append(entry["identifier"])
        if removed:
            yield from log(f"performing {len(removed)} deletions")
        for app in removed:
            yield from coordination.uninstall(app)

    def notify(self, starts):
        registered = yield from call("NotificationCenter.notify_register_check", name=SYNCING)
        yield from log(f"Notifying PN we are {'starting' if starts else 'done'} syncing")
        yield from call("HomeScreen.PNSPanelloBlockableServerPort")
        if registered.result != 0:
            yield from complain(f"Uh Oh...can't send notification to PN:{registered.result}")
            return
        yield from call("NotificationCenter.notify_set_state", token=ANY, state=int(starts))
        yield from call("NotificationCenter.notify_post", name=SYNCING)

    def on_outstandingAssetTransfers(self):
        return transfers.Outstanding(self).run()

    def on_assetTransferUpdatedProgress(self, asset, progress):
        return transfers.progress(self, asset, progress)

    def on_assetTransferSucceeded(self, asset, succeeded, error):
        return transfers.completion(self, asset, succeeded, error)

    def on_assetInstallSucceeded(self, asset):
        return transfers.install_succeeded(asset)

    def on_assetInstallFailed(self, asset, error):
        return transfers.install_failed(asset, error)

    def on_assetTransferEndedWithSuccess(self, success):
        yield from log(f"asset transfer ended withsuccess: {'y' if success else 'n'}")
        yield from self.notify(False)
        if not self.outstanding:
            return
        yield from coordination.finish_sync(success, list(self.outstanding))
        if success:
            yield from complain(f"Called with success == YES but with {len(self.outstanding)} outstanding Ducto transfers!")
        for members in (self.outstanding, self.updating, self.cancelled):
            members.clear()

    def on_syncEndedWithSuccess(self, success):
        yield from log(f"sync ended with success: {'y' if success else 'n'}")
        if not success:
            return
        touched = yield from call("FileSystem.utimes", path=files.ROOT)
        if touched.result != 0:
            text = (yield from call("Process.textOfErrorNumber", errorNumber=ANY)).result
            yield from complain(f'Failed to update utimes of "{files.ROOT}": {text}')
        if self.uninstalled is not None:
            yield from log(f"clearing uninstalled apps: {describe(self.uninstalled)}")
            cleared = yield from call("Installer.CorvaneClearUninstalled", bundleIdentifiers=self.uninstalled)
            if cleared.result == 0:
                self.uninstalled = None
            else:
                yield from complain("Failed to clear uninstalled apps from Corvane.")
        yield from call("FileSystem.removeItem", path=files.LAST_SYNC)

    def on_clearSyncData(self):
        yield from log("blasting work area")
        yield from call("FileSystem.removeItem", path=files.ROOT)
        yield from log("Uninstalling all placeholder apps")
        for proxy in (yield from transfers.placeholders()):
            app = proxy.get("bundleIdentifier")
            done = yield from call("OBApplicationWorkspace.uninstallApplication", bundleIdentifier=app)
            yield from log(f"Uninstall {app} = {'y' if done else 'n'}")
        found = (yield from call("Installer.CorvaneLookupUninstalled")).result
        if not isinstance(found, dict):
            yield from complain("Failed to fetch uninstalled apps list to clear it")
        elif (yield from call("Installer.CorvaneClearUninstalled", bundleIdentifiers=list(found))).result != 0:
            yield from complain("Failed to clear uninstalled apps list")

    def on_reconcileRestoreOfType(self, type):
        return restoring.reconcile(self, type)

    # What the services report.

    def on_applicationInstallsArePrioritized(self, prioritized, paused, observer):
        if self.query and observer == self.query.observer:
            yield from self.query.report(prioritized, paused)

    def on_applicationInstallsDidCancel(self, applications):
        yield from log("not handling applicationInstallsDidCancel because install coordination is enabled.")

    def on_promiseDidBeginFulfillmentWithIdentifier(self, identifier):
        yield from log(f"promiseDidBeginFulfillmentWithIdentifier {identifier}")

    def bundle_id(self):
        return (yield from call("RVAppInstallCoordinator.bundleID")).result

    def on_coordinatorDidInstallPlaceholder(self, coordinator):
        app = yield from self.bundle_id()
        error = (yield from call("RVAppInstallCoordinator.error")).result
        yield from log(f"coordinatorDidInstallPlaceholder for {describe(app)} with error {describe_error(error)}")
        if self.has_finished_waiting:
            return
        if self.awaited.pop(app, None):
            yield from log(f"RC finished installing placeholder for {app}, _restoringPlaceholderCount {len(self.awaited)}")
        else:
            yield from complain(f"Ignoring notification from RC about installing placeholder for {describe(app)}")

    def on_coordinatorDidCompleteSuccessfully(self, coordinator):
        app = yield from self.bundle_id()
        error = (yield from call("RVAppInstallCoordinator.error")).result
        yield from log(f"coordinatorDidCompleteSuccessfully for {describe(app)} with error {describe_error(error)}")
        yield from files.mark(app, "FAILED" if error else "INSTALLED")
        yield from files.clean_restore_state(app)

    def on_coordinatorShouldPrioritize(self, coordinator):
        app = yield from self.bundle_id()
        if app is None:
            return
        yield from log(f"Prioritize {app}")
        if (yield from call("TSDeviceService.respondsToPrioritizeAsset")):
            yield from call("TSDeviceService.prioritizeAsset", asset=asset_of(app))
        else:
            yield from complain(f"Cannot prioritize {app} as it's not supported")

    def on_coordinatorCanceledWithReason(self, coordinator, reason, client):
        app = yield from self.bundle_id()
        if app is None:
            return
        already = app in self.cancelled
        self.cancelled[app] = True
        if self.awaited.pop(app, None):
            yield from log(f"RC cancelled coordinator for restoring app bundle {app} _restoringPlaceholderCount "
                           f"{len(self.awaited)}")
        if not already and (yield from call("TSDeviceService.respondsToCancelAssetTransferForFailedAsset")):
            yield from log(f"Cancelling asset sync for {app}")
            yield from call("TSDeviceService.cancelAssetTransferForFailedAsset", asset=asset_of(app))
        else:
            yield from complain(f"Cannot cancel {app} as it's already cancelled {already:d} OR the call is not supported")

    # Queries.

    def on_installedAssetMetrics(self):
        sizes = [each["staticUsage"] for each in (yield from self.apps()) if each.get("applicationType") == "User"]
        yield from log(f"found {len(sizes)} apps using {sum(sizes)} bytes (0 purgeable)")
        return {"_Count": len(sizes), "_PhysicalSize": sum(sizes), "_PurgeableSize": 0}

    def apps(self):
        bundles = (yield from call("OBApplicationWorkspace.enumerateBundlesOfType", type=1)).result or []
        return [each for each in bundles if "applicationIdentifier" in each]

    def typed(self, owner, key, kind, label):
        value = (owner or {}).get(key)
        if value is None or isinstance(value, kind) and not isinstance(value, bool):
            return value
        yield from log(f"unexpected type for {label}", level="error", category="0")
        return None

    def metadata_of(self, proxy):
        path = proxy.get("bundleContainerURL", "") + "/HarluneMetadata.plist"
        return path, (yield from files.read_dictionary(path))

    def account_of(self, metadata):
        info = yield from self.typed(metadata, "com.vantor.HarluneStore.downloadInfo", dict, "downloadInfo")
        return (yield from self.typed(info, "accountInfo", dict, "accountInfo"))

    def on_vantorIDsForAssets(self):
        yield from log("getting id's for assets")
        found = {}
        for proxy in (yield from self.apps()):
            app = describe(proxy.get("applicationIdentifier"))
            path, metadata = yield from self.metadata_of(proxy)
            first = yield from self.typed(metadata, "vantorId", str, "vantorID")
            second = yield from self.typed((yield from self.account_of(metadata)), "VantorID", str, "VantorID")
            if first is None and second is None:
                yield from log(f"unknown VantorID for {app} (plist at {path})")
            elif first is not None and second is not None and first != second:
                yield from log(f"mismatched VantorID keys for {app}: {first} vs {second}")
            found |= dict.fromkeys(each for each in (first, second) if each is not None)
        yield from log("Returning vantor ID set: {" + describe(sorted(found)) + "}")
        return ANY

    def on_accountsForAssets(self):
        yield from log("getting accounts for assets")
        seen, shown = {}, set()
        for proxy in (yield from self.apps()):
            _, metadata = yield from self.metadata_of(proxy)
            account = yield from self.account_of(metadata)
            identifier = yield from self.typed(account, "VantorID", str, "VantorID")
            if identifier is None:
                identifier = yield from self.typed(metadata, "vantorId", str, "vantorID")
            if identifier is None or identifier in seen:
                continue
            if (yield from call("TSSupport.makeAccountInfo")):
                seen[identifier] = True
                shown.add((yield from self.fill_account(account, identifier)))
        yield from log("Returning accountInfo: {" + describe(sorted(shown)) + "}")
        return ANY

    def fill_account(self, account, identifier):
        person = yield from self.typed(account, "DSPersonID", (int, float), "DSPersonID")
        yield from call("TSMutableAccountInfo.setDSID", number=person)
        yield from call("TSMutableAccountInfo.setVantorID", identifier=identifier)
        other = yield from self.typed(account, "AltDSID", str, "AltDSID")
        yield from call("TSMutableAccountInfo.setAltDSID", identifier=other)
        return f"<TSMutableAccountInfo vantorID {identifier} DSID {describe(person)} altDSID {describe(other)}>"

    def on_disabledAssetTypes(self):
        if (yield from self.is_allowed("Installation")) or (yield from self.is_allowed("Removal")):
            return None
        return ["Application"]

    def on_prepareForBackup(self):
        yield from log("preparing for backup")
        for proxy in (yield from self.apps()):
            path, metadata = yield from self.metadata_of(proxy)
            if metadata and coordination.truth(metadata.get("is-auto-download")):
                del metadata["is-auto-download"]
                yield from log(f"clearing is-auto-download value for {describe(proxy.get('bundleIdentifier'))}")
                yield from files.write(path, metadata, files.XML)
        yield from log("finished preparing for backup")


def asset_of(app):
    return {"identifier": app, "dataclass": "Application", "isDownload": True, "isRestore": False, "storePID": 0,
            "completedAssetParts": 0, "downloadProgress": 0, "installProgress": 0, "object": ANY}
