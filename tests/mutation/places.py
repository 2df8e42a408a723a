"""Finds where a C++ source can be changed: one small mistake at each place.

Comments, texts and lines of the preprocessor are left alone. The sources are formatted by clang-format, so an
operator between two operands has a space on both sides, and the angle bracket of a template has not.
"""

import dataclasses
import re

TOKEN = re.compile(
    r"""
    (?P<skipped>//[^\n]*|/\*.*?\*/|^[ \t]*\#(?:[^\n\\]|\\.|\\\n)*)
  | (?P<text>(?:L|u8|u|U)?R"(?P<mark>[^(\s]*)\(.*?\)(?P=mark)"|(?:L|u8|u|U)?"(?:[^"\\\n]|\\.)*"|(?:L|u8|u|U)?'(?:[^'\\\n]|\\.)+')
  | (?P<number>(?:0[xX][0-9a-fA-F']+|\d(?:[\d']|(?:\.\d)|(?:[eE][+-]?\d))*)[uUlLzZfF]*)
  | (?P<word>[A-Za-z_]\w*)
  | (?P<sign><=>|<<=|>>=|\.\.\.|->|::|\+\+|--|<<|<=|>=|==|!=|&&|\|\||\+=|-=|\*=|/=|%=|&=|\|=|\^=|[^\s\w])
    """,
    re.X | re.M | re.S,
)

RELATIONS = {"<": "<=", "<=": "<", ">": ">=", ">=": ">", "==": "!=", "!=": "=="}
LOGIC = {"&&": "||", "||": "&&"}
SUMS = {"+": "-", "-": "+", "+=": "-=", "-=": "+="}
ASSIGNMENTS = {"=", "+=", "-=", "*=", "/=", "%=", "&=", "|=", "^=", "<<=", ">>="}
NO_CALL = {"return", "if", "for", "while", "do", "else", "switch", "case", "default", "using", "throw", "delete",
           "break", "continue", "goto", "static_assert", "typedef", "try", "catch", "co_return", "new", "public",
           "private", "protected", "friend", "template", "operator"}


@dataclasses.dataclass(frozen=True)
class Token:
    kind: str
    text: str
    start: int

    @property
    def end(self):
        return self.start + len(self.text)


@dataclasses.dataclass(frozen=True)
class Place:
    path: str
    start: int
    end: int
    operator: str
    new: str
    line: int
    column: int
    old: str
    line_text: str

    @property
    def key(self):
        return f"{self.path}:{self.line}:{self.column} {self.operator}: {self.shown}"

    @property
    def shown(self):
        old = " ".join(self.old.split())
        return f"{old} -> {self.new or 'nothing'}"


def tokens_of(source):
    found = []
    for match in TOKEN.finditer(source):
        kind = match.lastgroup if match.lastgroup != "mark" else "text"
        if match.group("skipped") is None:
            found.append(Token("text" if match.group("text") else kind, match.group(0), match.start()))
    return found


def pairs_of(tokens):
    """The index of the closing bracket for each opening one."""
    pairs, open_brackets = {}, []
    for i, token in enumerate(tokens):
        if token.text in ("(", "[", "{"):
            open_brackets.append(i)
        elif token.text in (")", "]", "}") and open_brackets:
            pairs[open_brackets.pop()] = i
    return pairs


def statements_of(tokens, pairs):
    """Pairs of the first token and the semicolon of each simple statement in a function."""
    found = []

    def is_function_body(i, inside):
        """Whether the brace i opens a block of statements."""
        previous = tokens[i - 1]
        if inside:
            return previous.text in (")", ";", "{", "}", "else", "do", "try", ":", "]") or (
                previous.kind == "word" and previous.text in ("mutable", "noexcept", "const"))
        segment = []
        for token in reversed(tokens[:i]):
            if token.text in (";", "{", "}"):
                break
            segment.append(token.text)
        return "(" in segment and not {"namespace", "class", "struct", "union", "enum", "="} & set(segment)

    def walk(i, end, inside):
        start = i
        while i < end:
            text = tokens[i].text
            if text in ("(", "["):
                walk_brackets(i + 1, pairs[i], inside)
                closing = pairs[i]
                if inside and text == "(" and tokens[start].text in ("if", "for", "while", "switch"):
                    i = start = closing + 1
                    continue
                i = closing + 1
            elif text == "{":
                block = is_function_body(i, inside)
                if inside and not block:
                    walk_brackets(i + 1, pairs[i], inside)
                else:
                    # A lambda belongs to its statement, a block ends one.
                    walk(i + 1, pairs[i], block)
                i = pairs[i] + 1
                if not inside or (block and tokens[start].text in ("{", "else", "do", "try", "catch")) or start == i:
                    start = i
                elif block and i < end and tokens[i].text not in (";", ",", ")", "(", "."):
                    start = i
            elif text == ";":
                if inside and start < i:
                    found.append((start, i))
                i = start = i + 1
            elif text in ("else", "do", "try") or (text == ":" and tokens[start].text in ("case", "default")):
                i = start = i + 1
            else:
                i += 1

    def walk_brackets(i, end, inside):
        while i < end:
            text = tokens[i].text
            if text == "{" and tokens[i - 1].text in (")", "]", "mutable", "noexcept"):
                walk(i + 1, pairs[i], True)  # a lambda
                i = pairs[i] + 1
            elif text in ("(", "[", "{"):
                walk_brackets(i + 1, pairs[i], inside)
                i = pairs[i] + 1
            else:
                i += 1

    walk(0, len(tokens), False)
    return found


def target_end(tokens, pairs, i, end):
    """After `a.b(c)[d]` and the like, or None when it begins otherwise."""
    while i < end and tokens[i].text == "*":
        i += 1
    if i >= end or (tokens[i].kind != "word" and tokens[i].text != "(") or tokens[i].text in NO_CALL:
        return None
    if tokens[i].text == "(":
        return None
    i += 1
    while i < end:
        text = tokens[i].text
        if text in ("::", ".", "->"):
            i += 2
        elif text in ("(", "["):
            i = pairs[i] + 1
        elif text == "<" and tokens[i - 1].end == tokens[i].start:  # a template's arguments
            while tokens[i].text != ">":
                i += 1
            i += 1
        else:
            break
    return i


def places_of(path, source):
    tokens = tokens_of(source)
    pairs = pairs_of(tokens)
    lines = source.split("\n")
    found = []

    def add(start, end, operator, new):
        line = source.count("\n", 0, start)
        column = start - (source.rfind("\n", 0, start) + 1)
        found.append(Place(path, start, end, operator, new, line + 1, column + 1, source[start:end],
                           lines[line].strip()))

    def is_spaced(token):
        return source[token.start - 1].isspace() and source[token.end].isspace()

    skipped_until = -1
    for i, token in enumerate(tokens):
        if token.text in ("static_assert", "alignas") and i + 1 in pairs:
            skipped_until = pairs[i + 1]
        if i <= skipped_until:
            continue
        previous = tokens[i - 1] if i else None
        if token.kind == "sign" and is_spaced(token):
            for operator, table in (("relation", RELATIONS), ("logic", LOGIC), ("sum", SUMS)):
                if token.text in table:
                    add(token.start, token.end, operator, table[token.text])
        elif token.kind == "number":
            digits = re.fullmatch(r"(0[xX][0-9a-fA-F']+|\d[\d']*)([uUlLzZ]*)", token.text)
            pure = previous and previous.text == "=" and tokens[i - 2].text in (")", "const", "noexcept", "override")
            if digits and not pure:
                value = int(digits[1].replace("'", ""), 0) if not re.fullmatch(r"0\d+", digits[1]) else None
                if value is not None:
                    shape = hex if digits[1][:2] in ("0x", "0X") else str
                    add(token.start, token.end, "constant", shape(value + 1) + digits[2])
                    if value > 0:
                        add(token.start, token.end, "constant", shape(value - 1) + digits[2])
        elif token.text in ("true", "false"):
            add(token.start, token.end, "boolean", "false" if token.text == "true" else "true")
        elif token.text in ("if", "while") and tokens[i + 1].text == "(":
            first, last = i + 2, pairs[i + 1] - 1
            depth = 0
            for j in range(first, last + 1):  # if (initialization; condition)
                depth += (tokens[j].text in ("(", "[", "{")) - (tokens[j].text in (")", "]", "}"))
                if tokens[j].text == ";" and depth == 0:
                    first = j + 1
            condition = source[tokens[first].start:tokens[last].end]
            # A condition that declares a variable cannot be negated in place.
            declares = any(tokens[j].text == "=" for j in range(first, last + 1))
            if condition not in ("true", "false") and not declares:
                add(tokens[first].start, tokens[last].end, "condition", f"!({condition})")
        elif token.text == "return":
            j = i + 1
            while tokens[j].text != ";":
                if tokens[j].kind == "word" and re.fullmatch(r"S_OK|S_FALSE|E_[A-Z]+", tokens[j].text):
                    new = {"S_OK": "S_FALSE", "S_FALSE": "S_OK"}.get(tokens[j].text, "S_OK")
                    add(tokens[j].start, tokens[j].end, "result", new)
                j = pairs[j] + 1 if tokens[j].text in ("{",) else j + 1

    for start, semicolon in statements_of(tokens, pairs):
        end = target_end(tokens, pairs, start, semicolon)
        if end is None:
            continue
        first, last = tokens[start], tokens[semicolon - 1]
        if end == semicolon and last.text == ")" and first.text != "static_cast":
            add(first.start, last.end, "call", "")
        elif end < semicolon and tokens[end].text in ASSIGNMENTS:
            add(first.start, last.end, "assignment", "")
    # What the two ways to find `return` in a lambda give twice counts once.
    return sorted(set(found), key=lambda place: (place.start, place.end, place.operator, place.new))
