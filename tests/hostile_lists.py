#!/usr/bin/env python3
"""Property lists that mean harm, in every place that a host has one: what a whole command costs is bounded by their
bytes. Memory is the process's own peak, processor time is compared with that of a harmless list of the same size.

usage: hostile_lists.py TSD [unittest arguments]
"""

import os
import pathlib
import plistlib
import resource
import shutil
import struct
import subprocess
import sys
import unittest

import tsd_folder
from colliding_names import bytes_that_cancel_a_key, harmless, names_of_one_hash
from tsd_folder import DONE, FAILED, SOME_FAILED
from hostile_host import zipped

SIZE = 950_000
# Runs the program from a process that is small itself, as a child counts what it had of its parent's memory.
LAUNCHER = """
import os, subprocess, sys
process = subprocess.Popen(sys.argv[1:], stdin=subprocess.DEVNULL, stdout=subprocess.DEVNULL)
_, status, usage = os.wait4(process.pid, 0)
print(os.waitstatus_to_exitcode(status), usage.ru_maxrss << 10, usage.ru_utime + usage.ru_stime)
"""
BASE, EACH = 64 << 20, 16
# What a command does beside reading the list, and a factor that no quadratic reader stays below.
SECONDS, FACTOR = 2.0, 8


def marker(kind, count):
    return bytes([kind | count]) if count < 15 else bytes([kind | 15, 0x12]) + struct.pack(">I", count)


def text(content):
    return marker(0x50, len(content)) + content


def data(content):
    return marker(0x40, len(content)) + content


def array(*numbers):
    return marker(0xa0, len(numbers)) + b"".join(struct.pack(">I", number) for number in numbers)


def dictionary(entries):
    return marker(0xd0, len(entries)) + b"".join(struct.pack(">I", number) for number in (*entries, *entries.values()))


def binary(*objects):
    """A document of these objects, the last of which is its outermost."""
    table, offsets = b"bplist00", b""
    for each in objects:
        offsets += struct.pack(">I", len(table))
        table += each
    return table + offsets + struct.pack(">6xBBQQQ", 4, 4, len(objects), len(objects) - 1, len(table))


def within(value, objects):
    """The document of an app's ordinary entries, with one more, under the key "x", that is the last of the objects.
    `value` is an array of dictionaries or a dictionary, of strings."""
    def add(each):
        if isinstance(each, dict):
            entries = {add(key): add(entry) for key, entry in each.items()}
            all_objects.append(dictionary(entries))
        elif isinstance(each, list):
            all_objects.append(array(*[add(entry) for entry in each]))
        else:
            all_objects.append(each if isinstance(each, bytes) else text(each.encode()))
        return len(all_objects) - 1

    all_objects = list(objects)
    last = len(all_objects) - 1
    key = add("x")
    first = value[0] if isinstance(value, list) else value
    entries = {add(name): add(entry) for name, entry in first.items()}
    all_objects.append(dictionary({**entries, key: last}))
    top = len(all_objects) - 1
    if isinstance(value, list):
        all_objects.append(array(top, *[add(each) for each in value[1:]]))
    return binary(*all_objects)


def references(count):
    return [0] * count


PLACES = SIZE // 4
SHARED = {
    "one long text in many places": [text(b"x" * (SIZE // 2)), array(*references(PLACES // 2))],
    "one short text in many places": [text(b"x" * 100), array(*references(PLACES))],
    "one of data in many places": [data(b"x" * (SIZE // 2)), array(*references(PLACES // 2))],
    "nothing in many places": [array(), array(*references(PLACES))],
    "no entries in many places": [dictionary({}), array(*references(PLACES))],
    "arrays of arrays of arrays": [text(b"x" * 60), *[array(*[level] * 60) for level in range(64)]],
    "as much as is read": [text(b"x" * 80), array(*references(90_000))],
    "as much data as is read": [data(b"x" * 90_000), array(*references(80))],
    "harmless": [text(b"x" * SIZE)],
}


def xml(body, before=b""):
    return b'<?xml version="1.0" encoding="UTF-8"?>\n' + before + b'<plist version="1.0">' + body + b"</plist>"


def attributes(number):
    return b"".join(b'a%d="" ' % each for each in range(number))


XML = {
    "declared attributes": xml(b"<dict/>", b"<!DOCTYPE plist [<!ATTLIST plist " + b"".join(
        b'a%d CDATA "" ' % each for each in range(SIZE // 18)) + b">]>"),
    "attributes": xml(b"<dict><key>x</key><string " + attributes(SIZE // 10) + b"/></dict>"),
    "entities": xml(b"<dict><key>x</key><string>&e9;</string></dict>", b"<!DOCTYPE plist [<!ENTITY e0 'xxxxxxxxxx'>" + b"".join(
        b"<!ENTITY e%d '%s'>" % (each, b"&e%d;" % (each - 1) * 10) for each in range(1, 10)) + b"]>"),
    "empty dictionaries": xml(b"<dict><key>x</key><array>" + b"<dict/>" * (SIZE // 7) + b"</array></dict>"),
    "very deep": xml(b"<dict><key>x</key>" + b"<array>" * 500 + b"<true/>" * (SIZE // 7) + b"</array>" * 500 + b"</dict>"),
    "harmless": xml(b"<dict><key>x</key><string>" + b"x" * SIZE + b"</string></dict>"),
}


class Costs(tsd_folder.Folder):
    def setUp(self):
        super().setUp()
        self.apps = self.make(2)
        pathlib.Path("dev").rename("fresh-dev")
        pathlib.Path("host").rename("fresh-host")

    def renew(self):
        for each in ("dev", "host"):
            shutil.rmtree(each, ignore_errors=True)
            shutil.copytree("fresh-" + each, each)

    def cost(self, *arguments):
        """Peak memory and processor time of the command."""
        run = subprocess.run([sys.executable, "-c", LAUNCHER, tsd_folder.TSD, *arguments], capture_output=True,
                             text=True, check=True, timeout=300)
        code, memory, seconds = run.stdout.split()
        self.assertIn(int(code), (DONE, FAILED, SOME_FAILED), run.stderr)
        return int(memory), float(seconds)


class Lists(Costs):
    # Each puts a document made of the objects in its place, and answers the command that comes across it.

    def as_todo_list(self, make):
        todo = [{"identifier": app, "operation": "install", "version": "1", "name": app} for app in self.apps]
        pathlib.Path("host/ApplicationsSync.plist").write_bytes(make(todo))
        return "sync"

    def as_manifest(self, make):
        pathlib.Path("host", self.apps[0], "Info.plist").write_bytes(make({"KBBundleIdentifier": self.apps[0]}))
        return "sync"

    def as_metadata(self, make):
        pathlib.Path("host", self.apps[0], "HarluneMetadata.plist").write_bytes(make({"vantorId": "7"}))
        return "sync"

    def as_layout(self, make):
        pathlib.Path("host/PanelloIconState.plist").write_bytes(make({"x": "y"}))
        return "sync"

    def as_packages_manifest(self, make):
        content = make({"KBBundleIdentifier": self.apps[0]})
        pathlib.Path("host/Packages", self.apps[0] + ".pkg").write_bytes(
            zipped(self.apps[0], manifest=content))
        return "sync"

    def as_restore_list(self, make):
        pathlib.Path("host/Restore/RestoreApplications.plist").write_bytes(make({"title": "x"}))
        return "restore"

    PLACES = (as_todo_list, as_manifest, as_metadata, as_layout, as_packages_manifest, as_restore_list)

    def check(self, documents):
        for place in self.PLACES:
            costs = {}
            for name, make in documents.items():
                self.renew()
                command = place(self, make)
                size = sum(path.stat().st_size for path in pathlib.Path("host").rglob("*") if path.is_file())
                memory, seconds = costs[name] = self.cost(command, "dev", "host", "--progress", "none")
                if os.environ.get("SHOW_COSTS"):
                    print(f"{place.__name__:22} {name:32} {memory / 2**20:7.0f} MiB {seconds:6.2f} s", flush=True)
                with self.subTest(place.__name__, name=name):
                    self.assertLess(memory, BASE + EACH * max(size, SIZE))
            for name, (_, seconds) in costs.items():
                with self.subTest(place.__name__, name=name):
                    self.assertLess(seconds, SECONDS + FACTOR * costs["harmless"][1])

    def test_shared_objects(self):
        self.check({name: lambda value, objects=objects: within(value, objects) for name, objects in SHARED.items()})

    def test_documents_in_xml(self):
        self.check({name: lambda value, document=document: document for name, document in XML.items()})

    def test_a_list_with_shared_parts_takes_its_marks(self):
        for objects in SHARED.values():
            self.renew()
            self.as_todo_list(lambda value, objects=objects: within(value, objects))
            run = subprocess.run([tsd_folder.TSD, "sync", "dev", "host", "--progress", "none"], capture_output=True)
            written = pathlib.Path("dev/fs/var/mobile").rglob("ApplicationsSync.plist")
            if run.returncode == FAILED:
                continue  # it was refused as a whole
            for path in written:
                marks = [entry["operation"] for entry in plistlib.loads(path.read_bytes())]
                self.assertEqual(marks, ["INSTALLED"] * 2, path)


class Names(Costs):
    """Names that collide in every table that has no secret cost what others of their length cost."""

    def write(self, name, value):
        pathlib.Path("host", name).write_bytes(plistlib.dumps(value, fmt=plistlib.FMT_BINARY))

    def as_entries(self, names):
        self.write("ApplicationsSync.plist", [{"identifier": name, "operation": "keep"} for name in names])
        return "sync"

    def as_keys(self, names):
        self.write(f"{self.apps[0]}/Info.plist", {**dict.fromkeys(names, 1), "KBBundleIdentifier": self.apps[0]})
        return "sync"

    def as_icons(self, names):
        self.write("PanelloIconState.plist", names)
        return "sync"

    def as_demoted(self, names):
        self.write("Restore/com.vantor.Cellarum.DemotedApps.plist", {"AutomaticDowngrades": names})
        return "restore"

    def as_values(self, names):
        todo = [{"identifier": app, "operation": "install", "x": names} for app in self.apps]
        self.write("ApplicationsSync.plist", todo)
        return "sync"

    def test_names_that_collide(self):
        names, contents = names_of_one_hash(), bytes_that_cancel_a_key(60_000)
        for place, colliding in ((self.as_entries, names), (self.as_keys, names), (self.as_icons, names),
                                 (self.as_demoted, names), (self.as_values, names), (self.as_values, contents)):
            seconds = []
            for each in (harmless(colliding), colliding):
                self.renew()
                seconds.append(self.cost(place(each), "dev", "host", "--progress", "none")[1])
            with self.subTest(place.__name__, of=type(colliding[0])):
                if os.environ.get("SHOW_COSTS"):
                    print(f"{place.__name__:12} {seconds[0]:6.2f} s, colliding {seconds[1]:6.2f} s", flush=True)
                self.assertLess(seconds[1], SECONDS + 3 * seconds[0])


class Files(tsd_folder.Folder):
    def setUp(self):
        super().setUp()
        self.apps = self.make(2)

    def sparse(self, name, size):
        with open(name, "wb") as file:
            file.truncate(size)

    def limited(self):
        resource.setrlimit(resource.RLIMIT_AS, (1 << 30, 1 << 30))

    def tsd_limited(self, *arguments):
        return subprocess.run([tsd_folder.TSD, *arguments], capture_output=True, text=True, preexec_fn=self.limited)

    def test_sparse_files(self):
        self.sparse("host/ApplicationsSync.plist", 2 << 40)
        for command in ("sync", "plan"):
            run = self.tsd_limited(command, "dev", "host")
            self.assertEqual(run.returncode, FAILED)
            self.assertRegex(run.stderr, "host/ApplicationsSync.plist: File too large")

    def test_a_plan_takes_no_large_file(self):
        self.sparse(f"host/{self.apps[0]}/large", 3 << 30)
        run = self.tsd_limited("plan", "dev", "host")
        self.assertEqual(run.returncode, DONE, run.stderr)
        self.assertRegex(run.stderr, f"host/{self.apps[0]}/large: not pushed: more than")

    def test_a_long_table(self):
        path = pathlib.Path("host/Packages", self.apps[0] + ".pkg")
        archive = zipped(self.apps[0], ("A.app/x", b"x", 0o100644))
        begin, last, end = archive.index(b"PK\1\2"), archive.rindex(b"PK\1\2"), archive.rindex(b"PK\5\6")
        table = archive[begin:last] + 1_000_000 * archive[last:end]
        path.write_bytes(archive[:begin] + table + archive[end:end + 8] +
                         struct.pack("<HHLLH", 65535, 65535, len(table), begin, 0))
        run = self.tsd_limited("sync", "dev", "host", "--progress", "none")
        self.assertEqual(run.returncode, SOME_FAILED, run.stderr)
        self.assertRegex(self.tsd("status", "dev").stdout, "failed")
        self.assertIn("its table of entries is too long", self.tsd("why", "dev", self.apps[0]).stdout.replace("\n", " "))

    def test_refusals_are_counted(self):
        folder = pathlib.Path("host", self.apps[0])
        for number in range(500):
            os.mkfifo(folder / str(number))
        run = self.tsd("sync", "dev", "host", "--progress", "none")
        self.assertEqual(run.stderr.count("not pushed: a named pipe"), 20)
        self.assertIn("host: 480 more files were not pushed", run.stderr)


if __name__ == "__main__":
    tsd_folder.main()
