#!/usr/bin/env python3
"""The program from its command line: exit codes, what stands on which stream, and the state of devices afterwards.

usage: command_line_tests.py TSD [unittest arguments]
"""

import collections
import contextlib
import fcntl
import json
import os
import pathlib
import plistlib
import re
import shutil
import signal
import struct
import subprocess
import sys
import tempfile
import termios
import unittest

TSD = None
DONE, FAILED, USAGE, SOME_FAILED, CANCELLED, DEADLINE, BUSY = range(7)

# A command line in a folder that has an empty device `dev`, a host `host` of 3 apps and a few things that are neither;
# what its exit code, standard output and standard error have to be (regular expressions; empty output where None).
Row = collections.namedtuple("Row", "line code out err", defaults=(None, None))

ONE_LINE = r"\Atsd: [^\n]*{}[^\n]*\n\Z"


def says(text):
    return ONE_LINE.format(re.escape(text))


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
    Row("home dev", USAGE, err=says("--output is required")),
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
    Row("home dev -o home.png", DONE, r"^home\.png: no apps\.$"),
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
    return next(str(path) for path in pathlib.Path("/").glob("lib/*/libc.so.6"))


def tree_of(folder):
    """Every file's content but those of the lock, which tells who holds it, and of the runs that are kept."""
    folder = pathlib.Path(folder)
    return {str(path.relative_to(folder)): path.read_bytes() if path.is_file() else None
            for path in folder.rglob("*") if path.name != "lock" and "runs" not in path.parts}


class Folder(unittest.TestCase):
    """Each test in an empty folder of its own."""

    def setUp(self):
        folder = tempfile.mkdtemp()
        self.addCleanup(shutil.rmtree, folder)
        self.addCleanup(os.chdir, os.getcwd())
        os.chdir(folder)

    def tsd(self, *arguments, code=DONE):
        run = subprocess.run([TSD, *arguments], capture_output=True, text=True, timeout=120, stdin=subprocess.DEVNULL)
        self.assertEqual(run.returncode, code, f"{' '.join(arguments)}\n{run.stdout}{run.stderr}")
        return run

    def document(self, *arguments, code=DONE):
        return json.loads(self.tsd(*arguments, "--json", code=code).stdout)

    def sync(self, *arguments, code=DONE):
        return self.document("sync", *arguments, "--progress", "none", code=code)

    def make(self, apps=3, device="dev", *more):
        self.tsd("init", device)
        return [app["id"] for app in self.document("sample", "host", "--apps", str(apps), *more)["apps"]]


class CommandLines(Folder):
    def setUp(self):
        super().setUp()
        self.make()
        os.mkdir("emptyhost")
        os.mkdir("oddhost")
        os.symlink("../host/ApplicationsSync.plist", "oddhost/ApplicationsSync.plist")
        os.makedirs("broken/fs")
        pathlib.Path("broken/device.db").write_text("not a database, but long enough to be looked at" * 40)
        pathlib.Path("file").write_text("a file")

    def check(self, row):
        with self.subTest(row.line):
            line = ["" if word == "''" else word for word in row.line.replace("C-LIBRARY", c_library()).split()]
            before = tree_of(".") if row.code != DONE else None
            run = self.tsd(*line, code=row.code)
            self.assertRegex(run.stdout, re.compile(row.out or r"\A\Z", re.MULTILINE))
            self.assertRegex(run.stderr, row.err or r"\A\Z")
            if before is not None:
                self.assertEqual(tree_of("."), before)
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
        self.tsd("status", "dev")
        with open("dev/lock", "r+") as lock:
            fcntl.flock(lock, fcntl.LOCK_EX)
            lock.write("4711 (tsd sync dev host)\n")
            lock.flush()
            self.assertRegex(self.tsd("status", "dev", code=BUSY).stderr, says("dev: in use by process 4711 (tsd sync"))
        self.tsd("status", "dev")


class Syncs(Folder):
    def outcomes(self, report):
        return {app["id"]: app["outcome"] for app in report["apps"]}

    def test_what_is_reported_of_an_asset(self):
        # (options, outcome, todo mark, state afterwards or None, exit code), of the first app of two. The rest of a
        # package that is cancelled may be there before the transfer hears of it.
        table = [
            ([], "INSTALLED", "INSTALLED", "installed", DONE),
            (["--asset", "APP:path=relative"], "INSTALLED", "INSTALLED", "installed", DONE),
            (["--asset", "APP:path=recorded"], "INSTALLED", "INSTALLED", "installed", DONE),
            (["--asset", "APP:path=none"], "PENDING", "install", "placeholder", SOME_FAILED),
            (["--asset", "APP:path=/var/mobile/../x"], "PENDING", "install", "placeholder", SOME_FAILED),
            (["--asset", "APP:isDownload=false"], "SENT", "SENT", "placeholder", DONE),
            (["--asset", "APP:isRestore=true"], "DOWNLOADED", "DOWNLOADED", "placeholder", DONE),
            (["--asset", "APP:stall"], "CANCELLED", "install", None, SOME_FAILED),
            (["--asset", "APP:stall", "--end-phase", "success"], "PENDING", "install", "placeholder", SOME_FAILED),
            (["--inject", "transfer:APP@2=fail"], "FAILED", "install", "placeholder", SOME_FAILED),
            (["--inject", "transfer:APP@2=cancel=APP"], "CANCELLED", "install|DOWNLOADED", None, SOME_FAILED),
            (["--inject", "setAppAssetPromise:APP=fail"], "FAILED", "FAILED", None, SOME_FAILED),
            (["--inject", "coordinatorDidCompleteSuccessfully:APP=none"], "PENDING", "DOWNLOADED", "installed",
             SOME_FAILED),
            (["--daemon-reports", "--inject", "coordinatorDidCompleteSuccessfully:APP=none"], "INSTALLED", "INSTALLED",
             "installed", DONE),
        ]
        apps = self.make(2)
        for number, (options, outcome, mark, state, code) in enumerate(table):
            with self.subTest(options):
                device = f"dev{number}"
                self.tsd("init", device)
                report = self.sync(device, "host", *[each.replace("APP", apps[0]) for each in options], code=code)
                self.assertEqual(self.outcomes(report), {apps[0]: outcome, apps[1]: "INSTALLED"})
                self.assertEqual(report["todo"][0]["identifier"], apps[0])
                self.assertIn(report["todo"][0]["operation"], mark.split("|"))
                states = {app["id"]: app["state"] for app in self.document("status", device)["apps"]}
                self.assertEqual(states.get(apps[0]), state)

    def test_a_recorded_package_is_found_again(self):
        apps = self.make(1)
        self.sync("dev", "host", "--asset", f"{apps[0]}:isDownload=false")
        self.sync("dev", "host", "--asset", f"{apps[0]}:path=recorded", "--log", "log")
        self.assertIn(f"Recovered download path for {apps[0]} at", pathlib.Path("log").read_text())

    def test_a_killed_sync_is_made_good_by_the_next(self):
        self.make(4, "dev", "--package-size", "100000")
        self.tsd("init", "whole")
        self.sync("whole", "host")
        for rule in ["transfer@3=kill", "transfer@9=kill-after", "setPlaceholderPromise@2=kill-after"]:
            with self.subTest(rule):
                shutil.rmtree("dev")
                self.tsd("init", "dev")
                self.tsd("sync", "dev", "host", "--inject", rule, code=-signal.SIGKILL)
                self.sync("dev", "host")
                self.assertEqual(self.document("status", "dev"), self.document("status", "whole"))

    def test_a_signal_leaves_packages_unfinished(self):
        apps = self.make(2, "dev", "--package-size", "1000")
        for app in apps:
            os.truncate(f"host/Packages/{app}.pkg", 1 << 28)
        run = subprocess.Popen([TSD, "sync", "dev", "host", "--json", "--progress", "plain", "--log", "log"],
                               stdout=subprocess.PIPE, stderr=subprocess.PIPE, text=True)
        for line in run.stderr:
            if "sent 25 %" in line:
                break
        # Most of the packages is still to come; nothing moves until the signal is there.
        run.send_signal(signal.SIGSTOP)
        run.send_signal(signal.SIGINT)
        run.send_signal(signal.SIGCONT)
        out, _ = run.communicate(timeout=60)
        self.assertEqual(run.returncode, CANCELLED)
        report = json.loads(out)
        self.assertEqual(report["result"], "cancelled")
        self.assertEqual(set(self.outcomes(report).values()), {"INTERRUPTED"})
        log = pathlib.Path("log").read_text()
        self.assertIn("asset transfer ended withsuccess: n", log)
        self.assertIn("sync ended with success: n", log)
        self.assertNotIn("asset transfer succeeded", log)

    def test_bars_on_a_terminal(self):
        apps = self.make(12)
        pathlib.Path(f"host/Packages/{apps[3]}.pkg").write_bytes(b"no archive")
        terminal, program_side = os.openpty()
        sizes = [(9, 20), (30, 80)]
        fcntl.ioctl(terminal, termios.TIOCSWINSZ, struct.pack("4H", *sizes[0], 0, 0))
        run = subprocess.Popen([TSD, "sync", "dev", "host"], stdout=subprocess.PIPE, stderr=program_side,
                               env={**os.environ, "TERM": "xterm", "NO_COLOR": "1"})
        os.close(program_side)
        shown = b""
        with contextlib.suppress(OSError):  # that the other side is closed
            while piece := os.read(terminal, 65536):
                shown += piece
                if b"Sending" in shown:
                    fcntl.ioctl(terminal, termios.TIOCSWINSZ, struct.pack("4H", *sizes[1], 0, 0))
        os.close(terminal)
        run.communicate(timeout=60)
        self.assertEqual(run.returncode, SOME_FAILED)
        frames = re.findall(r"\x1b\[\?7l(.*?)\x1b\[\?7h", shown.decode(), re.DOTALL)
        reached = collections.defaultdict(int)
        for frame in frames:
            rows = [row.rstrip() for row in frame.split("\x1b[K\r\n")[:-1]]
            self.assertTrue(any(len(rows) < height and all(len(row) < width for row in rows)
                                for height, width in sizes), rows)
            for name, percent in re.findall(r"^(\S+) .*?(\d+) %", "\n".join(rows), re.MULTILINE):
                self.assertGreaterEqual(int(percent), reached[name])
                reached[name] = int(percent)
        self.assertGreater(len(reached), 1)
        self.assertLess(reached["12"], 100)  # "12 apps", of which one failed

    def test_a_timeline(self):
        apps = self.make(3)
        self.tsd("sync", "dev", "host", "--progress", "none", "--trace", "killed", "--inject", "transfer@9=kill",
                 code=-signal.SIGKILL)
        self.tsd("init", "other")
        self.sync("other", "host", "--trace", "whole")
        killed = json.loads(pathlib.Path("killed").read_text() + "]")
        whole = json.loads(pathlib.Path("whole").read_text())
        for events in (killed, whole):
            names = {(each["pid"], each["tid"]): each["args"]["name"] for each in events if each["ph"] == "M"}
            # Which of the transfers took a package is theirs to settle.
            self.assertLessEqual({"daemon", "coordination", *apps}, set(names.values()))
            self.assertTrue(any(name.startswith("transfer-") for name in names.values()), names)
            slices, begun = collections.defaultdict(list), collections.defaultdict(list)
            for event in events:
                track, time = names[event["pid"], event["tid"]], event["ts"]
                if event["ph"] == "B":
                    begun[track].append((time, event["name"]))
                elif event["ph"] == "E":
                    slices[track].append((begun[track][-1][0], -time, begun[track].pop()[1]))
                elif event["ph"] == "X":
                    slices[track].append((time, -time - event["dur"], event["name"]))
            for track, all_of_it in slices.items():
                around = []  # the slices that a slice stands in: it may not outlast them
                for begin, end, name in sorted(all_of_it):
                    self.assertLessEqual(begin, -end)
                    while around and around[-1] <= begin:
                        around.pop()
                    self.assertTrue(not around or -end <= around[-1] or begin == -end, (track, name))
                    around.append(-end)
            self.assertEqual(any(begun.values()), events is killed)
        for app in apps:
            self.assertEqual([name for _, _, name in sorted(slices[app])],
                             [app, "prepare", "placeholder", "transfer", "install"])

    def test_the_order_of_packages_can_be_changed(self):
        apps = self.make(4)
        report = self.sync("dev", "host", "--transfers", "1", "--calls", "calls",
                           "--inject", "transfer@2=prioritize=" + self.last_of_the_layout())
        calls = [json.loads(line) for line in pathlib.Path("calls").read_text().splitlines()]
        ended = [call["app"] for call in calls if call["op"] == "assetTransferSucceeded" and not call.get("end")]
        asked = report["requested"]
        self.assertEqual(ended, [asked[0], asked[-1], *asked[1:-1]])
        self.assertEqual(sorted(asked), sorted(apps))
        self.assertEqual([call["n"] for call in calls], list(range(1, len(calls) + 1)))

    def test_a_daemon_without_abilities(self):
        self.make(3)
        self.tsd("set", "dev", "device-service-prioritize=no", "device-service-cancel=no")
        last = self.last_of_the_layout()
        report = self.sync("dev", "host", "--transfers", "1", "--log", "log", "--inject", f"transfer@1=prioritize={last}",
                           "--inject", f"transfer@2=cancel={last}", code=SOME_FAILED)
        self.assertEqual(self.outcomes(report)[last], "CANCELLED")
        log = pathlib.Path("log").read_text()
        self.assertIn(f"Cannot prioritize {last} as it's not supported", log)
        self.assertIn(f"Cannot cancel {last} as it's already cancelled 0 OR the call is not supported", log)
        self.assertIn(f"asset transfer succeeded for {last}", log)

    def last_of_the_layout(self):
        pages = plistlib.loads(pathlib.Path("host/PanelloIconState.plist").read_bytes())
        return pages[-1][-1]

    def test_hosts_that_are_odd(self):
        apps = self.make(2)
        os.mkfifo(f"host/{apps[0]}/pipe")
        os.symlink("/etc/passwd", f"host/{apps[0]}/link")
        os.remove(f"host/Packages/{apps[1]}.pkg")
        run = self.tsd("sync", "dev", "host", "--progress", "none", code=SOME_FAILED)
        self.assertIn(f"host/{apps[0]}/pipe: not pushed: a named pipe", run.stderr)
        self.assertIn(f"host/{apps[0]}/link: not pushed: a symbolic link", run.stderr)
        self.assertIn(f"{apps[1]}: host/Packages/{apps[1]}.pkg: No such file", run.stdout)
        table = [(b"", "cannot be read"), (b"no list at all", "cannot be read"),
                 (plistlib.dumps({"a": "dictionary"}), "not an array"), (plistlib.dumps(["a text", 5]), "")]
        for content, message in table:
            with self.subTest(content):
                pathlib.Path("host/ApplicationsSync.plist").write_bytes(content)
                self.tsd("init", "other")
                run = self.tsd("sync", "other", "host", "--json", "--progress", "none")
                self.assertEqual(json.loads(run.stdout)["apps"], [])
                self.assertIn(message, run.stderr)
                shutil.rmtree("other")

    def test_restrictions(self):
        apps = self.make(2)
        self.tsd("set", "dev", "app-installation=forbidden")
        report = self.sync("dev", "host")
        self.assertEqual(report["requested"], [])
        self.assertEqual(self.outcomes(report), dict.fromkeys(apps, "SKIPPED"))
        self.tsd("set", "dev", "app-installation=allowed", "app-removal=forbidden")
        self.sync("dev", "host")
        todo = [{"identifier": apps[0], "operation": "remove"}]
        pathlib.Path("host/ApplicationsSync.plist").write_bytes(plistlib.dumps(todo))
        self.assertEqual(self.outcomes(self.sync("dev", "host")), {apps[0]: "SKIPPED"})
        self.tsd("set", "dev", "app-removal=allowed")
        report = self.sync("dev", "host", "--inject", "uninstallAppWithBundleID=fail", code=SOME_FAILED)
        self.assertEqual(self.outcomes(report), {apps[0]: "FAILED"})
        self.assertEqual(self.sync("dev", "host")["removed"], [apps[0]])

    def test_what_people_are_told_of_a_failure(self):
        apps = self.make(2)
        pathlib.Path(f"host/Packages/{apps[0]}.pkg").write_bytes(b"no archive")
        run = self.tsd("sync", "dev", "host", "--progress", "plain", code=SOME_FAILED)
        self.assertRegex(run.stderr, r"(?m) failed: package .*not a zip archive")
        self.assertNotIn("100 %", run.stderr)  # a package that was sent is no app yet
        self.assertRegex(self.tsd("status", "dev").stdout, rf"(?m)^{apps[0]} .* failed$")

    def test_a_removed_app_is_told_to_the_host_once(self):
        apps = self.make(2)
        self.sync("dev", "host")
        self.tsd("uninstall", "dev", apps[0])
        os.remove("host/ApplicationsSync.plist")
        reports = self.sync("dev", "host", "--repeat", "2")["runs"]
        self.assertEqual([report["deleted"] for report in reports], [[apps[0]], []])


class Explanations(Folder):
    def plan(self, *options):
        before = {path: (path.stat().st_mtime_ns, path.is_file() and path.read_bytes())
                  for path in pathlib.Path("dev").rglob("*")}
        apps = self.document("plan", "dev", "host", *options)["apps"]
        self.assertEqual({path: (path.stat().st_mtime_ns, path.is_file() and path.read_bytes())
                          for path in pathlib.Path("dev").rglob("*")}, before)
        return {app["id"]: (app["decision"], app["rule"], app["fact"]) for app in apps}, [
            app["id"] for app in apps if "place" in app]

    def test_a_plan_says_what_a_sync_does(self):
        apps = self.make(6)
        self.document("restore", "dev", "host")
        self.tsd("store", "dev", apps[2], "--finish", "--package", f"host/Packages/{apps[2]}.pkg")
        self.tsd("store", "dev", apps[5])
        todo = plistlib.loads(pathlib.Path("host/ApplicationsSync.plist").read_bytes())
        version = todo[2]["version"]
        todo[2]["version"] = "99"
        todo[3]["operation"] = "remove"
        del todo[4]
        todo.append({"identifier": "x/../y", "operation": "install"})
        todo.append({"identifier": "com.example.done", "operation": "INSTALLED"})
        pathlib.Path("host/ApplicationsSync.plist").write_bytes(plistlib.dumps(todo))
        decisions, places = self.plan()
        self.assertEqual(decisions, {
            apps[0]: ("skipped", "being restored: its package is the restore's to bring", ""),
            apps[1]: ("skipped", "being restored: its package is the restore's to bring", ""),
            apps[2]: ("update", "the host wants it", f"99 over {version}"),
            apps[3]: ("removed", "the host wants it removed", ""),
            apps[4]: ("skipped", "auto demoted and not requested", ""),
            apps[5]: ("skipped", "install under way", "store download, active, loading"),
            "x/../y": ("refused", "its identifier would lead out of its folder", ""),
            "com.example.done": ("nothing", "nothing is to be done for its entry of the todo list", "INSTALLED")})
        self.assertEqual(places, self.sync("dev", "host", code=SOME_FAILED)["requested"])
        self.tsd("set", "dev", "app-removal=forbidden")
        decisions, _ = self.plan("--inject", f"setInstallOptions:{apps[2]}=fail")
        self.assertEqual(decisions[apps[3]], ("kept", "removing apps is restricted", ""))
        self.assertEqual(decisions[apps[2]][:2], ("failed", "its install could not be prepared"))

    def kinds(self, app):
        """Of each run, without what the device's own threads tell of, as that may come a little earlier or later."""
        return [[event["kind"] for event in run["events"] if event["kind"] != "shown"]
                for run in self.document("why", "dev", app)["runs"]]

    def test_an_apps_life(self):
        apps = self.make(2)
        self.tsd("sync", "dev", "host", "--inject", f"transfer:{apps[0]}@3=kill", code=-signal.SIGKILL)
        story = self.document("why", "dev", apps[0])
        self.assertEqual(self.kinds(apps[0]), [["preparing", "attached", "prepared", "transferring", "transferring"]])
        self.assertNotIn("ended", story["runs"][0])
        self.assertIn("waits for its package, which the sync is to deliver", story["install"]["waits"])
        self.sync("dev", "host", "--inject", f"transfer:{apps[0]}@2=fail", "--end-phase", "failed", code=SOME_FAILED)
        self.assertEqual(self.kinds(apps[0])[1][-2:], ["transferring", "transferFailed"])
        self.assertNotIn(b"\0", pathlib.Path("dev/runs/0001-sync/calls.jsonl").read_bytes())
        self.tsd("uninstall", "dev", apps[1])
        self.assertEqual(self.kinds(apps[1])[-1], ["person"])
        self.assertRegex(self.tsd("why", "dev", apps[1]).stdout,
                         r"not on the device(.|\n)* s installed\n(.|\n)*the person removes it")
        self.assertIn("none of the 3 kept runs", self.tsd("why", "dev", "com.example.nobody", code=FAILED).stderr)

    def test_the_last_runs_are_kept(self):
        self.make(1)
        for _ in range(21):
            self.tsd("backup", "dev")
        self.assertEqual(sorted(os.listdir("dev/runs")), [f"{number:04}-backup" for number in range(2, 22)])
        shutil.rmtree("dev/runs")
        pathlib.Path("dev/runs").write_text("no folder")
        self.assertRegex(self.tsd("backup", "dev").stderr, says("this run is not kept whole"))


class Shells(Folder):
    """What is made of the options besides the help: completions and manual pages."""

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
            ("query d metrics m", ""),
            ("sync d a", "a folder"),
            ("sync d --log a", "a folder,a file"),
            ("sync --transfers ", ""),
            ("nothing a", ""),
        ]
        os.mkdir("a folder")
        pathlib.Path("a file").touch()
        pathlib.Path("completion").write_text(self.tsd("completion", "bash").stdout)
        ask = """source completion; COMP_WORDS=(tsd "$@"); COMP_CWORD=$#; _tsd; IFS=,; echo "${COMPREPLY[*]}" """
        for line, offered in table:
            with self.subTest(line):
                run = subprocess.run(["bash", "-uc", ask, "bash", *line.split(" ")], capture_output=True, text=True)
                self.assertEqual(run.stderr, "")
                self.assertEqual(set(run.stdout.strip().split(",")), set(offered.split(",")))

    def test_completions_of_other_shells_can_be_read(self):
        for shell in filter(shutil.which, ["bash", "zsh", "fish"]):
            pathlib.Path(shell).write_text(self.tsd("completion", shell).stdout)
            run = subprocess.run([shell, "-n", shell], capture_output=True, text=True)
            self.assertEqual((run.returncode, run.stderr), (0, ""))

    def test_manual_pages(self):
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
                if command:
                    known = re.findall(r"^  (?:-\w,)?(--[-\w]+)", self.tsd(command, "--help").stdout, re.MULTILINE)
                    self.assertEqual(sorted(shown), sorted(known))


class Restores(Folder):
    def test_placeholders_and_what_is_missing(self):
        self.make(6)
        report = self.document("restore", "dev", "host")
        self.assertEqual([app["installType"] for app in report["apps"]], [2, 2, 8, 7, 7])
        self.assertEqual(self.document("status", "dev")["syncing"], 1)
        missing = report["apps"][3]["id"]
        self.tsd("init", "other")
        run = self.tsd("restore", "other", "host", "--inject", f"RVAppInstallCoordinator.setPlaceholderPromise:{missing}=fail",
                       code=DEADLINE)
        self.assertRegex(run.stdout, rf"Placeholders missing at the end:\n  {missing}\n")

    def test_the_store_finishes_and_a_sync_follows(self):
        apps = self.make(5)
        self.document("restore", "dev", "host")
        self.tsd("store", "dev", apps[0], "--finish")
        self.tsd("store", "dev", apps[1], "--finish", "--package", f"host/Packages/{apps[1]}.pkg")
        self.sync("dev", "host")
        status = self.document("status", "dev")
        self.assertEqual({app["state"] for app in status["apps"]}, {"installed"})
        self.assertEqual(status["coordinators"], [])

    def test_the_home_screen_in_a_picture(self):
        apps = self.make(6)
        self.document("restore", "dev", "host")
        self.tsd("store", "dev", apps[0], "--finish")
        pathlib.Path(f"host/Packages/{apps[0]}.pkg").write_bytes(b"no archive")
        pathlib.Path(f"host/Packages/{apps[5]}.pkg").write_bytes(b"no archive")
        self.sync("dev", "host", "--end-phase", "success", "--inject", f"transfer:{apps[3]}@5=none",
                  "--inject", f"transfer:{apps[2]}@1=fail", code=SOME_FAILED)
        home = self.document("home", "dev", "-o", "home.png")
        icons = {icon["id"]: icon for page in home["pages"] for icon in page}
        self.assertEqual([[icon["id"] for icon in page] for page in home["pages"]],
                         [[app for app in page if app in icons] for page in
                          plistlib.loads(pathlib.Path("host/PanelloIconState.plist").read_bytes())])
        self.assertEqual([(icons[app]["look"], icons[app]["failed"]) for app in apps[:5]],
                         [("installed", True), ("restoring", False), ("waiting", False), ("waiting", False),
                          ("installed", False)])
        self.assertEqual([0 < icons[app]["progress"] < 1 for app in apps[2:4]], [False, True])
        self.assertEqual([app["id"] for app in home["failed"]], [apps[5]])
        self.assertEqual(pathlib.Path("home.png").read_bytes()[:8], b"\x89PNG\r\n\x1a\n")

    def test_lists_that_are_none(self):
        self.make(2)
        pathlib.Path("host/Restore/RestoreApplications.plist").write_bytes(b"no list")
        run = self.tsd("restore", "dev", "host", "--progress", "none", code=FAILED)
        self.assertIn("host/Restore/RestoreApplications.plist: ", run.stderr)


if __name__ == "__main__":
    TSD = str(pathlib.Path(sys.argv.pop(1)).resolve())
    unittest.main()
