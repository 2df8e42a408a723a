#!/usr/bin/env python3
"""Makes the release of the tested build, and once more from a copy of the sources in another folder, which is
compiled again. Both have to be equal byte for byte. Also checks what the zip file has in it."""

import hashlib
import os
import re
import shutil
import subprocess
import sys
import zipfile

ROOT = os.path.realpath(os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", ".."))
COPY = os.path.join(ROOT, "build", "release-again", "in-a-folder-of-another-name")
INSTALLED = ("rcvlink", "rcvlink_msvc_library", "rcvlink-cli", "rcvlink-sim")  # the targets
NEEDED = (
    "README.md", "CHANGELOG.md", "LICENSE", "NOTICE", "SHA256SUMS", "bom.json",
    "bin/rcvlink.dll", "bin/rcvlink-cli.exe",
    "bin/rcvlink-sim.exe", "include/rcvlink.h", "include/rcvlink.hpp", "include/rcvlink_c.h",
    "share/rcvlink/csharp/Rcvlink.cs", "share/doc/rcvlink/examples/download.cpp",
    "lib/librcvlink.dll.a", "lib/rcvlink.lib",
    "lib/cmake/rcvlink/rcvlink-config.cmake", "lib/pkgconfig/rcvlink.pc",
    "share/doc/rcvlink/reference/index.html", "share/doc/rcvlink/docs/known-behaviour.md",
)
SYMBOLS = ("bin/rcvlink.dll.debug", "bin/rcvlink-cli.exe.debug", "bin/rcvlink-sim.exe.debug")
LINK = re.compile(r"\]\(([^)#:]+)(?:#[^)]*)?\)")


def run(folder, *command):
    # Tests that wait for a port run at the same time, and must not wait for the compiler.
    environment = dict(os.environ, CCACHE_DISABLE="1")
    result = subprocess.run(
        ["nice", "-n", "19", *command], cwd=folder, env=environment, check=False,
        stdin=subprocess.DEVNULL, stdout=subprocess.PIPE, stderr=subprocess.STDOUT, text=True,
    )
    if result.returncode != 0:
        print(result.stdout[-4000:])
        raise SystemExit(f"failed: {' '.join(command)}")


def build_again():
    shutil.rmtree(COPY, ignore_errors=True)
    shutil.copytree(ROOT, COPY, ignore=shutil.ignore_patterns("build", ".git", "__pycache__"))
    run(COPY, "cmake", "--preset", "release", "-DBUILD_TESTING=OFF")
    run(COPY, "cmake", "--build", "--preset", "release", "-j", str(os.cpu_count()), "--target", *INSTALLED)


def release_of(root):
    """The files of a release by name: their bytes."""
    run(root, sys.executable, "-B", os.path.join(root, "scripts", "release.py"), root)
    folder = os.path.join(root, "build", "kit")
    files = {}
    for name in sorted(os.listdir(folder)):
        with open(os.path.join(folder, name), "rb") as file:
            files[name] = file.read()
    return files


def contents_of(name):
    """The files in a zip file of the tested build, without the folder that they are in."""
    with zipfile.ZipFile(os.path.join(ROOT, "build", "kit", name)) as archive:
        return {entry.partition("/")[2]: archive.read(entry) for entry in archive.namelist()}


def difference(one, other):
    """Where two zip files of the same name differ."""
    names = sorted(set(one) | set(other))
    return ", ".join(name for name in names if one.get(name) != other.get(name))


def sum_mistakes(contents):
    lines = contents["SHA256SUMS"].decode().splitlines()
    sums = {name: digest for digest, name in (line.split("  ") for line in lines)}
    expected = {name: hashlib.sha256(data).hexdigest() for name, data in contents.items() if name != "SHA256SUMS"}
    return [] if sums == expected else ["SHA256SUMS is wrong"]


def link_mistakes(contents):
    """Links of the documents to files that are not there."""
    mistakes = []
    for name, data in contents.items():
        if not name.endswith(".md"):
            continue
        for link in LINK.findall(data.decode()):
            target = os.path.normpath(os.path.join(os.path.dirname(name), link))
            if target not in contents and not any(other.startswith(f"{target}/") for other in contents):
                mistakes.append(f"{name}: no {link}")
    return mistakes


def main():
    tested = release_of(ROOT)
    build_again()
    again = release_of(COPY)

    mistakes = [f"{name} is not the same when built again" for name in tested if again.get(name) != tested[name]]
    name = next(name for name in tested if name.endswith("-win64.zip"))
    contents = contents_of(name)
    mistakes += [f"{needed} is missing" for needed in NEEDED if needed not in contents]
    symbols = contents_of(name.replace("-win64", "-win64-symbols"))
    mistakes += [f"{needed} is missing" for needed in SYMBOLS if needed not in symbols]
    if not mistakes:
        mistakes += sum_mistakes(contents) + link_mistakes(contents)
    with open(os.path.join(ROOT, "build", "release", "bin", "rcvlink.dll"), "rb") as file:
        if file.read() != contents.get("bin/rcvlink.dll"):
            mistakes.append("bin/rcvlink.dll is not the one that is tested")
    print("\n".join(mistakes) if mistakes else f"{len(contents)} files, equal when built again")
    return 1 if mistakes else 0


if __name__ == "__main__":
    sys.exit(main())
