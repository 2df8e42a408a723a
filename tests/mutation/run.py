#!/usr/bin/env python3
"""Makes small mistakes in src/, one at a time, and asks whether a test notices.

usage: run.py [--sample N] [--seed N] [--again OUTCOME] [--only TEXT] [--table]

All places where a mistake can be made are listed (places.py), put into an order by the seed (1), and the first N (200)
are tried. The sources are copied to build/mutation, which has builds and a Wine prefix of its own. Results are kept in
build/mutation/results.json, so a run that was stopped goes on where it was; one of another seed uses them too. A
result counts as long as its source is the same.

  --again survived   tries these once more, after tests were added; not those of judged.txt
  --only TEXT        only mistakes with this text in their line of the table
  --table            prints the table of what is known and tries nothing

A mistake is killed when a unit test fails or does not end in time: those of its own folder first, then all, then the
slow ones. How long they may take is measured first, without a mistake. judged.txt lists survivors that no test can or
need see, with the reason.
"""

import argparse
import collections
import glob
import hashlib
import json
import os
import random
import re
import shutil
import signal
import subprocess
import sys
import time

import places

ROOT = os.path.realpath(os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", ".."))
WORK = os.path.join(ROOT, "build", "mutation")
BUILD = os.path.join(WORK, "build", "release")
RESULTS = os.path.join(WORK, "results.json")
TABLE = os.path.join(WORK, "table.md")
JUDGED = os.path.join(ROOT, "tests", "mutation", "judged.txt")
# What only the DLL has.
LEFT_OUT = ("src/api/cxx_runtime.cpp",)
SLOW = "*Noise*:*Torture*:MemoryUse.*:*Races*:ManyReceivers.*:*LongUse*"
BUILD_SECONDS = 600
STAGES = ("own", "all", "slow")
# A stage that takes so many times what it takes without a mistake does not end.
PATIENCE = 4
LONGEST_STAGE = 1200


def log(text):
    print(time.strftime("%H:%M:%S"), text, flush=True)


def read(path):
    with open(path, encoding="utf-8") as file:
        return file.read()


def write(path, text):
    with open(path, "w", encoding="utf-8") as file:
        file.write(text)


def environment():
    values = {name: value for name, value in os.environ.items() if not name.startswith("GTEST_")}
    values.pop("DISPLAY", None)
    values.update(
        WINEPREFIX=os.path.join(WORK, "build", "wine"),
        WINEDEBUG="-all",
        WINEDLLOVERRIDES="winemenubuilder.exe,mscoree,mshtml=",
        CCACHE_SLOPPINESS="pch_defines,time_macros",
    )
    if shutil.which("ccache"):
        values["CMAKE_CXX_COMPILER_LAUNCHER"] = "ccache"
    return values


def run(command, seconds, output=subprocess.DEVNULL):
    """The exit status, or None after the time limit."""
    process = subprocess.Popen(command, cwd=WORK, env=environment(), stdin=subprocess.DEVNULL, stdout=output,
                               stderr=subprocess.STDOUT, start_new_session=True)
    try:
        return process.wait(seconds)
    except subprocess.TimeoutExpired:
        return None
    finally:
        if process.poll() is None:
            os.killpg(process.pid, signal.SIGKILL)
            process.wait()


def copy_sources():
    """Makes the copy equal to the sources. A file that is equal keeps its time, so it is not compiled again. A file
    that is gone is removed: CMake would still find it."""
    listed = subprocess.run(["git", "ls-files", "-co", "--exclude-standard"], cwd=ROOT, stdout=subprocess.PIPE,
                            check=True, text=True).stdout.splitlines()
    for name in listed:
        source, copy = os.path.join(ROOT, name), os.path.join(WORK, name)
        if not os.path.isfile(source):
            continue
        with open(source, "rb") as file:
            content = file.read()
        if os.path.exists(copy):
            with open(copy, "rb") as file:
                if file.read() == content:
                    continue
        os.makedirs(os.path.dirname(copy), exist_ok=True)
        shutil.copyfile(source, copy)
        shutil.copymode(source, copy)
    for top in {name.split("/")[0] for name in listed if "/" in name}:
        for folder, _, names in os.walk(os.path.join(WORK, top)):
            for path in (os.path.join(folder, name) for name in names):
                if not os.path.isfile(os.path.join(ROOT, os.path.relpath(path, WORK))):
                    os.remove(path)


def build(*targets):
    with open(os.path.join(WORK, "build.log"), "ab") as output:
        return run(["cmake", "--build", BUILD, "-j", "1", "--target", *targets], BUILD_SECONDS * 3, output) == 0


def prepare():
    copy_sources()
    configured = run(["cmake", "--preset", "release", "-DBUILD_TESTING=ON",
                      f"-DCMAKE_PROJECT_INCLUDE={os.path.join(ROOT, 'tests', 'mutation', 'build.cmake')}"], 120)
    if configured != 0 or not build("unit_tests"):
        sys.exit("the sources do not build: see build/mutation/build.log")
    if run([os.path.join(WORK, "scripts", "prefix.sh")], 120) != 0:
        sys.exit("no Wine prefix")
    run(["wineserver", "-p"], 60)
    run(["wine", "cmd", "/c", "exit"], 60)


def suites_of(folder):
    """A filter for the suites of the tests of a folder, without the slow ones."""
    names = set()
    for path in glob.glob(os.path.join(ROOT, "tests", folder, "*_test.cpp")):
        names.update(re.findall(r"^TEST(?:_F|_P)?\((\w+),", read(path), re.M))
    return ":".join(f"{name}.*:*/{name}.*" for name in sorted(names))


def filter_of(stage, folder):
    if stage == "own":
        return f"{suites_of(folder)}-{SLOW}"
    return SLOW if stage == "slow" else f"*-{SLOW}"


def first_failure(text):
    failed = re.search(r"^\[  FAILED  \] ([\w/]+\.[\w/]+)", text, re.M)
    return failed[1] if failed else "the program"


def run_stage(gtest_filter, seconds):
    """What noticed the mistake, or an empty text."""
    path = os.path.join(WORK, "run.log")
    with open(path, "wb") as output:
        status = run(["wine", os.path.join(BUILD, "bin", "unit_tests.exe"), "--gtest_brief=1", "--gtest_fail_fast",
                      f"--gtest_filter={gtest_filter}"], seconds, output)
    with open(path, encoding="utf-8", errors="replace") as file:
        text = file.read()
    if status is None:
        return "time limit"
    # A crash at the end of a program leaves Wine's exit status at 0.
    if status != 0 or re.search(r"^wine: Unhandled", text, re.M) or "[  PASSED  ]" not in text:
        return first_failure(text)
    return ""


def seconds_of_stages():
    """What each stage may take. Without a mistake every test must pass."""
    seconds = {}
    for stage in ("all", "slow"):
        start = time.monotonic()
        noticed = run_stage(filter_of(stage, ""), LONGEST_STAGE)
        if noticed:
            sys.exit(f"without a mistake these tests fail: {noticed}; see build/mutation/run.log")
        seconds[stage] = PATIENCE * (time.monotonic() - start)
        log(f"{stage}: up to {seconds[stage]:.0f} s")
    return seconds | {"own": seconds["all"]}


def try_mistake(place, seconds):
    """Gives the outcome, the stage, and what noticed it."""
    path = os.path.join(WORK, place.path)
    source = read(path)
    write(path, source[:place.start] + place.new + source[place.end:])
    try:
        if not build("unit_tests"):
            return "not compiled", "", ""
        for stage in STAGES:
            noticed = run_stage(filter_of(stage, place.path.split("/")[1]), seconds[stage])
            if noticed:
                return "killed", stage, noticed
        return "survived", "", ""
    finally:
        write(path, source)


def all_places():
    found = []
    for path in sorted(glob.glob(os.path.join(ROOT, "src", "*", "*.cpp")) +
                       glob.glob(os.path.join(ROOT, "src", "*", "*.h"))):
        name = os.path.relpath(path, ROOT)
        if name not in LEFT_OUT:
            found += places.places_of(name, read(path))
    return found


def key_of(place):
    """A result is that of the source as it was."""
    digest = hashlib.sha256(read(os.path.join(ROOT, place.path)).encode()).hexdigest()
    return f"{place.key} [{digest[:12]}]"


def judged():
    """Lines `path | line of the source | mistake | reason`."""
    reasons = {}
    if os.path.exists(JUDGED):
        for line in read(JUDGED).splitlines():
            if line and not line.startswith("#"):
                path, rest = line.split(" | ", 1)
                text, mistake, reason = rest.rsplit(" | ", 2)
                reasons[path, text, mistake] = reason
    return reasons


def table(sample, results):
    reasons = judged()
    counts, by_operator, survivors = collections.Counter(), {}, []
    for place in sample:
        outcome, stage, noticed = results.get(key_of(place), ("not tried", "", ""))
        reason = reasons.get((place.path, place.line_text, place.shown))
        if outcome == "survived" and reason:
            outcome = "judged"
        counts[outcome] += 1
        by_operator.setdefault(place.operator, collections.Counter())[outcome] += 1
        if outcome in ("survived", "judged"):
            cells = (f"`{place.path}:{place.line}`", f"`{place.line_text}`", f"`{place.shown}`", reason or "")
            survivors.append("| " + " | ".join(cell.replace("|", "\\|") for cell in cells) + " |")
    outcomes = ("killed", "survived", "judged", "not compiled", "not tried")
    lines = ["| Mistake | " + " | ".join(outcomes) + " |", "|---" * (len(outcomes) + 1) + "|"]
    for operator, own in sorted(by_operator.items()):
        lines.append(f"| {operator} | " + " | ".join(str(own[outcome]) for outcome in outcomes) + " |")
    lines.append("| all | " + " | ".join(str(counts[outcome]) for outcome in outcomes) + " |")
    seen = counts["killed"] + counts["survived"]
    if seen:
        lines.append(f"\nKilled: {100 * counts['killed'] / seen:.1f} % of the {seen} that compiled and are not judged, "
                     f"{100 * counts['killed'] / (seen + counts['judged']):.1f} % of all that compiled.")
    lines += ["", "| Survivor | Line | Mistake | Reason |", "|---|---|---|---|", *survivors]
    return "\n".join(lines) + "\n"


def main():
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--sample", type=int, default=200)
    parser.add_argument("--seed", type=int, default=1)
    parser.add_argument("--again", default="")
    parser.add_argument("--only", default="")
    parser.add_argument("--table", action="store_true")
    choice = parser.parse_args()

    os.makedirs(WORK, exist_ok=True)
    results = json.loads(read(RESULTS)) if os.path.exists(RESULTS) else {}
    order = all_places()
    random.Random(choice.seed).shuffle(order)
    sample = order[:choice.sample]
    if not choice.table:
        signal.signal(signal.SIGTERM, lambda received, frame: sys.exit(128 + received))
        prepare()
        seconds = seconds_of_stages()
        # A header is compiled into many sources, so what is in one comes last.
        for number, place in sorted(enumerate(sample, 1), key=lambda numbered: numbered[1].path.endswith(".h")):
            key = key_of(place)
            known = results.get(key)
            wanted = known is None or known[0] == choice.again
            is_judged = (place.path, place.line_text, place.shown) in judged()
            if not wanted or (known and is_judged) or choice.only not in key:
                continue
            start = time.monotonic()
            results[key] = try_mistake(place, seconds)
            write(RESULTS, json.dumps(results, indent=1))
            log(f"{number}/{len(sample)} {' '.join(results[key])} "
                f"({time.monotonic() - start:.0f} s) {key}")
        run(["wineserver", "-k"], 60)
    known_places = {(place.path, place.line_text, place.shown) for place in order}
    for path, line_text, _ in sorted(judged().keys() - known_places):
        log(f"judged.txt has a line that is in no source: {path} | {line_text}")
    text = table(sample, results)
    write(TABLE, text)
    print(text, end="")


if __name__ == "__main__":
    main()
