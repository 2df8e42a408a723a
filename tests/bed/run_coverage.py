#!/usr/bin/env python3
"""Counts the lines and branches of src/ and cli/ that tests run, in the build of the preset coverage.

usage: run_coverage.py [unit]

Runs the unit tests, then those of the DLL and of the program as well; with "unit" only the first. Prints after each
a line for each folder, and for each file that is not run whole; under it the numbers of the lines that are not run.
The exit status is 0 only if the tests passed and the goals are reached: by the unit tests alone those of src/, and by
all tests those of cli/ as well.

A branch is a way out of a condition. What the compiler adds for exceptions that leave a call is not counted.
"""

import collections
import glob
import json
import os
import subprocess
import sys

import run_program

ROOT = run_program.ROOT
COVERAGE = os.path.join(run_program.BUILD, "coverage")
LINES = os.path.join(COVERAGE, "lines.json")
UNIT_TESTS = ("unit_tests", "cli_unit_tests")
OTHER_TESTS = "^(host_tests|usb_tests|cli_tests)"
UNIT_TEST_SECONDS = 600
# Percent of lines and of branches.
UNIT_GOALS = {"src": (99.0, 95.0)}
GOALS = UNIT_GOALS | {"cli": (90.0, 0.0)}

Count = collections.namedtuple("Count", "lines run_lines branches run_branches")


def run_unit_tests():
    statuses = [
        run_program.run(f"coverage-{name}", "wine", UNIT_TEST_SECONDS, [os.path.join(COVERAGE, "bin", f"{name}.exe")])
        for name in UNIT_TESTS
    ]
    return not any(statuses)


def run_other_tests():
    """They need ports, which ctest shares out."""
    environment = dict(os.environ, RCVLINK_PRESET="coverage")
    return subprocess.run(["ctest", "--preset", "coverage", "-R", OTHER_TESTS], cwd=ROOT, env=environment,
                          check=False).returncode == 0


def counts():
    """By file, what has been run so far, and the numbers of the lines that have not."""
    summary = subprocess.run(
        ["gcovr", "--root", ROOT, "--gcov-executable", "x86_64-w64-mingw32-gcov-posix",
         "--exclude-throw-branches", "--exclude-unreachable-branches",
         "--filter", "src/", "--filter", "cli/", "--json", LINES, "--json-summary", "-", COVERAGE],
        cwd=ROOT, stdout=subprocess.PIPE, check=True,
    )
    with open(LINES, encoding="utf-8") as file:
        left_out = {entry["file"]: lines_left_out(entry["lines"]) for entry in json.load(file)["files"]}
    files = {
        file["filename"]: Count(file["line_total"], file["line_covered"], file["branch_total"], file["branch_covered"])
        for file in json.loads(summary.stdout)["files"]
    }
    return files, left_out


def lines_left_out(lines):
    """A line of a template or an inline function has an entry for each of its copies."""
    run = {line["line_number"] for line in lines if line["count"] > 0}
    return sorted({line["line_number"] for line in lines if not line["gcovr/noncode"]} - run)


def total_of(files, prefix):
    chosen = [count for name, count in files.items() if name.startswith(prefix)]
    return Count(*(sum(column) for column in zip(*chosen)))


def percent(part, whole):
    return 100.0 * part / whole if whole else 100.0


def show(name, count):
    print(f"{name:40} {count.run_lines:5} of {count.lines:5} lines {percent(count.run_lines, count.lines):5.1f} %"
          f"  {count.run_branches:5} of {count.branches:5} branches"
          f" {percent(count.run_branches, count.branches):5.1f} %")


def report(tests):
    """Prints the figures; gives them by file."""
    files, left_out = counts()
    print(f"\nwith {tests}:")
    for name, count in sorted(files.items()):
        if count.run_lines < count.lines or count.run_branches < count.branches:
            show(name, count)
            if left_out[name]:
                print("    not run:", *left_out[name])
    print()
    for folder in sorted({os.path.dirname(name) for name in files} | set(GOALS)):
        show(folder + "/", total_of(files, folder + "/"))
    return files


def reaches_goals(files, goals):
    reached = True
    for folder, (lines, branches) in goals.items():
        count = total_of(files, folder + "/")
        if percent(count.run_lines, count.lines) < lines or percent(count.run_branches, count.branches) < branches:
            print(f"BELOW THE GOAL: {folder}/ has a goal of {lines} % of lines and {branches} % of branches")
            reached = False
    return reached


def main(arguments):
    if arguments not in ([], ["unit"]):
        print(__doc__.strip())
        return 2
    for old in glob.glob(os.path.join(COVERAGE, "**", "*.gcda"), recursive=True):
        os.remove(old)
    passed = run_unit_tests()
    passed = reaches_goals(report("the unit tests"), UNIT_GOALS) and passed
    if not arguments:
        passed = run_other_tests() and passed
        passed = reaches_goals(report("all tests"), GOALS) and passed
    return 0 if passed else 1


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
