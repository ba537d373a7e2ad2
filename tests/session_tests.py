#!/usr/bin/env python3
"""What syncs, restores and explanations do, as somebody who calls the program sees it.

usage: session_tests.py TSD [unittest arguments]
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
import termios
import xml.etree.ElementTree

import tsd_folder
from tsd_folder import CANCELLED, DONE, FAILED, SOME_FAILED, Folder, says


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
            (["--asset", "APP:path=none"], "WAITING", "install", "placeholder", SOME_FAILED),
            (["--asset", "APP:path=/var/mobile/../x"], "WAITING", "install", "placeholder", SOME_FAILED),
            (["--asset", "APP:isDownload=false"], "SENT", "SENT", "placeholder", SOME_FAILED),
            (["--asset", "APP:isRestore=true"], "DOWNLOADED", "DOWNLOADED", "placeholder", SOME_FAILED),
            (["--asset", "APP:stall"], "CANCELLED", "install", None, SOME_FAILED),
            (["--asset", "APP:stall", "--end-phase", "success"], "WAITING", "install", "placeholder", SOME_FAILED),
            (["--inject", "transfer:APP@2=fail"], "FAILED", "install", "placeholder", SOME_FAILED),
            (["--inject", "transfer:APP@2=cancel=APP"], "CANCELLED", "install|DOWNLOADED", None, SOME_FAILED),
            (["--inject", "setAppAssetPromise:APP=fail"], "FAILED", "FAILED", None, SOME_FAILED),
            (["--inject", "coordinatorDidCompleteSuccessfully:APP=none"], "UNRECORDED", "DOWNLOADED", "installed",
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
        self.sync("dev", "host", "--asset", f"{apps[0]}:isDownload=false", code=SOME_FAILED)
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
        run = subprocess.Popen([tsd_folder.TSD, "sync", "dev", "host", "--json", "--progress", "plain", "--log", "log"],
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
        self.assertEqual(set(self.outcomes(report).values()), {"NOT_REACHED"})
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
        run = subprocess.Popen([tsd_folder.TSD, "sync", "dev", "host"], stdout=subprocess.PIPE, stderr=program_side,
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
            # Which of the transfers took a package is theirs to settle; and what reports the placeholders may come after
            # the packages.
            threads = {"daemon"} if events is killed else {"daemon", "coordination"}
            self.assertLessEqual({*threads, *apps}, set(names.values()))
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
        pathlib.Path("host/ApplicationsSync.plist").write_bytes(plistlib.dumps(["a text", {"operation": "install"}]))
        run = self.tsd("sync", "dev", "host", "--progress", "none", code=SOME_FAILED)
        self.assertIn("host/ApplicationsSync.plist: entry 1 is ignored: it is not a dictionary", run.stderr)
        self.assertIn("host/ApplicationsSync.plist: entry 2 is ignored: it has no \"identifier\"", run.stderr)

    def test_restrictions(self):
        apps = self.make(2)
        self.tsd("set", "dev", "app-installation=forbidden")
        report = self.sync("dev", "host", code=SOME_FAILED)
        self.assertEqual(report["requested"], [])
        self.assertEqual(self.outcomes(report), dict.fromkeys(apps, "NOT_ALLOWED"))
        self.tsd("set", "dev", "app-installation=allowed", "app-removal=forbidden")
        self.sync("dev", "host")
        todo = [{"identifier": apps[0], "operation": "remove"}]
        pathlib.Path("host/ApplicationsSync.plist").write_bytes(plistlib.dumps(todo))
        self.assertEqual(self.outcomes(self.sync("dev", "host", code=SOME_FAILED)), {apps[0]: "NOT_ALLOWED"})
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

    def test_a_removed_app_is_told_again_after_a_kill_unless_it_is_wanted_back(self):
        apps = self.make(2)
        self.sync("dev", "host")
        self.tsd("uninstall", "dev", apps[0])
        os.rename("dev", "fresh")
        for wanted, told in ((True, []), (False, [apps[0]])):
            with self.subTest(wanted=wanted):
                if not wanted:
                    self.tsd("host", "remove", "host", apps[0])
                shutil.copytree("fresh", "dev")
                self.tsd("sync", "dev", "host", "--inject", "AppsClient.outstandingAssetTransfers=kill",
                         code=-signal.SIGKILL)
                reports = self.sync("dev", "host", "--repeat", "2")["runs"]
                self.assertEqual([report["deleted"] for report in reports], [told, []])
                shutil.rmtree("dev")


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
            apps[0]: ("skipped", "being restored: the restore brings its package", ""),
            apps[1]: ("skipped", "being restored: the restore brings its package", ""),
            apps[2]: ("update", "the host wants it",
                      f"{version} over {version} (the host's list says 99), the same version again"),
            apps[3]: ("removed", "the host wants it removed", ""),
            apps[4]: ("skipped", "auto demoted and not requested", ""),
            apps[5]: ("skipped", "install under way", "store download, active, loading"),
            "x/../y": ("refused", "its identifier would lead out of its folder", ""),
            "com.example.done": ("unchanged", "its entry of the todo list asks for nothing", "INSTALLED")})
        self.assertEqual(places, self.sync("dev", "host", code=SOME_FAILED)["requested"])
        self.tsd("set", "dev", "app-removal=forbidden")
        decisions, _ = self.plan("--inject", f"setInstallOptions:{apps[2]}=fail")
        self.assertEqual(decisions[apps[3]], ("absent", "it is not on the device", ""))
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
        self.assertIn("waits for its package, which the sync will deliver", story["install"]["waits"])
        self.sync("dev", "host", "--inject", f"transfer:{apps[0]}@2=fail", "--end-phase", "failed", code=SOME_FAILED)
        self.assertEqual(self.kinds(apps[0])[1][-2:], ["transferring", "transferFailed"])
        self.assertNotIn(b"\0", pathlib.Path("dev/runs/0001-sync/calls.jsonl").read_bytes())
        self.tsd("uninstall", "dev", apps[1])
        self.assertEqual(self.kinds(apps[1])[-1], ["person"])
        self.assertRegex(self.tsd("why", "dev", apps[1], "--all").stdout,
                         r"not on the device(.|\n)* s installed\n(.|\n)*the person removes it")
        self.assertIn("none of the 3 kept runs", self.tsd("why", "dev", "com.example.nobody", code=FAILED).stderr)

    def test_the_last_runs_are_kept(self):
        self.make(1)
        for _ in range(21):
            self.tsd("backup", "dev")
        self.assertEqual(sorted(os.listdir("dev/runs")), [f"{number:04}-backup" for number in range(2, 22)])
        shutil.rmtree("dev/runs")
        pathlib.Path("dev/runs").write_text("no folder")
        self.assertRegex(self.tsd("backup", "dev").stderr, says("not all of this run is kept"))


class Restores(Folder):
    def test_placeholders_and_what_is_missing(self):
        self.make(6)
        report = self.document("restore", "dev", "host")
        self.assertEqual([app["installType"] for app in report["apps"]], [2, 2, 8, 7, 7])
        self.assertEqual(self.document("status", "dev")["syncing"], 1)
        missing = report["apps"][3]["id"]
        self.tsd("init", "other")
        run = self.tsd("restore", "other", "host", "--inject", f"RVAppInstallCoordinator.setPlaceholderPromise:{missing}=fail",
                       code=SOME_FAILED)
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
        to_output = subprocess.run([tsd_folder.TSD, "home", "dev", "-o", "-"], capture_output=True, check=True).stdout
        self.assertEqual(to_output, pathlib.Path("home.png").read_bytes())
        self.tsd("home", "dev", "--dark", "-o", "home.svg")
        self.assertEqual(xml.etree.ElementTree.parse("home.svg").getroot().tag, "{http://www.w3.org/2000/svg}svg")
        self.assertRegex(self.tsd("home", "dev").stdout, r"(?m)^│ .* │$")

    def test_names_that_are_none(self):
        # (the app's name, what stands on the home screen)
        apps = self.make(3)
        names = ["  ", "\u202eTrap", "A name that is very much longer than its place"]
        for app, name in zip(apps, names):
            manifest = pathlib.Path(f"host/{app}/Info.plist")
            manifest.write_bytes(plistlib.dumps(plistlib.loads(manifest.read_bytes()) | {"KBBundleDisplayName": name}))
            pathlib.Path(f"host/Packages/{app}.pkg").unlink()
        self.sync("dev", "host", "--end-phase", "success", code=SOME_FAILED)
        self.tsd("home", "dev", "-o", "home.svg")
        shown = self.tsd("home", "dev").stdout
        self.assertEqual({len(line) for line in shown.split("\n") if line[:1] in "╭│╰" and line}, {79})
        for text in [apps[0].rsplit(".", 1)[1], "???Trap", "A name that is …"]:
            self.assertIn("□ " + text[:16], shown)

    def test_lists_that_are_none(self):
        self.make(2)
        pathlib.Path("host/Restore/RestoreApplications.plist").write_bytes(b"no list")
        run = self.tsd("restore", "dev", "host", "--progress", "none", code=FAILED)
        self.assertIn("host/Restore/RestoreApplications.plist: ", run.stderr)


if __name__ == "__main__":
    tsd_folder.main()
