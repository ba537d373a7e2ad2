#!/usr/bin/env python3
"""Plants one fault after another in a copy of the sources, and sees whether the checks find it.

usage: mutants.py BUILD [NAME...]

Each tests/mutants/NAME.patch says in its first line what it plants and in its second what has to find it: a test program
with its filter, or "analysis FILE" for clang's thread-safety analysis. The copy and its build lie in BUILD. Ends with 1
when a fault survives, when a patch no longer applies, or when a check finds something where nothing was planted.
"""

import pathlib
import subprocess
import sys

from source_copy import Copy, ROOT, run

class PatchedCopy(Copy):
    def patch(self, text, *options):
        return run("patch", "-p1", "--force", "--fuzz=0", *options, cwd=self.sources, input=text).returncode == 0

    def check(self, how):
        """(whether it builds, what the check found; empty: nothing)"""
        kind, rest = how.split(" ", 1)
        if kind == "analysis":
            command = ["clang++", "-std=c++20", "-fsyntax-only", "-Wthread-safety", f"-I{self.sources}"]
            lines = run(*command, self.sources / rest).stderr.splitlines()
            return True, next((line.split("warning: ")[1] for line in lines if "[-Wthread-safety" in line), "")
        if wrong := self.make(kind):
            return False, wrong
        try:
            ended = run(self.build / "bin" / kind, rest, "--gtest_brief=1", timeout=600)
        except subprocess.TimeoutExpired:
            return True, "it does not end"
        failed = [line.split("]")[1].split("(")[0].strip() for line in ended.stdout.splitlines() if "[  FAILED  ]" in line]
        return True, "" if ended.returncode == 0 else (failed or [f"ended with {ended.returncode}"])[0]


def main():
    folder, names = pathlib.Path(sys.argv[1]).resolve(), sys.argv[2:]
    patches = sorted((ROOT / "tests/mutants").glob("*.patch"))
    faults = {each.stem: each.read_text(encoding="utf-8") for each in patches if not names or each.stem in names}
    copy = PatchedCopy(folder, "release")
    heads = {name: [line.split(": ", 1)[1] for line in text.splitlines()[:2]] for name, text in faults.items()}
    wrong = 0
    for how in sorted({found_by for _, found_by in heads.values()}):
        builds, found = copy.check(how)
        if not builds or found:
            wrong += 1
            print(f"without a fault, {how}: {found}")
    for name, (plants, found_by) in heads.items():
        if not copy.patch(faults[name]):
            builds, found = False, "the patch does not apply"
        else:
            builds, found = copy.check(found_by)
            copy.patch(faults[name], "-R")
        wrong += not builds or not found
        result = f"found by {found}" if builds and found else "SURVIVES" if builds else f"NOT TRIED, {found}"
        print(f"{name:24} {plants}\n{'':24} {result}", flush=True)
    print(f"{len(heads)} planted faults, {wrong} not in order")
    return 1 if wrong or not heads else 0


if __name__ == "__main__":
    sys.exit(main())
