#!/usr/bin/env python3
"""Runs one test program, or one shard of it, for ctest.

usage: run_program.py NAME KIND SECONDS COMMAND...

NAME is that of the log and of the results in build/test-logs. KIND is "native" or "wine", "sanitized" for a
program of the preset sanitize, or "bed" for a program of Windows that needs the bed server and a set of serial
ports; ctest's resource says which set. After SECONDS the program is ended. A log without the tests that passed is printed when one failed.

  run_program.py --start-wine      makes the prefix, starts Wine's server: a program then starts in 50 ms
  run_program.py --end-wine        ends it
"""

import contextlib
import os
import re
import signal
import subprocess
import sys

ROOT = os.path.realpath(os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", ".."))
BUILD = os.path.join(ROOT, "build")
LOGS = os.path.join(BUILD, "test-logs")


def wine_environment():
    environment = dict(os.environ)
    environment.pop("DISPLAY", None)
    environment.update(
        WINEPREFIX=os.path.join(BUILD, "wine"),
        WINEDEBUG="-all",
        WINEDLLOVERRIDES="winemenubuilder.exe,mscoree,mshtml=",
        LC_ALL="C.UTF-8",
    )
    return environment


# Wine's loader for a program of Linux that calls Wine's functions. The sanitizer must see it before Wine does.
SANITIZED_LOADER = "/usr/lib/wine/wine64"


def sanitized_environment():
    """Wine handles the signals, and a test may replace operator new with malloc. The C++ library is preloaded so that
    the sanitizer finds its exceptions."""
    runtime = subprocess.run(
        ["clang++-14", "--print-file-name=libclang_rt.asan-x86_64.so"], stdout=subprocess.PIPE, check=True, text=True
    ).stdout.strip()
    return dict(
        wine_environment(),
        WINELOADERNOEXEC="1",
        LD_PRELOAD=f"{os.path.basename(runtime)}:libstdc++.so.6",
        LD_LIBRARY_PATH=os.path.dirname(runtime),
        ASAN_OPTIONS="detect_leaks=0:handle_segv=0:use_sigaltstack=0:alloc_dealloc_mismatch=0",
        UBSAN_OPTIONS="print_stacktrace=1",
    )


def quietly(*command):
    subprocess.run(
        command,
        env=wine_environment(),
        stdin=subprocess.DEVNULL,
        stdout=subprocess.DEVNULL,
        stderr=subprocess.DEVNULL,
        check=False,
    )


def start_wine():
    subprocess.run([os.path.join(ROOT, "scripts", "prefix.sh")], check=True)
    quietly("wineserver", "-p")
    quietly("wine", "cmd", "/c", "exit")


def end_wine():
    quietly("wineserver", "-k")
    quietly("wineserver", "-w")


def own_ports():
    """The ports of the set that ctest has reserved, "COM10 COM11 COM12 COM13"; the first set without ctest."""
    with open(os.path.join(ROOT, "tests", "bed", "ports.conf"), encoding="utf-8") as file:
        numbers = {name: int(value) for name, value in re.findall(r"^(\w+)=(\d+)$", file.read(), re.M)}
    reserved = re.match(r"id:(\d+),", os.environ.get("CTEST_RESOURCE_GROUP_0_PORTS", ""))
    first = int(reserved[1]) if reserved else numbers["FIRST_PORT"]
    return " ".join(f"COM{first + i}" for i in range(numbers["PORTS_PER_SET"]))


@contextlib.contextmanager
def bed_server(environment):
    """Starts the bed server; gives the environment for a program that uses it."""
    # The folder is passed separately, because LD_PRELOAD does not allow spaces in a path.
    environment = dict(
        environment, LD_PRELOAD="tcflush.so", LD_LIBRARY_PATH=os.path.join(BUILD, "bed")
    )
    bed = subprocess.Popen(
        [sys.executable, "-B", os.path.join(ROOT, "tests", "bed", "bed.py")],
        env=environment,
        stdin=subprocess.DEVNULL,
        stdout=subprocess.PIPE,
        start_new_session=True,
    )
    try:
        address = bed.stdout.readline().decode().split()
        if len(address) != 2:
            raise RuntimeError("the bed server did not start")
        yield dict(environment, RCVLINK_BED=address[1], RCVLINK_PORTS=own_ports())
    finally:
        bed.terminate()
        bed.wait()
        bed.stdout.close()


def run_limited(command, environment, log, time_limit):
    """The exit status, or None after the time limit. The program and its children are then ended."""
    with open(log, "wb") as output:
        process = subprocess.Popen(
            command,
            cwd=ROOT,
            env=environment,
            stdin=subprocess.DEVNULL,
            stdout=output,
            stderr=subprocess.STDOUT,
            start_new_session=True,
        )
        try:
            return process.wait(time_limit)
        except subprocess.TimeoutExpired:
            return None
        finally:
            if process.poll() is None:
                os.killpg(process.pid, signal.SIGKILL)
                process.wait()


def run(name, kind, time_limit, command):
    os.makedirs(LOGS, exist_ok=True)
    log = os.path.join(LOGS, f"{name}.log")
    results = os.path.join(LOGS, f"{name}.json")
    with contextlib.suppress(FileNotFoundError):
        os.remove(results)
    environments = {"native": os.environ.copy, "sanitized": sanitized_environment}
    environment = environments.get(kind, wine_environment)()
    # Relative, because under Wine a path that starts with a slash has no drive.
    environment["GTEST_OUTPUT"] = f"json:{os.path.relpath(results, ROOT)}"
    with contextlib.ExitStack() as stack:
        if kind == "bed":
            environment = stack.enter_context(bed_server(environment))
        prefix = {"native": [], "sanitized": [SANITIZED_LOADER]}.get(kind, ["wine"])
        status = run_limited(prefix + command, environment, log, time_limit)
    with open(log, encoding="utf-8", errors="replace") as file:
        text = file.read()
    # A crash at the end of a program leaves Wine's exit status at 0.
    crashed = re.search(r"^wine: Unhandled", text, re.M)
    if status == 0 and not crashed:
        return 0
    print(re.sub(r"^\[ RUN .*\r?\n\[       OK .*\r?\n", "", text, flags=re.M).rstrip())
    print(f"ended after {time_limit} s" if status is None else f"exit status {status}")
    return 1


def end_by_exception(number, _frame):
    raise SystemExit(128 + number)


def main(arguments):
    if arguments == ["--start-wine"]:
        start_wine()
    elif arguments == ["--end-wine"]:
        end_wine()
    elif len(arguments) >= 4:
        signal.signal(signal.SIGTERM, end_by_exception)
        name, kind, time_limit, *command = arguments
        return run(name, kind, int(time_limit), command)
    else:
        print(__doc__.strip())
        return 2
    return 0


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
