#!/usr/bin/env python3
"""Finished files are built as software that reads hostile files should be: what cmake/Hardening.cmake asks for is seen
in the programs, shared objects and archives themselves.

usage: hardened_files.py FILE...

The linker's own mark of control-flow protection can't be asked for: the start files of a distribution may lack it, and
then a linked file does too. What the compiler did is read instead, in an archive its objects' marks, in a linked file
where the pointers to functions point.
"""

import re
import shutil
import subprocess
import sys

# Machine: its mark where an indirect call may arrive, a frame taken at once that is larger than the guard below the
# stack, the property of an object.
ARRIVALS = {"X86-64": [b"\xf3\x0f\x1e\xfa"], "AArch64": [b"\x3f\x23\x03\xd5", b"\x5f\x24\x03\xd5"]}
LARGE_FRAME = {"X86-64": re.compile(r"\bsub +\$0x([0-9a-f]+),%rsp"), "AArch64": re.compile(r"\bsub\s+sp, sp, #0x([0-9a-f]+)")}
GUARD = {"X86-64": 4096, "AArch64": 65536}
MARKS = {"X86-64": ["IBT", "SHSTK"], "AArch64": ["BTI", "PAC"]}
# A processor's own reader of code, where this machine's reads another processor's.
DISASSEMBLER = {"X86-64": "x86_64-linux-gnu-objdump", "AArch64": "aarch64-linux-gnu-objdump"}


def output(*command):
    return subprocess.run(command, check=True, capture_output=True, text=True).stdout


def machine_of(file):
    machine = re.search(r"Machine: .*(X86-64|AArch64)", output("readelf", "-W", "-h", file))
    return machine[1] if machine else sys.exit(f"{file} is of a processor that this test does not know")


def called_by(file):
    """Names of the functions that the file has from elsewhere."""
    return set(re.findall(r" UND (\w+)", output("readelf", "-W", "-s", file)))


def problems_of_calls(file):
    names = called_by(file)
    if "__stack_chk_fail" not in names:
        yield "no function guards its return address"
    if not any("glibcxx_assert_fail" in name for name in names):
        yield "the standard library asserts nothing"
    # An archive may be of objects that hand the C library no buffer of a known size.
    if not file.endswith(".a") and not any(re.fullmatch(r"__(?!stack)\w+_chk", name) for name in names):
        yield "no function of the C library is told how large its buffer is"


def problems_of_linkage(file):
    segments, dynamic = output("readelf", "-W", "-l", file), output("readelf", "-W", "-d", file)
    if "GNU_RELRO" not in segments:
        yield "what is bound stays writable"
    if not re.search(r"\(FLAGS\).*BIND_NOW|\(FLAGS_1\).*\bNOW\b|\(BIND_NOW\)", dynamic):
        yield "functions are bound when they are called first"
    if not re.search(r"GNU_STACK .* RW +0x", segments):
        yield "its stack can be executed"
    if re.search(r"\bTEXTREL\b", dynamic):
        yield "its code is written when it is loaded"
    if "INTERP" in segments and not re.search(r"\(FLAGS_1\).*\bPIE\b", dynamic):
        yield "is always loaded at the same address"


def problems_of_frames(file, machine):
    """A frame larger than the guard may be taken in pieces alone, each of which is touched."""
    disassembler = shutil.which(DISASSEMBLER[machine]) or "objdump"
    large = [size for size in LARGE_FRAME[machine].findall(output(disassembler, "-d", "--no-show-raw-insn", file))
             if GUARD[machine] < int(size, 16) < 1 << 31]
    if large:
        yield f"{len(large)} frames could step over the guard below the stack, the largest of {max(large, key=len)}"


def problems_of_arrivals(file, machine):
    """Every function whose address stands in the tables of the file begins with the mark."""
    sections = [(row[0], *(int(number, 16) for number in row[1:4]), row[4]) for row in re.findall(
        r"\] (\S+) +\S+ +(\w+) (\w+) (\w+) \w+ +(\w*)", output("readelf", "-W", "-S", file))]
    code = [section for section in sections if "X" in section[4]]
    tables = [section for section in sections if section[0].startswith(".data")]
    with open(file, "rb") as opened:
        content = opened.read()
    arrivals, unmarked = 0, 0
    for place, target in re.findall(r"^(\w+) +\w+ R_\w+_RELATIV\w* +(\w+)$", output("readelf", "-W", "-r", file), re.M):
        target = int(target, 16)
        if not any(start <= int(place, 16) < start + size for _, start, _, size, _ in tables):
            continue
        for _, start, offset, size, _ in code:
            if start <= target < start + size:
                arrivals += 1
                unmarked += content[offset + target - start:][:4] not in ARRIVALS[machine]
    if unmarked or not arrivals:
        yield f"{unmarked} of {arrivals} functions that are called by their address do not begin with the mark for it"


def problems_of_objects(archive, machine):
    """Each object with code in it has the marks."""
    for notes in output("readelf", "-W", "-S", "-n", archive).split("\nFile: ")[1:]:
        code = re.search(r" \.text\S* +PROGBITS +\w+ \w+ (?!0+ )\w+ ", notes)
        if code and not all(re.search(rf"feature:.*\b{mark}\b", notes) for mark in MARKS[machine]):
            yield f"{notes.splitlines()[0]} has no mark of control-flow protection"


def main():
    problems = []
    for file in sys.argv[1:]:
        machine = machine_of(file)
        found = [*problems_of_calls(file), *problems_of_frames(file, machine)]
        if file.endswith(".a"):
            found += problems_of_objects(file, machine)
        else:
            found += [*problems_of_linkage(file), *problems_of_arrivals(file, machine)]
        problems += [f"{file}: {problem}" for problem in found]
    print("\n".join(problems) or f"{', '.join(sys.argv[1:])}: hardened")
    return bool(problems)


if __name__ == "__main__":
    sys.exit(main())
