#!/usr/bin/env python3
"""Runs the tests of races and of long use again and again, with a new seed each round.

usage: run_soak.py MINUTES [SEED]

A round is every step once. No step begins after MINUTES, but the first round is always whole; a failure ends the
run. SEED is that of the first round, the next ones have the numbers after it. The last line is the summary, and the
exit status is 0 only if nothing failed.
"""

import os
import random
import re
import sys
import time

import run_program

WINDOWS = os.path.join("build", "release", "bin")
SANITIZED = os.path.join(run_program.BUILD, "sanitize", "bin", "sanitized_tests.exe.so")
RACES = "*Races.*:ManyReceivers.*"
STEP_SECONDS = 1800
# Name, kind and program, the filter, and how many times as long as in a usual run: 10,000 moments that meet each
# operation, 10,200 cycles of a receiver, 10,800 of loading (on one thread, and as many on new ones).
STEPS = (
    ("races, sanitized", "sanitized", SANITIZED, RACES, 9),
    ("races", "wine", f"{WINDOWS}/unit_tests.exe", RACES, 9),
    ("long use", "wine", f"{WINDOWS}/unit_tests.exe", "*LongUse.*", 17),
    ("loading", "bed", f"{WINDOWS}/host_tests.exe", "ApiUnload.LeavesNothingOfManyTimes", 9),
)


def run_step(name, kind, program, gtest_filter, times, seed):
    """Whether it passed. Its log is printed when it has not."""
    os.environ.update(GTEST_FILTER=gtest_filter, RCVLINK_SEED=str(seed), RCVLINK_TIMES=str(times))
    start = time.monotonic()
    log = "soak-" + re.sub(r"\W+", "-", name)
    passed = run_program.run(log, kind, STEP_SECONDS, [program]) == 0
    print(f"seed {seed}: {name}: {'ok' if passed else 'FAILED'} after {time.monotonic() - start:.0f} s", flush=True)
    return passed


def main(arguments):
    if len(arguments) not in (1, 2) or not all(argument.isdigit() for argument in arguments):
        print(__doc__.strip())
        return 2
    start = time.monotonic()
    end = start + 60 * int(arguments[0])
    first = int(arguments[1]) if len(arguments) == 2 else random.randrange(1_000_000)
    passed = failed = 0
    seed = first
    while not failed and (seed == first or time.monotonic() < end):
        for step in STEPS:
            if seed != first and time.monotonic() >= end:
                break
            if run_step(*step, seed):
                passed += 1
            else:
                failed += 1
        seed += 1
    minutes = (time.monotonic() - start) / 60
    print(f"soak: seeds {first} to {seed - 1}, {minutes:.1f} minutes, {passed} steps passed, {failed} failed")
    return 1 if failed else 0


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
