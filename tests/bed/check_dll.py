#!/usr/bin/env python3
"""Checks the built DLL: its exports (tests/data/exports.txt), the DLLs that it imports (tests/data/imports.txt),
what protects it against attacks, its version and its size."""

import os
import re
import struct
import subprocess
import sys

ROOT = os.path.realpath(os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", ".."))
DLL = os.path.join(ROOT, "build", "release", "bin", "rcvlink.dll")

# Of the PE format.
PROTECTIONS = {0x0020: "HIGH_ENTROPY_VA", 0x0040: "DYNAMIC_BASE", 0x0100: "NX_COMPAT"}
RELOCATIONS = 5  # index of the data directory
EXECUTABLE, WRITABLE = 0x20000000, 0x80000000

# The runtime loads DLLs by name (rand_s does). One that is imported is there already, so it is Windows' own; another
# name may be that of a file in the host's current folder.
DLL_NAME = re.compile(rb"(?:[\w.-]\0){1,40}\.\0[dD]\0[lL]\0[lL]\0|[\w.-]{1,40}\.[dD][lL][lL]")

MOST_BYTES = 192 * 1024  # a host's developer notices a DLL that grows


def read_list(name):
    with open(os.path.join(ROOT, "tests", "data", name), encoding="utf-8") as file:
        return set(file.read().split())


def names_for_c():
    """The names that RcvlinkLoad looks up."""
    with open(os.path.join(ROOT, "include", "rcvlink_c.h"), encoding="utf-8") as file:
        return set(re.findall(r'"(_Z\w+|\?[\w?@]+)"', file.read()))


def objdump():
    return subprocess.run(
        ["x86_64-w64-mingw32-objdump", "-p", DLL], check=True, capture_output=True, text=True
    ).stdout


def exports(text):
    """The names in the export table, which objdump lists as "[   0] name" up to an empty line."""
    table = text.partition("[Ordinal/Name Pointer] Table\n")[2].partition("\n\n")[0]
    return set(re.findall(r"^\s*\[.*\s(\S+)$", table, re.M))


def imports(text):
    return set(re.findall(r"^\s*DLL Name: (\S+)$", text, re.M))


def named_dlls(image):
    return {name.replace(b"\0", b"").decode().lower() for name in DLL_NAME.findall(image)}


def differences(what, expected, found):
    return [f"{what} {name} is missing" for name in sorted(expected - found)] + [
        f"{what} {name} is not expected" for name in sorted(found - expected)
    ]


def header_mistakes(image):
    """Flags, relocations and sections."""
    pe = struct.unpack_from("<I", image, 0x3C)[0]
    sections, optional_size = struct.unpack_from("<H12xH", image, pe + 6)
    optional = pe + 24
    flags = struct.unpack_from("<H", image, optional + 70)[0]
    mistakes = [f"{name} is not set" for bit, name in PROTECTIONS.items() if not flags & bit]
    if struct.unpack_from("<I", image, optional + 112 + 8 * RELOCATIONS + 4)[0] == 0:
        mistakes.append("there are no relocations, so the DLL cannot be moved")
    for index in range(sections):
        section = optional + optional_size + 40 * index
        name = image[section:section + 8].rstrip(b"\0").decode()
        rights = struct.unpack_from("<I", image, section + 36)[0]
        if rights & EXECUTABLE and rights & WRITABLE:
            mistakes.append(f"section {name} is writable and executable")
    return mistakes


def project_version():
    with open(os.path.join(ROOT, "CMakeLists.txt"), encoding="utf-8") as file:
        return re.search(r"project\(rcvlink VERSION ([\d.]+)", file.read())[1]


def resource_version(image, name):
    """A string of the version resource: its name and its value, both in UTF-16."""
    key = (name + "\0").encode("utf-16-le")
    start = image.find(key)
    if start < 0:
        return None
    text = image[start + len(key):start + len(key) + 80].decode("utf-16-le", errors="replace")
    return text.lstrip("\0").partition("\0")[0]


def main():
    if not os.path.exists(DLL):
        print(f"{DLL} is missing")
        return 1
    with open(DLL, "rb") as file:
        image = file.read()
    text = objdump()
    expected = read_list("exports.txt")
    mistakes = differences("export", expected, exports(text))
    mistakes += differences("name in rcvlink_c.h", expected, names_for_c())
    mistakes += differences("import", read_list("imports.txt"), imports(text))
    known = {name.lower() for name in imports(text)} | {"rcvlink.dll"}
    mistakes += [f"{name} is named, but not imported" for name in sorted(named_dlls(image) - known)]
    mistakes += header_mistakes(image)
    version = project_version()
    for name in ("FileVersion", "ProductVersion"):
        if resource_version(image, name) != version:
            mistakes.append(f"{name} is {resource_version(image, name)}, not {version}")
    if len(image) > MOST_BYTES:
        mistakes.append(f"it has {len(image)} bytes, more than {MOST_BYTES}")
    print("\n".join(mistakes) if mistakes else f"{len(expected)} exports, {len(image)} bytes, all as expected")
    return 1 if mistakes else 0


if __name__ == "__main__":
    sys.exit(main())
