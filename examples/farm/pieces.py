"""Runs pieces. A result says what the build did, so that it is the same on every node and every time, and beside it, in
`run`, what it took where. A piece that something else has ended has none: it is run again."""

import json
import os
import re
import signal
import subprocess
import tempfile
import threading
import time

from plan import digest_of, write_whole

# What ends a process from outside: a cancelled job, a node without memory.
FROM_OUTSIDE = {signal.SIGHUP, signal.SIGINT, signal.SIGKILL, signal.SIGTERM}
REFUSED, DIFFERS = 1, 7  # exit codes of `tsd replay`
LONGEST = 4000  # characters of a text in a result
MOST_SEEDS = 10  # of a piece that do not hold: the others are not looked at then


class NoResult(Exception):
    """Nothing is known of a piece: something other than the build ended it."""


class Ended:
    """A process that has ended: `code` as Python has it, `hung`, `output`, `errors`, `seconds`, `kilobytes`."""

    def __init__(self, command, limit, **variables):
        environment = {name: value for name, value in os.environ.items() if not name.startswith("APPSYNC_")}
        begin, self.hung = time.monotonic(), False
        with tempfile.TemporaryFile() as output, tempfile.TemporaryFile() as errors:
            process = subprocess.Popen([str(word) for word in command], stdin=subprocess.DEVNULL, stdout=output,
                                       stderr=errors, env=environment | variables)
            timer = threading.Timer(limit, self._stop, [process])
            timer.start()
            _, status, usage = os.wait4(process.pid, 0)
            timer.cancel()
            process.returncode = self.code = os.waitstatus_to_exitcode(status)
            self.output, self.errors = (self._text(file) for file in (output, errors))
        self.seconds, self.kilobytes = time.monotonic() - begin, usage.ru_maxrss
        if not self.hung and -self.code in FROM_OUTSIDE:
            raise NoResult(f"was ended by signal {-self.code}")
        if self.code in (126, 127):
            raise NoResult(f"could not be started here: {self.errors.strip()}")

    def _stop(self, process):
        self.hung = True
        process.kill()

    @staticmethod
    def _text(file):
        file.seek(0)
        return file.read().decode(errors="replace")


def how_it_broke(run):
    """None when it ended by itself."""
    if run.hung:
        return {"result": "hung"}
    return {"result": "crashed", "text": f"signal {signal.Signals(-run.code).name}"} if run.code < 0 else None


def replay(plan, piece):
    path = plan.recording(piece)
    if digest_of(path) != piece["recording"]:
        raise NoResult(f"{path} is not what its name says")
    ignored = [word for each in plan.facts["ignored"] for word in ("--ignore", each)]
    run = Ended([plan.program("tsd"), "replay", path, "--json", *ignored], plan.facts["limit"])
    found = how_it_broke(run)
    if not found and run.code == REFUSED:
        found = {"result": "refused", "text": run.errors.strip().replace(f"{path}: ", "")[:LONGEST]}
    if not found and run.code not in (0, DIFFERS):
        raise NoResult(f"'tsd replay' ended with {run.code}: {run.errors.strip()}")
    if not found:
        document = json.loads(run.output)
        found = {key: document[key] for key in ("result", "events", "whole")}
        found["difference"] = next(iter(document["differences"]), None)
    return found, run.kilobytes


def play(plan, first, last):
    return Ended([plan.program("plugin_tests"), "--gtest_filter=*Simulation*", "--gtest_brief=1"], plan.facts["limit"],
                 APPSYNC_FIRST_SEED=str(first), APPSYNC_SEEDS=str(last - first + 1),
                 APPSYNC_PLUGIN=str(plan.program("libApplicationSync.so")))


def seeds(plan, first, last):
    """The tests end at the first seed that does not hold, and are begun anew behind it; one that ends the process is
    looked for by halves."""
    ranges, failed, most = [(first, last)], [], 0
    while ranges and len(failed) < MOST_SEEDS:
        first, last = ranges.pop()
        run = play(plan, first, last)
        most = max(most, run.kilobytes)
        shown = re.search(r"APPSYNC_SEED=(\d+) shows it again", run.errors)
        if run.code == 0:
            continue
        if shown:
            seed, place = int(shown[1]), re.search(r"([^\s/]+:\d+): Failure", run.output)
            text = run.output[place.start() if place else 0:][:LONGEST]
            failed.append({"seed": seed, "place": place[1] if place else "", "text": text})
            if not first <= seed <= last:  # one of those that the tests begin with: none of them can be played
                break
            if seed < last:
                ranges.append((seed + 1, last))
        elif first < last:
            middle = (first + last) // 2
            ranges += [(middle + 1, last), (first, middle)]
        else:
            broke = how_it_broke(run) or {"result": "failed"}
            failed.append({"seed": first, "place": broke["result"], "text": broke.get("text", run.output)[-LONGEST:]})
    return {"result": "failed" if failed else "done", "seeds": failed}, most


def run_piece(plan, piece):
    begin = time.monotonic()
    if "recording" in piece:
        found, kilobytes = replay(plan, piece)
    else:
        found, kilobytes = seeds(plan, piece["first"], piece["last"])
    took = {"seconds": round(time.monotonic() - begin, 3), "kilobytes": kilobytes, "host": os.uname().nodename}
    write_whole(plan.result_file(piece), json.dumps({**found, "run": took}) + "\n")


def run_job(plan, job):
    """True when all pieces of the job have a result. Those that have one already are left alone."""
    complete = True
    for piece in plan.pieces(job):
        if plan.result(piece):
            continue
        try:
            run_piece(plan, piece)
        except (NoResult, OSError) as problem:
            print(f"{piece['name']}: {problem}", flush=True)
            complete = False
    return complete
