#!/usr/bin/env python3
"""Which folder may include what. Run from anywhere; prints each violation and ends with 1 when there is one."""

import pathlib
import re
import sys

ROOT = pathlib.Path(__file__).resolve().parent.parent

# Folder: what its files may include by a path in quotes (a folder with a slash at its end, or one file).
PLUGIN = ["platform/", "core/"]
ALLOWED = {
    "platform": ["platform/"],
    "core": ["platform/", "core/"],
    "transfer": PLUGIN + ["transfer/"],
    "coordination": PLUGIN + ["coordination/"],
    "restore": PLUGIN + ["restore/"],
    "placeholder": PLUGIN + ["placeholder/"],
    "plist": ["platform/", "plist/"],
    "record": ["platform/", "plist/", "record/"],
    "contract": ["platform/", "contract/"],
}
# The rooms of a folder, each of which may also include the rooms before it; the folder's own files come last, but for
# the headers named here, which stand below all rooms.
ROOMS = {
    "device": {
        "may": ["platform/", "plist/"],
        "headers": ["DeviceErrors.h", "DeviceStatus.h"],
        "rooms": ["events", "files", "store", "boundary", "records", "package", "reports", "install", "coordination",
                  "services", "screen"],
    },
    "tsd": {
        "may": ["platform/", "plist/", "device/", "record/"],
        "headers": ["CommandError.h", "CommonOptions.h", "ExitCode.h", "OptionTable.h", "StartThread.h"],
        "rooms": ["terminal", "conduit", "host", "picture", "sample", "help", "history", "report", "stopping",
                  "daemon", "sync", "command"],
    },
}
for _folder, _house in ROOMS.items():
    _seen = _house["may"] + [f"{_folder}/{header}" for header in _house["headers"]]
    for _room in _house["rooms"]:
        _seen = _seen + [f"{_folder}/{_room}/"]
        ALLOWED[f"{_folder}/{_room}"] = _seen
    ALLOWED[_folder] = _seen + [f"{_folder}/"]
# What is built for testing may include everything of the product, but not one another's; and of the plug-in nothing,
# which is loaded. Benchmarks measure what it is made of.
AROUND = ["platform/", "plist/", "device/", "record/", "tsd/", "contract/", "tests/"]
ALLOWED |= {"tests": AROUND, "fuzz": AROUND + ["fuzz/"], "bench": AROUND + ["core/", "bench/"]}
# Folders that may use the operating system's own headers; the others use the standard library alone.
SYSTEM = ["device", "record", "tsd", "tests", "fuzz", "bench"]
# Library header: the folders that may include it.
LIBRARIES = {
    r"zstd\.h": ["record", "tests", "fuzz"],
    r"expat\.h": ["plist", "bench"],
    r"sqlite3\.h": ["device", "tests"],
    r"archive(_entry)?\.h": ["device", "tsd", "tests"],
    r"cairo(-svg)?\.h": ["device", "tsd", "tests", "bench"],
    r"pango/.*": ["tsd"],
    r"glib\.h": ["tsd"],
    r"nlohmann/.*": ["device", "tsd"],
    r"CLI/.*": ["tsd"],
    r"gtest/gtest(-spi)?\.h": ["contract", "tests"],
    r"benchmark/benchmark\.h": ["bench"],
}
# These take so long to compile that one source file of the product includes each.
ONCE = ["nlohmann/", "CLI/"]

STANDARD = re.compile(r"[a-z_0-9]+")
SYSTEM_HEADER = re.compile(r"((sys|linux)/)?[a-z_0-9]+\.h")
INCLUDE = re.compile(r'^\s*#\s*include\s*([<"])([^>"]+)[>"]')


def room_of(place):
    """The innermost folder of the table that the file lies in."""
    return next(str(folder) for folder in place.parents if str(folder) in ALLOWED)


def problem_of(room, quote, name):
    folder = room.split("/")[0]
    if quote == '"':
        if (ROOT / name).is_file() and any(name == a or (a.endswith("/") and name.startswith(a)) for a in ALLOWED[room]):
            return None
        return f"{room}/ may not include {name} (or there is no such file)"
    if STANDARD.fullmatch(name):
        return None
    for pattern, folders in LIBRARIES.items():
        if re.fullmatch(pattern, name):
            return None if folder in folders else f"{folder}/ may not use the library of {name}"
    if folder in SYSTEM and SYSTEM_HEADER.fullmatch(name):
        return None
    return f"{folder}/ may not include {name}"


def main():
    problems, count = [], 0
    users = {prefix: [] for prefix in ONCE}
    for folder in sorted({room.split("/")[0] for room in ALLOWED}):
        for path in sorted(p for p in (ROOT / folder).rglob("*") if p.suffix in (".h", ".cpp")):
            place = path.relative_to(ROOT)
            for number, line in enumerate(path.read_text(encoding="utf-8").splitlines(), 1):
                if not (match := INCLUDE.match(line)):
                    continue
                count += 1
                if problem := problem_of(room_of(place), *match.groups()):
                    problems.append(f"{place}:{number}: {problem}")
                for prefix in ONCE:
                    if match[2].startswith(prefix) and place not in users[prefix]:
                        users[prefix].append(place)
    for prefix, places in users.items():
        if len(places) > 1 or any(place.suffix == ".h" for place in places):
            problems.append(f"{prefix} belongs in one source file, is in {', '.join(map(str, places))}")
    if count == 0:
        problems.append(f"{ROOT}: no source files found")
    print("\n".join(problems) or f"{count} includes, all allowed")
    return bool(problems)


if __name__ == "__main__":
    sys.exit(main())
