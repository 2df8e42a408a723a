#!/usr/bin/env python3
"""Runs the tests of both presets with ctest, and counts what passed.

usage: run_tests.py [PROGRAM | GTEST_FILTER | --fast]

The name of a program runs only that program; --fast runs the unit tests, which open no port. Anything else is a
GoogleTest filter. The last line is "N passed, N failed", with ", N skipped" if there are any. The exit status is 0
only if something ran and nothing failed.
"""

import glob
import hashlib
import json
import os
import re
import subprocess
import sys
import time
import xml.etree.ElementTree as xml

ROOT = os.path.realpath(os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", ".."))
BUILD = os.path.join(ROOT, "build")
LOGS = os.path.join(BUILD, "test-logs")
PRESETS = ("native", "release")


def environment_for(gtest_filter):
    environment = {name: value for name, value in os.environ.items() if not name.startswith("GTEST_")}
    if gtest_filter:
        environment["GTEST_FILTER"] = gtest_filter
    return environment


def programs():
    """The names of the programs; a program with shards is one."""
    names = set()
    for preset in PRESETS:
        listed = subprocess.run(
            ["ctest", "--preset", preset, "--show-only=json-v1"],
            cwd=ROOT, stdout=subprocess.PIPE, check=True,
        )
        names.update(program_of(test["name"]) for test in json.loads(listed.stdout)["tests"])
    return names


def program_of(entry):
    return re.sub(r"\.\d+$", "", entry)


def choice_of(argument):
    """The options of ctest, and the filter of GoogleTest."""
    if not argument:
        return [], ""
    if argument == "--fast":
        return ["-L", "fast"], ""
    if argument in programs():
        return ["-R", rf"^{re.escape(argument)}(\.[0-9]+)?$"], ""
    return ["-L", "gtest"], argument


def run_ctest(preset, options, gtest_filter):
    """Runs the entries; gives pairs of their names and whether they passed."""
    report = os.path.join(LOGS, f"{preset}.xml")
    subprocess.run(
        ["ctest", "--preset", preset, "--output-junit", report, *options],
        cwd=ROOT, env=environment_for(gtest_filter), stdin=subprocess.DEVNULL, check=False,
    )
    cases = xml.parse(report).getroot().iter("testcase")
    return [(case.get("name"), case.get("status") == "run") for case in cases]


def results_of(entry, has_passed):
    """What passed, failed (names) and was skipped in an entry of ctest."""
    path = os.path.join(LOGS, f"{entry}.json")
    if not os.path.exists(path):  # no program of GoogleTest, or one that crashed
        return (1, [], 0) if has_passed else (0, [entry], 0)
    with open(path, encoding="utf-8") as file:
        suites = json.load(file)["testsuites"]
    passed, failed, skipped = 0, [], 0
    for suite in suites:
        for test in suite["testsuite"]:
            if "failures" in test:
                failed.append(f"{suite['name']}.{test['name']}")
            elif test["result"] == "SKIPPED":
                skipped += 1
            elif test["status"] == "RUN":
                passed += 1
    if not has_passed and not failed:
        failed.append(f"{entry}: not its tests, but the program")
    return passed, failed, skipped


def hash_of_dll():
    """The released DLL is this file (check_release.py)."""
    with open(os.path.join(BUILD, "release", "bin", "rcvlink.dll"), "rb") as file:
        return hashlib.sha256(file.read()).hexdigest()


def in_words(passed, failed, skipped):
    return f"{passed} passed, {len(failed)} failed" + (f", {skipped} skipped" if skipped else "")


def main(arguments):
    if len(arguments) > 1 or arguments in (["-h"], ["--help"]):
        print(__doc__.strip())
        return 2
    start = time.monotonic()
    os.makedirs(LOGS, exist_ok=True)
    for old in glob.glob(os.path.join(LOGS, "*")):
        os.remove(old)
    options, gtest_filter = choice_of(arguments[0] if arguments else "")
    totals = {}
    for preset in PRESETS:
        for entry, has_passed in run_ctest(preset, options, gtest_filter):
            if entry.startswith(("wine.", "build.")) and has_passed:
                continue  # prepares for others, and tidies up
            passed, failed, skipped = results_of(entry, has_passed)
            before = totals.get(program_of(entry), (0, [], 0))
            totals[program_of(entry)] = (before[0] + passed, before[1] + failed, before[2] + skipped)

    print()
    for program, counts in totals.items():
        print(f"{program}: {in_words(*counts)}")
    passed = sum(counts[0] for counts in totals.values())
    failed = [name for counts in totals.values() for name in counts[1]]
    skipped = sum(counts[2] for counts in totals.values())
    for failure in failed:
        print(f"FAILED {failure}")
    if "host_tests" in totals:  # they load it
        print(f"rcvlink.dll that was tested: SHA-256 {hash_of_dll()}")
    print(f"after {time.monotonic() - start:.0f} s")
    print(in_words(passed, failed, skipped), flush=True)
    return 0 if passed > 0 and not failed else 1


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
