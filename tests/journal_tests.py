#!/usr/bin/env python3
"""Every call, message and transaction record that the plug-in makes is the one that its rules ask for, in their order.

usage: journal_tests.py TSD PLUGIN_TESTS [unittest arguments]

Journals of the program and of the tests of the plug-in, with faults at every call and random lives of a device among
them, are held against a model that is written from the rules, in another language, without the plug-in's code.
"""

import os
import pathlib
import plistlib
import random
import re
import subprocess
import sys

import tsd_folder
from tsd_folder import Folder
from wide_data_tests import DOWNLOAD_INFO, NAMES, filled_out, write
from witness.client import Client
from witness.engine import Difference, check_journal, read_record

PLUGIN_TESTS = None
# They talk to the object itself, which no journal shows.
WITHOUT_A_BOUNDARY = "Restore.ReportsThatComeTooEarlyOrForNobody:" \
                     "SyncCases.CancellationsAreRememberedUntilTheTransferEnds"


def check(path, **facts):
    with open(path, encoding="utf-8") as lines:
        return check_journal(lines, lambda: Client(**facts))


class Journals(Folder):
    def check_tests(self, chosen, records, others_call_too=False, **environment):
        pathlib.Path("journals").mkdir()
        subprocess.run([PLUGIN_TESTS, f"--gtest_filter={chosen}-{WITHOUT_A_BOUNDARY}", "--gtest_brief=1"], check=True,
                       stdout=subprocess.DEVNULL, env={**os.environ, "APPSYNC_JOURNALS": "journals", **environment})
        count = 0
        for path in sorted(pathlib.Path("journals").iterdir()):
            with self.subTest(path.name):
                count += check(path, others_call_too=others_call_too)
        self.assertGreater(count, records)

    def test_every_call_failed(self):
        self.check_tests("*Sweep*", 50_000)

    def test_lives_of_a_device(self):
        seeds = int(os.environ.get("APPSYNC_SEEDS", "200")) // 8
        self.check_tests("Simulation.*", seeds * 500, APPSYNC_SEEDS=str(seeds))

    def test_chosen_cases(self):
        self.check_tests("SyncOutcome*:SyncCases*:Restore*:Queries*", 10_000, others_call_too=True)

    def test_the_program(self):
        dice = random.Random(7)
        apps = self.make(12, "dev", "--files", "5")
        for place, app in enumerate(apps):
            account = filled_out({"VantorID": f"person {place % 5}", "DSPersonID": place, "AltDSID": "other"}, 40, dice)
            metadata = {DOWNLOAD_INFO: filled_out({"accountInfo": account}, 9, dice), "title": NAMES[place % 10],
                        "vantorId": f"person {place % 3}", "is-auto-download": bool(place % 2)}
            write(f"host/{app}/HarluneMetadata.plist", filled_out(metadata, 25, dice), plistlib.FMT_BINARY)
        number = 0
        for line in ("sync dev host --transfers 1", "sync dev host --daemon-reports", "query dev metrics",
                     "query dev vantor-ids", "query dev accounts", "query dev disabled-asset-types", "backup dev", "clear dev"):
            number += 1
            self.tsd(*line.split(), "--calls", f"{number}.jsonl", *(["--progress", "none"] if "sync" in line else []))
            with self.subTest(line):
                self.assertGreater(check(f"{number}.jsonl"), 10)


class Sight(Folder):
    """What the model lets pass unseen would be worth nothing."""

    # What it cannot know: numbers of objects and sizes that others choose.
    UNKNOWN = {("addObserver", "observer"), ("notify_set_state", "token"), ("writeAtomically", "contents"),
               ("textOfErrorNumber", "errorNumber")}

    def test_a_changed_record_is_seen(self):
        self.make(1, "dev")
        self.tsd("sync", "dev", "host", "--transfers", "1", "--calls", "calls", "--progress", "none")
        lines = pathlib.Path("calls").read_text(encoding="utf-8").splitlines()
        check_journal(lines, Client)
        seen = set()
        for place, line in enumerate(lines):
            record = read_record(line)
            kind = (record["thread"], record["op"], re.sub(r"\W.*", "", record.get("text", "")[23:]))
            if kind in seen:
                continue
            seen.add(kind)
            if record["n"] < 3 or record["service"] == "AppsClient" or record.get("category") == "tsd.appsync":
                continue
            if record["op"] == "notify_post" and "Startup" in line:
                continue
            with self.subTest(line):
                self.assertNotPasses(lines[:place] + lines[place + 1:])
                self.assertNotPasses(lines[:place + 1] + lines[place:])
                for changed in self.changes_of(record, line):
                    self.assertNotPasses(lines[:place] + [changed] + lines[place + 1:])

    def changes_of(self, record, line):
        if record["service"] == "log":
            yield line.replace(f'"op":"{record["op"]}"', '"op":"error"' if record["op"] == "default" else '"op":"default"')
            yield line.replace(f'"category":"{record["category"]}"', '"category":"7"')
            yield line[:-2] + '!"}'
            return
        yield line.replace(f'"op":"{record["op"]}"', '"op":"other"')
        for name, value in record["args"].items():
            if value is not None and (record["op"], name) not in self.UNKNOWN:
                yield line.replace(f'"{name}":', f'"other {name}":', 1)

    def assertNotPasses(self, lines):
        with self.assertRaises((Difference, AttributeError, TypeError, KeyError)):
            check_journal(lines, Client)


if __name__ == "__main__":
    PLUGIN_TESTS = str(pathlib.Path(sys.argv.pop(2)).resolve())
    tsd_folder.main()
