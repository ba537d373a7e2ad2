"""Which packages are asked for, and what comes of them."""

from witness import coordination, files
from witness.engine import ANY, Either, Message, call, complain, describe, describe_error, log

TYPES = ["None", "StoreDownload", "Restore", "AutomaticDownload", "Sync", "AutomaticUpdate", "Migration", "Downgrade"]
STATES = ["Waiting", "Active", "Paused", "Canceled", "Failed", "Finished"]
PHASES = ["Loading", "Installing", "RestoringData", "InstallingPlaceholder"]


def named(kind, names, number):
    return f"OBInstall{kind}{names[number]}" if number < len(names) else f"Unknown Install {kind}: {number}"


def is_placeholder_app(proxy):
    return "applicationIdentifier" in proxy and proxy["appState.isPlaceholder"]


def is_true(value):
    return value in (True, 1)


class Query:
    """What the registry has under way, by its first report."""

    def __init__(self):
        self.observer, self.in_progress, self.restoring = None, None, None

    def ask(self):
        added = yield from call("OBApplicationWorkspace.addObserver", observer=ANY)
        self.observer = added.arguments["observer"]
        yield from log("Waiting for -applicationInstallsArePrioritized:arePaused: to complete...")
        # A report is not waited for longer than the clock says; what is known then tells which it was.
        yield from self.end_of_wait()
        yield from call("OBApplicationWorkspace.removeObserver", observer=self.observer)

    def end_of_wait(self):
        answer = yield Either(Message("default", "8", "Wait completed"),
                              Message("error", "8", "Query for in progress assets timed out"))
        if answer.choice == 0:
            assert self.in_progress is not None, "it was completed by no report"
        else:
            self.in_progress = self.restoring = None

    def report(self, prioritized, paused):
        yield from log(f"prioritized proxies {proxies_text(prioritized)} paused proxies {proxies_text(paused)}",
                       category="15")
        if self.in_progress is not None:
            return
        in_progress, restoring = [], []
        if not prioritized:
            yield from log("No assets currently in progress.")
        for proxy in prioritized:
            app = proxy.get("applicationIdentifier")
            if not proxy["isPlaceholder"]:
                yield from log(f"No placeholder for asset identifier {describe(app)}")
                continue
            if "installState" not in proxy:
                yield from log(f"No install progress found for asset identifier {describe(app)}")
                continue
            type_, state, phase = proxy["installType"], proxy["installState"], proxy["installPhase"]
            yield from log(f"Got install type={named('Type', TYPES, type_)} state={named('State', STATES, state)} "
                           f"phase={named('Phase', PHASES, phase)} for {describe(app)}")
            if state == 1 and (type_ != 2 and phase == 1 or type_ == 1 and phase == 0):
                in_progress.append(app)
            elif state == 1 and type_ == 2 and phase in (0, 1):
                restoring.append(app)
        self.in_progress, self.restoring = in_progress, restoring
        yield from log("signaling semaphore")


def proxies_text(proxies):
    def text(proxy):
        return f"<OBApplicationProxy {describe(proxy.get('applicationIdentifier'))}" + (
            " placeholder>" if proxy["isPlaceholder"] else ">")
    return "(" + ", ".join(map(text, proxies)) + ")"


def candidate_text(candidate):
    names = ["KBBundleIdentifier", "KBBundleVersion", "Container", "Path", "NameFromHarlune", "IsRestore",
             "intentional_demoted_app", "auto_demoted_app", "system_app"]
    return describe({name: candidate[name] for name in names if candidate.get(name) is not None})


def candidates_text(candidates):
    return "{" + "; ".join(f"{app} = {candidate_text(each)}" for app, each in candidates.items()) + "}"


def candidate_of_placeholder(proxy):
    return {"KBBundleVersion": proxy.get("bundleVersion"), "KBBundleIdentifier": proxy.get("bundleIdentifier"),
            "Container": proxy.get("bundleContainerURL"), "IsRestore": proxy["installType"] == 2,
            "intentional_demoted_app": proxy["installType"] == 8, "auto_demoted_app": proxy["installType"] == 7,
            "system_app": proxy.get("applicationType") == "System", "Path": proxy.get("bundleURL")}


def candidate_of_request(entry):
    app = entry["identifier"]
    folder = f"{files.WORK}/{app}"

    def text(key):
        return entry[key] if isinstance(entry.get(key), str) else None
    return {"Path": folder, "KBBundleIdentifier": app, "Container": folder, "KBBundleVersion": text("version"),
            "NameFromHarlune": text("name"), "IsRestore": False, "intentional_demoted_app": False,
            "auto_demoted_app": False, "system_app": False}


def system_placeholders():
    bundles = (yield from call("OBApplicationWorkspace.enumerateBundlesOfType", type=7)).result or []
    found = dict.fromkeys(each["bundleIdentifier"] for each in bundles
                          if is_placeholder_app(each) and "bundleIdentifier" in each)
    yield from log("SystemAppPlaceholders {" + describe(list(found)) + "}")
    return found


def placeholders():
    bundles = (yield from call("OBApplicationWorkspace.enumerateBundlesOfType", type=0)).result or []
    return [each for each in bundles if is_placeholder_app(each)]


def make_icon(bundle_path, target):
    if bundle_path is None:
        yield from complain("missing bundlePath")
        return False
    url = (yield from call("IconRenderer.KBURLCreateWithFileSystemPath", path=bundle_path, isDirectory=True)).result
    if not url:
        yield from complain("couldn't create URL")
        return False
    bundle = (yield from call("IconRenderer.KBBundleCreate", url=url)).result
    if not bundle:
        yield from complain("couldn't create bundle from URL")
        return False
    image = (yield from call("IconRenderer.GYCreateDeviceAppropriateHomeScreenIconImageFromBundle", bundle=bundle)).result
    if not image:
        yield from complain("couldn't create PN icon from bundle")
        return False
    destination = (yield from call("ImageEncoder.QGImageDestinationCreateWithData", type="public.png", count=1)).result
    if not destination:
        yield from complain("couldn't create image")
        return False
    yield from call("QGImageDestination.QGImageDestinationAddImage", image=image)
    if not (yield from call("QGImageDestination.QGImageDestinationFinalize")):
        yield from complain("Couldn't finalize image")
        return False
    if not (yield from call("FileSystem.writeAtomically", path=target, contents=ANY)):
        yield from complain(f"Couldn't save image file to {target}")
        return False
    return True


class Outstanding:
    """The packages that the host must still send."""

    def __init__(self, client):
        self.client, self.assets = client, []

    def run(self):
        allowed = yield from self.client.is_allowed("Installation")
        todo = yield from files.load_list(files.TODO)
        yield from log(f"outstandingAssetTransfers starting with todoList {describe(todo)}", category="15")
        self.requested = set()
        self.system = yield from system_placeholders()
        existing = {}
        for proxy in (yield from placeholders()):
            existing[proxy["applicationIdentifier"]] = candidate_of_placeholder(proxy)
        wanted = dict(existing)
        yield from log(f"outstandingAssetTransfers preExistingPlaceHolders {candidates_text(existing)}, idsWeWant "
                       f"{candidates_text(wanted)}", category="15")
        yield from self.take_requests(todo, wanted)
        yield from self.leave_out(wanted)
        ordered = yield from files.order(wanted)
        yield from call("FileSystem.removeItem", path=files.ICONS)
        made = yield from call("FileSystem.createDirectory", path=files.ICONS, withIntermediateDirectories=False)
        if not made:
            yield from complain(f"Can't create icon scratch dir! {describe_error(made.error)}")
        for candidate in ordered:
            if (yield from self.is_to_be_sent(candidate, allowed)):
                yield from self.request(candidate)
        return self.assets

    def take_requests(self, todo, wanted):
        for entry in todo or []:
            if not isinstance(entry, dict) or entry.get("operation") != "install":
                continue
            app = entry.get("identifier")
            if not files.is_path_component(app):
                yield from log(f"Ignoring invalid path: {describe(app)}")
                continue
            self.requested.add(app)
            if app in wanted:
                yield from log(f"{app} already has a placeholder - skipping")
            else:
                wanted[app] = candidate_of_request(entry)

    def leave_out(self, wanted):
        self.client.query = query = Query()
        yield from query.ask()
        self.client.query = None
        if query.in_progress is None:
            yield from complain("Failed to get list of assets already in progress!")
        else:
            yield from log(f"Assets already in progress (not returning these): {describe(query.in_progress)}")
            for app in query.in_progress:
                wanted.pop(app, None)
        if query.restoring is None:
            yield from complain("Failed to get list of assets currently restoring!")
        else:
            yield from log(f"Assets currently restoring: {describe(query.restoring)}")

    def is_to_be_sent(self, candidate, allowed):
        app = candidate["KBBundleIdentifier"]
        by_hand, automatically = candidate["intentional_demoted_app"], candidate["auto_demoted_app"]
        demotion = f"{app} is currenlty demoted (manual:{by_hand:d}, auto:{automatically:d}) - "
        if not candidate["IsRestore"] and not allowed:
            text = f"skipping {app} - its not a restore and app installation is disabled"
        elif candidate["IsRestore"]:
            text = f"{app} is currenlty marked to be restored and will be handled by tillerd - skipping"
        elif candidate["system_app"]:
            text = f"{app} is auto demoted: {automatically:d}, manual demoted: {by_hand:d}, system app:1 - skipping"
        elif app in self.system:
            text = f"{app} is system app placeholder - skipping"
        elif (by_hand or automatically) and app not in self.requested:
            text = demotion + "skipping"
        else:
            if by_hand or automatically:
                yield from log(demotion + "but will be installed as it's requested by client")
            return True
        yield from log(text)
        return False

    def request(self, candidate):
        app, version, path = candidate["KBBundleIdentifier"], candidate["KBBundleVersion"], candidate["Path"]
        info = (yield from call("Process.infoDictionaryOfBundleAtPath", path=path)).result
        name = info.get("KBBundleDisplayName") if isinstance(info, dict) else None
        name = next(each for each in (name, candidate.get("NameFromHarlune"), app) if isinstance(each, str))
        icon = f"{files.ICONS}/{app}.png"
        if not (yield from make_icon(path, icon)):
            icon = f"{describe(candidate['Container'])}/HarluneArtwork"
        stored = yield from files.stored_path(app, version)
        if isinstance(stored, str):
            if (yield from call("FileSystem.fileExists", path=stored)):
                yield from log(f"Recovered download path for {app} at {stored}")
            else:
                yield from log(f"Download path recovered for {app} but the file is missing: {stored}")
        asset = {"identifier": app, "dataclass": "Application", "prettyName": name, "assetType": "Application",
                 "isDownload": True, "isRestore": False, "icon": icon, "infoPlist": f"{path}/Info.plist",
                 "storePlist": f"{describe(candidate['Container'])}/HarluneMetadata.plist", "storePID": 0,
                 "variantOptions": {"AssetParts": 1, **({} if version is None else {"Version": version})},
                 "completedAssetParts": 0, "downloadProgress": 0, "installProgress": 0}
        yield from log(f"Asset {app} (pretty={name}, version={describe(version)}) prepped with icon {icon}, at {path}, meta "
                       f"at {asset['storePlist']}, info at {asset['infoPlist']}, storePid=0, isRestore=n")
        proxy = (yield from call("OBApplicationWorkspace.applicationProxyForIdentifier", bundleIdentifier=app,
                                 placeholder=False)).result
        exists = bool(proxy) and proxy["isInstalled"] and not proxy["isPlaceholder"]
        if exists:
            yield from log(f"App {app} is already installed and will be updated.")
        if (yield from coordination.Preparation(self.client.me, asset, exists).run()):
            self.assets.append(asset)
            if exists:
                self.client.updating[app] = True
        else:
            yield from complain(f"Not requesting app asset for {app}")
            yield from files.mark(app, "FAILED")


def asset_text(asset, path):
    return (f"<TSAsset {asset['identifier']} {'download' if asset['isDownload'] else 'no download'}"
            f"{' restore' if asset['isRestore'] else ''}{f' path {path}' if path is not None else ''}>")


def progress(client, asset, fraction):
    app = asset["identifier"]
    yield from log(f"finished transferring {fraction:f} for {app}")
    yield from coordination.update_progress(asset, app in client.updating)
    client.outstanding[app] = True


def completion(client, asset, succeeded, error):
    app, path = asset["identifier"], asset.get("path")
    existing = client.updating.pop(app, False)
    was_cancelled = client.cancelled.pop(app, False)
    client.outstanding.pop(app, None)
    yield from log(f"transfer for asset {asset_text(asset, path)} ended with success {'y' if succeeded else 'n'} error "
                   f"{describe_error(error)} existingApp:{existing:d}")
    if not succeeded:
        yield from failed_transfer(asset, error, existing, was_cancelled)
        return
    yield from log(f"asset transfer succeeded for {app}")
    if path is None:
        path = yield from files.stored_path(app, (asset.get("variantOptions") or {}).get("Version"))
    elif not path.startswith("/"):
        path = f"{files.PUBLIC}/{path}"
    if not files.is_path_component(path):
        yield from log(f"Ignoring invalid path: {describe(path)}")
        return
    if not asset["isDownload"]:
        yield from files.mark(app, "SENT")
        return
    yield from log(f"Received file at {path}")
    yield from files.mark(app, "DOWNLOADED")
    if not asset["isRestore"]:
        yield from log(f"Installing synced asset {asset_text(asset, path)}")
        yield from coordination.complete_transfer({**asset, "path": path}, None, existing)
    elif asset["completedAssetParts"] == 2:
        yield from log(f"Not processing kTSAssetPartApplicationData for restore asset {asset_text(asset, path)} as "
                       "coordination is enabled")
    else:
        yield from log(f"Not processing restore asset {asset_text(asset, path)} as coordination is enabled")


def is_recoverable(error):
    yield from log(f"Ravelle is enabled - treating error {describe_error(error)} as non recoverable")
    return False


def failed_transfer(asset, error, existing, was_cancelled):
    app = asset["identifier"]
    recoverable = yield from is_recoverable(error)
    yield from log(f"failed to transfer asset {app}. err={describe_error(error)}, recoverable={recoverable:d}")
    if not (yield from call("OBApplicationWorkspace.applicationIsInstalled", bundleIdentifier=app)):
        return
    if asset["isRestore"]:
        return
    yield from log(f"Uninstalling placeholder {app}")
    if not was_cancelled:
        yield from coordination.complete_transfer(asset, error or coordination.reason(30), existing)


def install_succeeded(asset):
    app = asset["identifier"]
    yield from log(f"{app} install succeeded")
    yield from files.mark(app, "INSTALLED")
    yield from files.clean_restore_state(app)


def install_failed(asset, error):
    app = asset["identifier"]
    recoverable = yield from is_recoverable(error)
    if recoverable or asset["isRestore"]:
        yield from log(f"{app} install failed but was recoverable: {describe_error(error)}")
        yield from call("InstallTransactionLog.logScenario", about=app, scenario="Orrin restore", step=0,
                        success=False, description="install failed recoverably")
    else:
        yield from log(f"{app} install failed unrecoverably: {describe_error(error)}")
        yield from files.mark(app, "FAILED")
        yield from coordination.uninstall(app)
    yield from files.clean_restore_state(app)
