"""What the results of a plan say together."""

import collections
import heapq
import os
import re
import shlex

# In the order in which a person wants to know of them, with the words and the tones of the page.
RESULTS = {"crashed": ("crashed", "bad"), "hung": ("took too long", "bad"), "differs": ("differ", "bad"),
           "failed": ("with seeds that do not hold", "bad"), "refused": ("cannot be read", "wait"),
           "missing": ("without a result", "wait"), "done": ("in order", "good")}
MOST_EXAMPLES, MOST_SLOW = 5, 10


def first_call(text, app):
    """A call without what differs from one recording to the next: apps, numbers, and what is in lists."""
    if app:
        text = text.replace(app, "APP")
    return re.sub(r"\d+", "#", re.sub(r"\[.*\]|\{.*\}", "…", text))[:200]


def group_of(result):
    """What results have in common that are counted as one finding, as pairs of a word and a text; None if all is well."""
    kind = result["result"]
    if kind == "differs":
        difference = result["difference"]
        expected, came = (first_call(difference[key], difference["app"]) for key in ("expected", "came"))
        return (("kind", difference["kind"]), ("in", difference["inside"] or "no call"),
                ("expected", expected or "nothing more"), ("came", came or "the end of the call"))
    if kind in ("crashed", "hung", "refused"):
        return ("kind", RESULTS[kind][0]), ("text", re.sub(r"\d+", "#", result.get("text", ""))[:200])
    return None


class Gathering:
    """`counts` by result; `replays` and `seeds` that have run; `groups`, the largest first; `slowest`; `missing`, how many
    pieces of which jobs; `hosts`, pieces and seconds of each."""

    def __init__(self, plan, host=None):
        self.plan, self.host = plan, host or os.uname().nodename
        self.counts, self.replays, self.seeds, self.seconds, self.kilobytes = collections.Counter(), 0, 0, 0.0, 0
        self.missing, self.hosts, self._groups, self._slow = {}, {}, {}, []
        for job in plan.jobs():
            for piece in plan.pieces(job):
                result = plan.result(piece)
                self.counts[result["result"] if result else "missing"] += 1
                if result:
                    self._count(piece, result)
                else:
                    self.missing[job] = self.missing.get(job, 0) + 1
        self.groups = sorted(self._groups.values(), key=lambda group: (-group["count"], group["what"]))
        self.slowest = [{"seconds": seconds, "name": self.name(piece), "fetch": self.fetch(piece)}
                        for seconds, _, piece in sorted(self._slow, key=lambda each: each[:2], reverse=True)]

    @property
    def is_partial(self):
        return self.counts["missing"] > 0

    @property
    def is_in_order(self):
        return set(+self.counts) <= {"done", "missing"}

    @staticmethod
    def name(piece):
        return piece["file"] if "recording" in piece else f"seeds {piece['first']} to {piece['last']}"

    def fetch(self, piece, seed=None):
        """The command that brings a piece, and the build that it ran on, to somebody's desk and runs it there."""
        def remote(path):
            return shlex.quote(f"{self.host}:{path}")
        plugin = remote(self.plan.program("libApplicationSync.so"))
        if "recording" in piece:
            path = self.plan.recording(piece)
            return f"scp {remote(path)} {plugin} . && tsd replay {path.name} --plugin ./libApplicationSync.so"
        which = f"APPSYNC_SEED={seed}" if seed else f"APPSYNC_FIRST_SEED={piece['first']} " \
            f"APPSYNC_SEEDS={piece['last'] - piece['first'] + 1}"
        return f"scp {remote(self.plan.program('plugin_tests'))} {plugin} . && " \
               f"{which} APPSYNC_PLUGIN=./libApplicationSync.so ./plugin_tests --gtest_filter='*Simulation*'"

    def _count(self, piece, result):
        run = result["run"]
        if "recording" in piece:
            self.replays += 1
        else:
            self.seeds += piece["last"] - piece["first"] + 1
        host = self.hosts.setdefault(run["host"], [0, 0.0])
        host[0] += 1
        host[1] += run["seconds"]
        self.seconds += run["seconds"]
        self.kilobytes = max(self.kilobytes, run["kilobytes"])
        slow = (run["seconds"], piece["name"], piece)
        (heapq.heappush if len(self._slow) < MOST_SLOW else heapq.heappushpop)(self._slow, slow)
        what = group_of(result)
        if what:
            self._find(what, self.name(piece), result.get("difference"), self.fetch(piece))
        for failed in result.get("seeds", []):
            what = ("kind", "a seed that does not hold"), ("at", failed["place"])
            self._find(what, f"seed {failed['seed']}", {"text": failed["text"]}, self.fetch(piece, failed["seed"]))

    def _find(self, what, name, detail, fetch):
        group = self._groups.setdefault(what, {"what": what, "count": 0, "examples": [], "detail": detail, "fetch": fetch})
        group["count"] += 1
        if len(group["examples"]) < MOST_EXAMPLES:
            group["examples"].append(name)

    def sentence(self):
        total = self.plan.facts["pieces"]
        known = total - self.counts["missing"]
        wrong = known - self.counts["done"]
        found = f"{wrong:,} of them {'is' if wrong == 1 else 'are'} not in order" if wrong else "all of them in order"
        if not known:
            return f"None of {total:,} pieces has a result yet."
        return (f"Partial: {known:,} of {total:,} pieces have a result, {found}." if self.is_partial else
                f"All {total:,} pieces have a result, {found}.")

    def document(self):
        return {"build": self.plan.facts["build"], "pieces": self.plan.facts["pieces"], "counts": dict(+self.counts),
                "partial": self.is_partial, "replays": self.replays, "seeds": self.seeds,
                "seconds": round(self.seconds, 1), "kilobytes": self.kilobytes,
                "groups": [{**group, "what": dict(group["what"])} for group in self.groups], "slowest": self.slowest,
                "missing": self.missing, "hosts": self.hosts}

    def table(self):
        rows = [(f"{self.counts[kind]:,}", words) for kind, (words, _) in RESULTS.items() if self.counts[kind]]
        lines = [f"{count:>9}  {words}" for count, words in [("PIECES", "RESULT"), *rows]]
        for group in self.groups:
            (_, kind), *rest = group["what"]
            lines += ["", f"{group['count']:>9}  {kind}", *(f"{word:>19}  {text}" for word, text in rest if text)]
            lines += [f"{'as':>19}  {', '.join(group['examples'])}", f"{'to the desk':>19}  {group['fetch']}"]
        lines += ["", f"{'SECONDS':>9}  SLOWEST"] + [f"{each['seconds']:9.3f}  {each['name']}" for each in self.slowest]
        if self.missing:
            lines += ["", f"{'MISSING':>9}  IN JOB"] + [f"{count:9,}  {job}, which logs into {self.plan.folder}/logs/{job}"
                                                       for job, count in list(self.missing.items())[:MOST_SLOW]]
        return "\n".join([*lines, "", self.sentence(), ""])
