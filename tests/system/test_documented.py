"""What the documents say about limits, leftovers and untrusted users, one test for each statement.

Most promises of the documents are the subject of another file of this folder; here are the rest.
"""

import os

import pytest

from harness.checks import not_printed, printed_lines
from harness.machine import ANN as USER
from harness.machine import SPB
from harness.shared_machine import ANN, GUEST, KEY, SharedMachine, why_not

HOME = "/opt/corvan/zor"
REGISTRY = "/etc/zor/zor.ini"
SCANNER = HOME + "/bin/trawlhw"
CUSTOM_SCANNER = {"bin/customscanners/": b"", "bin/customscanners/probe": b"probe\n"}


@pytest.fixture
def shared_machine(binary):
    if why_not() is not None:
        pytest.skip(why_not())
    fresh = SharedMachine(binary)
    yield fresh
    fresh.delete()


def install(machine, *options, exploiter="ABC", **how):
    outcome = machine.run("i", exploiter, "-s", SPB, *options, **how)
    assert outcome.status == 0, outcome.stdout
    return outcome


def with_control(machine, script):
    """A package whose scanner control runs `script`."""
    machine.pack({"bin/trawlcfg": b"#!/bin/sh\n" + script})


# Failures.


def test_an_upgrade_with_a_mistyped_package_deletes_the_properties_of_the_administrator(machine):
    install(machine)
    machine.plant(HOME + "/properties/own.properties", "mine\n")

    assert machine.run("i", "ABC", "-s", "/media/toolkit.sbp").status == 1

    assert not machine.exists(HOME + "/properties")


def test_a_rolled_back_shared_installation_blocks_one_of_a_user_in_its_directory(machine):
    machine.let_commands_fail(("common_trace_path", 3))
    machine.make_directory("/opt/target", 0o777)
    assert machine.run("i", "ABC", "-s", SPB, "-d", "/opt/target").status == 1

    command = ("i", "ABC", "-s", SPB, "-d", "/opt/target", "-eeo", "-l")
    outcome = machine.run(*command)

    assert outcome.status == 1
    printed_lines(
        outcome,
        "*** Error: incompatible install type",
        "ZOR already installed as global in /opt/target",
    )
    machine.remove("/opt/target/install/zor_install.properties")
    assert machine.run(*command).status == 0


def test_a_failing_run_after_a_killed_upgrade_leaves_new_programs_with_the_old_registry(machine):
    install(machine)
    machine.register(version="9.1.0.0000", date="20/01/01")
    machine.plant(SCANNER, "new program", 0o755)
    machine.plant(SCANNER + ".bak", "old program", 0o755)
    machine.pack(without=["install/", "install/trawlcfg.sh", "config/ZorTrace.properties"])
    machine.remove(HOME + "/config/ZorTrace.properties")

    assert machine.run("i", "ABC", "-s", SPB).status == 1

    assert machine.read(SCANNER) == "new program"
    assert not machine.exists(SCANNER + ".bak")
    assert machine.read(REGISTRY).startswith("ZOR_Version = 9.1.0.0000\n")


def test_backups_renamed_before_the_next_run_bring_the_old_programs_back(machine):
    install(machine)
    machine.register(version="9.1.0.0000", date="20/01/01")
    machine.plant(SCANNER, "old program", 0o755)  # as after "mv trawlhw.bak trawlhw"
    machine.pack(without=["install/", "install/trawlcfg.sh", "config/ZorTrace.properties"])
    machine.remove(HOME + "/config/ZorTrace.properties")

    assert machine.run("i", "ABC", "-s", SPB).status == 1

    assert machine.read(SCANNER) == "old program"


def test_a_backup_that_a_user_blocks_is_code_9_and_found_by_its_name(machine):
    machine.pack(CUSTOM_SCANNER)
    install(machine)
    machine.plant(HOME + "/bin/customscanners/probe.bak/x")

    outcome = machine.run("i", "ABC", "-s", SPB)

    assert outcome.status == 1
    printed_lines(outcome, "File extraction failed, error = 9 (Cannot rename file)")
    found = machine.run_in_shell(f"find {HOME} /etc/zor -name '*.bak' ! -type f")
    assert found.stdout == HOME + "/bin/customscanners/probe.bak\n"


def test_a_placeholder_whose_value_contains_itself_never_ends(machine):
    outcome = machine.run_in_shell(
        "ulimit -S -t 1; exec \"$0\" i ABC -s /media/toolkit.spb -d '/opt/$(ZOR_DestinationDir)'"
    )

    assert outcome.status in (-24, 128 + 24)  # SIGXCPU, of the shell's limit


# Scanners.


@pytest.mark.parametrize("options", [(), ("-eeo", "-z")], ids=["without -z", "with -z"])
@pytest.mark.parametrize("command", ["i", "r"])
def test_scanners_that_do_not_stop_are_ignored(machine, command, options):
    install(machine)
    machine.let_commands_fail(("-shutdown", 1), ("-disable", 1))

    outcome = machine.run(command, "ABC", "-s", SPB, *options)

    assert outcome.status == 0
    not_printed(outcome, "Could not shutdown ZOR.")
    not_printed(outcome, "Cannot stop ZOR for update")


# Removals.


def test_a_removal_without_an_intact_installation_fails(machine):
    assert machine.run("r", "ABC").status == 1


def test_a_private_removal_deletes_its_whole_directory(machine):
    machine.plant("/opt/archive/2019/letter", "mine\n")

    assert machine.run("r", "ABC", "-p", "-d", "/opt/archive").status == 0

    assert not machine.exists("/opt/archive")


def test_a_file_system_mounted_below_the_cache_is_emptied(machine):
    install(machine)
    machine.make_directory(HOME + "/cache_data/mounted")
    machine.plant("/srv/data/letter", "mine\n")

    outcome = machine.run(
        "r",
        "ABC",
        options=("--bind", machine.at("/srv/data"), HOME + "/cache_data/mounted"),
    )

    assert outcome.status == 0
    assert not machine.exists("/srv/data/letter")


def test_a_newline_in_a_name_forges_a_line_of_the_log(machine):
    install(machine)
    machine.plant(HOME + "/cache_data/x\nInstallation failed", "")

    outcome = machine.run("r", "ABC")

    printed_lines(outcome, "Installation failed")
    assert outcome.status == 0


def test_the_trace_directory_of_c_stays_after_the_last_removal(machine):
    install(machine, "-c", "/srv/traces")
    machine.plant("/srv/traces/zor.log", "mine\n")

    assert machine.run("r", "ABC").status == 0

    assert machine.read("/srv/traces/zor.log") == "mine\n"


# Untrusted users.


def writable_by_others(machine):
    places = ("/etc/zor", "/etc/kel", "/opt", "/usr/kel")
    return [path for path, node in machine.tree(*places).items() if node.mode & 0o002]


def test_without_r_these_places_are_open_to_everybody(machine):
    machine.pack(CUSTOM_SCANNER)

    install(machine, umask=0o077)

    assert writable_by_others(machine) == [
        "/opt/corvan/zor/bin/customscanners",
        "/opt/corvan/zor/bin/etc",
        "/opt/corvan/zor/cache_data",
        "/usr/kel",
        "/usr/kel/corvan",
        "/usr/kel/corvan/common",
        "/usr/kel/corvan/common/ZOR",
        "/usr/kel/corvan/common/ZOR/logs",
    ]


def test_with_r_from_the_first_installation_nothing_is_open_to_everybody(machine):
    machine.pack(CUSTOM_SCANNER)

    install(machine, "-r")

    assert writable_by_others(machine) == []


def test_with_r_the_directories_of_the_setting_are_closed_to_the_group_too(machine):
    install(machine, "-r")

    assert machine.mode("/etc/kel/corvan/common/cfg") == 0o755
    assert machine.mode("/etc/kel/corvan/common/cfg/log.properties") == 0o664


def test_r_in_a_later_run_leaves_the_common_directory_open(machine):
    install(machine)

    install(machine, "-r")

    assert writable_by_others(machine) == [
        "/usr/kel",
        "/usr/kel/corvan",
        "/usr/kel/corvan/common",
        "/usr/kel/corvan/common/ZOR",
        "/usr/kel/corvan/common/ZOR/logs",
    ]


def test_a_file_of_root_that_another_user_renames_gets_the_mode_of_its_new_name(shared_machine):
    machine = shared_machine
    install(machine)
    machine.plant(HOME + "/bin/etc/notes", "of root\n", 0o600)
    etc = machine.at(HOME + "/bin/etc")
    machine.as_user(GUEST, lambda: os.rename(etc + "/notes", etc + "/trawlfs"))

    install(machine)

    assert machine.mode(HOME + "/bin/etc/trawlfs") == 0o777


def test_a_directory_that_a_group_can_write_to_counts_as_one_where_others_can_plant(shared_machine):
    machine = shared_machine
    install(machine)
    machine.remove(HOME + "/ZOR_files")
    os.link(machine.at(KEY), machine.at(HOME + "/ZOR_files"))
    machine.change_mode(HOME, 0o775)

    install(machine)

    assert machine.read(KEY) == "the key\n"


def test_a_rollback_restores_owner_group_and_mode_of_the_registry(shared_machine):
    machine = shared_machine
    install(machine)
    machine.register(version="9.1.0.0000", date="20/01/01")
    os.chown(machine.at(REGISTRY), ANN.uid, GUEST.uid)
    machine.change_mode(REGISTRY, 0o640)
    before = machine.state(REGISTRY)
    # After the registry was saved, the command that enables the scanners is interrupted.
    with_control(machine, b'case "$*" in *enable*) kill -INT $$ ;; esac\n')

    outcome = machine.run("i", "XYZ", "-s", SPB)

    printed_lines(outcome, "Saving INI file to /etc/zor/zor.ini")
    printed_lines(outcome, "Installation failed, rolling back")
    assert machine.state(REGISTRY) == before


def test_an_index_that_the_owner_of_the_home_made_first_stays_theirs(shared_machine):
    machine = shared_machine
    machine.as_user(ANN, lambda: os.mkdir(machine.at("/home/ann/zor")))
    machine.as_user(ANN, lambda: machine.plant("/home/ann/zor/ZOR_files"))

    install(machine, "-d", "/home/ann/zor")

    assert machine.owner("/home/ann/zor/ZOR_files") == ANN.uid


# The command line.


@pytest.mark.parametrize("character", [*"\"'\\$`;&|<>()\t\n"])
def test_a_directory_with_this_character_is_not_called_by_its_name(machine, character):
    outcome = machine.run("i", "ABC", "-s", SPB, "-d", f"/opt/a{character}b")

    assert (outcome.status, outcome.commands) == (1, [])


def test_a_directory_can_run_a_command(machine):
    assert machine.run("i", "ABC", "-s", SPB, "-d", "/opt/a;b", "-c", "/srv/c;d").status == 1
    assert machine.run("i", "ABC", "-s", SPB, "-c", "/srv/$(id>/var/scanners/ran)").status == 0

    assert machine.read("/var/scanners/ran").startswith("uid=0(root)")


def test_the_value_of_the_common_directory_can_run_a_command(machine):
    setting = "corvan_common_dir=/srv/`id>/var/scanners/ran`\n"
    machine.plant("/etc/kel/corvan/common/cfg/log.properties", setting)

    machine.run("i", "ABC", "-s", SPB)

    assert machine.read("/var/scanners/ran").startswith("uid=0(root)")


def test_a_relative_directory_is_registered_as_it_is(machine):
    machine.run_in_shell('cd /opt && "$0" i ABC -s /media/toolkit.spb -d tools')

    assert "\nZOR_HomeDirectory = tools\n" in machine.read(REGISTRY)
    outcome = machine.run("i", "ABC", "-s", SPB)
    printed_lines(outcome, "*** Error: cannot create file in INI home dir.")


def test_an_exploiter_with_a_newline_forges_lines_of_the_registry(machine):
    install(machine, exploiter="ABC\nZOR_HomeDirectory = /srv/other")

    printed_lines(machine.run("t"), "Install dir = /srv/other:")


def test_without_proc_modes_of_what_cannot_be_read_stay(machine):
    with open(machine.binary, "rb") as program:
        if b"__asan_init" in program.read():
            pytest.skip("the leak checker of the sanitized program needs /proc")
    install(machine, user=USER)
    home = "/home/ann/corvan/zor"
    machine.plant(home + "/_uninst", "", 0o100)
    machine.change_mode(home + "/install", 0o700)

    outcome = install(machine, user=USER, options=("--tmpfs", "/proc"))

    printed_lines(outcome, f"Unable to change permissions to '{home}/_uninst' file/directory")
    assert machine.mode(home + "/_uninst") == 0o100
    assert machine.mode(home + "/install") == 0o750


def test_programs_run_through_the_shell_follow_other_users_links(shared_machine):
    """The trace path that the toolkit's own program gets is not checked."""
    machine = shared_machine
    machine.link_as(GUEST, "/home/guest/traces", "/etc")

    outcome = install(machine, "-c", "/home/guest/traces")

    assert outcome.commands == [
        f"{HOME}/bin/trawlcfg [-s] [common_trace_path] [/home/guest/traces]"
    ]


def test_an_error_of_the_command_line_empties_the_log_before_it(machine):
    machine.plant("/var/log", "of an earlier run\n")

    assert machine.run("i", "ABC", "-o", "/var/log", "--wrong").status == 1

    assert machine.read("/var/log") == ""


# Descriptors.


def test_commands_inherit_the_standard_descriptors_only(machine):
    with_control(machine, b"ls /proc/self/fd >/var/scanners/open\n")

    script = 'exec "$0" i ABC -o /var/log -s /media/toolkit.spb 7</etc/passwd'
    assert machine.run_in_shell(script).status == 0

    assert machine.read("/var/scanners/open") == "0\n1\n2\n3\n"  # 3 is the directory itself


def test_a_daemon_of_a_scanner_does_not_keep_the_lock(machine):
    with_control(machine, b"exec >/dev/null 2>&1 </dev/null; setsid sleep 60 &\n")

    outcome = machine.run_in_shell(
        'flock -F /var/lock "$0" i ABC -o /var/log -s /media/toolkit.spb;'
        "flock -n /var/lock echo free"
    )

    assert outcome.stdout == "free\n"


def test_standard_output_that_is_closed_does_not_become_another_file(machine):
    outcome = machine.run_in_shell('"$0" i ABC -s /media/toolkit.spb >&-')

    assert outcome.status == 0
    assert machine.read(REGISTRY).startswith("ZOR_Version = 9.2.30.0000\n")
