"""The scanners' control programs: what is run in which order, and the effect of their failures."""

import pytest

from harness.checks import not_printed, printed_lines, same_lines
from harness.machine import ANN, SPB

HOME = "/opt/corvan/zor"

STOP_COMMANDS = [
    "/opt/corvan/zor/bin/trawlfs [-shutdown]",
    "/opt/corvan/zor/bin/trawlcfg [-disable] [all]",
    "/opt/corvan/zor/bin/trawlcfg [-shutdown] [all] [-timeout] [60] [-force]",
    "/opt/corvan/zor/bin/trawlcfg [-shutdown] [all] [-timeout] [120]",
]

START_COMMAND = "/opt/corvan/zor/bin/trawlcfg [-enable] [all]"


def install(machine, *options, **how):
    """Installs, or upgrades, for exploiter ABC, which must succeed."""
    outcome = machine.run("i", "ABC", "-s", SPB, *options, **how)
    assert outcome.status == 0, outcome.stdout + outcome.stderr
    return outcome


@pytest.mark.parametrize("failing", ["trawlfs", "-disable", "-force", "-timeout 120", "trawl"])
@pytest.mark.parametrize("options", [(), ("-eeo", "-z")], ids=["", "-z"])
def test_a_failing_stop_command_does_not_keep_the_later_ones_from_running(
    machine, failing, options
):
    install(machine)
    machine.let_commands_fail((failing, 5))

    same_lines(install(machine, *options).commands, STOP_COMMANDS + [START_COMMAND])


def test_a_missing_file_system_scanner_gives_the_shells_status(machine):
    install(machine)
    machine.remove(HOME + "/bin/trawlfs")

    outcome = install(machine)

    printed_lines(
        outcome,
        "Exec '/opt/corvan/zor/bin/trawlfs -shutdown >/dev/null 2>&1' returned 32512",
        "Exec '/opt/corvan/zor/bin/trawlcfg -disable all >/dev/null 2>&1' returned 0",
    )
    same_lines(outcome.commands, STOP_COMMANDS[1:] + [START_COMMAND])


def test_the_old_programs_stop_the_scanners_and_the_new_one_starts_them(machine):
    script = b'#!/bin/sh\necho new "$@" >>/var/scanners/commands\n'
    install(machine)
    machine.pack({"bin/trawlcfg": script, "bin/trawlfs": script})

    same_lines(install(machine).commands, STOP_COMMANDS + ["new -enable all"])


def test_the_scanners_are_stopped_before_the_first_file_is_touched(machine):
    install(machine)
    machine.plant(
        HOME + "/bin/trawlcfg",
        "#!/bin/sh\ntest -e /opt/corvan/zor/properties/scan."
        'properties && echo there "$1" >>/var/scanners/commands\n',
        0o755,
    )

    same_lines(
        install(machine).commands[1:4], ["there -disable", "there -shutdown", "there -shutdown"]
    )


def test_the_scanners_are_started_when_the_registry_is_written(machine):
    install(machine)
    machine.register(version="9.0.0.0000")
    machine.pack(
        {"bin/trawlcfg": b"#!/bin/sh\nhead -n 1 /etc/zor/zor.ini >>/var/scanners/commands\n"}
    )

    same_lines(install(machine).commands[4:], ["ZOR_Version = 9.2.30.0000"])


def test_a_removal_starts_nothing(machine):
    install(machine)

    same_lines(machine.run("r", "ABC").commands, STOP_COMMANDS)


def test_a_registration_only_stops_and_starts_nothing(machine):
    install(machine)
    machine.register(version="10.0.0.0000")

    same_lines(install(machine).commands, [])


def test_an_exploiter_that_leaves_others_behind_stops_nothing(machine):
    install(machine)
    machine.register(exploiters="ABC:XYZ:")

    same_lines(machine.run("r", "ABC").commands, [])


def test_the_programs_of_a_per_user_installation_are_its_own(machine):
    install(machine)
    install(machine, user=ANN)

    outcome = install(machine, user=ANN)

    same_lines(
        outcome.commands,
        [
            line.replace("/opt/corvan/zor", "/home/ann/corvan/zor")
            for line in STOP_COMMANDS + [START_COMMAND]
        ],
    )


def test_a_restart_that_succeeds_is_not_reported(machine):
    install(machine)

    not_printed(install(machine), "could not restart")


@pytest.mark.parametrize("options", [(), ("-eeo", "-z")], ids=["", "-z"])
def test_a_failing_restart_leaves_the_upgrade_committed(machine, options):
    install(machine)
    machine.let_commands_fail(("-enable", 1))

    printed_lines(
        install(machine, *options),
        "*** Error: could not restart ZOR.",
        "Installation successful, committing changes",
    )


@pytest.mark.parametrize("options", [(), ("-eeo", "-z")], ids=["", "-z"])
def test_a_failing_trace_path_command_is_fatal_even_when_errors_are_tolerated(machine, options):
    machine.let_commands_fail(("common_trace_path", 1))

    outcome = machine.run("i", "ABC", "-s", SPB, *options)

    assert outcome.status == 1
    printed_lines(outcome, "Installation failed, rolling back")


def test_debug_mode_shows_the_output_of_each_command_in_its_place(machine):
    install(machine)

    outcome = machine.run("r", "ABC", "-v")

    printed_lines(
        outcome,
        "scanner control output: -shutdown",
        "Exec '/opt/corvan/zor/bin/trawlfs -shutdown' returned 0",
        "scanner control output: -disable all",
        "Exec '/opt/corvan/zor/bin/trawlcfg -disable all' returned 0",
        "scanner control output: -shutdown all -timeout 60 -force",
        "Exec '/opt/corvan/zor/bin/trawlcfg -shutdown all -timeout 60 -force' returned 0",
        "scanner control output: -shutdown all -timeout 120",
        "Exec '/opt/corvan/zor/bin/trawlcfg -shutdown all -timeout 120' returned 0",
    )
    assert (
        outcome.stderr
        == """\
scanner control error: -shutdown
scanner control error: -disable all
scanner control error: -shutdown all -timeout 60 -force
scanner control error: -shutdown all -timeout 120
"""
    )


def test_without_debug_mode_nothing_of_a_commands_output_is_seen(machine):
    install(machine)

    outcome = machine.run("r", "ABC")

    not_printed(outcome, "scanner control output")
    assert outcome.stderr == ""
