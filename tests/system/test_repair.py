"""A registered installation whose scanner control is missing or empty, installed again."""

import pytest

from harness.checks import not_printed, printed, printed_lines, same_text, same_tree
from harness.installations import DEPLOYMENT, HOMES, PACKAGE, SETTINGS
from harness.machine import ANN, SPB
from harness.rollback import FILE_INDEX, PROPERTIES_DIRECTORY, XSS_FILES, rolled_back

HOME = "/opt/corvan/zor"
CONTROL = HOME + "/bin/trawlcfg"

CONTROL_IS_MISSING = """\
INI file found, verifying...
*** Error: cannot find /opt/corvan/zor/bin/trawlcfg in INI home dir.
"""


def break_installation(machine, version="9.2.30.0000", date="22/12/02"):
    """Installs the toolkit, registers it as `version` and takes its scanner control away."""
    assert machine.run("i", "ABC", "-s", SPB).status == 0
    machine.register(version=version, date=date)
    machine.remove(CONTROL)


def repair(machine, *options, exploiter="ABC"):
    """Installs again, which must succeed."""
    outcome = machine.run("i", exploiter, "-s", SPB, *options)
    assert outcome.status == 0, outcome.stdout
    return outcome


def test_a_repair_prints_its_progress(machine):
    break_installation(machine)

    printed(
        repair(machine),
        PACKAGE
        + SETTINGS
        + CONTROL_IS_MISSING
        + "ZOR broken in existing location, forcing update.\n"
        + HOMES
        + """\
Installed ZOR is older (or the same version), performing upgrade (deploying files)
Exec '/usr/sbin/selinuxenabled >/dev/null 2>&1' returned 32512
SELinux not enabled or not supported
Exec '/opt/corvan/zor/bin/trawlfs -shutdown >/dev/null 2>&1' returned 0
Exec '/opt/corvan/zor/bin/trawlcfg -disable all >/dev/null 2>&1' returned 32512
Exec '/opt/corvan/zor/bin/trawlcfg -shutdown all -timeout 60 -force >/dev/null 2>&1' returned 32512
Exec '/opt/corvan/zor/bin/trawlcfg -shutdown all -timeout 120 >/dev/null 2>&1' returned 32512
DEL: /opt/corvan/zor/properties/scan.properties
RMDIR: /opt/corvan/zor/properties
Starting file extraction...
"""
        + DEPLOYMENT
        + """\
Saving INI file to /etc/zor/zor.ini
Exec '/opt/corvan/zor/bin/trawlcfg -enable all >/dev/null 2>&1' returned 0
Installation successful, committing changes
RMDIR: /opt/corvan/zor/cache_data
Done.
""",
    )


def test_a_repair_brings_the_scanner_control_back(machine):
    break_installation(machine)

    repair(machine)

    assert machine.read(CONTROL).startswith("#!/bin/sh\n")
    assert machine.run("r", "ABC").status == 0


def test_an_empty_scanner_control_is_repaired_too(machine):
    break_installation(machine)
    machine.plant(CONTROL, "", 0o755)

    printed_lines(
        repair(machine),
        "*** Error: found /opt/corvan/zor/bin/trawlcfg with invalid size.",
        "ZOR broken in existing location, forcing update.",
        "Log file is: /opt/corvan/zor/ZOR_files",
    )

    assert machine.read(CONTROL).startswith("#!/bin/sh\n")


@pytest.mark.parametrize("version", ["10.0.0.0000", "9.2.30.0001", "1", ""])
def test_a_broken_installation_of_any_version_is_deployed_again(machine, version):
    break_installation(machine, version)

    printed_lines(
        repair(machine),
        "Installed ZOR is older (or the same version), performing upgrade (deploying files)",
    )

    assert machine.read("/etc/zor/zor.ini").startswith("ZOR_Version = 9.2.30.0000\n")
    assert machine.exists(CONTROL)


def test_a_broken_installation_of_a_later_build_date_is_only_registered(machine):
    # The fourth number of this build is 0 and cannot be lowered, so the date decides.
    break_installation(machine, "10.0.0.0000", "23/01/01")

    printed_lines(
        repair(machine, exploiter="XYZ"),
        "ZOR broken in existing location, forcing update.",
        "Log file is: /opt/corvan/zor/ZOR_files",
        "currentZorHome = '/opt/corvan/zor' currentCfgHome = '/opt/corvan/zor'",
        "Installed ZOR is not older than this version, updating exploiters only",
    )

    assert not machine.exists(CONTROL)
    same_text(
        machine.read("/etc/zor/zor.ini"),
        """\
ZOR_Version = 9.2.30.0000
ZOR_BuildDate = 23/01/01
ZOR_HomeDirectory = /opt/corvan/zor
ZOR_Exploiters = ABC:XYZ:
ZOR_ConfigRootDirectory = /opt/corvan/zor
""",
    )


def test_a_repair_keeps_the_exploiters_and_adds_the_caller(machine):
    break_installation(machine)

    printed_lines(
        repair(machine, exploiter="XYZ"),
        "Adding exploiter XYZ to INI file",
        "Saving INI file to /etc/zor/zor.ini",
    )

    assert "\nZOR_Exploiters = ABC:XYZ:\n" in machine.read("/etc/zor/zor.ini")


def test_a_repair_works_where_the_registry_says(machine):
    break_installation(machine)

    repair(machine, "-d", "/opt/elsewhere")

    assert machine.exists(CONTROL)
    assert not machine.exists("/opt/elsewhere")


def test_a_repair_keeps_the_settings(machine):
    break_installation(machine)
    settings = HOME + "/config/Zor.properties"
    machine.plant(settings, machine.read(settings).replace("trace_level=3", "trace_level=8"))

    repair(machine)

    assert "\ntrace_level=8\n" in machine.read(settings)


def test_a_repair_empties_the_cache(machine):
    break_installation(machine)
    machine.plant(HOME + "/cache_data/entry", "cached")

    repair(machine)

    assert not machine.exists(HOME + "/cache_data")


def test_a_repair_needs_the_settings_file(machine):
    break_installation(machine)
    machine.remove(HOME + "/config/Zor.properties")
    before = machine.tree()

    outcome = machine.run("i", "ABC", "-s", SPB)

    assert outcome.status == 1
    printed_lines(
        outcome,
        "Could not load property file",
        "Exec '/opt/corvan/zor/bin/trawlcfg -enable all >/dev/null 2>&1' returned 0",
        "Installation failed, rolling back",
    )
    rolled_back(machine, before, FILE_INDEX, PROPERTIES_DIRECTORY, XSS_FILES)


def test_a_broken_installation_is_not_removed(machine):
    break_installation(machine)
    before = machine.tree()

    outcome = machine.run("r", "ABC")

    printed(
        outcome,
        SETTINGS
        + CONTROL_IS_MISSING
        + HOMES
        + """\
*** Error: INI file not found: nothing to remove.
Done.
""",
        status=1,
    )
    same_tree(machine.tree(), before)


def test_a_broken_installation_elsewhere_is_looked_for_in_the_given_directory_by_a_removal(machine):
    break_installation(machine)

    printed_lines(
        machine.run("r", "ABC", "-d", "/opt/given"),
        "*** Error: cannot find /opt/corvan/zor/bin/trawlcfg in INI home dir.",
        "Log file is: /opt/given/ZOR_files",
    )


def test_an_installation_that_cannot_be_written_is_not_repaired_but_installed_afresh(machine):
    assert machine.run("i", "ABC", "-s", SPB, user=ANN).status == 0
    home = "/home/ann/corvan/zor"
    machine.remove(home + "/bin/trawlcfg")
    machine.change_mode(home, 0o555)

    outcome = machine.run("i", "ABC", "-s", SPB, user=ANN)

    not_printed(outcome, "forcing update")
    printed_lines(
        outcome,
        "*** Error: cannot create file in INI home dir.",
        "Log file is: /home/ann/corvan/zor/ZOR_files",
    )
    printed_lines(
        outcome,
        "Performing fresh install on /home/ann/corvan/zor (config=/home/ann/corvan/zor/config)",
    )


def test_a_per_user_installation_is_repaired_too(machine):
    assert machine.run("i", "ABC", "-s", SPB, user=ANN).status == 0
    machine.remove("/home/ann/corvan/zor/bin/trawlcfg")

    outcome = machine.run("i", "ABC", "-s", SPB, user=ANN)

    assert outcome.status == 0
    printed_lines(outcome, "ZOR broken in existing location, forcing update.")
    assert machine.exists("/home/ann/corvan/zor/bin/trawlcfg")


def test_files_in_a_directory_that_must_not_be_searched_cannot_be_opened(machine):
    assert machine.run("i", "ABC", "-s", SPB, user=ANN).status == 0
    machine.change_mode("/home/ann/corvan/zor/bin", 0o600)

    outcome = machine.run("i", "ABC", "-s", SPB, user=ANN)

    assert outcome.status == 1
    printed_lines(outcome, "ZOR broken in existing location, forcing update.")
    printed_lines(
        outcome,
        "Bin dir file extraction failed",
        "File extraction failed, error = 2 (Cannot open file for writing)",
    )


def test_a_registry_that_must_not_be_searched_for_cannot_be_opened(machine):
    assert machine.run("i", "ABC", "-s", SPB, user=ANN).status == 0
    machine.change_mode("/home/ann/.zor", 0o600)

    outcome = machine.run("i", "ABC", "-s", SPB, user=ANN)

    assert outcome.status == 1
    printed_lines(outcome, "INI file not found or outdated (code=1)")
    printed_lines(outcome, "*** Error: could not open or write to INI file. Error = 2")
