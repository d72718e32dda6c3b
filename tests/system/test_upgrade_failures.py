"""Each fatal failure of an upgrade: its messages, the restart, and what the rollback restores."""

import pytest

from harness.checks import not_printed, printed, printed_lines, same_lines, same_text, same_tree
from harness.installations import NO_SELINUX, UPGRADE_START
from harness.machine import ANN, SPB
from harness.rollback import (
    FILE_INDEX,
    MAIN_PROPERTY_FILE,
    OBSOLETE_FILE,
    OLDER_BACKUP,
    PROPERTIES_DIRECTORY,
    SCRIPTS_OF_OLD,
    SINGLE_USER_FLAG,
    XSS_FILES,
    rolled_back,
)

HOME = "/opt/corvan/zor"
MAIN = HOME + "/config/Zor.properties"
TRACE = HOME + "/config/ZorTrace.properties"

UP_TO_EXTRACTION = UPGRADE_START

UP_TO_PROPERTIES = (
    UP_TO_EXTRACTION
    + """\
Extracting configs to '/opt/corvan/zor/config'
"""
    + NO_SELINUX
    + "Customizing properties file: /opt/corvan/zor/config/Zor.properties\n"
)

RESTARTED_AND_FAILED = """\
Exec '/opt/corvan/zor/bin/trawlcfg -enable all >/dev/null 2>&1' returned 0
Installation failed, rolling back
Done.
"""


def install_older(machine, **how):
    """Installs the toolkit and makes it look older, with a file that the package replaces."""
    outcome = machine.run("i", "OLD", "-s", SPB, **how)
    assert outcome.status == 0, outcome.stdout
    if not how:
        machine.register(version="9.1.0.0005", date="21/06/30", exploiters="OLD:")
        machine.plant(HOME + "/bin/trawlhw", "older", 0o700)


def fail(machine, *options, **how):
    """Tries to upgrade for exploiter ABC, which must fail."""
    outcome = machine.run("i", "ABC", "-s", SPB, *options, **how)
    assert outcome.status == 1
    return outcome


def test_a_missing_package_is_reported_after_the_properties_are_deleted(machine):
    install_older(machine)
    machine.remove(SPB)
    before = machine.tree()

    outcome = fail(machine)

    printed(
        outcome,
        UP_TO_EXTRACTION + "*** Error: package not found or not valid.\n"
        "File extraction failed\n" + RESTARTED_AND_FAILED,
        status=1,
    )
    rolled_back(machine, before, PROPERTIES_DIRECTORY)


@pytest.mark.parametrize(
    "empty, message",
    [
        ("bin/empty", "Bin dir file extraction failed\n"),
        ("properties/empty", ""),
        ("config/empty", "Extracting configs to '/opt/corvan/zor/config'\n"),
    ],
)
def test_a_failed_extraction_brings_back_the_replaced_files(machine, empty, message):
    install_older(machine)
    machine.pack({empty: b""})
    before = machine.tree()

    outcome = fail(machine)

    printed(
        outcome,
        UP_TO_EXTRACTION
        + message
        + "File extraction failed, error = 1 (Cannot open file for reading)\n"
        "File extraction failed\n" + RESTARTED_AND_FAILED,
        status=1,
    )
    rolled_back(machine, before, FILE_INDEX, PROPERTIES_DIRECTORY)
    assert not machine.exists(HOME + "/ZOR_files")


def test_a_failure_in_the_last_directory_loses_the_xss_files(machine):
    install_older(machine)
    machine.pack({"install/empty": b""})
    before = machine.tree()

    fail(machine)

    rolled_back(machine, before, FILE_INDEX, PROPERTIES_DIRECTORY, XSS_FILES)


def test_a_failed_extraction_is_not_labelled_again(machine):
    install_older(machine)
    machine.add_selinux()
    machine.pack({"bin/empty": b""})

    assert fail(machine).commands.count("/usr/sbin/selinuxenabled") == 1


def test_obsolete_files_do_not_come_back(machine):
    install_older(machine)
    machine.pack({"bin/empty": b""})
    machine.plant(HOME + "/bin/trawlnet", "obsolete")
    machine.plant(HOME + "/bin/libzor.so", "obsolete")
    before = machine.tree()

    fail(machine)

    rolled_back(machine, before, FILE_INDEX, PROPERTIES_DIRECTORY, OBSOLETE_FILE)


def test_an_older_backup_does_not_come_back(machine):
    install_older(machine)
    machine.pack({"bin/empty": b""})
    machine.plant(HOME + "/bin/trawlhw.bak", "oldest")
    before = machine.tree()

    fail(machine)

    rolled_back(machine, before, FILE_INDEX, PROPERTIES_DIRECTORY, OLDER_BACKUP)


def test_the_scanners_are_started_again_before_the_rollback(machine):
    install_older(machine)
    machine.pack(
        {
            "bin/empty": b"",
            "bin/trawlcfg": b'#!/bin/sh\necho new "$@" >>/var/scanners/commands\n',
        }
    )

    same_lines(
        fail(machine).commands,
        [
            "/opt/corvan/zor/bin/trawlfs [-shutdown]",
            "/opt/corvan/zor/bin/trawlcfg [-disable] [all]",
            "/opt/corvan/zor/bin/trawlcfg [-shutdown] [all] [-timeout] [60] [-force]",
            "/opt/corvan/zor/bin/trawlcfg [-shutdown] [all] [-timeout] [120]",
            "new -enable all",
        ],
    )


def test_a_failing_restart_after_a_failure_is_reported(machine):
    install_older(machine)
    machine.remove(SPB)
    machine.let_commands_fail(("-enable", 1))

    printed_lines(
        fail(machine),
        "File extraction failed",
        "Exec '/opt/corvan/zor/bin/trawlcfg -enable all >/dev/null 2>&1' returned 256",
        "*** Error: could not restart ZOR.",
        "Installation failed, rolling back",
        "Done.",
    )


def test_a_missing_main_property_file_fails_the_upgrade(machine):
    install_older(machine)
    machine.remove(MAIN)
    before = machine.tree()

    printed(
        fail(machine),
        UP_TO_PROPERTIES
        + f"""\
Loading file {MAIN} error: 2 (No such file or directory)
Could not load property file
"""
        + RESTARTED_AND_FAILED,
        status=1,
    )

    rolled_back(machine, before, FILE_INDEX, PROPERTIES_DIRECTORY, XSS_FILES)


def test_a_main_property_file_that_cannot_be_saved_fails_the_upgrade(machine):
    install_older(machine, user=ANN)
    path = "/home/ann/corvan/zor/config/Zor.properties"
    machine.change_mode(path, 0o400)
    before = machine.tree()

    outcome = fail(machine, user=ANN)

    printed_lines(
        outcome,
        f"Customizing properties file: {path}",
        f"Saving file {path} error: 13 (Permission denied)",
        "Could not save property file",
        "Exec '/home/ann/corvan/zor/bin/trawlcfg -enable all >/dev/null 2>&1' returned 0",
        "Installation failed, rolling back",
        "Done.",
    )
    rolled_back(machine, before, FILE_INDEX, PROPERTIES_DIRECTORY, XSS_FILES)


def test_a_missing_trace_property_file_fails_the_upgrade(machine):
    install_older(machine)
    machine.pack(without=("config/ZorTrace.properties",))
    machine.remove(TRACE)
    before = machine.tree()

    printed(
        fail(machine),
        UP_TO_PROPERTIES
        + f"""\
Looking for Trace Dir
Customizing property file: {TRACE}
Loading file {TRACE} error: 2 (No such file or directory)
Could not load property file
"""
        + RESTARTED_AND_FAILED,
        status=1,
    )

    rolled_back(machine, before, FILE_INDEX, PROPERTIES_DIRECTORY, XSS_FILES, MAIN_PROPERTY_FILE)


def test_a_trace_property_file_that_cannot_be_saved_fails_the_upgrade(machine):
    install_older(machine, user=ANN)
    path = "/home/ann/corvan/zor/config/ZorTrace.properties"
    machine.pack(without=("config/ZorTrace.properties",))
    machine.change_mode(path, 0o400)
    before = machine.tree()

    outcome = fail(machine, user=ANN)

    printed_lines(
        outcome,
        f"Customizing property file: {path}",
        f"Saving file {path} error: 13 (Permission denied)",
        "Could not save property file",
        "Exec '/home/ann/corvan/zor/bin/trawlcfg -enable all >/dev/null 2>&1' returned 0",
        "Installation failed, rolling back",
        "Done.",
    )
    not_printed(outcome, "File saved successfully")
    rolled_back(machine, before, FILE_INDEX, PROPERTIES_DIRECTORY, XSS_FILES, MAIN_PROPERTY_FILE)


UP_TO_REGISTRY = (
    UP_TO_PROPERTIES
    + f"""\
Looking for Trace Dir
Customizing property file: {TRACE}
File saved successfully
Updating file with variables /opt/corvan/zor/install/trawlcfg.sh
Updating: /opt/corvan/zor/install/trawlcfg.sh
Updating file with variables /opt/corvan/zor/install/rmdirs.sh
Updating: /opt/corvan/zor/install/rmdirs.sh
Created Corvan Common Dir='/usr/kel/corvan/common' result=0
Adding exploiter ABC to INI file
Updating BuildDate informations to: 22/12/02
Saving INI file to /etc/zor/zor.ini
"""
)


def test_a_registry_that_cannot_be_backed_up_fails_the_upgrade(machine):
    install_older(machine)
    machine.make_directory("/etc/zor/zor.ini.bak")
    before = machine.tree()

    printed(
        fail(machine),
        UP_TO_REGISTRY
        + "*** Error: could not open or write to INI file. Error = 2\n"
        + RESTARTED_AND_FAILED,
        status=1,
    )

    rolled_back(machine, before, FILE_INDEX, PROPERTIES_DIRECTORY, XSS_FILES, MAIN_PROPERTY_FILE)


def test_a_full_disk_under_the_backup_of_the_registry_fails_the_upgrade(machine):
    install_older(machine)
    machine.plant("/media/zor.ini", machine.read("/etc/zor/zor.ini"))
    # One page holds the registry; its copy finds no second one.
    script = """
        cat /media/zor.ini >/etc/zor/zor.ini
        "$0" "$@"; echo "status $?"
        ls /etc/zor; cmp /etc/zor/zor.ini /media/zor.ini && echo same
    """

    outcome = machine.run_in_shell(
        script, "i", "ABC", "-s", SPB, options=("--size", "4096", "--tmpfs", "/etc/zor")
    )

    printed_lines(
        outcome,
        "Saving INI file to /etc/zor/zor.ini",
        "*** Error: could not open or write to INI file. Error = 6",
    )
    assert outcome.stdout.endswith(
        "Installation failed, rolling back\nDone.\nstatus 1\nzor.ini\nsame\n"
    )


def test_a_registry_that_cannot_be_written_completely_comes_back(machine):
    install_older(machine)
    machine.register(version="10.0.0.0000", exploiters="OLD:")
    machine.change_mode("/etc/zor/zor.ini", 0o640)
    before = machine.tree()

    # One block of 512 bytes: enough for the copy, too little with the long identifier.
    outcome = machine.run_in_shell(
        'trap \'\' XFSZ; ulimit -f 1; exec "$0" "$@"', "i", "A" * 400, "-s", SPB
    )

    assert outcome.status == 1
    printed_lines(
        outcome,
        "Saving INI file to /etc/zor/zor.ini",
        "*** Error: could not open or write to INI file. Error = 5",
        "Installation failed, rolling back",
    )
    rolled_back(machine, before)


def test_a_registration_only_that_cannot_save_the_registry_fails(machine):
    install_older(machine)
    machine.register(version="10.0.0.0000", exploiters="OLD:")
    machine.make_directory("/etc/zor/zor.ini.bak")
    before = machine.tree()

    outcome = fail(machine)

    printed_lines(
        outcome,
        "Adding exploiter ABC to INI file",
        "Saving INI file to /etc/zor/zor.ini",
        "*** Error: could not open or write to INI file. Error = 2",
        "Installation failed, rolling back",
        "Done.",
    )
    same_lines(outcome.commands, [])
    same_tree(machine.tree(), before)


def test_a_script_that_the_package_does_not_contain_stays_filled_in(machine):
    install_older(machine)
    machine.pack(without=("install/trawlcfg.sh",))
    machine.plant(HOME + "/install/trawlcfg.sh", "older $(ZOR_DestinationDir)\n", 0o700)
    machine.make_directory("/etc/zor/zor.ini.bak")
    before = machine.tree()

    fail(machine)

    rolled_back(
        machine,
        before,
        FILE_INDEX,
        PROPERTIES_DIRECTORY,
        XSS_FILES,
        MAIN_PROPERTY_FILE,
        SCRIPTS_OF_OLD,
    )
    assert machine.read(HOME + "/install/trawlcfg.sh") == "older /opt/corvan/zor\n"


def test_the_single_user_flag_is_made_after_a_failure_too(machine):
    install_older(machine)
    machine.remove(SPB)
    before = machine.tree()

    outcome = fail(machine, "-r")

    printed_lines(
        outcome,
        "File extraction failed",
        "Creating single user mode flag file: /opt/corvan/zor/config/SingleUserMode",
        "Exec '/opt/corvan/zor/bin/trawlcfg -enable all >/dev/null 2>&1' returned 0",
        "Installation failed, rolling back",
    )
    rolled_back(machine, before, PROPERTIES_DIRECTORY, SINGLE_USER_FLAG, FILE_INDEX)
    assert machine.index(HOME).endswith("\n/opt/corvan/zor/config/SingleUserMode\n")


def test_without_rollback_the_replaced_files_stay_next_to_the_new_ones(machine):
    install_older(machine)
    machine.make_directory("/etc/zor/zor.ini.bak")

    outcome = fail(machine, "-norollback")

    printed_lines(
        outcome,
        "*** Error: could not open or write to INI file. Error = 2",
        "Exec '/opt/corvan/zor/bin/trawlcfg -enable all >/dev/null 2>&1' returned 0",
        "Installation failed",
        "Done.",
    )
    assert machine.read(HOME + "/bin/trawlhw.bak") == "older"
    assert machine.read_bytes(HOME + "/bin/trawlhw") == b"\x7fELF hardware scanner\x00\xff"
    assert machine.read(HOME + "/config/xss/schema.xss.bak") == "<schema/>\n"


def test_a_failed_upgrade_keeps_the_cache_and_skips_the_permission_pass(machine):
    install_older(machine)
    machine.plant(HOME + "/cache_data/entry", "cached")
    machine.change_mode(HOME + "/bin", 0o711)
    machine.remove(SPB)

    fail(machine)

    assert machine.read(HOME + "/cache_data/entry") == "cached"
    assert machine.mode(HOME + "/bin") == 0o711


def test_a_failed_upgrade_makes_common_directories_only_for_itself(machine):
    install_older(machine)
    machine.remove("/usr/kel")
    machine.make_directory("/etc/zor/zor.ini.bak")
    before = machine.tree()

    fail(machine)

    rolled_back(machine, before, FILE_INDEX, PROPERTIES_DIRECTORY, XSS_FILES, MAIN_PROPERTY_FILE)
    assert not machine.exists("/usr/kel")


def test_a_failed_upgrade_leaves_the_registry_untouched(machine):
    install_older(machine)
    machine.remove(SPB)
    before = machine.read("/etc/zor/zor.ini")

    fail(machine)

    same_text(machine.read("/etc/zor/zor.ini"), before)


def test_a_failed_upgrade_can_be_repeated(machine):
    install_older(machine)
    package = machine.read_bytes(SPB)
    machine.pack({"install/empty": b""})
    fail(machine)
    machine.plant(SPB, package)

    outcome = machine.run("i", "ABC", "-s", SPB)

    assert outcome.status == 0
    assert machine.read(HOME + "/properties/scan.properties") == "depth=4\n"
    assert machine.read(HOME + "/config/xss/schema.xss") == "<schema/>\n"
    assert "\nZOR_Exploiters = OLD:ABC:\n" in machine.read("/etc/zor/zor.ini")
