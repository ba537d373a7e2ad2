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
import resource
import shutil
import statistics
import subprocess
import sys
import tempfile
import time
from typing import NamedTuple

TRANSFERS = 2
SEED = 5

# What an install by hand does for each package: a copy in place, unpacked into a fresh folder by the archive library's
# own tool, then everything that was written flushed with one request.
BY_HAND = """
target=$1; shift
for package; do
  name=${package##*/}
  apps=$target/Application/$name
  mkdir "$apps"
  cp "$package" "$target/Packages/$name"
  bsdtar -x -f "$target/Packages/$name" -C "$apps"
  rm "$target/Packages/$name"
  sync -f "$apps"
done
"""


def row(work, figure, goal="", met=None):
    print(json.dumps({"work": work, "figure": figure, "goal": goal, "met": met}), flush=True)


class Done(NamedTuple):
    """What became of one way of doing it."""

    seconds: float
    processor: float  # seconds of processor time
    memory: int  # bytes, at most
    report: dict


class Bench:
    """Where everything lies, and what is run there."""

    def __init__(self, tsd, folder):
        self.tsd, self.folder = tsd, folder

    def run(self, *command, **options):
        return subprocess.run([str(part) for part in command], check=True, stdout=subprocess.PIPE, **options)

    def host(self, apps, size, files=3):
        host = self.folder / f"host-{apps}-{size}-{files}"
        if not host.exists():
            self.run(self.tsd, "sample", host, "--apps", apps, "--package-size", size, "--files", files, "--seed", SEED)
        return host

    def device(self):
        device = self.folder / "device"
        shutil.rmtree(device, ignore_errors=True)
        self.run(self.tsd, "init", device)
        return device

    def sync_command(self, device, host):
        return [self.tsd, "sync", device, host, "--transfers", TRANSFERS, "--progress", "none", "--json"]

    def sync(self, host, device=None):
        """One sync of the whole process, onto an empty device unless one is given."""
        device = device or self.device()
        os.sync()
        begin = time.monotonic()
        process = subprocess.Popen([str(part) for part in self.sync_command(device, host)], stdout=subprocess.PIPE)
        report = json.loads(process.stdout.read())
        _, status, usage = os.wait4(process.pid, 0)
        seconds = time.monotonic() - begin
        process.returncode = os.waitstatus_to_exitcode(status)
        assert process.returncode == 0 and report["result"] == "done", report
        return Done(seconds, usage.ru_utime + usage.ru_stime, usage.ru_maxrss * 1024, report)

    def by_hand(self, host):
        """The same packages without any device."""
        target = self.folder / "by-hand"
        shutil.rmtree(target, ignore_errors=True)
        for name in ("Packages", "Application"):
            (target / name).mkdir(parents=True)
        packages = sorted((host / "Packages").glob("*.pkg"))
        os.sync()
        before = resource.getrusage(resource.RUSAGE_CHILDREN)
        begin = time.monotonic()
        shells = [
            subprocess.Popen(["sh", "-e", "-c", BY_HAND, "sh", target, *packages[first::TRANSFERS]])
            for first in range(TRANSFERS)
        ]
        assert [shell.wait() for shell in shells] == [0] * TRANSFERS
        seconds = time.monotonic() - begin
        after = resource.getrusage(resource.RUSAGE_CHILDREN)
        processor = after.ru_utime + after.ru_stime - before.ru_utime - before.ru_stime
        return Done(seconds, processor, 0, {})

    def seconds_of(self, *command):
        """The least of several turns."""
        turns = []
        for _ in range(5):
            begin = time.monotonic()
            self.run(*command)
            turns.append(time.monotonic() - begin)
        return min(turns)


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
        if call.startswith("clone"):
            self.counts["threads"] += 1
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
    counted("syncs to disk", sum(syncs.values()), 6, f" ({told})")
    counted("store commits", per_app["store commits"], 7)
    calls = per_app["system calls"]
    row("system calls per app in a sync", f"{calls:.0f}", "under 250", None if short else calls < 250)
    counted("threads started", per_app["threads"], 0)


def agreeing(rounds, measure):
    """Pairs of what both ways took, by hand first; as many again where the rounds disagree by more than a quarter."""
    pairs = [measure() for _ in range(rounds)]
    for way in zip(*pairs):
        if max(way) > 1.25 * min(way):
            return pairs + [measure() for _ in range(rounds)]
    return pairs


def compare(bench, short, work, host, goal, memory_goal=None):
    """A sync of the host beside its packages installed by hand; answers the reports of the syncs."""
    if not shutil.which("bsdtar"):
        row(work, "bsdtar is not installed")
        return []
    syncs = []

    def measure():
        hand = bench.by_hand(host).seconds
        syncs.append(bench.sync(host))
        print(f"{work}: by hand {hand:.2f} s, sync {syncs[-1].seconds:.2f} s", file=sys.stderr)
        return hand, syncs[-1].seconds

    pairs = agreeing(1 if short else 5, measure)
    ratio = min(sync for _, sync in pairs) / min(hand for hand, _ in pairs)
    typical = statistics.median(sync / hand for hand, sync in pairs)
    row(work, f"{ratio:.2f} times by hand ({typical:.2f} the typical round)", f"at most {goal}",
        None if short else ratio <= goal)
    if memory_goal:
        memory = max(sync.memory for sync in syncs) / (1 << 20)
        row("... its peak memory", f"{memory:.0f} MiB", f"under {memory_goal} MiB", None if short else memory < memory_goal)
    return syncs


def compare_all(bench, short):
    for files, apps in ((3, 100), (30, 60), (300, 24), (1000, 12)):
        apps = 2 if short else apps
        host = bench.host(apps, files * (200 if short else 20_000), files)
        compare(bench, short, f"a sync of {apps} packages of {files} files of 20 KB", host, 1.15)
    size = 1 << 20 if short else 200 << 20
    compare(bench, short, "a sync of one package of 200 MiB", bench.host(1, size, 30), 1.0, memory_goal=32)
    apps = 2 if short else 200
    syncs = compare(bench, short, f"a sync of {apps} apps of 1 MiB", bench.host(apps, 1 << 20), 1.15)
    if syncs:
        share = statistics.median(each.report["placeholdersAfterSeconds"] / each.report["seconds"] for each in syncs)
        row(f"the last of {apps} placeholders is on the home screen", f"after {100 * share:.1f} % of the sync",
            "at most 12 %", None if short else share <= 0.12)


def grow(bench, short):
    few, many = (2, 4) if short else (200, 2000)
    each = {few: [], many: []}
    by_hand = []
    memory = 0
    for _ in range(1 if short else 2):
        for apps in (few, many):
            host = bench.host(apps, 4096)
            done = bench.sync(host)
            each[apps].append(done.processor / apps)
            memory = max(memory, done.memory)
            print(f"{apps} apps: {1000 * each[apps][-1]:.2f} ms of processor time each", file=sys.stderr)
        if shutil.which("bsdtar"):
            by_hand.append(bench.by_hand(host).processor / many)
    if by_hand:
        ratio = min(each[many]) / min(by_hand)
        row(f"processor time of an app at {many} apps of 4 KiB", f"{ratio:.2f} times that by hand")
    ratio = min(each[many]) / min(each[few])
    row(f"... beside one at {few}", f"{ratio:.2f} times", "at most 1.1", None if short else ratio <= 1.1)
    row(f"peak memory of a sync of {many} apps", f"{memory / (1 << 20):.0f} MiB", "under 100 MiB",
        None if short else memory < 100 << 20)


def look(bench, short):
    """What the views of a large device take, beside reading its store with the database's own shell."""
    if not shutil.which("sqlite3"):
        row("the views of a large device", "sqlite3 is not installed")
        return
    apps = 4 if short else 2000
    host = bench.host(apps, 4096)
    device = bench.device()
    bench.sync(host, device)
    store = device / "device.db"
    by_shell = bench.seconds_of("sqlite3", "-readonly", store, "SELECT kind, key, hex(value) FROM records")
    tsd = bench.tsd
    app = json.loads(bench.run(tsd, "status", device, "--json").stdout)["apps"][0]["id"]
    idle = bench.folder / "idle"
    bench.run(tsd, "host", "new", idle)
    for name, command in (("status", ["status", device]), ("why of one app", ["why", device, app]),
                          ("plan with nothing to do", ["plan", device, idle]),
                          ("plan of an update for each", ["plan", device, host])):
        ratio = bench.seconds_of(tsd, *command) / by_shell
        row(f"{name}, of {apps} apps", f"{ratio:.1f} times reading the store with the database's shell")
    again = bench.sync(host, device)
    row(f"a second sync of {apps} apps", f"{1000 * again.processor / apps:.2f} ms of processor time for each")


def main():
    arguments = argparse.ArgumentParser(description="Measures tsd sync on a folder of this machine.")
    arguments.add_argument("--short", action="store_true", help="a few apps, once")
    arguments.add_argument("--folder", default=".", help="where to work; on a real disk")
    arguments.add_argument("bin", type=pathlib.Path, help="where tsd lies")
    options = arguments.parse_args()
    with tempfile.TemporaryDirectory(prefix="sync-on-disk-", dir=options.folder) as folder:
        bench = Bench(options.bin.resolve() / "tsd", pathlib.Path(folder).resolve())
        count(bench, options.short)
        compare_all(bench, options.short)
        grow(bench, options.short)
        look(bench, options.short)


if __name__ == "__main__":
    main()
