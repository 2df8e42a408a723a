#!/usr/bin/env python3
"""Refuses what would stay in the host process after the DLL is unloaded.

The C++ runtime needs a guard for a static local that is not constant-initialised, and a TLS key for a
thread_local variable; it frees neither when the DLL is unloaded. This script looks for both in the
object files of the library, and for TlsAlloc in the DLL, which only the runtime would call.
"""

import os
import re
import subprocess
import sys

ROOT = os.path.realpath(os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", ".."))
OBJECTS = "build/release/src/CMakeFiles"
DLL = "build/release/bin/rcvlink.dll"

REFUSED_SYMBOLS = {
    r"_ZGV": "is the guard of a static local",
    r"__cxa_guard_": "guards a static local",
    r"__emutls_": "is of a thread_local variable",
    r"__cxa_thread_atexit": "is of a thread_local variable",
}
REFUSED_IMPORTS = ["TlsAlloc"]


def run(*command):
    return subprocess.run(command, check=True, capture_output=True, text=True).stdout


def object_files():
    for path, _, names in os.walk(os.path.join(ROOT, OBJECTS)):
        for name in sorted(names):
            if name.endswith(".obj"):
                yield os.path.relpath(os.path.join(path, name), os.path.join(ROOT, OBJECTS))


def mistakes_of_object(name):
    symbols = run("x86_64-w64-mingw32-nm", "--format=just-symbols", os.path.join(ROOT, OBJECTS, name))
    return [
        f"{name}: {symbol} {reason}"
        for symbol in symbols.split()
        for pattern, reason in REFUSED_SYMBOLS.items()
        if re.match(pattern, symbol)
    ]


def mistakes_of_dll():
    text = run("x86_64-w64-mingw32-objdump", "-p", os.path.join(ROOT, DLL))
    imports = re.findall(r"^\s+[0-9a-f]+\s+\d+\s+(\w+)$", text, re.M)
    if not imports:
        return [f"{DLL}: no imports found"]
    return [f"{DLL}: imports {name}" for name in REFUSED_IMPORTS if name in imports]


def main():
    if not os.path.exists(os.path.join(ROOT, DLL)):
        print(f"{DLL} is missing")
        return 1
    objects = list(object_files())
    mistakes = [mistake for name in objects for mistake in mistakes_of_object(name)]
    mistakes += mistakes_of_dll()
    print("\n".join(mistakes) if mistakes else f"{len(objects)} object files without guards")
    return 1 if mistakes or not objects else 0


if __name__ == "__main__":
    sys.exit(main())
