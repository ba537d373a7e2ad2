#!/usr/bin/env python3
"""The program from its command line: exit codes, what stands on which stream, and the state of devices afterwards.

usage: command_line_tests.py TSD [unittest arguments]
"""

import collections
import contextlib
import fcntl
import glob
import json
import os
import pathlib
import re
import shutil
import sqlite3
import subprocess
import tempfile

import tsd_folder
from tsd_folder import BUSY, DONE, FAILED, USAGE, Folder, says, tree_of

# A command line in a folder that has an empty device `dev`, a host `host` of 3 apps and a few things that are neither;
# what its exit code, standard output and standard error have to be (regular expressions; empty output where None).
Row = collections.namedtuple("Row", "line code out err", defaults=(None, None))

COMMAND_LINES = [
    # What the program says about itself.
    Row("--help", DONE, r"Subcommands:(.|\n)*sample(.|\n)*Exit codes:"),
    Row("--version", DONE, r"^tsd \d+\.\d+\.\d+$"),
    Row("sync --help", DONE, r"--asset(.|\n)*--end-phase(.|\n)*--inject"),
    Row("completion tcsh", USAGE, err=says("tcsh")),
    Row("manual file", FAILED, err=says("file: ")),
    # Command lines that make no sense.
    Row("", USAGE, err=says("subcommand")),
    Row("frobnicate dev", USAGE, err=says("there is no subcommand 'frobnicate'")),
    Row("sync dev", USAGE, err=says("HOST is required")),
    Row("status dev --frobnicate", USAGE, err=says("--frobnicate")),
    Row("status dev --progress loud", USAGE, err=says("loud")),
    Row("sync dev host --transfers 0", USAGE, err=says("--transfers")),
    Row("sync dev host --transfers many", USAGE, err=says("many")),
    Row("sync dev host --end-phase maybe", USAGE, err=says("maybe")),
    Row("sync dev host --asset com.example.a", USAGE, err=says("APP:KEY=VALUE is expected")),
    Row("sync dev host --asset com.example.a:colour=red", USAGE, err=says("colour=red")),
    Row("sync dev host --asset com.example.a:isDownload=perhaps", USAGE, err=says("isDownload=perhaps")),
    Row("sync dev host --asset com.example.a:completedAssetParts=2x", USAGE, err=says("completedAssetParts=2x")),
    Row("sync dev host --inject nowhere=fail", USAGE, err=says("nowhere")),
    Row("sync dev host --inject writeAtomically=explode", USAGE, err=says("explode")),
    Row("sync dev host --inject writeAtomically", USAGE, err=says("writeAtomically")),
    Row("query dev weather", USAGE, err=says("weather")),
    Row("set dev app-removal", USAGE, err=says("KEY=VALUE is expected")),
    Row("set dev app-removal=sometimes", USAGE, err=says("sometimes")),
    Row("set dev app-removal=forbidden colour=red", USAGE, err=says("colour")),
    Row("store dev com.example.a --package host/ApplicationsSync.plist", USAGE, err=says("--finish")),
    Row("store dev com.example.a --type 99999999999999999999", USAGE, err=says("99999999999999999999")),
    Row("sample new --package-size -5", USAGE, err=says("-5")),
    Row("init ''", USAGE, err=says("DEVICE")),
    Row("sample new --demo --apps 4", USAGE, err=says("--demo")),
    # Things that are not what they should be; the device stays as it is.
    Row("init dev", FAILED, err=says("dev")),
    Row("init file/below", FAILED, err=says("file/below")),
    Row("status nowhere", FAILED, err=says("nowhere: No such file")),
    Row("status host", FAILED, err=says("host: not a device")),
    Row("status file", FAILED, err=says("file: not a folder")),
    Row("status broken", FAILED, err=says("broken")),
    Row("sync dev nowhere", FAILED, err=says("nowhere: No such file")),
    Row("sync dev file", FAILED, err=says("file: not a folder")),
    Row("sync dev oddhost --progress none", FAILED, err=says("oddhost/ApplicationsSync.plist: a symbolic link")),
    Row("restore dev nowhere", FAILED, err=says("nowhere: No such file")),
    Row("sample host", FAILED, err=says("host: there is something already")),
    Row("uninstall dev com.example.nobody", FAILED, err=says("com.example.nobody")),
    Row("store dev com.example.a --finish --package nowhere", FAILED, err=says("nowhere: No such file")),
    Row("status dev --log nowhere/log", FAILED, err=says("nowhere/log: No such file")),
    Row("home dev -o nowhere/home.png", FAILED, err=says("nowhere/home.png: No such file")),
    Row("home dev -o host", FAILED, err=says("host: a folder")),
    Row("home dev -o /dev/null", FAILED, err=says("/dev/null: a ")),
    Row("query dev metrics --plugin nowhere.so", FAILED, err=says("nowhere.so: the plug-in is not there")),
    Row("query dev metrics --plugin file", FAILED, err=says("file: cannot be loaded as a plug-in")),
    Row("query dev metrics --plugin C-LIBRARY", FAILED, err=says("no entry point 'TSPluginTable'")),
    # What goes well says nothing on standard error.
    Row("status dev", DONE, r"^No apps\.$"),
    Row("help", DONE, r"Subcommands:(.|\n)*Exit codes:"),
    Row("help sync", DONE, r"tsd sync(.|\n)*--end-phase"),
    Row("help weather", USAGE, err=says("weather")),
    Row("points", DONE, r"^cancelForReason +RV\w+::cancelForReason, RV(.|\n)*^transfer +each chunk(.|\n)*^writeAtomically +FileSystem::"),
    Row("set dev", DONE, r"^app-installation=allowed$(.|\n)*^icon-size=120$"),
    Row("home dev -o home.png", DONE, r"^home\.png: no apps\.$"),
    Row("home dev", DONE, r"^dev: no apps on the home screen\.$"),
    Row("query dev metrics", DONE, r"^_Count 0$"),
    Row("query dev disabled-asset-types", DONE, r"^none$"),
    Row("sync dev emptyhost --progress none", DONE, r"^Nothing to do\.$"),
    Row("restore dev emptyhost --progress none", DONE, r"^Nothing to do"),
    Row("backup dev", DONE, r"ready"),
    Row("clear dev", DONE, r"cleared"),
]

# The same with --json: standard output is one document, whatever happens.
DOCUMENTS = [
    Row("frobnicate --json", USAGE, r'"result": "failed"', r"frobnicate"),
    Row("sync dev --json", USAGE, r'"command": "sync"', r"HOST"),
    Row("status nowhere --json", FAILED, r'"message": "nowhere: No such file', r"nowhere"),
    Row("sync dev nowhere --json", FAILED, r'"exitCode": 1', r"nowhere"),
    Row("sync dev emptyhost --json --progress none", DONE, r'"result": "done"'),
    Row("restore dev emptyhost --json --progress none", DONE, r'"missing": \[\]'),
    Row("restore dev host --type 1 --json --progress none", DONE, r'"missing": \[\]'),
    Row("set dev icon-size=120 --json", DONE, r'"icon-size": "120"'),
    Row("home dev -o home.png --json", DONE, r'"pages": \[\]'),
    Row("query dev vantor-ids --json", DONE, r'"answer": \[\]'),
    Row("status dev --json", DONE, r'"coordinators": \[\]'),
]


def c_library():
    """The one that this process runs with, as others may lie about for other processors."""
    return re.search(r"\S+/libc\.so\.6$", pathlib.Path("/proc/self/maps").read_text(), re.MULTILINE)[0]


def records_of(store):
    """What the store remembers, in whatever order its file has it."""
    with tempfile.TemporaryDirectory() as folder:
        for file in glob.glob(glob.escape(store) + "*"):
            shutil.copy(file, folder)
        with contextlib.closing(sqlite3.connect(folder + "/device.db")) as database:
            return set(database.execute("SELECT kind, key, value FROM records"))


def picture():
    """All but the locks, which tell who holds them, and the runs that are kept."""
    files = {name: content for name, content in tree_of(".").items()
             if not {"lock", "runs"} & set(name.split("/"))}
    return {name: records_of(name) if name == "dev/device.db" else content for name, content in files.items()
            if not name.startswith("dev/device.db-")}


class CommandLines(Folder):
    def setUp(self):
        super().setUp()
        self.make()
        os.mkdir("emptyhost")
        pathlib.Path("emptyhost/ApplicationsSync.plist").write_text("<plist version='1.0'><array/></plist>")
        os.mkdir("oddhost")
        os.symlink("../host/ApplicationsSync.plist", "oddhost/ApplicationsSync.plist")
        os.makedirs("broken/fs")
        pathlib.Path("broken/device.db").write_text("not a database, but long enough to be looked at" * 40)
        pathlib.Path("file").write_text("a file")

    def check(self, row):
        with self.subTest(row.line):
            line = ["" if word == "''" else word for word in row.line.replace("C-LIBRARY", c_library()).split()]
            before = picture() if row.code != DONE else None
            run = self.tsd(*line, code=row.code)
            self.assertRegex(run.stdout, re.compile(row.out or r"\A\Z", re.MULTILINE))
            self.assertRegex(run.stderr, row.err or r"\A\Z")
            if before is not None:
                self.assertEqual(picture(), before)
            return run

    def test_command_lines(self):
        for row in COMMAND_LINES:
            self.check(row)

    def test_documents(self):
        for row in DOCUMENTS:
            run = self.check(row)
            if run:
                self.assertEqual(json.loads(run.stdout)["schema"], 1)

    def test_a_device_in_use_names_its_holder(self):
        self.tsd("backup", "dev")
        with open("dev/lock", "r+") as lock:
            fcntl.flock(lock, fcntl.LOCK_EX)
            lock.write("4711 (tsd sync dev host)\n")
            lock.flush()
            self.assertRegex(self.tsd("backup", "dev", code=BUSY).stderr, says("dev: in use by process 4711 (tsd sync"))
        self.tsd("status", "dev")


class Shells(Folder):
    """What is made of the options besides the help: completions and manual pages."""

    def make_host(self):
        for name in ("Packages", "Restore", "com.example.ferrystead", "com.example.folder"):
            os.makedirs("host/" + name)
        pathlib.Path("host/Packages/com.example.ferrystead.pkg").touch()

    def test_completion_in_bash(self):
        # Words as bash splits them at "=", the last one up to the cursor; what it offers.
        table = [
            ("sy", "sync"),
            ("sync --pr", "--progress"),
            ("sync --progress ", "auto,plain,tty,none"),
            ("sync --progress = t", "tty"),
            ("set d app-removal =", "allowed,forbidden"),
            ("set d app-removal = forbidden icon", "icon-size="),
            ("query a", "a folder"),
            ("query d --json m", "metrics"),
            ("why dev com.e", "com.example.a"),
            ("sync d h --inject setInst", "setInstallOptions=,setInstallTargetType="),
            ("sync d h --inject setInstallOptions = kill", "kill,kill-after"),
            ("query d metrics m", ""),
            ("sync d a", "a folder"),
            ("sync d --log a", "a folder,a file"),
            ("sync --transfers ", ""),
            ("sync dev host --asset com.example.f", "com.example.ferrystead:"),
            ("sync dev host --asset com.example.ferrystead : st", "stall"),
            ("host remove host com.example.f", "com.example.ferrystead,com.example.folder"),
            ("host remove host ", "com.example.ferrystead,com.example.folder"),
            ("host add host a", "a folder,a file"),
            ("nothing a", ""),
        ]
        os.mkdir("a folder")
        pathlib.Path("a file").touch()
        self.tsd("init", "dev")
        self.tsd("store", "dev", "com.example.a")
        self.make_host()
        pathlib.Path("completion").write_text(self.tsd("completion", "bash").stdout)
        ask = """source completion; COMP_WORDS=(tsd "$@"); COMP_CWORD=$#; _tsd; IFS=,; echo "${COMPREPLY[*]}" """
        path = {"PATH": f"{pathlib.Path(tsd_folder.TSD).parent}:{os.environ['PATH']}"}
        for line, offered in table:
            with self.subTest(line):
                run = subprocess.run(["bash", "-uc", ask, "bash", *line.split(" ")], capture_output=True, text=True,
                                     env=os.environ | path)
                self.assertEqual(run.stderr, "")
                self.assertEqual(set(run.stdout.strip().split(",")), set(offered.split(",")))

    def test_completions_of_other_shells_can_be_read(self):
        for shell in filter(shutil.which, ["bash", "zsh", "fish"]):
            pathlib.Path(shell).write_text(self.tsd("completion", shell).stdout)
            run = subprocess.run([shell, "-n", shell], capture_output=True, text=True)
            self.assertEqual((run.returncode, run.stderr), (0, ""))
        if shutil.which("zsh"):
            ask = "source zsh && print $_comps[tsd]"
            run = subprocess.run(["zsh", "-fc", ask], capture_output=True, text=True, env=os.environ | {"HOME": os.getcwd()})
            self.assertEqual(run.stdout, "_tsd\n", run.stderr)

    def test_completion_in_fish(self):
        if not shutil.which("fish"):
            self.skipTest("no fish is here")
        os.mkdir("folder")
        self.make_host()
        self.tsd("init", "dev")
        self.tsd("store", "dev", "com.example.a")
        pathlib.Path("completion").write_text(self.tsd("completion", "fish").stdout)
        path = {"PATH": f"{pathlib.Path(tsd_folder.TSD).parent}:{os.environ['PATH']}", "HOME": os.getcwd()}
        for line, offered in [("sync f", "folder/"), ("set d", "dev/"), ("set dev app-rem", "app-removal=allowed,app-removal=forbidden"),
                              ("set dev app-removal=forbidden icon", "icon-size="), ("query dev --log f met", "metrics"),
                              ("host che", "check"), ("host check f", "folder/"), ("query dev metrics f", ""),
                              ("why dev com.", "com.example.a"),
                              ("host remove host ", "com.example.ferrystead,com.example.folder"),
                              ("host add host hos", "host/"), ("sync --transfers 3 dev f", "folder/")]:
            with self.subTest(line):
                run = subprocess.run(["fish", "-c", f"source completion; complete -C 'tsd {line}'"], capture_output=True,
                                     text=True, env=os.environ | path)
                self.assertEqual({row.split("\t")[0] for row in run.stdout.splitlines()},
                                 set(filter(None, offered.split(","))), run.stderr)

    def actions(self):
        """Of a rule, as the completion has them."""
        return re.search(r"%%=\*\}=\" -W \"([^\"]*)\"", self.tsd("completion", "bash").stdout)[1].split()

    def test_manual_pages(self):
        self.tsd("init", "dev")
        self.tsd("manual", "pages")
        help_text = self.tsd("--help").stdout.split("Subcommands:")[1].split("Exit codes")[0]
        names = re.findall(r"^  (\w+)", help_text, re.MULTILINE)
        self.assertEqual(sorted(os.listdir("pages")), sorted(["tsd.1", *[f"tsd-{name}.1" for name in names]]))
        for page in sorted(os.listdir("pages")):
            with self.subTest(page):
                run = subprocess.run(["groff", "-ww", "-man", "-Tascii", "-P-cbou", f"pages/{page}"], capture_output=True,
                                     text=True)
                self.assertEqual((run.returncode, run.stderr), (0, ""))
                shown = re.findall(r"^ +(?:-\w, ?)?(--[-\w]+)", run.stdout, re.MULTILINE)
                command = page[4:-2]
                if not command:
                    # The text has its own list of what the program takes.
                    settings = re.findall(r"^(\S+)=", self.tsd("set", "dev").stdout, re.MULTILINE)
                    for heading, names in [("SETTINGS OF A DEVICE", settings), ("ACTIONS OF RULES", self.actions())]:
                        section = re.search(rf"^{heading}\n((?: .*\n|\n)+)", run.stdout, re.MULTILINE)[1]
                        self.assertEqual(re.findall(r"^ {7}([-\w]+=?)(?: |$)", section, re.MULTILINE), names)
                    for heading in ["ENVIRONMENT", "FILES", "EXAMPLES", "EXIT STATUS", "INJECTION RULES"]:
                        self.assertIn(f"\n{heading}\n", run.stdout)
                else:
                    known = re.findall(r"^  (?:-\w,)?(--[-\w]+)", self.tsd(command, "--help").stdout, re.MULTILINE)
                    self.assertEqual(sorted(shown), sorted(known))


if __name__ == "__main__":
    tsd_folder.main()
