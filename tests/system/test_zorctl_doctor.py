"""zorctl doctor: what an interrupted run left, and putting it right.

scripts/doctor_sweep kills runs at every point; these are the rules one by one.
"""

import fcntl
import os

import pytest

from harness.machine import SPB
from harness.zorctl import report, zorctl

HOME = "/opt/corvan/zor"
INI = "/etc/zor/zor.ini"


@pytest.fixture
def installed(machine):
    machine.make_directory("/run")
    assert machine.run("i", "SHOP", "-s", SPB).status == 0
    return machine


def doctor(machine, *arguments, status):
    found = report(machine, "doctor", *arguments, status=status)
    return (
        found["interrupted"],
        [(one["action"], one["path"]) for one in found["actions"]],
        [one["code"] for one in found["advice"]],
    )


def interrupt_upgrade(machine):
    """Leaves what a kill in the middle of an extraction leaves."""
    machine.plant(HOME + "/bin/trawlhw.bak", machine.read_bytes(HOME + "/bin/trawlhw"), 0o755)
    machine.plant(HOME + "/bin/trawlhw", b"half of", 0o600)
    machine.plant(HOME + "/ZOR_files", "# File created by ZOR: 22/12/02zor_9.2.30.0000\n")


def test_an_intact_installation_needs_nothing(installed):
    before = installed.tree("/etc", "/opt", "/usr")

    assert doctor(installed, "--apply", status=0) == (None, [], [])
    assert installed.tree("/etc", "/opt", "/usr") == before


def test_nothing_installed_ends_with_3(machine):
    machine.make_directory("/run")

    assert doctor(machine, "--apply", status=3) == (None, [], [])


def test_it_only_reports_unless_asked_to_act(installed):
    interrupt_upgrade(installed)
    before = installed.tree("/etc", "/opt", "/usr")

    interrupted, actions, _ = doctor(installed, status=1)

    assert interrupted == "upgrade"
    assert ("restore", HOME + "/bin/trawlhw") in actions
    assert installed.tree("/etc", "/opt", "/usr") == before


def test_an_interrupted_extraction_goes_back_to_the_old_files(installed):
    old = installed.read_bytes(HOME + "/bin/trawlhw")
    interrupt_upgrade(installed)

    _, actions, advice = doctor(installed, "--apply", status=1)

    assert [action for action, _ in actions] == [
        "restore",
        "rebuild-index",
        "set-modes",
        "enable-scanners",
    ]
    assert advice == ["reinstall"]
    assert installed.read_bytes(HOME + "/bin/trawlhw") == old
    assert not installed.exists(HOME + "/bin/trawlhw.bak")
    assert installed.logged_commands()[-1] == HOME + "/bin/trawlcfg [-enable] [all]"
    assert zorctl(installed, "status").status == 0


def test_an_interrupted_commit_goes_forward(installed):
    for name in ("bin/trawlhw", "config/ZorHWConfig.xml"):
        installed.plant(f"{HOME}/{name}.bak", b"old")
    installed.plant(INI + ".bak", b"old")

    interrupted, actions, _ = doctor(installed, "--apply", status=0)

    assert interrupted == "upgrade"
    assert [action for action, _ in actions] == [
        "delete-backup",
        "customise",
        "delete-backup",
        "delete-backup",
        "set-modes",
        "delete-cache",
        "enable-scanners",
    ]
    assert not installed.exists(HOME + "/cache_data")
    assert not installed.exists(HOME + "/bin/trawlhw.bak")
    assert installed.read_bytes(HOME + "/bin/trawlhw") != b"old"


def test_an_empty_registry_with_a_complete_backup_is_restored(installed):
    old = installed.read(INI)
    installed.plant(INI + ".bak", old)
    installed.plant(INI, "")

    assert doctor(installed, "--apply", status=0) == (
        "registration",
        [("restore-registry", INI)],
        [],
    )
    assert installed.read(INI) == old


def test_a_backup_in_a_directory_that_others_may_write_to_is_not_restored(installed):
    interrupt_upgrade(installed)
    installed.change_mode(HOME + "/bin", 0o777)

    _, actions, advice = doctor(installed, "--apply", status=1)

    assert "untrusted-backup" in advice
    assert "restore" not in [action for action, _ in actions]
    assert installed.read(HOME + "/bin/trawlhw") == "half of"


def test_a_link_is_no_backup(installed):
    interrupt_upgrade(installed)
    installed.remove(HOME + "/bin/trawlhw.bak")
    installed.link(HOME + "/bin/trawlhw.bak", "/etc/passwd")

    _, actions, advice = doctor(installed, "--apply", status=1)

    assert "untrusted-backup" in advice
    assert "restore" not in [action for action, _ in actions]


def test_a_backup_with_another_name_is_not_restored(installed):
    interrupt_upgrade(installed)
    os.link(installed.at(HOME + "/bin/trawlhw.bak"), installed.at("/opt/other"))

    _, actions, advice = doctor(installed, "--apply", status=1)

    assert "untrusted-backup" in advice
    assert "restore" not in [action for action, _ in actions]


def test_an_interrupted_removal_is_finished(installed):
    listed = [
        line
        for line in installed.read(HOME + "/ZOR_files").splitlines()
        if not line.startswith("#")
    ]
    for path in sorted(listed):
        if installed.exists(path):
            installed.remove(path)
        if path.endswith("/trawlcfg"):
            break

    assert doctor(installed, "--apply", status=3) == ("removal", [("finish-removal", HOME)], [])
    assert not installed.exists(HOME) and not installed.exists(INI)


@pytest.mark.parametrize(
    "careless",
    [
        lambda machine: machine.remove(HOME + "/bin"),
        lambda machine: machine.remove(HOME + "/bin/trawlcfg"),
        lambda machine: machine.plant(INI, machine.read(INI).replace("SHOP:", "SHOP:DESK:")),
    ],
    ids=["bin deleted", "control deleted", "another exploiter"],
)
def test_a_careless_deletion_is_not_taken_for_a_removal(installed, careless):
    careless(installed)
    installed.plant(HOME + "/config/mine", b"mine")
    if installed.exists(HOME + "/bin/trawlcfg"):
        for path in ("/bin/libzorcore.so", "/bin/trawlcfg"):
            installed.remove(HOME + path)

    _, actions, advice = doctor(installed, "--apply", status=1)

    assert "finish-removal" not in [action for action, _ in actions]
    assert "broken" in advice
    assert installed.exists(HOME + "/config/mine") and installed.exists(INI)


def test_an_unregistered_tree_is_left_to_the_administrator(installed):
    installed.remove(INI)

    assert doctor(installed, "--apply", status=3) == ("installation", [], ["unregistered-files"])
    assert installed.exists(HOME + "/bin/trawlcfg")


def test_it_does_not_start_while_another_run_holds_the_lock(installed):
    installed.plant("/run/wzorinst.lock")
    interrupt_upgrade(installed)
    with open(installed.at("/run/wzorinst.lock"), "rb") as lock:
        fcntl.flock(lock, fcntl.LOCK_EX)

        outcome = zorctl(installed, "doctor", "--apply")

    assert (outcome.status, outcome.stderr) == (
        75,
        "zorctl: cannot take the lock /run/wzorinst.lock\n",
    )
    assert installed.exists(HOME + "/bin/trawlhw.bak")
