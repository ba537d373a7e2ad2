"""What lies in a farm's folder.

    build/            tsd and libApplicationSync.so; plugin_tests where seeds are asked for
    recordings/ab/    the recordings, named by their digests
    jobs/1, jobs/2 …  the pieces of each job, one a line
    results/ab/       what became of each piece, in a file that appears whole
    logs/             what the jobs had to say
    farm/             these scripts, for the nodes
    plan.json         what was asked for; written last

Nothing but results and logs is written after the plan. A recording's piece is named by the digests of the recording and
of the build, so that whoever runs it, and how often, it has one result.
"""

import hashlib
import json
import os
import pathlib
import shutil

HERE = pathlib.Path(__file__).resolve().parent
STYLE = "report.css"
MOST_JOBS = 1000  # that Slurm takes as one array unless it is told otherwise
SEEDS_A_PIECE = 200


class Refusal(Exception):
    """What a person is told instead of a run."""


def digest_of(path):
    with open(path, "rb") as file:
        return hashlib.file_digest(file, "sha256").hexdigest()


def write_whole(path, content):
    """A file that is there with all its content, or not at all. Others may write the same one meanwhile."""
    path.parent.mkdir(parents=True, exist_ok=True)
    temporary = path.with_name(f".{path.name}.{os.uname().nodename}.{os.getpid()}")
    temporary.write_text(content)
    temporary.rename(path)


class Plan:
    """One of a farm's folders. Paths in it are absolute, as nodes have working directories of their own."""

    def __init__(self, folder):
        self.folder = pathlib.Path(folder).resolve()
        try:
            self.facts = json.loads((self.folder / "plan.json").read_text())
        except FileNotFoundError:
            raise Refusal(f"{folder}: no farm was started here") from None

    def program(self, name):
        return self.folder / "build" / name

    def recording(self, piece):
        digest = piece["recording"]
        return self.folder / "recordings" / digest[:2] / f"{digest}.recording"

    def jobs(self):
        return range(1, self.facts["jobs"] + 1)

    def pieces(self, job):
        with open(self.folder / "jobs" / str(job)) as lines:
            return [json.loads(line) for line in lines]

    def result_file(self, piece):
        name = f"{piece['name']}-{self.facts['build'][:16]}.json"
        return self.folder / "results" / hashlib.sha256(name.encode()).hexdigest()[:2] / name

    def result(self, piece):
        """Absent as well when a node died before its disk had the file's content."""
        try:
            return json.loads(self.result_file(piece).read_text())
        except (FileNotFoundError, ValueError):
            return None


def seeds_of(text):
    first, _, last = text.partition("-")
    if not (first.isdigit() and last.isdigit() and 0 < int(first) <= int(last)):
        raise Refusal(f"--seeds {text}: give the first and the last one, as in 1-10000")
    return int(first), int(last)


def copy_build(source, folder, names):
    """The build's digest."""
    digest = hashlib.sha256()
    (folder / "build").mkdir(parents=True, exist_ok=True)
    for name in names:
        shutil.copy2(source / name, folder / "build" / name)
        digest.update(f"{name} {digest_of(folder / 'build' / name)}\n".encode())
    return digest.hexdigest()


def keep_recording(path, folder):
    """The digest of a recording, which is linked into the folder where that can be done, and copied elsewhere."""
    digest = digest_of(path)
    kept = folder / "recordings" / digest[:2] / f"{digest}.recording"
    kept.parent.mkdir(parents=True, exist_ok=True)
    if not kept.exists():
        try:
            os.link(path, kept)
        except OSError:
            temporary = kept.with_suffix(".coming")
            shutil.copyfile(path, temporary)
            temporary.rename(kept)
    return digest


def recording_pieces(source, folder):
    """A piece for each content, whatever the number of files that have it."""
    if not source.is_dir():
        raise Refusal(f"{source}: no such folder")
    pieces = {}
    for path in sorted(source.rglob("*.recording")):
        digest = keep_recording(path.resolve(), folder)
        pieces.setdefault(digest, {"name": digest, "recording": digest, "file": str(path.relative_to(source))})
    if not pieces:
        raise Refusal(f"{source}: there is no *.recording in it")
    return list(pieces.values())


def seed_pieces(first, last):
    for begin in range(first, last + 1, SEEDS_A_PIECE):
        end = min(begin + SEEDS_A_PIECE - 1, last)
        yield {"name": f"seeds-{begin}-{end}", "first": begin, "last": end}


def lay(asked):
    """A folder with all that its jobs need; the plan."""
    folder = pathlib.Path(asked.folder).resolve()
    if not asked.recordings and not asked.seeds:
        raise Refusal("nothing to run: give --recordings, --seeds or both")
    seeds = seeds_of(asked.seeds) if asked.seeds else None
    names = ["libApplicationSync.so", *(["tsd"] if asked.recordings else []), *(["plugin_tests"] if seeds else [])]
    source = pathlib.Path(asked.build)
    for name in names:
        if not (source / name).is_file():
            raise Refusal(f"{source / name}: not there; '--build' names the folder with {', '.join(names)}")
    # What may be refused comes before anything is written.
    pieces = recording_pieces(pathlib.Path(asked.recordings), folder) if asked.recordings else []
    build = copy_build(source, folder, names)
    pieces += seed_pieces(*seeds) if seeds else []
    count = min(-(-len(pieces) // asked.per_job), MOST_JOBS)
    shutil.rmtree(folder / "jobs", ignore_errors=True)
    for job in range(1, count + 1):
        # Every so manieth piece, so that neighbours that take long are not one job's alone.
        write_whole(folder / "jobs" / str(job), "".join(json.dumps(each) + "\n" for each in pieces[job - 1::count]))
    (folder / "logs").mkdir(exist_ok=True)
    shutil.copytree(HERE, folder / "farm", dirs_exist_ok=True, ignore=shutil.ignore_patterns("__pycache__"))
    if not (HERE / STYLE).exists():
        shutil.copyfile(HERE.parents[1] / "tsd/report/page" / STYLE, folder / "farm" / STYLE)
    facts = {"build": build, "jobs": count, "pieces": len(pieces), "recordings": asked.recordings and str(asked.recordings),
             "seeds": asked.seeds, "ignored": asked.ignore, "limit": asked.limit}
    write_whole(folder / "plan.json", json.dumps(facts, indent=2) + "\n")
    return Plan(folder)
