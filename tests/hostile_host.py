#!/usr/bin/env python3
"""Hosts that mean harm, through whole syncs and restores. Whatever is wrong with one app, its neighbours are installed;
nothing beside the device is read or written.

usage: hostile_host.py TSD [unittest arguments]
"""

import collections
import io
import json
import os
import pathlib
import plistlib
import resource
import shutil
import socket
import stat
import struct
import subprocess
import sys
import tarfile
import tempfile
import unittest
import zipfile

TSD = None
DONE, FAILED, SOME_FAILED = 0, 1, 3
NOBODY = 65534
SECRET = b"what nobody but its owner may see"

# What is done to one app of a host, and what must be said of it: on standard error, where the app goes without what was
# refused and is installed all the same, or as the reason why it failed.
Row = collections.namedtuple("Row", "name make says reason", defaults=("", ""))


def digest(folder):
    """All there is to see of a tree, without opening what is no regular file."""
    facts = {}
    for path in pathlib.Path(folder).rglob("*"):
        status = path.lstat()
        content = path.read_bytes() if stat.S_ISREG(status.st_mode) else None
        target = os.readlink(path) if path.is_symlink() else None
        facts[os.fsencode(path)] = (status.st_mode, status.st_mtime_ns, content, target)
    return facts


# --- The host's folder. Each function is given the folder of the app concerned, or the path of its package.

def entry(make):
    return lambda folder, package: make(folder / "x")


def instead(name, make):
    """Something else in the place of that file of the app's, or of the whole folder."""
    def act(folder, package):
        path = folder / name
        shutil.rmtree(path) if path.is_dir() else path.unlink()
        make(path)
    return act


def sent(make):
    """Something else in the place of the package."""
    def act(folder, package):
        package.unlink()
        make(package)
    return act


def link(path):
    path.symlink_to(pathlib.Path("canary/secret").resolve())


def hard_link(path):
    os.link("canary/shared", path)


def make_socket(path):
    with socket.socket(socket.AF_UNIX) as listener:
        listener.bind(str(path))


def make_device(path):
    os.mknod(path, 0o600 | stat.S_IFCHR, os.makedev(1, 5))


def make_deep(path):
    os.makedirs(path / "/".join(["d"] * 300))


def make_wide(path):
    path.mkdir()
    for number in range(3000):
        path.joinpath(str(number)).touch()


FOLDERS = [
    Row("a link", entry(link), "/x: not pushed: a symbolic link"),
    Row("a link for a manifest", instead("Info.plist", link), "Info.plist: not pushed: a symbolic link"),
    Row("a link for metadata", instead("HarluneMetadata.plist", link), "Metadata.plist: not pushed: a symbolic link"),
    Row("a link for an icon", instead("AppIcon.png", link), "AppIcon.png: not pushed: a symbolic link"),
    Row("a link for a folder", instead("", lambda path: path.symlink_to("../canary")), "not pushed: a symbolic link"),
    Row("a link for a package", sent(link), reason="pkg: a symbolic link"),
    Row("a link among directories", entry(lambda path: path.symlink_to("..")), "/x: not pushed: a symbolic link"),
    # A hard link cannot be told from a file; the device gets a copy.
    Row("a hard link", entry(hard_link)),
    Row("a pipe", entry(os.mkfifo), "/x: not pushed: a named pipe"),
    Row("a pipe for a package", sent(os.mkfifo), reason="pkg: a named pipe"),
    Row("a folder for a package", sent(os.mkdir), reason="pkg: a folder"),
    Row("a folder for a manifest", instead("Info.plist", os.mkdir), "Info.plist: readFile failed: Is a directory"),
    Row("a file for a folder", instead("", pathlib.Path.touch), "Info.plist: readFile failed: Not a directory"),
    Row("a socket", entry(make_socket), "/x: not pushed: a socket"),
    Row("a deep tree", entry(make_deep), "/d/d/d/d/d/d/d/d/d: not pushed: nested more than 16 deep"),
    Row("a wide tree", entry(make_wide)),
    Row("a line end in a name", lambda folder, package: os.mkfifo(folder / "x\ny"), r"/x\?y: not pushed: a named pipe"),
    Row("a name in bytes", lambda folder, package: os.mkfifo(os.fsencode(folder) + b"/\xff"), r"/\?: not pushed"),
    Row("a backslash in a name", lambda folder, package: (folder / "..\\..\\x").touch()),
    Row("twins", lambda folder, package: (folder / "INFO.PLIST").touch()),
    Row("setuid", entry(lambda path: (path.touch(), path.chmod(0o6777)))),
]


def list_of(value, name=""):
    """The property list of an app's file, or of the host's."""
    content = value if isinstance(value, bytes) else plistlib.dumps(value, fmt=plistlib.FMT_BINARY)
    return lambda folder, package: (folder / name).write_bytes(content)


GARBAGE = b"bplist00 garbage, and no list at all, of some length"
MANIFEST, METADATA, LAYOUT = "Info.plist", "HarluneMetadata.plist", "../PanelloIconState.plist"
# Lists that the plug-in passes over in silence.
LISTS = [
    *[Row(f"{name} of {value!r}", list_of(value, name), f"{pathlib.Path(name).name}: {doing} failed: {reason}")
      for name, doing, values in (
          (MANIFEST, "reading the property list", {GARBAGE: r"byte \d+: ", b"": "an empty", ("x",): "it is not a dict"}),
          (METADATA, "reading the property list", {GARBAGE: r"byte \d+: ", b"": "an empty", "x": "it is not a dict"}),
          (LAYOUT, "setting the icon layout", {GARBAGE: r"byte \d+: ", "x": "it is not an array",
                                               ("a", 7): "entry 2 is no identifier", ("a", ""): "entry 2 is no identifier",
                                               (("a",), "b"): "entry 2 is no page", ((), (1,)): "entry 2 is no page"}),
          (LAYOUT, "reading the property list", {b"": "an empty document"}))
      for value, reason in values.items()],
]
FOR_ROOT = [Row("a device", entry(make_device), "/x: not pushed: a device")]
FOR_NOBODY = [
    Row("an unreadable folder", entry(lambda path: path.mkdir(0)), "/x: not pushed: Permission denied"),
    Row("an unreadable file", lambda folder, package: (folder / "Info.plist").chmod(0), "not pushed: Permission denied"),
    Row("an unreadable package", lambda folder, package: package.chmod(0), reason="pkg: Permission denied"),
]

# --- Packages: what stands in them beside a manifest, as (name, content, mode), and what is done to the archive then.


def zipped(app, *entries, then=lambda archive: archive, compression=zipfile.ZIP_STORED, manifest=None):
    buffer = io.BytesIO()
    with zipfile.ZipFile(buffer, "w", compression) as archive:
        manifest = manifest or plistlib.dumps({"KBBundleIdentifier": app, "KBBundleVersion": "9"}, fmt=plistlib.FMT_BINARY)
        for name, content, mode in [("A.app/Info.plist", manifest, 0o100644), *entries]:
            info = zipfile.ZipInfo(name)
            info.external_attr, info.compress_type = mode << 16, compression
            archive.writestr(info, content)
    return then(buffer.getvalue())


def package(*entries, **how):
    return lambda folder, path: path.write_bytes(zipped(folder.name, *entries, **how))


def file(name, content=b"x", mode=0o100644):
    return (name, content, mode)


def patched(offset, size, number):
    """A field of the last entry's in the table at the archive's end, where the archive says what it holds."""
    def patch(archive):
        at = archive.rindex(b"PK\1\2") + offset
        return archive[:at] + number.to_bytes(size, "little") + archive[at + size:]
    return patch


def encrypted(archive):
    at = archive.rindex(b"PK\3\4") + 6
    return patched(8, 2, 1)(archive[:at] + b"\1" + archive[at + 1:])


def overlapping(archive):
    """The last entry a thousand times over, with one content for all of them."""
    begin, last, end = archive.index(b"PK\1\2"), archive.rindex(b"PK\1\2"), archive.rindex(b"PK\5\6")
    table = archive[begin:last] + 1000 * archive[last:end]
    return archive[:begin] + table + archive[end:end + 8] + struct.pack("<HHLLH", 1001, 1001, len(table), begin, 0)


def tar_with_links(folder, path):
    with tarfile.open(path, "w") as archive:
        for kind in (tarfile.LNKTYPE, tarfile.SYMTYPE):
            member = tarfile.TarInfo("A.app/x")
            member.type, member.linkname = kind, "../../../canary/secret"
            archive.addfile(member)


def long_names(count, depth):
    return [file("A.app/" + str(number) + "/d" * depth) for number in range(count)]


PACKAGES = [
    Row("a way out", package(file("A.app/../../../../../canary/x")), reason="not a plain name"),
    Row("an absolute name", package(file("/var/mobile/x")), reason="an absolute name"),
    Row("backslashes", package(file("A.app/..\\..\\x")), reason="a backslash"),
    Row("nothing but backslashes", package(file("..\\..\\x")), reason="not a plain name"),
    Row("a link", package(file("A.app/l", b"../../../canary/secret", 0o120777)), reason="a link"),
    Row("a link and a file below", package(file("A.app/l", b"/", 0o120777), file("A.app/l/x")), reason="a link"),
    # What archives call a pipe is what came out of one.
    Row("a pipe", package(file("A.app/p", b"", 0o010644))),
    Row("a device", package(file("A.app/d", b"", 0o020644)), reason="neither a file nor a folder"),
    Row("twins", package(file("A.app/a"), file("A.app/A")), reason="in case only"),
    Row("twins beyond ASCII", package(file("A.app/ä"), file("A.app/Ä"))),
    Row("a file as a folder", package(file("A.app/a"), file("A.app/a/b")), reason="a file and a folder"),
    Row("deep", package(*long_names(1, 40)), reason="too deep"),
    Row("a bomb", package(file("A.app/b", bytes(8 << 20)), compression=zipfile.ZIP_DEFLATED), reason="File too large"),
    Row("overlaps", package(file("A.app/o"), then=overlapping)),
    Row("less than it holds", package(file("A.app/s", b"x" * 99), then=patched(24, 4, 5)), reason="Inconsistent.* size: 5 in"),
    Row("more than it holds", package(file("A.app/s", b"x" * 99), then=patched(24, 4, 1 << 30)), reason="Inconsistent.* size: 10"),
    Row("encrypted", package(file("A.app/e"), then=encrypted), reason="A.app/e.*encrypted"),
    Row("setuid", package(file("A.app/s", b"#!", 0o106755))),
    Row("cut", package(file("A.app/c"), then=lambda archive: archive[:-30]), reason="not a zip archive"),
    Row("a tape archive", tar_with_links, reason="not a zip archive"),
    Row("a garbage manifest", package(manifest=GARBAGE), reason=r"A.app/Info.plist.*byte \d+: "),
    Row("a manifest that is not a dictionary", package(manifest=plistlib.dumps(["x"])), reason="A.app/Info.plist.* not a dictionary"),
    Row("of another app", lambda folder, path: path.write_bytes(zipped("com.example.other")), reason="com.example.other"),
    Row("bytes for a name", package(file("A.app/bytes"), then=lambda all: all.replace(b"bytes", b"\xff\xfe\x80\xc0 "))),
]

IDENTIFIERS = ["", ".", "..", "../../../canary", "/canary", "a/b", "a/../../b", "..\\x", "a\nb", "x" * 5000, "/" * 900]


def nested(depth):
    value = "the innermost"
    for _ in range(depth):
        value = [value]
    return value


class Hosts(unittest.TestCase):
    def setUp(self):
        folder = tempfile.mkdtemp()
        self.addCleanup(shutil.rmtree, folder, ignore_errors=True)
        self.addCleanup(os.chdir, os.getcwd())
        os.chdir(folder)
        os.chmod(folder, 0o711)
        self.run_as = {}
        self.tsd("sample", "sample", "--apps", "3", "--package-size", "2000")
        self.apps = sorted(path.stem for path in pathlib.Path("sample/Packages").glob("*.pkg"))

    def tsd(self, *arguments, codes=(DONE,)):
        run = subprocess.run([TSD, *arguments], capture_output=True, timeout=120, stdin=subprocess.DEVNULL,
                             restore_signals=False, **self.run_as)
        self.assertIn(run.returncode, codes, run.stderr)
        return run

    def prepare(self):
        """A new device, host and canary; what to compare the latter two with when the device was used."""
        for each in ("dev", "host", "canary"):
            shutil.rmtree(each, ignore_errors=True)
        os.mkdir("dev")
        shutil.copytree("sample", "host")
        os.mkdir("canary")
        pathlib.Path("canary/secret").write_bytes(SECRET)
        pathlib.Path("canary/shared").write_bytes(b"the host's own")

    def use(self, command, *arguments):
        """Runs a command on the device with the host, as whoever owns them, and looks after the device and all else."""
        if "user" in self.run_as:
            for path in pathlib.Path(".").rglob("*"):
                os.chown(path, NOBODY, NOBODY, follow_symlinks=False)
        self.tsd("init", "dev")
        before = digest("host"), digest("canary"), os.listdir(".")
        run = self.tsd(command, "dev", "host", "--json", "--progress", "none", *arguments, codes=range(6))
        self.assertEqual((digest("host"), digest("canary"), os.listdir(".")), before)
        for path, (mode, _, content, _) in digest("dev").items():
            self.assertTrue(stat.S_ISREG(mode) or stat.S_ISDIR(mode), path)
            self.assertFalse(mode & (stat.S_ISUID | stat.S_ISGID), path)
            self.assertNotIn(SECRET, content or b"", path)
        return json.loads(run.stdout), os.fsdecode(run.stderr)

    def check(self, rows):
        app, *neighbours = self.apps
        for row in rows:
            with self.subTest(row.name):
                self.prepare()
                row.make(pathlib.Path("host", app), pathlib.Path("host/Packages", app + ".pkg"))
                report, said = self.use("sync")
                outcomes = {each["id"]: (each["outcome"], each["reason"]) for each in report["apps"]}
                self.assertEqual([outcomes[each] for each in neighbours], [("INSTALLED", "")] * 2)
                self.assertEqual(outcomes[app][0], "FAILED" if row.reason else "INSTALLED", outcomes[app])
                self.assertRegex(outcomes[app][1], row.reason or r"\A\Z")
                self.assertRegex(said, row.says or r"\A\Z")

    def test_folders(self):
        self.check(FOLDERS)

    def test_lists(self):
        self.check(LISTS)

    def test_packages(self):
        # Bombs are cut short by a limit that the process has, as nobody has the time for the device's own.
        self.run_as = {"preexec_fn": lambda: resource.setrlimit(resource.RLIMIT_FSIZE, (4 << 20, 4 << 20))}
        self.check(PACKAGES)

    @unittest.skipUnless(os.geteuid() == 0, "only root can make devices and act as somebody else")
    def test_as_root_and_as_nobody(self):
        self.check(FOR_ROOT)
        self.run_as = {"user": NOBODY, "group": NOBODY, "extra_groups": []}
        try:
            self.tsd("--version")
        except PermissionError as problem:
            self.skipTest(f"nobody may not run the program: {problem}")
        self.check(FOR_NOBODY)

    def test_identifiers(self):
        self.prepare()
        todo = plistlib.loads(pathlib.Path("host/ApplicationsSync.plist").read_bytes())
        odd = [{"identifier": each, "operation": operation, "version": "1", "name": each}
               for each in IDENTIFIERS for operation in ("install", "remove")]
        pathlib.Path("host/ApplicationsSync.plist").write_bytes(plistlib.dumps(odd + todo, fmt=plistlib.FMT_BINARY))
        report, _ = self.use("sync")
        installed = {each["id"] for each in report["apps"] if each["outcome"] == "INSTALLED"}
        self.assertEqual(installed, set(self.apps))

    def test_restores(self):
        self.prepare()
        path = pathlib.Path("host/Restore/RestoreApplications.plist")
        apps = plistlib.loads(path.read_bytes())
        some = next(iter(apps.values()))
        deep = {"HarluneMetadata": plistlib.dumps({"title": "deep", "in it": nested(510)}, fmt=plistlib.FMT_BINARY)}
        odd = {each: some for each in IDENTIFIERS}
        path.write_bytes(plistlib.dumps({**odd, "com.example.deep": deep, **apps}, fmt=plistlib.FMT_BINARY))
        self.use("restore")
        status = json.loads(self.tsd("status", "dev", "--json").stdout)
        self.assertEqual({each["id"] for each in status["apps"] if each["state"]} - {"com.example.deep"}, set(apps))


    def test_demoted_lists(self):
        automatic = '"AutomaticDowngrades"'
        for value, reason in ((GARBAGE, r"byte \d+: "), (b"", "an empty document"), (["x"], "it is not a dictionary"),
                              ({"AutomaticDowngrades": self.apps[0]}, f"{automatic} is not an array"),
                              ({"AutomaticDowngrades": [self.apps[0], 7]}, f"{automatic}: entry 2 is no identifier")):
            with self.subTest(value):
                self.prepare()
                list_of(value, "com.vantor.Cellarum.DemotedApps.plist")(pathlib.Path("host/Restore"), None)
                report, said = self.use("restore")
                self.assertRegex(said, rf"DemotedApps.plist: reading the property list failed: {reason}")
                self.assertEqual({each["outcome"] for each in report["apps"]}, {"PLACED"})

    def test_metadata_on_a_device(self):
        self.prepare()
        self.use("sync")
        path = next(pathlib.Path("dev/fs/var/containers").rglob("HarluneMetadata.plist"))
        for value, reason in ((GARBAGE, r"byte \d+: "), (["x"], "it is not a dictionary")):
            list_of(value, path.name)(path.parent, None)
            for command, codes in ((("backup", "dev"), [FAILED]), (("query", "dev", "accounts"), [DONE])):
                with self.subTest(value, command=command):
                    said = os.fsdecode(self.tsd(*command, codes=codes).stderr)
                    self.assertRegex(said, rf"{path.name}: reading the property list failed: {reason}")


if __name__ == "__main__":
    TSD = str(pathlib.Path(sys.argv.pop(1)).resolve())
    unittest.main()
