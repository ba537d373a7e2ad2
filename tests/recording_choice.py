"""Chooses recordings that together show as much as possible of what the plug-in does, in as few bytes as possible.

What a recording shows is taken from its lines: each message's format with its flags and marks, each call with which of
its arguments are there and what kind of answer came, and which of these followed which. Identifiers, paths and texts of
apps do not count.
"""

import functools
import heapq
import re

CONVERSION = re.compile(r"%(?:\{public\})?(?:@|l*[dufs]|c)")
TELLING = re.compile(r"\d|y|n|install|remove|DOWNLOADED|INSTALLED|FAILED|SENT|initiating|updating|starting|done|OB\w+")
EMPTY = {"(null)": "null", "()": "empty", "{}": "empty"}
WORD = re.compile(r'"(?:[^"\\]|\\.)*"|#\d+|<\d+ bytes>|-?\d+(?:\.\d+)?|[\w.]+|[^\s\w]', re.ASCII)
CALL = re.compile(r"\d+ .*? +([<>=!]) ([\w.]+)(.*)", re.DOTALL)
MESSAGE = re.compile(r'.*level (\d), message "[\w.]+\|(.*)"\)$', re.DOTALL)
# Of every message: that somebody wants it, and by which name.
COMMON = re.compile(r"LogHandle\.isEnabled|TSSupport\.TSGetLogCategory|LogHandle\.write returns")


class Features:
    """What recordings of one plug-in show."""

    def __init__(self, library):
        self._texts = {text.decode() for text in re.findall(rb"[\x20-\x7e]{2,}", library)}
        formats = sorted((text for text in self._texts if len(text) > 7), key=lambda text: -len(CONVERSION.sub("", text)))
        self._formats = [(text, self._pattern(text)) for text in formats]
        self._kind_of = functools.lru_cache(1 << 16)(self._kind_of_message)

    def of(self, lines):
        """Of a recording as `tsd recording show` prints it."""
        found, before = set(), ""
        for line in lines:
            parts = None if COMMON.search(line) else CALL.match(line)
            if not parts:
                continue
            whole, kind = self._whole_and_kind(*parts.groups())
            found |= {whole, (before, kind)}
            before = kind
        return found

    @staticmethod
    def _pattern(text):
        parts, conversions = CONVERSION.split(text), CONVERSION.findall(text)
        holes = ("(.*)" if each.endswith(("@", "s")) else r"(-?[\w.]+)" for each in conversions)
        return re.compile(re.escape(parts[0]) + "".join(hole + re.escape(part) for hole, part in zip(holes, parts[1:])),
                          re.DOTALL)

    def _kind_of_message(self, text):
        for form, pattern in self._formats:
            if match := pattern.fullmatch(text):
                return form, ",".join(map(self._telling, match.groups()))
        return "", ""

    def _telling(self, text):
        return EMPTY.get(text, text if TELLING.fullmatch(text) or text in self._texts else "")

    def _whole_and_kind(self, way, operation, rest):
        if operation == "LogHandle.write" and (message := MESSAGE.match(rest)):
            form, told = self._kind_of(message[2].replace('\\"', '"'))
            return f"log {message[1]} {form} {told}", f"log {message[1]} {form}"
        rest = re.sub(r"\[(?!\]).*\]", "[+]", re.sub(r"\{(?!\}).*\}", "{+}", rest))
        words = [self._word(each) for each in WORD.findall(rest)[:40] if each[0] != "#"]
        failed = words[:1] == ["returns"] and ":" in words
        if failed:
            words = [*words[:3], "error"]
        ending = "error" if failed else next((each for each in words[1:2] if each in ("null", "false")), "")
        return f"{way} {operation} {' '.join(words)}"[:160], f"{way} {operation} {ending}"

    def _word(self, word):
        if word[0] == '"':
            last = word[1:-1].rsplit("/", 1)[-1]
            return word if word[1:-1] in self._texts else f'".../{last}"' if last in self._texts else '""'
        if word[0] == "<" and len(word) > 1:
            return "<0>" if word == "<0 bytes>" else "<bytes>"
        return "number" if word[0].isdigit() and len(word) > 1 else word


def chosen(features, sizes, first, budget):
    """Names out of `features` (name: set) that show most for their `sizes`, within so many bytes: those of `first` that
    bring something, then the others, the best first."""
    names, shown, total = [], set(), 0

    def take(name):
        nonlocal total
        if not features[name] - shown or total + sizes[name] > budget:
            return
        names.append(name)
        shown.update(features[name])
        total += sizes[name]

    for name in first:
        take(name)
    rest = [(-len(features[name]) / sizes[name], name) for name in sorted(features) if name not in names]
    heapq.heapify(rest)
    while rest:
        _, name = heapq.heappop(rest)
        worth = -len(features[name] - shown) / sizes[name]
        if rest and worth > rest[0][0]:
            if worth < 0:
                heapq.heappush(rest, (worth, name))
        else:
            take(name)
    return names
