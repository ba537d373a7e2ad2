"""Installs, updates and removals through the install-coordination service."""

import re

from witness import files
from witness.engine import call, complain, describe, describe_error, log, some, step

SYNC, STORE = 3, 1


def reason(code):
    return {"domain": "TSError", "code": code}


def coordinator_text(app):
    return some(rf"<RV\w*AppInstallCoordinator ") + app + some(r" client \d+>")


def acquire(app, existing, create):
    """The coordinator or nothing, and the service's error."""
    yield from step(3, 1, True, app, "Create coordinator")
    kind, word = ("RVUpdatingAppInstallCoordinator", "updating") if existing else (
        "RVInitiatingAppInstallCoordinator", "initiating")
    found = yield from call("InstallCoordination.coordinatorForAppWithBundleID", kind=kind, bundleID=app,
                            clientID=SYNC, createIfNotExisting=create)
    coordinator = found.result
    if coordinator:
        creator = (yield from call("RVAppInstallCoordinator.creatorIdentifier")).result
        how = f"(createIfNotExisting:{create:d}, existingApp:{existing:d}"
        if creator == SYNC:
            yield from log(f"Created {word} coordinator {coordinator_text(app)} {how}) for {app} with error "
                           f"{describe_error(found.error)}")
        else:
            coordinator = None
            yield from log(f"RC returned {word} coordinator {coordinator_text(app)} {how}, creatorIdentifier={creator})"
                           f" for {app} with error {describe_error(found.error)} - Will not perform install/update for "
                           "this bundle")
    yield from step(3, 2, coordinator, app, "Finished creating coordinator")
    return coordinator, found.error


def cancel_coordinator(app, code):
    yield from call("RVAppInstallCoordinator.cancelForReason", reason=reason(code), client=SYNC)


def make_asset_promise(app, path):
    if path is None:
        made = yield from call("InstallCoordination.makePromisedTransferToPathWithoutPath", name=app + "-Asset",
                               client=SYNC, diskSpaceNeeded=0)
    else:
        made = yield from call("InstallCoordination.makePromisedTransferToPath", name=app + "-Asset", client=SYNC,
                               transferPath=path, diskSpaceNeeded=0)
    if not made.result:
        yield from complain(f"Error creating asset promise for '{app}'")
        return None
    attached = yield from call("RVAppInstallCoordinator.setAppAssetPromise", promise=made.result)
    if attached:
        yield from log(f"Added app asset promise to coordinator for '{app}'")
        return made.result
    yield from complain(f"Error {describe_error(attached.error)} adding app asset promise at {describe(path)} to "
                        f"'{app}'")
    yield from complain(f"Cancelling asset promise for '{app}'")
    yield from call("RVPromisedTransferToPath.cancelForReason", self=made.result, reason=reason(30), client=SYNC)
    return None


def fulfil(service, promise):
    yield from call(service + ".setPercentComplete", {"self": promise, "fraction": 1.0})
    yield from call(service + ".setComplete", {"self": promise, "complete": True})


def make_icon_promise(app, path, size, placeholder, for_install):
    if not placeholder:
        yield from complain(f"Placeholder to add icon promise is nil for '{app}'")
        return False
    promise = (yield from call("InstallCoordination.makePromisedTransferToPath", name=app + "-Icon", client=SYNC,
                               transferPath=path, diskSpaceNeeded=size)).result
    if not promise:
        return False
    yield from fulfil("RVPromisedTransferToPath", promise)
    attached = yield from call("RVPlaceholder.setIconPromise", promise=promise)
    if attached:
        yield from log(f"Added icon promise to placeholder for '{app}'")
        return True
    yield from complain(f"Error {describe_error(attached.error)} adding icon promise to placeholder for '{app}'")
    yield from call("RVPromisedTransferToPath.cancelForReason", {"self": promise}, reason=reason(30 if for_install else 29),
                    client=SYNC)
    return False


def make_placeholder(app, name, install_type):
    yield from step(4, 1, True, app, "Create placeholder")
    placeholder = (yield from call("InstallCoordination.makeAppPlaceholder", bundleName=name, bundleID=app,
                                   installType=install_type, client=SYNC)).result
    yield from step(4, 2, placeholder, app, "Finished creating placeholder")
    shown = f"<RVPlaceholder {app} type {install_type}>" if placeholder else "(null)"
    yield from log(f"Created placeholder {shown} for '{app}' of type {install_type}")
    return placeholder


def cancel_placeholder(code):
    yield from call("RVPlaceholder.cancelForReason", reason=reason(code), client=SYNC)


def placeholder_path(app):
    return (yield from call("Process.temporaryDirectory")).result + f"/com.vantor.tsd.Apps/{app}.app"


def create_placeholder_path(path, app):
    made = yield from call("FileSystem.createDirectory", path=path, withIntermediateDirectories=True,
                           attributes=files.OWNER)
    if not made or made.error:
        yield from call("InstallTransactionLog.logScenario", about=app, scenario="Harlune App Restore", step=0,
                        success=False, description="Failed to create app directory")
    yield from log(f"Created app directory for '{app}' at {path} with err={describe_error(made.error)}")
    return made


class Preparation:
    """Of one app, from its asset to the placeholder on the home screen."""

    def __init__(self, me, asset, existing):
        self.me, self.asset, self.existing = me, asset, existing
        self.app, self.error = asset["identifier"], None
        self.coordinator, self.placeholder, self.cancels_placeholder, self.metadata = None, None, False, None

    def ask(self, what, arguments=None, **more):
        """A call whose error is remembered."""
        answer = yield from call(what, arguments, **more)
        if answer.error:
            self.error = answer.error
        return answer

    def run(self):
        asset, app = self.asset, self.app
        self.manifest = yield from files.read_dictionary(asset["infoPlist"])
        self.store = yield from files.read_dictionary(asset["storePlist"])
        version = (asset.get("variantOptions") or {}).get("Version")
        yield from log(f"processing app install for bundle '{app}', title {describe(asset.get('prettyName'))} assetplist "
                       f"{describe(self.manifest)}, version {describe(version)} with install coordination", category="15")
        yield from step(1, 1, True, app, "Update app" if self.existing else "Install App")
        done = yield from self.prepare(version)
        yield from log(f"processing app install for bundle {app} finished with status {done:d} error "
                       f"{describe_error(self.error)}")
        yield from step(1, 2, done, app, "Install app")
        if not done:
            if self.placeholder and self.cancels_placeholder:
                yield from log(f"Cancelling placeholder for appBundleIdentifier:{app}")
                yield from cancel_placeholder(1)
            if self.coordinator:
                yield from log(f"Cancelling coordinator for appBundleIdentifier:{app}")
                yield from cancel_coordinator(app, 1)
        return done

    def prepare(self, version):
        app = self.app
        if not self.asset.get("prettyName") and not app:
            return False
        self.coordinator, error = yield from acquire(app, self.existing, True)
        self.error = error or self.error
        if not self.coordinator:
            return False
        yield from call("RVAppInstallCoordinator.setObserver", observer=self.me)
        if (yield from call("RVAppInstallCoordinator.hasInstallOptions")):
            yield from log(f"coordinator for {app} has install options")
        elif not (yield from self.set_options()):
            return False
        if (yield from call("RVAppInstallCoordinator.hasInitialZDRAssetPromises")):
            yield from log(f"coordinator for {app} has an ZDR app asset promise")
        else:
            answer = yield from self.ask("RVAppInstallCoordinator.setInitialZDRAssetPromises", count=0)
            if not answer:
                yield from complain(f"Error {describe_error(answer.error)} setting ZDR asset promise for '{app}'")
                return False
            yield from log(f"set ZDR asset promise to install coordinator for {app}")
        if (yield from call("RVAppInstallCoordinator.hasAppAssetPromise")):
            yield from log(f"coordinator for {app} has an app asset promise")
        else:
            if not (yield from make_asset_promise(app, None)):
                return False
        if (yield from call("RVAppInstallCoordinator.hasPlaceholderPromise")):
            yield from log(f"coordinator for {app} has a placeholder promise")
            return True
        icon, size = yield from self.place_icon()
        yield from self.configure(icon, size, version)
        answer = yield from self.ask("RVAppInstallCoordinator.setPlaceholderPromise", placeholder=self.placeholder)
        if answer:
            yield from log(f"added placeholder promise to coordinator for {app}")
            return True
        yield from complain(f"Error {describe_error(answer.error)} adding placeholder promise to coordinator for '{app}'")
        self.cancels_placeholder = True
        return False

    def set_options(self):
        app = self.app
        self.metadata = (yield from call("Installer.makeStoreMetadata", dictionary=self.store)).result
        options = (yield from call("Installer.makeInstallOptions")).result
        if options:
            yield from call("CVInstallOptions.setHarluneMetadata", metadata=self.metadata)
            yield from call("CVInstallOptions.setObInstallType", type=4)
            yield from call("CVInstallOptions.setInstallTargetType", type=1)
        answer = yield from self.ask("RVAppInstallCoordinator.setInstallOptions", options=options)
        if answer:
            yield from log(f"set install options on coordinator for {app}")
            return True
        yield from complain(f"Error {describe_error(answer.error)} setting install options on coordinator for '{app}'")
        return False

    def place_icon(self):
        """Where the icon lies and its size; 0 for none."""
        app = self.app
        directory = yield from placeholder_path(app)
        made = yield from create_placeholder_path(directory, app)
        path = directory + "/Icon.png"
        if not made or self.asset.get("icon") is None:
            return path, 0
        yield from step(5, 1, True, app, "Copying icon")
        size, source = 0, self.asset["icon"]
        copied = yield from self.ask("FileSystem.copyItem", {"from": source, "to": path})
        error = copied.error
        if copied:
            attributes = yield from self.ask("FileSystem.attributesOfItem", path=path)
            error = attributes.error or error
            if attributes.result and not attributes.error:
                size = attributes.result["size"]
            yield from log(f"icon for {app} at {path} has a size of {size}")
        yield from log(f"Copied icon from {source} to {path} with error {describe_error(error)} for '{app}', "
                       f"sizeOnDisk:{size}")
        yield from step(5, 2, True, app, "Copying icon")
        return path, size

    def configure(self, icon, size, version):
        app = self.app
        name = self.asset.get("prettyName")
        self.placeholder = yield from make_placeholder(app, app if name is None else name, 4)
        if not self.placeholder:
            return
        if size:
            if not (yield from make_icon_promise(app, icon, size, self.placeholder, True)):
                return
        attributes = (yield from call("InstallCoordination.makePlaceholderAttributesWithInfoPlistDictionary",
                                      manifest=self.manifest)).result
        prohibited = (self.manifest or {}).get("OBApplicationLaunchProhibited")
        yield from set_attributes(attributes, prohibited, version)
        answer = yield from self.ask("RVPlaceholder.setPlaceholderAttributes", attributes=attributes)
        if not answer:
            yield from complain(f"Error {describe_error(answer.error)} setting attributes on placeholder for '{app}'")
            return
        yield from log(f"set {attributes_text(version)} attributes on placeholder for {app}")
        answer = yield from self.ask("RVPlaceholder.setMetadata", metadata=self.metadata)
        if not answer:
            yield from complain(f"Error {describe_error(answer.error)} setting store metadata on placeholder for '{app}'")
            return
        yield from log(f"set store metadata on placeholder for {app}")
        answer = yield from self.ask("RVPlaceholder.setConfigurationCompleteWithError")
        if answer:
            yield from log(f"set placeholder configuration as complete for {app}")
        else:
            yield from complain(f"Error {describe_error(answer.error)} setting placeholder configuration as complete for "
                                f"'{app}'")


def truth(value):
    """The boolean value of an entry: a number is true unless it is 0, and a text is false."""
    return bool(value) if isinstance(value, (bool, int, float)) else False


def set_attributes(attributes, prohibited, version):
    if attributes:
        yield from call("RVPlaceholderAttributes.setLaunchProhibited", prohibited=truth(prohibited))
        yield from call("RVPlaceholderAttributes.setBundleVersion", version=version)


def attributes_text(version):
    """Without a version where setting it was made to fail."""
    return some(rf"<RVPlaceholderAttributes version ({re.escape(describe(version))}|\(null\))>")


def update_progress(asset, existing):
    app = asset["identifier"]
    coordinator, _ = yield from acquire(app, existing, False)
    if not coordinator or (yield from call("RVAppInstallCoordinator.error")).result:
        return
    promise = (yield from call("RVAppInstallCoordinator.appAssetPromiseWithError")).result
    if promise and (yield from call("RVPromisedTransferToPath.isComplete", {"self": promise})):
        yield from log(f"Asset promise is already satisfied for {app}")
        return
    if not promise:
        promise = yield from make_asset_promise(app, asset.get("path"))
    yield from log(f"Updating download progress: {asset['downloadProgress']:f} install progress:"
                   f"{asset['installProgress']:f} for {app}")
    if promise:
        yield from call("RVPromisedTransferToPath.setPercentComplete", {"self": promise},
                        fraction=asset["downloadProgress"])


def complete_transfer(asset, error, existing):
    app, path = asset["identifier"], asset.get("path")
    coordinator, _ = yield from acquire(app, existing, False)
    if not coordinator or (yield from call("RVAppInstallCoordinator.error")).result:
        return
    if error:
        made = yield from call("InstallCoordination.RVCreateUserPresentableError", code=1, second=0, underlying=error)
        yield from call("RVAppInstallCoordinator.cancelForReason", reason=made.result, client=SYNC)
        return
    promise = (yield from call("RVAppInstallCoordinator.appAssetPromiseWithError")).result
    if promise and (yield from call("RVPromisedTransferToPath.isComplete", {"self": promise})):
        yield from log(f"Asset promise is already satisfied for {app}")
        return
    if promise:
        yield from call("RVPromisedTransferToPath.setTransferPath", {"self": promise}, path=path)
    else:
        promise = yield from make_asset_promise(app, path)
    yield from log(f"Satisfying asset promise for {app}")
    if promise:
        yield from fulfil("RVPromisedTransferToPath", promise)


def finish_sync(success, outstanding):
    for app in outstanding:
        found = yield from call("InstallCoordination.coordinatorForAppWithBundleID", kind="RVAppInstallCoordinator",
                                bundleID=app, clientID=SYNC, createIfNotExisting=False)
        if found.result and not success:
            yield from log(f"Cancelling coordinator with error {describe_error(reason(30))} for {app}")
            yield from cancel_coordinator(app, 30)


def uninstall(app):
    yield from step(7, 1, True, app, "Uninstall app")
    yield from call("InstallCoordination.uninstallAppWithBundleID", bundleID=app, requestUserConfirmation=False)
