#!/usr/bin/env python3
"""Kills `tsd`, or makes the disk fail, at every single step of a command, and looks at what is left.

usage: kill_sweep.py TSD kill|error|full [--every N] [--second N] [--only COMMAND]

kill   The process dies before and after each step, and again in the recovery (--second N: at every N-th step of it).
error  Each step fails, once and from then on: no space, input/output error, permission denied, a short write.
full   The device lies on a disk of its own that really has no more than so many pages (where one can be mounted).

Right after each run the todo list is a list that was written, with every outcome that was acknowledged; each app is
wholly what it was or wholly what it was to become; nothing beside the device has changed. The same command run again
reaches the state of a run that nothing happened to, leaves no temporary file and no container without an app, and
opening the device once more changes nothing.
"""

import argparse
import concurrent.futures
import itertools
import json
import os
import pathlib
import plistlib
import re
import shutil
import sqlite3
import subprocess
import sys
import tempfile

from tsd_folder import DEADLINE, DONE, FAILED, SOME_FAILED, tree_of

KILLED = -9

TODO_LIST = "var/mobile/Library/ApplicationSync/HarluneStuff/ApplicationsSync.plist"
CONTAINERS = "var/containers/Bundle/Application/"
TEMPORARY = ".applicationsync-"
# Made anew by every sync from what the device shows at that moment, which an interrupted run has changed.
NOT_COMPARED = ("var/mobile/Library/ApplicationSync/AssetSortOrder.plist", "var/mobile/Library/ApplicationSync/Icons")
# How far an entry of the todo list has come; outcomes are last.
PROGRESS = {"remove": 0, "install": 0, "SENT": 1, "DOWNLOADED": 1, "INSTALLED": 2, "FAILED": 2}

# Number of the error, and the text that a person has to see. A short write is one before there is no space left.
ERRORS = {"input/output": (5, "Input/output error"), "permission": (13, "Permission denied"),
          "space": (28, "No space left"), "short": (28, "No space left")}


class Found(Exception):
    """Something that must not be."""


def require(holds, what):
    if not holds:
        raise Found(what)


def mount(*arguments):
    subprocess.run(["mount", *arguments], check=True)


class Device:
    """A device's folder as it lies on the disk."""

    def __init__(self, folder):
        self.folder = pathlib.Path(folder)

    def copy_to(self, folder):
        shutil.copytree(self.folder, folder)
        return Device(folder)

    def records(self):
        """The store's records by kind and key. Read from a copy, as reading takes part in the store's recovery."""
        with tempfile.TemporaryDirectory() as folder:
            for name in ("device.db", "device.db-wal"):
                if (self.folder / name).exists():
                    shutil.copy(self.folder / name, folder)
            database = sqlite3.connect(folder + "/device.db")
            rows = database.execute("SELECT kind, key, value FROM records ORDER BY kind, key").fetchall()
            database.close()
        return {(kind, key): plistlib.loads(value) for kind, key, value in rows}

    def apps(self):
        """Each app's record, and the content of its container."""
        return {key: (record, tree_of(self.folder / ("fs" + record["container"])))
                for (kind, key), record in self.records().items() if kind == "app"}

    def todo_list(self):
        try:
            return plistlib.loads((self.folder / "fs" / TODO_LIST).read_bytes())
        except FileNotFoundError:
            return None

    def everything(self):
        return tree_of(self.folder / "fs"), self.records()

    def open(self, tsd):
        """Lets a process take the device for itself, which finishes or rolls back what another left. It does nothing."""
        tsd.run("uninstall", self.folder, "com.example.nobody", codes=(FAILED,))

    def picture(self, tsd):
        """What can be compared with another device, once it was opened: containers go by their apps."""
        self.open(tsd)
        status = json.loads(tsd.run("status", self.folder, "--json").stdout)
        names = {record["container"].rsplit("/", 1)[1]: app for app, (record, _) in self.apps().items()}
        files = {}
        for path, content in tree_of(self.folder / "fs").items():
            if path.startswith(CONTAINERS):
                container, slash, rest = path[len(CONTAINERS):].partition("/")
                require(container in names, f"the container {container} is nobody's")
                path = CONTAINERS + names[container] + slash + rest
            require(TEMPORARY not in path, f"a temporary file was left: {path}")
            if not path.startswith(NOT_COMPARED):
                files[path] = content
        return {"status": status, "todo list": self.todo_list(), **files}


class Program:
    """`tsd`, run in one folder."""

    def __init__(self, program, folder):
        self.program, self.folder = program, folder

    def run(self, *arguments, codes=(DONE,)):
        run = subprocess.run([self.program, *map(str, arguments)], capture_output=True, text=True, timeout=120,
                             cwd=self.folder, stdin=subprocess.DEVNULL, errors="replace")
        require(run.returncode in codes, f"{' '.join(map(str, arguments))} ended with {run.returncode}: {run.stderr}")
        return run


class Command:
    """A command that is tried: on a device that has had an earlier sync, and a few apps besides."""

    def __init__(self, tsd, base, name, *arguments, host=None):
        self.tsd, self.name, self.arguments = tsd, name, arguments
        self.host = host and tsd.folder / host
        self.folder = tsd.folder / "commands" / name
        self.before = Device(tsd.folder / base)
        self.old_apps = self.before.apps()
        clean = self.before.copy_to(self.folder / "clean")
        self.code = self.run(clean, codes=(DONE, SOME_FAILED)).returncode
        self.new_apps, self.after = clean.apps(), clean.picture(tsd)
        self.bystanders = self.others()

    def run(self, device, *more, codes):
        arguments = [self.host, "--progress", "none"] if self.host else self.arguments
        return self.tsd.run(self.name, device.folder, *arguments, *more, codes=codes)

    def others(self):
        """Everything that no run has any business with."""
        return [tree_of(self.tsd.folder / folder) for folder in ("canary", "host", "restored")]

    def steps(self):
        """How many steps a run takes."""
        low, high = 0, 1
        while self.kill(high):
            low, high = high, high * 2
        while high - low > 1:
            middle = (low + high) // 2
            low, high = (middle, high) if self.kill(middle) else (low, middle)
        require(low > 5, f"a {self.name} of only {low} steps")
        return low

    def kill(self, step):
        device = self.before.copy_to(self.folder / "count")
        run = self.run(device, "--inject", f"step@{step}=kill", codes=(KILLED, self.code))
        shutil.rmtree(device.folder)
        return run.returncode == KILLED

    def check_disk(self, device, list_before, calls):
        """What holds whenever the process has ended, however it did."""
        lines = calls.read_text().split("\n")[:-1]  # death may have come in the middle of the last one
        if self.host:
            self.check_list(device.todo_list(), list_before, [json.loads(line) for line in lines])
        now = device.apps()
        for app, (record, content) in now.items():
            known = [apps[app][1] for apps in (self.old_apps, self.new_apps) if app in apps]
            require(record.get("isPlaceholder") or content in known,
                    f"{app} is neither what it was nor what it should become")
        for app in self.old_apps:
            require(app in now or app not in self.new_apps, f"{app} is gone")
        require(self.others() == self.bystanders, "something beside the device has changed")

    def check_list(self, todo, list_before, calls):
        begun = taken = False
        acknowledged, pending = {}, {}
        for call in calls:
            if call["op"] == "reconcileSync":
                begun, taken = True, call.get("result") is True
            elif "|Changing " in call.get("text", ""):
                words = call["text"].split()
                pending[call["thread"]] = words[1], words[-1]
            elif call["op"] == "writeAtomically" and call["args"]["path"].endswith("/ApplicationsSync.plist"):
                app, mark = pending.pop(call["thread"])
                if call["result"]:
                    acknowledged[app] = mark
        if todo == list_before and not taken:
            return
        if todo is None:
            return require(begun and not taken, "the todo list is gone")
        require(begun, "the todo list has changed")
        host_list = plistlib.loads((self.host / "ApplicationsSync.plist").read_bytes())
        require([entry["identifier"] for entry in todo] == [entry["identifier"] for entry in host_list],
                "the todo list is not one that was written")
        for entry in todo:
            mark = acknowledged.get(entry["identifier"], "install")
            require(PROGRESS[entry["operation"]] >= PROGRESS[mark] or entry["operation"] == "remove",
                    f"{entry} lacks the acknowledged {mark}")

    def differences(self, device, excused=lambda picture: picture):
        now, after = excused(device.picture(self.tsd)), excused(self.after)
        return [f"{name}: {now.get(name)!s:.300} instead of {after.get(name)!s:.300}"
                for name in sorted(now.keys() | after.keys()) if now.get(name) != after.get(name)]

    def check_recovered(self, device, excused=lambda picture: picture):
        # What is done already can be asked for once more of a host only.
        if self.host or self.differences(device, excused):
            self.run(device, codes=(self.code,))
        wrong = self.differences(device, excused)
        require(not wrong, "run again, it differs: " + "; ".join(wrong[:3]))
        everything = device.everything()
        device.open(self.tsd)
        require(device.everything() == everything, "opening the device once more changed it")

    def interrupt(self, device, rules, codes):
        """Runs the command with the rules, and looks at the disk."""
        calls = self.folder / (device.folder.name + ".calls")
        list_before = device.todo_list()
        injections = [word for rule in rules for word in ("--inject", rule)]
        run = self.run(device, "--calls", calls, *injections, codes=codes)
        self.check_disk(device, list_before, calls)
        calls.unlink()
        return run

    def try_kill(self, device, first, second=None):
        """Answers how often the process died."""
        kills = 0
        codes = (KILLED, self.code) if self.host else (KILLED, DONE, FAILED)  # what is done already may be refused
        for rule in (first, second) if second else (first,):
            kills += self.interrupt(device, [rule], codes).returncode == KILLED
        self.check_recovered(device)
        return kills

    def try_error(self, device, rules, texts, mend=lambda: None):
        """Answers whether the run met an error, of which one of the texts has to tell."""
        run = self.interrupt(device, rules, (DONE, FAILED, SOME_FAILED, DEADLINE))
        told = any(text in run.stderr + run.stdout for text in texts)
        wrong = self.differences(device)
        require(not wrong or told, f"not a word about {texts}, but {'; '.join(wrong[:3])}")
        bad = any(line.startswith(("status", "todo")) for line in wrong) if self.host else wrong
        require(not bad or run.returncode != DONE, f"all is said to be well, but {'; '.join(wrong[:3])}")
        # An app that comes later stands behind the others. A placeholder that lacks the icon is kept as it is.
        iconless = re.findall(r"/([^/]+)\.app/Icon\.png: createFile failed", run.stderr)

        def excused(picture):
            files = {name: value for name, value in picture.items()
                     if not any(f"{app}.app/{file}" in name for app in iconless for file in ("Icon.png", "Info.plist"))}
            return files | {"status": {**picture["status"], "home": sorted(picture["status"]["home"])}}

        mend()
        self.check_recovered(device, excused)
        return told

    def try_full(self, device, pages):
        disk = device.folder.with_suffix(".disk")
        disk.mkdir()
        mount("-t", "tmpfs", "-o", f"size={4 * pages}k", "none", disk)
        try:
            on_disk = device.copy_to(disk / device.folder.name)
            texts = "No space left", "disk is full"
            return self.try_error(on_disk, [], texts, lambda: mount("-o", "remount,size=0", disk))
        finally:
            subprocess.run(["umount", "--lazy", disk], check=True)  # a program that just starts may hold it

    def kills(self, steps, every, second):
        for step in range(1, steps + 1, every):
            yield self.try_kill, (f"step@{step}=kill",)
            yield self.try_kill, (f"step@{step}=kill-after",)
            # The recovery, and what comes after it, is as long as the run itself, or a bit longer.
            for again in range(1 + step % second, steps + 20, second):
                yield self.try_kill, (f"step@{step}=kill", f"step@{again}=kill")

    @staticmethod
    def errors(steps, every, trial):
        for number, step in enumerate(range(1, steps + 1, every)):
            # A sample takes one sort of error after another.
            for kind in itertools.islice(itertools.cycle(ERRORS), number, number + (1 if every > 1 else len(ERRORS))):
                value, text = ERRORS[kind]
                for onwards in ("", "+"):
                    rules = [f"step@{step}{onwards}=value={value}"]
                    if kind == "short":
                        rules = [f"step@{step}=none", f"step@{step + 1}{onwards}=value={value}"]
                    yield trial, (rules, [text])

    def disks(self, every):
        """From one that the device just fits on to one that a run fits on, too."""
        pages = sum(-(-len(content or b"") // 4096) for content in tree_of(self.before.folder).values())
        for more in range(1, 240, every):
            yield self.try_full, (pages + more,)

    def sweep(self, mode, every, second):
        steps = self.steps()
        trials = list({"kill": lambda: self.kills(steps, every, second), "full": lambda: self.disks(every),
                       "error": lambda: self.errors(steps, every, self.try_error)}[mode]())
        found, count = [], 0

        def attempt(number, trial, arguments):
            device = self.before.copy_to(self.folder / str(number))
            try:
                return trial(device, *arguments)
            except Exception as problem:  # whatever it is, the others go on
                found.append(f"{self.name} {' '.join(map(str, arguments))}: {problem}")
                return 0
            finally:
                shutil.rmtree(device.folder)

        with concurrent.futures.ThreadPoolExecutor(os.cpu_count()) as pool:
            jobs = [pool.submit(attempt, number, *trial) for number, trial in enumerate(trials)]
            count = sum(job.result() for job in jobs)
        print(f"{self.name}: {steps} steps, {len(trials)} runs, {count} {'kills' if mode == 'kill' else 'errors'}, "
              f"{len(found)} found", flush=True)
        for text in found[:20]:
            print("  " + text)
        return not found


def make_base(tsd):
    """A device with an app to be updated, one to be removed and one of an earlier sync; what the host wants next. And
    what has become of it after a restore, with an install of the store's under way."""
    tsd.run("sample", "earlier", "--apps", 1, "--seed", 7, "--package-size", 20000, "--files", 3)
    tsd.run("sample", "host", "--demo", "--apps", 5, "--package-size", 20000, "--files", 3)
    tsd.run("sample", "restored", "--apps", 3, "--seed", 3, "--package-size", 1000, "--files", 3)
    tsd.run("init", "base")
    for package in sorted((tsd.folder / "host/Packages/older").iterdir()):
        tsd.run("store", "base", package.stem)
        tsd.run("store", "base", package.stem, "--finish", "--package", package)
    tsd.run("sync", "base", "earlier", "--progress", "none")
    shutil.copytree(tsd.folder / "base", tsd.folder / "later")
    tsd.run("restore", "later", "restored", "--progress", "none")
    tsd.run("store", "later", "com.example.bought")
    (tsd.folder / "canary/var/mobile").mkdir(parents=True)
    (tsd.folder / "canary/var/mobile/sings").write_text("while nobody touches it")


def main():
    options = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    options.add_argument("program", metavar="TSD")
    options.add_argument("mode", choices=["kill", "error", "full"])
    options.add_argument("--every", type=int, default=1, metavar="N", help="only every N-th step")
    options.add_argument("--second", type=int, default=50, metavar="N", help="a second kill at every N-th step")
    options.add_argument("--only", choices=["sync", "restore", "store", "uninstall", "backup", "clear"])
    chosen = options.parse_args()
    with tempfile.TemporaryDirectory() as folder:
        tsd = Program(os.path.abspath(chosen.program), pathlib.Path(folder))
        make_base(tsd)
        commands = [Command(tsd, "base", "sync", host="host"),
                    Command(tsd, "base", "restore", host="restored"),
                    Command(tsd, "later", "store", "com.example.bought", "--finish"),
                    Command(tsd, "later", "uninstall", "com.example.quillwick"),
                    Command(tsd, "later", "backup"),
                    Command(tsd, "later", "clear")]
        good = [command.sweep(chosen.mode, chosen.every, chosen.second) for command in commands
                if chosen.only in (None, command.name)]
    return 0 if all(good) else 1


if __name__ == "__main__":
    sys.exit(main())
