"""Exchanges property lists with the standard library's module.

Each document NAME.in in the directory is read and written again as NAME.binary and NAME.xml; samples of the module's
own are added as sample.binary, sample.xml and uid.binary.
"""

import datetime
import pathlib
import plistlib
import sys

directory = pathlib.Path(sys.argv[1])
forms = {".binary": plistlib.FMT_BINARY, ".xml": plistlib.FMT_XML}


def write(path, value):
    for suffix, form in forms.items():
        path.with_suffix(suffix).write_bytes(plistlib.dumps(value, fmt=form, sort_keys=False))


for path in directory.glob("*.in"):
    write(path, plistlib.loads(path.read_bytes()))

limits = [0, 255, 256, 65535, 65536, 2**32 - 1, 2**32, 2**63 - 1, 2**63, 2**64 - 1, -1, -(2**31), -(2**63)]
shared = ["same", {"key": "same"}]
write(directory / "sample", {
    "limits": limits,
    "reals": [0.1, -0.0, 1e300, 5e-324, float("inf"), float("-inf"), float("nan")],
    "text": ["", " \n\t<&>\"' ", "é", "\U0001f600", "x" * 20, "y" * 70000],
    "dates": [datetime.datetime(1, 1, 1), datetime.datetime(2001, 1, 1), datetime.datetime(9999, 12, 31, 23, 59, 59)],
    "data": [b"", b"\0\1\2", bytes(range(256))],
    "flags": [True, False],
    "shared": [shared, shared],
    "empty": [[], {}],
    "keys": {str(number): number for number in range(300)},
})
(directory / "uid.binary").write_bytes(plistlib.dumps(plistlib.UID(1), fmt=plistlib.FMT_BINARY))
