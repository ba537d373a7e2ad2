#!/usr/bin/env python3
"""Makes the recordings anew that the tests replay, and tells which of them changed.

usage: make_recordings.py TSD FOLDER

Apps, names and accounts in them are invented, as `tsd sample` does.
"""

import json
import pathlib
import subprocess
import sys
import tempfile

# What happens on one device, in this order: the recording's name and what is recorded; without a name it only happens.
# FIRST and SECOND are the first two apps of the host.
LINES = [
    ("nothing-there", "sync phone empty --transfers 1"),
    ("queries-metrics", "query phone metrics"),
    ("first-sync", "sync phone host --transfers 1"),
    ("same-again", "sync phone host --transfers 1"),
    ("queries-accounts", "query phone accounts"),
    ("queries-identifiers", "query phone vantor-ids"),
    ("queries-types", "query phone disabled-asset-types"),
    ("backup", "backup phone"),
    ("", "uninstall phone FIRST"),
    ("after-an-uninstall", "sync phone host --transfers 1"),
    ("", "set phone app-installation=forbidden app-removal=forbidden"),
    ("forbidden", "sync phone host --transfers 1"),
    ("", "set phone app-installation=allowed app-removal=allowed"),
    ("cleared", "clear phone"),
    ("many-in-flight", "sync other host --transfers 8 --daemon-reports"),
    ("faults", "sync third host --transfers 1 --inject setPlaceholderPromise:FIRST=fail --inject copyItem@2=fail"),
    ("cancelled", "sync fourth host --transfers 1 --inject setAppAssetPromise:FIRST=cancel=SECOND"),
    ("prioritized", "sync fifth host --transfers 1 --inject setInstallOptions:SECOND=prioritize=FIRST"),
    ("phase-failed", "sync sixth host --transfers 1 --asset FIRST:isDownload=false --end-phase failed"),
    ("cancelled-and-again", "sync ninth host --transfers 1 --repeat 2 --inject transfer:FIRST@1=cancel=FIRST"),
    ("", "store tenth FIRST"),
    ("the-stores-own", "sync tenth host --transfers 1"),
    ("no-work-area", "sync eleventh host --transfers 1 --inject moveItem=fail"),
    ("no-directory", "sync phone host --transfers 1 --inject createDirectory=fail"),
    ("restore-failed", "restore twelfth host --inject setPlaceholderPromise@2=fail"),
    ("restore", "restore seventh host"),
    ("restore-in-daemon", "restore eighth host --in-daemon"),
]
DEVICES = "phone other third fourth fifth sixth seventh eighth ninth tenth eleventh twelfth".split()


def main():
    tsd, folder = str(pathlib.Path(sys.argv[1]).resolve()), pathlib.Path(sys.argv[2]).resolve()
    folder.mkdir(exist_ok=True)
    before = {path.name: path.read_bytes() for path in folder.glob("*.recording")}
    for name in before:
        if subprocess.run([tsd, "replay", folder / name], capture_output=True, check=False).returncode:
            print(f"{name}: replays differently")
        (folder / name).unlink()
    with tempfile.TemporaryDirectory() as place:
        def run(line):
            done = subprocess.run([tsd, *line], cwd=place, capture_output=True, text=True, timeout=120, check=False)
            if done.returncode not in (0, 1, 3, 5):
                sys.exit(f"{' '.join(map(str, line))}: {done.stderr}")
            return done.stdout

        run("sample host --apps 6 --package-size 2000 --demo".split())
        run("host new empty".split())
        for device in DEVICES:
            run(["init", device])
        plan = json.loads(run("plan fourth host --json".split()))
        apps = [app["id"] for app in plan["apps"] if app["decision"] == "new"]
        for name, line in LINES:
            words = line.replace("FIRST", apps[0]).replace("SECOND", apps[1]).split()
            more = ["--record", folder / f"{name}.recording"] if name else []
            run([*words, *more, *(["--progress", "none"] if name else [])])
    sizes = [path.stat().st_size for path in folder.glob("*.recording")]
    print(f"{len(sizes)} recordings, {sum(sizes) // 1024} KiB")


if __name__ == "__main__":
    main()
