#!/usr/bin/env python3
"""The farm of examples/farm, by GNU parallel and by a Slurm of one node, which is started here: what it finds is what one
replay after the other finds, whatever is killed meanwhile. Says so where an engine is not installed, and does not fail.

usage: farm_tests.py TSD [unittest arguments]

TSD has the plug-in and plugin_tests beside it. With the variable APPSYNC_FARM_SEEDS so many seeds are played.
"""

import contextlib
import hashlib
import json
import os
import pathlib
import re
import shutil
import socket
import subprocess
import tempfile
import threading
import time
import unittest

import tsd_folder
from tsd_folder import DIFFERS, DONE, FAILED, Folder, says, tree_of

ROOT = pathlib.Path(__file__).resolve().parent.parent
FARM = ROOT / "examples/farm/farm"
PARTIAL = 3
SEEDS = int(os.environ.get("APPSYNC_FARM_SEEDS", 400))
REPLAYS, JOBS = 200, 4
GATED = (90, 91)  # neighbours, so that they are pieces of different jobs
SLURM = ("slurmctld", "slurmd", "munged", "munge", "sbatch", "scontrol", "scancel", "squeue", "sinfo")
# Where daemons are that only root usually starts.
PATH = os.environ["PATH"] + ":/usr/sbin:/sbin"


def digest_of(path):
    return hashlib.sha256(path.read_bytes()).hexdigest()


def missing(*programs):
    return [program for program in programs if not shutil.which(program, path=PATH)]


def until(condition, what, seconds=120):
    """Asks again and again, as nobody says when it is so."""
    end, pause = time.monotonic() + seconds, threading.Event()
    while not condition():
        if time.monotonic() > end:
            raise AssertionError(f"waited in vain for {what}")
        pause.wait(0.05)


def answer(*command):
    return subprocess.run(command, capture_output=True, text=True, timeout=60)


def free_ports(count):
    with contextlib.ExitStack() as stack:
        sockets = [stack.enter_context(socket.socket()) for _ in range(count)]
        for each in sockets:
            each.bind(("127.0.0.1", 0))
        return [each.getsockname()[1] for each in sockets]


class Slurm:
    """Controller, node daemon and authentication, on the loopback address; all they have is in a folder of their own."""

    def __init__(self, folder):
        self.folder, self._daemons = pathlib.Path(folder), []
        for name in ("state", "spool"):
            (self.folder / name).mkdir(parents=True)
        key = self.folder / "key"
        key.write_bytes(os.urandom(64))
        key.chmod(0o400)
        (self.folder / "slurm.conf").write_text(self._configuration())
        os.environ["SLURM_CONF"] = str(self.folder / "slurm.conf")
        try:
            self._start("munged", "--foreground", "--force", f"--key-file={key}",
                        *(f"--{name}={self.folder}/munge{name}" for name in ("socket", "pid-file", "log-file", "seed-file")))
            until(lambda: answer("munge", "-n", "-S", f"{self.folder}/mungesocket").returncode == 0, "munged", 30)
            self._start("slurmctld", "-D")
            until(lambda: answer("scontrol", "ping").returncode == 0, "slurmctld", 30)
            self._start("slurmd", "-D", "-N", "node")
            until(lambda: "idle" in answer("sinfo", "-h", "-o", "%T").stdout, "slurmd", 30)
        except BaseException:
            self.end()
            raise

    def _configuration(self):
        host, user, (controller, node) = os.uname().nodename, os.getuid(), free_ports(2)
        lines = {"ClusterName": "farm", "SlurmctldHost": f"{host}(127.0.0.1)", "SlurmctldPort": controller,
                 "SlurmdPort": node, "SlurmUser": user, "SlurmdUser": user, "AuthType": "auth/munge",
                 "CredType": "cred/munge", "AuthInfo": f"socket={self.folder}/mungesocket",
                 "StateSaveLocation": self.folder / "state", "SlurmdSpoolDir": self.folder / "spool",
                 "SlurmctldPidFile": self.folder / "slurmctld.pid", "SlurmdPidFile": self.folder / "slurmd.pid",
                 "ProctrackType": "proctrack/linuxproc", "TaskPlugin": "task/none",
                 "JobAcctGatherType": "jobacct_gather/none", "SelectType": "select/cons_tres",
                 "SelectTypeParameters": "CR_CPU",
                 "NodeName": f"node NodeHostname={host} NodeAddr=127.0.0.1 CPUs={min(2, os.cpu_count())}",
                 "PartitionName": "farm Nodes=node Default=YES"}
        return "".join(f"{name}={value}\n" for name, value in lines.items())

    def _start(self, name, *arguments):
        with open(self.folder / f"{name}.output", "wb") as output:
            self._daemons.append(subprocess.Popen([shutil.which(name, path=PATH), *arguments], stdin=subprocess.DEVNULL,
                                                  stdout=output, stderr=subprocess.STDOUT))

    def wait_for_jobs(self):
        until(lambda: answer("squeue", "-h").stdout == "", "the end of the queue", 1500)

    def end(self):
        if len(self._daemons) == 3:
            answer("scancel", "--user", str(os.getuid()))
            with contextlib.suppress(AssertionError):
                until(lambda: answer("squeue", "-h").stdout == "", "the end of the queue", 60)
        for daemon in reversed(self._daemons):
            daemon.terminate()
            try:
                daemon.wait(30)
            except subprocess.TimeoutExpired:
                daemon.kill()
                daemon.wait()


class Farm(Folder):
    """A part of the corpus, for a plug-in that writes another file than the recorded one."""

    @classmethod
    def setUpClass(cls):
        cls.common = pathlib.Path(tempfile.mkdtemp())
        cls.addClassCleanup(shutil.rmtree, cls.common)
        cls.recordings, cls.build = cls.common / "recordings", cls.common / "build"
        cls.recordings.mkdir()
        cls.build.mkdir()
        corpus = {digest_of(path): path for path in (ROOT / "tests/recordings").glob("*.recording")}
        for number, digest in enumerate(sorted(corpus)[:REPLAYS]):
            whole = corpus[digest].read_bytes()
            # Some are of daemons that were killed.
            content = whole[:len(whole) * 2 // 3] if number % 4 == 0 else whole
            (cls.recordings / corpus[digest].name).write_bytes(content)
        binaries = pathlib.Path(tsd_folder.TSD).parent
        library = (binaries / "libApplicationSync.so").read_bytes()
        old, new = b"ApplicationsSync.plist-debug", b"ApplicationsSync.plist-other"
        (cls.build / "libApplicationSync.so").write_bytes(library.replace(old, new))
        (cls.build / "plugin_tests").symlink_to(binaries / "plugin_tests")
        cls.program(cls.build / "tsd", f'exec "{tsd_folder.TSD}" "$@" --plugin "$(dirname "$0")/libApplicationSync.so"')
        cls.serial = {digest_of(path): cls.replayed(path) for path in sorted(cls.recordings.iterdir())}
        differing = next(path for path in cls.recordings.iterdir() if cls.serial[digest_of(path)]["result"] == "differs")
        # Once more by a name that sorts first, and is a line of a page.
        shutil.copyfile(differing, cls.recordings / "!<img src=x>.recording")

    @staticmethod
    def program(path, script):
        path.write_text(f"#!/bin/sh\n{script}\n")
        path.chmod(0o755)

    @classmethod
    def replayed(cls, path):
        run = subprocess.run([cls.build / "tsd", "replay", path, "--json"], capture_output=True, text=True)
        document = json.loads(run.stdout)
        return {**{key: document[key] for key in ("result", "events", "whole")},
                "difference": next(iter(document["differences"]), None)}

    def farm(self, *arguments, code=DONE):
        run = subprocess.run(["python3", "-B", FARM, *map(str, arguments)], capture_output=True, text=True, timeout=1700)
        self.assertEqual(run.returncode, code, run.stdout + run.stderr)
        return run

    def gathered(self, code, *more):
        return json.loads(self.farm("gather", "out", "--json", *more, code=code).stdout)

    def asked(self):
        per_job = -(-(REPLAYS + -(-SEEDS // 200)) // JOBS)
        return ["--recordings", self.recordings, "--seeds", f"1-{SEEDS}", "--per-job", per_job, "--build", self.build]

    def pieces(self, job):
        return [json.loads(line) for line in pathlib.Path(f"out/jobs/{job}").read_text().splitlines()]

    def check_all(self):
        """Every result is what one replay after the other brings, and is counted."""
        found = {}
        for path in pathlib.Path("out/results").rglob("*.json"):
            found[path.name.rpartition("-")[0]] = {key: value for key, value in json.loads(path.read_text()).items()
                                                   if key != "run"}
        self.assertEqual({name: result for name, result in found.items() if not name.startswith("seeds-")}, self.serial)
        self.assertEqual(len(self.serial), REPLAYS)
        document = self.gathered(DIFFERS)
        differing = sum(result["result"] == "differs" for result in self.serial.values())
        self.assertGreater(differing, 20)
        self.assertEqual((document["partial"], document["replays"], document["seeds"]), (False, REPLAYS, SEEDS))
        self.assertEqual(document["counts"], {"differs": differing, "done": document["pieces"] - differing})
        group, = document["groups"]
        self.assertEqual((group["count"], group["what"]["kind"]), (differing, "other arguments"))
        self.assertRegex(group["what"]["came"], r"^FileSystem\..*plist-other")

    def check_page(self):
        page = pathlib.Path("out/report.html").read_text()
        self.assertIn("!&lt;img src=x&gt;.recording", page)
        self.assertNotIn("<img", page)
        self.assertIn(f"{REPLAYS} replayed of", page)

    @unittest.skipIf(missing("parallel"), "there is no GNU parallel here ('.ci/packages farm' installs it)")
    def test_by_parallel(self):
        pathlib.Path("hosts").write_text("2/:\n")
        self.farm("start", *self.asked(), "--engine", "parallel", "out", "--", "--sshloginfile", "hosts")
        self.check_all()
        self.check_page()
        self.check_idempotence()
        self.check_fetching()
        again = self.farm("start", "--seeds", "1-2", "--engine", "parallel", "out", code=FAILED)
        self.assertRegex(again.stderr, "a farm was started here already")

    def check_idempotence(self):
        before = tree_of("out/results")
        self.farm("job", "out", 1)
        self.assertEqual(tree_of("out/results"), before)
        # A node that dies may leave a name without a content, and a recording that is another one has no result.
        name = self.pieces(1)[0]["name"]
        path, = pathlib.Path("out/results").rglob(f"{name}-*.json")
        path.write_bytes(b"")
        self.assertEqual(self.gathered(DIFFERS)["missing"], {"1": 1})
        recording = pathlib.Path(f"out/recordings/{name[:2]}/{name}.recording")
        content = recording.read_bytes()
        recording.unlink()
        recording.write_bytes(content[:-1])
        self.assertIn("is not what its name says", self.farm("job", "out", 1, code=PARTIAL).stdout)
        recording.write_bytes(content)
        self.farm("job", "out", 1)
        self.check_all()

    def check_fetching(self):
        """The command of the page brings the difference to another folder."""
        command = self.gathered(DIFFERS, "--host", "farm.example")["groups"][0]["fetch"]
        pathlib.Path("desk/bin").mkdir(parents=True)
        self.program(pathlib.Path("desk/bin/scp"),
                     'for each; do case $each in farm.example:*) cp "${each#*:}" . ;; esac; done')
        pathlib.Path("desk/bin/tsd").symlink_to(tsd_folder.TSD)
        environment = {**os.environ, "PATH": f"{os.getcwd()}/desk/bin:{PATH}"}
        run = subprocess.run(["bash", "-c", command], cwd="desk", env=environment, capture_output=True, text=True)
        self.assertEqual(run.returncode, DIFFERS, run.stderr)
        self.assertIn("plist-other", run.stdout)

    @unittest.skipIf(missing("parallel"), "there is no GNU parallel here ('.ci/packages farm' installs it)")
    def test_seeds_that_do_not_hold(self):
        """One that the tests name, and two that end the process; the others have been looked at all the same."""
        build = pathlib.Path("build")
        build.mkdir()
        (build / "libApplicationSync.so").touch()
        self.program(build / "plugin_tests", """
            for seed in $(seq $APPSYNC_FIRST_SEED $((APPSYNC_FIRST_SEED + APPSYNC_SEEDS - 1))); do
              case $seed in
                13) echo "a/Model.cpp:7: Failure"; echo "APPSYNC_SEED=13 shows it again, call by call" >&2; exit 1 ;;
                77 | 200) kill -SEGV $$ ;;
                *) echo $seed >>"$(dirname "$0")/held" ;;
              esac
            done""")
        self.farm("start", "--seeds", "1-250", "--build", build, "--engine", "parallel", "out")
        groups = self.gathered(DIFFERS)["groups"]
        self.assertEqual([(group["what"]["at"], group["examples"]) for group in groups],
                         [("crashed", ["seed 77", "seed 200"]), ("Model.cpp:7", ["seed 13"])])
        held = set(pathlib.Path("out/build/held").read_text().split())
        self.assertEqual(held, {str(seed) for seed in range(1, 251)} - {"13", "77", "200"})

    def test_what_cannot_be_started(self):
        pathlib.Path("empty").mkdir()
        for words, problem in ((["--seeds", "5-1"], "give the first and the last one"), ([], "nothing to run"),
                               (["--recordings", "empty", "--build", self.build], "there is no *.recording in it"),
                               (["--seeds", "1-5", "--build", "empty"], "not there")):
            with self.subTest(words):
                run = self.farm("start", *words, "--engine", "parallel", "out", code=FAILED)
                self.assertRegex(run.stderr, says(problem).replace("tsd", "farm"))
        self.farm("gather", "out", code=FAILED)

    @unittest.skipIf(missing(*SLURM), f"there is no {', '.join(missing(*SLURM))} here ('.ci/packages farm' installs Slurm)")
    def test_by_slurm(self):
        """A job is killed in the middle, another one goes back to the queue."""
        # Where a path may not be long, as a socket's.
        folder = tempfile.mkdtemp(dir="/tmp")
        self.addCleanup(shutil.rmtree, folder)
        gates = [self.gate(sorted(self.recordings.iterdir())[number]) for number in GATED]
        slurm = Slurm(f"{folder}/slurm")
        self.addCleanup(slurm.end)
        queued = self.farm("start", *self.asked(), "--build", "gated", "--engine", "slurm", "out").stdout
        array = re.search(r"as the array (\d+)", queued)[1]
        killed, requeued = (self.wait_in(gate) for gate in gates)
        answer("scancel", "--signal=KILL", "--full", f"{array}_{killed}")
        answer("scontrol", "requeue", f"{array}_{requeued}")
        # It would be left alone for two minutes.
        until(lambda: answer("squeue", "-h", "-j", f"{array}_{requeued}", "-o", "%T").stdout == "PENDING\n", "the queue")
        answer("scontrol", "update", f"JobId={array}_{requeued}", "StartTime=now")
        slurm.wait_for_jobs()
        names = [piece["name"] for piece in self.pieces(killed)]
        missed = self.gathered(DIFFERS)["missing"]
        self.assertEqual(set(missed), {str(killed)})
        # A job that is killed after its replay may have come to the next one.
        self.assertIn(missed[str(killed)], range(1, len(names) - names.index(gates[0].name) + 1))
        self.assertEqual(list(pathlib.Path("out/results").rglob(f"{gates[0].name}-*.json")), [])
        self.assertRegex(self.farm("gather", "out", code=DIFFERS).stdout, r"\nPartial: \d+ of \d+ pieces have a result")
        self.assertIn(f"1 of {JOBS} jobs to do", self.farm("start", "--engine", "slurm", "out").stdout)
        slurm.wait_for_jobs()
        self.check_all()

    def gate(self, recording):
        """Where the first replay of the recording waits for ever."""
        gate = pathlib.Path.cwd() / "gates" / digest_of(recording)
        gate.parent.mkdir(exist_ok=True)
        os.mkfifo(f"{gate}.pipe")
        if not pathlib.Path("gated").exists():
            shutil.copytree(self.build, "gated", symlinks=True)
            whole = (self.build / "tsd").read_text().partition("\n")[2]
            self.program(pathlib.Path("gated/tsd"), f"""
                gate={gate.parent}/$(basename "$2" .recording)
                if [ -p "$gate.pipe" ] && mkdir "$gate" 2>/dev/null; then read line <"$gate.pipe"; fi\n{whole}""")
        return gate

    def wait_in(self, gate):
        """The number of the job that waits there."""
        until(gate.exists, "the job to come to its recording")
        return next(job for job in range(1, JOBS + 1) if gate.name in (piece["name"] for piece in self.pieces(job)))


if __name__ == "__main__":
    for program in missing("parallel", *SLURM):
        print(f"there is no {program} here: a part of the farm is not tested ('.ci/packages farm' installs it)")
    tsd_folder.main()
