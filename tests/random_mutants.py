#!/usr/bin/env python3
"""Plants faults by the dice, one at a time, and sees whether the tests find them: says how good the tests are.

usage: random_mutants.py BUILD [--area plugin|values|install] [--count N] [--seed S] [--jobs N] [--only FILE]

A statement, a guard or a message goes, a condition is negated, an operator, a constant or a text becomes another one,
two neighbouring statements change places. One object is compiled and linked for each; a fault that does not compile is
drawn again. It is found when a test fails, crashes or does not end. What survives is printed with its place, and is
either equivalent to what was there, which a line of tests/mutants/equivalent.txt says with the reason, or wants a test.
The copies of the sources and their builds lie in BUILD, one for each job. Ends with 1 when fewer were found than the
area's goal.
"""

import argparse
import collections
import concurrent.futures
import json
import pathlib
import queue
import random
import subprocess
import sys
from typing import NamedTuple

from fault_sites import sites_of
from source_copy import Copy, ROOT

SEEDS = "300"


class Area(NamedTuple):
    """Where faults are planted, what is built anew with one, which tests have to find it, and how many of a hundred."""

    folders: list
    targets: list
    suites: list
    goal: int


# Suites in the order in which they are asked; a word that begins with "@" is a file of the copy, "%" one of its build.
PLUGIN_SUITES = [
    ["%bin/plugin_tests", "--gtest_filter=-*Simulation*:*Sweep*:*Thread*"],
    ["%bin/plugin_tests", "--gtest_filter=*Simulation*:*Sweep*"],
    ["%bin/plugin_tests", "--gtest_filter=*Thread*"],
    [sys.executable, "@tests/journal_tests.py", "%bin/tsd", "%bin/plugin_tests", "Journals"],
]
AREAS = {
    "plugin": Area(["core", "transfer", "coordination", "restore", "placeholder"],
                   ["ApplicationSync", "plugin_tests", "tsd"], PLUGIN_SUITES, 97),
    "values": Area(["platform", "plist"], ["ApplicationSync", "plugin_tests", "property_list_tests", "device_foundation_tests", "tsd"],
                   [["%bin/property_list_tests"], ["%bin/device_foundation_tests"], *PLUGIN_SUITES], 90),
    "install": Area(["device/package", "device/reports", "device/install", "device/coordination"], ["plugin_tests", "device_service_tests", "contract_tests", "tsd"],
                    [["%bin/device_service_tests"], ["%bin/contract_tests"], *PLUGIN_SUITES], 90),
}


class Fault(NamedTuple):
    file: str
    kind: str
    line: int
    was: str
    text: str  # of the whole file with the fault

    def name(self):
        return f"{self.file}:{self.line} {self.kind}: {self.was}"


def one_line(text, most=100):
    text = " ".join(text.split())
    return text if len(text) <= most else text[:most - 1] + "…"


def faults_of(area, only):
    for folder in area.folders:
        for path in sorted((ROOT / folder).glob("*.cpp")):
            file = str(path.relative_to(ROOT))
            if only and only not in file:
                continue
            source = path.read_text(encoding="utf-8")
            for site in sites_of(source):
                # A short one is told by its whole line.
                was = source[site.begin:site.end]
                if len(was) < 12:
                    was = source[source.rfind("\n", 0, site.begin) + 1:source.find("\n", site.end)]
                yield Fault(file, site.kind, source.count("\n", 0, site.begin) + 1, one_line(was),
                            source[:site.begin] + site.planted + source[site.end:])


class Job(Copy):
    """One copy, in which one fault after another is tried."""

    def __init__(self, folder, area):
        super().__init__(folder, "debug", "-DCMAKE_CXX_FLAGS=-O1 -g0", "-DCMAKE_CXX_FLAGS_DEBUG=")
        self._area = area
        if wrong := self.make(*area.targets):
            sys.exit(wrong)
        if found := self.tests():
            sys.exit(f"without a fault, {found}")

    def tests(self):
        """Which test failed; empty: none."""
        places = {"%": self.build, "@": self.sources}
        for words in self._area.suites:
            command = [str(places[word[0]] / word[1:]) if word[0] in places else word for word in words]
            if words[0][0] == "%":
                command += ["--gtest_brief=1", "--gtest_fail_fast"]
            try:
                ended = subprocess.run(command, capture_output=True, text=True, check=False, timeout=120, errors="replace",
                                       env={"APPSYNC_SEEDS": SEEDS, "PATH": "/usr/bin:/bin"})
            except subprocess.TimeoutExpired:
                return "it does not end"
            if ended.returncode != 0:
                lines = [line for line in ended.stdout.splitlines() if "[  FAILED  ]" in line]
                return lines[0].split("]")[1].split("(")[0].strip() if lines else f"ended with {ended.returncode}"
        return ""

    def try_out(self, fault):
        """What found it; empty: nothing; none: it is no fault, as it does not build."""
        path = self.sources / fault.file
        original = path.read_text(encoding="utf-8")
        path.write_text(fault.text, encoding="utf-8")
        try:
            return None if self.make(*self._area.targets) else self.tests()
        finally:
            path.write_text(original, encoding="utf-8")


def equivalents():
    """(file, kind, what was there): the reason."""
    lines = (ROOT / "tests/mutants/equivalent.txt").read_text(encoding="utf-8").splitlines()
    rows = [line.split(" | ") for line in lines if line and not line.startswith("#")]
    return {tuple(row[:3]): row[3] for row in rows}


def main():
    parser = argparse.ArgumentParser()
    parser.add_argument("build", type=pathlib.Path)
    parser.add_argument("--area", choices=AREAS, default="plugin")
    parser.add_argument("--count", type=int, default=100)
    parser.add_argument("--seed", type=int, default=1)
    parser.add_argument("--jobs", type=int, default=2)
    parser.add_argument("--only", default="")
    options = parser.parse_args()
    area, known = AREAS[options.area], equivalents()

    drawn = [fault for fault in faults_of(area, options.only) if (fault.file, fault.kind, fault.was) not in known]
    random.Random(options.seed).shuffle(drawn)
    print(f"{len(drawn)} places in {', '.join(area.folders)}; seed {options.seed}", flush=True)
    free = queue.Queue()
    for number in range(options.jobs):
        free.put(Job(options.build.resolve() / f"{options.area}-{number}", area))

    results, rest = [], iter(drawn)

    def work():
        job = free.get()
        for fault in rest_one_by_one():
            found = job.try_out(fault)
            if found is not None:
                results.append((fault, found))
                if not found:
                    print(f"SURVIVES {fault.name()}", flush=True)

    def rest_one_by_one():
        while len(results) < options.count and (fault := next(rest, None)):
            yield fault

    with concurrent.futures.ThreadPoolExecutor(options.jobs) as pool:
        for each in [pool.submit(work) for _ in range(options.jobs)]:
            each.result()

    survivors = [fault for fault, found in results if not found]
    planted = collections.Counter(fault.kind for fault, _ in results)
    missed = collections.Counter(fault.kind for fault in survivors)
    for kind, count in sorted(planted.items()):
        print(f"{kind:22} {count:5} planted {count - missed[kind]:5} found")
    share = 100 * (len(results) - len(survivors)) / max(1, len(results))
    print(f"{len(results)} planted, {len(results) - len(survivors)} found: {share:.1f} %, wanted {area.goal} %")
    rows = [fault._asdict() | {"text": "", "found": found} for fault, found in results]
    (options.build / f"{options.area}-{options.seed}.json").write_text(json.dumps(rows, indent=1))
    return 0 if results and share >= area.goal else 1


if __name__ == "__main__":
    sys.exit(main())
