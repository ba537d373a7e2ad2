#!/usr/bin/env python3
"""The libraries that a process may hold twice, in the plug-in and in its host, keep nothing that the copies could
disagree on: no object that is written or initialised while the program runs, but for those named here.

usage: library_state.py LIBRARY...

Archives may have none at all, a shared object none of the namespaces `platform` and `plist`.
"""

import re
import subprocess
import sys

# Demangled name: why two copies of it do no harm.
ALLOWED = {
    "platform::TextHashKey::forNewTable()::key":
        "each table carries the key it was made with, so nobody looks for anything by another copy's",
}
# Constants that are never written, which clang keeps among what is, as their type has a destructor.
CONSTANTS = {
    "platform::Array::operator[](unsigned long) const::absent",
    "platform::Dictionary::operator[](std::basic_string_view<char, std::char_traits<char> >) const::absent",
}
# Objects of the language's own run time that a compiler puts into every file.
COMPILERS_OWN = re.compile(r"DW\.ref\.|__dso_handle|completed\.|_?GLOBAL_OFFSET_TABLE_|__TMC_END__|\.L")
WRITABLE = re.compile(r"\.(data|bss|tdata|tbss)(?!\.rel\.ro)")
# What belongs to an object: whether it is made already, what it refers to.
BELONGS_TO = re.compile(r"^(guard variable|reference temporary #\d+|TLS \w+ function) for ")


def readelf(*arguments):
    return subprocess.run(["readelf", "-W", *arguments], check=True, capture_output=True, text=True).stdout


def objects_of(library):
    """Pairs of demangled name and section of the objects in sections that are written."""
    sections, found = {}, []
    for line in readelf("-S", "-s", library).splitlines():
        if match := re.match(r"\s*\[ *(\d+)\] (\S+)", line):
            if match[1] == "0":
                sections = {}
            sections[match[1]] = match[2]
        elif match := re.match(r"\s*\d+: \w+ +\w+ (OBJECT|TLS|NOTYPE) +(\w+) +\w+ +(\d+) (\S+)", line):
            section = sections.get(match[3], "")
            if WRITABLE.match(section):
                found.append((match[4], section))
    names = subprocess.run(["c++filt"], input="\n".join(name for name, _ in found), check=True, capture_output=True,
                           text=True).stdout.splitlines()
    return sorted({(plain, section) for plain, (name, section) in zip(names, found) if not COMPILERS_OWN.match(name)})


def main():
    problems, seen = [], set()
    for library in sys.argv[1:]:
        for name, section in objects_of(library):
            subject = BELONGS_TO.sub("", name)
            if not library.endswith(".a") and not subject.startswith(("platform::", "plist::")):
                continue
            seen.add(subject)
            if subject not in ALLOWED and name not in CONSTANTS:
                problems.append(f"{library}: {name} lies in {section}: two copies of it in one process could disagree")
    problems += [f"{name} is allowed and nowhere any more" for name in ALLOWED if name not in seen]
    print("\n".join(problems) or f"{', '.join(sys.argv[1:])}: no state but {', '.join(ALLOWED)}")
    return bool(problems)


if __name__ == "__main__":
    sys.exit(main())
