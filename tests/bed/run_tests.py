#!/usr/bin/env python3
"""Runs every test program of the build and counts what passed.

usage: run_tests.py [PROGRAM | GTEST_FILTER | --fast]

The name of a program runs only that program; --fast runs the unit tests, which open no port. Anything else is a
GoogleTest filter; programs that take no filter are then left out. The last line is "N passed, N failed", with
", N skipped" if there are any. The exit status is 0 only if something ran and nothing failed.
"""

import concurrent.futures
import contextlib
import json
import os
import queue
import re
import signal
import subprocess
import sys
import threading
import time
from dataclasses import dataclass, field

ROOT = os.path.realpath(os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", ".."))
BUILD = os.path.join(ROOT, "build")
LOGS = os.path.join(BUILD, "test-logs")

SCRIPT = "script"  # passes when it exits with 0; counts as one test
WINE_SCRIPT = "wine script"  # the same, a Windows program
NATIVE = "native"  # a GoogleTest program
WINE = "wine"  # a GoogleTest program for Windows
BED = "bed"  # the same, with the bed server and its serial ports

WITHOUT_FILTER = (SCRIPT, WINE_SCRIPT)


@dataclass
class Program:
    name: str
    path: str
    kind: str
    shards: int = 1
    time_limit: int = 120



def port_sets():
    """The names of the ports of each set, "COM10 COM11 COM12" the first."""
    with open(os.path.join(ROOT, "tests", "bed", "ports.conf"), encoding="utf-8") as file:
        numbers = {name: int(value) for name, value in re.findall(r"^(\w+)=(\d+)$", file.read(), re.M)}
    first, size = numbers["FIRST_PORT"], numbers["PORTS_PER_SET"]
    starts = range(first, first + numbers["PORT_SETS"] * size, size)
    return [" ".join(f"COM{start + i}" for i in range(size)) for start in starts]


# Programs with ports run in parallel at the end, the longest first.
PROGRAMS = [
    Program("check_layers", "tests/bed/check_layers.py", SCRIPT),
    Program("check_format", "tests/bed/check_format.py", SCRIPT),
    Program("check_exports", "tests/bed/check_exports.py", SCRIPT),
    Program("check_statics", "tests/bed/check_statics.py", SCRIPT),
    Program("check_readme", "tests/bed/check_readme.py", SCRIPT),
    Program("check_docs", "tests/bed/check_docs.py", SCRIPT),
    Program("simulator_tests", "build/native/bin/simulator_tests", NATIVE),
    Program("unit_tests", "build/release/bin/unit_tests.exe", WINE, shards=2),
    Program("cli_unit_tests", "build/release/bin/cli_unit_tests.exe", WINE),
    Program("msvc_host", "build/release/bin/msvc_host.exe", WINE_SCRIPT),
    Program("host_tests", "build/release/bin/host_tests.exe", BED, shards=24, time_limit=600),
    Program("cli_tests", "build/release/bin/cli_tests.exe", BED, shards=16, time_limit=300),
    Program("usb_tests", "build/release/bin/usb_tests.exe", BED, shards=4),
]


@dataclass
class Outcome:
    passed: int = 0
    skipped: int = 0
    failures: list = field(default_factory=list)

    def add(self, other):
        self.passed += other.passed
        self.skipped += other.skipped
        self.failures += other.failures


def base_environment():
    environment = dict(os.environ)
    environment.pop("DISPLAY", None)
    environment.update(
        WINEPREFIX=os.path.join(BUILD, "wine"),
        WINEDEBUG="-all",
        WINEDLLOVERRIDES="winemenubuilder.exe,mscoree,mshtml=",
        LC_ALL="C.UTF-8",
    )
    for name in list(environment):
        if name.startswith("GTEST_"):
            del environment[name]
    return environment


def quietly(command, environment):
    return subprocess.run(
        command,
        env=environment,
        stdin=subprocess.DEVNULL,
        stdout=subprocess.DEVNULL,
        stderr=subprocess.DEVNULL,
        check=False,
    ).returncode


@contextlib.contextmanager
def wine_server(environment):
    """Keeps Wine's server and services running, so that a program starts in 50 ms, not in seconds."""
    quietly(["wineserver", "-p"], environment)
    try:
        quietly(["wine", "cmd", "/c", "exit"], environment)
        yield
    finally:
        quietly(["wineserver", "-k"], environment)
        quietly(["wineserver", "-w"], environment)


def port_environment(environment):
    """For programs that open serial ports: makes pseudo-terminals behave like ports."""
    # The folder is passed separately, because LD_PRELOAD does not allow spaces in a path.
    return dict(
        environment, LD_PRELOAD="tcflush.so", LD_LIBRARY_PATH=os.path.join(BUILD, "bed")
    )


@contextlib.contextmanager
def bed_server(environment):
    """Starts the bed server; gives the environment for programs that use it."""
    environment = port_environment(environment)
    with open(os.path.join(LOGS, "bed.log"), "wb") as log:
        bed = subprocess.Popen(
            [sys.executable, "-B", os.path.join(ROOT, "tests", "bed", "bed.py")],
            env=environment,
            stdin=subprocess.DEVNULL,
            stdout=subprocess.PIPE,
            stderr=log,
            start_new_session=True,
        )
        try:
            address = bed.stdout.readline().decode().split()
            if len(address) != 2:
                raise RuntimeError("the bed server did not start, see build/test-logs/bed.log")
            yield dict(environment, RCVLINK_BED=address[1])
        finally:
            bed.terminate()
            bed.wait()
            bed.stdout.close()


# The programs that are running, each in a session of its own.
_running = set()
_running_lock = threading.Lock()


def start_process(command, **options):
    with _running_lock:
        process = subprocess.Popen(command, start_new_session=True, **options)
        _running.add(process)
        return process


def end_process(process):
    """Kills a program and its session, if it still runs."""
    with _running_lock:
        if process.poll() is None:
            os.killpg(process.pid, signal.SIGKILL)
            process.wait()
        _running.discard(process)


def end_all_processes():
    for process in list(_running):
        end_process(process)


def run_limited(command, environment, log, time_limit):
    """The exit status, or None after the time limit."""
    with open(log, "wb") as output:
        process = start_process(
            command,
            cwd=ROOT,
            env=environment,
            stdin=subprocess.DEVNULL,
            stdout=output,
            stderr=subprocess.STDOUT,
        )
        try:
            return process.wait(time_limit)
        except subprocess.TimeoutExpired:
            return None
        finally:
            end_process(process)


def command_of(program):
    path = os.path.join(ROOT, program.path)
    if program.kind == SCRIPT:
        return [sys.executable, "-B", path]
    return [path] if program.kind == NATIVE else ["wine", path]


def read_results(path):
    """The outcome, from the JSON output of a GoogleTest program."""
    with open(path, encoding="utf-8") as file:
        suites = json.load(file)["testsuites"]
    outcome = Outcome()
    for suite in suites:
        for test in suite["testsuite"]:
            if "failures" in test:
                outcome.failures.append(f"{suite['name']}.{test['name']}")
            elif test["result"] == "SKIPPED":
                outcome.skipped += 1
            elif test["status"] == "RUN":
                outcome.passed += 1
    return outcome


def show(log):
    """Prints a program's output without tests that passed and printed nothing."""
    with open(log, encoding="utf-8", errors="replace") as file:
        text = file.read()
    print(re.sub(r"^\[ RUN .*\r?\n\[       OK .*\r?\n", "", text, flags=re.M).rstrip(), flush=True)


def run_shard(program, shard, gtest_filter, environment):
    """Runs one shard; gives its outcome and the file with its output."""
    name = program.name if program.shards == 1 else f"{program.name}-{shard}"
    log = os.path.join(LOGS, f"{name}.log")
    results = os.path.join(LOGS, f"{name}.json")
    with contextlib.suppress(FileNotFoundError):
        os.remove(results)
    if not os.path.exists(os.path.join(ROOT, program.path)):
        with open(log, "w", encoding="utf-8") as file:
            file.write(f"{program.path} is missing\n")
        return Outcome(failures=[f"{name}: the program is missing"]), log

    command = command_of(program)
    if program.kind not in WITHOUT_FILTER:
        # Relative, because under Wine a path that starts with a slash has no drive.
        command.append(f"--gtest_output=json:{os.path.relpath(results, ROOT)}")
        environment = dict(
            environment,
            GTEST_FILTER=gtest_filter or "*",
            GTEST_TOTAL_SHARDS=str(program.shards),
            GTEST_SHARD_INDEX=str(shard),
        )
    status = run_limited(command, environment, log, program.time_limit)
    return outcome_of(program, name, status, results, log), log


def lines_of(log, start):
    with open(log, encoding="utf-8", errors="replace") as file:
        return [line.strip() for line in file if line.startswith(start)]


def last_started_test(log):
    started = lines_of(log, "[ RUN ")
    return started[-1].partition("]")[2].strip() if started else "no test"


def outcome_of(program, name, status, results, log):
    if status is None:
        limit = program.time_limit
        return Outcome(failures=[f"{name}: time limit of {limit} s reached in {last_started_test(log)}"])
    if program.kind in WITHOUT_FILTER:
        return Outcome(passed=1) if status == 0 else Outcome(failures=[f"{name}: ended with {status}"])
    if not os.path.exists(results):
        return Outcome(failures=[f"{name}: ended with {status} in {last_started_test(log)}"])
    outcome = read_results(results)
    # A crash at the end of the program leaves Wine's exit status at 0.
    outcome.failures += [f"{name}: {line}" for line in lines_of(log, "wine: Unhandled")]
    if status != 0 and not outcome.failures:
        outcome.failures.append(f"{name}: ended with {status}")
    return outcome


def run_programs(programs, gtest_filter, environment):
    """Runs the shards of these programs in parallel, at most one per set of ports."""
    start = time.monotonic()
    sets = port_sets()
    free = queue.SimpleQueue()
    for ports in sets:
        free.put(ports)

    def run(program, shard):
        ports = free.get()
        try:
            own = dict(environment, RCVLINK_PORTS=ports)
            return run_shard(program, shard, gtest_filter, own)
        finally:
            free.put(ports)

    total = Outcome()
    with concurrent.futures.ThreadPoolExecutor(len(sets)) as pool:
        runs = [
            [pool.submit(run, program, shard) for shard in range(program.shards)]
            for program in programs
        ]
        try:
            for program, shards in zip(programs, runs):
                outcome = Outcome()
                for shard in shards:
                    shard_outcome, log = shard.result()
                    if shard_outcome.failures:
                        show(log)
                    outcome.add(shard_outcome)
                seconds = time.monotonic() - start
                print(
                    f"{program.name}: {outcome.passed} passed, {len(outcome.failures)} failed, "
                    f"{outcome.skipped} skipped after {seconds:.1f} s",
                    flush=True,
                )
                total.add(outcome)
        except BaseException:
            pool.shutdown(wait=False, cancel_futures=True)
            end_all_processes()
            raise
    return total


def chosen_programs(argument):
    """The programs to run, and the filter for them."""
    if not argument:
        return PROGRAMS, ""
    if argument == "--fast":
        return [program for program in PROGRAMS if program.kind in (NATIVE, WINE)], ""
    named = [program for program in PROGRAMS if program.name == argument]
    if named:
        return named, ""
    return [program for program in PROGRAMS if program.kind not in WITHOUT_FILTER], argument


def run_all(programs, gtest_filter):
    outcome = Outcome()
    environment = base_environment()
    with contextlib.ExitStack() as stack:
        bed_environment = environment
        if any(program.kind not in (SCRIPT, NATIVE) for program in programs):
            stack.enter_context(wine_server(environment))
        if any(program.kind == BED for program in programs):
            bed_environment = stack.enter_context(bed_server(environment))
        for program in programs:
            if program.kind != BED:
                outcome.add(run_programs([program], gtest_filter, environment))
        with_ports = [program for program in programs if program.kind == BED]
        outcome.add(run_programs(with_ports, gtest_filter, bed_environment))
    return outcome


def end_by_exception(number, _frame):
    raise SystemExit(128 + number)


def main(arguments):
    if len(arguments) > 1 or arguments in (["-h"], ["--help"]):
        print(__doc__.strip())
        return 2
    signal.signal(signal.SIGTERM, end_by_exception)
    os.makedirs(LOGS, exist_ok=True)
    programs, gtest_filter = chosen_programs(arguments[0] if arguments else "")
    outcome = run_all(programs, gtest_filter)

    for failure in outcome.failures:
        print(f"FAILED {failure}")
    total = f"{outcome.passed} passed, {len(outcome.failures)} failed"
    if outcome.skipped:
        total += f", {outcome.skipped} skipped"
    print(total, flush=True)
    ran = outcome.passed + len(outcome.failures)
    return 0 if ran > 0 and not outcome.failures else 1


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
