"""What the tests of a shared machine have in common: an installation, and checks after a run."""

import os

from harness.machine import ROOT, SPB
from harness.shared_machine import OUTSIDE, same_state

HOME = "/opt/corvan/zor"
BIN_ETC = HOME + "/bin/etc"
INDEX = HOME + "/ZOR_files"
PROBE = HOME + "/$_ZOR_$"
COMMON = "/usr/kel/corvan/common"

# The installation's own places outside of its home.
ITS_OWN = ("/etc/zor", "/etc/kel")

# What each action finds, and its arguments.
ACTIONS = {
    "installation": ("i", "XYZ", "-s", SPB),
    "upgrade": ("i", "XYZ", "-s", SPB),
    "registration": ("i", "XYZ", "-s", SPB),
    "removal": ("r", "ABC"),
    "removal by known places": ("r", "ABC"),
}
INSTALLING = ("installation", "upgrade", "registration")
DEPLOYING = ("installation", "upgrade")
REMOVING = ("removal", "removal by known places")


def install(machine, *options, user=ROOT):
    """Installs for exploiter ABC, which must succeed."""
    outcome = machine.run("i", "ABC", "-s", SPB, *options, user=user)
    assert outcome.status == 0, outcome.stdout + outcome.stderr


def prepare(machine, action, home=HOME, registry="/etc/zor/zor.ini", user=ROOT):
    """Installs the toolkit and makes the machine one on which `action` does what its name says."""
    install(machine, user=user)
    if action == "installation":
        machine.remove(os.path.dirname(registry))
    elif action == "upgrade":
        register(machine, user, registry, home, "9.1.7.0003", "21/03/04")
    elif action == "registration":
        register(machine, user, registry, home, "9.9.0.0001", "23/01/02")
    elif action == "removal by known places":
        # With a directory in its place, the index can be neither read nor written.
        machine.remove(home + "/ZOR_files")
        machine.make_directory(home + "/ZOR_files")


def register(machine, user, registry, home, version, date):
    machine.register(home, version, date, path=registry)
    if user is not ROOT:
        machine.give_to(user, registry)


class Untouched:
    """A context in which everything in `places` but what is in `without` must stay as it was."""

    def __init__(self, machine, places=OUTSIDE, without=ITS_OWN):
        self.look = lambda: machine.state(*places, without=without)

    def __enter__(self):
        self.before = self.look()

    def __exit__(self, kind, *_):
        if kind is None:
            same_state(self.look(), self.before)


def no_permission(path):
    """What the permission pass prints of a path whose mode it does not set."""
    return f"Unable to change permissions to '{path}' file/directory"


def refused_modes(outcome):
    """The lines of the permission pass about modes that it did not set."""
    return [
        line
        for line in outcome.stdout.splitlines()
        if line.startswith("Unable to change permissions")
    ]


def ends(outcome, status):
    """Checks the exit status, and shows the output of a run that ended otherwise."""
    assert outcome.status == status, (
        f"exit status expected: {status}, came: {outcome.status}\n{outcome.stdout}"
        f"{outcome.stderr}"
    )
