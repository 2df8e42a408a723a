"""Helpers for all programs that the bed starts."""

import os


class Refused(Exception):
    """A request that failed; its text is sent to the client."""


def bound_to_this_process(command):
    """The same command; the system ends it if this process dies first."""
    return ["setpriv", "--pdeathsig", "TERM", *command]


def without_preload():
    return {name: value for name, value in os.environ.items() if name != "LD_PRELOAD"}
