"""zorctl status: what is installed, and whether it is intact."""

import json
import os
import re

import pytest

from harness.checks import printed
from harness.machine import ANN, SPB
from harness.zorctl import report, zorctl

HEAD = """\
ZOR installer version: 22/12/02zor_9.2.30.0000
Default install type: global
Corvan common dir = /usr/kel/corvan/common
"""

SHARED = """
Status of shared (global) installation: intact
INI file = /etc/zor/zor.ini
Install dir = /opt/corvan/zor
Install version = 9.2.30.0000
Build date = 22/12/02
Exploiter list = SHOP DESK
Home = intact
Index = complete, 17 files
Recorded type = global
Single-user mode = no
Leftover backups = none
"""

NONE_OF_ROOT = """
Status of installation of user root: absent
INI file = /root/.zor/zor.ini
Not installed
"""

HOME = "/opt/corvan/zor"


@pytest.fixture
def installed(machine):
    """A machine with a shared installation that SHOP and DESK use."""
    for exploiter in ("SHOP", "DESK"):
        assert machine.run("i", exploiter, "-s", SPB).status == 0
    return machine


def shared(machine, status):
    """The shared installation's part of the report, and its problems' codes."""
    one = report(machine, "status", "--type", "global", status=status)["installations"][0]
    return one, [problem["code"] for problem in one["problems"]]


def test_nothing_is_installed(machine):
    before = machine.tree()

    outcome = zorctl(machine, "status")

    printed(
        outcome,
        HEAD
        + """
Status of shared (global) installation: absent
INI file = /etc/zor/zor.ini
Not installed
"""
        + NONE_OF_ROOT,
        status=3,
    )
    assert machine.tree() == before


def test_a_shared_installation_is_intact(installed):
    before = installed.tree()

    outcome = zorctl(installed, "status")

    printed(outcome, HEAD + SHARED + NONE_OF_ROOT, status=0)
    assert installed.tree() == before


def test_the_json_of_an_intact_installation(installed):
    found = report(installed, "status")

    assert found == {
        "schema": 1,
        "command": "status",
        "tool": {"version": "9.2.30.0000", "build_date": "22/12/02"},
        "default_install_type": "global",
        "common_directory": "/usr/kel/corvan/common",
        "installations": [
            {
                "type": "global",
                "user": None,
                "uid": None,
                "health": "intact",
                "problems": [],
                "registry": {
                    "path": "/etc/zor/zor.ini",
                    "state": "complete",
                    "backup_state": "missing",
                },
                "version": "9.2.30.0000",
                "build_date": "22/12/02",
                "home": HOME,
                "configuration_root": HOME,
                "exploiters": ["SHOP", "DESK"],
                "home_state": "intact",
                "index": {"path": HOME + "/ZOR_files", "state": "complete", "files": 17},
                "recorded_type": "global",
                "single_user_mode": False,
                "backups": [],
            },
            {
                "type": "local",
                "user": "root",
                "uid": 0,
                "health": "absent",
                "problems": [],
                "registry": {
                    "path": "/root/.zor/zor.ini",
                    "state": "missing",
                    "backup_state": "missing",
                },
                "version": None,
                "build_date": None,
                "home": None,
                "configuration_root": None,
                "exploiters": None,
                "home_state": None,
                "index": None,
                "recorded_type": None,
                "single_user_mode": None,
                "backups": None,
            },
        ],
    }


def test_the_shell_format_can_be_evaluated(installed):
    registry = installed.read("/etc/zor/zor.ini").replace("SHOP:", "SH'OP; exit 9:A B:")
    installed.plant("/etc/zor/zor.ini", registry)
    zorctl(installed, "status")  # plants the binary

    outcome = installed.execute(
        [
            "/bin/sh",
            "-c",
            'eval "$(/media/zorctl status --format shell)"\n'
            'echo "$ZORCTL_COUNT $ZORCTL_0_HEALTH $ZORCTL_0_VERSION $ZORCTL_0_REGISTRY_STATE"\n'
            'echo "$ZORCTL_0_EXPLOITERS"; echo "[$ZORCTL_1_VERSION]"',
        ],
        user=ANN,
        umask=0o022,
        environment=None,
        options=("--ro-bind", os.path.realpath(os.environ["ZORCTL"]), "/media/zorctl"),
        everywhere=False,
    )

    printed(outcome, "2 intact 9.2.30.0000 complete\nSH'OP; exit 9\nA B\nDESK\n[]\n")


def test_a_user_sees_the_shared_installation_and_its_own(installed):
    assert installed.run("i", "ANNS", "-s", SPB, user=ANN).status == 0

    found = report(installed, "status", user=ANN)

    assert [(one["type"], one["user"], one["health"]) for one in found["installations"]] == [
        ("global", None, "intact"),
        ("local", "ann", "intact"),
    ]
    assert found["default_install_type"] == "local"
    assert found["installations"][1]["exploiters"] == ["ANNS"]


def test_root_sees_the_installations_of_all_users(installed):
    assert installed.run("i", "ANNS", "-s", SPB, user=ANN).status == 0

    found = report(installed, "status", "--all-users")

    assert [
        (one["type"], one["user"], one["uid"], one["health"]) for one in found["installations"]
    ] == [
        ("global", None, None, "intact"),
        ("local", "root", 0, "absent"),
        ("local", "ann", 1000, "intact"),
    ]


@pytest.mark.parametrize("options", [(), ("--json",), ("--format", "shell")])
def test_filters_select_the_same_in_every_format(installed, options):
    assert zorctl(installed, "status", "--exploiter", "DESK", *options).status == 0
    assert zorctl(installed, "status", "--exploiter", "ESK", *options).status == 3
    assert zorctl(installed, "status", "--type", "local", *options).status == 3


def test_a_missing_home_directory_is_damage(installed):
    installed.remove(HOME)

    one, problems = shared(installed, status=1)

    assert (one["health"], one["home_state"], problems) == ("damaged", "missing", ["home-missing"])


@pytest.mark.parametrize(
    "spoil, state, problem",
    [
        (lambda m: m.remove(HOME + "/bin/trawlcfg"), "control-missing", "control-missing"),
        (lambda m: m.plant(HOME + "/bin/trawlcfg", b""), "control-empty", "control-empty"),
    ],
)
def test_a_broken_scanner_control_is_damage(installed, spoil, state, problem):
    spoil(installed)

    one, problems = shared(installed, status=1)

    assert (one["home_state"], problems) == (state, [problem])


def test_an_empty_registry_next_to_a_complete_backup_is_damage(installed):
    installed.plant("/etc/zor/zor.ini.bak", installed.read("/etc/zor/zor.ini"))
    installed.plant("/etc/zor/zor.ini", "")

    one, problems = shared(installed, status=1)

    assert one["registry"] == {
        "path": "/etc/zor/zor.ini",
        "state": "empty",
        "backup_state": "complete",
    }
    assert problems == ["registry-damaged"]
    assert one["problems"][0]["text"] == (
        "/etc/zor/zor.ini is no registry: empty; /etc/zor/zor.ini.bak is complete"
    )


@pytest.mark.parametrize(
    "text, state",
    [
        ("ZOR_Version = 9.x\n", "bad-version"),
        ("ZOR_Version = 9.2\n", "incomplete"),
        (" \n", "empty"),
    ],
)
def test_a_registry_that_does_not_parse_is_damage(installed, text, state):
    installed.plant("/etc/zor/zor.ini", text)

    one, problems = shared(installed, status=1)

    assert (one["registry"]["state"], problems) == (state, ["registry-damaged"])


def test_left_backups_of_installed_files_are_damage_and_others_are_not(installed):
    installed.plant(HOME + "/bin/trawlhw.bak", "old")
    installed.plant(HOME + "/bin/of_the_owner.bak", "mine")

    one, problems = shared(installed, status=1)

    assert (one["backups"], problems) == ([HOME + "/bin/trawlhw.bak"], ["backups-left"])


def test_an_unfinished_index_is_damage(installed):
    installed.plant(HOME + "/ZOR_files", "# File created by ZOR: 22/12/02zor_9.2.30.0000\n")

    one, problems = shared(installed, status=1)

    assert (one["index"]["state"], problems) == ("interrupted", ["index-interrupted"])


def test_single_user_mode_is_reported(machine):
    assert machine.run("i", "SHOP", "-s", SPB, "-r").status == 0

    one, _ = shared(machine, status=0)

    assert one["single_user_mode"] is True


def test_what_may_not_be_read_is_unknown_and_no_failure(installed):
    installed.change_mode(HOME + "/install", 0o000)
    installed.change_mode(HOME + "/config", 0o000)

    outcome = report(installed, "status", "--type", "global", user=ANN)
    one = outcome["installations"][0]

    assert (one["health"], one["recorded_type"], one["single_user_mode"], one["backups"]) == (
        "intact",
        "unknown",
        "unknown",
        "unknown",
    )


def test_a_registry_that_may_not_be_read_is_unknown(installed):
    installed.change_mode("/etc/zor", 0o000)

    found = report(installed, "status", "--type", "global", user=ANN, status=2)

    assert found["installations"][0]["health"] == "unknown"
    assert found["installations"][0]["version"] == "unknown"


def plant_fifo(machine, path):
    machine.remove(path)
    os.mkfifo(machine.at(path))


@pytest.mark.parametrize(
    "path, member, value",
    [
        (
            "/etc/zor/zor.ini",
            "registry",
            {"path": "/etc/zor/zor.ini", "state": "not-regular", "backup_state": "missing"},
        ),
        (
            HOME + "/ZOR_files",
            "index",
            {"path": HOME + "/ZOR_files", "state": "not-regular", "files": "unknown"},
        ),
        (HOME + "/install/zor_install.properties", "recorded_type", "unknown"),
    ],
)
def test_a_fifo_in_place_of_a_file_is_not_waited_for(installed, path, member, value):
    plant_fifo(installed, path)
    try:
        outcome = zorctl(installed, "status", "--type", "global", "--json")
    finally:
        os.unlink(installed.at(path))

    assert json.loads(outcome.stdout)["installations"][0][member] == value


def test_a_registry_without_end_is_not_read(machine):
    machine.make_directory("/home/ann/.zor")
    machine.link("/home/ann/.zor/zor.ini", "/dev/zero")
    machine.make_directory("/etc/zor")
    with open(machine.at("/etc/zor/zor.ini"), "wb") as file:
        file.truncate(1 << 30)

    found = report(machine, "status", "--all-users", status=1)

    assert [(one["user"], one["registry"]["state"]) for one in found["installations"]] == [
        (None, "too-large"),
        ("root", "missing"),
        ("ann", "not-regular"),
    ]


def test_control_characters_are_escaped(machine):
    machine.register(home="/opt/a\x1b[31mb", exploiters="A\tB\xff:")
    text = zorctl(machine, "status", "--type", "global").stdout

    assert "Install dir = /opt/a\\x1b[31mb\n" in text
    assert "Exploiter list = A\\tB\xff\n" in text
    found = report(machine, "status", "--type", "global", status=1)
    assert found["installations"][0]["home"] == "/opt/a\x1b[31mb"


def test_bytes_that_are_not_utf_8_are_escaped_in_json(machine):
    machine.register()
    machine.plant(
        "/etc/zor/zor.ini", machine.read_bytes("/etc/zor/zor.ini").replace(b"ABC:", b"A\xffC:")
    )

    found = report(machine, "status", "--type", "global", status=1)

    assert found["installations"][0]["exploiters"] == ["A\\xffC"]


def test_without_a_terminal_nothing_is_coloured(installed):
    assert "\033" not in zorctl(installed, "status", environment={"TERM": "xterm"}).stdout


@pytest.mark.parametrize(
    "variables, shown",
    [
        ({}, "\033[32mintact\033[0m"),
        ({"NO_COLOR": ""}, "\033[32mintact\033[0m"),
        ({"NO_COLOR": "1"}, "intact"),
        ({"TERM": "dumb"}, "intact"),
    ],
)
def test_on_a_terminal_health_is_coloured_unless_that_is_not_wanted(installed, variables, shown):
    terminal = ("/bin/sh", "-c", 'script -qec "$0 status --type global" /dev/null')

    outcome = zorctl(installed, tool=terminal, environment={"TERM": "xterm", **variables})

    assert f"Status of shared (global) installation: {shown}\r\n" in outcome.stdout
    assert ("\033" in outcome.stdout) == ("\033" in shown)


@pytest.mark.parametrize(
    "arguments",
    [
        (),
        ("nonsense",),
        ("status", "--nonsense"),
        ("status", "--type", "other"),
        ("status", "more"),
    ],
)
def test_a_wrong_command_line_ends_with_2(machine, arguments):
    outcome = zorctl(machine, *arguments)

    assert (outcome.status, outcome.stdout) == (2, "")
    assert re.match(r"usage: zorctl .*\nzorctl( status)?: error: .+\n\Z", outcome.stderr)


@pytest.mark.parametrize("arguments", [("--help",), ("status", "--help"), ("--version",)])
def test_help_and_version_end_with_0(machine, arguments):
    outcome = zorctl(machine, *arguments)

    assert (outcome.status, outcome.stderr) == (0, "")
    assert outcome.stdout != ""


def test_a_report_that_cannot_be_written_is_not_as_asked(installed):
    zorctl(installed, "status")  # plants the binary
    outcome = zorctl(installed, "status", tool=("/bin/sh", "-c", '"$0" "$@" >/dev/full'))

    assert outcome.status == 2
