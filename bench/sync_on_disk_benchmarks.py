#!/usr/bin/env python3
"""Measures `tsd sync` on a folder of this machine, beside the same packages copied, unpacked and synced by hand.

usage: sync_on_disk_benchmarks.py [--short] [--folder DIR] BIN

Works in a folder of its own below DIR (the current one unless told otherwise), which should lie on a real disk. Prints
one line of JSON per row on standard output; docs/performance.md says what the rows mean. What two ways are compared by
is run in turns, several times, and the least of each counts. With --short everything runs once with a few apps, and
what comes out says nothing about time.
"""

import argparse
import ast
import collections
import json
import os
import pathlib
import re
import shutil
import statistics
import subprocess
import sys
import tempfile
import time

TRANSFERS = 2
SEED = 5

# What an install by hand does for each package: a copy in place, unpacked into a fresh folder by the archive library's
# own tool, then every file and every folder on the way synced.
BY_HAND = """
target=$1; shift
for package; do
  name=${package##*/}
  apps=$target/Application/$name
  mkdir "$apps"
  cp "$package" "$target/Packages/$name"
  bsdtar -x -f "$target/Packages/$name" -C "$apps"
  sync "$target/Packages/$name" "$target/Packages" "$apps"/*/* "$apps"/* "$apps" "$target/Application"
  rm "$target/Packages/$name"
done
"""


def row(work, figure, goal="", met=None):
    print(json.dumps({"work": work, "figure": figure, "goal": goal, "met": met}), flush=True)


class Bench:
    """Where everything lies, and what is run there."""

    def __init__(self, tsd, folder):
        self.tsd, self.folder = tsd, folder

    def run(self, *command, **options):
        return subprocess.run([str(part) for part in command], check=True, stdout=subprocess.PIPE, **options)

    def host(self, apps, size):
        host = self.folder / f"host-{apps}-{size}"
        if not host.exists():
            self.run(self.tsd, "sample", host, "--apps", apps, "--package-size", size, "--files", 3, "--seed", SEED)
        return host

    def device(self):
        device = self.folder / "device"
        shutil.rmtree(device, ignore_errors=True)
        self.run(self.tsd, "init", device)
        return device

    def sync_command(self, device, host):
        return [self.tsd, "sync", device, host, "--transfers", TRANSFERS, "--progress", "none", "--json"]

    def sync(self, host):
        """One sync onto an empty device: seconds of the whole process, its report, its peak memory in bytes."""
        device = self.device()
        os.sync()
        begin = time.monotonic()
        process = subprocess.Popen([str(part) for part in self.sync_command(device, host)], stdout=subprocess.PIPE)
        report = json.loads(process.stdout.read())
        _, status, usage = os.wait4(process.pid, 0)
        seconds = time.monotonic() - begin
        process.returncode = os.waitstatus_to_exitcode(status)
        assert process.returncode == 0 and report["result"] == "done", report
        return seconds, report, usage.ru_maxrss * 1024

    def by_hand(self, host):
        """The same packages without any device: seconds."""
        target = self.folder / "by-hand"
        shutil.rmtree(target, ignore_errors=True)
        for name in ("Packages", "Application"):
            (target / name).mkdir(parents=True)
        packages = sorted((host / "Packages").glob("*.pkg"))
        os.sync()
        begin = time.monotonic()
        shells = [
            subprocess.Popen(["sh", "-e", "-c", BY_HAND, "sh", target, *packages[first::TRANSFERS]])
            for first in range(TRANSFERS)
        ]
        assert [shell.wait() for shell in shells] == [0] * TRANSFERS
        return time.monotonic() - begin


class Trace:
    """The system calls of one sync, counted by kind."""

    LINE = re.compile(r"\d+ +(?:<\.\.\. )?(\w+)(\((?:\d+<([^>]*)>)?.*)?")
    SYNCS = ("fsync", "fdatasync", "syncfs", "sync_file_range", "sync", "msync")

    def __init__(self, bench, host):
        device = bench.device()
        file = bench.folder / "trace"
        # A build that looks for leaks at its end cannot while it is traced.
        bench.run("strace", "-f", "-y", "-s", "24", "-o", file, *bench.sync_command(device, host),
                  env={**os.environ, "LSAN_OPTIONS": "detect_leaks=0"})
        self.counts = collections.Counter()
        with open(file, errors="replace") as lines:
            for line in lines:
                self._take(line)

    def _take(self, line):
        match = self.LINE.match(line)
        if not match or match[2] is None:
            return  # a signal, an end, or the second half of a call that was told already
        call, arguments, path = match.groups()
        self.counts["system calls"] += 1
        if call in self.SYNCS:
            self.counts["syncs", self._kind(path or "")] += 1
        elif call.startswith("rename") and "\"ApplicationsSync.plist\"" in arguments:
            self.counts["list rewrites"] += 1
        elif call == "pwrite64" and path.endswith("-wal") and ", 24, " in arguments:
            # A frame of the log of the store: its head tells the last one of a commit.
            head = ast.literal_eval("b" + re.search(r'"(?:[^"\\]|\\.)*"', arguments)[0])
            self.counts["store commits"] += head[4:8] != b"\0\0\0\0"

    @staticmethod
    def _kind(path):
        path = path.split("/device/", 1)[-1]
        for kind, pattern in (
            ("store", r"device\.db"),
            ("lists", r".*/HarluneStuff(/\.[^/]*)?$|.*/HarluneStuff/[^/]*\.plist$"),
            ("packages", r".*/PublicStaging/Packages"),
            ("apps", r"fs/var/containers/"),
            ("icons", r".*/(Icons|tmp)(/|$)"),
        ):
            if re.match(pattern, path):
                return kind
        return "other"


def count(bench, short):
    """Per app: what a sync of twice as many apps does more, so that what each sync does once falls out."""
    if not shutil.which("strace"):
        row("what a sync does per app, counted", "strace is not installed")
        return
    few = 2 if short else 20
    once, twice = (Trace(bench, bench.host(apps, 16384)).counts for apps in (few, 2 * few))
    per_app = collections.Counter({kind: (twice[kind] - once[kind]) / few for kind in twice})
    syncs = {kind[1]: value for kind, value in per_app.items() if kind[0] == "syncs" and value}
    told = ", ".join(f"{kind} {value:.1f}" for kind, value in sorted(syncs.items(), key=lambda item: -item[1]))

    def counted(name, value, goal, more=""):
        row(f"{name} per app in a sync", f"{value:.1f}{more}", f"{goal}", None if short else value <= goal + 0.5)

    counted("list rewrites", per_app["list rewrites"], 2)
    counted("syncs to disk", sum(syncs.values()), 14, f" ({told})")
    counted("store commits", per_app["store commits"], 7)
    row("system calls per app in a sync", f"{per_app['system calls']:.0f}")


def compare(bench, short):
    if not shutil.which("bsdtar"):
        row("a sync beside the same packages unpacked by hand", "bsdtar is not installed")
        return
    apps, rounds = (2, 1) if short else (200, 5)
    host = bench.host(apps, 1 << 20)
    hands, syncs, shares = [], [], []
    for _ in range(rounds):
        hands.append(bench.by_hand(host))
        seconds, report, _ = bench.sync(host)
        syncs.append(seconds)
        shares.append(report["placeholdersAfterSeconds"] / report["seconds"])
        print(f"by hand {hands[-1]:.2f} s, sync {seconds:.2f} s", file=sys.stderr)
    ratio = min(syncs) / min(hands)
    typical = statistics.median(sync / hand for sync, hand in zip(syncs, hands))
    row(
        f"a sync of {apps} apps of 1 MiB, beside copying, unpacking and syncing them by hand",
        f"{ratio:.2f} times ({typical:.2f} the typical round)",
        "at most 1.5",
        None if short else ratio <= 1.5,
    )
    share = statistics.median(shares)
    row(
        f"the last of {apps} placeholders is on the home screen",
        f"after {100 * share:.1f} % of the sync",
        "at most 10 %",
        None if short else share <= 0.1,
    )


def grow(bench, short):
    few, many = (2, 4) if short else (200, 2000)
    each = {few: [], many: []}
    memory = 0
    for _ in range(1 if short else 2):
        for apps in (few, many):
            seconds, _, peak = bench.sync(bench.host(apps, 16384))
            each[apps].append(seconds / apps)
            memory = max(memory, peak)
            print(f"{apps} apps: {1000 * each[apps][-1]:.2f} ms each", file=sys.stderr)
    ratio = min(each[many]) / min(each[few])
    row(
        f"a sync of {many} apps of 16 KiB, time per app beside that of {few}",
        f"{ratio:.2f} times",
        "at most 2",
        None if short else ratio <= 2,
    )
    row(
        f"peak memory of a sync of {many} apps",
        f"{memory / (1 << 20):.0f} MiB",
        "under 256 MiB",
        None if short else memory < 256 << 20,
    )


def main():
    arguments = argparse.ArgumentParser(description="Measures tsd sync on a folder of this machine.")
    arguments.add_argument("--short", action="store_true", help="a few apps, once")
    arguments.add_argument("--folder", default=".", help="where to work; on a real disk")
    arguments.add_argument("bin", type=pathlib.Path, help="where tsd lies")
    options = arguments.parse_args()
    with tempfile.TemporaryDirectory(prefix="sync-on-disk-", dir=options.folder) as folder:
        bench = Bench(options.bin.resolve() / "tsd", pathlib.Path(folder).resolve())
        count(bench, options.short)
        compare(bench, options.short)
        grow(bench, options.short)


if __name__ == "__main__":
    main()
