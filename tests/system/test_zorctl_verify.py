"""zorctl verify: what of an installation is not as its package made it."""

import fcntl
import os

import pytest

from harness.checks import printed
from harness.machine import ANN, SPB
from harness.zorctl import report, zorctl

HOME = "/opt/corvan/zor"


@pytest.fixture(autouse=True)
def lockable(machine):
    """The lock can be taken."""
    machine.make_directory("/run")


@pytest.fixture
def installed(machine):
    assert machine.run("i", "SHOP", "-s", SPB).status == 0
    return machine


def check(machine, expected, *arguments, status=1, spb=(SPB,), **options):
    """Compares the report with `expected`, whose first line is empty."""
    printed(zorctl(machine, "verify", *spb, *arguments, **options), expected.lstrip("\n"), status)


@pytest.mark.parametrize("spb", [(SPB,), ()], ids=["package", "index"])
def test_a_fresh_installation_is_as_it_should_be(installed, spb):
    before = installed.tree("/etc", "/opt", "/usr")

    check(installed, "", spb=spb, status=0)

    assert installed.tree("/etc", "/opt", "/usr") == before


@pytest.mark.parametrize("spb", [(SPB,), ()], ids=["package", "index"])
@pytest.mark.parametrize("options", [(), ("-r",), ("-d", "/opt/my zor")])
def test_an_upgraded_installation_is_as_it_should_be(machine, options, spb):
    for _ in range(2):
        assert machine.run("i", "SHOP", "-s", SPB, *options).status == 0

    check(machine, "", spb=spb, status=0)


@pytest.mark.parametrize("runs", [1, 2])
def test_an_installation_of_a_user_is_as_it_should_be(machine, runs):
    for _ in range(runs):
        assert machine.run("i", "SHOP", "-s", SPB, user=ANN).status == 0

    check(machine, "", user=ANN, status=0)


def test_what_differs_from_the_package(installed):
    installed.plant(HOME + "/bin/trawlhw", b"#!/bin/sh\nexit 1\n", 0o755)
    installed.plant(
        HOME + "/bin/trawlfs",
        installed.read_bytes(HOME + "/bin/trawlfs").replace(b"exit 0", b"exit 1"),
        0o755,
    )
    installed.remove(HOME + "/config/ZorHWConfig.xml")
    installed.change_mode(HOME + "/bin/trawlcfg", 0o4755)
    installed.plant(HOME + "/bin/mine", b"mine")

    check(
        installed,
        """
foreign     /opt/corvan/zor/bin/mine
.M.......    /opt/corvan/zor/bin/trawlcfg
..5......    /opt/corvan/zor/bin/trawlfs
S.5......    /opt/corvan/zor/bin/trawlhw
missing   c /opt/corvan/zor/config/ZorHWConfig.xml
""",
    )


def test_what_differs_from_the_index(installed):
    installed.plant(HOME + "/bin/trawlhw", b"#!/bin/sh\nexit 1\n", 0o755)
    installed.remove(HOME + "/config/ZorHWConfig.xml")
    installed.change_mode(HOME + "/bin/trawlcfg", 0o4755)

    check(
        installed,
        """
.M.......    /opt/corvan/zor/bin/trawlcfg
missing   c /opt/corvan/zor/config/ZorHWConfig.xml
""",
        spb=(),
    )


def test_changed_settings_are_named_by_their_keys(installed):
    path = HOME + "/config/Zor.properties"
    installed.plant(
        path,
        installed.read(path)
        .replace("trace_level=3", "trace_level=5")
        .replace("trace_file=zor.log\n", "")
        + "my.setting=1\n#note=1\n",
    )

    expected = """
..5......  c /opt/corvan/zor/config/Zor.properties
             customised: my.setting
             customised: trace_file
             customised: trace_level
"""
    check(installed, expected, status=0)
    check(installed, expected, "--strict", status=1)
    check(installed, "", "--no-customised", "--strict", status=0)


def test_a_changed_script_is_a_difference(installed):
    path = HOME + "/install/trawlcfg.sh"
    installed.plant(path, installed.read(path) + "rm -rf /\n", 0o750)

    check(installed, "..5......    /opt/corvan/zor/install/trawlcfg.sh\n")


def test_foreign_files_are_not_a_difference_unless_asked_for(installed):
    installed.plant(HOME + "/bin/deep/mine", b"mine")
    installed.plant(HOME + "/mine", b"mine")

    expected = """
foreign     /opt/corvan/zor/bin/deep/mine
foreign     /opt/corvan/zor/mine
"""
    check(installed, expected, status=0)
    check(installed, expected, "--strict", status=1)
    check(installed, "", "--strict", "--no-foreign", status=0)


def test_a_file_that_became_a_link_is_a_difference(installed):
    os.rename(installed.at(HOME + "/bin/trawlhw"), installed.at("/opt/trawlhw"))
    installed.link(HOME + "/bin/trawlhw", "/opt/trawlhw")

    check(installed, ".M.......    /opt/corvan/zor/bin/trawlhw\n")


def test_a_fifo_does_not_block(installed):
    installed.remove(HOME + "/bin/trawlhw")
    os.mkfifo(installed.at(HOME + "/bin/trawlhw"), 0o755)
    try:
        outcome = zorctl(installed, "verify", SPB)
    finally:
        os.unlink(installed.at(HOME + "/bin/trawlhw"))

    printed(outcome, ".M.......    /opt/corvan/zor/bin/trawlhw\n", status=1)


def test_the_json_says_the_same(installed):
    installed.plant(HOME + "/bin/trawlhw", b"#!/bin/sh\nexit 1\n", 0o700)
    path = HOME + "/config/Zor.properties"
    installed.plant(path, installed.read(path) + "my.setting=1\n")
    installed.plant(HOME + "/bin/mi\tne", b"mine")

    found = report(installed, "verify", SPB, status=1)

    assert (found["type"], found["home"], found["compared_with"]) == ("global", HOME, "package")
    assert found["differences"] == [
        {
            "path": HOME + "/bin/mi\tne",
            "kind": "foreign",
            "columns": None,
            "configuration": False,
            "keys": [],
        },
        {
            "path": HOME + "/bin/trawlhw",
            "kind": "changed",
            "columns": "SM5......",
            "configuration": False,
            "keys": [],
        },
        {
            "path": path,
            "kind": "customised",
            "columns": "..5......",
            "configuration": True,
            "keys": ["my.setting"],
        },
    ]


def test_control_characters_are_escaped(installed):
    installed.plant(HOME + "/bin/a\n\x1b[31m", b"mine")

    check(installed, "foreign     /opt/corvan/zor/bin/a\\n\\x1b[31m\n", status=0)


def test_without_a_lock_there_is_a_warning(installed):
    installed.remove("/run")

    printed(
        zorctl(installed, "verify", SPB),
        "",
        status=0,
        stderr="zorctl: warning: cannot lock /run/wzorinst.lock; "
        "this may change while it is reported\n",
    )


def test_while_another_run_holds_the_lock_there_is_a_warning(installed):
    installed.plant("/run/wzorinst.lock")
    with open(installed.at("/run/wzorinst.lock"), "rb") as lock:
        fcntl.flock(lock, fcntl.LOCK_EX)
        outcome = zorctl(installed, "verify", SPB)

    printed(
        outcome,
        "",
        status=0,
        stderr="zorctl: warning: another run holds /run/wzorinst.lock; "
        "this may change while it is reported\n",
    )


def test_nothing_installed_ends_with_3(machine):
    outcome = zorctl(machine, "verify", SPB)

    printed(outcome, "", status=3, stderr="zorctl: /etc/zor/zor.ini: nothing is installed\n")


@pytest.mark.parametrize("content", [b"no archive", None])
def test_a_package_that_cannot_be_read_ends_with_2(installed, content):
    if content:
        installed.plant("/media/bad", content)

    outcome = zorctl(installed, "verify", "/media/bad")

    printed(outcome, "", status=2, stderr="zorctl: /media/bad: package not found or not valid\n")


def test_without_index_and_package_it_cannot_check(installed):
    installed.remove(HOME + "/ZOR_files")

    outcome = zorctl(installed, "verify")

    printed(
        outcome,
        "",
        status=2,
        stderr="zorctl: /opt/corvan/zor/ZOR_files: missing; "
        "name the package to compare with it\n",
    )


def test_a_damaged_registry_is_a_difference(installed):
    installed.plant("/etc/zor/zor.ini", "")

    printed(
        zorctl(installed, "verify", SPB), "", status=1, stderr="zorctl: /etc/zor/zor.ini: empty\n"
    )


def test_a_damaged_entry_says_nothing_about_its_file(installed):
    package = installed.read_bytes(SPB)
    content = installed.read_bytes(HOME + "/bin/trawlhw")
    at = package.index(content)  # small files are stored
    installed.plant("/media/bad", package[: at - 1])

    outcome = zorctl(installed, "verify", "/media/bad")

    assert outcome.status == 2
