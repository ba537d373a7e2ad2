#!/usr/bin/env python3
"""Hosts made by hand: `tsd host` and `tsd pack`.

usage: host_tests.py TSD [unittest arguments]
"""

import os
import pathlib
import plistlib
import shutil
import zipfile

import tsd_folder
from tsd_folder import DONE, FAILED, SOME_FAILED, USAGE, Folder, says, tree_of

TODO = "ApplicationsSync.plist"
RESTORED, DEMOTED = "Restore/RestoreApplications.plist", "Restore/com.vantor.Cellarum.DemotedApps.plist"


def plist(path):
    return plistlib.loads(pathlib.Path(path).read_bytes())


def write(path, value, form=plistlib.FMT_XML):
    pathlib.Path(path).parent.mkdir(parents=True, exist_ok=True)
    pathlib.Path(path).write_bytes(plistlib.dumps(value, fmt=form))


class Hosts(Folder):
    def setUp(self):
        super().setUp()
        self.tsd("sample", "made", "--apps", "3")
        self.apps = [entry["identifier"] for entry in plist(f"made/{TODO}")]
        self.packages = [f"made/Packages/{app}.pkg" for app in self.apps]

    def bundle(self, app, folder, **manifest):
        """An app's folder as its developer has it."""
        write(f"{folder}/Info.plist", {"KBBundleIdentifier": app, "KBBundleVersion": "1.5",
                                       "KBBundleDisplayName": "Übung", "KBBundleIconFile": "Icon.png"} | manifest)
        shutil.copy(f"made/{self.apps[0]}/AppIcon.png", f"{folder}/Icon.png")
        write(f"{folder}/HarluneMetadata.plist", {"title": "Übung", "bundleVersion": "1.5"})
        pathlib.Path(folder, "größe").mkdir()
        pathlib.Path(folder, "größe", "empty").touch()
        pathlib.Path(folder, "run").write_bytes(b"x" * 300000)
        os.chmod(f"{folder}/run", 0o755)

    def test_a_host_from_nothing_to_a_synced_and_a_restored_phone(self):
        self.tsd("host", "new", "host")
        self.bundle("com.example.own", "Own.app")
        self.tsd("host", "add", "host", "Own.app", *self.packages[:2], "--demoted", "by-hand")
        self.assertEqual([(entry["identifier"], entry["operation"]) for entry in plist(f"host/{TODO}")],
                         [(app, "install") for app in ["com.example.own", *self.apps[:2]]])
        self.assertEqual(plist(f"host/{TODO}")[0]["name"], "Übung")
        self.assertEqual(pathlib.Path("host/com.example.own/Icon.png").read_bytes(),
                         pathlib.Path("Own.app/Icon.png").read_bytes())
        self.assertEqual(plist(f"host/{DEMOTED}"), {"IntentionalDowngrades": ["com.example.own", *self.apps[:2]]})
        self.assertEqual(self.document("host", "check", "host")["findings"], [])
        self.tsd("init", "dev")
        self.assertEqual({app["outcome"] for app in self.sync("dev", "host")["apps"]}, {"INSTALLED"})
        [run] = pathlib.Path("dev/fs").rglob("Own.app/run")
        self.assertTrue(os.access(run, os.X_OK))
        self.tsd("init", "restored")
        answer = self.document("restore", "restored", "host", "--progress", "none")
        self.assertEqual({app["outcome"] for app in answer["apps"]}, {"PLACED"})
        self.tsd("host", "remove", "host", self.apps[0])
        self.tsd("host", "remove", "host", self.apps[1], "--uninstall")
        self.assertEqual([path for path in tree_of("host") if self.apps[0] in path or self.apps[1] in path], [])
        self.assertEqual(list(plist(f"host/{RESTORED}")), ["com.example.own"])
        self.assertEqual({app["id"]: app["outcome"] for app in self.sync("dev", "host")["apps"]},
                         {"com.example.own": "INSTALLED", self.apps[1]: "REMOVED"})

    def test_what_is_there_is_not_overwritten_unasked(self):
        self.tsd("host", "new", "host")
        self.tsd("host", "add", "host", self.packages[0])
        self.bundle(self.apps[0], "New.app")
        self.bundle("com.example/../evil", "Evil.app")
        self.bundle("com.example.link", "Link.app")
        os.symlink("/etc/passwd", "Link.app/link")
        self.bundle("com.example.twin", "Twin.app")
        shutil.copytree("Twin.app/größe", "Twin.app/GRÖßE".replace("Ö", "ö"))
        pathlib.Path("damaged.pkg").write_bytes(pathlib.Path(self.packages[1]).read_bytes()[:-4000])
        pathlib.Path("other.pkg").write_text("something else")
        pathlib.Path("empty").mkdir()
        table = [
            (("host", "new", "host"), FAILED, "host: there is something already"),
            (("host", "new", "other.pkg"), FAILED, "other.pkg: there is something already"),
            (("host", "add", "host", self.packages[1], self.packages[0]), FAILED, f"{self.apps[0]}.pkg: there is"),
            (("host", "add", "host", self.packages[1], self.packages[1]), FAILED, "another one of the app"),
            (("host", "add", "host", self.packages[1], "Evil.app"), FAILED, "Evil.app: \"com.example/../evil\" cannot"),
            (("host", "add", "host", self.packages[1], "Link.app"), FAILED, "Link.app/link: a symbolic link"),
            (("host", "add", "host", "Twin.app"), FAILED, "in case only"),
            (("host", "add", "host", "damaged.pkg"), FAILED, "damaged.pkg: "),
            (("host", "add", "host", "nowhere.pkg"), FAILED, "nowhere.pkg: No such file"),
            (("host", "add", "host", "empty"), FAILED, "empty: no app is in it"),
            (("host", "add", "nowhere", self.packages[1]), FAILED, "nowhere: No such file"),
            (("host", "remove", "host", self.apps[0], self.apps[0][:-1]), FAILED, f"did you mean '{self.apps[0]}'?"),
            (("host", "add", "host"), USAGE, "a package or a folder is expected"),
            (("host", "remove", "host", self.apps[0], "--restore"), USAGE, "belong to 'host add'"),
            (("host", "check", "host", self.apps[0]), USAGE, "nothing is expected"),
            (("pack", "New.app", "-o", "other.pkg"), FAILED, "other.pkg: there is something already"),
            (("pack", "New.app", "-o", "New.app/new.pkg"), FAILED, "New.app/new.pkg: this is in the folder"),
            (("pack", "Twin.app", "-o", "twin.pkg"), FAILED, "in case only"),
            (("pack", "New.app", "-o", "nowhere/new.pkg"), FAILED, "nowhere/new.pkg: No such file"),
        ]
        before = tree_of(".")
        for line, code, text in table:
            with self.subTest(" ".join(line)):
                self.assertRegex(self.tsd(*line, code=code).stderr, says(text))
                after = tree_of(".")
                self.assertEqual([path for path in {**before, **after} if before.get(path) != after.get(path)], [])
        self.tsd("host", "add", "host", "New.app", "--replace")
        self.assertEqual(plist(f"host/{TODO}")[0]["version"], "1.5")
        self.assertEqual(sorted(os.listdir(f"host/{self.apps[0]}")),
                         ["HarluneArtwork", "HarluneMetadata.plist", "Icon.png", "Info.plist"])
        self.assertEqual(sorted(os.listdir("host")), sorted([TODO, "Packages", self.apps[0]]))

    def test_a_list_keeps_its_form_and_what_is_not_ours(self):
        write("host/" + TODO, ["odd", {"identifier": self.apps[0], "operation": "remove", "mine": 1}], plistlib.FMT_BINARY)
        write("host/PanelloIconState.plist", [[self.apps[0], "com.example.other"], [self.apps[0]]])
        self.tsd("host", "add", "host", self.packages[0], "--replace")
        self.assertEqual(pathlib.Path("host", TODO).read_bytes()[:6], b"bplist")
        odd, entry = plist(f"host/{TODO}")
        self.assertEqual((odd, entry["operation"], entry["mine"]), ("odd", "install", 1))
        self.tsd("host", "remove", "host", self.apps[0])
        self.assertEqual(plist(f"host/{TODO}"), ["odd"])
        self.assertEqual(plist("host/PanelloIconState.plist"), [["com.example.other"], []])

    def test_a_package_is_the_same_each_time(self):
        self.bundle("com.example.own", "Own.app")
        pathlib.Path("around").mkdir()
        shutil.copytree("Own.app", "around/Own.app")
        for folder, package in [("Own.app", "one.pkg"), ("around", "two.pkg")]:
            self.assertEqual(self.document("pack", folder, "-o", package)["id"], "com.example.own")
        self.assertEqual(pathlib.Path("one.pkg").read_bytes(), pathlib.Path("two.pkg").read_bytes())
        with zipfile.ZipFile("one.pkg") as package:
            self.assertIn("Own.app/größe/empty", package.namelist())

    def test_check_foretells_what_a_sync_comes_to(self):
        self.tsd("sample", "host", "--apps", "9", "--demo")
        apps = [entry["identifier"] for entry in plist(f"host/{TODO}")]
        os.remove(f"host/Packages/{apps[1]}.pkg")
        shutil.copy(f"host/Packages/{apps[3]}.pkg", f"host/Packages/{apps[2]}.pkg")
        # Whole as far as its manifest, which is all that a plan looks at.
        rest = pathlib.Path(f"host/Packages/{apps[4]}.pkg")
        content = bytearray(rest.read_bytes())
        content[200000:200010] = bytes(byte ^ 0xFF for byte in content[200000:200010])
        rest.write_bytes(content)
        todo = plist(f"host/{TODO}")
        todo[5]["operation"] = "instal"
        write(f"host/{TODO}", todo)
        check = self.document("host", "check", "host", code=SOME_FAILED)
        self.tsd("init", "dev")
        sync = self.sync("dev", "host", code=SOME_FAILED)
        missed = {app["id"] for app in sync["apps"] if app["outcome"] not in ["INSTALLED", "REMOVED", "ABSENT"]}
        self.assertEqual(len(missed), 6)
        self.assertEqual({each["app"] for each in check["findings"] if each["weight"] == "problem"}, missed)
        [finding] = [each for each in check["findings"] if each.get("app") == apps[5]]
        line = pathlib.Path(f"host/{TODO}").read_text().splitlines()[:finding["line"]]
        self.assertEqual((line[-1].strip(), sum("<dict>" == each.strip() for each in line if each.startswith("\t<"))),
                         ("<dict>", 6))

    def test_check_finds_what_is_odd(self):
        app = self.apps[0]
        # What is done to the host, and the finding: its weight, file, line, text and code. A line of 0: none.
        table = [
            (lambda: os.symlink(TODO, "host/link"), DONE, "note", "link", 0, "it is not pushed: a symbolic link"),
            (lambda: os.mkdir("host/com.example.stray"), DONE, "note", "com.example.stray", 0, "no entry of the todo"),
            (lambda: os.rename("host/Packages", "host/packages"), FAILED, "error", "packages", 0, "did you mean"),
            (lambda: pathlib.Path(f"host/{TODO}").write_text("<plist>\n<array>\n<dict>\n</array>"), FAILED, "error", TODO,
             4, "mismatched tag"),
            (lambda: write(f"host/{TODO}", {}), FAILED, "error", TODO, 0, "it is not an array"),
            (lambda: os.remove(f"host/{app}/Info.plist"), DONE, "note", f"{app}/Info.plist", 0, "no such file"),
            (lambda: shutil.rmtree(f"host/{app}"), DONE, "note", app, 0, "no such folder"),
            (lambda: [pathlib.Path(f"host/{app}", name).write_text("no PNG") for name in ["AppIcon.png", "HarluneArtwork"]],
             DONE, "note", app, 0, "no icon"),
            (lambda: write("host/PanelloIconState.plist", [[app], [3]]), DONE, "note", "PanelloIconState.plist", 8,
             "entry 2 is no page of identifiers"),
            (lambda: write(f"host/{RESTORED}", {app: {}}), SOME_FAILED, "problem", RESTORED, 5, "it is passed over"),
            (lambda: write(f"host/{app}/HarluneMetadata.plist", {"title": "x", "vantorId": 7}), DONE, "note",
             f"{app}/HarluneMetadata.plist", 7, '"vantorId" is no text'),
            (lambda: write(f"host/{RESTORED}", {app: {"HarluneMetadata": plistlib.dumps({"title": 7})}}), DONE, "note",
             RESTORED, 5, '"HarluneMetadata": "title" is no text'),
            (lambda: pathlib.Path(f"host/{RESTORED}").write_text("?"), FAILED, "error", RESTORED, 0, "neither an XML"),
            (lambda: write(f"host/{DEMOTED}", {"AutomaticDowngrades": ["com.example.x"]}), DONE, "note", DEMOTED, 5,
             "not in the restore list"),
        ]
        for change, code, weight, file, line, text in table:
            with self.subTest(text):
                shutil.rmtree("host", ignore_errors=True)
                shutil.copytree("made", "host")
                change()
                found = self.document("host", "check", "host", code=code)["findings"]
                self.assertTrue(any((each["weight"], each["file"], each.get("line", 0)) == (weight, f"host/{file}", line)
                                    and text in each["text"] and each["remedy"] for each in found), found)

    def test_restore_lists_of_any_size(self):
        for count in [0, 7]:
            self.tsd("sample", f"host{count}", "--apps", "8", "--restored", str(count))
            self.assertEqual(len(plist(f"host{count}/{RESTORED}")), count)
        self.assertEqual(len(plist(f"host7/{DEMOTED}")["IntentionalDowngrades"]), 2)


if __name__ == "__main__":
    tsd_folder.main()
