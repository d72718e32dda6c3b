"""zorctl next to other users: what they plant neither misleads it, holds it up, nor fills it."""

import os

import pytest

from harness.machine import SPB
from harness.shared_machine import ANN, GUEST, KEY, SECRET, SharedMachine, why_not
from harness.zorctl import report, zorctl

pytestmark = pytest.mark.skipif(why_not() is not None, reason=str(why_not()))

HOME = "/opt/corvan/zor"
OPEN = HOME + "/bin/customscanners"  # where everybody may create


@pytest.fixture
def machine(binary):
    fresh = SharedMachine(binary)
    fresh.make_directory("/run")
    yield fresh
    fresh.delete()


@pytest.fixture
def installed(machine):
    assert machine.run("i", "SHOP", "-s", SPB).status == 0
    return machine


# status --all-users


def users(machine, status=0, user=None):
    found = report(
        machine, "status", "--all-users", status=status, **({"user": user} if user else {})
    )
    return {
        one["user"]: (one["health"], one["registry"]["state"])
        for one in found["installations"]
        if one["type"] == "local"
    }


def test_root_sees_the_installation_of_every_user(installed):
    assert installed.run("i", "ANNS", "-s", SPB, user=ANN).status == 0

    assert users(installed) == {"root": ("absent", "missing"), "ann": ("intact", "complete")}


def test_root_sees_with_the_rights_of_the_user(installed):
    """A link of the user's shows nothing that the user may not read, nor that it exists."""
    registry = installed.read_bytes("/etc/zor/zor.ini")
    installed.plant(SECRET + "/zor.ini", registry, 0o600)
    installed.as_user(GUEST, lambda: os.mkdir(installed.at("/home/guest/.zor")))
    installed.link_as(GUEST, "/home/guest/.zor/zor.ini", SECRET + "/zor.ini")

    assert users(installed)["guest"] == ("unknown", "unreadable")


def test_a_user_does_not_see_what_others_keep_closed(installed):
    assert installed.run("i", "ANNS", "-s", SPB, user=ANN).status == 0
    installed.change_mode("/home/ann", 0o700)

    assert users(installed, user=GUEST) == {
        "guest": ("absent", "missing"),
        "root": ("unknown", "unreadable"),
        "ann": ("unknown", "unreadable"),
    }


def test_no_user_can_hold_root_up(installed):
    def plant():
        os.mkdir(installed.at("/home/guest/.zor"))
        os.mkfifo(installed.at("/home/guest/.zor/zor.ini"))

    installed.as_user(GUEST, plant)

    assert users(installed, status=1)["guest"] == ("damaged", "not-regular")


# plan


def test_a_plan_follows_no_links_below_a_directory_that_goes(installed):
    """Two links to their own directory would lead to endless paths."""
    for name in ("a", "b"):
        installed.link(f"{HOME}/properties/{name}", ".")

    found = report(installed, "plan", "i", "DESK", "-s", SPB)

    own = [HOME + "/properties/a", HOME + "/properties/b"]
    assert found["deleted_of_owner"] == own
    assert [path for path in found["not_restored"] if path.startswith(own[0][:-1])] == [
        *own,
        HOME + "/properties/scan.properties",
    ]
