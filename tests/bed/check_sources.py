#!/usr/bin/env python3
"""Refuses a C++ source that the CMakeLists.txt of its folder, or of the next one above, does not name.

A test in such a source would never fail, since nobody builds it.
"""

import os
import sys

ROOT = os.path.realpath(os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", ".."))
AREAS = ("cli", "examples", "simulator", "src", "tests")
LISTS = "CMakeLists.txt"


def read(path):
    with open(path, encoding="utf-8") as file:
        return file.read()


def unlisted(folder, list_folder=None, names=frozenset()):
    """The sources below `folder` that are not named, given the list that holds for the folder above."""
    own_list = os.path.join(folder, LISTS)
    if os.path.isfile(own_list):
        list_folder = folder
        names = frozenset(read(own_list).replace("(", " ").replace(")", " ").split())
    for entry in sorted(os.scandir(folder), key=lambda entry: entry.name):
        if entry.is_dir():
            yield from unlisted(entry.path, list_folder, names)
        elif entry.name.endswith(".cpp") and os.path.relpath(entry.path, list_folder) not in names:
            yield os.path.relpath(entry.path, ROOT)


def main():
    sources = [source for area in AREAS for source in unlisted(os.path.join(ROOT, area))]
    for source in sources:
        print(f"{source}: no {LISTS} names it")
    return 1 if sources else 0


if __name__ == "__main__":
    sys.exit(main())
