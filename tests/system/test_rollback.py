"""Each fatal failure of a fresh installation, and what its rollback restores."""

import pytest

from harness.checks import not_printed, printed, printed_lines, same_lines, same_text, same_tree
from harness.installations import FRESH_START, NO_SELINUX, SHARED_TREE, tree_with
from harness.machine import ANN, SPB
from harness.rollback import (
    COMMON_SETTING,
    FILE_INDEX,
    INSTALL_TYPE_FILE,
    OLDER_BACKUP,
    SINGLE_USER_FLAG,
    XSS_FILES,
    rolled_back,
)
from harness.shared_machine import ANN as ANN_HERSELF
from harness.shared_machine import SharedMachine, why_not

FAILED = """\
Installation failed, rolling back
Done.
"""

UP_TO_LABELS = FRESH_START + "Extracting configs to '/opt/corvan/zor/config'\n" + NO_SELINUX


def fail(machine, *options, **how):
    """Tries to install for exploiter ABC, which must fail."""
    outcome = machine.run("i", "ABC", "-s", SPB, *options, **how)
    assert outcome.status == 1
    return outcome


def plant_older_files(machine):
    """Plants a home directory with files that an installation replaces, and others."""
    home = "/opt/corvan/zor"
    machine.make_directory(home, 0o711)
    machine.plant(home + "/bin/trawlcfg", "older control", 0o700)
    machine.plant(home + "/bin/mine", "my own", 0o600)
    machine.plant(home + "/properties/scan.properties", "depth=1\n", 0o604)
    machine.plant(home + "/config/Zor.properties", "older=1\n", 0o640)
    machine.plant(home + "/config/ZorTrace.properties", "older=2\n", 0o640)
    machine.plant(home + "/install/trawlcfg.sh", "older script\n", 0o700)
    machine.make_directory(home + "/cache_data", 0o711)


def test_a_missing_package_changes_nothing(machine):
    before = machine.tree()

    outcome = machine.run("i", "ABC", "-s", "/no/such.spb")

    printed(
        outcome,
        FRESH_START.replace("/media/toolkit.spb", "/no/such.spb")
        + "*** Error: package not found or not valid.\n"
        + NO_SELINUX
        + FAILED,
        status=1,
    )
    same_tree(machine.tree(), before)


def test_a_missing_package_leaves_an_index_that_was_there(machine):
    machine.plant("/opt/corvan/zor/ZOR_files", "/opt/corvan/zor/bin/x\n", 0o644)
    before = machine.tree()

    machine.remove(SPB)
    fail(machine)

    same_tree(machine.tree(), before)


@pytest.mark.parametrize(
    "empty, message",
    [
        ("bin/empty", "Bin dir file extraction failed\n"),
        ("properties/empty", ""),
        ("config/empty", "Extracting configs to '/opt/corvan/zor/config'\n"),
        ("config/xss/empty", "Extracting configs to '/opt/corvan/zor/config'\n"),
        ("install/empty", "Extracting configs to '/opt/corvan/zor/config'\n"),
    ],
)
def test_an_empty_file_of_the_package_cannot_be_extracted(machine, empty, message):
    machine.pack({empty: b""})
    before = machine.tree()

    outcome = machine.run("i", "ABC", "-s", SPB)

    printed(
        outcome,
        FRESH_START
        + message
        + "File extraction failed, error = 1 (Cannot open file for reading)\n"
        + NO_SELINUX
        + FAILED,
        status=1,
    )
    same_tree(machine.tree(), before)


@pytest.mark.parametrize(
    "empty", ["bin/empty", "properties/empty", "config/empty", "install/empty"]
)
def test_files_replaced_before_the_extraction_failed_come_back(machine, empty):
    machine.pack({empty: b""})
    plant_older_files(machine)
    before = machine.tree()

    fail(machine)

    rolled_back(machine, before)


def test_an_index_that_was_there_is_deleted_when_the_extraction_fails(machine):
    machine.pack({"bin/empty": b""})
    machine.plant("/opt/corvan/zor/ZOR_files", "/opt/corvan/zor/bin/x\n")
    before = machine.tree()

    fail(machine)

    rolled_back(machine, before, FILE_INDEX)
    assert not machine.exists("/opt/corvan/zor/ZOR_files")


def test_an_older_backup_of_a_replaced_file_does_not_come_back(machine):
    machine.pack({"install/empty": b""})
    plant_older_files(machine)
    machine.plant("/opt/corvan/zor/bin/trawlcfg.bak", "oldest control")
    before = machine.tree()

    fail(machine)

    rolled_back(machine, before, OLDER_BACKUP)


def test_a_replaced_xss_file_does_not_come_back_once_the_second_pass_has_replaced_it(machine):
    machine.pack({"install/empty": b""})
    machine.plant("/opt/corvan/zor/config/xss/schema.xss", "older")
    before = machine.tree()

    fail(machine)

    rolled_back(machine, before, XSS_FILES)


def test_a_replaced_xss_file_comes_back_when_the_first_pass_fails(machine):
    machine.pack({"config/xss/schema.xss": b"new", "config/zz": b""})
    machine.plant("/opt/corvan/zor/config/xss/schema.xss", "older")
    before = machine.tree()

    fail(machine)

    rolled_back(machine, before)


def test_a_file_whose_directory_is_missing_cannot_be_written(machine):
    machine.pack({"bin/no/such/directory": b"x"})
    before = machine.tree()

    printed_lines(
        fail(machine),
        "Bin dir file extraction failed",
        "File extraction failed, error = 2 (Cannot open file for writing)",
    )

    rolled_back(machine, before)


def test_a_directory_that_cannot_be_made_fails_the_extraction(machine):
    machine.link("/opt/corvan/zor/properties", "/nowhere")
    before = machine.tree()

    printed_lines(
        fail(machine),
        "Starting file extraction...",
        "File extraction failed, error = 11 (Cannot create directory)",
    )

    rolled_back(machine, before)


def test_a_file_that_cannot_be_renamed_to_its_backup_fails_the_extraction(machine):
    plant_older_files(machine)
    machine.make_directory("/opt/corvan/zor/properties/scan.properties.bak")
    before = machine.tree()

    printed_lines(
        fail(machine),
        "Starting file extraction...",
        "File extraction failed, error = 9 (Cannot rename file)",
    )

    rolled_back(machine, before)


def test_a_file_too_large_for_the_process_fails_the_extraction(machine):
    before = machine.tree()

    # 8 blocks of 512 bytes: less than libzorcore.so needs.
    outcome = machine.run_in_shell(
        'trap \'\' XFSZ; ulimit -f 8; exec "$0" "$@"', "i", "ABC", "-s", SPB
    )

    assert outcome.status == 1
    printed_lines(
        outcome,
        "Bin dir file extraction failed",
        "File extraction failed, error = 5 (Cannot write file)",
    )
    rolled_back(machine, before)


def test_a_limit_on_the_size_of_files_does_not_end_the_run_halfway(machine):
    before = machine.tree()

    # Without the trap above, a write beyond the limit sends a signal.
    outcome = machine.run_in_shell('ulimit -f 8; exec "$0" "$@"', "i", "ABC", "-s", SPB)

    assert outcome.status == 1
    printed_lines(outcome, "File extraction failed, error = 5 (Cannot write file)")
    printed_lines(outcome, "Installation failed, rolling back", "Done.")
    rolled_back(machine, before)


def test_a_full_disk_fails_the_extraction(machine):
    machine.pack({"bin/large": b"0123456789" * 20000})

    outcome = machine.run_in_shell(
        '"$0" "$@"; echo status $?; find /opt -mindepth 1',
        "i",
        "ABC",
        "-s",
        SPB,
        options=("--size", "65536", "--tmpfs", "/opt"),
    )

    printed_lines(
        outcome,
        "Bin dir file extraction failed",
        "File extraction failed, error = 6 (Cannot write file (out of space))",
    )
    assert outcome.stdout.endswith("Installation failed, rolling back\nDone.\nstatus 1\n")


def test_a_small_file_on_a_full_disk_fails_the_extraction(machine):
    machine.pack(
        without=(
            "bin/trawlfs",
            "bin/trawlhw",
            "bin/libzorcore.so",
            "properties/",
            "properties/scan.properties",
        )
    )
    machine.plant("/media/filler", b"x" * 4096)

    outcome = machine.run_in_shell(
        'cat /media/filler >/opt/filler; "$0" "$@"; echo status $?; find /opt -mindepth 1',
        "i",
        "ABC",
        "-s",
        SPB,
        options=("--size", "8192", "--tmpfs", "/opt"),
    )

    printed_lines(outcome, "File extraction failed, error = 6 (Cannot write file (out of space))")
    assert outcome.stdout.endswith(
        "Installation failed, rolling back\nDone.\nstatus 1\n/opt/filler\n"
    )


def test_a_cache_directory_that_cannot_be_made_fails_the_installation(machine):
    machine.link("/opt/corvan/zor/cache_data", "/nowhere")
    before = machine.tree()

    printed(
        fail(machine),
        UP_TO_LABELS + "Error creating dir cache_data in /opt/corvan/zor result=11 "
        "(Cannot create directory)\n"
        "Cannot create subdir: cache_data\n" + FAILED,
        status=1,
    )

    rolled_back(machine, before, FILE_INDEX)


def test_a_configuration_directory_of_the_binaries_that_cannot_be_made_fails_it(machine):
    machine.link("/opt/corvan/zor/bin/etc", "/nowhere")
    before = machine.tree()

    printed(
        fail(machine),
        UP_TO_LABELS
        + "Error creating dir etc in /opt/corvan/zor/bin result=11 (Cannot create directory)\n"
        "Cannot create subdir: etc\n" + FAILED,
        status=1,
    )

    rolled_back(machine, before, FILE_INDEX)


def test_an_install_directory_that_cannot_be_made_fails_the_installation(machine):
    machine.pack(without=("install/", "install/trawlcfg.sh", "install/rmdirs.sh"))
    machine.link("/opt/corvan/zor/install", "/nowhere")
    before = machine.tree()

    printed(
        fail(machine),
        UP_TO_LABELS
        + "Error creating dir install in /opt/corvan/zor result=11 (Cannot create directory)\n"
        "Cannot create extra directories!\n" + FAILED,
        status=1,
    )

    rolled_back(machine, before, FILE_INDEX)


MAIN = "/opt/corvan/zor/config/Zor.properties"
TRACE = "/opt/corvan/zor/config/ZorTrace.properties"


def test_a_missing_main_property_file_fails_the_installation(machine):
    machine.pack(without=("config/Zor.properties",))
    before = machine.tree()

    printed(
        fail(machine),
        UP_TO_LABELS + f"Customizing property file: {MAIN}\n"
        f"Loading file {MAIN} error: 2 (No such file or directory)\n"
        "Could not load property file\n" + FAILED,
        status=1,
    )

    rolled_back(machine, before, FILE_INDEX)


@pytest.mark.parametrize("name", ["Zor.properties", "ZorTrace.properties"])
def test_a_property_file_that_cannot_be_saved_fails_the_installation(machine, name):
    path = "/home/ann/corvan/zor/config/" + name
    machine.pack(without=("config/" + name,))
    machine.plant(path, "key=$(ZOR_DestinationDir)\n", 0o400)
    before = machine.tree()

    outcome = fail(machine, user=ANN)

    printed_lines(
        outcome,
        f"Customizing property file: {path}",
        f"Saving file {path} error: 13 (Permission denied)",
        "Could not save property file",
        "Installation failed, rolling back",
        "Done.",
    )
    rolled_back(machine, before, FILE_INDEX)


@pytest.mark.parametrize("name", ["Zor.properties", "ZorTrace.properties"])
def test_a_directory_in_place_of_a_property_file_cannot_be_saved(machine, name):
    path = "/opt/corvan/zor/config/" + name
    machine.pack({f"config/{name}/": b""}, without=("config/" + name,))
    before = machine.tree()

    outcome = fail(machine)

    # It opens for reading, and reads as a file without lines.
    printed_lines(
        outcome,
        f"Customizing property file: {path}",
        f"Saving file {path} error: 21 (Is a directory)",
        "Could not save property file",
        "Installation failed, rolling back",
        "Done.",
    )
    rolled_back(machine, before, FILE_INDEX)


@pytest.mark.parametrize("name", ["Zor.properties", "ZorTrace.properties"])
def test_a_property_file_that_cannot_be_read_fails_the_installation(machine, name):
    path = "/home/ann/corvan/zor/config/" + name
    machine.pack(without=("config/" + name,))
    machine.plant(path, "key=$(ZOR_DestinationDir)\n", 0)
    before = machine.tree()

    outcome = fail(machine, user=ANN)

    printed_lines(
        outcome,
        f"Customizing property file: {path}",
        f"Loading file {path} error: 13 (Permission denied)",
        "Could not load property file",
        "Installation failed, rolling back",
        "Done.",
    )
    rolled_back(machine, before, FILE_INDEX)


def test_a_missing_trace_property_file_fails_the_installation(machine):
    machine.pack(without=("config/ZorTrace.properties",))
    before = machine.tree()

    printed(
        fail(machine),
        UP_TO_LABELS + f"Customizing property file: {MAIN}\n"
        f"Customizing property file: {TRACE}\n"
        f"Loading file {TRACE} error: 2 (No such file or directory)\n"
        "Could not load property file\n" + FAILED,
        status=1,
    )

    rolled_back(machine, before, FILE_INDEX)


UP_TO_REGISTRY = (
    UP_TO_LABELS
    + f"""\
Customizing property file: {MAIN}
Customizing property file: {TRACE}
Updating file with variables /opt/corvan/zor/install/trawlcfg.sh
Updating: /opt/corvan/zor/install/trawlcfg.sh
Updating file with variables /opt/corvan/zor/install/rmdirs.sh
Updating: /opt/corvan/zor/install/rmdirs.sh
Saving INI file to /etc/zor/zor.ini
"""
)


def test_a_registry_that_cannot_be_opened_fails_the_installation(machine):
    machine.plant("/etc/zor", "a file in place of the directory")
    before = machine.tree()

    printed(
        fail(machine),
        UP_TO_REGISTRY + "*** Error: could not open or write to INI file. Error = 2\n" + FAILED,
        status=1,
    )

    rolled_back(machine, before, FILE_INDEX, COMMON_SETTING)


def test_a_registry_that_cannot_be_backed_up_fails_the_installation(machine):
    machine.make_directory("/etc/zor/zor.ini")
    before = machine.tree()

    outcome = fail(machine)

    printed(
        outcome,
        UP_TO_REGISTRY.replace("(code=1)", "(code=2)")
        + "*** Error: could not open or write to INI file. Error = 4\n"
        + FAILED,
        status=1,
    )
    rolled_back(machine, before, FILE_INDEX, COMMON_SETTING)


def test_a_registry_whose_backup_cannot_be_opened_fails_the_installation(machine):
    machine.plant("/etc/zor/zor.ini", "unsound")
    machine.make_directory("/etc/zor/zor.ini.bak")
    before = machine.tree()

    printed_lines(
        fail(machine),
        "Saving INI file to /etc/zor/zor.ini",
        "*** Error: could not open or write to INI file. Error = 2",
    )

    rolled_back(machine, before, FILE_INDEX, COMMON_SETTING)


def test_a_full_disk_under_the_registry_fails_the_installation(machine):
    machine.plant("/media/filler", b"x" * 4096)

    outcome = machine.run_in_shell(
        'cat /media/filler >/etc/zor/filler; "$0" "$@"; echo status $?; '
        "find /etc/zor -mindepth 1",
        "i",
        "ABC",
        "-s",
        SPB,
        options=("--size", "4096", "--tmpfs", "/etc/zor"),
    )

    printed_lines(
        outcome,
        "Saving INI file to /etc/zor/zor.ini",
        "*** Error: could not open or write to INI file. Error = 5",
    )
    assert outcome.stdout.endswith(
        "Installation failed, rolling back\nDone.\nstatus 1\n/etc/zor/filler\n"
    )


def test_an_invalid_registry_comes_back(machine):
    machine.plant("/etc/zor/zor.ini", "ZOR_Version = 2.x\n", 0o600)
    machine.let_commands_fail(("common_trace_path", 1))
    before = machine.tree()

    fail(machine)

    rolled_back(machine, before, FILE_INDEX, INSTALL_TYPE_FILE, COMMON_SETTING)
    assert machine.mode("/etc/zor/zor.ini") == 0o600


@pytest.mark.skipif(why_not() is not None, reason=str(why_not()))
def test_a_registry_whose_owner_cannot_be_kept_comes_back_with_its_mode(binary):
    machine = SharedMachine(binary)
    try:
        machine.make_directory("/home/ann/.zor")
        machine.give_to(ANN_HERSELF, "/home/ann/.zor")
        machine.plant("/home/ann/.zor/zor.ini", "ZOR_Version = 2.x\n", 0o646)  # of root
        machine.let_commands_fail(("common_trace_path", 1))

        fail(machine, "-c", "/home/ann/traces", user=ANN_HERSELF)

        assert machine.read("/home/ann/.zor/zor.ini") == "ZOR_Version = 2.x\n"
        assert machine.mode("/home/ann/.zor/zor.ini") == 0o646
    finally:
        machine.delete()


def test_an_older_backup_of_the_registry_does_not_come_back(machine):
    machine.plant("/etc/zor/zor.ini", "ZOR_Version = 2.x\n")
    machine.plant("/etc/zor/zor.ini.bak", "older")
    machine.let_commands_fail(("common_trace_path", 1))
    before = machine.tree()

    fail(machine)

    rolled_back(machine, before, FILE_INDEX, INSTALL_TYPE_FILE, COMMON_SETTING, OLDER_BACKUP)


def test_a_failing_trace_path_command_fails_the_installation(machine):
    machine.let_commands_fail(("common_trace_path", 3))
    before = machine.tree()

    outcome = fail(machine)

    printed(
        outcome,
        UP_TO_REGISTRY
        + """\
Created Corvan Common Dir='/usr/kel/corvan/common' result=0
Setting logs dir='/usr/kel/corvan/common/ZOR/logs'
Updating common trace path='/usr/kel/corvan/common' result=0
Exec '/opt/corvan/zor/bin/trawlcfg -s common_trace_path /usr/kel/corvan/common/ZOR/logs \
>/dev/null 2>&1' returned 768
Setting common trace path='/usr/kel/corvan/common/ZOR/logs' result=768
"""
        + FAILED,
        status=1,
    )
    rolled_back(machine, before, FILE_INDEX, INSTALL_TYPE_FILE, COMMON_SETTING)


def test_after_a_failing_trace_path_command_exactly_this_is_left(machine):
    machine.let_commands_fail(("common_trace_path", 3))

    fail(machine)

    assert not machine.exists("/usr/kel")
    same_text(
        machine.listing("/etc", "/opt"),
        """\
d 0755 /etc
d 0775 /etc/kel
d 0775 /etc/kel/corvan
d 0775 /etc/kel/corvan/common
d 0775 /etc/kel/corvan/common/cfg
f 0664 /etc/kel/corvan/common/cfg/log.properties
d 0755 /opt
d 0755 /opt/corvan
d 0755 /opt/corvan/zor
f 0644 /opt/corvan/zor/ZOR_files
d 0750 /opt/corvan/zor/install
f 0666 /opt/corvan/zor/install/zor_install.properties
""",
    )


def test_a_missing_scanner_control_fails_the_installation(machine):
    machine.pack(without=("bin/trawlcfg",))

    printed_lines(
        fail(machine),
        "Exec '/opt/corvan/zor/bin/trawlcfg -s common_trace_path "
        "/usr/kel/corvan/common/ZOR/logs >/dev/null 2>&1' returned 32512",
        "Setting common trace path='/usr/kel/corvan/common/ZOR/logs' result=32512",
        "Installation failed, rolling back",
    )


def test_a_failing_trace_path_command_fails_a_per_user_installation_too(machine):
    machine.let_commands_fail(("common_trace_path", 1))
    before = machine.tree()

    fail(machine, "-c", "/home/ann/a/b", user=ANN)

    rolled_back(machine, before, FILE_INDEX, INSTALL_TYPE_FILE)


def test_a_late_failure_brings_back_every_replaced_file(machine):
    plant_older_files(machine)
    machine.let_commands_fail(("common_trace_path", 1))
    before = machine.tree()

    fail(machine)

    rolled_back(machine, before, FILE_INDEX, INSTALL_TYPE_FILE, COMMON_SETTING)


def test_an_install_type_file_of_the_package_is_rolled_back(machine):
    machine.pack({"install/zor_install.properties": b"ZOR_InstallType=none\n"})
    machine.plant("/opt/corvan/zor/install/zor_install.properties", "ZOR_InstallType=global\n#\n")
    machine.let_commands_fail(("common_trace_path", 1))
    before = machine.tree()

    fail(machine)

    rolled_back(machine, before, FILE_INDEX, COMMON_SETTING)


def test_a_custom_trace_directory_is_removed_again(machine):
    machine.let_commands_fail(("common_trace_path", 1))
    before = machine.tree()

    fail(machine, "-c", "/opt/trace/deep")

    rolled_back(machine, before, FILE_INDEX, INSTALL_TYPE_FILE)


def test_a_log_directory_in_which_something_was_written_stays(machine):
    machine.pack({"bin/trawlcfg": b"#!/bin/sh\n: >/opt/trace/log\nexit 1\n"})
    before = machine.tree()

    fail(machine, "-c", "/opt/trace")

    after = machine.tree()
    assert after["/opt/trace/log"].content == b""
    before["/opt/trace"] = after["/opt/trace"]
    before["/opt/trace/log"] = after["/opt/trace/log"]
    rolled_back(machine, before, FILE_INDEX, INSTALL_TYPE_FILE)


def test_the_single_user_flag_is_made_after_a_failure_too(machine):
    machine.let_commands_fail(("common_trace_path", 1))
    before = machine.tree()

    outcome = fail(machine, "-r")

    printed_lines(
        outcome, "Creating single user mode flag file: /opt/corvan/zor/config/SingleUserMode"
    )
    rolled_back(machine, before, FILE_INDEX, INSTALL_TYPE_FILE, COMMON_SETTING, SINGLE_USER_FLAG)


def test_the_single_user_flag_keeps_the_configuration_directory_of_a_failed_extraction(machine):
    machine.pack({"install/empty": b""})
    before = machine.tree()

    outcome = fail(machine, "-r")

    printed(
        outcome,
        FRESH_START + "Extracting configs to '/opt/corvan/zor/config'\n"
        "File extraction failed, error = 1 (Cannot open file for reading)\n"
        + NO_SELINUX
        + "Creating single user mode flag file: /opt/corvan/zor/config/SingleUserMode\n"
        + FAILED,
        status=1,
    )
    # The flag's line is appended to the index, which the failed extraction had deleted.
    rolled_back(machine, before, FILE_INDEX, SINGLE_USER_FLAG)
    same_text(machine.read("/opt/corvan/zor/ZOR_files"), "/opt/corvan/zor/config/SingleUserMode\n")


def test_without_a_configuration_directory_the_single_user_flag_cannot_be_made(machine):
    machine.remove(SPB)
    before = machine.tree()

    outcome = fail(machine, "-r")

    printed(
        outcome,
        FRESH_START
        + "*** Error: package not found or not valid.\n"
        + NO_SELINUX
        + "Creating single user mode flag file: /opt/corvan/zor/config/SingleUserMode\n"
        "Unable to create single user mode flag file\n" + FAILED,
        status=1,
    )
    same_tree(machine.tree(), before)


def test_without_rollback_everything_stays(machine):
    plant_older_files(machine)
    machine.let_commands_fail(("common_trace_path", 1))

    outcome = fail(machine, "-norollback")

    printed_lines(
        outcome,
        "Setting common trace path='/usr/kel/corvan/common/ZOR/logs' result=256",
        "Installation failed",
        "Done.",
    )
    not_printed(outcome, "rolling back")
    same_text(
        machine.listing("/etc", "/opt", "/usr/kel"),
        tree_with(
            SHARED_TREE,
            {
                "/opt/corvan/zor": "d 0711",
                "/opt/corvan/zor/bin/mine": "f 0600",
                "/opt/corvan/zor/bin/trawlcfg.bak": "f 0700",
                "/opt/corvan/zor/cache_data": "d 0711",
                "/opt/corvan/zor/config/Zor.properties": "f 0755",
                "/opt/corvan/zor/config/Zor.properties.bak": "f 0640",
                "/opt/corvan/zor/config/ZorHWConfig.xml": "f 0755",
                "/opt/corvan/zor/config/ZorTrace.properties": "f 0755",
                "/opt/corvan/zor/config/ZorTrace.properties.bak": "f 0640",
                "/opt/corvan/zor/config/xss/schema.xss.bak": "f 0755",
                "/opt/corvan/zor/install": "d 0755",
                "/opt/corvan/zor/install/trawlcfg.sh.bak": "f 0700",
                "/opt/corvan/zor/install/zor_install.properties": "f 0666",
                "/opt/corvan/zor/properties/scan.properties.bak": "f 0604",
            },
        ),
    )
    assert machine.read("/opt/corvan/zor/bin/trawlcfg.bak") == "older control"


def test_a_failed_installation_can_be_repeated(machine):
    machine.let_commands_fail(("common_trace_path", 1))
    fail(machine)
    machine.remove("/var/scanners/fail")

    outcome = machine.run("i", "ABC", "-s", SPB)

    assert outcome.status == 0
    printed_lines(
        outcome, "Performing fresh install on /opt/corvan/zor (config=/opt/corvan/zor/config)"
    )
    same_lines(
        machine.run("t").stdout.splitlines()[4:8],
        [
            "Status of shared (global) installation:",
            "INI file = /etc/zor/zor.ini",
            "Install dir = /opt/corvan/zor",
            "Install version = 9.2.30.0000",
        ],
    )
