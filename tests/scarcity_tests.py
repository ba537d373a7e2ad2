#!/usr/bin/env python3
"""The program where it cannot have what it needs: threads, memory, room in a file. It ends with a message, never by a
signal; what it could not do, the same command does afterwards.

usage: scarcity_tests.py TSD LIBRARY [unittest arguments], the library being that of ScarceResources.cpp
"""

import json
import os
import pathlib
import plistlib
import resource
import shutil
import signal
import subprocess
import sys
import unittest

import tsd_folder
from hostile_host import zipped
from tsd_folder import DEADLINE, DONE, FAILED, SOME_FAILED

SCARCE = None
ALL_INSTALLED = {"installed"}


def becomes_ordinary():
    """Signals as a shell has them: what Python ignores, its children would."""
    signal.signal(signal.SIGXFSZ, signal.SIG_DFL)


class Scarcity(tsd_folder.Folder):
    def setUp(self):
        super().setUp()
        self.apps = self.make(3)
        shutil.copytree("dev", "fresh")

    def renew(self):
        shutil.rmtree("dev")
        shutil.copytree("fresh", "dev")

    def run_short(self, *arguments, **scarce):
        environment = dict(os.environ, LD_PRELOAD=SCARCE, **scarce)
        return subprocess.run([tsd_folder.TSD, *arguments], capture_output=True, text=True, timeout=120,
                              stdin=subprocess.DEVNULL, env=environment)

    def check_ends(self, run, told=True):
        """It ended of its own will, and, unless all went well, said why."""
        self.assertIn(run.returncode, (DONE, FAILED, SOME_FAILED, DEADLINE), run.stderr)
        if told and run.returncode != DONE:
            # A library without memory may end the program itself.
            self.assertRegex(run.stderr, r"(?m)^tsd: .|^Fatal .*[Mm]emory")

    def check_recovers(self, *arguments):
        self.tsd(*arguments)
        self.assertEqual({app["state"] for app in self.document("status", "dev")["apps"]}, ALL_INSTALLED)

    COMMANDS = (("sync", "dev", "host", "--progress", "plain"), ("restore", "dev", "host", "--progress", "plain"),
                ("status", "dev"), ("home", "dev"), ("plan", "dev", "host"), ("backup", "dev"), ("clear", "dev"),
                ("set", "dev", "icon-size=60"), ("uninstall", "dev", "com.example.none"))

    def test_every_thread(self):
        for command in self.COMMANDS:
            for number in range(1, 32):
                with self.subTest(" ".join(command), thread=number):
                    self.renew()
                    run = self.run_short(*command, SCARCE_THREADS=str(number))
                    self.check_ends(run)
                    if "thread" not in run.stderr:
                        break
            else:
                self.fail("no number of threads is enough")
        self.renew()
        self.check_recovers("sync", "dev", "host")

    def test_memory(self):
        # A sample of the allocations of each command, which fail alone or with all that come after them.
        for command in (("status", "dev"), ("sync", "dev", "host", "--progress", "none"),
                        ("restore", "dev", "host", "--progress", "none")):
            self.renew()
            self.run_short(*command, SCARCE_COUNT="count")
            total = int(pathlib.Path("count").read_text())
            self.assertGreater(total, 1000)
            for number in [*range(1, 10), *range(10, total, total // 25)]:
                for once in ("!", ""):
                    with self.subTest(" ".join(command), allocation=number, once=once):
                        self.renew()
                        run = self.run_short(*command, SCARCE_MEMORY=f"{number}{once}")
                        self.check_ends(run, told=not once)
            self.tsd(*command)
            if command[0] == "sync":
                self.check_recovers(*command)

    def test_one_app_that_needs_too_much(self):
        app, *neighbours = self.apps
        # Read, it takes more than twenty times its size.
        manifest = plistlib.dumps({"KBBundleIdentifier": app, "more": [1] * 150_000}, fmt=plistlib.FMT_BINARY)
        pathlib.Path("host/Packages", app + ".pkg").write_bytes(zipped(app, manifest=manifest))
        run = self.run_short("sync", "dev", "host", "--progress", "none", "--json", SCARCE_LARGEST="1000000")
        self.assertEqual(run.returncode, SOME_FAILED, run.stderr)
        outcomes = {each["id"]: (each["outcome"], each["reason"]) for each in json.loads(run.stdout)["apps"]}
        self.assertEqual([outcomes[each] for each in neighbours], [("INSTALLED", "")] * 2)
        self.assertRegex(": ".join(outcomes[app]), rf"\AFAILED: .*{app}.pkg.*: out of memory")
        self.check_recovers("sync", "dev", "host")

    def test_a_clock_that_nobody_set(self):
        self.run_short("sync", "dev", "host", "--progress", "none", SCARCE_TIME="3")
        began = "1969-12-31T23:59:57.500Z"
        self.assertEqual(json.loads(pathlib.Path("dev/runs/0001-sync/run.json").read_text())["began"], began)
        self.assertEqual([run["began"] for run in self.document("runs", "dev")["runs"]], [began])
        self.tsd("why", "dev", self.apps[0])

    def test_a_file_that_may_not_grow(self):
        def limited():
            becomes_ordinary()
            resource.setrlimit(resource.RLIMIT_FSIZE, (64 << 10, 64 << 10))

        run = subprocess.run([tsd_folder.TSD, "sync", "dev", "host", "--progress", "none"], capture_output=True,
                             text=True, preexec_fn=limited, timeout=120)
        self.assertIn(run.returncode, (FAILED, SOME_FAILED), run.stderr)
        self.assertRegex(run.stderr + run.stdout, "File too large|disk I/O error")
        self.check_recovers("sync", "dev", "host")


if __name__ == "__main__":
    SCARCE = str(pathlib.Path(sys.argv.pop(2)).resolve())
    tsd_folder.main()
