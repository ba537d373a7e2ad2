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
    "restore": PLUGIN + ["restore/", "coordination/CancellationReason.h", "coordination/TransactionStep.h"],
    "placeholder": PLUGIN + ["placeholder/"],
    "plist": ["platform/", "plist/"],
    "device": ["platform/", "plist/", "device/"],
    "tsd": ["platform/", "plist/", "device/", "tsd/"],
    "contract": ["platform/", "contract/"],
}
# Folders that may use the operating system's own headers; the others use the standard library alone.
SYSTEM = ["device", "tsd"]
# Library header: the folders that may include it.
LIBRARIES = {
    r"expat\.h": ["plist"],
    r"sqlite3\.h": ["device"],
    r"archive(_entry)?\.h": ["device", "tsd"],
    r"cairo\.h": ["device", "tsd"],
    r"pango/.*": ["tsd"],
    r"nlohmann/.*": ["device", "tsd"],
    r"CLI/.*": ["tsd"],
    r"gtest/gtest\.h": ["contract"],
}
# These take so long to compile that one source file of the product includes each.
ONCE = ["nlohmann/", "CLI/"]

STANDARD = re.compile(r"[a-z_0-9]+")
SYSTEM_HEADER = re.compile(r"((sys|linux)/)?[a-z_0-9]+\.h")
INCLUDE = re.compile(r'^\s*#\s*include\s*([<"])([^>"]+)[>"]')


def problem_of(folder, quote, name):
    if quote == '"':
        if (ROOT / name).is_file() and any(name == a or (a.endswith("/") and name.startswith(a)) for a in ALLOWED[folder]):
            return None
        return f"{folder}/ may not include {name} (or there is no such file)"
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
    for folder in ALLOWED:
        for path in sorted(p for p in (ROOT / folder).rglob("*") if p.suffix in (".h", ".cpp")):
            place = path.relative_to(ROOT)
            for number, line in enumerate(path.read_text(encoding="utf-8").splitlines(), 1):
                if not (match := INCLUDE.match(line)):
                    continue
                count += 1
                if problem := problem_of(folder, *match.groups()):
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
