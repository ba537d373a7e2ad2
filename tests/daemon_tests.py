#!/usr/bin/env python3
"""The daemon's part of a sync: what is asked of its transfers, how it stops, and what it does without threads, memory,
room on the disk or the files that it expects.

usage: daemon_tests.py TSD [unittest arguments]
"""

import json
import os
import pathlib
import plistlib
import select
import signal
import subprocess

import tsd_folder
from tsd_folder import CANCELLED, SOME_FAILED, Folder


class Requests(Folder):
    def test_requests_that_come_before_the_transfers(self):
        apps = self.make(4)
        first, *between, last = self.sync("dev", "host")["requested"]
        # While the others are still prepared, the person cancels the first app and wants the last one first.
        for number, (rules, sent, failed, wished) in enumerate([
                ([f"setPlaceholderPromise:{last}=prioritize={between[0]}"], [between[0], first, between[1], last], [], 1),
                ([f"setPlaceholderPromise:{last}=cancel={first}"], [*between, last], [first], 0),
                ([f"setPlaceholderPromise:{last}=prioritize={between[1]}",
                  f"setPlaceholderPromise:{last}=prioritize={between[0]}",
                  f"setPlaceholderPromise:{last}=cancel={between[1]}"], [between[0], first, last], [between[1]], 2)]):
            with self.subTest(rules):
                device = f"dev{number}"
                self.tsd("init", device)
                options = [part for rule in rules for part in ("--inject", rule)]
                report = self.sync(device, "host", "--transfers", "1", "--calls", "calls", *options,
                                   code=SOME_FAILED if failed else 0)
                calls = [json.loads(line) for line in pathlib.Path("calls").read_text().splitlines()]
                begun = [call for call in calls if not call.get("end")]
                progress = [call["app"] for call in begun if call["op"] == "assetTransferUpdatedProgress"]
                self.assertEqual(list(dict.fromkeys(progress)), sent)
                ended = {call["app"]: call["args"]["succeeded"] for call in begun if call["op"] == "assetTransferSucceeded"}
                self.assertEqual(ended, {**dict.fromkeys(apps, True), **dict.fromkeys(failed, False)})
                self.assertEqual(len([call for call in begun if call["op"] == "assetTransferSucceeded"]), len(apps))
                answers = [call for call in begun if call["op"] == "prioritizeCompletion"]
                self.assertEqual([call["args"]["error"] for call in answers], [None] * wished)
                self.assertEqual({app["id"] for app in report["apps"] if app["outcome"] == "CANCELLED"}, set(failed))


class Stops(Folder):
    """A signal in the middle of a command. The journal goes into a pipe, so that the command stands still at the point
    at which the test has stopped reading, but for what the pipe holds."""

    IN_THE_PIPE = 10  # apps whose records the pipe may hold

    def begin(self, *arguments):
        os.mkfifo("calls")
        reader = os.open("calls", os.O_RDONLY | os.O_NONBLOCK)
        run = subprocess.Popen([tsd_folder.TSD, *arguments, "--json", "--progress", "none", "--calls", "calls"],
                               stdout=subprocess.PIPE, stderr=subprocess.PIPE, text=True)
        self.addCleanup(self.leave, run)
        select.select([reader], [], [], 60)  # until somebody writes, it would be at its end
        os.set_blocking(reader, True)
        calls = os.fdopen(reader, encoding="utf-8")
        self.addCleanup(calls.close)
        return run, calls

    @staticmethod
    def leave(run):
        run.kill()
        run.communicate()

    def read_until(self, calls, operation, count):
        """The journal up to the count-th call of this operation."""
        records = []
        for line in calls:
            records.append(json.loads(line))
            count -= records[-1]["op"] == operation and not records[-1].get("end")
            if count == 0:
                return records
        self.fail(f"the journal ended before {operation}")

    def stop(self, run):
        run.send_signal(signal.SIGINT)
        self.assertIn("stopping", run.stderr.readline())

    def begun(self, records):
        """Apps that a coordinator was answered for."""
        return {call["app"] for call in records
                if call["op"] == "coordinatorForAppWithBundleID" and call["result"] is not None}

    def end(self, run, calls):
        records = [json.loads(line) for line in calls]
        out, _ = run.communicate(timeout=60)
        self.assertEqual(run.returncode, CANCELLED)
        return json.loads(out), records

    def test_while_installs_are_prepared(self):
        apps = self.make(60)
        run, calls = self.begin("sync", "dev", "host")
        before = self.read_until(calls, "coordinatorForAppWithBundleID", 10)
        self.stop(run)
        report, after = self.end(run, calls)
        begun = self.begun(before) | self.begun(after)
        self.assertLess(len(begun), 10 + self.IN_THE_PIPE)
        self.assertEqual(set(report["requested"]), begun)
        # What was not reached is told as that, and is as the host gave it.
        self.assertEqual({app["outcome"] for app in report["apps"]}, {"NOT_REACHED"})
        self.assertEqual({entry["operation"] for entry in report["todo"]}, {"install"})
        self.assertEqual([each["args"] for each in after if each["op"] == "syncEndedWithSuccess" and not each.get("end")],
                         [{"success": False}])
        self.assertEqual(set(self.sync("dev", "host")["requested"]), set(apps))

    def test_while_apps_are_removed(self):
        apps = self.make(40)
        self.sync("dev", "host")
        todo = [{"identifier": app, "operation": "remove"} for app in apps]
        pathlib.Path("host/ApplicationsSync.plist").write_bytes(plistlib.dumps(todo))
        run, calls = self.begin("sync", "dev", "host")
        self.read_until(calls, "uninstallAppWithBundleID", 5)
        self.stop(run)
        report, _ = self.end(run, calls)
        self.assertLess(len(report["removed"]), 5 + self.IN_THE_PIPE)
        self.assertEqual({app["id"] for app in report["apps"] if app["outcome"] == "NOT_REACHED"},
                         set(apps) - set(report["removed"]))
        self.assertEqual(len(self.document("status", "dev")["apps"]), 40 - len(report["removed"]))

    def test_while_packages_are_installed(self):
        self.make(40)
        run, calls = self.begin("sync", "dev", "host", "--transfers", "8")
        self.read_until(calls, "assetTransferSucceeded", 12)
        self.stop(run)
        report, _ = self.end(run, calls)
        arrived = {entry["identifier"] for entry in report["todo"] if entry["operation"] == "DOWNLOADED"}
        installed = {entry["identifier"] for entry in report["todo"] if entry["operation"] == "INSTALLED"}
        self.assertLess(len(arrived | installed), 12 + 8 + self.IN_THE_PIPE)
        # A package that had arrived is installed when the device is opened again.
        self.tsd("set", "dev", "icon-size=64")
        states = {app["id"]: app["state"] for app in self.document("status", "dev")["apps"]}
        self.assertEqual({app for app, state in states.items() if state == "installed"}, arrived | installed)

    def test_while_apps_are_restored(self):
        self.make(60)
        apps = plistlib.loads(pathlib.Path("host/Restore/RestoreApplications.plist").read_bytes())
        entry = next(iter(apps.values()))
        many = {f"com.example.app{number}": entry for number in range(60)}
        pathlib.Path("host/Restore/RestoreApplications.plist").write_bytes(plistlib.dumps(many))
        run, calls = self.begin("restore", "dev", "host")
        before = self.read_until(calls, "coordinatorForAppWithBundleID", 10)
        self.stop(run)
        report, after = self.end(run, calls)
        begun = self.begun(before) | self.begun(after)
        self.assertLess(len(begun), 10 + self.IN_THE_PIPE)
        self.assertEqual(set(report["missing"]), set(many) - begun)
        outcomes = {app["id"]: app["outcome"] for app in report["apps"]}
        self.assertEqual({outcomes[app] for app in report["missing"]}, {"NOT_REACHED"})

    def test_while_the_hosts_files_are_taken(self):
        apps = self.make(2)
        with open(f"host/{apps[0]}/large", "wb") as large:
            large.truncate(4 << 30)
        run = subprocess.Popen([tsd_folder.TSD, "sync", "dev", "host", "--json", "--progress", "plain"],
                               stdout=subprocess.PIPE, stderr=subprocess.PIPE, text=True)
        self.assertIn("Taking", run.stderr.readline())
        run.send_signal(signal.SIGINT)
        out, _ = run.communicate(timeout=60)
        self.assertEqual(run.returncode, CANCELLED)
        self.assertIn("stopped while the host's files were being copied", json.loads(out)["error"]["message"])
        self.assertFalse(os.path.exists("dev/fs/var/mobile/Media/PublicStaging/ApplicationSync"))

    def test_a_second_signal_ends_at_once(self):
        self.make(60)
        run, calls = self.begin("sync", "dev", "host")
        self.read_until(calls, "coordinatorForAppWithBundleID", 5)
        self.stop(run)
        run.send_signal(signal.SIGINT)  # while the command waits for somebody who reads its journal
        self.assertEqual(run.wait(timeout=60), CANCELLED)
        self.assertNotIn("syncEndedWithSuccess", calls.read())


if __name__ == "__main__":
    tsd_folder.main()
