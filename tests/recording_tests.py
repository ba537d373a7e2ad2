#!/usr/bin/env python3
"""What is recorded replays: whole, cut anywhere, with many threads; and what a plug-in does differently is told.

usage: recording_tests.py TSD [unittest arguments]
"""

import ctypes
import ctypes.util
import json
import pathlib
import plistlib
import random
import re

import tsd_folder
from tsd_folder import DIFFERS, DONE, FAILED, SOME_FAILED, USAGE, Folder, says


def decompressed(path):
    """What is in a recording, behind its head."""
    library = ctypes.CDLL(ctypes.util.find_library("zstd") or "libzstd.so.1")
    library.ZSTD_decompress.restype = ctypes.c_size_t
    packed, room = pathlib.Path(path).read_bytes()[9:], ctypes.create_string_buffer(64 << 20)
    size = library.ZSTD_decompress(room, ctypes.c_size_t(len(room)), packed, ctypes.c_size_t(len(packed)))
    if size > len(room):
        raise ValueError(f"{path}: not decompressed")
    return room.raw[:size]


def texts_in(value):
    """All that a property list holds as texts, but for its keys."""
    if isinstance(value, dict):
        value = list(value.values())
    if isinstance(value, list):
        return {text for each in value for text in texts_in(each)}
    return {value} if isinstance(value, str) else set()


class Corpus(Folder):
    """What `make recordings` made: a difference is a change of behaviour, to be explained where they are made anew."""

    def test_every_recording(self):
        recordings = sorted((pathlib.Path(__file__).parent / "recordings").glob("*.recording"))
        self.assertGreater(len(recordings), 15)
        self.assertLess(sum(path.stat().st_size for path in recordings), 2 << 20)
        for path in recordings:
            with self.subTest(path.name):
                report = self.document("replay", str(path))
                self.assertTrue(report["whole"])
                # A message that is not compared keeps its place among what other threads do.
                if path.name.startswith("Threads."):
                    self.document("replay", str(path), "--ignore", "messages")

    def test_those_of_earlier_versions(self):
        """Nobody makes them any more: what the plug-in does by now may differ, but not what is read."""
        events = {"version-1-many-in-flight": 1944, "version-1-restore": 616, "version-2-many-in-flight": 1940,
                  "version-2-restore": 616}
        paths = (pathlib.Path(__file__).parent / "recordings" / "older").glob("*.recording")
        shown = {}
        for path in paths:
            self.assertEqual(path.read_bytes()[8], int(path.stem.split("-")[1]))
            facts = self.document("recording", "show", str(path))
            self.assertTrue(facts["whole"])
            shown[path.stem] = facts["events"]
            report = self.document("replay", str(path), "--go-on", code=(DONE, DIFFERS))
            self.assertTrue(report["whole"] or report["differences"])
        self.assertEqual(shown, events)

    def test_redacted_they_replay(self):
        for path in sorted((pathlib.Path(__file__).parent / "recordings").glob("*.recording")):
            # In these, accounts of one letter, which stay, are sorted among others.
            if "VantorIDs" in path.name or "AnAccountThatCannotBeMade" in path.name:
                continue
            with self.subTest(path.name):
                pathlib.Path("redacted").unlink(missing_ok=True)
                self.document("recording", "redact", str(path), "redacted")
                self.assertEqual(self.document("replay", "redacted")["differences"], [])


class Recordings(Folder):
    def record(self, *arguments, code=DONE, name="recording"):
        self.tsd(*arguments, "--record", name, "--progress", "none", code=code)
        return name

    def replayed(self, name="recording"):
        """How many events were replayed, all of them as recorded."""
        report = self.document("replay", name)
        self.assertEqual((report["result"], report["differences"]), ("done", []))
        return report

    def test_every_command_that_drives_the_plug_in(self):
        apps = self.make(6, "dev", "--demo")
        lines = [["restore", "dev", "host"], ["sync", "dev", "host", "--transfers", "1"],
                 ["sync", "dev", "host", "--repeat", "2"],
                 *(["query", "dev", each] for each in ("metrics", "accounts", "vantor-ids", "disabled-asset-types")),
                 ["backup", "dev"], ["clear", "dev"]]
        for number, line in enumerate(lines):
            with self.subTest(line):
                name = f"recording-{number}"
                # An app of the demonstration is damaged.
                self.record(*line, code=SOME_FAILED if line[0] == "sync" else DONE, name=name)
                report = self.replayed(name)
                self.assertTrue(report["whole"])
                self.assertGreater(report["events"], 10)
        shown = self.document("recording", "show", "recording-1")
        self.assertTrue(set(apps) & set(shown["apps"]))
        self.assertRegex(self.tsd("recording", "show", "recording-1").stdout,
                         r"(?m)^\d+ daemon < TSClient\.reconcileSync\(.*progressCallback callback#\d+, true\)$")

    def test_sixteen_packages_in_flight_replay_every_time(self):
        self.make(24)
        name = self.record("sync", "dev", "host", "--transfers", "16")
        events = {self.replayed(name)["events"] for _ in range(100)}
        self.assertEqual(len(events), 1)
        self.assertIn("transfer-16", self.tsd("recording", "show", name).stdout)

    def test_cut_anywhere(self):
        self.make(2)
        whole = pathlib.Path(self.record("sync", "dev", "host")).read_bytes()
        chance = random.Random(7)
        places = {0, 1, 5, 8, 9, 10, 11, len(whole) - 1} | {chance.randrange(len(whole)) for _ in range(60)}
        last = 0
        for place in sorted(places):
            pathlib.Path("cut").write_bytes(whole[:place])
            report = self.replayed("cut")
            self.assertGreaterEqual(report["events"], last)
            last = report["events"]
            # The last bytes only say that nothing follows.
            self.assertEqual(report["whole"], place > len(whole) - 8 and report["whole"], place)
        self.assertGreater(last, 100)

    def reported(self, subject):
        """What the page about a run, or about a recording, shows."""
        page = self.tsd("report", subject, "-o", "-").stdout
        return json.loads(re.search(r'<script type="application/json" id="data">(.*?)</script>', page, re.DOTALL)[1])

    def test_a_report_tells_the_same_as_that_of_the_device(self):
        apps = self.make(8, "dev", "--demo")
        for name, *line in (("sync", "sync", "dev", "host", "--transfers", "1", "--inject",
                             f"transfer:{apps[3]}@3=none", "--end-phase", "success"), ("restore", "restore", "dev", "host")):
            with self.subTest(name):
                self.record(*line, code=SOME_FAILED, name=name)
                run, recorded = self.reported("dev"), self.reported(name)
                self.assertNotIn("home", recorded)
                # What the journal alone tells; the device knows the names, and more about the outcomes.
                # Threads that are not inside the plug-in may be in another order.
                stories = [{app["id"]: sorted([kind, text] for _, kind, text in app["events"]) for app in page["apps"]
                            if app["events"]} for page in (run, recorded)]
                self.assertGreater(len(stories[0]), 4)
                self.assertEqual(*stories)
                messages = [sorted(row[-1] for row in page["journal"]["rows"] if row[7] % 4 == 3 and "appsync|" in row[-1])
                            for page in (run, recorded)]
                self.assertEqual(*messages)
                times = [row[1] for row in recorded["journal"]["rows"]]
                self.assertEqual(times, sorted(times))
                self.assertGreater(len(set(times)), 5)
        facts = dict(recorded["facts"])
        self.assertEqual((facts["Recorded"], facts["Messages"]), ("to the end", str(len(messages[1]))))
        pathlib.Path("cut").write_bytes(pathlib.Path("sync").read_bytes()[:-400])
        self.assertEqual(self.reported("cut")["run"]["result"], "cut")
        self.assertIn("has no runs", self.tsd("report", "sync", "--run", "1", "-o", "-", code=USAGE).stderr)

    def test_what_is_no_recording(self):
        self.make(1)
        whole = bytearray(pathlib.Path(self.record("sync", "dev", "host")).read_bytes())
        for name, content, words in (("text", b"hello, world", "this is no recording"),
                                     ("later", bytes(whole[:8]) + b"\x63" + bytes(whole[9:]), "version 99"),
                                     ("damaged", bytes(whole[:400]) + b"\xff" * 64 + bytes(whole[464:]), "event")):
            pathlib.Path(name).write_bytes(content)
            self.assertRegex(self.tsd("replay", name, code=FAILED).stderr, says(name))
            self.assertIn(words, self.tsd("replay", name, code=FAILED).stderr)
            self.assertIn(words, self.tsd("recording", "show", name, code=FAILED).stderr)
            self.assertIn(words, self.tsd("report", name, "-o", "-", code=FAILED).stderr)

    def test_as_a_journal(self):
        """It says the same as the journal that the device wrote meanwhile."""
        apps = self.make(3, "dev")
        self.record("sync", "dev", "host", "--transfers", "1", "--calls", "calls")
        journals = [[json.loads(line) for line in lines.splitlines()]
                    for lines in (pathlib.Path("calls").read_text(encoding="utf-8"),
                                  self.tsd("recording", "journal", "recording").stdout)]
        # Each thread by itself: which of two is first may look otherwise from the other side.
        device, recorded = (sorted(((record["thread"], place, record["op"], record["category"], record["text"])
                                    for place, record in enumerate(journal) if record["service"] == "log" and
                                    record["category"] != "tsd.appsync"), key=lambda each: each[:2])
                            for journal in journals)
        device, recorded = ([(thread, *rest) for thread, _, *rest in each] for each in (device, recorded))
        self.assertGreater(len(recorded), 100)
        self.assertEqual(recorded, device)
        asked = [[(record["thread"], record["app"], record["result"], record["error"]) for record in journal
                  if record["op"] in ("setInstallOptions", "setPlaceholderPromise", "applicationIsInstalled")]
                 for journal in journals]
        self.assertEqual({app for _, app, _, _ in asked[1]}, set(apps))
        self.assertEqual(asked[1], asked[0])
        entered = [record for record in journals[1] if record["service"] == "AppsClient"]
        self.assertEqual(sum("end" in record for record in entered) * 2, len(entered))
        self.assertEqual([record["n"] for record in journals[1]], list(range(1, len(journals[1]) + 1)))

    def somebodys(self, apps):
        """Identifiers, names, accounts and whatever else a host says in texts, that no fixed text is."""
        texts = set(apps)
        for path in pathlib.Path("host").rglob("*.plist"):
            texts |= texts_in(plistlib.loads(path.read_bytes()))
        return {text.encode() for text in texts
                if len(text) > 3 and text not in ("install", "remove", "Application") and not text[0].isdigit()}

    def named(self, secrets, stream):
        """Those that stand in it, not as a part of a word."""
        return {secret for secret in secrets if secret in stream
                and re.search(rb"(?<![A-Za-z0-9_])" + re.escape(secret) + rb"(?![A-Za-z0-9_])", stream)}

    def test_what_is_redacted_names_nobody_and_replays(self):
        apps = self.make(6, "dev", "--demo")
        secrets = self.somebodys(apps)
        self.assertGreater(len(secrets), 12)
        seen = set()
        for number, line in enumerate((["restore", "dev", "host"], ["sync", "dev", "host", "--repeat", "2"],
                                       ["query", "dev", "accounts"], ["query", "dev", "vantor-ids"], ["backup", "dev"],
                                       ["clear", "dev"])):
            with self.subTest(line):
                name, redacted = f"recording-{number}", f"redacted-{number}"
                self.record(*line, code=SOME_FAILED if line[0] == "sync" else DONE, name=name)
                events = self.replayed(name)["events"]
                report = self.document("recording", "redact", name, redacted)
                self.assertEqual((report["result"], report["events"], report["whole"]), ("done", events, True))
                self.assertEqual(self.replayed(redacted)["events"], events)
                before, after = decompressed(name), decompressed(redacted)
                seen |= self.named(secrets, before)
                self.assertEqual(self.named(secrets, after), set())
                self.assertNotIn(b"\x89PNG", after)
        self.assertGreater(len(seen), 12)
        self.assertEqual(set(apps) - {secret.decode() for secret in seen}, set())

    def test_what_refuses_to_be_redacted(self):
        self.make(1)
        name = self.record("sync", "dev", "host")
        whole = pathlib.Path(name).read_bytes()
        pathlib.Path("other").write_text("mine")
        self.assertIn("other", self.tsd("recording", "redact", name, "other", code=FAILED).stderr)
        self.assertEqual(pathlib.Path("other").read_text(), "mine")
        self.assertIn("is missing", self.tsd("recording", "redact", name, code=USAGE).stderr)
        pathlib.Path("damaged").write_bytes(whole[:400] + b"\xff" * 64 + whole[464:])
        self.assertIn("damaged: event", self.tsd("recording", "redact", "damaged", "new", code=FAILED).stderr)
        # Another plug-in does not do what is recorded.
        library = pathlib.Path(tsd_folder.TSD).with_name("libApplicationSync.so").read_bytes()
        pathlib.Path("other.so").write_bytes(library.replace(b"getting installed assets", b"getting installed thingi"))
        refused = self.tsd("recording", "redact", name, "new", "--plugin", "other.so", code=FAILED)
        self.assertIn("answers differently", refused.stderr)
        self.assertEqual([path.name for path in pathlib.Path().iterdir() if path.name.startswith(("new", ".new"))], [])
        # A cut one is redacted up to there.
        pathlib.Path("cut").write_bytes(whole[:len(whole) // 2])
        self.assertFalse(self.document("recording", "redact", "cut", "redacted-cut")["whole"])
        self.assertEqual(self.replayed("redacted-cut")["events"], self.replayed("cut")["events"])

    def test_another_plug_in(self):
        """A build that says something else, that is told to go on, and one whose messages nobody compares."""
        self.make(3)
        name = self.record("sync", "dev", "host")
        library = pathlib.Path(tsd_folder.TSD).with_name("libApplicationSync.so").read_bytes()
        old, new = b"getting installed assets", b"getting installed thingies"[:24]
        self.assertIn(old, library)
        pathlib.Path("other.so").write_bytes(library.replace(old, new))
        page = self.tsd("replay", name, "--plugin", "other.so", code=DIFFERS).stdout
        self.assertRegex(page, r"in TSClient\.installedAssets: other arguments\n *expected .*" + old.decode() +
                         r".*\n *came .*" + new.decode())
        self.assertRegex(page, r"(?m)^ *thread +daemon: in TSClient.installedAssets")
        differences = self.document("replay", name, "--plugin", "other.so", "--go-on", code=DIFFERS)["differences"]
        self.assertEqual({each["kind"] for each in differences}, {"other arguments"})
        self.assertEqual(self.document("replay", name, "--plugin", "other.so", "--ignore", "messages")["differences"], [])
        # Another order of services' calls is not ignored with them.
        old, new = b"ApplicationsSync.plist-debug", b"ApplicationsSync.plist-other"
        pathlib.Path("other.so").write_bytes(library.replace(old, new))
        report = self.document("replay", name, "--plugin", "other.so", "--ignore", "messages", code=DIFFERS)
        self.assertIn("FileSystem.", report["differences"][0]["expected"])


if __name__ == "__main__":
    tsd_folder.main()
