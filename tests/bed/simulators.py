"""Simulated receivers on serial ports."""

import os
import signal
import subprocess
import threading
import time

from processes import Refused, bound_to_this_process, without_preload

START_SECONDS = 20
STOP_SECONDS = 20


class Simulator:
    """One rcvlink-sim on one port."""

    def __init__(self, program, link, arguments):
        self._link = link
        self._process = subprocess.Popen(
            bound_to_this_process([program, *arguments, "--link", link]),
            stdin=subprocess.DEVNULL,
            stdout=subprocess.PIPE,
            stderr=subprocess.PIPE,
            env=without_preload(),
            start_new_session=True,
        )
        self._errors = []
        self._error_reader = threading.Thread(target=self._read_errors, daemon=True)
        self._error_reader.start()
        self._wait_until_open()

    def _read_errors(self):
        for line in self._process.stderr:
            self._errors.append(line.decode(errors="replace"))

    def _wait_until_open(self):
        timer = threading.Timer(START_SECONDS, self._process.kill)
        timer.start()
        name = self._process.stdout.readline()
        timer.cancel()
        if not name:
            status = self._process.wait()
            self._error_reader.join()
            self._remove_link()
            raise Refused(f"the simulator ended with {status}: {''.join(self._errors).strip()}")

    def _remove_link(self):
        if os.path.islink(self._link):
            os.unlink(self._link)

    def pause(self):
        self._process.send_signal(signal.SIGSTOP)
        while self._process.poll() is None and self._state() != "T":
            time.sleep(0.001)

    def _state(self):
        with open(f"/proc/{self._process.pid}/stat", encoding="utf-8") as file:
            return file.read().rpartition(")")[2].split()[0]

    def resume(self):
        self._process.send_signal(signal.SIGCONT)

    def errors(self):
        return "".join(self._errors).strip()

    def status(self):
        return self._process.poll()

    def stop(self):
        self.resume()
        self._process.terminate()
        try:
            status = self._process.wait(STOP_SECONDS)
        except subprocess.TimeoutExpired:
            status = self.kill()
        self._close()
        return status

    def kill(self):
        self._process.kill()
        status = self._process.wait()
        self._close()
        return status

    def _close(self):
        self._remove_link()
        self._error_reader.join()
        self._process.stdout.close()
        self._process.stderr.close()
