"""Windows programs, with their output on pipes or on a terminal."""

import fcntl
import os
import pty
import signal
import struct
import subprocess
import termios
import threading

from processes import Refused, bound_to_this_process
from screen import Screen

TERMINAL_ROWS = 50
TERMINAL_COLUMNS = 100


def pipe_without_reader():
    reader, writer = os.pipe()
    os.close(reader)
    return writer


class Job:
    """A Windows program with its output on pipes."""

    def __init__(self, command, folder, closed=False):
        self._condition = threading.Condition()
        self._chunks = {"output": [], "errors": []}
        output = pipe_without_reader() if closed else subprocess.PIPE
        self._process = subprocess.Popen(
            bound_to_this_process(command),
            cwd=folder,
            stdin=subprocess.DEVNULL,
            stdout=output,
            stderr=subprocess.PIPE,
            start_new_session=True,
        )
        streams = {"output": self._process.stdout, "errors": self._process.stderr}
        if closed:
            os.close(output)
            del streams["output"]
        self._open_streams = len(streams)
        for name, stream in streams.items():
            threading.Thread(target=self._read, args=(name, stream), daemon=True).start()

    def _read(self, name, stream):
        while chunk := os.read(stream.fileno(), 4096):
            with self._condition:
                self._chunks[name].append(chunk)
                self._condition.notify_all()
        with self._condition:
            self._open_streams -= 1
            self._condition.notify_all()

    def _text(self, name):
        return b"".join(self._chunks[name]).decode(errors="replace").replace("\r\n", "\n")

    def _has_shown(self, text):
        return text in self._text("output") or text in self._text("errors")

    def expect(self, text, seconds):
        with self._condition:
            self._condition.wait_for(
                lambda: self._open_streams == 0 or self._has_shown(text), seconds
            )
            if not self._has_shown(text):
                raise Refused(f"no {text!r} in the output: {self._text('output')!r}")

    def interrupt(self):
        self._process.send_signal(signal.SIGINT)

    def finish(self, seconds):
        with self._condition:
            ended = self._condition.wait_for(lambda: self._open_streams == 0, seconds)
        if not ended:
            self.kill()
            raise Refused(f"the program did not end: {self._text('output')!r}")
        return {
            "status": self._process.wait(),
            "output": self._text("output"),
            "errors": self._text("errors"),
            "history": [],
        }

    def kill(self):
        self._process.kill()
        self._process.wait()


class TerminalJob:
    """A Windows program that has a console."""

    def __init__(self, command, folder):
        self._condition = threading.Condition()
        self._screen = Screen(TERMINAL_ROWS, TERMINAL_COLUMNS)
        self._open = True
        self._master, slave = pty.openpty()
        size = struct.pack("HHHH", TERMINAL_ROWS, TERMINAL_COLUMNS, 0, 0)
        fcntl.ioctl(slave, termios.TIOCSWINSZ, size)
        self._process = subprocess.Popen(
            # setsid --ctty makes the pseudo-terminal the controlling one, as a console needs.
            bound_to_this_process(["setsid", "--ctty", *command]),
            cwd=folder,
            stdin=slave,
            stdout=slave,
            stderr=slave,
        )
        os.close(slave)
        threading.Thread(target=self._read, daemon=True).start()

    def _read(self):
        while True:
            try:
                chunk = os.read(self._master, 4096)
            except OSError:  # what a pseudo-terminal gives when the other side has closed it
                chunk = b""
            with self._condition:
                self._screen.feed(chunk)
                if not chunk:
                    self._open = False
                    os.close(self._master)
                self._condition.notify_all()
                if not self._open:
                    return

    def expect(self, text, seconds):
        with self._condition:
            self._condition.wait_for(lambda: not self._open or self._screen.has_shown(text), seconds)
            if not self._screen.has_shown(text):
                raise Refused(f"no {text!r} on the screen: {self._screen.text()!r}")

    def interrupt(self):
        with self._condition:
            if not self._open:
                raise Refused("the program has ended")
            os.write(self._master, b"\x03")

    def finish(self, seconds):
        with self._condition:
            ended = self._condition.wait_for(lambda: not self._open, seconds)
        if not ended:
            self.kill()
            raise Refused(f"the program did not end: {self._screen.text()!r}")
        status = self._process.wait()
        return {
            "status": status,
            "output": self._screen.text(),
            "errors": "",
            "history": self._screen.history(),
        }

    def kill(self):
        self._process.kill()
        self._process.wait()
