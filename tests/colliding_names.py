"""Names that are one to hashes without a secret: what a host would send to make tables of names as slow as lists."""

import itertools
import random
import string
import struct

WORD = (1 << 64) - 1
# The hash of a widespread standard library: MurmurHash64A with the seed that it has for texts.
FACTOR, SEED = 0xc6a4a7935bd1e995, 0xc70f6907
INVERSE = pow(FACTOR, -1, 1 << 64)
LETTERS = (string.ascii_letters + string.digits + "-.").encode()
TAKEN = frozenset(range(0x21, 0x7f)) - frozenset(b"/\\\"")
# Eight bytes at the begin of a block for which a multiplying hash forgets all that it has seen, its key included.
FORGOTTEN = bytes.fromhex("db28b4a0d17e03e7")


def _scrambled(word):
    word = word * FACTOR & WORD
    return (word ^ word >> 47) * FACTOR & WORD


def _unscrambled(word):
    word = word * INVERSE & WORD
    return (word ^ word >> 47) * INVERSE & WORD


def _after(state, word):
    return (state ^ _scrambled(word)) * FACTOR & WORD


def _parts(state, count, dice):
    """So many texts of 16 bytes that all lead from one state of the hash to another, and the latter."""
    parts, end = [], None
    while len(parts) < count:
        first = bytes(dice.choices(LETTERS, k=8))
        middle = _after(state, *struct.unpack("<Q", first))
        if end is None:
            end = _after(middle, *struct.unpack("<Q", bytes(dice.choices(LETTERS, k=8))))
        second = struct.pack("<Q", _unscrambled(end * INVERSE & WORD ^ middle))
        if TAKEN.issuperset(second):
            parts.append((first + second).decode())
    return parts, end


def names_of_one_hash():
    """100,000 names of 80 characters."""
    dice, stages, state = random.Random(1), [], SEED ^ 80 * FACTOR & WORD
    for _ in range(5):
        parts, state = _parts(state, 10, dice)
        stages.append(parts)
    return ["".join(parts) for parts in itertools.product(*stages)]


def bytes_that_cancel_a_key(count):
    """Contents of 40 bytes each, that are no text."""
    return [FORGOTTEN + b"%08d" % number + b"x" * 24 for number in range(count)]


def harmless(names):
    """As many others of the same length."""
    length = len(names[0])
    others = [f"{number:08}".rjust(length, "x") for number in range(len(names))]
    return others if isinstance(names[0], str) else [each.encode() for each in others]
