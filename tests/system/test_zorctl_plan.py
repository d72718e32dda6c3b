"""zorctl plan: what a run would do, without doing it."""

import pytest

from harness.checks import printed
from harness.machine import SPB
from harness.zorctl import report, zorctl

HOME = "/opt/corvan/zor"
WARNING = """\
zorctl: warning: cannot lock /run/wzorinst.lock; this may change while it is reported
"""


@pytest.fixture
def ready(machine):
    """A machine on which the lock can be taken."""
    machine.make_directory("/run")
    return machine


@pytest.fixture
def installed(ready):
    assert ready.run("i", "SHOP", "-s", SPB).status == 0
    return ready


def plan(machine, *arguments, status=0):
    return report(machine, "plan", *arguments, status=status)


def test_a_fresh_installation_is_reported_and_not_done(ready):
    before = ready.tree("/etc", "/opt", "/usr")

    found = plan(ready, "i", "SHOP", "-s", SPB)

    assert (found["operation"], found["succeeds"], found["home"]) == ("fresh", True, HOME)
    assert found["locked"] is True
    assert HOME + "/bin/trawlcfg" in found["created"]
    assert found["commands"] == [HOME + "/bin/trawlcfg -s common_trace_path"]
    assert ready.tree("/etc", "/opt", "/usr") == before
    assert ready.logged_commands() == []


def test_the_text_says_it_in_short(ready):
    outcome = zorctl(ready, "plan", "i", "SHOP", "-s", SPB)

    assert outcome.stdout.startswith(
        "Operation: fresh (global) in /opt/corvan/zor\nResult: success\nScanners stopped: no\n"
    )
    assert "\nFiles created: 15\n" in outcome.stdout
    assert outcome.status == 0


def test_an_upgrade_names_the_files_of_the_owner_that_go(installed):
    installed.plant(HOME + "/properties/mine", b"mine")
    installed.plant(HOME + "/bin/trawlhw.bak", b"mine")
    installed.plant(HOME + "/bin/mine", b"mine")

    found = plan(installed, "i", "DESK", "-s", SPB)

    assert (found["operation"], found["stops_scanners"]) == ("upgrade", True)
    assert found["deleted_of_owner"] == [HOME + "/bin/trawlhw.bak", HOME + "/properties/mine"]
    assert HOME + "/properties/mine" in found["not_restored"]
    assert HOME + "/config/Zor.properties" in found["not_restored"]


def test_a_removal_names_the_files_of_the_owner_that_go(installed):
    installed.plant(HOME + "/config/mine", b"mine")
    installed.plant(HOME + "/bin/mine", b"mine")

    found = plan(installed, "r", "SHOP")

    assert found["operation"] == "removal"
    assert found["deleted_of_owner"] == [HOME + "/config/mine"]
    assert "/etc/zor" in found["deleted_directories"]
    assert HOME not in found["deleted_directories"]


def test_one_of_two_exploiters_is_only_unregistered(installed):
    assert installed.run("i", "DESK", "-s", SPB).status == 0

    found = plan(installed, "r", "SHOP")

    assert (found["operation"], found["deleted"], found["replaced"]) == (
        "unregistration",
        [],
        ["/etc/zor/zor.ini"],
    )


def test_a_run_that_would_fail_ends_with_1_and_says_why(ready):
    ready.pack({"bin/empty": b""})

    found = plan(ready, "i", "SHOP", "-s", SPB, status=1)

    assert found["failure"] == (
        "the entry for /opt/corvan/zor/bin/empty cannot be opened: it is "
        "empty or of an unknown method"
    )


def test_removing_what_is_not_installed_ends_with_3(ready):
    found = plan(ready, "r", "SHOP", status=3)

    assert (found["operation"], found["succeeds"]) == ("refused", False)


@pytest.mark.parametrize("options, status", [((), 0), (("--unchanged-exit", "42"), 42)])
def test_a_run_that_changes_nothing_can_have_a_status_of_its_own(installed, options, status):
    registry = installed.read("/etc/zor/zor.ini").replace("9.2.30", "9.9.0")
    installed.plant("/etc/zor/zor.ini", registry)

    found = plan(installed, *options, "i", "SHOP", "-s", SPB, status=status)

    assert (found["operation"], found["unchanged"]) == ("registration", True)


def test_the_log_of_the_run_is_not_touched(ready):
    ready.plant("/tmp/log", b"old")

    plan(ready, "i", "SHOP", "-o", "/tmp/log", "-s", SPB)

    assert ready.read("/tmp/log") == "old"


@pytest.mark.parametrize(
    "arguments, reason",
    [
        (("x", "SHOP"), "Invalid command: x"),
        (("i", "SHOP", "-%"), "Invalid option: -%"),
        (("i", "SHOP", "-s"), "Missing argument for option: -s"),
        (("i", "SHOP"), "Error: an SPB file is required to install or upgrade"),
    ],
)
def test_a_command_line_that_the_installer_refuses_ends_with_2(ready, arguments, reason):
    printed(
        zorctl(ready, "plan", *arguments),
        "",
        status=2,
        stderr=f"zorctl: wzorinst would not accept this command line: {reason}\n",
    )


def test_without_a_lock_there_is_a_warning(machine):
    assert zorctl(machine, "plan", "i", "SHOP", "-s", SPB).stderr == WARNING
