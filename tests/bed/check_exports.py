#!/usr/bin/env python3
"""Checks the built DLL: its exported names (tests/data/exports.txt), the DLLs it imports
(tests/data/imports.txt) and its security flags."""

import os
import re
import subprocess
import sys

ROOT = os.path.realpath(os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", ".."))
DLL = "build/release/bin/rcvlink.dll"
PROTECTIONS = {"HIGH_ENTROPY_VA", "DYNAMIC_BASE", "NX_COMPAT"}


def read_list(name):
    with open(os.path.join(ROOT, "tests", "data", name), encoding="utf-8") as file:
        return set(file.read().split())


def dump():
    return subprocess.run(
        ["x86_64-w64-mingw32-objdump", "-p", os.path.join(ROOT, DLL)],
        check=True,
        capture_output=True,
        text=True,
    ).stdout


def exports(text):
    """The names in the export table, which objdump lists as "[   0] name" up to an empty line."""
    table = text.partition("[Ordinal/Name Pointer] Table\n")[2].partition("\n\n")[0]
    return set(re.findall(r"^\s*\[.*\s(\S+)$", table, re.M))


def imports(text):
    return set(re.findall(r"^\s*DLL Name: (\S+)$", text, re.M))


def protections(text):
    block = re.search(r"^DllCharacteristics.*\n((?:\s+[A-Z_]+\n)*)", text, re.M)
    return set(block.group(1).split()) if block else set()


def differences(what, expected, found):
    return [f"{what} {name} is missing" for name in sorted(expected - found)] + [
        f"{what} {name} is not expected" for name in sorted(found - expected)
    ]


def main():
    if not os.path.exists(os.path.join(ROOT, DLL)):
        print(f"{DLL} is missing")
        return 1
    text = dump()
    expected = read_list("exports.txt")
    mistakes = differences("export", expected, exports(text))
    mistakes += differences("import", read_list("imports.txt"), imports(text))
    mistakes += [f"{name} is not set" for name in sorted(PROTECTIONS - protections(text))]
    print("\n".join(mistakes) if mistakes else f"{len(expected)} exports, all as expected")
    return 1 if mistakes else 0


if __name__ == "__main__":
    sys.exit(main())
