"""An ordinary user plants links, FIFOs and hard links where a shared installation lets everybody.

Each test installs, lets the attacker plant with no more rights than any user has, and runs the
installer as root. Nothing outside of the installation may change, and nothing may hang.
"""

import os
import socket

import pytest

from harness.attacks import (
    ACTIONS,
    BIN_ETC,
    COMMON,
    DEPLOYING,
    HOME,
    INDEX,
    INSTALLING,
    PROBE,
    REMOVING,
    Untouched,
    ends,
    install,
    no_permission,
    prepare,
    refused_modes,
)
from harness.checks import not_printed, printed_lines, same_lines, same_text
from harness.installations import SHARED_TRANSCRIPT
from harness.machine import SPB
from harness.shared_machine import ANN as HER
from harness.shared_machine import (
    GUEST,
    HER_OWN,
    KEY,
    NOTHING,
    OUTSIDE,
    SECRET,
    SHADOW,
    SharedMachine,
    why_not,
)

pytestmark = pytest.mark.skipif(why_not() is not None, reason=str(why_not()))

TARGETS = {
    "a system directory": SECRET,
    "a file": SHADOW,
    "another user's directory": HER_OWN,
    "nothing": NOTHING,
}

DIRECTORY_OR_NOTHING = {name: TARGETS[name] for name in ("a system directory", "nothing")}

# Those whose modes the permission pass sets, and those that a removal empties.
SET = ("trawlfs", "trawlhw", "trawlvpd", "trawlsw", "trawlcfg")
EMPTIED = ("trawlhw", "trawluse", "trawlnet", "trawlfs", "trawlsw", "trawlvpd")
SCANNERS = (*SET, "trawluse", "trawlnet")


@pytest.fixture
def machine(binary):
    fresh = SharedMachine(binary)
    yield fresh
    fresh.delete()


def named(values):
    return {"argvalues": values.values(), "ids": values.keys()}


# Below bin/etc, where everybody may create.


@pytest.mark.parametrize("target", **named(TARGETS))
@pytest.mark.parametrize("action", INSTALLING)
def test_no_mode_is_set_through_links_in_bin_etc(machine, action, target):
    prepare(machine, action)
    for name in SCANNERS:
        machine.link_as(GUEST, f"{BIN_ETC}/{name}", target)
    links = machine.state(BIN_ETC)

    with Untouched(machine):
        outcome = machine.run(*ACTIONS[action])

    same_lines(refused_modes(outcome), [no_permission(f"{BIN_ETC}/{name}") for name in SET])
    ends(outcome, 0)
    assert machine.state(BIN_ETC) == links


@pytest.mark.parametrize("target", **named(TARGETS))
@pytest.mark.parametrize("action", REMOVING)
def test_a_removal_deletes_links_in_bin_etc_and_not_what_they_lead_to(machine, action, target):
    prepare(machine, action)
    for name in SCANNERS:
        machine.link_as(GUEST, f"{BIN_ETC}/{name}", target)

    with Untouched(machine):
        outcome = machine.run(*ACTIONS[action])

    for name in SCANNERS:
        printed_lines(outcome, f"DEL: {BIN_ETC}/{name}")
    printed_lines(outcome, f"RMDIR: {BIN_ETC}")
    ends(outcome, 0)
    assert not machine.exists(BIN_ETC)


@pytest.mark.parametrize("action", INSTALLING)
def test_fifos_in_bin_etc_get_their_modes(machine, action):
    prepare(machine, action)
    for name in SET:
        machine.fifo_as(GUEST, f"{BIN_ETC}/{name}")

    with Untouched(machine):
        outcome = machine.run(*ACTIONS[action])

    assert refused_modes(outcome) == []
    ends(outcome, 0)
    assert [machine.mode(f"{BIN_ETC}/{name}") for name in SET] == [0o777] * len(SET)


@pytest.mark.parametrize("action", INSTALLING)
def test_directories_of_mode_000_in_bin_etc_get_their_modes(machine, action):
    prepare(machine, action)
    machine.as_user(GUEST, lambda: os.mkdir(machine.at(BIN_ETC + "/trawlfs"), 0))

    outcome = machine.run(*ACTIONS[action])

    ends(outcome, 0)
    assert machine.mode(BIN_ETC + "/trawlfs") == 0o777
    assert machine.owner(BIN_ETC + "/trawlfs") == GUEST.uid


@pytest.mark.parametrize("action", REMOVING)
def test_a_removal_deletes_fifos_in_bin_etc(machine, action):
    prepare(machine, action)
    for name in EMPTIED:
        machine.fifo_as(GUEST, f"{BIN_ETC}/{name}")

    with Untouched(machine):
        outcome = machine.run(*ACTIONS[action])

    ends(outcome, 0)
    assert not machine.exists(BIN_ETC)


@pytest.mark.parametrize("action", INSTALLING)
def test_no_mode_is_set_through_hard_links_in_bin_etc(machine, action):
    prepare(machine, action)
    board = board_of_all(machine)
    machine.as_user(GUEST, lambda: os.link(board, machine.at(BIN_ETC + "/trawlhw")))

    with Untouched(machine):
        outcome = machine.run(*ACTIONS[action])

    ends(outcome, 0)


def board_of_all(machine):
    """Root's file that everybody may read and write; returns its name on the host."""
    machine.plant("/srv/board", "to all\n", 0o666)
    return machine.at("/srv/board")


@pytest.mark.parametrize("name", ["config", "logs", "_uninst", "bin/plugins"])
def test_a_link_that_was_given_away_is_refused_wherever_it_is(machine, name):
    prepare(machine, "registration")
    if machine.exists(f"{HOME}/{name}"):
        os.rename(machine.at(f"{HOME}/{name}"), machine.at(f"{HOME}/moved"))
    machine.link(f"{HOME}/{name}", SECRET)
    machine.give_to(GUEST, f"{HOME}/{name}")

    with Untouched(machine):
        outcome = machine.run(*ACTIONS["registration"])

    printed_lines(outcome, no_permission(f"{HOME}/{name}"))
    ends(outcome, 0)


def test_a_refused_link_counts_as_a_missing_file(machine):
    prepare(machine, "registration")
    path = f"{HOME}/install/zor_install.properties"
    os.rename(machine.at(path), machine.at("/srv/properties"))
    machine.link(path, "/srv/properties")
    machine.give_to(GUEST, path)

    outcome = machine.run(*ACTIONS["registration"], "-d", HOME)

    printed_lines(outcome, f"Loading file {path} error: 2 (No such file or directory)")
    ends(outcome, 0)


# Below bin/customscanners, where everybody may create and the package may have files.

CUSTOM = HOME + "/bin/customscanners"
SCANNER = CUSTOM + "/site.sh"
SCANNER_BYTES = b"#!/bin/sh\necho site\n"
CUSTOM_FILES = {"bin/customscanners/": b"", "bin/customscanners/site.sh": SCANNER_BYTES}
SUB_FILES = {**CUSTOM_FILES, "bin/customscanners/sub/run.sh": b"run\n"}
SUB_FILES_AND_ENTRY = {
    **CUSTOM_FILES,
    "bin/customscanners/sub/": b"",
    "bin/customscanners/sub/run.sh": b"run\n",
}


def replace_by_link(machine, path, target):
    """What GUEST may do to anything in a directory that everybody may change."""

    def act():
        os.rename(machine.at(path), machine.at(path) + ".moved")
        os.symlink(target, machine.at(path))

    machine.as_user(GUEST, act)


@pytest.mark.parametrize("target", **named(TARGETS))
@pytest.mark.parametrize("action", DEPLOYING)
def test_a_file_of_the_package_takes_the_place_of_a_link(machine, action, target):
    machine.pack(CUSTOM_FILES)
    prepare(machine, action)
    replace_by_link(machine, SCANNER, target)

    with Untouched(machine):
        outcome = machine.run(*ACTIONS[action])

    ends(outcome, 0)
    scanner = machine.state(SCANNER)[SCANNER]
    assert str(scanner) == f"f 0755 0:0 {SCANNER_BYTES!r}"
    assert not machine.exists(SCANNER + ".bak")


@pytest.mark.parametrize("target", **named(TARGETS))
def test_a_rollback_puts_a_link_back(machine, target):
    machine.pack(CUSTOM_FILES)
    prepare(machine, "upgrade")
    replace_by_link(machine, SCANNER, target)
    link = machine.state(SCANNER)
    machine.make_directory("/etc/zor/zor.ini.bak")  # the registry cannot be saved

    with Untouched(machine):
        outcome = machine.run(*ACTIONS["upgrade"])

    printed_lines(outcome, "Installation failed, rolling back")
    ends(outcome, 1)
    assert machine.state(SCANNER, SCANNER + ".bak") == link


@pytest.mark.parametrize("action", DEPLOYING)
def test_a_file_of_the_package_takes_the_place_of_a_fifo(machine, action):
    machine.pack(CUSTOM_FILES)
    prepare(machine, action)
    machine.as_user(GUEST, lambda: os.unlink(machine.at(SCANNER)))
    machine.fifo_as(GUEST, SCANNER)

    with Untouched(machine):
        outcome = machine.run(*ACTIONS[action])

    ends(outcome, 0)
    assert machine.read_bytes(SCANNER) == SCANNER_BYTES
    assert not machine.exists(SCANNER + ".bak")


@pytest.mark.parametrize("target", **named(DIRECTORY_OR_NOTHING))
@pytest.mark.parametrize(
    "files, error",
    [
        (SUB_FILES_AND_ENTRY, "11 (Cannot create directory)"),
        (SUB_FILES, "2 (Cannot open file for writing)"),
    ],
    ids=["with its directory", "without its directory"],
)
@pytest.mark.parametrize("action", DEPLOYING)
def test_nothing_is_extracted_below_a_link(machine, action, files, error, target):
    machine.pack(SUB_FILES_AND_ENTRY)
    prepare(machine, action)
    machine.pack(files)
    replace_by_link(machine, CUSTOM + "/sub", target)
    link = machine.state(CUSTOM + "/sub")

    with Untouched(machine):
        outcome = machine.run(*ACTIONS[action])

    printed_lines(
        outcome, "Bin dir file extraction failed", f"File extraction failed, error = {error}"
    )
    printed_lines(outcome, "Installation failed, rolling back")
    ends(outcome, 1)
    assert machine.state(CUSTOM + "/sub") == link


@pytest.mark.parametrize("target", **named(DIRECTORY_OR_NOTHING))
@pytest.mark.parametrize("action", REMOVING)
def test_a_removal_leaves_what_links_in_customscanners_lead_to(machine, action, target):
    machine.pack(SUB_FILES_AND_ENTRY)
    prepare(machine, action)
    replace_by_link(machine, CUSTOM + "/sub", target)
    machine.link_as(GUEST, CUSTOM + "/dangling", NOTHING)
    run_sh = SECRET + "/run.sh"
    machine.plant(run_sh, "as the file that the index has below the link\n", 0o600)

    with Untouched(machine):
        outcome = machine.run(*ACTIONS[action])

    ends(outcome, 0)


# The common directory, which everybody may rename on the whole way from /usr/kel down.

ARCHIVE = "/etc/archive"
COMMON_LINKS = ("/usr/kel/corvan", COMMON, COMMON + "/ZOR", COMMON + "/ZOR/logs")


def plant_archive(machine):
    """A directory that has what the common directory has, wherever a link to it is planted."""
    for name in ("a", "logs/b", "ZOR/c", "ZOR/logs/d", "common/ZOR/e", "common/ZOR/logs/f"):
        machine.plant(f"{ARCHIVE}/{name}", "kept\n")


@pytest.mark.parametrize("target", **named(DIRECTORY_OR_NOTHING))
@pytest.mark.parametrize("path", COMMON_LINKS)
@pytest.mark.parametrize("action", INSTALLING)
def test_no_directory_is_made_through_links_above_the_logs(machine, action, path, target):
    prepare(machine, action)
    replace_by_link(machine, path, target)

    with Untouched(machine):
        outcome = machine.run(*ACTIONS[action])

    result = 0 if path.startswith(COMMON + "/") else 11
    printed_lines(
        outcome,
        f"Created Corvan Common Dir='{COMMON}' result={result}",
        f"Setting logs dir='{COMMON}/ZOR/logs'",
    )
    ends(outcome, 0)


@pytest.mark.parametrize("path", COMMON_LINKS)
@pytest.mark.parametrize("action", REMOVING)
def test_a_removal_empties_no_directory_through_links_above_the_logs(machine, action, path):
    prepare(machine, action)
    plant_archive(machine)
    replace_by_link(machine, path, ARCHIVE)

    with Untouched(machine):
        outcome = machine.run(*ACTIONS[action])

    ends(outcome, 0)
    not_printed(outcome, f"RMDIR: {COMMON}/ZOR/logs\n")
    if path == COMMON + "/ZOR/logs":
        printed_lines(outcome, f"DEL: {path}")
    else:
        not_printed(outcome, f"{COMMON}/")
        assert machine.state(path)[path].content == ARCHIVE.encode()


@pytest.mark.parametrize("path", COMMON_LINKS)
@pytest.mark.parametrize("action", ["upgrade", "removal"])
def test_fifos_above_the_logs_do_not_hang_a_run(machine, action, path):
    prepare(machine, action)
    machine.as_user(GUEST, lambda: os.rename(machine.at(path), machine.at(path) + ".moved"))
    machine.fifo_as(GUEST, path)

    with Untouched(machine):
        outcome = machine.run(*ACTIONS[action])

    ends(outcome, 0)


def test_single_user_mode_sets_no_mode_through_links_above_the_logs(machine):
    prepare(machine, "upgrade")
    replace_by_link(machine, COMMON + "/ZOR", SECRET)

    with Untouched(machine):
        outcome = machine.run(*ACTIONS["upgrade"], "-r")

    ends(outcome, 0)


# The probe and the index, when another user may create in the home directory.


def open_home(machine, action):
    prepare(machine, action)
    machine.give_to(GUEST, HOME)


NOT_WRITABLE = "*** Error: cannot create file in INI home dir."


@pytest.mark.parametrize("target", **named(TARGETS))
@pytest.mark.parametrize("action", ["upgrade", "registration", "removal"])
def test_the_probe_follows_no_link(machine, action, target):
    open_home(machine, action)
    machine.link_as(GUEST, PROBE, target)
    link = machine.state(PROBE)

    with Untouched(machine):
        outcome = machine.run(*ACTIONS[action])

    printed_lines(
        outcome, "INI file found, verifying...", NOT_WRITABLE, f"Log file is: {HOME}/ZOR_files"
    )
    ends(outcome, 1 if action == "removal" else 0)
    assert machine.state(PROBE) == link


def make_socket(path):
    """Binds a socket; the directory comes first, because the path of a socket is short."""
    os.chdir(os.path.dirname(path))
    socket.socket(socket.AF_UNIX).bind(os.path.basename(path))


def plant_special(machine, kind, path):
    if kind == "fifo":
        machine.fifo_as(GUEST, path)
    else:
        machine.as_user(GUEST, lambda: make_socket(machine.at(path)))


@pytest.mark.parametrize("kind", ["fifo", "socket"])
@pytest.mark.parametrize("action", ["upgrade", "registration", "removal"])
def test_the_probe_does_not_wait(machine, action, kind):
    open_home(machine, action)
    plant_special(machine, kind, PROBE)

    with Untouched(machine):
        outcome = machine.run(*ACTIONS[action])

    printed_lines(outcome, "INI file found, verifying...", NOT_WRITABLE)
    ends(outcome, 1 if action == "removal" else 0)


def test_the_probe_empties_no_file_through_a_hard_link(machine):
    open_home(machine, "registration")
    board = board_of_all(machine)
    machine.as_user(GUEST, lambda: os.link(board, machine.at(PROBE)))

    with Untouched(machine):
        outcome = machine.run(*ACTIONS["registration"])

    printed_lines(outcome, "INI file found, verifying...", NOT_WRITABLE)


def delete_as_guest(machine, path):
    if machine.exists(path):
        machine.as_user(GUEST, lambda: os.unlink(machine.at(path)))


NO_INDEX = f"Warning! Failed to create install log file: {INDEX}"


@pytest.mark.parametrize("target", **named(TARGETS))
@pytest.mark.parametrize("action", [*INSTALLING, "removal"])
def test_the_index_follows_no_link(machine, action, target):
    open_home(machine, action)
    delete_as_guest(machine, INDEX)
    machine.link_as(GUEST, INDEX, target)
    link = machine.state(INDEX)

    with Untouched(machine):
        outcome = machine.run(*ACTIONS[action])

    ends(outcome, 0)
    if action == "removal":
        not_printed(outcome, "RM FILE: ")
        printed_lines(outcome, f"DEL: {INDEX}")
        assert not machine.exists(HOME)
    else:
        assert (NO_INDEX in outcome.stdout) == (action in DEPLOYING)
        assert machine.state(INDEX) == link


@pytest.mark.parametrize("kind", ["fifo", "socket"])
@pytest.mark.parametrize("action", [*INSTALLING, "removal"])
def test_the_index_does_not_wait(machine, action, kind):
    open_home(machine, action)
    delete_as_guest(machine, INDEX)
    plant_special(machine, kind, INDEX)

    with Untouched(machine):
        outcome = machine.run(*ACTIONS[action])

    assert (NO_INDEX in outcome.stdout) == (action in DEPLOYING)
    ends(outcome, 0)


@pytest.mark.parametrize("action", ["installation", "upgrade", "registration"])
def test_the_index_is_not_written_through_a_hard_link(machine, action):
    open_home(machine, action)
    board = board_of_all(machine)
    delete_as_guest(machine, INDEX)
    machine.as_user(GUEST, lambda: os.link(board, machine.at(INDEX)))

    with Untouched(machine):
        outcome = machine.run(*ACTIONS[action])

    assert (NO_INDEX in outcome.stdout) == (action in DEPLOYING)
    ends(outcome, 0)


def test_a_failed_extraction_deletes_a_link_at_the_index_and_not_its_target(machine):
    open_home(machine, "upgrade")
    delete_as_guest(machine, INDEX)
    machine.link_as(GUEST, INDEX, SHADOW)
    machine.pack({"bin/empty": b""})  # cannot be extracted

    with Untouched(machine):
        outcome = machine.run(*ACTIONS["upgrade"])

    printed_lines(outcome, "File extraction failed, error = 1 (Cannot open file for reading)")
    ends(outcome, 1)


# The whole installation below another user's link.


def test_a_home_below_another_users_link_is_refused(machine):
    machine.make_directory("/srv/zor")
    machine.give_to(GUEST, "/srv/zor")
    machine.link("/opt/corvan", "/srv/zor")
    machine.give_to(GUEST, "/opt/corvan")

    with Untouched(machine):
        outcome = machine.run("i", "ABC", "-s", SPB)

    printed_lines(
        outcome,
        NO_INDEX,
        "Bin dir file extraction failed",
        "File extraction failed, error = 11 (Cannot create directory)",
    )
    ends(outcome, 1)


def test_an_installation_that_moved_below_another_users_link_counts_as_not_writable(machine):
    install(machine)
    os.rename(machine.at("/opt/corvan"), machine.at("/srv/corvan"))
    machine.link("/opt/corvan", "/srv/corvan")
    machine.give_to(GUEST, "/opt/corvan")

    with Untouched(machine, (*OUTSIDE, "/usr/kel"), without=()):
        outcome = machine.run("r", "ABC")

    printed_lines(outcome, "INI file found, verifying...", NOT_WRITABLE)
    printed_lines(outcome, "*** Error: INI file not found: nothing to remove.")
    ends(outcome, 1)


def test_a_link_whose_owner_the_user_namespace_does_not_map_is_refused(machine):
    prepare(machine, "upgrade")
    machine.link_as(GUEST, BIN_ETC + "/trawlfs", SECRET)

    with Untouched(machine):
        outcome = machine.run_in_namespace(*ACTIONS["upgrade"])

    same_lines(refused_modes(outcome), [no_permission(BIN_ETC + "/trawlfs")])
    ends(outcome, 0)


# Owners of files that are replaced.


@pytest.mark.parametrize("owner", [(2000, 2000), (0, 2000), (2000, 0)])
def test_a_registry_is_replaced_and_keeps_its_owner_and_group(machine, owner):
    prepare(machine, "registration")
    os.chown(machine.at("/etc/zor/zor.ini"), *owner)
    before = os.stat(machine.at("/etc/zor/zor.ini"))

    outcome = machine.run("i", "XYZ", "-s", SPB)

    ends(outcome, 0)
    after = os.stat(machine.at("/etc/zor/zor.ini"))
    assert "ZOR_Exploiters = ABC:XYZ:\n" in machine.read("/etc/zor/zor.ini")
    assert (after.st_uid, after.st_gid) == owner
    assert after.st_ino != before.st_ino


def test_a_registry_whose_owner_cannot_be_kept_is_written_in_place(machine):
    machine.make_directory("/home/ann/.zor")
    machine.give_to(HER, "/home/ann/.zor")
    machine.plant("/home/ann/.zor/zor.ini", "ZOR_Version = 2.x\n", 0o646)
    before = os.stat(machine.at("/home/ann/.zor/zor.ini"))

    outcome = machine.run("i", "ABC", "-s", SPB, user=HER)

    ends(outcome, 0)
    after = os.stat(machine.at("/home/ann/.zor/zor.ini"))
    assert "ZOR_Exploiters = ABC:\n" in machine.read("/home/ann/.zor/zor.ini")
    assert (after.st_uid, after.st_gid, after.st_mode) == (0, 0, before.st_mode)
    assert after.st_ino == before.st_ino


# The log.


@pytest.mark.parametrize("name", ["/dev/stdout", "/dev/fd/1"])
def test_the_log_goes_to_a_descriptor_whoever_owns_the_links_in_dev(machine, name):
    """In a container, they often belong to a user whom its user namespace does not map."""
    outcome = machine.run_in_shell(
        'chown -h 2000 /dev/stdout /dev/fd; "$0" "$@"', "i", "ABC", "-o", name, "-s", SPB
    )

    ends(outcome, 0)
    same_text(outcome.stdout, SHARED_TRANSCRIPT)


def test_the_log_goes_to_standard_error_whoever_owns_its_link(machine):
    outcome = machine.run_in_shell(
        'chown -h 2000 /dev/stderr; "$0" "$@"', "i", "ABC", "-o", "/dev/stderr", "-s", SPB
    )

    ends(outcome, 0)
    same_text(outcome.stderr, SHARED_TRANSCRIPT)


def test_a_path_that_leaves_the_descriptors_is_none_of_them(machine):
    machine.make_directory("/fd", 0o777)
    os.link(machine.at(SHADOW), machine.at("/fd/5"))

    outcome = machine.run("i", "ABC", "-o", "/proc/../fd/5", "-s", SPB)

    ends(outcome, 0)
    assert machine.read("/fd/5") == "root:secret:1::::::\n"


def test_the_status_report_reads_no_registry_through_a_link(machine):
    machine.plant(
        "/home/guest/zor.ini",
        "ZOR_Version = 1.0\nZOR_HomeDirectory = /home/guest\nZOR_Exploiters = XYZ:\n",
    )
    machine.link("/etc/zor/zor.ini", "/home/guest/zor.ini")
    machine.give_to(GUEST, "/etc/zor/zor.ini")

    outcome = machine.run("t")

    printed_lines(outcome, "INI file = /etc/zor/zor.ini", "Not installed")
    ends(outcome, 0)


def test_the_key_is_out_of_the_attackers_reach(machine):
    """Whatever a test above finds unchanged, the attacker could not have changed alone."""
    for path in (KEY, SHADOW, HER_OWN + "/letter"):
        with pytest.raises(AssertionError):
            machine.as_user(GUEST, lambda path=path: machine.read_bytes(path))
