#!/usr/bin/env python3
"""Runs the fuzz targets from their committed corpus.

usage: run_fuzz.py [SECONDS] [TARGET]

First the committed corpus alone must reach the edges of LEAST_EDGES. Then all targets together run SECONDS (60), one
on each processor at a time. An input that fails is kept in build/test-logs. The results are in
build/test-logs/fuzz.json, in the form of GoogleTest.
"""

import concurrent.futures
import glob
import json
import os
import re
import subprocess
import sys

import run_program

ROOT = run_program.ROOT
FUZZ = os.path.join(ROOT, "tests", "fuzz")
PROGRAMS = os.path.join(run_program.BUILD, "sanitize", "bin")
# Beside its fuzzing a target starts, and reads its corpus.
START_SECONDS = 60
# About 95 % of the edges that the committed corpus reaches. Fewer mean that an input ends at an early command, for
# example because the library now sends another one.
LEAST_EDGES = {
    "cli_names": 1310,
    "quorin_download_serial": 930,
    "quorin_download_usb": 880,
    "quorin_file_list": 745,
    "quorin_parsers": 155,
    "quorin_reply": 745,
    "report_text": 1600,
    "simulator_faults": 230,
    "simulator_script": 1290,
    "usb_descriptors": 35,
    "usb_open": 715,
    "velmar_download": 995,
    "velmar_file_list": 735,
    "velmar_logs": 305,
    "velmar_reply": 850,
}


def targets():
    sources = sorted(glob.glob(os.path.join(FUZZ, "*.cpp")))
    return [name for name in (os.path.splitext(os.path.basename(path))[0] for path in sources) if name != "main"]


def options(target):
    artifacts = os.path.join(run_program.LOGS, f"fuzz-{target}-")
    listed = ["-handle_segv=0", "-timeout=20", "-max_len=4096", "-print_final_stats=1", f"-artifact_prefix={artifacts}"]
    dictionary = os.path.join(FUZZ, target.split("_")[0] + ".dict")
    if os.path.exists(dictionary):
        listed.append(f"-dict={dictionary}")
    return listed


def fuzz(target, limit, seconds, log, *corpora):
    """The exit status and the text of a run."""
    command = [run_program.SANITIZED_LOADER, os.path.join(PROGRAMS, f"fuzz_{target}.exe.so"), *options(target), limit,
               *corpora]
    status = run_program.run_limited(command, run_program.sanitized_environment(), log, seconds + START_SECONDS)
    with open(log, encoding="utf-8", errors="replace") as file:
        return status, file.read()


def edges_of(text):
    reached = re.findall(r" cov: (\d+)", text)
    return int(reached[-1]) if reached else 0


def run(target, seconds):
    """Whether the target found nothing, and its executions a second and edges."""
    committed = os.path.join(FUZZ, "corpus", target)
    grown = os.path.join(run_program.BUILD, "fuzz-corpus", target)  # what it found in earlier runs
    os.makedirs(grown, exist_ok=True)
    log = os.path.join(run_program.LOGS, f"fuzz-{target}")
    status, text = fuzz(target, "-runs=0", 0, f"{log}-corpus.log", committed)
    edges = edges_of(text)
    if status != 0:
        print(text[-8000:])
        print(f"{target}: the committed corpus did not run to its end", flush=True)
        return False
    if edges < LEAST_EDGES[target]:
        print(f"{target}: the committed corpus reaches {edges} edges, fewer than {LEAST_EDGES[target]}", flush=True)
        return False
    status, text = fuzz(target, f"-max_total_time={seconds}", seconds, f"{log}.log", grown, committed)
    executions = re.findall(r"stat::number_of_executed_units: (\d+)", text)
    # Without the counts the fuzzer did not come to its end.
    passed = status == 0 and bool(executions)
    if not passed:
        print(text[-8000:])
    rate = int(executions[-1]) // seconds if executions else 0
    print(f"{target:24} {rate:7} executions/s {edges_of(text):6} edges  {'ok' if passed else 'FAILED'}", flush=True)
    return passed


def main(arguments):
    if arguments[:1] in (["-h"], ["--help"]) or len(arguments) > 2:
        print(__doc__.strip())
        return 2
    total = int(arguments[0]) if arguments else 60
    chosen = arguments[1:] or targets()
    os.makedirs(run_program.LOGS, exist_ok=True)
    seconds = max(1, total // len(chosen))
    with concurrent.futures.ThreadPoolExecutor(os.cpu_count()) as pool:
        passed = list(pool.map(lambda target: run(target, seconds), chosen))
    cases = [
        {"name": name, "status": "RUN", "result": "COMPLETED", **({} if good else {"failures": []})}
        for name, good in zip(chosen, passed)
    ]
    with open(os.path.join(run_program.LOGS, "fuzz.json"), "w", encoding="utf-8") as file:
        json.dump({"testsuites": [{"name": "Fuzz", "testsuite": cases}]}, file)
    return 0 if all(passed) else 1


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
