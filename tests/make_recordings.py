#!/usr/bin/env python3
"""Makes the recordings anew that the tests replay, and tells which of them changed.

usage: make_recordings.py TSD FOLDER

Those of the scenes below, and a choice of what the tests of the plug-in beside TSD record: their cases, each call
failed, services that throw, threads that meet, and lives of a device by their seeds. Apps, names and accounts in them
are invented.
"""

import concurrent.futures
import json
import os
import pathlib
import subprocess
import sys
import tempfile

from recording_choice import Features, chosen

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
    ("cancelled-twice", "sync thirteenth host --transfers 1 --repeat 2 --inject transfer:FIRST=cancel=FIRST"),
    ("", "store tenth FIRST"),
    ("the-stores-own", "sync tenth host --transfers 1"),
    ("no-work-area", "sync eleventh host --transfers 1 --inject moveItem=fail"),
    ("no-directory", "sync phone host --transfers 1 --inject createDirectory=fail"),
    ("restore-failed", "restore twelfth host --inject setPlaceholderPromise@2=fail"),
    ("restore", "restore seventh host"),
    ("restore-in-daemon", "restore eighth host --in-daemon"),
]
DEVICES = "phone other third fourth fifth sixth seventh eighth ninth tenth eleventh twelfth thirteenth".split()


# The tests that are recorded. Left out are those that talk to the object itself, past what is recorded, those whose
# threads go as they like, and one that is long.
TESTS = [
    ("plugin_tests", "-Restore.ReportsThatComeTooEarlyOrForNobody:Restore.ALongListTakesOneWait:"
                     "SyncCases.CancellationsAreRememberedUntilTheTransferEnds:"
                     "HardCases.ACoordinatorOfAnUnknownAppStillHasTheRestoreStateCleaned:"
                     "ScriptedServices.ADaemonMayEndATransferInsideTheCallThatCancelsIt:Simulation.*:Threads.*"),
    ("plugin_tests", "Threads.WhoeverMeetsAnEditWaitsForItsEnd"),
    ("plugin_tests", "Simulation.*"),
    ("exception_tests", "*AServiceThatThrows*:*WhatAServiceStops*"),
]
SEEDS = 100
BUDGET = 1_750_000  # bytes of all recordings; the limit is 2 MiB


def record_scenes(tsd, place, folder):
    def run(line):
        done = subprocess.run([tsd, *line], cwd=place, capture_output=True, text=True, timeout=120, check=False)
        if done.returncode not in (0, 1, 3, 5):
            sys.exit(f"{' '.join(map(str, line))}: {done.stderr}")
        return done.stdout

    run("sample host --apps 6 --package-size 2000 --demo".split())
    run("host new empty".split())
    for device in DEVICES:
        run(["init", device])
        run(["set", device, "icon-size=16"])
    plan = json.loads(run("plan fourth host --json".split()))
    apps = [app["id"] for app in plan["apps"] if app["decision"] == "new"]
    for name, line in LINES:
        words = line.replace("FIRST", apps[0]).replace("SECOND", apps[1]).split()
        more = ["--record", folder / f"{name}.recording"] if name else []
        run([*words, *more, *(["--progress", "none"] if name else [])])


def record_tests(tsd, folder):
    for program, names in TESTS:
        subprocess.run([pathlib.Path(tsd).with_name(program), f"--gtest_filter={names}", "--gtest_brief=1"], check=True,
                       stdout=subprocess.DEVNULL,
                       env={**os.environ, "APPSYNC_RECORDINGS": str(folder), "APPSYNC_SEEDS": str(SEEDS)})


def shown(tsd, path):
    """The recording's lines; none of one that does not replay."""
    if subprocess.run([tsd, "replay", path], capture_output=True, check=False).returncode:
        return None
    return subprocess.run([tsd, "recording", "show", path], capture_output=True, text=True, errors="replace",
                          check=True).stdout.splitlines()


def choice(tsd, scenes, tests, before):
    """The paths that are kept: all scenes, of the tests' those that show something."""
    features = Features(pathlib.Path(tsd).with_name("libApplicationSync.so").read_bytes())
    paths = sorted([*scenes.iterdir(), *tests.iterdir()])
    shows = {}
    with concurrent.futures.ThreadPoolExecutor(os.cpu_count()) as pool:
        for path, lines in zip(paths, pool.map(lambda path: shown(tsd, path), paths)):
            if lines is not None:
                shows[path] = features.of(lines)
            elif path.parent == scenes:
                sys.exit(f"{path.name}: does not replay as it was recorded")
    print(f"{len(paths) - len(shows)} of {len(paths)} recordings cannot be replayed")
    first = [path for path in shows if path.parent == scenes]
    again = [path for path in shows if path.parent == tests and path.name in before]
    kept = chosen(shows, {path: path.stat().st_size for path in shows}, [*first, *again], BUDGET)
    everything = set().union(*shows.values())
    print(f"{len(set().union(*(shows[path] for path in kept)))} of {len(everything)} things shown")
    return sorted({*first, *kept})


def main():
    tsd, folder = str(pathlib.Path(sys.argv[1]).resolve()), pathlib.Path(sys.argv[2]).resolve()
    folder.mkdir(exist_ok=True)
    before = {path.name: shown(tsd, path) for path in folder.glob("*.recording")}
    for name in sorted(name for name, lines in before.items() if lines is None):
        print(f"{name}: replays differently")
    with tempfile.TemporaryDirectory() as place:
        scenes, tests = pathlib.Path(place) / "scenes", pathlib.Path(place) / "tests"
        scenes.mkdir()
        tests.mkdir()
        record_scenes(tsd, place, scenes)
        record_tests(tsd, tests)
        paths = choice(tsd, scenes, tests, before)
        for name in set(before) - {path.name for path in paths}:
            (folder / name).unlink()
        for path in paths:
            # What differs in its times alone stays as it is, but for its version.
            made, kept = path.read_bytes(), folder / path.name
            if before.get(path.name) != shown(tsd, path) or kept.read_bytes()[:9] != made[:9]:
                kept.write_bytes(made)
    sizes = [path.stat().st_size for path in folder.glob("*.recording")]
    print(f"{len(sizes)} recordings, {sum(sizes) // 1024} KiB")


if __name__ == "__main__":
    main()
