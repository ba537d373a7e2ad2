#!/usr/bin/env python3
"""What an integrator gets: the installed tree, moved elsewhere, and programs built against it and nothing else.

usage: installed_tree_tests.py BUILD [TREE]

Installs BUILD below BUILD/installed, unless a TREE is given that came about in another way. What is compiled there
stays, so that the next run has less to do.
"""

import os
import pathlib
import re
import shutil
import subprocess
import sys

ROOT = pathlib.Path(__file__).resolve().parent.parent


def run(*command, code=0, **options):
    done = subprocess.run([str(word) for word in command], capture_output=True, text=True, **options)
    if done.returncode != code:
        sys.exit(f"{' '.join(map(str, command))}\nended with {done.returncode}:\n{done.stdout[-4000:]}{done.stderr[-4000:]}")
    return done.stdout


def cache_of(build):
    return dict(re.findall(r"^(\w+):\w+=(.*)$", (build / "CMakeCache.txt").read_text(), re.MULTILINE))


def install(build, prefix):
    """Under one prefix first, then moved: nothing may remember where it was installed."""
    elsewhere = prefix.with_name("elsewhere")
    shutil.rmtree(elsewhere, ignore_errors=True)
    shutil.rmtree(prefix, ignore_errors=True)
    run("cmake", "--install", build, "--prefix", elsewhere)
    elsewhere.rename(prefix)
    for path in prefix.rglob("*"):
        if path.suffix in (".cmake", ".pc", ".h") and re.search(re.escape(str(ROOT)), path.read_text()):
            sys.exit(f"{path} has a path of the machine it was built on")


def check_headers(prefix):
    """The interfaces and value types are there, and all that they include; nothing of the plug-in's own."""
    include = prefix / "include/applicationsync"
    headers = {str(path.relative_to(include)) for path in include.rglob("*.h")}
    included = {name for path in include.rglob("*.h") for name in re.findall(r'#include "(.+)"', path.read_text())}
    for problem in [f"{name} is included but not installed" for name in included - headers]:
        sys.exit(problem)
    if "platform/Plugin.h" not in headers or any(not re.match("platform/|record/|plist/PropertyList.h", name) for name in headers):
        sys.exit(f"not the headers that a host needs: {sorted(headers)}")


def check_daemon(program):
    out = run(program, code=3)
    expected = ['asked for com.example.maps, shown as "Maps"', 'asked for com.example.notes, shown as "Notes"',
                "com.example.maps is installed", "com.example.notes is not installed"]
    if out.splitlines() != expected:
        sys.exit(f"{program} said:\n{out}")


def main():
    build = pathlib.Path(sys.argv[1]).resolve()
    settings = cache_of(build)
    work = build / "installed"
    work.mkdir(exist_ok=True)
    prefix = pathlib.Path(sys.argv[2]).resolve() if len(sys.argv) > 2 else work / "tree"
    if len(sys.argv) == 2:
        install(build, prefix)
    check_headers(prefix)
    library = next(prefix.glob("lib*/**/libApplicationSync.so"))
    run(sys.executable, ROOT / "tests/plugin_library.py", library)

    # With CMake: the example, a project of its own, from the sources that are installed with the rest.
    example = next(prefix.glob("share/applicationsync/examples/minimal-daemon"))
    launcher = settings.get("CCACHE", "")
    run("cmake", "-G", "Ninja", "-S", example, "-B", work / "daemon", f"-DCMAKE_PREFIX_PATH={prefix}",
        f"-DCMAKE_CXX_COMPILER={settings['CMAKE_CXX_COMPILER']}", "-DCMAKE_CXX_FLAGS=-Wall -Wextra -Werror",
        *([f"-DCMAKE_CXX_COMPILER_LAUNCHER={launcher}"] if launcher.startswith("/") else []))
    run("cmake", "--build", work / "daemon")
    check_daemon(work / "daemon/minimal-daemon")
    run(work / "daemon/minimal-daemon-contract", "--gtest_brief=1")

    # With pkg-config.
    environment = dict(os.environ, PKG_CONFIG_PATH=str(next(prefix.glob("lib*/**/pkgconfig"))))
    flags = run("pkg-config", "--cflags", "--libs", "applicationsync-record", env=environment).split()
    plugin = run("pkg-config", "--variable=plugin", "applicationsync", env=environment).strip()
    sources = [path for path in example.glob("*.cpp") if path.name != "contract.cpp"]
    run(settings["CMAKE_CXX_COMPILER"], "-std=c++20", f'-DPLUGIN="{plugin}"', "-o", work / "with-pkg-config", *sources,
        *flags, "-ldl")
    check_daemon(work / "with-pkg-config")

    # A daemon that records itself, replayed without its device.
    run(work / "daemon/minimal-daemon", library, work / "daemon.recording", code=3)
    replayed = run(prefix / "bin/tsd", "replay", work / "daemon.recording")
    if not replayed.endswith("events replayed, as recorded.\n"):
        sys.exit(f"the daemon's recording: {replayed}")

    # The program finds the plug-in beside which it is installed, and has its pages and completions.
    run(prefix / "bin/tsd", "sample", "host", cwd=fresh(work / "run"))
    run(prefix / "bin/tsd", "init", "phone", cwd=work / "run")
    run(prefix / "bin/tsd", "sync", "phone", "host", "--progress", "none", cwd=work / "run")
    for name in ["man/man1/tsd-sync.1*", "bash-completion/completions/tsd", "zsh/vendor-completions/_tsd",
                 "fish/vendor_completions.d/tsd.fish"]:
        if not any(path.stat().st_size for path in prefix.glob(f"share/{name}")):
            sys.exit(f"share/{name} is not there, or empty")
    print(f"{prefix}: a host builds and runs, and so does the program")


def fresh(folder):
    shutil.rmtree(folder, ignore_errors=True)
    folder.mkdir()
    return folder


if __name__ == "__main__":
    main()
