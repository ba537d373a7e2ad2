"""Where a fault can be planted in a C++ source, and how: finds statements, guards, messages, conditions, operators and
constants in the text as it is formatted here, without a compiler. What does not compile afterwards is no fault."""

import re
from typing import NamedTuple

TOKEN = re.compile(
    r"""(?P<comment>//[^\n]*|/\*.*?\*/)
      | (?P<directive>^[ \t]*\#[^\n]*(?:\\\n[^\n]*)*)
      | (?P<raw>R"(?P<fence>[^(\s]*)\(.*?\)(?P=fence)")
      | (?P<text>"(?:[^"\\\n]|\\.)*")
      | (?P<character>'(?:[^'\\\n]|\\.)+')
      | (?P<number>\b\d[\w.']*)
      | (?P<word>[A-Za-z_]\w*)
      | (?P<sign><=>|->\*?|::|&&|\|\||==|!=|<=|>=|<<|>>|\+\+|--|[-+*/%|&^]=|[^\s\w])""",
    re.VERBOSE | re.DOTALL | re.MULTILINE)

NO_EXPRESSION = {"return", "using", "namespace", "class", "struct", "enum", "union", "const", "constexpr", "static", "auto",
                 "template", "typedef", "case", "default", "break", "continue", "goto", "throw", "if", "else", "for", "while",
                 "do", "switch", "try", "catch", "public", "private", "protected", "friend", "virtual", "explicit",
                 "static_assert", "extern", "inline", "bool", "int", "char", "double", "float", "void", "unsigned", "co_return"}
EXCHANGED = {"&&": "||", "||": "&&", "==": "!=", "!=": "==", "<": "<=", "<=": "<", ">": ">=", ">=": ">", "true": "false",
             "false": "true", "+": "-", "-": "+"}
CLOSING = {"(": ")", "{": "}", "[": "]"}


class Token(NamedTuple):
    kind: str
    text: str
    begin: int
    end: int


class Site(NamedTuple):
    """One fault: the text from `begin` to `end` becomes `planted`."""

    kind: str
    begin: int
    end: int
    planted: str


def tokens_of(source):
    kept = []
    for match in TOKEN.finditer(source):
        kind = match.lastgroup if match.lastgroup != "fence" else "raw"
        if kind not in ("comment", "directive"):
            kept.append(Token(kind, match[0], match.start(), match.end()))
    return kept


def partners_of(tokens):
    """For each opening bracket the place of its closing one."""
    partners, open_ones = {}, []
    for place, token in enumerate(tokens):
        if token.text in CLOSING and token.kind == "sign":
            open_ones.append(place)
        elif token.text in CLOSING.values() and token.kind == "sign" and open_ones:
            partners[open_ones.pop()] = place
    return partners


def opens_block(tokens, place):
    """Whether the brace opens statements, and not a list of values, a class or a namespace."""
    before = [token.text for token in tokens[max(0, place - 12):place]]
    if not before or before[-1] in ("=", ",", "(", "return", "{"):
        return False
    if before[-1] in (")", "else", "do", "try", "]", "const", "noexcept", "override", "final", "mutable"):
        return "class" not in before[-4:] and "struct" not in before[-4:]
    return "->" in before[-8:] and ";" not in before[before.index("->"):]


def statements_of(tokens, partners):
    """(first token, last token) of each expression statement, block by block, in order."""
    blocks = []
    for place, token in enumerate(tokens):
        if token.text == "{" and place in partners and opens_block(tokens, place):
            block, at = [], place + 1
            while at < partners[place]:
                first = at
                while at < partners[place] and tokens[at].text not in (";", "{"):
                    at = partners[at] + 1 if tokens[at].text in ("(", "[") and at in partners else at + 1
                if at < partners[place] and tokens[at].text == "{":
                    # A block of its own, or a list of values in the middle of a statement.
                    inner = opens_block(tokens, at)
                    at = partners.get(at, partners[place]) + 1
                    if inner:
                        continue
                    while at < partners[place] and tokens[at].text != ";":
                        at = partners[at] + 1 if tokens[at].text in CLOSING and at in partners else at + 1
                if at < partners[place]:
                    block.append((first, at))
                at += 1
            blocks.append(block)
    return blocks


def is_expression(tokens, first, last):
    """A call, an assignment or the like; not a declaration, which others need."""
    head = tokens[first]
    if head.text in NO_EXPRESSION or (head.kind != "word" and head.text not in ("*", "++", "--", "(", "::")):
        return False
    # Two words side by side are a type and a name.
    words = [token.kind == "word" for token in tokens[first:last]]
    depth = 0
    for place in range(first, last - 1):
        depth += (tokens[place].text in "([{") - (tokens[place].text in ")]}")
        if depth == 0 and words[place - first] and words[place - first + 1]:
            return False
        if depth == 0 and tokens[place].text in ("&", "*", ">") and tokens[place].end < tokens[place + 1].begin and \
                words[place - first + 1] and tokens[place].begin == tokens[place - 1].end:
            return False
    return any(token.text in ("(", "=", "++", "--", "+=", "-=", "|=", "&=") for token in tokens[first:last])


def spaced(source, token):
    """Operators stand between spaces here; references, templates and signs do not."""
    return source[token.begin - 1].isspace() and source[token.end:token.end + 1].isspace()


def statement_sites(source, tokens, partners):
    for block in statements_of(tokens, partners):
        previous = None
        for first, last in block:
            begin, end = tokens[first].begin, tokens[last].end
            text = source[begin:end]
            if tokens[first].text == "if":
                closing = partners.get(first + 1)
                follows = tokens[closing + 1].text if closing else ""
                if follows in ("return", "continue", "break", "throw"):
                    yield Site("guard deleted", begin, end, ";")
                elif closing and is_expression(tokens, closing + 1, last):
                    yield Site("statement deleted", tokens[closing + 1].begin, end, ";")
                previous = None
            elif is_expression(tokens, first, last):
                isMessage = tokens[first].text in ("say", "sayError", "log")
                yield Site("message deleted" if isMessage else "statement deleted", begin, end, ";")
                if previous:
                    other = source[previous[0]:previous[1]]
                    if other != text:
                        between = source[previous[1]:begin]
                        yield Site("neighbours exchanged", previous[0], end, text + between + other)
                previous = (begin, end)
            else:
                previous = None


def token_sites(source, tokens, partners):
    for place, token in enumerate(tokens):
        if token.text in ("if", "while") and tokens[place + 1].text == "(" and place + 1 in partners:
            begin, end = tokens[place + 1].end, tokens[partners[place + 1]].begin
            declared = source.rfind(";", begin, end)
            begin = declared + 1 if declared >= 0 else begin
            if declared >= 0 or not re.match(r"\s*(const |auto)", source[begin:end]):
                yield Site("condition negated", begin, end, f"!({source[begin:end].strip()})")
        elif token.kind == "sign" and token.text in EXCHANGED and spaced(source, token):
            yield Site(f"{EXCHANGED[token.text]} for {token.text}", token.begin, token.end, EXCHANGED[token.text])
        elif token.text in ("true", "false"):
            yield Site("constant changed", token.begin, token.end, EXCHANGED[token.text])
        elif token.text == "!" and tokens[place + 1].text != "=" and not source[token.end].isspace():
            yield Site("negation dropped", token.begin, token.end, "")
        elif token.kind == "number" and re.fullmatch(r"\d+", token.text):
            yield Site("constant changed", token.begin, token.end, str(int(token.text) + 1))
        elif token.kind == "text" and len(token.text) > 2 and not source[:token.begin].rstrip().endswith("#include"):
            yield Site("text changed", token.begin, token.end, token.text[:-1] + '~"')


def sites_of(source):
    tokens = tokens_of(source)
    partners = partners_of(tokens)
    found = [*statement_sites(source, tokens, partners), *token_sites(source, tokens, partners)]
    # Formats and conditions that the compiler itself checks are no faults that could reach anybody.
    asserted = [(m.start(), m.end()) for m in re.finditer(r"static_assert\s*\(.*?\);", source, re.DOTALL)]
    return sorted({site for site in found if not any(b <= site.begin < e for b, e in asserted)})
