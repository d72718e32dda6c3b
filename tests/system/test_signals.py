"""INT, QUIT, TERM and HUP: an installation is undone, everything else finishes, and the process
then dies of the signal.

The scanner programs of the package send the signals, so each arrives at a known step.
"""

import signal

import pytest

from harness import toolkit
from harness.checks import same_lines, same_tree
from harness.machine import ANN, BINARY, ROOT, SPB
from harness.rollback import (
    COMMON_SETTING,
    FILE_INDEX,
    INSTALL_TYPE_FILE,
    MAIN_PROPERTY_FILE,
    PROPERTIES_DIRECTORY,
    XSS_FILES,
    rolled_back,
)

HOME = "/opt/corvan/zor"
REGISTRY = "/etc/zor/zor.ini"
SIGNALS = ("INT", "QUIT", "TERM", "HUP")

# Lines of a text, a signal and who gets it: the installer, or the command itself.
TO_SEND = "/var/scanners/signals"

SENDER = b"""#!/bin/sh
send()
{
    case $2 in
        command) kill -s "$1" $$ ;;
        installer)
            for process in /proc/[0-9]*; do
                [ "$(cat "$process/comm" 2>/dev/null)" != wzorinst ] ||
                    kill -s "$1" "${process#/proc/}"
            done
            ;;
    esac
}
if [ -e /var/scanners/signals ]; then
    while read -r text name whom; do
        case "$*" in *"$text"*) send "$name" "$whom" ;; esac
    done </var/scanners/signals
fi
"""

PROGRAM = SENDER + toolkit.SCANNER_PROGRAM

# Runs a command and prints how it ended: the exit status, or the signal as a negative number.
WAITER = """
import resource, subprocess, sys
resource.setrlimit(resource.RLIMIT_CORE, (0, 0))
print("ended with", subprocess.run(sys.argv[1:]).returncode)
"""


@pytest.fixture
def sending(machine):
    """A machine whose scanner programs send signals."""
    machine.pack({"bin/trawlcfg": PROGRAM, "bin/trawlfs": PROGRAM})
    return machine


def run(machine, *arguments, user=ROOT, ignored=""):
    """Runs wzorinst; returns the lines that it printed, and how it ended."""
    command = [BINARY, *arguments]
    if ignored:
        command = ["/bin/sh", "-c", f"trap '' {ignored}; exec \"$@\"", "sh", *command]
    outcome = machine.execute(
        ["/usr/bin/python3", "-I", "-c", WAITER, *command], user, 0o022, None, (), False
    )
    *lines, last = outcome.stdout.splitlines()
    assert last.startswith("ended with "), outcome
    return lines, int(last.removeprefix("ended with "))


def send(machine, *lines):
    machine.plant(TO_SEND, "".join(line + "\n" for line in lines))


def install(machine, **how):
    """Installs for OLD; the next installation is an upgrade."""
    lines, ended = run(machine, "i", "OLD", "-s", SPB, **how)
    assert ended == 0, lines


def arguments_of_commands(machine):
    """The arguments of the calls of the scanner programs, from the first to the last."""
    return [line.partition(" ")[2] for line in machine.logged_commands()]


def died_of(name):
    return -getattr(signal, "SIG" + name)


@pytest.mark.parametrize("name", SIGNALS)
def test_a_signal_undoes_a_fresh_installation(sending, name):
    before = sending.tree()
    send(sending, f"common_trace_path {name} installer")

    lines, ended = run(sending, "i", "ABC", "-s", SPB)

    assert ended == died_of(name)
    assert "Installation failed, rolling back" in lines
    assert "Installation successful, committing changes" not in lines
    assert not sending.exists(REGISTRY)
    rolled_back(sending, before, FILE_INDEX, INSTALL_TYPE_FILE, COMMON_SETTING)


@pytest.mark.parametrize("name", SIGNALS)
def test_a_signal_stops_an_upgrade_before_it_replaces_anything(sending, name):
    install(sending)
    before = sending.tree()
    send(sending, f"-disable {name} installer")

    lines, ended = run(sending, "i", "ABC", "-s", SPB)

    assert ended == died_of(name)
    assert "Installation failed, rolling back" in lines
    assert "Starting file extraction..." not in lines
    same_tree(sending.tree(), before)


@pytest.mark.parametrize("name", SIGNALS)
def test_a_signal_undoes_an_upgrade_to_its_last_step(sending, name):
    install(sending)
    sending.register(exploiters="OLD:", version="9.1.0.0005")
    sending.plant(HOME + "/bin/trawlhw", "older", 0o700)
    before = sending.tree()
    send(sending, f"-enable {name} installer")

    lines, ended = run(sending, "i", "ABC", "-s", SPB)

    assert ended == died_of(name)
    assert "Installation failed, rolling back" in lines
    assert sending.read(HOME + "/bin/trawlhw") == "older"
    assert sending.read(REGISTRY).startswith("ZOR_Version = 9.1.0.0005\n")
    rolled_back(sending, before, FILE_INDEX, PROPERTIES_DIRECTORY, MAIN_PROPERTY_FILE, XSS_FILES)


@pytest.mark.parametrize("name", SIGNALS)
def test_the_scanners_are_enabled_again_after_a_signal(sending, name):
    install(sending)
    commands = len(sending.logged_commands())
    send(sending, f"-timeout {name} installer")

    _, ended = run(sending, "i", "ABC", "-s", SPB)

    assert ended == died_of(name)
    calls = arguments_of_commands(sending)[commands:]
    assert calls[:3] == [
        "[-shutdown]",
        "[-disable] [all]",
        "[-shutdown] [all] [-timeout] [60] [-force]",
    ]
    assert calls[-1] == "[-enable] [all]"


@pytest.mark.parametrize("name", SIGNALS)
def test_norollback_leaves_an_interrupted_installation_as_it_is(sending, name):
    send(sending, f"common_trace_path {name} installer")

    lines, ended = run(sending, "i", "ABC", "-s", SPB, "-norollback")

    assert ended == died_of(name)
    assert "Installation failed" in lines
    assert "Installation failed, rolling back" not in lines
    assert sending.read(HOME + "/config/xss/schema.xss") == "<schema/>\n"


@pytest.mark.parametrize("name", SIGNALS)
def test_a_removal_finishes_before_it_dies_of_a_signal(sending, name):
    install(sending)
    _, ended = run(sending, "r", "OLD")
    assert ended == 0
    removed = sending.tree()
    install(sending)
    send(sending, f"-disable {name} installer")

    lines, ended = run(sending, "r", "OLD")

    assert ended == died_of(name)
    assert lines[-2:] == ["Uninstallation successful, removing temporary files", "Done."]
    same_tree(sending.tree(), removed)


@pytest.mark.parametrize("name", SIGNALS)
def test_a_private_installation_finishes_before_it_dies_of_a_signal(sending, name):
    send(sending, f"common_trace_path {name} installer")

    lines, ended = run(sending, "i", "ABC", "-s", SPB, "-p", "-d", "/opt/private")

    assert ended == died_of(name)
    assert lines[-2:] == ["PrivMode Action finished with RC: 0", "Done."]
    same_lines(
        sending.index("/opt/private").splitlines()[-1:],
        ["/opt/private/install/zor_install.properties"],
    )


@pytest.mark.parametrize("name", SIGNALS)
def test_a_private_removal_finishes_before_it_dies_of_a_signal(sending, name):
    _, ended = run(sending, "i", "ABC", "-s", SPB, "-p", "-d", "/opt/private")
    assert ended == 0
    send(sending, f"-disable {name} installer")

    lines, ended = run(sending, "r", "ABC", "-p", "-d", "/opt/private")

    assert ended == died_of(name)
    assert lines[-2:] == ["Performing private remove", "Done."]
    assert not sending.exists("/opt/private")


@pytest.mark.parametrize("name", SIGNALS)
def test_a_signal_that_the_caller_ignores_stays_ignored(sending, name):
    send(sending, f"common_trace_path {name} installer")

    lines, ended = run(sending, "i", "ABC", "-s", SPB, ignored=name)

    assert ended == 0
    assert lines[-2:] == ["Installation successful, committing changes", "Done."]


@pytest.mark.parametrize("name", SIGNALS)
def test_commands_inherit_the_callers_ignored_signals_only(sending, name):
    """A handler of the installer's own must not reach its commands, an ignored signal must."""
    status = b"#!/bin/sh\ngrep SigIgn /proc/self/status >>/var/scanners/ignored\n"
    sending.pack({"bin/trawlcfg": status})
    number = getattr(signal, "SIG" + name)

    _, ended = run(sending, "i", "ABC", "-s", SPB)
    _, ended_ignoring = run(sending, "r", "ABC", ignored=name)

    assert (ended, ended_ignoring) == (0, 0)
    masks = [int(line.split()[1], 16) for line in sending.log_lines("/var/scanners/ignored")]
    assert [bool(mask >> (number - 1) & 1) for mask in masks] == [False, True, True, True]


@pytest.mark.parametrize("name", ["INT", "QUIT"])
def test_a_command_killed_by_the_keyboard_counts_as_the_signal(sending, name):
    before = sending.tree()
    send(sending, f"common_trace_path {name} command")

    lines, ended = run(sending, "i", "ABC", "-s", SPB)

    assert ended == died_of(name)
    assert "Installation failed, rolling back" in lines
    rolled_back(sending, before, FILE_INDEX, INSTALL_TYPE_FILE, COMMON_SETTING)


@pytest.mark.parametrize("name", ["INT", "QUIT"])
def test_a_stop_command_killed_by_the_keyboard_stops_the_upgrade(sending, name):
    """Its status alone would be ignored: a failed stop does not fail an upgrade."""
    install(sending)
    before = sending.tree()
    send(sending, f"-disable {name} command")

    lines, ended = run(sending, "i", "ABC", "-s", SPB)

    assert ended == died_of(name)
    assert "Starting file extraction..." not in lines
    same_tree(sending.tree(), before)


@pytest.mark.parametrize("name", ["TERM", "HUP"])
def test_a_command_killed_by_another_signal_is_a_failed_command(sending, name):
    install(sending)
    send(sending, f"-disable {name} command")

    lines, ended = run(sending, "i", "ABC", "-s", SPB)

    assert ended == 0
    assert "Installation successful, committing changes" in lines


def test_the_first_of_several_signals_counts(sending):
    before = sending.tree()
    send(
        sending,
        "common_trace_path TERM installer",
        "common_trace_path HUP installer",
        "common_trace_path INT installer",
    )

    _, ended = run(sending, "i", "ABC", "-s", SPB)

    assert ended == died_of("TERM")
    rolled_back(sending, before, FILE_INDEX, INSTALL_TYPE_FILE, COMMON_SETTING)


def test_signals_during_the_rollback_do_not_stop_it(sending):
    """The restart of the scanners comes after the stop, before the rollback."""
    install(sending)
    before = sending.tree()
    send(sending, "-disable HUP installer", "-enable INT installer", "-enable TERM installer")

    lines, ended = run(sending, "i", "ABC", "-s", SPB)

    assert ended == died_of("HUP")
    assert "Installation failed, rolling back" in lines
    same_tree(sending.tree(), before)


@pytest.mark.parametrize("name", SIGNALS)
def test_a_signal_undoes_a_per_user_installation(sending, name):
    before = sending.tree("/home/ann")
    send(sending, f"common_trace_path {name} installer")

    lines, ended = run(sending, "i", "ABC", "-s", SPB, "-c", "/home/ann/traces", user=ANN)

    assert ended == died_of(name)
    assert "Installation failed, rolling back" in lines
    home = "/home/ann/corvan/zor"
    left = set(sending.tree("/home/ann")) - set(before)
    assert not sending.exists("/home/ann/.zor")
    assert left == {
        "/home/ann/corvan",
        home,
        home + "/ZOR_files",
        home + "/install",
        home + "/install/zor_install.properties",
    }
