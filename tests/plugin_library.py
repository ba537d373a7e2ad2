#!/usr/bin/env python3
"""What the plug-in's shared object needs and shows: nothing beyond the C++ standard library, and its entry point alone.

usage: plugin_library.py LIBRARY [--sanitized]

A sanitized build brings its run-time library and symbols of it; then only the other libraries are looked at.
"""

import re
import subprocess
import sys

RUNTIME = re.compile(r"lib(stdc\+\+|m|gcc_s|c|pthread)\.so\.\d+|ld-linux[-\w]*\.so\.\d+")
SANITIZERS = re.compile(r"lib(a|t|ub)san\.so\.\d+")
ENTRY_POINT = "TSPluginTable"


def readelf(*arguments):
    return subprocess.run(["readelf", "-W", *arguments], check=True, capture_output=True, text=True).stdout


def main():
    library, sanitized = sys.argv[1], "--sanitized" in sys.argv[2:]
    needed = re.findall(r"\(NEEDED\).*\[(.+)\]", readelf("-d", library))
    problems = [f"needs {name}" for name in needed
                if not RUNTIME.fullmatch(name) and not (sanitized and SANITIZERS.fullmatch(name))]
    # Columns: number, value, size, type, binding, visibility, section, name.
    rows = [line.split() for line in readelf("--dyn-syms", library).splitlines() if re.match(r"\s*\d+:", line)]
    exported = [row[7] for row in rows if len(row) > 7 and row[6] != "UND" and row[4] in ("GLOBAL", "WEAK", "UNIQUE")]
    if ENTRY_POINT not in exported:
        problems.append(f"does not export {ENTRY_POINT}")
    if not sanitized:
        problems += [f"exports {name}" for name in exported if name != ENTRY_POINT]
    print("\n".join(f"{library} {problem}" for problem in problems) or f"{library}: needs {', '.join(needed)}")
    return bool(problems)


if __name__ == "__main__":
    sys.exit(main())
