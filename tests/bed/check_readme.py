#!/usr/bin/env python3
"""Checks that the host program in README.md is the compiled one, examples/download.cpp."""

import os
import sys

ROOT = os.path.realpath(os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", ".."))


def read(path):
    with open(os.path.join(ROOT, path), encoding="utf-8") as file:
        return file.read()


def main():
    example = read("examples/download.cpp")
    if f"```cpp\n{example}```\n" not in read("README.md"):
        print("The host program in README.md differs from examples/download.cpp")
        return 1
    return 0


if __name__ == "__main__":
    sys.exit(main())
