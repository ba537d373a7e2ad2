#!/usr/bin/env python3
"""What can be seen of a device while another process is working on it, and after that process was killed.

usage: looking_tests.py TSD [unittest arguments]
"""

import fcntl
import os
import pathlib
import plistlib
import pty
import signal
import struct
import subprocess
import termios
import unicodedata

import tsd_folder
from tsd_folder import BUSY, DONE, Folder, tree_of


class Stuck:
    """A sync that has come as far as to the first progress of an app's package, and no further: nobody reads on what it
    writes of its calls."""

    def __init__(self, *arguments, until):
        os.mkfifo("calls")
        self.process = subprocess.Popen([tsd_folder.TSD, "sync", *arguments, "--calls", "calls", "--progress", "none",
                                         # Another package would go on until it has something to tell.
                                         "--transfers", "1"],
                                        stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL)
        self.calls = open("calls", encoding="utf-8")
        for line in self.calls:
            if until in line:
                break
        # What the device keeps of the run is handed over a moment later.
        while not any(until in kept.read_text() for kept in pathlib.Path(arguments[0]).glob("runs/*/calls.jsonl")):
            assert self.process.poll() is None
        os.kill(self.process.pid, signal.SIGSTOP)
        # The signal is sent by then; its threads stand still only when this returns.
        os.waitid(os.P_PID, self.process.pid, os.WSTOPPED)

    def kill(self):
        self.process.kill()
        self.process.wait()
        self.calls.close()


def on_terminal(columns, *arguments):
    """The lines that a command writes to a terminal of so many columns."""
    terminal, end = pty.openpty()
    fcntl.ioctl(end, termios.TIOCSWINSZ, struct.pack("HHHH", 30, columns, 0, 0))
    text = b""
    with subprocess.Popen([tsd_folder.TSD, *arguments], stdout=end, stderr=subprocess.DEVNULL,
                          stdin=subprocess.DEVNULL):
        os.close(end)
        try:
            while part := os.read(terminal, 65536):
                text += part
        except OSError:  # nobody writes to it any more
            pass
    os.close(terminal)
    return text.decode().split("\r\n")


def columns_of(line):
    return sum(0 if unicodedata.category(sign) in ("Mn", "Me", "Cf") else 2 if unicodedata.east_asian_width(sign) in "WF" else 1
               for sign in line)


class Looking(Folder):
    VIEWS = [("status", "dev"), ("home", "dev", "-o", "home.png"), ("plan", "dev", "host"), ("why", "dev", "APP"),
             ("query", "dev", "metrics"), ("watch", "dev", "--until-idle")]

    def views(self, app, *names):
        """Runs them, and sees that nothing was written to the device nor to the folder for temporary files."""
        before = tree_of("dev")
        answers = {}
        for arguments in self.VIEWS:
            if not names or arguments[0] in names:
                answers[arguments[0]] = self.document(*[app if each == "APP" else each for each in arguments])
        after = tree_of("dev")
        # By name alone: two journals that differ would be told apart line by line for minutes.
        self.assertEqual([path for path in {**before, **after} if before.get(path) != after.get(path)], [])
        self.assertEqual(tree_of(os.environ["TMPDIR"]), {})
        return answers

    def test_lines_keep_to_the_terminal(self):
        apps = self.make(8)
        names = ["A name that is very much longer than its place", "日本語の名前がとても長い", "حديقة هادئة جدا", "e\u0301" * 30,
                 "👩\u200d👩\u200d👧 family"]
        for app, name in zip(apps, names):
            manifest = pathlib.Path(f"host/{app}/Info.plist")
            manifest.write_bytes(plistlib.dumps(plistlib.loads(manifest.read_bytes()) | {"KBBundleDisplayName": name}))
        for columns in (40, 80, 160):
            for arguments in (("plan", "dev", "host"), ("sync", "dev", "host"), ("status", "dev"), ("home", "dev"),
                              ("runs", "dev"), ("why", "dev", app), ("query", "dev", "metrics"),
                              ("query", "dev", "accounts"), ("restore", "dev", "host"), ("backup", "dev"),
                              ("watch", "dev", "--until-idle"), *([("help", "sync")] if columns > 40 else [])):
                with self.subTest(" ".join(arguments), columns=columns):
                    lines = on_terminal(columns, *arguments)
                    self.assertGreater(len(lines), 1, arguments)
                    # An identifier is one word, which is never cut where the person may want to copy it.
                    wide = [line for line in lines if columns_of(line) > columns and len(line.split()) > 1]
                    self.assertEqual(wide, [])
        # A wide one is used.
        self.assertGreater(max(columns_of(line) for line in on_terminal(160, "home", "dev")), 100)

    def test_a_device_at_work_and_after_a_kill(self):
        app = self.make(4, "dev", "--package-size", "4000000")[0]
        pathlib.Path("tmp").mkdir()
        outside = os.environ.get("TMPDIR")
        os.environ["TMPDIR"] = str(pathlib.Path("tmp").resolve())
        self.addCleanup(lambda: os.environ.pop("TMPDIR") if outside is None else os.environ.update(TMPDIR=outside))
        first = self.document("plan", "dev", "host")["apps"][0]["id"]
        self.tsd("plan", "dev", "host", "--inject", "AppsClient.outstandingAssetTransfers=kill", code=-signal.SIGKILL)
        self.views(app, "plan")
        sync = Stuck("dev", "host", until=f'"op":"assetTransferUpdatedProgress","app":"{first}","args":{{"asset"')
        self.addCleanup(sync.kill)
        try:
            answers = self.views(app, "status", "home", "plan", "why", "query")
            self.assertEqual(answers["status"]["busy"]["process"], str(sync.process.pid))
            self.assertRegex(answers["status"]["busy"]["command"], "sync dev host")
            icons = {icon["id"]: icon for page in answers["home"]["pages"] for icon in page}
            self.assertEqual({icon["look"] for icon in icons.values()}, {"waiting"})
            self.assertTrue(0 < icons[first]["progress"] < 1, icons[first])
            self.assertRegex(self.tsd("status", "dev").stdout, rf"(?m)^{first} .* placeholder, \d+ %$")
            self.assertRegex(self.tsd("runs", "dev").stdout, "sync +still running$")
            self.assertIn("run 1 (sync): still running", answers["why"]["answer"])
            self.tsd("backup", "dev", code=BUSY)
            watch = subprocess.Popen([tsd_folder.TSD, "watch", "dev", "--until-idle"], stdout=subprocess.PIPE, text=True)
            self.addCleanup(watch.stdout.close)
            self.assertIn(f"dev: process {sync.process.pid} is working on it", watch.stdout.readline())
        finally:
            sync.kill()
        seen = watch.stdout.read()
        self.assertEqual(watch.wait(), DONE)
        self.assertRegex(seen, rf"(?m)^{first}: (\d+ %|installing)$")
        self.assertIn("dev: 4 apps: 4 on the way.", seen)
        after = self.views(app)
        icons = {icon["id"]: icon for page in after["home"]["pages"] for icon in page}
        self.assertTrue(0 < icons[first]["progress"] < 1, icons[first])
        self.assertNotIn("busy", after["status"])
        self.assertRegex(self.tsd("runs", "dev").stdout, "sync +killed$")
        self.assertIn("run 1 (sync): killed", after["why"]["answer"])
        further = "packages may have come further than is shown"
        self.assertNotIn(further, self.tsd("status", "dev").stderr)
        with open("dev/runs/0001-sync/calls.jsonl", "a") as journal:
            journal.write('{"note":"the journal is cut off here, as it has become too long"}\n')
        for view in (["status", "dev"], ["home", "dev"], ["why", "dev", app], ["watch", "dev", "--until-idle"]):
            self.assertEqual(self.tsd(*view).stderr.count(further), 1, view)
        self.sync("dev", "host")
        self.assertEqual(self.tsd("watch", "dev", "--until-idle").stdout,
                         "dev: nobody is changing it; 4 apps: 4 installed.\ndev: 4 apps: 4 installed.\n")

    def test_a_watch_ends_when_it_is_told_to(self):
        self.make(1)
        watch = subprocess.Popen([tsd_folder.TSD, "watch", "dev"], stdout=subprocess.PIPE, text=True)
        self.addCleanup(watch.stdout.close)
        self.assertEqual(watch.stdout.readline(), "dev: nobody is changing it; no apps.\n")
        watch.send_signal(signal.SIGINT)
        self.assertEqual((watch.stdout.read(), watch.wait()), ("dev: no apps.\n", DONE))


if __name__ == "__main__":
    tsd_folder.main()
