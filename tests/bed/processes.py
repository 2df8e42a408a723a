"""What the programs of the bed have in common."""

import os


class Refused(Exception):
    """A request that cannot be met; its text goes to the client."""


def bound_to_this_process(command):
    """The same command, ended by the system if this process dies without ending it."""
    return ["setpriv", "--pdeathsig", "TERM", *command]


def without_preload():
    return {name: value for name, value in os.environ.items() if name != "LD_PRELOAD"}
