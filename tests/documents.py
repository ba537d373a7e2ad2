#!/usr/bin/env python3
"""The documents keep their word: links lead somewhere, C++ is that of the examples, and every shell block runs.

usage: documents.py [BIN]

BIN is the folder of the built program. With it the blocks marked `sh` are run, those of a document as one script that
has to end with 0, in an empty folder where `build/release/bin` is BIN. Blocks marked otherwise are only shown; `make`
has the targets that those marked `console` name.
"""

import os
import pathlib
import re
import subprocess
import sys
import tempfile

ROOT = pathlib.Path(__file__).resolve().parent.parent
LINK = re.compile(r"\[[^\]]*\]\(([^)\s]+)\)")
FENCE = re.compile(r"^```(\w*)\n(.*?)^```$", re.MULTILINE | re.DOTALL)


def anchors_of(text):
    """The anchors that a reader's viewer makes of the headings."""
    headings = re.findall(r"^#+ +(.+?) *$", FENCE.sub("", text), re.MULTILINE)
    return {re.sub(r"[^\w\- ]", "", heading.lower()).replace(" ", "-") for heading in headings}


def broken_links(document, text):
    for target in LINK.findall(FENCE.sub("", text)):
        if re.match(r"\w+:", target):
            continue
        path, _, anchor = target.partition("#")
        linked = (document.parent / path) if path else document
        if not linked.exists():
            yield f"{document.relative_to(ROOT)}: link to {target}, which is not there"
        elif anchor and anchor not in anchors_of(linked.read_text(encoding="utf-8")):
            yield f"{document.relative_to(ROOT)}: link to {target}, where there is no such heading"


def strange_examples(document, text):
    """Blocks of C++ that are not in a program of examples/, where they are compiled and run."""
    programs = [path.read_text(encoding="utf-8") for path in (ROOT / "examples").rglob("*.cpp")]
    for language, block in FENCE.findall(text):
        if language == "cpp" and not any(block in program for program in programs):
            yield f"{document.relative_to(ROOT)}: not in any program of examples/:\n{block}"


def unknown_targets(document, text):
    """`make` commands of the blocks that are only shown, with a target that the Makefile does not have."""
    targets = set(re.findall(r"^([\w-]+):", (ROOT / "Makefile").read_text(encoding="utf-8"), re.MULTILINE))
    for language, block in FENCE.findall(text):
        for command in re.findall(r"^make ([^#;\n]*)", block, re.MULTILINE) if language == "console" else []:
            for word in command.split():
                if "=" not in word and word not in targets:
                    yield f"{document.relative_to(ROOT)}: make {word}: there is no such target"


def unknown_packages(document, text):
    """The library's Debian package is called after the version of the interface."""
    header = (ROOT / "platform/Plugin.h").read_text(encoding="utf-8")
    version = re.search(r"pluginInterfaceVersion = (\d+)", header)[1]
    for name in set(re.findall(r"libapplicationsync\d+", text)) - {f"libapplicationsync{version}"}:
        yield f"{document.relative_to(ROOT)}: {name}: there is no such package"


def failing_commands(document, text, program_folder):
    script = "".join(block for language, block in FENCE.findall(text) if language == "sh")
    if not script:
        return
    with tempfile.TemporaryDirectory() as folder:
        binaries = pathlib.Path(folder, "build/release/bin")
        binaries.parent.mkdir(parents=True)
        binaries.symlink_to(program_folder)
        run = subprocess.run(["bash", "-xeuo", "pipefail", "-c", script], cwd=folder, capture_output=True, text=True,
                             stdin=subprocess.DEVNULL)
    if run.returncode != 0:
        yield f"{document.relative_to(ROOT)}: its commands ended with {run.returncode}:\n{run.stderr[-4000:]}"


def main():
    documents = sorted(path for path in ROOT.rglob("*.md") if "build" not in path.relative_to(ROOT).parts)
    problems = []
    for document in documents:
        text = document.read_text(encoding="utf-8")
        problems += broken_links(document, text)
        problems += strange_examples(document, text)
        problems += unknown_targets(document, text)
        problems += unknown_packages(document, text)
        if len(sys.argv) > 1:
            problems += failing_commands(document, text, os.path.abspath(sys.argv[1]))
    print("\n".join(problems) or f"{len(documents)} documents in order")
    return bool(problems)


if __name__ == "__main__":
    sys.exit(main())
