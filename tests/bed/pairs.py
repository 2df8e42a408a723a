"""Pairs of serial ports: what is written to one comes out of the other, as with a null modem."""

import os
import pty
import select
import termios
import threading
import tty

READ_SIZE = 4096


class Pair:
    """Two pseudo-terminals that are joined."""

    def __init__(self, links):
        self._links = links
        self._wake, self._waker = os.pipe()
        masters = []
        self._open = [self._wake]
        for link in links:
            master, slave = pty.openpty()
            # The slave stays open, so that a program that closes the port does not hang up the line.
            self._open += [master, slave]
            masters.append(master)
            os.set_blocking(master, False)
            self._prepare(slave)
            os.symlink(os.ttyname(slave), link)
        ways = [masters, list(reversed(masters))]
        self._threads = [threading.Thread(target=self._carry, args=way, daemon=True) for way in ways]
        for thread in self._threads:
            thread.start()

    @staticmethod
    def _prepare(slave):
        tty.setraw(slave)
        settings = termios.tcgetattr(slave)
        # Wine reads speed 0 from a pseudo-terminal that nobody set.
        settings[4] = settings[5] = termios.B9600
        termios.tcsetattr(slave, termios.TCSANOW, settings)

    def _carry(self, source, target):
        waiting = b""
        while True:
            readers = [self._wake] if waiting else [self._wake, source]
            writers = [target] if waiting else []
            readable, _, _ = select.select(readers, writers, [])
            if self._wake in readable:
                return
            if waiting:
                waiting = waiting[os.write(target, waiting) :]
            else:
                waiting = os.read(source, READ_SIZE)

    def close(self):
        os.close(self._waker)
        for thread in self._threads:
            thread.join()
        for link in self._links:
            os.unlink(link)
        for descriptor in self._open:
            os.close(descriptor)
