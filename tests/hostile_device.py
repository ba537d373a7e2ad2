#!/usr/bin/env python3
"""Devices into whose folder somebody else has written: its records of runs, and what stands in the place of its files.

usage: hostile_device.py TSD [unittest arguments]
"""

import json
import os
import pathlib
import plistlib
import shutil
import sqlite3
import subprocess
import unittest

import tsd_folder
from tsd_folder import DONE, FAILED


class Records(tsd_folder.Folder):
    """What a run keeps of itself costs it nothing, whatever is done to it."""

    def setUp(self):
        super().setUp()
        self.apps = self.make(2)
        self.tsd("sync", "dev", "host")
        self.run = pathlib.Path("dev/runs/0001-sync")

    def test_records_cut_under_way(self):
        os.mkfifo("calls")
        self.tsd("init", "other")
        sync = subprocess.Popen([tsd_folder.TSD, "sync", "other", "host", "--progress", "none", "--calls", "calls"],
                                stdout=subprocess.DEVNULL, stderr=subprocess.PIPE)
        with open("calls", "rb") as calls, sync:
            # What comes through the pipe has been noted in the records before or will be after they are cut.
            calls.read(1000)
            for name in ("log", "calls.jsonl"):
                os.truncate(f"other/runs/0001-sync/{name}", 0)
            while calls.read(1000):
                pass
            self.assertEqual((sync.wait(), sync.stderr.read()), (DONE, b""))

    def test_records_that_are_none(self):
        deep = "[" * 200_000
        long = json.dumps({"message": "x" * (5 << 20)})
        for name in ("run.json", "calls.jsonl", "apps.jsonl"):
            for text in (deep, deep + "]" * 200_000, '{"n":1,"args":' + deep, long, "", "\0" * 100, "null\n[]\n{}\n7\n"):
                with self.subTest(name, begins=text[:20], size=len(text)):
                    self.run.joinpath(name).write_text(text)
                    self.tsd("why", "dev", self.apps[0])
                    self.tsd("runs", "dev")
                    self.tsd("status", "dev")
        self.tsd("backup", "dev")
        self.tsd("sync", "dev", "host")

    def test_things_in_the_place_of_records(self):
        for name in ("run.json", "calls.jsonl", "apps.jsonl"):
            for make in (os.mkfifo, os.mkdir, lambda path: os.symlink("/etc/passwd", path)):
                path = self.run / name
                shutil.rmtree(path) if path.is_dir() and not path.is_symlink() else path.unlink(missing_ok=True)
                make(path)
                with self.subTest(name, make=make):
                    run = subprocess.run([tsd_folder.TSD, "why", "dev", self.apps[0]], capture_output=True, text=True,
                                         timeout=60)
                    self.assertIn(run.returncode, (DONE, FAILED))
                    self.assertIn(f"dev/runs/0001-sync/{name}: ", run.stderr)
                    self.tsd("backup", "dev")
            shutil.rmtree(path) if path.is_dir() and not path.is_symlink() else path.unlink()

    def test_runs_elsewhere(self):
        os.makedirs("other/0001-sync")
        shutil.rmtree("dev/runs")
        os.symlink("../other", "dev/runs")
        for number in range(2, 30):
            os.mkdir(f"other/{number:04}-sync")
        before = tsd_folder.tree_of("other")
        run = self.tsd("sync", "dev", "host", "--progress", "none")
        self.assertRegex(run.stderr, "dev/runs: ")
        self.assertEqual(tsd_folder.tree_of("other"), before)
        self.assertIn("dev/runs: ", self.tsd("runs", "dev").stderr)


class Places(tsd_folder.Folder):
    """Somebody else's hand in a device's folder: what lies beside it stays as it is, and nothing is waited for."""

    def setUp(self):
        super().setUp()
        self.apps = self.make(2)
        self.tsd("sync", "dev", "host")
        os.mkdir("other")
        pathlib.Path("other/file").write_text("somebody else's")
        os.mkdir("other/0001-sync")

    def put(self, name, make):
        path = pathlib.Path("dev", name)
        if path.is_dir() and not path.is_symlink():
            shutil.rmtree(path)
        else:
            path.unlink(missing_ok=True)
        make(path)

    def test_each_place(self):
        # (name, how it is put there, what is said)
        link, hard = lambda path: path.symlink_to("../other/file"), lambda path: os.link("other/file", path)
        folder = lambda path: path.symlink_to("../other")
        rows = [("lock", hard, "dev/lock: a file that has other names, too"), ("lock", link, "dev/lock: a symbolic link"),
                ("lock", os.mkfifo, "dev/lock: a named pipe"), ("fs", folder, "dev: not a device"),
                ("device.db", link, "dev: not a device"), ("device.db", os.mkfifo, "dev: not a device"),
                ("device.db", hard, "dev/device.db: a file that has other names, too"),
                ("device.db-journal", os.mkfifo, "dev/device.db-journal: no regular file"),
                ("device.db-wal", os.mkfifo, "dev/device.db-wal: no regular file"),
                ("device.db-wal", link, "dev/device.db-wal: a symbolic link")]
        shutil.copytree("dev", "kept")
        for name, make, said in rows:
            with self.subTest(name, said=said):
                shutil.rmtree("dev")
                shutil.copytree("kept", "dev")
                self.put(name, make)
                before = tsd_folder.tree_of("other")
                self.assertIn(said, self.tsd("sync", "dev", "host", code=FAILED).stderr)
                if name != "lock":
                    self.assertIn(said, self.tsd("status", "dev", code=FAILED).stderr)
                self.assertEqual(tsd_folder.tree_of("other"), before)

    def test_a_link_on_the_way_to_a_device_is_the_owners(self):
        os.mkdir("far")
        os.rename("dev", "far/dev")
        os.symlink("far", "near")
        os.symlink("near/dev", "dev")
        self.tsd("sync", "dev", "host")
        self.tsd("status", "near/dev")

    def test_links_in_a_host(self):
        for name in ("Packages", "Restore"):
            os.rename(f"host/{name}", f"other/{name}")
            os.symlink(f"../other/{name}", f"host/{name}")
            for command in ("sync", "plan", "restore"):
                self.assertIn(f"host/{name}: a symbolic link", self.tsd(command, "dev", "host", code=FAILED).stderr)
            os.remove(f"host/{name}")
            os.rename(f"other/{name}", f"host/{name}")

    def test_lists_that_cannot_be_read_are_told(self):
        path = pathlib.Path("host", self.apps[0], "HarluneMetadata.plist")
        path.write_bytes(b"bplist00 garbage, and no list at all, of some length")
        self.assertRegex(self.tsd("sync", "dev", "host").stderr,
                         rf"{path.name}: reading the property list failed: byte \d+: ")

    def test_entries_of_another_type_are_told(self):
        metadata = {"vantorId": 7, "is-auto-download": True}
        write = lambda path, value: path.write_bytes(plistlib.dumps(value))
        write(pathlib.Path("host", self.apps[0], "HarluneMetadata.plist"), metadata)
        write(pathlib.Path("host/Restore/RestoreApplications.plist"), {
            app: {"HarluneMetadata": plistlib.dumps({**metadata, "title": app})} for app in self.apps})
        said = r'HarluneMetadata.plist: reading an entry failed: "vantorId" is no text\n'
        for command in (["sync", "dev", "host", "--progress", "none"], ["query", "dev", "vantor-ids"], ["backup", "dev"]):
            self.assertRegex(self.tsd(*command).stderr, said)
        self.tsd("init", "another")
        self.assertIn(f'RestoreApplications.plist: {self.apps[0]}: its "HarluneMetadata": "vantorId" is no text\n',
                      self.tsd("restore", "another", "host", "--progress", "none").stderr)

    def test_a_setting_that_nobody_set(self):
        store = sqlite3.connect("dev/device.db")
        value = plistlib.dumps("20000", fmt=plistlib.FMT_BINARY)
        store.execute("INSERT INTO records(kind, key, value) VALUES('setting', 'icon-size', ?)", (value,))
        store.commit()
        store.close()
        self.tsd("sync", "dev", "host")
        self.assertIn("icon-size: 120", self.tsd("set", "dev").stdout.replace("=", ": "))


if __name__ == "__main__":
    tsd_folder.main()
