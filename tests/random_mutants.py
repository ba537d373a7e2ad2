#!/usr/bin/env python3
"""Plants faults by the dice, one at a time, and sees whether the tests find them: says how good the tests are.

usage: random_mutants.py BUILD [--area plugin|replay|values|install] [--count N] [--seed S] [--jobs N] [--only FILE] [--again]

A statement, a guard or a message goes, a condition is negated, an operator, a constant or a text becomes another one,
two neighbouring statements change places. One object is compiled and linked for each; a fault that does not compile is
drawn again. It is found when a test fails, crashes or does not end. What survives is printed with its place, and is
either equivalent to what was there, which a line of tests/mutants/equivalent.txt says with the reason, or wants a test.

The copies of the sources and their builds lie in BUILD, one for each job. BUILD/AREA.jsonl keeps what became of each
fault: another run, with another seed or after an interruption, plants what was not planted yet, and the figures are of
all of them. `--again` plants the survivors once more, when tests were added, and what did not end. A fault is another
one as soon as its file has changed. Ends with 1 when fewer were found than the area's goal.
"""

import argparse
import atexit
import collections
import concurrent.futures
import hashlib
import json
import os
import pathlib
import queue
import random
import shutil
import signal
import subprocess
import sys
import threading
import time
from typing import NamedTuple

from fault_sites import sites_of
from quick_build import QuickCopy
from source_copy import ROOT

SEEDS = "300"
# A fault may want all memory, or write without end.
BOUNDED = ["sh", "-c", 'ulimit -c 0; ulimit -v 4000000; ulimit -f 2000000; exec "$@"', "sh"]


class Area(NamedTuple):
    """Where faults are planted, what is built for it, which tests have to find one, and how many of a hundred."""

    folders: list
    targets: list
    suites: list
    goal: int


def journals(test):
    return [sys.executable, "@tests/journal_tests.py", "%bin/tsd", "%bin/plugin_tests", f"Journals.{test}"]


# A word that begins with "@" is a file of the copy, "%" one of its build.
REPLAY = [sys.executable, "@tests/recording_tests.py", "%bin/tsd", "--failfast", "Corpus"]
PLUGIN_SUITES = [
    REPLAY,
    ["%bin/plugin_tests", "--gtest_filter=-*Simulation*:*Sweep*:*Thread*"],
    ["%bin/plugin_tests", "--gtest_filter=*Sweep*:*Thread*"],
    ["%bin/plugin_tests", "--gtest_filter=*Simulation*"],
    *map(journals, ["test_chosen_cases", "test_every_call_failed", "test_lives_of_a_device", "test_the_program"]),
    ["%bin/exception_tests"],
]
PLUGIN_TARGETS = ["ApplicationSync", "plugin_tests", "exception_tests", "tsd"]


def seeds(target):
    return [f"%bin/fuzz_{target}", f"@fuzz/seeds/{target}"]


PLUGIN_FOLDERS = ["core", "transfer", "coordination", "restore", "placeholder"]
AREAS = {
    "plugin": Area(PLUGIN_FOLDERS, PLUGIN_TARGETS, PLUGIN_SUITES, 97),
    "replay": Area(PLUGIN_FOLDERS, ["ApplicationSync", "tsd"], [REPLAY], 95),
    "values": Area(["platform", "plist"],
                   [*PLUGIN_TARGETS, "property_list_tests", "device_foundation_tests", "fuzz_binary_list",
                    "fuzz_xml_list", "fuzz_round_trip"],
                   [["%bin/property_list_tests"], ["%bin/device_foundation_tests"],
                    *map(seeds, ["binary_list", "xml_list", "round_trip"]), *PLUGIN_SUITES], 90),
    "install": Area(["device/package", "device/reports", "device/install", "device/coordination"],
                    ["ApplicationSync", "plugin_tests", "tsd", "device_service_tests", "contract_tests",
                     "fuzz_package"],
                    [["%bin/device_service_tests"], ["%bin/contract_tests"], seeds("package"), *PLUGIN_SUITES[1:5],
                     *([sys.executable, f"@tests/{name}.py", "%bin/tsd"]
                       for name in ("hostile_host", "outcome_tests")),
                     [sys.executable, "@tests/kill_sweep.py", "%bin/tsd", "error", "--every", "20"]], 90),
}


class Fault(NamedTuple):
    file: str
    kind: str
    line: int
    was: str
    text: str  # of the whole file with the fault

    def name(self):
        return f"{self.file}:{self.line} {self.kind}: {self.was}"

    def key(self):
        return hashlib.sha256(f"{self.file} {self.text}".encode()).hexdigest()[:16]


def one_line(text, most=140):
    text = " ".join(text.split())
    return text if len(text) <= most else text[:most - 1] + "…"


def faults_of(area, only):
    for folder in area.folders:
        for path in sorted((ROOT / folder).glob("*.cpp")):
            file = str(path.relative_to(ROOT))
            if only and only not in file:
                continue
            source = path.read_text(encoding="utf-8")
            seen = collections.Counter()
            for site in sites_of(source):
                was = what_was(source, site)
                seen[site.kind, was] += 1
                if seen[site.kind, was] > 1:
                    was += f" ({seen[site.kind, was]})"
                yield Fault(file, site.kind, source.count("\n", 0, site.begin) + 1, was,
                            source[:site.begin] + site.planted + source[site.end:])


def what_was(source, site):
    """The text that a fault replaces; a short one is marked in its line, and a short line comes after the one before."""
    text = source[site.begin:site.end]
    if len(text) >= 30:
        return one_line(text)
    begin, end = source.rfind("\n", 0, site.begin) + 1, source.find("\n", site.end)
    if len(source[begin:end].strip()) < 40:
        begin = source.rfind("\n", 0, begin - 1) + 1
    return one_line(f"{source[begin:site.begin]}«{text}»{source[site.end:end]}")


class Job(QuickCopy):
    """One copy, in which one fault after another is tried."""

    def __init__(self, folder, area):
        super().__init__(folder, area.folders, area.targets)
        memory = pathlib.Path("/dev/shm")
        self._scratch = (memory if memory.is_dir() else folder) / f"{folder.name}.{os.getpid()}"
        atexit.register(shutil.rmtree, self._scratch, ignore_errors=True)
        self._suites = [Suite(words) for words in area.suites]
        for suite in self._suites:
            began = time.monotonic()
            if found := self._run(suite, 1200):
                sys.exit(f"without a fault, {found}")
            suite.unmutated = suite.spent = time.monotonic() - began

    def _run(self, suite, limit):
        """Which test failed; empty: none."""
        places = {"%": self.build, "@": self.sources}
        command = [str(places[word[0]] / word[1:]) if word[0] in places else word for word in suite.words]
        if suite.words[0].endswith("_tests"):
            command += ["--gtest_brief=1", "--gtest_fail_fast"]
        shutil.rmtree(self._scratch, ignore_errors=True)
        self._scratch.mkdir()
        environment = {"APPSYNC_SEEDS": SEEDS, "PATH": "/usr/bin:/bin", "TMPDIR": str(self._scratch)}
        with subprocess.Popen([*BOUNDED, *command], stdout=subprocess.PIPE, stderr=subprocess.STDOUT, text=True,
                              errors="replace", start_new_session=True, env=environment) as running:
            try:
                output, _ = running.communicate(timeout=limit)
            except subprocess.TimeoutExpired:
                os.killpg(running.pid, signal.SIGKILL)
                return f"{suite.name()} does not end"
        if running.returncode == 0:
            return ""
        failed = [line.split("]")[1].split("(")[0].strip() for line in output.splitlines() if "[  FAILED  ]" in line]
        return failed[0] if failed else f"{suite.name()} ended with {running.returncode}"

    def try_out(self, fault):
        """What found it; empty: nothing; none: it is no fault, as it does not build."""
        with self.exchanged(fault.file, fault.text) as wrong:
            if wrong:
                return None
            # First what has found most in its time.
            for suite in sorted(self._suites, key=lambda each: -(each.found + 1) / each.spent):
                began = time.monotonic()
                found = self._run(suite, 3 * suite.unmutated + 10)
                suite.spent += time.monotonic() - began
                if found:
                    suite.found += 1
                    return found
            return ""


class Suite:
    def __init__(self, words):
        self.words = words
        self.unmutated = self.spent = 1.0  # seconds
        self.found = 0

    def name(self):
        shown = self.words[:1] if self.words[0][0] == "%" else [word for word in self.words[1:] if word[0] != "%"]
        return " ".join(pathlib.PurePath(word).name for word in shown)


class Results:
    """What became of each fault, in a file that grows line by line."""

    def __init__(self, path, again):
        self._path, self._lock = path, threading.Lock()
        lines = path.read_text(encoding="utf-8").splitlines() if path.exists() else []
        self._found = {row["key"]: row["found"] for row in map(json.loads, lines)}
        # A machine that had much to do may have been too slow.
        unsure = ("", *(found for found in self._found.values() if found and found.endswith("does not end")))
        self.again = {key for key, found in self._found.items() if found in unsure} if again else set()

    def holds(self, fault):
        return fault.key() in self._found

    def add(self, fault, found):
        row = fault._asdict() | {"text": "", "key": fault.key(), "found": found}
        with self._lock, self._path.open("a", encoding="utf-8") as file:
            file.write(json.dumps(row, ensure_ascii=False) + "\n")
            self._found[fault.key()] = found

    def planted(self, faults):
        """(fault, what found it) of those that were built."""
        return [(fault, found) for fault in faults if (found := self._found.get(fault.key())) is not None]


def equivalents():
    """(file, kind, what was there): the reason."""
    lines = (ROOT / "tests/mutants/equivalent.txt").read_text(encoding="utf-8").splitlines()
    rows = [line.split(" | ") for line in lines if line and not line.startswith("#")]
    return {tuple(row[:3]): row[3] for row in rows}


def without_equivalents(faults, only):
    """Those that somebody could see. Ends the program when a line of the list fits none or several."""
    known = equivalents()
    places = collections.Counter((fault.file, fault.kind, fault.was) for fault in faults)
    folders = {fault.file.rsplit("/", 1)[0] for fault in faults}
    wrong = [" | ".join(row) for row in known if places[row] != 1 and row[0].rsplit("/", 1)[0] in folders]
    if wrong and not only:
        sys.exit("lines of tests/mutants/equivalent.txt that do not fit one place:\n" + "\n".join(wrong))
    return [fault for fault in faults if (fault.file, fault.kind, fault.was) not in known]


def summary(results, goal):
    """Prints the figures; gives the share that was found, in percent."""
    survivors = [fault for fault, found in results if not found]
    planted = collections.Counter(fault.kind for fault, _ in results)
    missed = collections.Counter(fault.kind for fault in survivors)
    for kind, count in sorted(planted.items()):
        print(f"{kind:22} {count:5} planted {count - missed[kind]:5} found")
    for fault in survivors:
        print(f"survives: {fault.name()}")
    share = 100 * (len(results) - len(survivors)) / max(1, len(results))
    print(f"{len(results)} planted, {len(results) - len(survivors)} found: {share:.1f} %, wanted {goal} %")
    return share


def main():
    parser = argparse.ArgumentParser()
    parser.add_argument("build", type=pathlib.Path)
    parser.add_argument("--area", choices=AREAS, default="plugin")
    parser.add_argument("--count", type=int, default=100)
    parser.add_argument("--seed", type=int, default=1)
    parser.add_argument("--jobs", type=int, default=2)
    parser.add_argument("--only", default="")
    parser.add_argument("--again", action="store_true")
    options = parser.parse_args()
    area = AREAS[options.area]

    faults = without_equivalents(list(faults_of(area, options.only)), options.only)
    options.build.mkdir(parents=True, exist_ok=True)
    results = Results(options.build / f"{options.area}.jsonl", options.again)
    drawn = [fault for fault in faults
             if (fault.key() in results.again if options.again else not results.holds(fault))]
    random.Random(options.seed).shuffle(drawn)
    print(f"{len(faults)} places in {', '.join(area.folders)}, {len(drawn)} to try; seed {options.seed}", flush=True)
    tried, rest = [], iter(drawn)

    def rest_one_by_one():
        while len(tried) < options.count and (fault := next(rest, None)):
            yield fault

    def work(number):
        job = Job(options.build.resolve() / f"{options.area}-{number}", area)
        for fault in rest_one_by_one():
            began, found = time.monotonic(), job.try_out(fault)
            results.add(fault, found)
            if found is not None:
                tried.append(fault)
                how = f"found by {found}" if found else "SURVIVES"
                print(f"{len(tried):4} {time.monotonic() - began:5.1f} s  {fault.name()}: {how}", flush=True)

    if drawn and options.count:
        with concurrent.futures.ThreadPoolExecutor(options.jobs) as pool:
            for each in [pool.submit(work, number) for number in range(options.jobs)]:
                each.result()
    planted = results.planted(faults)
    return 0 if summary(planted, area.goal) >= area.goal and planted else 1


if __name__ == "__main__":
    sys.exit(main())
