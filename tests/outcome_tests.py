#!/usr/bin/env python3
"""What people and documents are told of a run is what happened: outcomes, plans and explanations, beside each other and
beside what the device holds.

usage: outcome_tests.py TSD [unittest arguments]
"""

import collections
import json
import os
import pathlib
import plistlib
import random
import re
import shutil
import subprocess

import tsd_folder
from tsd_folder import DEADLINE, DONE, FAILED, SOME_FAILED, USAGE, Folder, says

IN_ORDER = {"INSTALLED", "REMOVED", "ABSENT", "PLACED"}


def write_list(path, content):
    pathlib.Path(path).write_bytes(content if isinstance(content, bytes) else plistlib.dumps(content))


class Outcomes(Folder):
    def check_report(self, report, text):
        """Counts, the last line and the words of the table say the same as the apps."""
        outcomes = [app["outcome"] for app in report["apps"]]
        self.assertEqual(report["counts"], dict(collections.Counter(outcomes)))
        good = sum(outcome in IN_ORDER for outcome in outcomes)
        if outcomes:
            self.assertRegex(text, rf"(?m)^(Sync|Restore) .*: {good} of {len(outcomes)} apps? in order")
        for app in report["apps"]:
            self.assertRegex(text, rf"(?m)^{re.escape(app['id'])} .* {app['outcome'].lower().replace('_', ' ')}$")
            self.assertEqual(app["reason"] == "", app["outcome"] in {"INSTALLED", "REMOVED", "PLACED"}, app)

    def outcomes(self, line, code):
        """Of a command on a device, once for the document and once for the text."""
        words = line.split()
        shutil.rmtree("again", ignore_errors=True)
        shutil.copytree(words[1], "again")
        text = self.tsd(words[0], "again", *words[2:], "--progress", "none", code=code).stdout
        report = self.document(*words, "--progress", "none", code=code)
        self.check_report(report, text)
        return {app["id"]: (app["outcome"], app["reason"]) for app in report["apps"]}

    def test_only_what_is_as_the_host_wants_it_is_in_order(self):
        # Options, the outcome of every app and a part of its reason, and the exit code.
        table = [
            ("--inject step@30+=value=28", "NOT_REACHED", "failed before its turn", FAILED),
            ("--inject prepareForSyncWithHostAnchor=fail", "NOT_REACHED", "failed before its turn", FAILED),
            ("--inject reconcileSync=fail", "NOT_REACHED", "failed before its turn", FAILED),
            ("--inject outstandingAssetTransfers=none", "NOT_REQUESTED", "did not ask", SOME_FAILED),
            ("--inject writeAtomically=fail", "UNRECORDED", "could not become", SOME_FAILED),
            ("--inject transfer=fail", "FAILED", "injected at transfer", SOME_FAILED),
        ]
        apps = self.make(2)
        for options, outcome, reason, code in table:
            with self.subTest(options):
                shutil.rmtree("other", ignore_errors=True)
                self.tsd("init", "other")
                found = self.outcomes(f"sync other host {options}", code)
                self.assertEqual({app: each[0] for app, each in found.items()}, dict.fromkeys(apps, outcome))
                for _, why in found.values():
                    self.assertIn(reason, why)

    def test_restores(self):
        # The first three apps are restored: options before it and for it, the first app's outcome and state, exit code.
        table = [
            ("", "", "PLACED", "restoring", DONE),
            ("", "--inject RVAppInstallCoordinator.setPlaceholderPromise:APP=fail", "FAILED", "missing", SOME_FAILED),
            ("", "--inject setUserDataPromise:APP=error", "PLACED", "restoring", DONE),
            ("", "--inject coordinatorDidInstallPlaceholder:APP=none", "WAITING", "restoring", DEADLINE),
            ("backup-placeholders=no", "", "NOT_ALLOWED", "missing", SOME_FAILED),
            ("", "--inject tessaroShouldCreateAppPlaceholdersWithError=error", "PLACED", "restoring", DONE),
            ("backup-error=yes", "", "NOT_ALLOWED", "missing", SOME_FAILED),
        ]
        self.make(1)
        path = pathlib.Path("host/Restore/RestoreApplications.plist")
        app = next(iter(plistlib.loads(path.read_bytes())))
        for setting, options, outcome, state, code in table:
            with self.subTest(setting + options):
                shutil.rmtree("other", ignore_errors=True)
                self.tsd("init", "other")
                if setting:
                    self.tsd("set", "other", setting)
                report = self.document("restore", "other", "host", "--progress", "none",
                                       *options.replace("APP", app).split(), code=code)
                first = next(each for each in report["apps"] if each["id"] == app)
                self.assertEqual((first["outcome"], first["state"]), (outcome, state))
                self.assertEqual("error" in report, setting != "" or "tessaro" in options)


class Explanations(Folder):
    def test_the_answer_comes_first(self):
        apps = self.make(2)
        self.tsd("sync", "dev", "host", "--inject", f"transfer:{apps[0]}@2=fail", code=SOME_FAILED)
        name = apps[0].rsplit(".", 1)[1]
        for word in (apps[0], name, name.capitalize(), name[1:-1]):
            out = self.tsd("why", "dev", word).stdout
            self.assertRegex(out, rf"\A{apps[0]}: .*, a placeholder; run 1 \(sync\): failed: injected at transfer\.\n")
        # A sync that failed as a whole is the answer for every app in it.
        self.sync("dev", "host", "--inject", "reconcileSync=fail", code=FAILED)
        for app in apps:
            answer = self.document("why", "dev", app)["answer"]
            self.assertRegex(answer, r"run 2 \(sync\): not reached: .* could not take over the host's files")
        # What is not on disk has not become so.
        self.sync("dev", "host", "--inject", "writeAtomically=fail", code=SOME_FAILED)
        kinds = [event["kind"] for event in self.document("why", "dev", apps[0], "--run", "3")["runs"][0]["events"]]
        self.assertEqual(("markFailed" in kinds, "marked" in kinds), (True, False))
        self.assertRegex(self.tsd("runs", "dev").stdout,
                         r"\A +1 .* sync +not complete: 1 of 2 apps in order, 1 failed\n +2 .* sync +failed: 0 of 2")
        self.assertEqual([run["counts"] for run in self.document("runs", "dev")["runs"]],
                         [{"INSTALLED": 1, "FAILED": 1}, {"NOT_REACHED": 2}, {"UNRECORDED": 2}])

    def test_one_event_has_one_name(self):
        apps = self.make(1)
        self.sync("dev", "host", "--inject", f"setAppAssetPromise:{apps[0]}=fail", code=SOME_FAILED)
        self.assertRegex(self.tsd("status", "dev").stdout, rf"(?m)^{apps[0]} .* failed$")
        self.assertNotIn("TSError", self.tsd("why", "dev", apps[0]).stdout + self.tsd("status", "dev").stdout)

    def test_after_a_restore_nobody_syncs(self):
        self.make(2)
        self.document("restore", "dev", "host", "--progress", "none")
        self.assertIn("none is: restore 1 left it so", self.tsd("status", "dev").stdout)

    def test_what_costs_an_icon_alone_is_counted(self):
        for app in self.make(3):
            os.remove(f"host/{app}/AppIcon.png")
            os.remove(f"host/{app}/HarluneArtwork")
        run = self.tsd("sync", "dev", "host", "--progress", "none")
        self.assertRegex(run.stderr, says("3 icons could not be copied, and their placeholders have none; the first: "))
        self.tsd("init", "other")
        run = self.tsd("sync", "other", "host", "--progress", "none", "--inject", "writeAtomically@4+=fail",
                       code=SOME_FAILED)
        self.assertEqual(len(re.findall("writeAtomically failed", run.stderr)), 2)
        self.assertRegex(run.stderr, r": \d+ times in all\n")

    def test_a_report_says_what_the_sync_said(self):
        self.make(3)
        said = self.tsd("sync", "dev", "host", "--progress", "none", "--inject", "writeAtomically@4+=fail", code=SOME_FAILED)
        counts = re.search(r": (\d of 3 apps in order[^.]*)\.", said.stdout)[1]
        self.assertIn("unrecorded", counts)
        self.assertIn(f": {counts}.", self.tsd("report", "dev", "-o", "-").stdout)

    def test_quiet_is_for_what_went_well(self):
        self.make(2)
        for line in [("sync", "dev", "host"), ("set", "dev", "icon-size=60"), ("host", "check", "host"), ("backup", "dev"),
                     ("home", "dev", "-o", "home.png"), ("init", "other")]:
            run = self.tsd(*line, "--quiet")
            self.assertEqual((run.stdout, run.stderr), ("", ""), line)
        self.assertIn("icon-size=60", self.tsd("set", "dev", "-q").stdout)
        run = self.tsd("sync", "other", "host", "-q", "--inject", "setPlaceholderPromise@1=fail", code=SOME_FAILED)
        self.assertEqual(run.stdout, "")
        self.assertRegex(run.stderr, says("Sync not complete after "))

    def test_what_was_meant(self):
        self.make(2)
        table = [("statsu dev", USAGE, "did you mean 'status'?"), ("set dev icn-size=120", USAGE, "did you mean 'icon-size'?"),
                 ("sync dev host --inject transfr=fail", USAGE, "did you mean 'transfer'?"),
                 ("why dev com.example.nobody", FAILED, "has no kept run"),
                 ("why dev com.example.candelwell", FAILED, "did you mean 'com.example.candlewell'?"),
                 ("why dev com.example", FAILED, "com.example: this may mean com.example.candlewell, com.example.thistlefold"),
                 ("why dev candlewell --run 7", FAILED, "dev: run 7 is not kept; those from 1 to 1 are"),
                 ("sync dev host --progress none --inject transfer:com.example.nobody=fail", DONE,
                  "--inject transfer:com.example.nobody=fail: its turn never came")]
        for number, (line, code, message) in enumerate(table):
            with self.subTest(line):
                if number == 4:
                    self.sync("dev", "host")
                self.assertRegex(self.tsd(*line.split(), code=code).stderr, says(message))


class Hosts(Folder):
    def test_a_broken_host_is_an_error(self):
        # What is done to the host, the arguments, and what the error names, in the text and in the document.
        def todo(content):
            return lambda: write_list("host/ApplicationsSync.plist", content)

        def renamed(name, to):
            return lambda: os.rename(f"host/{name}", f"host/{to}")

        table = [
            (todo(b"<plist><aray/></plist>"), "host", "host/ApplicationsSync.plist: .*line 1"),
            (todo(b'<plist version="1.0">\n<array>\n<dict>\n</array></plist>'), "host", "ApplicationsSync.plist: .*line 4"),
            (todo(b""), "host", "host/ApplicationsSync.plist: "),
            (todo({"a": "dictionary"}), "host", "host/ApplicationsSync.plist: it is not an array"),
            (renamed("ApplicationsSync.plist", "ApplicationSync.plist"), "host",
             "host/ApplicationSync.plist: .*did you mean 'ApplicationsSync.plist'"),
            (renamed("Packages", "packages"), "host", "host/packages: .*did you mean 'Packages'"),
            (lambda: None, "dev", "dev: this is a device, not a host"),
            (lambda: os.mkdir("empty"), "empty", "empty: nothing of a host is in it"),
        ]
        self.make(1)
        shutil.copytree("host", "whole")
        for spoil, host, message in table:
            for command in ("sync", "plan"):
                with self.subTest(message, command=command):
                    shutil.rmtree("host")
                    shutil.rmtree("empty", ignore_errors=True)
                    shutil.copytree("whole", "host")
                    spoil()
                    run = self.tsd(command, "dev", host, "--json", *(["--progress", "none"]), code=FAILED)
                    self.assertRegex(json.loads(run.stdout)["error"]["message"], message)
                    self.assertRegex(run.stderr, message)

    def test_a_broken_restore_is_an_error(self):
        self.make(1)
        write_list("host/Restore/RestoreApplications.plist", ["no dictionary"])
        self.assertRegex(self.tsd("restore", "dev", "host", "--progress", "none", code=FAILED).stderr,
                         says("host/Restore/RestoreApplications.plist: it is not a dictionary"))
        self.assertRegex(self.tsd("restore", "dev", "host", "--type", "9", code=USAGE).stderr, says("--type: '9'"))

    def test_an_empty_list_is_done(self):
        self.make(1)
        write_list("host/ApplicationsSync.plist", [])
        self.assertEqual(self.sync("dev", "host")["counts"], {})
        self.assertRegex(self.tsd("sync", "dev", "host", "--progress", "none").stdout, r"\ANothing to do\.\n")


class Agreement(Folder):
    """What a plan foretells, what the sync tells, what is told of it later, and what the device then holds."""

    # What a sync cannot do, though nothing speaks against it before: a plan is wrong of these apps alone.
    UNFORESEEN = [None, None, "transfer:APP@2=fail", "coordinatorDidCompleteSuccessfully:APP=none", "transfer:APP=none",
                  "writeAtomically@12+=fail"]
    STATES = {"INSTALLED": {"installed"}, "UNRECORDED": {"installed"}, "REMOVED": {None}, "ABSENT": {None}}

    def spoil_host(self, dice, apps):
        """Entries as people write them, and packages as they get lost."""
        todo = plistlib.loads(pathlib.Path("host/ApplicationsSync.plist").read_bytes())
        for app in apps:
            entry = next(each for each in todo if each["identifier"] == app)
            package = pathlib.Path(f"host/Packages/{app}.pkg")
            match dice.randrange(12):
                case 0:
                    entry["operation"] = dice.choice(["remove", "remove", "frobnicate", "INSTALLED", "FAILED"])
                case 1:
                    todo += [{**entry, "operation": each} for each in dice.choice([["remove", "install"], ["remove"]])]
                case 2:
                    todo.remove(entry)
                case 3:
                    package.unlink()
                case 4:
                    package.write_bytes(b"no archive")
                case 5:
                    package.write_bytes(pathlib.Path("whole/Packages", f"{dice.choice(apps)}.pkg").read_bytes())
                case 6:
                    entry["version"] = dice.choice(["0.1", "99"])
        todo += dice.sample([{"identifier": "x/../y", "operation": "install"},
                             {"identifier": "com.example.never.there", "operation": "remove"}], dice.randrange(3))
        write_list("host/ApplicationsSync.plist", todo)

    def spoil_device(self, dice, apps):
        if dice.random() < 0.3:
            self.document("restore", "dev", "host", "--progress", "none")
        for app in dice.sample(apps, 2):
            package = f"whole/Packages/{app}.pkg"
            # One that is being restored the store can finish only.
            subprocess.run([tsd_folder.TSD, "store", "dev", app,
                            *dice.choice([["--finish", "--package", package], []])], capture_output=True, timeout=60)
        if dice.random() < 0.3:
            self.tsd("set", "dev", dice.choice(["app-installation=forbidden", "app-removal=forbidden"]))

    def check(self, seed):
        dice = random.Random(seed)
        for each in ("dev", "host"):
            shutil.rmtree(each, ignore_errors=True)
        shutil.copytree("whole", "host")
        self.tsd("init", "dev")
        apps = sorted(path.stem for path in pathlib.Path("host/Packages").iterdir())
        self.spoil_device(dice, apps)
        self.spoil_host(dice, apps)
        rule, victim = dice.choice(self.UNFORESEEN), dice.choice(apps)
        foretold = {app["id"]: app for app in self.document("plan", "dev", "host")["apps"]}
        words = ["--inject", rule.replace("APP", victim)] if rule else []
        run = subprocess.run([tsd_folder.TSD, "sync", "dev", "host", "--json", "--progress", "none", *words],
                             capture_output=True, text=True, timeout=60)
        report = json.loads(run.stdout)
        good = all(app["outcome"] in IN_ORDER for app in report["apps"])
        self.assertEqual(run.returncode, DONE if good else SOME_FAILED, run.stderr)
        states = {app["id"]: app["state"] for app in self.document("status", "dev")["apps"]}
        for app in report["apps"]:
            if not rule or app["id"] != victim and "APP" in rule:
                told = foretold[app["id"]]
                self.assertEqual(app["outcome"], told["outcome"], (app, told))
                if app["reason"] and "host/Packages/" not in told["rule"]:
                    self.assertEqual(app["reason"], ": ".join(filter(None, [told["rule"], told["fact"]])))
            if app["outcome"] in self.STATES:
                self.assertIn(states.get(app["id"]), self.STATES[app["outcome"]], app)
            why = self.document("why", "dev", app["id"])
            self.assertEqual((why["runs"][-1]["outcome"], why["runs"][-1]["reason"]), (app["outcome"], app["reason"]))
            self.assertIn(app["outcome"].lower().replace("_", " "), why["answer"])

    def test_random_hosts_and_devices(self):
        self.tsd("sample", "whole", "--apps", "6", "--package-size", "2000")
        for seed in range(int(os.environ.get("APPSYNC_SEEDS", "200")) // 25):
            with self.subTest(seed=seed):
                self.check(seed)


if __name__ == "__main__":
    tsd_folder.main()
