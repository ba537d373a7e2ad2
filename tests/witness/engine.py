"""Holds a journal against a model of the plug-in.

The model says for every operation which calls, messages and transaction records it makes, in order and with what
arguments; it is a coroutine for each operation, which gets the answers that the journal has. So it needs no device, and
whatever a service answers, also under injected faults, it knows what has to follow.
"""

import json
import re

PREFIX = "com.vantor.tsd.appsync|"


class Anything:
    """Equal to whatever it is compared with: what the model cannot know."""

    def __eq__(self, other):
        return True

    def __repr__(self):
        return "anything"


ANY = Anything()


class Real(float):
    """A real number that remembers how it was written."""

    def __new__(cls, text):
        number = super().__new__(cls, text)
        number.text = text.removesuffix(".0")
        return number


class Difference(AssertionError):
    """The journal and the model part."""


class Call:
    def __init__(self, what, arguments, about=ANY):
        self.service, self.op = what.split(".", 1)
        self.arguments = known(arguments)
        self.about = about

    def matches(self, record):
        return ((record["service"], record["op"]) == (self.service, self.op) and
                known(record["args"]) == self.arguments and self.about == record["app"])

    def __repr__(self):
        return f"{self.service}.{self.op} {self.arguments}" + ("" if self.about is ANY else f" about {self.about}")


class Message:
    """A message; between \\x01 and \\x02 its text has a regular expression."""

    def __init__(self, level, category, text):
        self.level, self.category = level, category
        self.text = text if category == "0" else PREFIX + text

    def matches(self, record):
        if (record["service"], record["op"], record.get("category")) != ("log", self.level, self.category):
            return False
        expected, text = without_units(self.text), without_units(record["text"])
        if "\x01" not in expected:
            return expected == text
        pieces = re.split("[\x01\x02]", expected)
        return re.fullmatch("".join(piece if index % 2 else re.escape(piece) for index, piece in enumerate(pieces)),
                            text, re.DOTALL) is not None

    def __repr__(self):
        return f"{self.level} [{self.category}] {self.text}"


class Either:
    """One of several; the answer is which."""

    def __init__(self, *choices):
        self.choices = choices

    def matches(self, record):
        return any(choice.matches(record) for choice in self.choices)

    def __repr__(self):
        return " or ".join(map(repr, self.choices))


class Answer:
    def __init__(self, request, record):
        self.arguments, self.result, self.error = record.get("args"), record.get("result"), record.get("error")
        self.choice = None
        if isinstance(request, Either):
            self.choice = next(index for index, each in enumerate(request.choices) if each.matches(record))

    def __bool__(self):
        return bool(self.result)


def known(arguments):
    return {name: value for name, value in arguments.items() if value is not None}


def without_units(text):
    """The journal shows data as its number of bytes."""
    return re.sub(r"<(\d+) bytes>", r"\1", text)


def some(pattern):
    """A part of a message's text of which only the shape is known."""
    return f"\x01{pattern}\x02"


def call(what, arguments=None, about=ANY, **more):
    return (yield Call(what, {**(arguments or {}), **more}, about))


def log(text, level="default", category="8"):
    yield Message(level, category, text)


def complain(text):
    yield from log(text, level="error")


def step(number, phase, success, app, description):
    yield from call("InstallTransactionLog.logStep", about=app, step=number, party=1, phase=phase, success=bool(success),
                    description=description)


def describe(value):
    """A value as it stands in a message."""
    match value:
        case None:
            return "(null)"
        case bool():
            return str(int(value))
        case Real():
            return value.text
        case dict():
            return "{" + "; ".join(f"{key} = {describe(entry)}" for key, entry in value.items()) + "}"
        case list():
            return "(" + ", ".join(map(describe, value)) + ")"
        case _:
            return str(value)


def describe_error(error):
    if error is None:
        return "(null)"
    text = f"{error['domain']} {error['code']}"
    return f"{text}: {error['description']}" if error.get("description") else text


def _without_duplicates(pairs):
    members = dict(pairs)
    if len(members) != len(pairs):
        raise Difference(f"a key stands twice: {[key for key, _ in pairs]}")
    return members


def read_record(line):
    return json.loads(line, parse_float=Real, object_pairs_hook=_without_duplicates)


class Running:
    """An operation under way on a thread."""

    def __init__(self, name, coroutine):
        self.name, self.coroutine = name, coroutine
        self.request, self.result, self.isDone = None, None, False
        self.go_on(None)

    def go_on(self, answer):
        try:
            self.request = self.coroutine.send(answer)
        except StopIteration as end:
            self.request, self.result, self.isDone = None, end.value, True


class Witness:
    """Goes through the records of one process. `model` makes the coroutines: `enter(op, arguments, app)` for a call into the
    plug-in, `unasked(record)` for what begins without one, or nothing;
    `is_foreign(record)` tells what others than the plug-in do, `end()` objects to what is not at its end."""

    def __init__(self, model):
        self.model = model
        self.threads = {}
        self.count = 0

    def hear(self, record):
        self.count += 1
        if record["service"] == "log" and record["category"] == "tsd.appsync":
            return  # the transaction log's own, told again by the call
        under_way = self.threads.setdefault(record["thread"], [])
        if record["service"] == "AppsClient":
            self._hear_entry(under_way, record)
            return
        if not under_way or under_way[-1].isDone:
            if not under_way and self.model.is_foreign(record):
                return
            coroutine = self.model.unasked(record)
            if coroutine is None:
                raise Difference(f"nothing was to follow, and there is {record}" +
                                 (f" in {under_way[-1].name}" if under_way else ""))
            under_way.append(Running("unasked", coroutine))
        running = under_way[-1]
        if not running.request.matches(record):
            raise Difference(f"{running.name}:\n  expected {running.request}\n  there is {record}")
        running.go_on(Answer(running.request, record))
        if running.name == "unasked" and running.isDone:
            under_way.pop()

    def _hear_entry(self, under_way, record):
        if not record.get("end"):
            under_way.append(Running(record["op"], self.model.enter(record["op"], record["args"], record["app"])))
            return
        running = under_way.pop()
        if running.name != record["op"] or not running.isDone:
            raise Difference(f"{running.name}: it ended, and expected was {running.request}")
        self.model.check_result(running.name, running.result, record)

    def end(self):
        left = [running for under_way in self.threads.values() for running in under_way]
        if left:
            raise Difference(f"{left[-1].name}: it never ended; expected was {left[-1].request}")
        self.model.end()


def check_journal(lines, new_model, was_killed=False):
    """Raises a Difference at the first line that no model explains. The count of records."""
    witness, count = None, 0
    for number, line in enumerate(lines, 1):
        record = read_record(line)
        if record["n"] == 1:
            if witness:
                witness.end()
            witness = Witness(new_model())
        try:
            witness.hear(record)
        except Difference as difference:
            raise Difference(f"line {number}: {difference}") from None
        count += 1
    if witness and not was_killed:
        witness.end()
    return count
