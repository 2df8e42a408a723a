#!/usr/bin/env python3
"""The Unix side of the test bed: starts simulated receivers and programs for tests under Wine.

Prints "listening HOST:PORT" as its first line. A client connects and sends requests, each a JSON
object on its own line. Each request is answered by one line, {"ok": true, ...} or {"ok": false,
"error": TEXT}. When a connection closes, everything it started is stopped and its folders are
removed, so a test that crashed leaves nothing behind.

Simulated receivers, by port name ("COM12"):
  {"do": "start", "port": P, "arguments": [...]}     starts rcvlink-sim; answers when P can be opened
  {"do": "stop", "port": P}                          ends it with SIGTERM -> {"status": exit status,
                                                     "has_ended": whether it had ended before, "errors": TEXT}
  {"do": "kill", "port": P}                          ends it with SIGKILL; its port disappears
  {"do": "pause", "port": P}, {"do": "resume", "port": P}     SIGSTOP, SIGCONT
  {"do": "status", "port": P}                        -> {"status": exit status, null while it runs}

  {"do": "join", "ports": [P, P]}                    makes both, with a null modem between them and no receiver

Windows programs (paths relative to the folder of the programs of the preset RCVLINK_PRESET, or else release):
  {"do": "run", "program": "rcvlink-cli.exe", "arguments": [...], "output": "pipe", "folder": DIR}
      -> {"job": N}. DIR, the folder to run in, may be left out. Its output is a "pipe", one whose
      reader has "closed" it, or a "terminal" (a console on a pseudo-terminal of 100 columns).
  {"do": "expect", "job": N, "text": T, "seconds": S}
      waits until the output contains T; fails if the program ends before, or after S seconds
  {"do": "interrupt", "job": N}                      Ctrl-C
  {"do": "finish", "job": N, "seconds": S}
      waits for the end -> {"status": exit status, "output": TEXT, "errors": TEXT, "history": [...]}
      On a terminal, "output" is the screen at the end and "history" every text that a line has
      shown, in order; "errors" is empty, because a terminal does not separate them.

  {"do": "folder"}                                   -> {"path": a new, empty folder}
  {"do": "write", "path": P, "bytes": HEX}           makes a file, even with a name that Windows forbids
"""

import argparse
import json
import os
import re
import shutil
import signal
import socket
import socketserver
import sys
import tempfile
import threading

from jobs import Job, TerminalJob
from pairs import Pair
from processes import Refused
from simulators import Simulator

ROOT = os.path.realpath(os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", ".."))
BUILD = os.path.join(ROOT, "build")
PROGRAMS = os.path.join(BUILD, os.environ.get("RCVLINK_PRESET", "release"), "bin")


class Connection(socketserver.StreamRequestHandler):
    """The requests of one client, and all that it has started."""

    def setup(self):
        super().setup()
        self._simulators = {}
        self._jobs = {}
        self._pairs = []
        self._folders = []

    def handle(self):
        for line in self.rfile:
            try:
                answer = self._answer(json.loads(line))
                answer["ok"] = True
            except Refused as refusal:
                answer = {"ok": False, "error": str(refusal)}
            except (KeyError, TypeError, ValueError, OSError) as error:
                answer = {"ok": False, "error": f"{type(error).__name__}: {error}"}
            self.wfile.write(json.dumps(answer).encode() + b"\n")

    def finish(self):
        for simulator in self._simulators.values():
            simulator.stop()
        for job in self._jobs.values():
            job.kill()
        for pair in self._pairs:
            pair.close()
        for folder in self._folders:
            shutil.rmtree(folder, ignore_errors=True)
        super().finish()

    def _answer(self, request):
        actions = {
            "start": self._start,
            "stop": self._stop,
            "kill": self._kill,
            "pause": self._pause,
            "resume": self._resume,
            "status": self._status,
            "join": self._join,
            "run": self._run,
            "expect": self._expect,
            "interrupt": self._interrupt,
            "finish": self._finish,
            "folder": self._folder,
            "write": self._write,
        }
        if request["do"] not in actions:
            raise Refused(f"unknown request {request['do']!r}")
        return actions[request["do"]](request) or {}

    def _simulator(self, request):
        if request["port"] not in self._simulators:
            raise Refused(f"no receiver was started on {request['port']}")
        return self._simulators[request["port"]]

    @staticmethod
    def _free_link(port):
        if not re.fullmatch(r"COM\d+", port):
            raise Refused(f"{port!r} is not a COM port")
        link = os.path.join(BUILD, "ports", port.lower())
        if os.path.islink(link):
            raise Refused(f"{port} is in use")
        return link

    def _join(self, request):
        self._pairs.append(Pair([self._free_link(port) for port in request["ports"]]))

    def _start(self, request):
        port = request["port"]
        link = self._free_link(port)
        program = self.server.simulator
        self._simulators[port] = Simulator(program, link, request["arguments"])

    def _stop(self, request):
        simulator = self._simulator(request)
        has_ended = simulator.status() is not None
        status = simulator.stop()
        del self._simulators[request["port"]]
        return {"status": status, "has_ended": has_ended, "errors": simulator.errors()}

    def _kill(self, request):
        self._simulator(request).kill()
        del self._simulators[request["port"]]

    def _pause(self, request):
        self._simulator(request).pause()

    def _resume(self, request):
        self._simulator(request).resume()

    def _status(self, request):
        return {"status": self._simulator(request).status()}

    def _run(self, request):
        program = os.path.join(PROGRAMS, request["program"])
        if not os.path.exists(program):
            raise Refused(f"there is no {program}")
        number = len(self._jobs) + 1
        command = ["wine", program, *request["arguments"]]
        folder = request.get("folder")
        output = request["output"]
        if output == "terminal":
            self._jobs[number] = TerminalJob(command, folder)
        else:
            self._jobs[number] = Job(command, folder, closed=output == "closed")
        return {"job": number}

    def _expect(self, request):
        self._jobs[request["job"]].expect(request["text"], request["seconds"])

    def _interrupt(self, request):
        self._jobs[request["job"]].interrupt()

    def _finish(self, request):
        return self._jobs[request["job"]].finish(request["seconds"])

    def _write(self, request):
        with open(request["path"], "wb") as file:
            file.write(bytes.fromhex(request["bytes"]))

    def _folder(self, _request):
        parent = os.path.join(BUILD, "tmp")
        os.makedirs(parent, exist_ok=True)
        folder = tempfile.mkdtemp(dir=parent)
        self._folders.append(folder)
        return {"path": folder}


class Bed(socketserver.ThreadingTCPServer):
    daemon_threads = False
    allow_reuse_address = True

    def __init__(self, simulator):
        super().__init__(("127.0.0.1", 0), Connection)
        self.simulator = simulator
        self._lock = threading.Lock()
        self._requests = set()

    def process_request(self, request, client_address):
        with self._lock:
            self._requests.add(request)
        super().process_request(request, client_address)

    def shutdown_request(self, request):
        with self._lock:
            self._requests.discard(request)
        super().shutdown_request(request)

    def close_connections(self):
        """Ends every connection as if its client had closed it."""
        with self._lock:
            for request in self._requests:
                try:
                    request.shutdown(socket.SHUT_RDWR)
                except OSError:  # the client has closed it already
                    pass


def main():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument(
        "--simulator", default=os.path.join(BUILD, "native", "bin", "rcvlink-sim"), metavar="PROGRAM"
    )
    bed = Bed(parser.parse_args().simulator)
    # shutdown() waits for serve_forever(), which this handler interrupts, so it needs its own thread.
    for number in (signal.SIGTERM, signal.SIGINT):
        signal.signal(number, lambda *_: threading.Thread(target=bed.shutdown).start())
    print("listening {}:{}".format(*bed.server_address), flush=True)
    bed.serve_forever()
    bed.close_connections()
    bed.server_close()  # waits for the connections' threads
    return 0


if __name__ == "__main__":
    sys.exit(main())
