"""One ordinary user plants links and FIFOs in the per-user installation of another.

Ann installs for herself. What her installation lets everybody change, the guest has changed before
she runs the installer again; nothing of her own outside of the installation may change.
"""

import os

import pytest

from harness.attacks import (
    ACTIONS,
    DEPLOYING,
    INSTALLING,
    REMOVING,
    Untouched,
    ends,
    no_permission,
    prepare,
    refused_modes,
)
from harness.checks import not_printed, printed_lines, same_lines
from harness.machine import ROOT, SPB
from harness.shared_machine import ANN, GUEST, HER_LETTER, HER_OWN, SHADOW, SharedMachine, why_not

pytestmark = pytest.mark.skipif(why_not() is not None, reason=str(why_not()))

HOME = "/home/ann/corvan/zor"
REGISTRY = "/home/ann/.zor/zor.ini"
BIN_ETC = HOME + "/bin/etc"
CUSTOM = HOME + "/bin/customscanners"
HER_NOTHING = "/home/ann/.forward"
TARGETS = {
    "her directory": HER_OWN,
    "her file": HER_LETTER,
    "nothing": HER_NOTHING,
    "the system's file": SHADOW,
}
SCANNERS = ("trawlfs", "trawlhw", "trawlvpd", "trawlsw", "trawlcfg")
CUSTOM_FILES = {
    "bin/customscanners/": b"",
    "bin/customscanners/site.sh": b"echo site\n",
    "bin/customscanners/sub/": b"",
    "bin/customscanners/sub/run.sh": b"run\n",
}


@pytest.fixture
def machine(binary):
    fresh = SharedMachine(binary)
    fresh.pack(CUSTOM_FILES)
    yield fresh
    fresh.delete()


def named(values):
    return {"argvalues": values.values(), "ids": values.keys()}


def hers(machine):
    return Untouched(
        machine, without=("/etc/zor", "/etc/kel", HOME, "/home/ann/.zor", "/home/ann/corvan")
    )


def prepare_hers(machine, action):
    prepare(machine, action, HOME, REGISTRY, ANN)


def run(machine, action):
    return machine.run(*ACTIONS[action], user=ANN)


@pytest.mark.parametrize("target", **named(TARGETS))
@pytest.mark.parametrize("action", INSTALLING)
def test_no_mode_is_set_through_the_neighbours_links(machine, action, target):
    prepare_hers(machine, action)
    for name in SCANNERS:
        machine.link_as(GUEST, f"{BIN_ETC}/{name}", target)

    with hers(machine):
        outcome = run(machine, action)

    same_lines(refused_modes(outcome), [no_permission(f"{BIN_ETC}/{name}") for name in SCANNERS])
    ends(outcome, 0)


@pytest.mark.parametrize("target", **named(TARGETS))
@pytest.mark.parametrize("action", REMOVING)
def test_a_removal_deletes_the_neighbours_links_only(machine, action, target):
    prepare_hers(machine, action)
    for name in SCANNERS:
        machine.link_as(GUEST, f"{BIN_ETC}/{name}", target)

    with hers(machine):
        outcome = run(machine, action)

    printed_lines(outcome, f"RMDIR: {BIN_ETC}")
    ends(outcome, 0)
    assert not machine.exists(BIN_ETC)


@pytest.mark.parametrize("action", INSTALLING)
def test_the_neighbours_fifos_do_not_block_the_run(machine, action):
    prepare_hers(machine, action)
    for name in SCANNERS:
        machine.fifo_as(GUEST, f"{BIN_ETC}/{name}")

    with hers(machine):
        outcome = run(machine, action)

    # Setting the mode of another user's file is not permitted.
    same_lines(refused_modes(outcome), [no_permission(f"{BIN_ETC}/{name}") for name in SCANNERS])
    ends(outcome, 0)


@pytest.mark.parametrize("target", **named(TARGETS))
@pytest.mark.parametrize("action", DEPLOYING)
def test_a_file_of_the_package_takes_the_place_of_the_neighbours_link(machine, action, target):
    prepare_hers(machine, action)
    scanner = CUSTOM + "/site.sh"
    machine.as_user(GUEST, lambda: os.unlink(machine.at(scanner)))
    machine.link_as(GUEST, scanner, target)

    with hers(machine):
        outcome = run(machine, action)

    ends(outcome, 0)
    assert machine.state(scanner)[scanner].kind == "f"
    assert machine.read_bytes(scanner) == b"echo site\n"
    assert machine.owner(scanner) == ANN.uid
    assert not machine.exists(scanner + ".bak")


@pytest.mark.parametrize("target", **named(TARGETS))
@pytest.mark.parametrize("action", DEPLOYING)
def test_nothing_is_extracted_below_the_neighbours_link(machine, action, target):
    prepare_hers(machine, action)
    sub = machine.at(CUSTOM + "/sub")
    machine.as_user(GUEST, lambda: os.rename(sub, sub + ".moved"))
    machine.link_as(GUEST, CUSTOM + "/sub", target)

    with hers(machine):
        outcome = run(machine, action)

    printed_lines(
        outcome,
        "Bin dir file extraction failed",
        "File extraction failed, error = 11 (Cannot create directory)",
    )
    ends(outcome, 1)


@pytest.mark.parametrize("target", **named(TARGETS))
def test_no_traces_directory_is_made_below_the_neighbours_link(machine, target):
    machine.link_as(GUEST, "/home/guest/traces", target)

    with hers(machine):
        outcome = machine.run("i", "ABC", "-s", SPB, "-c", "/home/guest/traces/hers", user=ANN)

    printed_lines(outcome, "Setting logs dir='/home/guest/traces/hers'")
    ends(outcome, 0)


def test_a_private_removal_empties_no_directory_through_the_neighbours_link(machine):
    machine.link_as(GUEST, "/home/guest/hers", HER_OWN)

    with hers(machine):
        outcome = machine.run("r", "ABC", "-p", "-d", "/home/guest/hers", user=ANN)

    not_printed(outcome, "DEL: ")
    ends(outcome, 0)


def test_no_log_is_written_through_the_neighbours_link(machine):
    machine.link_as(GUEST, "/home/guest/log", HER_LETTER)

    with hers(machine):
        outcome = machine.run("i", "ABC", "-s", SPB, "-o", "/home/guest/log", user=ANN)

    ends(outcome, 0)


@pytest.mark.parametrize("owner", [ANN, ROOT], ids=["her own", "root's"])
def test_her_own_links_and_roots_are_followed(machine, owner):
    prepare_hers(machine, "registration")
    machine.make_directory("/home/ann/scanner", 0o700)
    machine.give_to(ANN, "/home/ann/scanner")
    machine.link(BIN_ETC + "/trawlfs", "/home/ann/scanner")
    machine.give_to(owner, BIN_ETC + "/trawlfs")

    outcome = run(machine, "registration")

    assert refused_modes(outcome) == []
    ends(outcome, 0)
    assert machine.mode("/home/ann/scanner") == 0o777


def test_root_refuses_links_of_a_user_whose_installation_it_changes(machine):
    """Root works on Ann's directory with -d; she is a stranger then."""
    machine.as_user(ANN, lambda: os.makedirs(machine.at("/home/ann/shared/config")))
    machine.link_as(ANN, "/home/ann/shared/bin", "/etc/secret")

    with Untouched(machine, without=("/etc/zor", "/etc/kel", "/home/ann/shared")):
        outcome = machine.run("i", "ABC", "-s", SPB, "-d", "/home/ann/shared")

    printed_lines(outcome, "File extraction failed, error = 11 (Cannot create directory)")
    ends(outcome, 1)
