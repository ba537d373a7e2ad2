"""Apps that come back from a backup."""

from witness import coordination, files
from witness.coordination import SYNC, STORE, cancel_coordinator, cancel_placeholder
from witness.engine import ANY, Either, Message, call, complain, describe, describe_error, log, step


def reconcile(client, type_):
    yield from log(f"reconcileRestoreOfType {type_}")
    yield from client.notify(True)
    yield from call("FileSystem.createDirectory", path=files.ROOT, withIntermediateDirectories=True)
    if type_ in (2, 3):
        answer = (yield from call("CLManager.tessaroShouldCreateAppPlaceholdersWithError")) if client.manager else None
        if answer:
            yield from process_list(client)
        else:
            yield from log(f"Will not reconcile restore of type {type_} - error "
                           f"{describe_error(answer.error if client.manager else None)}")
    return True


def process_list(client):
    if not (yield from call("FileSystem.fileExists", path=files.RESTORE_LIST)):
        yield from log("no harlune restore plist found - skipping processing of harlune restored apps")
        return
    read = yield from call("FileSystem.readFile", path=files.RESTORE_LIST)
    if read.result is None:
        yield from log(f"failed to read harlune app restore info. err={describe_error(read.error)}")
    else:
        yield from log("processing harlune restore info")
        parsed = yield from files.parse(read.result)
        if isinstance(parsed.result, dict):
            yield from restore_apps(client, parsed.result)
        elif parsed.result is None:
            yield from log(f"failed to parse harlune app restore info. err={describe_error(parsed.error)}")
        else:
            yield Either(Message("default", "8", "failed to parse harlune app restore info. err=\x01.*\x02"))
    yield from call("FileSystem.removeItem", path=files.RESTORE_LOG)
    moved = yield from call("FileSystem.moveItem", {"from": files.RESTORE_LIST, "to": files.RESTORE_LOG})
    if not moved:
        yield from log(f"failed to copy harlune metadata. err={describe_error(moved.error)}")


def load_demoted():
    size = (yield from call("FileSystem.readFile", path=files.DEMOTED)).result
    if not size:
        return None
    value = (yield from files.parse(size)).result
    if value is None:
        yield from complain("couldn't parse demoted apps list")
    elif not isinstance(value, dict):
        yield from complain("demoted apps list is not a dictionary")
    else:
        return value
    return None


def restore_apps(client, apps):
    demoted = yield from load_demoted()

    def holds(key, app):
        members = (demoted or {}).get(key)
        return isinstance(members, list) and app in members
    yield from log(f"Demoted Apps: {describe(demoted)}", category="15")
    for app, entry in apps.items():
        status = 2 if holds("AutomaticDowngrades", app) else 1 if holds("IntentionalDowngrades", app) else 0
        yield from log(f"processing harlune restore info for '{app}' demotionStatus :{status}")
        if not isinstance(entry, dict):
            yield from log(f"no harlune restore info for '{app}' - skipping")
        elif not isinstance(entry.get("HarluneMetadata"), int):
            yield from log(f"no HarluneMetadata for '{app}' - ignoring")
        else:
            yield from RestoredApp(client, app, entry, status).run()
    count = len(client.awaited)
    yield from log(f"Will wait for {count * 5} seconds for {count} placeholders to install")
    yield from log("Finished waiting for placeholder installs")
    client.has_finished_waiting = True


class RestoredApp:
    def __init__(self, client, app, entry, status):
        self.client, self.app, self.status = client, app, status
        self.metadata_size = entry["HarluneMetadata"]
        self.rights, self.icon = entry.get("ApplicationSINF"), entry.get("PlaceholderIcon")
        self.coordinator, self.placeholder, self.error = None, None, None

    def run(self):
        app = self.app
        demoted = self.status != 0
        description = "Restore demoted app" if demoted else "Restore app"
        yield from log(f"processing app restore for {'demoted' if demoted else 'non demoted'} bundle '{app}' with install "
                       "coordination")
        yield from step(2, 1, True, app, description)
        done = yield from self.prepare()
        if done is None:  # in the store's hands already
            yield from step(2, 2, True, app, description)
            return
        yield from log(f"processing app restore for {'demoted app ' if demoted else ''}{app} finished with status {done:d} "
                       f"error {describe_error(self.error)}")
        yield from step(2, 2, done, app, description)
        if done:
            return
        if self.coordinator:
            yield from log(f"Cancelling coordinator for appBundleIdentifier:{app}")
            yield from cancel_coordinator(app, 29)
        if self.placeholder:
            yield from log(f"Cancelling placeholder for appBundleIdentifier:{app}")
            yield from cancel_placeholder(29)
        if self.client.awaited.pop(app, None):
            yield from log(f"Shiftwell cancelled coordinator for restoring app bundle {app} _restoringPlaceholderCount "
                           f"{len(self.client.awaited)}")

    def ask(self, what, arguments=None, **more):
        answer = yield from call(what, arguments, **more)
        self.error = None if answer else answer.error
        return answer

    def prepare(self):
        app = self.app
        parsed = yield from files.parse(self.metadata_size)
        self.metadata = parsed.result
        if not isinstance(self.metadata, dict):
            if parsed.result is None:
                yield from complain(f"failed to parse harlune metadata for '{app}'. err={describe_error(parsed.error)}")
                self.error = parsed.error
            else:
                yield Message("error", "8", f"failed to parse harlune metadata for '{app}'. err=\x01.*\x02")
            return False
        kind = "RVRestoringDemotedAppInstallCoordinator" if self.status else "RVRestoringAppInstallCoordinator"
        found = yield from call("InstallCoordination.coordinatorForAppWithBundleID", kind=kind, bundleID=app, clientID=SYNC,
                                createIfNotExisting=True)
        self.coordinator = found.result
        if not self.coordinator:
            self.error = found.error
            yield from complain(f"Error {describe_error(found.error)} creating restore coordinator for {app}")
            return False
        if not self.status:
            client = (yield from call("RVAppInstallCoordinator.appAssetPromiseResponsibleClientWithError")).result
            if client == STORE:
                yield from log(f"App asset DRI for {app} is set to {STORE} - nothing more for tsd to do")
                return None
        yield from call("RVAppInstallCoordinator.setObserver", observer=self.client.me)
        if not (yield from self.promise_user_data()) or not (yield from self.promise_placeholder()):
            return False
        if self.status:
            return True
        answer = yield from self.ask("RVAppInstallCoordinator.setAppAssetPromiseResponsibleClient", client=STORE)
        if answer:
            yield from log(f"set RVClientMercato to satisfy app asset promise for {app}")
        else:
            yield from complain(f"Error {describe_error(answer.error)} setting RVClientMercato to satisfy app data promise "
                                f"for '{app}'")
        return bool(answer)

    def promise_user_data(self):
        app = self.app
        if (yield from call("RVAppInstallCoordinator.hasUserDataPromise")):
            yield from log(f"Coordinator for {app} has a valid user data promise")
            return True
        promise = (yield from call("InstallCoordination.makePromisedOutOfBandTransfer", name=app + "-UserData", client=SYNC,
                                   diskSpaceNeeded=0)).result
        if not promise:
            return True
        yield from coordination.fulfil("RVPromisedOutOfBandTransfer", promise)
        answer = yield from self.ask("RVAppInstallCoordinator.setUserDataPromise", promise=promise)
        if answer:
            yield from log(f"Added out of band user data promise for for {app}")
        else:
            yield from complain(f"Error {describe_error(answer.error)} adding out of band data promise for '{app}'")
        return bool(answer)

    def promise_placeholder(self):
        app, client = self.app, self.client
        if (yield from call("RVAppInstallCoordinator.hasPlaceholderPromise")):
            yield from log(f"Coordinator for {app} has a valid placeholder promise")
            return True
        placeholder = yield from self.build_placeholder()
        if not placeholder:
            return False
        answer = yield from self.ask("RVAppInstallCoordinator.setPlaceholderPromise", placeholder=placeholder)
        if not answer:
            self.placeholder = placeholder
            yield from complain(f"Error {describe_error(answer.error)} setting placeholder promise for '{app}'")
            return False
        if app not in client.awaited:
            client.awaited[app] = True
            yield from log(f"Shiftwell will wait for RC to install placeholder for {app}, _restoringPlaceholderCount "
                           f"{len(client.awaited)}")
        yield from log(f"added placeholder promise for {app}")
        return True

    def build_placeholder(self):
        app, metadata = self.app, self.metadata
        name = next(each for each in (metadata.get("title"), metadata.get("itemName"), app) if isinstance(each, str))
        directory = yield from coordination.placeholder_path(app)
        made = yield from coordination.create_placeholder_path(directory, app)
        if not made:
            return None
        icon = directory + "/Icon.png"
        size = yield from self.write_icon(icon)
        placeholder = yield from coordination.make_placeholder(app, name, {1: 8, 2: 7}.get(self.status, 2))
        if not placeholder:
            return None
        if size:
            attached = yield from coordination.make_icon_promise(app, icon, size, placeholder, False)
        else:
            attached = True
        if not attached or not (yield from self.configure(placeholder)):
            yield from cancel_placeholder(29)
            return None
        return placeholder

    def configure(self, placeholder):
        app, metadata = self.app, self.metadata
        version = metadata.get("bundleVersion") if isinstance(metadata.get("bundleVersion"), str) else None
        prohibited = metadata.get("OBApplicationLaunchProhibited", metadata.get("launchProhibited"))
        attributes = (yield from call("InstallCoordination.makePlaceholderAttributes")).result
        yield from coordination.set_attributes(attributes, prohibited, version)
        shown = coordination.attributes_text(version)
        if not (yield from self.set_piece("setPlaceholderAttributes", {"attributes": attributes},
                                          "setting placeholder attributes", f"set {shown} placeholder attributes for {app}")):
            return False
        store = (yield from call("Installer.makeStoreMetadata", dictionary=metadata)).result
        if not (yield from self.set_piece("setMetadata", {"metadata": store}, "setting store metadata",
                                          f"set store metadata on placeholder for {app}")):
            return False
        if self.rights is not None and not (yield from self.set_piece(
                "setSinfData", {"data": self.rights}, "setting SINF data", f"set SINF data on placeholder for {app}")):
            return False
        return (yield from self.set_piece("setConfigurationCompleteWithError", {},
                                          "setting placeholder configuration as complete",
                                          f"set placeholder configuration complete for {app}"))

    def set_piece(self, operation, arguments, what, success):
        answer = yield from call("RVPlaceholder." + operation, arguments)
        if answer:
            yield from log(success)
        else:
            yield from complain(f"Error {describe_error(answer.error)} {what} for '{self.app}'")
        return bool(answer)

    def write_icon(self, path):
        app = self.app
        if self.icon is None:
            yield from complain(f"no icon data for '{app}'")
            return 0
        created = yield from call("FileSystem.createFile", path=path, contents=self.icon, attributes=files.OWNER)
        size = 0
        if created:
            attributes = yield from call("FileSystem.attributesOfItem", path=path)
            if attributes.result and not attributes.error:
                size = attributes.result["size"]
        yield from log(f"icon data for '{app}' was writen to {path} with status:{bool(created):d} fileSize:{size}")
        return size
