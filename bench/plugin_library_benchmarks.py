#!/usr/bin/env python3
"""The size of the plug-in library, stripped: `plugin_library_benchmarks.py [--short] BIN`."""

import json
import pathlib
import subprocess
import sys
import tempfile

with tempfile.TemporaryDirectory() as folder:
    stripped = pathlib.Path(folder, "library.so")
    subprocess.run(["strip", "-o", stripped, pathlib.Path(sys.argv[-1], "libApplicationSync.so")], check=True)
    size = stripped.stat().st_size
print(json.dumps({"work": "the plug-in library, stripped", "figure": f"{size / 1024:.0f} KiB", "goal": "under 1024 KiB",
                  "met": None if "--short" in sys.argv else size < 1 << 20}))
