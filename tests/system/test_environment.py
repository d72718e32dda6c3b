"""External commands: SELinux labels, quoting, and the environment they run in."""

import pytest

from harness.checks import not_printed, printed_lines, same_lines
from harness.machine import ANN, SPB
from harness.toolkit import archive


def install(machine, *options, **how):
    """Installs for exploiter ABC; the installation must succeed."""
    outcome = machine.run("i", "ABC", "-s", SPB, *options, **how)
    assert outcome.status == 0, outcome.stdout + outcome.stderr
    return outcome


def test_without_selinux_nothing_is_labelled(machine):
    printed_lines(
        install(machine),
        "Extracting configs to '/opt/corvan/zor/config'",
        "Exec '/usr/sbin/selinuxenabled >/dev/null 2>&1' returned 32512",
        "SELinux not enabled or not supported",
        "Customizing property file: /opt/corvan/zor/config/Zor.properties",
    )


def test_with_selinux_the_binaries_are_labelled(machine):
    machine.add_selinux()

    outcome = install(machine)

    printed_lines(
        outcome,
        "Extracting configs to '/opt/corvan/zor/config'",
        "Exec '/usr/sbin/selinuxenabled >/dev/null 2>&1' returned 0",
        "Exec '/usr/bin/chcon -R -t texrel_shlib_t /opt/corvan/zor/bin "
        ">/dev/null 2>&1' returned 0",
        "Customizing property file: /opt/corvan/zor/config/Zor.properties",
    )
    not_printed(outcome, "SELinux not enabled")
    same_lines(
        outcome.commands,
        [
            "/usr/sbin/selinuxenabled",
            "/usr/bin/chcon [-R] [-t] [texrel_shlib_t] [/opt/corvan/zor/bin]",
            "/opt/corvan/zor/bin/trawlcfg [-s] [common_trace_path] "
            "[/usr/kel/corvan/common/ZOR/logs]",
        ],
    )


def test_with_selinux_switched_off_nothing_is_labelled(machine):
    machine.add_selinux(enabled_status=1)

    outcome = install(machine)

    printed_lines(
        outcome,
        "Exec '/usr/sbin/selinuxenabled >/dev/null 2>&1' returned 256",
        "SELinux not enabled or not supported",
    )
    not_printed(outcome, "chcon")


def test_a_failing_label_is_ignored(machine):
    machine.add_selinux(chcon_status=7)

    outcome = install(machine)

    printed_lines(
        outcome,
        "Exec '/usr/bin/chcon -R -t texrel_shlib_t /opt/corvan/zor/bin "
        ">/dev/null 2>&1' returned 1792",
        "Customizing property file: /opt/corvan/zor/config/Zor.properties",
    )
    not_printed(outcome, "SELinux not enabled")


def test_a_per_user_installation_is_labelled_too(machine):
    machine.add_selinux()

    same_lines(
        install(machine, user=ANN).commands,
        [
            "/usr/sbin/selinuxenabled",
            "/usr/bin/chcon [-R] [-t] [texrel_shlib_t] [/home/ann/corvan/zor/bin]",
        ],
    )


def test_a_failed_extraction_is_labelled_too(machine):
    machine.add_selinux()
    machine.plant(SPB, archive({"bin/empty": b""}).content())

    outcome = machine.run("i", "ABC", "-s", SPB)

    printed_lines(
        outcome,
        "File extraction failed, error = 1 (Cannot open file for reading)",
        "Exec '/usr/sbin/selinuxenabled >/dev/null 2>&1' returned 0",
        "Exec '/usr/bin/chcon -R -t texrel_shlib_t /opt/corvan/zor/bin "
        ">/dev/null 2>&1' returned 0",
        "Installation failed, rolling back",
    )


def test_debug_mode_shows_what_the_labelling_prints(machine):
    machine.add_selinux()

    outcome = install(machine, "-v")

    printed_lines(
        outcome,
        "scanner control output: ",
        "Exec '/usr/sbin/selinuxenabled' returned 0",
        "scanner control output: -R -t texrel_shlib_t /opt/corvan/zor/bin",
        "Exec '/usr/bin/chcon -R -t texrel_shlib_t /opt/corvan/zor/bin' returned 0",
    )


def test_a_program_with_a_blank_in_its_path_is_quoted(machine):
    outcome = install(machine, "-d", "/opt/my zor")

    printed_lines(
        outcome,
        'Exec \'"/opt/my zor/bin/trawlcfg" -s common_trace_path '
        "/usr/kel/corvan/common/ZOR/logs >/dev/null 2>&1' returned 0",
    )
    same_lines(
        outcome.commands,
        ["/opt/my zor/bin/trawlcfg [-s] [common_trace_path] [/usr/kel/corvan/common/ZOR/logs]"],
    )


def test_the_directory_to_label_is_not_quoted(machine):
    machine.add_selinux()

    outcome = install(machine, "-d", "/opt/my zor")

    printed_lines(
        outcome,
        "Exec '/usr/bin/chcon -R -t texrel_shlib_t /opt/my zor/bin >/dev/null 2>&1' returned 0",
    )
    assert outcome.commands[1] == "/usr/bin/chcon [-R] [-t] [texrel_shlib_t] [/opt/my] [zor/bin]"


def test_a_tab_in_a_path_is_not_quoted(machine):
    outcome = install(machine, "-c", "/var/my\ttrace")

    printed_lines(
        outcome,
        "Exec '/opt/corvan/zor/bin/trawlcfg -s common_trace_path "
        "/var/my\ttrace >/dev/null 2>&1' returned 0",
    )
    same_lines(
        outcome.commands,
        ["/opt/corvan/zor/bin/trawlcfg [-s] [common_trace_path] [/var/my] [trace]"],
    )


def test_an_installation_below_a_directory_with_a_blank_is_complete(machine):
    install(machine, "-d", "/opt/my zor")

    assert "\nZOR_HomeDirectory = /opt/my zor\n" in machine.read("/etc/zor/zor.ini")
    assert "\nfscanner.cache_dir=/opt/my zor/cache_data\n" in machine.read(
        "/opt/my zor/config/Zor.properties"
    )
    assert "\n/opt/my zor/bin/trawlcfg\n" in machine.index("/opt/my zor")


def test_an_unset_library_path_becomes_the_directory_of_the_binaries(machine):
    install(machine)

    same_lines(machine.library_paths(), ["/opt/corvan/zor/bin"])


def test_a_library_path_that_was_set_follows_the_directory_of_the_binaries(machine):
    install(machine, environment={"LD_LIBRARY_PATH": "/usr/local/lib:/x"})

    same_lines(machine.library_paths(), ["/opt/corvan/zor/bin:/usr/local/lib:/x"])


def test_an_empty_library_path_leaves_its_colon(machine):
    install(machine, environment={"LD_LIBRARY_PATH": ""})

    same_lines(machine.library_paths(), ["/opt/corvan/zor/bin:"])


def test_debug_mode_logs_the_library_path(machine):
    outcome = install(machine, "-v", environment={"LD_LIBRARY_PATH": "/x"})

    printed_lines(
        outcome,
        "Updating common trace path='/usr/kel/corvan/common' result=0",
        "Setting 'LD_LIBRARY_PATH' to 'LD_LIBRARY_PATH=/opt/corvan/zor/bin:/x'",
    )


def test_without_debug_mode_the_library_path_is_not_logged(machine):
    not_printed(install(machine), "LD_LIBRARY_PATH")


def test_the_labelling_tools_of_a_fresh_installation_see_the_callers_library_path(machine):
    machine.add_selinux()

    install(machine)

    same_lines(machine.library_paths(), ["(unset)", "(unset)", "/opt/corvan/zor/bin"])


def test_the_tools_of_an_upgrade_see_the_toolkits_library_path_once(machine):
    install(machine)
    machine.add_selinux()
    before = len(machine.library_paths())

    install(machine)

    # Probe and label twice, four stop commands between them, and the restart.
    same_lines(machine.library_paths()[before:], ["/opt/corvan/zor/bin"] * 9)


def test_the_tools_of_a_removal_see_the_toolkits_library_path_once(machine):
    install(machine)
    before = len(machine.library_paths())

    machine.run("r", "ABC", environment={"LD_LIBRARY_PATH": "/x"})

    same_lines(machine.library_paths()[before:], ["/opt/corvan/zor/bin:/x"] * 4)


def test_the_library_path_of_a_home_with_a_final_slash_has_one_slash(machine):
    assert machine.run("i", "ABC", "-s", SPB, "-d", "/opt/x//").status == 0

    same_lines(machine.library_paths(), ["/opt/x/bin"])


@pytest.mark.parametrize("status", [1, 2, 127])
def test_the_raw_status_of_a_command_is_logged(machine, status):
    machine.let_commands_fail(("common_trace_path", status))

    outcome = machine.run("i", "ABC", "-s", SPB)

    printed_lines(
        outcome,
        "Exec '/opt/corvan/zor/bin/trawlcfg -s common_trace_path "
        "/usr/kel/corvan/common/ZOR/logs >/dev/null 2>&1' "
        f"returned {status * 256}",
    )


def test_a_scanner_control_that_cannot_be_executed_has_status_126(machine):
    machine.pack({"bin/trawlcfg/": b""}, without=("bin/trawlcfg",))

    outcome = machine.run("i", "ABC", "-s", SPB)

    assert outcome.status == 1
    printed_lines(
        outcome,
        "Exec '/opt/corvan/zor/bin/trawlcfg -s common_trace_path "
        "/usr/kel/corvan/common/ZOR/logs >/dev/null 2>&1' returned 32256",
    )


# What a command finds.


def test_a_command_finds_the_lines_before_it_in_the_log_file(machine):
    machine.pack({"bin/trawlcfg": b"#!/bin/sh\ncp /tmp/log /var/scanners/log\n"})

    outcome = machine.run("i", "ABC", "-s", SPB, "-o", "/tmp/log")

    assert outcome.status == 0
    found, whole = machine.read("/var/scanners/log"), machine.read("/tmp/log")
    assert found.splitlines()[-1] == (
        "Updating common trace path='/usr/kel/corvan/common' result=0"
    )
    assert whole.startswith(found + "Exec '/opt/corvan/zor/bin/trawlcfg -s common_trace_path ")


# SIGPIPE and SIGXFSZ in the kernel's mask of ignored signals.
PIPE_AND_XFSZ = 1 << 12 | 1 << 24


@pytest.mark.parametrize(
    "trap, ignored",
    [("", 0), ("trap '' PIPE XFSZ; ", PIPE_AND_XFSZ)],
    ids=["not ignored", "ignored"],
)
def test_a_command_ignores_the_signals_that_the_caller_ignores(machine, trap, ignored):
    script = b"#!/bin/sh\ngrep SigIgn: /proc/self/status >/var/scanners/mask\n"
    machine.pack({"bin/trawlcfg": script})

    outcome = machine.run_in_shell(trap + 'exec "$0" "$@"', "i", "ABC", "-s", SPB)

    assert outcome.status == 0
    assert int(machine.read("/var/scanners/mask").split()[1], 16) & PIPE_AND_XFSZ == ignored
