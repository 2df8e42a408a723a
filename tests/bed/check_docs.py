#!/usr/bin/env python3
"""Checks that code quoted in docs/ is in the file named by the comment before the quote."""

import os
import re
import sys

ROOT = os.path.realpath(os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", ".."))
QUOTE = re.compile(r"<!-- (\S+) -->\n```\w+\n(.*?)```\n", re.DOTALL)


def read(path):
    with open(os.path.join(ROOT, path), encoding="utf-8") as file:
        return file.read()


def main():
    pages = [f"docs/{name}" for name in sorted(os.listdir(os.path.join(ROOT, "docs"))) if name.endswith(".md")]
    quotes = [(page, *quote) for page in pages for quote in QUOTE.findall(read(page))]
    mistakes = [f"{page}: not in {source}:\n{code}" for page, source, code in quotes if code not in read(source)]
    print("\n".join(mistakes) if mistakes else f"{len(quotes)} quotes of code match their files")
    return 1 if mistakes or not quotes else 0


if __name__ == "__main__":
    sys.exit(main())
