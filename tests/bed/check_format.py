#!/usr/bin/env python3
"""All C++ sources are as clang-format makes them. The version counts: others differ."""

import os
import subprocess
import sys

ROOT = os.path.realpath(os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", ".."))
FOLDERS = ("include", "src", "cli", "simulator", "tests", "examples", "bench")
FORMATTER = "clang-format-14"


def sources():
    for folder in FOLDERS:
        for path, _, names in os.walk(os.path.join(ROOT, folder)):
            yield from (os.path.join(path, name) for name in names if name.endswith((".h", ".hpp", ".c", ".cpp")))


def main():
    files = sorted(sources())
    return subprocess.run([FORMATTER, "--dry-run", "-Werror", *files], check=False).returncode or not files


if __name__ == "__main__":
    sys.exit(main())
