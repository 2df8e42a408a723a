#!/usr/bin/env python3
"""Measures, and writes docs/performance.md. bench/run starts it when everything is built.

Each part keeps its figures in build/bench/PART.json, and the page is written from these files.
"""

import contextlib
import hashlib
import itertools
import json
import os
import random
import shutil
import statistics
import subprocess
import sys
import threading
import time

import image
import page

ROOT = os.path.realpath(os.path.join(os.path.dirname(os.path.abspath(__file__)), ".."))
BUILD = os.path.join(ROOT, "build")
WORK = os.path.join(BUILD, "bench")
NATIVE = os.path.join(BUILD, "native", "bin")
WINDOWS = os.path.join("build", "release", "bin")  # relative, as Wine's paths have no drive

KIB = 1024
LINE_FILE = "LINE.DAT"
LINE_BYTES = 128 * KIB
DELAYS_MS = (0, 1, 5, 16)
REPEATS = 3
FAMILIES = ("quorin", "velmar")
# Of a Velmar file of fewer than 4 bytes the library does not see the end.
GET_FILES = (
    ("ONE.DAT", 1, ("quorin",)),
    ("FOUR.DAT", 4, ("velmar",)),
    ("SMALL.DAT", 200 * KIB, FAMILIES),
    ("LARGE.DAT", 1024 * KIB, FAMILIES),
)
CALL_FILES = {"SMALL.DAT": 100 * KIB, "LARGE.DAT": 200 * KIB}
# So large that the time of the processor, which is counted in steps of 10 ms, is that of many steps.
MANY_FILE, MANY_BYTES = "MANY.DAT", 512 * KIB
MANY = (1, 8, 64)
ABORTS = 100  # of each operation of each family
ABORT_FILE, ABORT_BYTES = "LONG.DAT", 1024 * KIB  # takes a minute and a half
ABORT_OPERATIONS = ("list", "check", "download")
FIRST_PORT = 140  # of those that this makes; the tests have others
MODE = ("--speed", "115200", "--no-memory")

# The programs of lrzsz for each protocol: the sender with its switches, the receiver with its.
SENDERS = {
    "XMODEM-1K": (["sx", "-k", "-q"], ["rx", "-q", "-c"]),
    "YMODEM": (["sb", "-k", "-q"], ["rb", "-q"]),
    "ZMODEM": (["sz", "-q"], ["rz", "-q"]),
}


def make_file(path, size):
    with open(path, "wb") as file:
        file.write(random.Random(size).randbytes(size))


def folder(name, files):
    path = os.path.join(WORK, name)
    shutil.rmtree(path, ignore_errors=True)
    os.makedirs(path)
    for file, size in files.items():
        make_file(os.path.join(path, file), size)
    return path


def digest(path, size):
    """Of the first bytes: XMODEM fills the last block up."""
    with open(path, "rb") as file:
        return hashlib.sha256(file.read(size)).hexdigest()


def host_environment():
    """Of a program that opens a port: a purge does not discard what the line has not carried yet."""
    return dict(os.environ, LD_PRELOAD="tcflush.so", LD_LIBRARY_PATH=os.path.join(BUILD, "bed"))


def port_link(number):
    """Where the pseudo-terminal of a COM port belongs. Wine finds it by a link in its folder of devices."""
    path = os.path.join(BUILD, "ports", f"com{number}")
    device = os.path.join(os.environ["WINEPREFIX"], "dosdevices", f"com{number}")
    if not os.path.islink(device):
        os.symlink(path, device)
    return path


@contextlib.contextmanager
def simulator(family, files, link, *switches, speed=9600):
    process = subprocess.Popen(
        [os.path.join(NATIVE, "rcvlink-sim"), family, "--folder", files, "--speed", str(speed), "--link", link]
        + [*switches],
        stdout=subprocess.PIPE,
        stdin=subprocess.DEVNULL,
    )
    try:
        if not process.stdout.readline():
            raise RuntimeError("the simulator did not start")
        yield
    finally:
        process.terminate()
        process.wait()
        process.stdout.close()


class Relay:
    def __init__(self, delay_ms, host_link, how, device):
        self._process = subprocess.Popen(
            [os.path.join(NATIVE, "bench-relay"), str(delay_ms), host_link, how, device],
            stdin=subprocess.PIPE,
            stdout=subprocess.PIPE,
        )
        if self._process.stdout.readline() != b"ready\n":
            raise RuntimeError("the relay did not start")

    def end(self):
        """What passed over the line."""
        output, _ = self._process.communicate()
        return json.loads(output)


def carry_lrzsz(protocol, delay_ms, source, lane):
    """Sends the file with a program of lrzsz over the relay."""
    place = folder(f"lane{lane}", {})
    host, device = os.path.join(place, "host"), os.path.join(place, "device")
    relay = Relay(delay_ms, host, "make", device)
    try:
        send, receive = SENDERS[protocol]
        names = [LINE_FILE] if protocol == "XMODEM-1K" else []
        with open(device, "r+b", buffering=0) as sender_end, open(host, "r+b", buffering=0) as receiver_end:
            start = time.monotonic()
            sender = subprocess.Popen(
                [*send, source],
                env=host_environment(),
                stdin=sender_end,
                stdout=sender_end,
                stderr=subprocess.DEVNULL,
            )
            receiver = subprocess.Popen(
                [*receive, *names],
                cwd=place,
                env=host_environment(),
                stdin=receiver_end,
                stdout=receiver_end,
                stderr=subprocess.DEVNULL,
            )
            status = receiver.wait(300)
            seconds = time.monotonic() - start
            # The receiver's end discards its last answer, if it has not left yet. Some senders wait for it.
            sender.terminate()
            sender.wait()
    finally:
        figures = relay.end()
    if status != 0 or digest(os.path.join(place, LINE_FILE), LINE_BYTES) != digest(source, LINE_BYTES):
        raise RuntimeError(f"{protocol} failed: {status}")
    return figures | {"total_s": seconds}


def again(carry, *arguments):
    """Once more, for a transfer that failed: under load lrzsz gives up some at their start."""
    try:
        return carry(*arguments)
    except RuntimeError as failure:
        print(f"  once more: {failure}", flush=True)
        return carry(*arguments)


def run_program(family, delay_ms, files, lane, command, *arguments):
    """Runs a command of rcvlink-cli over the relay."""
    number = FIRST_PORT + lane
    device = os.path.join(folder(f"lane{lane}", {}), "device")
    with simulator(family, files, device, speed=115200):
        relay = Relay(delay_ms, port_link(number), "open", device)
        try:
            start = time.monotonic()
            status = subprocess.run(
                ["wine", os.path.join(WINDOWS, "rcvlink-cli.exe"), command, f"COM{number}", *arguments, *MODE],
                cwd=ROOT,
                env=host_environment(),
                stdin=subprocess.DEVNULL,
                stdout=subprocess.DEVNULL,
                stderr=subprocess.DEVNULL,
                timeout=300,
                check=False,
            ).returncode
            seconds = time.monotonic() - start
        finally:
            figures = relay.end()
    if status != 0:
        raise RuntimeError(f"{command}: {family} failed: {status}")
    return figures | {"total_s": seconds}


def carry_rcvlink(family, delay_ms, source, lane):
    """Downloads the file with rcvlink-cli over the relay."""
    name = os.path.basename(source)
    copy = os.path.join(WORK, f"lane{lane}", name)
    figures = run_program(
        family, delay_ms, os.path.dirname(source), lane, "get", name, "-o", os.path.relpath(copy, ROOT)
    )
    if digest(copy, -1) != digest(source, -1):
        raise RuntimeError(f"{family}: {name} is not the same")
    return figures


def at_once(jobs):
    """Runs the functions side by side; gives their results in order."""
    results, failures = [None] * len(jobs), []

    def run(index):
        try:
            results[index] = jobs[index]()
        except Exception as failure:  # shown by the caller's thread
            failures.append(failure)

    threads = [threading.Thread(target=run, args=(index,)) for index in range(len(jobs))]
    for thread in threads:
        thread.start()
    for thread in threads:
        thread.join()
    if failures:
        raise failures[0]
    return results


def measure_line():
    """All protocols at once, each on a line of its own, so that what else the computer does meets all."""
    source = os.path.join(folder("line", {LINE_FILE: LINE_BYTES}), LINE_FILE)
    protocols = [*FAMILIES, *SENDERS]
    runs = {protocol: {delay: [] for delay in DELAYS_MS} for protocol in protocols}
    for repeat in range(REPEATS):
        for delay in DELAYS_MS:
            print(f"line: turn {repeat + 1} of {REPEATS}, {delay} ms ...", flush=True)
            jobs = [
                lambda p=protocol, lane=lane: carry_rcvlink(p, delay, source, lane)
                if p in FAMILIES
                else again(carry_lrzsz, p, delay, source, lane)
                for lane, protocol in enumerate(protocols)
            ]
            for protocol, figures in zip(protocols, at_once(jobs)):
                runs[protocol][delay].append(figures)

    def rate(figures):
        # The bytes of the file that came in the middle of the transfer, without its framing.
        share = LINE_BYTES / figures["to_host"]
        return figures["middle_bytes"] / figures["middle_s"] * share

    return {
        "bytes": LINE_BYTES,
        "rates": {
            protocol: {delay: statistics.median(map(rate, figures)) for delay, figures in delays.items()}
            for protocol, delays in runs.items()
        },
    }


def measure_get():
    files = folder("get", {name: size for name, size, _ in GET_FILES})
    rows = [("find", 0, FAMILIES, lambda family, lane: run_program(family, 0, files, lane, "find"))]
    for name, size, families in GET_FILES:
        rows.append((name, size, families, lambda family, lane, source=os.path.join(files, name): carry_rcvlink(
            family, 0, source, lane)))
    table = []
    for name, size, families, measure in rows:
        repeats = REPEATS if size < 200 * KIB else 1
        runs = {family: [] for family in families}
        for repeat in range(repeats):
            print(f"get: {name}, turn {repeat + 1} of {repeats} ...", flush=True)
            jobs = [lambda f=family, lane=lane: measure(f, lane) for lane, family in enumerate(families)]
            for family, figures in zip(families, at_once(jobs)):
                runs[family].append(figures)
        for family, figures in runs.items():
            middle = sorted(figures, key=lambda run: run["total_s"])[len(figures) // 2]
            table.append({"family": family, "size": size, "runs": repeats} | middle)
    return {"table": table}


def run_windows(program, *arguments):
    output = subprocess.run(
        ["wine", os.path.join(WINDOWS, program), *arguments],
        cwd=ROOT,
        env=host_environment(),
        stdin=subprocess.DEVNULL,
        stdout=subprocess.PIPE,
        stderr=subprocess.DEVNULL,
        timeout=900,
        check=False,
    ).stdout.decode()
    try:
        return json.loads(output)
    except ValueError:
        raise RuntimeError(f"{program} printed: {output}") from None


def measure_library():
    print("library ...", flush=True)
    return run_windows("bench-library.exe")


def measure_calls():
    files = folder("calls", CALL_FILES)
    figures = {}
    for family in FAMILIES:
        print(f"calls: {family} ...", flush=True)
        with simulator(family, files, port_link(FIRST_PORT)):
            figures[family] = run_windows("bench-host.exe", "calls", f"COM{FIRST_PORT}", *CALL_FILES)
    return figures


def measure_aborts():
    files = folder("aborts", {ABORT_FILE: ABORT_BYTES})

    def measure(family, operation, number):
        with simulator(family, files, port_link(number), "--pace", speed=115200):
            figures = run_windows("bench-host.exe", "aborts", operation, ABORT_FILE, str(ABORTS), f"COM{number}")
        return {"family": family, "operation": operation} | figures

    print("aborts ...", flush=True)
    pairs = [(family, operation) for family in FAMILIES for operation in ABORT_OPERATIONS]
    jobs = [lambda p=pair, n=FIRST_PORT + lane: measure(*p, n) for lane, pair in enumerate(pairs)]
    return {"table": at_once(jobs)}


def measure_many():
    files = folder("many", {MANY_FILE: MANY_BYTES})
    path = os.path.relpath(os.path.join(files, MANY_FILE), ROOT)
    runs = {count: [] for count in MANY}
    for repeat in range(REPEATS):
        for count in MANY:
            print(f"many: turn {repeat + 1} of {REPEATS}, {count} receivers ...", flush=True)
            with contextlib.ExitStack() as stack:
                numbers = range(FIRST_PORT, FIRST_PORT + count)
                for number in numbers:
                    stack.enter_context(simulator("quorin", files, port_link(number)))
                ports = [f"COM{number}" for number in numbers]
                runs[count].append(run_windows("bench-host.exe", "many", path, *ports))
    table = [sorted(figures, key=lambda run: run["processor_s"])[len(figures) // 2] for figures in runs.values()]
    for run in itertools.chain.from_iterable(runs.values()):
        if run["failures"] or run["bytes"] != run["receivers"] * MANY_BYTES:
            raise RuntimeError(f"downloads failed: {run}")
    return {"table": table}


def measure_size():
    print("size ...", flush=True)
    return image.measure(ROOT)


PARTS = {
    "line": measure_line,
    "get": measure_get,
    "library": measure_library,
    "calls": measure_calls,
    "aborts": measure_aborts,
    "many": measure_many,
    "size": measure_size,
}


def processor():
    """The machine, without a name."""
    with open("/proc/cpuinfo", encoding="utf-8") as file:
        speeds = [float(line.split(":")[1]) for line in file if line.startswith("cpu MHz")]
    return {"cores": os.cpu_count(), "ghz": round(max(speeds) / 1000, 1) if speeds else None}


def result_path(part):
    return os.path.join(WORK, f"{part}.json")


def main(arguments):
    unknown = set(arguments) - set(PARTS)
    if unknown:
        print(f"unknown: {' '.join(sorted(unknown))}; there are {' '.join(PARTS)}")
        return 2
    os.makedirs(WORK, exist_ok=True)
    for part in arguments or PARTS:
        figures = PARTS[part]()
        with open(result_path(part), "w", encoding="utf-8") as file:
            json.dump(figures, file, indent=1)
    figures = {}
    for part in PARTS:
        if not os.path.exists(result_path(part)):
            print(f"docs/performance.md is not written: bench/run {part} has not run")
            return 0
        with open(result_path(part), encoding="utf-8") as file:
            figures[part] = json.load(file)
    with open(os.path.join(ROOT, "docs", "performance.md"), "w", encoding="utf-8") as file:
        file.write(page.text(figures, processor()))
    print("written: docs/performance.md")
    return 0


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
