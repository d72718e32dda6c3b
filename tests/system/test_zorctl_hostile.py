"""zorctl next to other users: what they plant neither misleads it, holds it up, nor fills it."""

import os

import pytest

from harness.machine import SPB
from harness.shared_machine import ANN, GUEST, SECRET, SharedMachine, why_not
from harness.zorctl import report, zorctl

pytestmark = pytest.mark.skipif(why_not() is not None, reason=str(why_not()))

HOME = "/opt/corvan/zor"
OPEN = HOME + "/bin/etc"  # where everybody may create


@pytest.fixture
def machine(binary):
    fresh = SharedMachine(binary)
    fresh.plant("/run/wzorinst.lock")
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


# verify


def foreign(machine, **options):
    found = report(machine, "verify", SPB, **options)
    return [(one["kind"], one["path"]) for one in found["differences"]]


def test_verify_finds_what_is_deep_down(installed):
    """Deeper than the process may have files open."""
    levels = 100

    def plant():
        os.chdir(installed.at(OPEN))
        for _ in range(levels):
            os.mkdir("d")
            os.chdir("d")
        with open("deep", "wb"):
            pass

    installed.as_user(GUEST, plant)

    few = ("/bin/sh", "-c", 'ulimit -n 32; exec "$0" "$@"')
    assert foreign(installed, tool=few) == [("foreign", OPEN + "/d" * levels + "/deep")]


def test_verify_says_where_it_cannot_look(installed):
    """A path may have 4095 bytes."""
    name = "d" * 250

    def plant():
        os.chdir(installed.at(OPEN))
        for _ in range(17):
            os.mkdir(name)
            os.chdir(name)

    installed.as_user(GUEST, plant)

    assert foreign(installed, status=2) == [("unknown", OPEN + ("/" + name) * 17)]


def test_verify_follows_no_link_of_others(installed):
    installed.link_as(GUEST, OPEN + "/loop", ".")
    installed.link_as(GUEST, OPEN + "/secret", SECRET)

    assert foreign(installed) == [("foreign", OPEN + "/loop"), ("foreign", OPEN + "/secret")]


def test_verify_says_what_a_user_may_not_look_at(installed):
    found = report(installed, "verify", SPB, "--type", "global", user=ANN, status=2)

    assert {one["kind"] for one in found["differences"]} == {"unknown"}
    assert HOME + "/install" in [one["path"] for one in found["differences"]]


# run


@pytest.fixture
def ready(machine):
    """A machine with spb next to zorctl, and a place for copies and logs."""
    machine.make_directory("/var/tmp", 0o1777)
    machine.make_directory("/var/log")
    with open(os.environ["SPB"], "rb") as file:
        machine.plant("/media/spb", file.read(), 0o755)
    return machine


@pytest.mark.parametrize(
    "place, owner, mode, used",
    [
        ("/srv/tmp", None, 0o700, "/srv/tmp"),
        ("/srv/tmp", None, 0o1777, "/srv/tmp"),
        ("/srv/tmp", None, 0o777, "/var/tmp"),
        ("/home/guest/tmp", GUEST, 0o755, "/var/tmp"),
        ("/home/guest/tmp", None, 0o700, "/var/tmp"),
    ],
    ids=["closed", "sticky", "open", "of another user", "below another user's"],
)
def test_the_copy_is_where_nobody_else_can_exchange_it(ready, place, owner, mode, used):
    ready.make_directory(place, mode)
    if owner:
        ready.give_to(owner, place)

    outcome = zorctl(ready, "run", "--", "i", "SHOP", "-s", SPB, environment={"TMPDIR": place})

    assert outcome.status == 0
    assert f"SPB file: {used}/zorctl-" in outcome.stdout


def test_without_a_safe_place_nothing_is_run_or_deleted(ready):
    ready.remove("/var/tmp")
    ready.give_to(GUEST, "/tmp")
    ready.plant("/signers", "mine\n")

    outcome = zorctl(ready, "run", "--", "i", "SHOP", "-s", SPB)

    assert (outcome.status, outcome.stdout) == (2, "")
    assert outcome.stderr == "zorctl: cannot create a directory for the package\n"
    assert ready.exists("/signers") and not ready.exists(HOME)


# doctor


def interrupt_upgrade(machine):
    """Leaves what a kill in the middle of an extraction leaves."""
    machine.plant(HOME + "/bin/trawlhw.bak", machine.read_bytes(HOME + "/bin/trawlhw"), 0o755)
    machine.plant(HOME + "/bin/trawlhw", b"half of", 0o600)
    machine.plant(HOME + "/ZOR_files", "# File created by ZOR: 22/12/02zor_9.2.30.0000\n")


def doctored(machine):
    """Codes of the advice, and the restored paths, of a repair."""
    found = report(machine, "doctor", "--apply", status=1)
    return (
        {one["code"] for one in found["advice"]},
        [one["path"] for one in found["actions"] if one["action"] == "restore"],
    )


def test_doctor_restores_no_backup_of_another_user(installed):
    interrupt_upgrade(installed)
    installed.give_to(GUEST, HOME + "/bin/trawlhw.bak")

    assert doctored(installed) == ({"untrusted-backup", "reinstall"}, [])
    assert installed.read(HOME + "/bin/trawlhw") == "half of"


@pytest.mark.parametrize("place", [HOME + "/bin", HOME, "/opt/corvan"])
def test_doctor_restores_nothing_in_a_directory_of_another_user(installed, place):
    interrupt_upgrade(installed)
    installed.give_to(GUEST, place)

    assert doctored(installed) == ({"untrusted-backup", "reinstall"}, [])
    assert installed.read(HOME + "/bin/trawlhw") == "half of"


def test_doctor_does_not_look_for_backups_through_a_link_of_another_user(installed):
    interrupt_upgrade(installed)
    os.rename(installed.at(HOME + "/bin"), installed.at("/opt/bin"))
    installed.link(HOME + "/bin", "/opt/bin")
    installed.give_to(GUEST, HOME + "/bin")

    advice, restored = doctored(installed)

    assert restored == []
    assert installed.read("/opt/bin/trawlhw") == "half of"
    assert "reinstall" in advice


def test_a_planted_backup_is_no_sign_of_an_upgrade(machine):
    """Else root would repeat the end of one, with the administrator's settings."""
    scanner = HOME + "/bin/customscanners/site.sh"
    machine.pack({"bin/customscanners/": b"", "bin/customscanners/site.sh": b"echo site\n"})
    assert machine.run("i", "SHOP", "-s", SPB).status == 0
    machine.as_user(GUEST, lambda: os.mknod(machine.at(scanner + ".bak")))

    found = report(machine, "doctor", "--apply", status=1)

    assert (found["interrupted"], found["actions"]) == (None, [])
    assert [one["code"] for one in found["advice"]] == ["untrusted-backup"]
