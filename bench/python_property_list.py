"""Takes the time of the standard library's property-list module: `python_property_list.py OPERATION FILE`.

Prints the seconds of processor time that one operation on the file's content takes, the least of a few. "read-each"
reads the documents that the file's list has as data.
"""

import pathlib
import plistlib
import sys
import time

operation, file = sys.argv[1:]
document = pathlib.Path(file).read_bytes()
content = plistlib.loads(document)
work = {
    "read": lambda: plistlib.loads(document),
    "read-each": lambda: [plistlib.loads(inner) for inner in content],
    "write-binary": lambda: plistlib.dumps(content, fmt=plistlib.FMT_BINARY, sort_keys=False),
    "write-xml": lambda: plistlib.dumps(content, fmt=plistlib.FMT_XML, sort_keys=False),
}[operation]

least = float("inf")
for _ in range(3):
    begin = time.thread_time()
    work()
    least = min(least, time.thread_time() - begin)
print(least)
