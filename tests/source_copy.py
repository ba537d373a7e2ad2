"""A copy of the sources, in which faults can be planted, and its build."""

import pathlib
import shutil
import subprocess
import sys

ROOT = pathlib.Path(__file__).resolve().parent.parent


def run(*command, **options):
    return subprocess.run([str(word) for word in command], capture_output=True, text=True, check=False, **options)


class Copy:
    """The sources as they are in the working tree, and a build of them by a preset and settings of CMake."""

    def __init__(self, folder, preset, *settings):
        self.sources = folder / "sources"
        # Where the compiler cache finds what the ordinary build has compiled.
        self.build = self.sources / "build" / preset
        listed = run("git", "ls-files", "-z", "--cached", "--others", "--exclude-standard", cwd=ROOT).stdout
        for name in filter(None, listed.split("\0")):
            target = self.sources / name
            original = ROOT / name
            # One that did not change keeps its time, so that it is not compiled again.
            if original.exists() and not (target.exists() and target.read_bytes() == original.read_bytes()):
                target.parent.mkdir(parents=True, exist_ok=True)
                shutil.copy(original, target)
        configured = run("cmake", "--preset", preset, *settings, cwd=self.sources)
        if configured.returncode != 0:
            sys.exit(configured.stdout + configured.stderr)

    def make(self, *targets):
        """What went wrong; empty: nothing."""
        built = run("cmake", "--build", self.build, "--target", *targets)
        return "" if built.returncode == 0 else built.stdout[-2000:] or "does not build"
