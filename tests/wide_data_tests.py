#!/usr/bin/env python3
"""What becomes of lists that hold far more than anybody reads, through the program and the plug-in as they are shipped.

usage: wide_data_tests.py TSD [unittest arguments]

The lists are another codec's, and of every width on both sides of where something changes.
"""

import collections
import datetime
import pathlib
import plistlib
import random
import zipfile

import tsd_folder
from tsd_folder import Folder

WIDTHS = (0, 8, 9, 65, 1000)
DOWNLOAD_INFO = "com.vantor.HarluneStore.downloadInfo"
# Ten, so that a list of apps by their identifiers is a wide one as well.
NAMES = ("Maps", "Größere Karten", "Карты", "地図帳", "خرائط", "नक़्शे", "Χάρτες", "แผนที่", "מפות", "🗺️")
ON_DEVICE = pathlib.Path("dev/fs/var/mobile/Library/ApplicationSync/HarluneStuff/ApplicationsSync.plist")


def read(path):
    return plistlib.loads(pathlib.Path(path).read_bytes())


def write(path, value, form):
    pathlib.Path(path).write_bytes(plistlib.dumps(value, fmt=form, sort_keys=False))


def filled_out(entries, width, dice):
    """The entries, somewhere among what nobody reads, up to so many keys."""
    def value(depth):
        kinds = [True, dice.randrange(-1 << 40, 1 << 40), 0.25, dice.choice(NAMES) * dice.randrange(9),
                 dice.randbytes(dice.choice((0, 1, 14, 15, 255, 256))), datetime.datetime(2024, 2, 29, 12, 0, 1),
                 [] if depth == 0 else [value(depth - 1) for _ in range(dice.randrange(4))],
                 {} if depth == 0 else {f"{dice.choice(NAMES)} {n}": value(depth - 1) for n in range(dice.choice((1, 9)))}]
        return dice.choice(kinds)

    unread = [(f"{dice.choice(NAMES)} {number}", value(2)) for number in range(width - len(entries))]
    cut = dice.randrange(len(unread) + 1)
    return dict([*unread[:cut], *entries.items(), *unread[cut:]])


class WideLists(Folder):
    def make_wide(self, width):
        """A host whose lists have so many keys each; its apps."""
        dice = random.Random(width)
        forms = [plistlib.FMT_XML, plistlib.FMT_BINARY]
        apps = self.make(10, "dev", "--files", "5", "--package-size", "60000")
        for place, app in enumerate(apps):
            manifest = {"KBBundleIdentifier": app, "KBBundleVersion": "2.0", "KBBundleDisplayName": NAMES[place]}
            account = filled_out({"VantorID": f"person {place % 2}", "DSPersonID": place % 2 + 7}, width, dice)
            metadata = {DOWNLOAD_INFO: filled_out({"accountInfo": account}, width, dice), "title": NAMES[place],
                        "vantorId": f"person {place % 2}", "bundleVersion": f"{place}.5"}
            if place % 3:
                metadata["is-auto-download"] = True
            write(f"host/{app}/Info.plist", filled_out(manifest, width, dice), forms[place % 2])
            write(f"host/{app}/HarluneMetadata.plist", filled_out(metadata, width, dice), forms[place % 2 - 1])
        todo = [{"identifier": app, "operation": "install", "version": "2.0", "name": name}
                for app, name in zip(apps, NAMES)]
        write("host/ApplicationsSync.plist", [filled_out(entry, width, dice) for entry in todo], forms[width % 2])
        restore = {app: filled_out({"HarluneMetadata": pathlib.Path(f"host/{app}/HarluneMetadata.plist").read_bytes()},
                                   width, dice) for app in apps}
        write("host/Restore/RestoreApplications.plist", restore, forms[width % 2 - 1])
        return apps

    def metadata_on_device(self):
        paths = pathlib.Path("dev/fs/var/containers/Bundle/Application").glob("*/HarluneMetadata.plist")
        return {value["title"]: value for value in map(read, paths)}

    def test_they_come_whole_and_what_is_read_is_found(self):
        for width in WIDTHS:
            with self.subTest(width):
                self.setUp()
                apps = self.make_wide(width)
                sent = read("host/ApplicationsSync.plist")
                report = self.sync("dev", "host")
                self.assertEqual({app["id"]: (app["name"], app["outcome"]) for app in report["apps"]},
                                 {app: (name, "INSTALLED") for app, name in zip(apps, NAMES)})
                # Nothing but the mark has changed in what lies on the disk.
                self.assertEqual(read(ON_DEVICE), [{**entry, "operation": "INSTALLED"} for entry in sent])
                self.assertCountEqual(self.document("query", "dev", "vantor-ids")["answer"], ["person 0", "person 1"])
                accounts = self.document("query", "dev", "accounts")["answer"]
                self.assertEqual({each["vantorID"]: each["DSID"] for each in accounts}, {"person 0": 7, "person 1": 8})
                before = self.metadata_on_device()
                self.assertEqual(before, {name: read(f"host/{app}/HarluneMetadata.plist")
                                          for app, name in zip(apps, NAMES)})
                self.tsd("backup", "dev")
                for value in before.values():
                    value.pop("is-auto-download", None)
                self.assertEqual(self.metadata_on_device(), before)

    def test_files_of_every_size_come_whole(self):
        """On both sides of what the host's files, a package and a copy are read and written in."""
        app, = self.make(1)
        dice = random.Random(1)
        files = {f"資料/piece {size}": dice.randbytes(size) for piece in (1, 1 << 10, 1 << 12, 1 << 16, 1 << 17, 1 << 18)
                 for size in (piece - 1, piece, piece + 1)}
        folder = pathlib.Path("host", app, "資料")
        folder.mkdir()
        with zipfile.ZipFile(f"host/Packages/{app}.pkg", "w") as package:
            package.write(f"host/{app}/Info.plist", "Größe.app/Info.plist")
            for place, (name, content) in enumerate(files.items()):
                pathlib.Path("host", app, name).write_bytes(content)
                package.writestr(f"Größe.app/{name}", content, (zipfile.ZIP_STORED, zipfile.ZIP_DEFLATED)[place % 2])
        self.sync("dev", "host")
        bundle, = pathlib.Path("dev/fs/var/containers/Bundle/Application").glob("*/*.app")
        for root in (ON_DEVICE.with_name(app), bundle):
            for name, content in files.items():
                self.assertEqual((root / name).read_bytes(), content, root / name)

    def test_restored_placeholders_have_names_and_versions(self):
        for width in WIDTHS:
            with self.subTest(width):
                self.setUp()
                apps = self.make_wide(width)
                report = self.document("restore", "dev", "host")
                self.assertEqual(report["missing"], [])
                self.assertEqual({app["id"]: (app["name"], app["version"]) for app in report["apps"]},
                                 {app: (name, f"{place}.5") for place, (app, name) in enumerate(zip(apps, NAMES))})
                self.tsd("store", "dev", apps[0], "--finish", "--package", f"host/Packages/{apps[0]}.pkg")
                self.assertEqual(self.metadata_on_device()[NAMES[0]], read(f"host/{apps[0]}/HarluneMetadata.plist"))


class Samples(Folder):
    def test_a_sample_is_as_wide_as_what_real_hosts_send(self):
        apps = self.make(12)
        todo = read("host/ApplicationsSync.plist")
        self.assertEqual({len(entry) for entry in todo}, {14})
        self.assertEqual({len(read(f"host/{app}/Info.plist")) for app in apps}, {40})
        self.assertLessEqual({len(read(f"host/{app}/HarluneMetadata.plist")) for app in apps}, {25, 26})
        self.assertTrue(any(not entry["name"].isascii() for entry in todo))
        self.sync("dev", "host")
        bundles = [[path for path in bundle.rglob("*") if path.is_file()]
                   for bundle in pathlib.Path("dev/fs/var/containers/Bundle/Application").glob("*/*.app")]
        sizes = collections.Counter(map(len, bundles))
        self.assertEqual(sizes[40], 1)
        self.assertTrue(all(3 <= size <= 12 or size == 40 for size in sizes), sizes)


if __name__ == "__main__":
    tsd_folder.main()
