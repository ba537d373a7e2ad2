"""The lists that the plug-in reads and writes."""

from witness.engine import ANY, Either, Message, call, complain, describe, log

ROOT = "/var/mobile/Library/ApplicationSync"
WORK = ROOT + "/HarluneStuff"
TODO = WORK + "/ApplicationsSync.plist"
LAST_SYNC = ROOT + "/LastSyncAppState.plist"
SORT_ORDER = ROOT + "/AssetSortOrder.plist"
ICONS = ROOT + "/Icons"
RESTORE_STATE = ROOT + "/RestoreState.plist"
PUBLIC = "/var/mobile/Media/PublicStaging"
STAGING = PUBLIC + "/ApplicationSync"
RESTORE_LIST = "/var/mobile/Media/HarluneRestore/RestoreApplications.plist"
RESTORE_LOG = "/var/mobile/Library/Logs/MediaServices/RestoreApplications.plist"
DEMOTED = "/var/mobile/Library/Preferences/com.vantor.Cellarum.DemotedApps.plist"
OWNER = {"FXFileOwnerAccountName": "mobile", "FXFileGroupOwnerAccountName": "mobile"}
BINARY, XML = "binary", "xml"
NO_PROPERTY_LIST = {("plist", 1), ("plist", 2)}


def is_path_component(value):
    return isinstance(value, str) and "/.." not in value


def parse(count):
    return (yield from call("PropertyListSerialization.propertyListWithData", bytes=count))


def read(path):
    """What a list file holds; nothing when it cannot be read or parsed."""
    size = (yield from call("FileSystem.readFile", path=path)).result
    if size is None:
        return None
    return (yield from parse(size)).result


def read_dictionary(path):
    value = yield from read(path)
    return value if isinstance(value, dict) else None


def write(path, value, form):
    data = yield from call("PropertyListSerialization.dataWithPropertyList", value=value, format=form)
    if data.result is None and form == XML:  # not every value has an XML form
        data = yield from call("PropertyListSerialization.dataWithPropertyList", value=value, format=BINARY)
    if data.result is not None:
        yield from call("FileSystem.writeAtomically", path=path, contents=data.result)
    return data.result is not None


def load_list(path):
    """Of the todo list and of that of the last sync."""
    size = (yield from call("FileSystem.readFile", path=path)).result
    if not size:
        return None
    value = (yield from parse(size)).result
    if value is None:
        yield from complain("couldn't parse todo list")
    elif not isinstance(value, list):
        yield from complain("todo list is not an array")
    else:
        return value
    return None


def first_entry(todo, app):
    return next((entry for entry in todo or [] if isinstance(entry, dict) and entry.get("identifier") == app), None)


def mark(app, word):
    todo = yield from load_list(TODO)
    entry = first_entry(todo, app)
    if entry is None:
        return
    yield from log(f"Changing {app} from {describe(entry.get('operation'))} to {word}")
    entry["operation"] = word
    yield from write(TODO, todo, BINARY)


def order(candidates):
    """The candidates in the order of the home screen; `candidates` loses those that stand there."""
    ordered = []
    port = (yield from call("HomeScreen.PNSPanelloBlockableServerPort")).result
    yield from call("HomeScreen.PNGetFlattenedIconState", port=port, form=1)
    wanted = None
    # Whether a buffer came with the answer is not in the journal.
    if (yield Either(Message("default", "8", "saved icon sort order"),
                     Message("default", "8", "got no icon sort order from PN"))).choice == 0:
        size = (yield from call("FileSystem.writeAtomically", path=SORT_ORDER, contents=ANY)).arguments["contents"]
        wanted = (yield from parse(size)).result
        yield from call("Process.deallocateMemory", length=size)
    for app in wanted if isinstance(wanted, (list, dict)) else []:
        if isinstance(app, str) and app in candidates:
            yield from log(f"prioritize {app}")
            ordered.append(candidates.pop(app))
    for app, candidate in candidates.items():
        yield from log(f"lastly {app}")
        ordered.append(candidate)
    return ordered


def stored_path(app, version):
    """Where the restore state says that the package of this version lies."""
    root = yield from read(RESTORE_STATE)
    for key in (app, version, "path"):
        root = root.get(key) if isinstance(root, dict) and key is not None else None
    return root


def clean_restore_state(app):
    size = (yield from call("FileSystem.readFile", path=RESTORE_STATE)).result
    if size is None:
        return
    parsed = yield from parse(size)
    root = parsed.result
    if isinstance(root, dict):
        root.pop(app, None)
    # What could not be read this time, or not by this reader, stays.
    is_none = root is None and parsed.error and (parsed.error["domain"], parsed.error["code"]) in NO_PROPERTY_LIST
    if is_none or root == {}:
        yield from call("FileSystem.removeItem", path=RESTORE_STATE)
    elif isinstance(root, dict):
        yield from write(RESTORE_STATE, root, XML)
