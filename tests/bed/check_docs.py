#!/usr/bin/env python3
"""Checks that code quoted in docs/ is in the file named by the comment before the quote, and that the lines of the
report in docs/troubleshooting.md are lines that the library writes."""

import os
import re
import sys

ROOT = os.path.realpath(os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", ".."))
QUOTE = re.compile(r"<!-- (\S+) -->\n```\w+\n(.*?)```\n", re.DOTALL)
TRACE = re.compile(r'\bTrace\(\s*((?:L?"(?:[^"\\]|\\.)*"\s*)+)')
TEXTS = re.compile(r'L?"((?:[^"\\]|\\.)*)"')  # the pieces of a format
PLACE = re.compile(r"%[0-9]*[a-zA-Z]")
# What a report shows at a place of a format.
SHOWN = {"%s": ".*", "%u": r"\d+", "%i": r"-?\d+", "%0x": "[0-9a-f]+", "%08X": "[0-9A-F]{8}", "%p": "[0-9A-F]{16}"}
LINE = re.compile(r"^\| `([^`]+)` \|", re.M)


def read(path):
    with open(os.path.join(ROOT, path), encoding="utf-8") as file:
        return file.read()


def source_text():
    paths = [os.path.join(folder, name) for folder, _, names in os.walk(os.path.join(ROOT, "src")) for name in names]
    return "\n".join(read(path) for path in sorted(paths))


def pattern_of(format_text):
    """Matches the lines that a format makes."""
    text = format_text.removesuffix(r"\r\n")
    pieces = [re.escape(piece) for piece in PLACE.split(text)]
    places = [SHOWN[place] for place in PLACE.findall(text)]
    return re.compile("".join(piece + place for piece, place in zip(pieces, [*places, ""])))


def unwritten_lines():
    """Lines of the page's table that no Trace writes, and how many lines there are."""
    text = source_text()
    patterns = [pattern_of("".join(TEXTS.findall(call))) for call in TRACE.findall(text)]

    def is_written(line):
        # A format may have a place for the very words that tell a line, so they are looked for as well.
        words = line.rpartition(" - ")[2].partition("[")[0].partition(".")[0].split()
        return any(pattern.fullmatch(line) for pattern in patterns) and all(
            word in text or word.isdigit() for word in words
        )

    lines = LINE.findall(read("docs/troubleshooting.md").partition("\n## In the report\n")[2])
    return [line for line in lines if not is_written(line)], len(lines)


def main():
    pages = [f"docs/{name}" for name in sorted(os.listdir(os.path.join(ROOT, "docs"))) if name.endswith(".md")]
    quotes = [(page, *quote) for page in pages for quote in QUOTE.findall(read(page))]
    mistakes = [f"{page}: not in {source}:\n{code}" for page, source, code in quotes if code not in read(source)]
    unwritten, lines = unwritten_lines()
    mistakes += [f"docs/troubleshooting.md: the library does not write: {line}" for line in unwritten]
    print("\n".join(mistakes) if mistakes else f"{len(quotes)} quotes of code, {lines} lines of the report")
    return 1 if mistakes or not quotes or not lines else 0


if __name__ == "__main__":
    sys.exit(main())
