"""The program in a folder of its own: what the tests of `tsd` stand on."""

import json
import os
import pathlib
import re
import shutil
import subprocess
import sys
import tempfile
import unittest

TSD = None
DONE, FAILED, USAGE, SOME_FAILED, CANCELLED, DEADLINE, BUSY, DIFFERS = range(8)

ONE_LINE = r"\Atsd: [^\n]*{}[^\n]*\n\Z"


def says(text):
    return ONE_LINE.format(re.escape(text))


def tree_of(folder):
    """Every path below a folder: the file's content, nothing for a folder."""
    return {str(path.relative_to(folder)): path.read_bytes() if path.is_file() else None
            for path in sorted(pathlib.Path(folder).rglob("*"))}


class Folder(unittest.TestCase):
    """Each test in an empty folder of its own."""

    def setUp(self):
        folder = tempfile.mkdtemp()
        self.addCleanup(shutil.rmtree, folder)
        self.addCleanup(os.chdir, os.getcwd())
        os.chdir(folder)

    def tsd(self, *arguments, code=DONE):
        run = subprocess.run([TSD, *arguments], capture_output=True, text=True, timeout=120, stdin=subprocess.DEVNULL)
        codes = code if isinstance(code, tuple) else (code,)
        self.assertIn(run.returncode, codes, f"{' '.join(arguments)}\n{run.stdout}{run.stderr}")
        return run

    def document(self, *arguments, code=DONE):
        return json.loads(self.tsd(*arguments, "--json", code=code).stdout)

    def sync(self, *arguments, code=DONE):
        return self.document("sync", *arguments, "--progress", "none", code=code)

    def make(self, apps=3, device="dev", *more):
        self.tsd("init", device)
        return [app["id"] for app in self.document("sample", "host", "--apps", str(apps), *more)["apps"]]


def main():
    """Runs the tests of the script with the program that its first argument names."""
    global TSD
    TSD = str(pathlib.Path(sys.argv.pop(1)).resolve())
    unittest.main()
