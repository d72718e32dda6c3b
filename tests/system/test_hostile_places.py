"""Places that another user can influence are named on the command line, or hold the settings.

The attacker owns the directory in which the private installation, the target, the log or the traces
are; or a link that leads to the registry or to the common setting was given to the attacker.
"""

import os

import pytest

from harness.attacks import HOME, PROBE, Untouched, ends, install, prepare
from harness.checks import not_printed, printed_lines
from harness.machine import SPB
from harness.shared_machine import (
    GUEST,
    HER_OWN,
    NOTHING,
    OUTSIDE,
    SECRET,
    SHADOW,
    SharedMachine,
    why_not,
)

pytestmark = pytest.mark.skipif(why_not() is not None, reason=str(why_not()))

GUESTS = "/home/guest"
TARGET = "/home/guest/zor"
ARCHIVE = "/etc/archive"
EMPTY = "/srv/empty"
TARGETS = {
    "a system directory": SECRET,
    "a file": SHADOW,
    "another user's directory": HER_OWN,
    "nothing": NOTHING,
}
OF_THE_GUEST = {"below the guest's own": TARGET}


@pytest.fixture
def machine(binary):
    fresh = SharedMachine(binary)
    fresh.make_directory(EMPTY)
    fresh.plant(ARCHIVE + "/cache_data/kept", "kept\n")
    fresh.plant(ARCHIVE + "/kept", "kept\n")
    yield fresh
    fresh.delete()


def named(values):
    return {"argvalues": values.values(), "ids": values.keys()}


# The target of -p.

ALL_TARGETS = {**TARGETS, "an archive": ARCHIVE, "an empty directory": EMPTY}
SPELLINGS = {"as it is": "", "with a slash": "/", "with a dot": "/.", "with two slashes": "//"}


@pytest.mark.parametrize("spelling", **named(SPELLINGS))
@pytest.mark.parametrize("target", **named(ALL_TARGETS))
def test_a_private_removal_empties_no_directory_through_a_link(machine, target, spelling):
    machine.link_as(GUEST, TARGET, target)

    with Untouched(machine):
        outcome = machine.run("r", "ABC", "-p", "-d", TARGET + spelling)

    not_printed(outcome, "DEL: ")
    not_printed(outcome, "RMDIR: ")
    printed_lines(outcome, "Performing private remove", "Done.")
    ends(outcome, 0)


@pytest.mark.parametrize("target", **named(ALL_TARGETS))
def test_a_private_removal_empties_no_directory_below_a_link(machine, target):
    machine.plant(ARCHIVE + "/zor/kept", "kept\n")
    machine.link_as(GUEST, GUESTS + "/apps", target)

    with Untouched(machine):
        outcome = machine.run("r", "ABC", "-p", "-d", GUESTS + "/apps/zor")

    not_printed(outcome, "DEL: ")
    ends(outcome, 0)


@pytest.mark.parametrize("spelling", **named(SPELLINGS))
@pytest.mark.parametrize("target", **named(ALL_TARGETS))
def test_a_private_installation_follows_no_link(machine, target, spelling):
    machine.link_as(GUEST, TARGET, target)

    with Untouched(machine):
        outcome = machine.run("i", "ABC", "-s", SPB, "-p", "-d", TARGET + spelling)

    printed_lines(outcome, "File extraction failed, error = 11 (Cannot create directory)")
    printed_lines(outcome, "PrivMode Action finished with RC: 11")
    ends(outcome, 1)


def prepare_private(machine):
    """The target of a private installation after the attack."""

    def make():
        for name in ("bin", "config", "install", "properties"):
            os.makedirs(machine.at(f"{TARGET}/{name}"))

    machine.as_user(GUEST, make)


def install_privately(machine, *options):
    return machine.run("i", "ABC", "-s", SPB, "-p", "-d", TARGET, *options)


WHERE_IT_MAY_CHANGE = ("/etc/zor", "/etc/kel", TARGET)
FILES = (
    "bin/trawlcfg",
    "config/Zor.properties",
    "config/xss/schema.xss",
    "install/trawlcfg.sh",
    "properties/scan.properties",
)


@pytest.mark.parametrize("target", **named(TARGETS))
@pytest.mark.parametrize("name", FILES)
def test_a_private_file_is_not_extracted_to_where_a_link_leads(machine, name, target):
    prepare_private(machine)
    machine.as_user(GUEST, lambda: os.makedirs(machine.at(TARGET + "/config/xss")))
    machine.link_as(GUEST, f"{TARGET}/{name}", target)

    with Untouched(machine, without=WHERE_IT_MAY_CHANGE):
        outcome = install_privately(machine)

    printed_lines(outcome, "File extraction failed, error = 2 (Cannot open file for writing)")
    printed_lines(outcome, "PrivMode Action finished with RC: 2")
    ends(outcome, 1)


@pytest.mark.parametrize("name", FILES)
def test_a_private_file_is_not_extracted_into_a_fifo(machine, name):
    prepare_private(machine)
    machine.as_user(GUEST, lambda: os.makedirs(machine.at(TARGET + "/config/xss")))
    machine.fifo_as(GUEST, f"{TARGET}/{name}")

    with Untouched(machine, without=WHERE_IT_MAY_CHANGE):
        outcome = install_privately(machine)

    printed_lines(outcome, "File extraction failed, error = 2 (Cannot open file for writing)")
    ends(outcome, 1)


@pytest.mark.parametrize("name", ["bin", "config", "install", "properties", "config/xss"])
@pytest.mark.parametrize("target", [SECRET, EMPTY, HER_OWN])
def test_no_private_directory_is_extracted_below_a_link(machine, name, target):
    prepare_private(machine)
    if name != "config/xss":
        os.rmdir(machine.at(f"{TARGET}/{name}"))
    machine.link_as(GUEST, f"{TARGET}/{name}", target)

    with Untouched(machine, without=WHERE_IT_MAY_CHANGE):
        outcome = install_privately(machine)

    printed_lines(outcome, "File extraction failed, error = 11 (Cannot create directory)")
    printed_lines(outcome, "PrivMode Action finished with RC: 11")
    ends(outcome, 1)


@pytest.mark.parametrize("target", **named(TARGETS))
@pytest.mark.parametrize("parent, name", [("", "cache_data"), ("/bin", "etc")])
def test_no_further_private_directory_is_a_link(machine, parent, name, target):
    prepare_private(machine)
    machine.link_as(GUEST, f"{TARGET}{parent}/{name}", target)

    with Untouched(machine, without=WHERE_IT_MAY_CHANGE):
        outcome = install_privately(machine)

    printed_lines(
        outcome,
        f"Error creating dir {name} in {TARGET}{parent} result=11 (Cannot create directory)",
        f"Cannot create subdir: {name}",
    )
    ends(outcome, 1)


@pytest.mark.parametrize("target", **named(TARGETS))
def test_a_private_install_type_is_not_written_through_a_link(machine, target):
    prepare_private(machine)
    machine.link_as(GUEST, TARGET + "/install/zor_install.properties", target)

    with Untouched(machine, without=WHERE_IT_MAY_CHANGE):
        outcome = install_privately(machine)

    printed_lines(outcome, f"Could not create file {TARGET}/install/zor_install.properties")
    ends(outcome, 0)


@pytest.mark.parametrize("target", **named(TARGETS))
def test_a_private_index_is_not_written_through_a_link(machine, target):
    prepare_private(machine)
    machine.link_as(GUEST, TARGET + "/ZOR_files", target)

    with Untouched(machine, without=WHERE_IT_MAY_CHANGE):
        outcome = install_privately(machine, "-r")

    printed_lines(outcome, f"Warning! Failed to create install log file: {TARGET}/ZOR_files")
    ends(outcome, 0)


@pytest.mark.parametrize("target", **named(TARGETS))
def test_a_single_user_flag_is_neither_found_nor_made_through_a_link(machine, target):
    prepare_private(machine)
    machine.link_as(GUEST, TARGET + "/config/SingleUserMode", target)

    with Untouched(machine, without=WHERE_IT_MAY_CHANGE):
        outcome = install_privately(machine, "-r")

    not_printed(outcome, "Single user mode file found")
    printed_lines(outcome, "Unable to create single user mode flag file")
    ends(outcome, 0)


@pytest.mark.parametrize(
    "name, line",
    [
        ("ZOR_files", f"Warning! Failed to create install log file: {TARGET}/ZOR_files"),
        ("config/SingleUserMode", "Unable to create single user mode flag file"),
        (
            "install/zor_install.properties",
            f"Could not create file {TARGET}/install/zor_install.properties",
        ),
    ],
)
def test_a_fifo_in_a_private_installation_does_not_hang_the_run(machine, name, line):
    prepare_private(machine)
    machine.fifo_as(GUEST, f"{TARGET}/{name}")

    with Untouched(machine, without=WHERE_IT_MAY_CHANGE):
        outcome = install_privately(machine, "-r")

    printed_lines(outcome, line)
    ends(outcome, 0)


def test_a_fifo_at_the_target_of_a_private_removal_stays(machine):
    machine.fifo_as(GUEST, TARGET)

    with Untouched(machine):
        outcome = machine.run("r", "ABC", "-p", "-d", TARGET)

    not_printed(outcome, "DEL: ")
    ends(outcome, 0)


def test_a_private_removal_deletes_links_and_not_what_they_lead_to(machine):
    prepare_private(machine)
    for number, target in enumerate(ALL_TARGETS.values()):
        machine.link_as(GUEST, f"{TARGET}/config/{number}", target)
    machine.fifo_as(GUEST, f"{TARGET}/config/fifo")

    with Untouched(machine, without=WHERE_IT_MAY_CHANGE):
        outcome = machine.run("r", "ABC", "-p", "-d", TARGET)

    ends(outcome, 0)
    assert not machine.exists(TARGET)


# The target of -d.


@pytest.mark.parametrize("target", **named(ALL_TARGETS))
def test_nothing_is_installed_below_a_link(machine, target):
    machine.link_as(GUEST, TARGET, target)

    with Untouched(machine):
        outcome = machine.run("i", "ABC", "-s", SPB, "-d", TARGET)

    printed_lines(outcome, "File extraction failed, error = 11 (Cannot create directory)")
    printed_lines(outcome, "Installation failed, rolling back")
    ends(outcome, 1)


@pytest.mark.parametrize("special", ["fifo", "link"])
def test_the_install_type_of_a_target_is_not_read_from_elsewhere(machine, special):
    prepare_private(machine)
    path = TARGET + "/install/zor_install.properties"
    if special == "fifo":
        machine.fifo_as(GUEST, path)
    else:
        machine.plant("/etc/secret/type", "ZOR_InstallType=local\n", 0o600)
        machine.link_as(GUEST, path, "/etc/secret/type")

    with Untouched(machine, without=WHERE_IT_MAY_CHANGE):
        outcome = machine.run("i", "ABC", "-s", SPB, "-d", TARGET)

    not_printed(outcome, "incompatible install type")
    printed_lines(outcome, f"Could not create file {path}")
    ends(outcome, 0)


# The file of -o and the directory of -c.


@pytest.mark.parametrize("target", **named(TARGETS))
def test_no_log_is_written_through_a_link(machine, target):
    machine.link_as(GUEST, GUESTS + "/log", target)

    with Untouched(machine):
        outcome = machine.run("i", "ABC", "-s", SPB, "-o", GUESTS + "/log")

    assert outcome.stdout == f"SPB file: {SPB}\n"
    ends(outcome, 0)
    assert machine.exists(HOME + "/bin/trawlcfg")


def test_a_fifo_at_the_log_does_not_hang_the_run(machine):
    machine.fifo_as(GUEST, GUESTS + "/log")

    with Untouched(machine):
        outcome = machine.run("i", "ABC", "-s", SPB, "-o", GUESTS + "/log")

    assert outcome.stdout == f"SPB file: {SPB}\n"
    ends(outcome, 0)


def test_a_fifo_at_the_package_does_not_hang_the_run(machine):
    machine.fifo_as(GUEST, GUESTS + "/package.spb")

    outcome = machine.run("i", "ABC", "-s", GUESTS + "/package.spb")

    printed_lines(outcome, "*** Error: package not found or not valid.")
    ends(outcome, 1)


def test_no_log_is_written_through_a_hard_link(machine):
    machine.plant("/srv/board", b"notes of all", 0o666)
    machine.as_user(GUEST, lambda: os.link(machine.at("/srv/board"), machine.at(GUESTS + "/log")))

    with Untouched(machine):
        outcome = machine.run("i", "ABC", "-s", SPB, "-o", GUESTS + "/log")

    assert outcome.stdout == f"SPB file: {SPB}\n"
    ends(outcome, 0)
    assert machine.read("/srv/board") == "notes of all"


@pytest.mark.parametrize("target", **named(TARGETS))
@pytest.mark.parametrize("below", ["", "/deep/traces"])
def test_no_trace_directory_is_made_through_a_link(machine, below, target):
    path = GUESTS + "/traces" + below
    machine.link_as(GUEST, GUESTS + "/traces", target)

    with Untouched(machine):
        outcome = machine.run("i", "ABC", "-s", SPB, "-c", path, "-r")

    printed_lines(outcome, f"Setting logs dir='{path}'")
    ends(outcome, 0)


# The registry and the common setting, after somebody gave a link away.


@pytest.mark.parametrize("target", ["/home/guest/zor.ini", NOTHING])
@pytest.mark.parametrize("action", ["installation", "upgrade", "registration"])
def test_no_registry_is_read_or_written_through_a_link(machine, action, target):
    prepare(machine, action)
    registry = "/etc/zor/zor.ini"
    if machine.exists(registry):
        os.rename(machine.at(registry), machine.at("/home/guest/zor.ini"))
    else:
        machine.plant("/home/guest/zor.ini", "ZOR_Version = 1.x\n")
    machine.link(registry, target)
    machine.give_to(GUEST, registry)

    with Untouched(machine, without=("/etc/kel",)):
        outcome = machine.run("i", "XYZ", "-s", SPB)

    printed_lines(outcome, "INI file not found or outdated (code=1)")
    printed_lines(
        outcome,
        "Saving INI file to /etc/zor/zor.ini",
        "*** Error: could not open or write to INI file. Error = 2",
    )
    ends(outcome, 1)


def test_no_registry_is_removed_below_a_link(machine):
    install(machine)
    os.rename(machine.at("/etc/zor"), machine.at("/srv/registry"))
    machine.link("/etc/zor", "/srv/registry")
    machine.give_to(GUEST, "/etc/zor")

    with Untouched(machine, (*OUTSIDE, "/opt"), without=()):
        outcome = machine.run("r", "ABC")

    printed_lines(outcome, "INI file not found or outdated (code=1)")
    ends(outcome, 1)


SETTING = "/etc/kel/corvan/common/cfg/log.properties"


@pytest.mark.parametrize("target", **named({**TARGETS, "a setting": "/home/guest/log.properties"}))
def test_no_setting_is_read_or_written_through_a_link(machine, target):
    machine.plant("/home/guest/log.properties", "corvan_common_dir=/etc/elsewhere\n")
    machine.link(SETTING, target)
    machine.give_to(GUEST, SETTING)

    with Untouched(machine, without=("/etc/zor",)):
        outcome = machine.run("i", "ABC", "-s", SPB)

    printed_lines(outcome, "Created Corvan Common Dir='/usr/kel/corvan/common' result=0")
    ends(outcome, 0)


@pytest.mark.parametrize("command", [("t",), ("i", "ABC", "-s", SPB)])
def test_a_fifo_at_the_setting_does_not_hang_the_run(machine, command):
    machine.make_directory("/etc/kel/corvan/common/cfg")
    machine.give_to(GUEST, "/etc/kel/corvan/common/cfg")
    machine.fifo_as(GUEST, SETTING)

    with Untouched(machine, without=("/etc/zor",)):
        outcome = machine.run(*command)

    ends(outcome, 0)


@pytest.mark.parametrize(
    "path",
    [
        "/opt/corvan/zor/config/Zor.properties",
        "/opt/corvan/zor/config/ZorTrace.properties",
        "/opt/corvan/zor/install/trawlcfg.sh",
    ],
)
def test_no_file_of_an_upgrade_is_edited_through_a_link(machine, path):
    """Zor.properties stays where it is; the others are extracted in the link's place."""
    prepare(machine, "upgrade")
    os.rename(machine.at(path), machine.at("/etc/secret/edited"))
    machine.link(path, "/etc/secret/edited")
    machine.give_to(GUEST, path)

    with Untouched(machine):
        outcome = machine.run("i", "XYZ", "-s", SPB)

    if path.endswith("/Zor.properties"):
        printed_lines(outcome, "Could not load property file")
        ends(outcome, 1)
    else:
        ends(outcome, 0)
        assert machine.state(path)[path].kind == "f"


def test_the_probe_of_a_repair_follows_no_link(machine):
    prepare(machine, "upgrade")
    machine.remove(HOME + "/bin/trawlcfg")
    machine.give_to(GUEST, HOME)
    machine.link_as(GUEST, PROBE, SHADOW)

    with Untouched(machine):
        outcome = machine.run("i", "ABC", "-s", SPB)

    printed_lines(outcome, "*** Error: cannot create file in INI home dir.")
    ends(outcome, 0)
