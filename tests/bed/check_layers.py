#!/usr/bin/env python3
"""Refuses an #include that points up the layers of src/, or across the borders of the project.

  src/        a layer includes itself and lower ones; quorin and velmar do not see each other;
              the public header api/rcvlink.h is for all
  cli/        of src/ only the public header
  simulator/  nothing of src/, and src/ nothing of simulator/
"""

import os
import re
import sys

ROOT = os.path.realpath(os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", ".."))

# From low to high; layers of one height do not include each other.
HEIGHTS = {
    "platform": 0,
    "report": 1,
    "transport": 2,
    "commands": 3,
    "receiver": 4,
    "quorin": 5,
    "velmar": 5,
    "api": 6,
}
PUBLIC_HEADER = "src/api/rcvlink.h"
INCLUDE_FOLDERS = ["", "src", "src/api"]
INCLUDE = re.compile(r'^\s*#\s*include\s*["<]([^">]+)[">]')
SOURCE_ENDINGS = (".h", ".cpp", ".in", ".inc")


def sources(folder):
    for path, _, names in os.walk(os.path.join(ROOT, folder)):
        for name in sorted(names):
            if name.endswith(SOURCE_ENDINGS):
                yield os.path.relpath(os.path.join(path, name), ROOT)


def resolve(source, name):
    """The file of the project that is included, or None when it is none of ours."""
    for folder in [os.path.dirname(source), *INCLUDE_FOLDERS]:
        path = os.path.normpath(os.path.join(folder, name))
        if os.path.isfile(os.path.join(ROOT, path)):
            return path
    return None


def layer(path):
    return path.split("/")[1]


def refusal(source, target):
    """Why `source` may not include `target`, or None."""
    area, target_area = source.split("/")[0], target.split("/")[0]
    if target == PUBLIC_HEADER and area != "simulator":
        return None
    if area != target_area:
        return f"{area}/ does not see {target_area}/"
    if area != "src" or layer(source) == layer(target):
        return None
    if HEIGHTS[layer(target)] >= HEIGHTS[layer(source)]:
        return f"{layer(target)} is not below {layer(source)}"
    return None


def check(source):
    mistakes = []
    if source.startswith("src/") and layer(source) not in HEIGHTS:
        return [f"{source}: {layer(source)} is not one of the layers"]
    with open(os.path.join(ROOT, source), encoding="utf-8") as file:
        for number, line in enumerate(file, 1):
            include = INCLUDE.match(line)
            target = resolve(source, include.group(1)) if include else None
            reason = refusal(source, target) if target else None
            if reason:
                mistakes.append(f"{source}:{number}: includes {target}: {reason}")
    return mistakes


def main():
    files = [source for area in ("src", "cli", "simulator") for source in sources(area)]
    mistakes = [mistake for source in files for mistake in check(source)]
    print("\n".join(mistakes) if mistakes else f"{len(files)} files keep to the layers")
    return 1 if mistakes or not files else 0


if __name__ == "__main__":
    sys.exit(main())
