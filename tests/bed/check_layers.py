#!/usr/bin/env python3
"""Refuses an #include of a higher layer, or of a part of the project that must not be seen.

What each part may include:
  include/    nothing of the project
  src/        include/
  cli/        include/, but nothing of src/
  simulator/  nothing of the other parts; no other part includes it

In src/ and simulator/ a folder is a layer. It may include itself and lower layers, but no other layer
of the same height, so families do not include each other.
"""

import os
import re
import sys

ROOT = os.path.realpath(os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", ".."))

HEIGHTS = {
    "src/platform": 0,
    "src/report": 1,
    "src/transport": 2,
    "src/commands": 3,
    "src/receiver": 4,
    "src/api": 6,
    "simulator": 0,
    "simulator/usb/driver": 0,
    "simulator/usb": 1,
    "simulator/ports": 2,
    "simulator/program": 3,
}
# A folder with such a file belongs to a family.
FAMILY_HEIGHTS = {"src/{0}/{0}_protocol.h": 5, "simulator/{0}/receiver.h": 1}
LAYERED_AREAS = ("src", "simulator")
SEEN_BY = {"include": ("src", "cli")}
INCLUDE_FOLDERS = ["", "src", "include"]
INCLUDE = re.compile(r'^\s*#\s*include\s*["<]([^">]+)[">]')
SOURCE_ENDINGS = (".h", ".hpp", ".cpp", ".in", ".inc")


def sources(folder):
    for path, _, names in os.walk(os.path.join(ROOT, folder)):
        for name in sorted(names):
            if name.endswith(SOURCE_ENDINGS):
                yield os.path.relpath(os.path.join(path, name), ROOT)


def resolve(source, name):
    """The included file of the project, or None for a file from elsewhere."""
    for folder in [os.path.dirname(source), *INCLUDE_FOLDERS]:
        path = os.path.normpath(os.path.join(folder, name))
        if os.path.isfile(os.path.join(ROOT, path)):
            return path
    return None


def area_of(path):
    return path.split("/")[0]


def height(layer):
    """None for a folder that is not a layer."""
    for pattern, family_height in FAMILY_HEIGHTS.items():
        marker = pattern.format(os.path.basename(layer))
        if os.path.dirname(marker) == layer and os.path.isfile(os.path.join(ROOT, marker)):
            return family_height
    return HEIGHTS.get(layer)


def refusal(source, target):
    """Why `source` may not include `target`, or None."""
    area, target_area = area_of(source), area_of(target)
    if area in SEEN_BY.get(target_area, ()):
        return None
    if area != target_area:
        return f"{area}/ must not include {target_area}/"
    layer, target_layer = os.path.dirname(source), os.path.dirname(target)
    if area not in LAYERED_AREAS or layer == target_layer:
        return None
    if height(target_layer) is None:
        return f"{target_layer}/ is not one of the layers"
    if height(target_layer) >= height(layer):
        return f"{target_layer}/ is not below {layer}/"
    return None


def check(source):
    mistakes = []
    layer = os.path.dirname(source)
    if area_of(source) in LAYERED_AREAS and height(layer) is None:
        return [f"{source}: {layer}/ is not one of the layers"]
    with open(os.path.join(ROOT, source), encoding="utf-8") as file:
        for number, line in enumerate(file, 1):
            include = INCLUDE.match(line)
            target = resolve(source, include.group(1)) if include else None
            reason = refusal(source, target) if target else None
            if reason:
                mistakes.append(f"{source}:{number}: includes {target}: {reason}")
    return mistakes


def main():
    files = [source for area in ("include", "src", "cli", "simulator") for source in sources(area)]
    mistakes = [mistake for source in files for mistake in check(source)]
    print("\n".join(mistakes) if mistakes else f"{len(files)} files respect the layers")
    return 1 if mistakes or not files else 0


if __name__ == "__main__":
    sys.exit(main())
