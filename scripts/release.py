#!/usr/bin/env python3
"""Makes the release of a build: two zip files and their checksums.

usage: release.py ROOT

ROOT is the folder of the sources, where the preset `release` is built. ROOT/build/kit becomes a folder with

  rcvlink-VERSION-win64.zip          what a developer of a host needs
  rcvlink-VERSION-win64-symbols.zip  the symbols of its programs, for a debugger
  SHA256SUMS                         of both

Equal builds give equal bytes: names are sorted, and each file has the same date.
"""

import hashlib
import json
import os
import re
import shutil
import subprocess
import sys
import zipfile

# The zip format has no date before this one. A build's own date would make two releases differ.
DATE = (1980, 1, 1, 0, 0, 0)

# What is linked into the programs: Debian's package, its name, its licence, and into what. NOTICE has the same.
LINKED = (
    ("libcli11-dev", "CLI11", "BSD-3-Clause", "rcvlink-cli.exe, rcvlink-sim.exe"),
    ("nlohmann-json3-dev", "JSON for Modern C++", "MIT", "rcvlink-cli.exe, rcvlink-sim.exe"),
    ("g++-mingw-w64-x86-64-posix", "libstdc++ and libgcc", "GPL-3.0-or-later WITH GCC-exception-3.1", "all programs"),
    ("mingw-w64-x86-64-dev", "mingw-w64 runtime and winpthreads", "ZPL-2.1", "all programs"),
)


def sha256(path):
    with open(path, "rb") as file:
        return hashlib.sha256(file.read()).hexdigest()


def files_of(folder):
    """The files below a folder, by name, with "/" between folders."""
    found = []
    for parent, _, names in os.walk(folder):
        found += [os.path.relpath(os.path.join(parent, name), folder).replace(os.sep, "/") for name in names]
    return sorted(found)


def write_sums(folder, names):
    with open(os.path.join(folder, "SHA256SUMS"), "w", encoding="ascii") as file:
        file.writelines(f"{sha256(os.path.join(folder, name))}  {name}\n" for name in names)


def write_zip(folder, path):
    """Packs a folder, which is also the top folder in the zip file."""
    top = os.path.basename(folder)
    with zipfile.ZipFile(path, "w", zipfile.ZIP_DEFLATED) as archive:
        for name in files_of(folder):
            entry = zipfile.ZipInfo(f"{top}/{name}", DATE)
            entry.compress_type = zipfile.ZIP_DEFLATED
            entry.create_system = 0  # MS-DOS, as for files without rights of Unix
            with open(os.path.join(folder, name), "rb") as file:
                archive.writestr(entry, file.read())


def version_of_package(name):
    return subprocess.run(
        ["dpkg-query", "-W", "-f", "${Version}", name], check=True, capture_output=True, text=True
    ).stdout


def bill_of_materials(version, stage):
    """In CycloneDX's form. It has no time and no serial number, which it need not have."""
    linked = []
    for package, name, licence, where in LINKED:
        package_version = version_of_package(package)
        linked.append({
            "type": "library",
            "name": name,
            "version": package_version,
            "description": f"linked into {where}",
            "licenses": [{"expression": licence}],
            "purl": f"pkg:deb/debian/{package}@{package_version}",
        })
    programs = [
        {
            "type": "file",
            "name": name,
            "version": version,
            "hashes": [{"alg": "SHA-256", "content": sha256(os.path.join(stage, name))}],
            "licenses": [{"license": {"id": "MIT"}}],
        }
        for name in files_of(stage)
        if name.startswith(("bin/", "lib/"))
    ]
    return {
        "bomFormat": "CycloneDX",
        "specVersion": "1.4",
        "version": 1,
        "metadata": {"component": {"type": "library", "name": "rcvlink", "version": version}},
        "components": programs + linked,
    }


def install(build, stage, *options):
    subprocess.run(
        ["cmake", "--install", build, "--prefix", stage, *options], check=True, stdout=subprocess.DEVNULL
    )


def version_of_build(build):
    with open(os.path.join(build, "CMakeCache.txt"), encoding="utf-8") as file:
        return re.search(r"^CMAKE_PROJECT_VERSION:STATIC=(.+)$", file.read(), re.M)[1]


def make_release(root):
    build = os.path.join(root, "build", "release")
    output = os.path.join(root, "build", "kit")
    version = version_of_build(build)
    name = f"rcvlink-{version}-win64"
    shutil.rmtree(output, ignore_errors=True)

    stage = os.path.join(output, name)
    install(build, stage)
    reference = os.path.join(root, "build", "kit-reference")
    shutil.rmtree(reference, ignore_errors=True)  # Doxygen leaves pages of an earlier run
    subprocess.run(["doxygen", "kit/Doxyfile"], cwd=root, check=True)
    shutil.copytree(reference, os.path.join(stage, "share/doc/rcvlink/reference"))
    for source in ("kit/README.md", "CHANGELOG.md", "LICENSE", "NOTICE"):
        shutil.copy(os.path.join(root, source), stage)
    with open(os.path.join(stage, "bom.json"), "w", encoding="utf-8") as file:
        json.dump(bill_of_materials(version, stage), file, indent=2)
        file.write("\n")
    write_sums(stage, files_of(stage))
    write_zip(stage, f"{stage}.zip")

    symbols = os.path.join(output, f"{name}-symbols")
    install(build, symbols, "--component", "symbols")
    write_zip(symbols, f"{symbols}.zip")

    for folder in (stage, symbols):
        shutil.rmtree(folder)
    write_sums(output, files_of(output))


def main(arguments):
    if len(arguments) != 1:
        print(__doc__.strip())
        return 2
    make_release(os.path.abspath(arguments[0]))
    return 0


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
