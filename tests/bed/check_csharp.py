#!/usr/bin/env python3
"""Checks the entry points of bindings/csharp/Rcvlink.cs: all functions of the DLL, each by one of its two names, and
each method that of its function."""

import os
import re
import sys

from check_dll import differences, exports, objdump

ROOT = os.path.realpath(os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", ".."))
ENTRIES = os.path.join(ROOT, "build", "release", "tests", "csharp", "entries.txt")
NAMES = re.compile(r'"(_Z\w+)",\s*"(\?[\w?@]+)"')  # of a function, in rcvlink_c.h
MEMBER = re.compile(r"\(\*(\w+)\)\(")  # of the table in rcvlink_c.h, in the same order


def functions_for_c():
    """From the name of Microsoft's compilers to that of the member of RcvlinkFunctions."""
    with open(os.path.join(ROOT, "include", "rcvlink_c.h"), encoding="utf-8") as file:
        text = file.read()
    table = text.partition("struct RcvlinkFunctions {")[2].partition("\n};")[0]
    return dict(zip((names[1] for names in NAMES.findall(text)), MEMBER.findall(table), strict=True))


def main():
    with open(ENTRIES, encoding="utf-8") as file:
        found = dict(line.split() for line in file)
    mistakes = differences("entry point", {name for name in exports(objdump()) if name.startswith("?")}, set(found))
    for entry, member in functions_for_c().items():
        if found.get(entry, member) != member:
            mistakes.append(f"{found[entry]} calls {entry}, which is {member}")
    print("\n".join(mistakes) if mistakes else f"{len(found)} entry points, all as exported")
    return 1 if mistakes else 0


if __name__ == "__main__":
    sys.exit(main())
