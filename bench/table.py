#!/usr/bin/env python3
"""Runs the measuring programs and shows what they found as a table: work, figure, goal, met or missed.

usage: table.py [--short] BIN

Measuring programs are BIN/*_benchmarks and the scripts *_benchmarks.py beside this file, which get BIN as their last
argument. Each prints one line of JSON per row on standard output and says anything else on standard error:

    {"work": "read a list", "figure": "54 times as fast", "goal": "at least 40", "met": true}

`met` is null where a row has no goal, or the program could not tell. With --short, which is passed on, the programs
take the smallest inputs and the goals say nothing: all that counts is that they ran and printed their rows.

Ends with 1 when a program failed or printed no row. A goal that was missed is shown, but is no failure.
"""

import json
import pathlib
import subprocess
import sys

HEADINGS = ("work", "figure", "goal", "")
MET = {True: "met", False: "MISSED", None: ""}


def programs(folder):
    scripts = sorted(pathlib.Path(__file__).resolve().parent.glob("*_benchmarks.py"))
    return [[path] for path in sorted(folder.glob("*_benchmarks"))] + [[sys.executable, path, folder] for path in scripts]


def rows_of(command, options):
    """The rows that the program printed; one that fails may have printed some."""
    command = [command[0], *command[1:-1], *options, *command[1:][-1:]]
    run = subprocess.run(command, stdout=subprocess.PIPE, text=True)
    rows = [json.loads(line) for line in run.stdout.splitlines()]
    for row in rows:
        assert row["work"] and row["figure"] and row["goal"] is not None and row["met"] in MET, row
    return rows, run.returncode


def printed(cells, widths):
    return "  ".join(cell.ljust(width) for cell, width in zip(cells, widths)).rstrip()


def main():
    options = [argument for argument in sys.argv[1:] if argument == "--short"]
    folder = pathlib.Path(sys.argv[-1]).resolve()
    table, failed = [], False
    for command in programs(folder):
        name = pathlib.Path(command[-1] if len(command) == 1 else command[1]).name
        rows, code = rows_of(command, options)
        table += [(row["work"], str(row["figure"]), row["goal"], MET[row["met"]]) for row in rows]
        if code != 0 or not rows:
            print(f"{name} ended with {code} after {len(rows)} rows", file=sys.stderr)
            failed = True
    widths = [max(len(row[column]) for row in [HEADINGS, *table]) for column in range(4)]
    print(printed(HEADINGS, widths))
    print(printed(["-" * width for width in widths], widths))
    print("\n".join(printed(row, widths) for row in table))
    return failed or not table


if __name__ == "__main__":
    sys.exit(main())
