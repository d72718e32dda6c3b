"""The status report, printed by a lone `t`."""

import pytest

from harness.checks import printed, printed_lines, same_tree
from harness.machine import ANN, STRANGER

COMMON_SETTING = "/etc/kel/corvan/common/cfg/log.properties"


def test_a_machine_without_any_installation(machine):
    printed(
        machine.run("t"),
        """\
ZOR installer version: 22/12/02zor_9.2.30.0000
Default install type: global
Corvan common dir = /usr/kel/corvan/common

Status of shared (global) installation:
INI file = /etc/zor/zor.ini
Not installed

Status of installation for current user:
INI file = /root/.zor/zor.ini
Not installed
""",
    )


def test_the_report_changes_nothing(machine):
    before = machine.tree()

    machine.run("t")

    same_tree(machine.tree(), before)


def test_a_shared_and_a_per_user_installation(machine):
    machine.register(exploiters="ABC:XYZ:")
    machine.register(
        home="/home/ann/corvan/zor",
        version="2.3.0.0012",
        exploiters="OWN:",
        path="/home/ann/.zor/zor.ini",
    )

    printed(
        machine.run("t", user=ANN),
        """\
ZOR installer version: 22/12/02zor_9.2.30.0000
Default install type: local
Corvan common dir = /usr/kel/corvan/common

Status of shared (global) installation:
INI file = /etc/zor/zor.ini
Install dir = /opt/corvan/zor
Install version = 9.2.30.0000
Exploiter list = ABC:XYZ:

Status of installation for current user:
INI file = /home/ann/.zor/zor.ini
Install dir = /home/ann/corvan/zor
Install version = 2.3.0.0012
Exploiter list = OWN:
""",
    )


def test_root_has_an_installation_of_its_own_too(machine):
    machine.register(home="/root/corvan/zor", path="/root/.zor/zor.ini")

    printed_lines(
        machine.run("t"),
        "Status of shared (global) installation:",
        "INI file = /etc/zor/zor.ini",
        "Not installed",
        "",
        "Status of installation for current user:",
        "INI file = /root/.zor/zor.ini",
        "Install dir = /root/corvan/zor",
        "Install version = 9.2.30.0000",
        "Exploiter list = ABC:",
    )


def test_a_user_without_a_home_directory_sees_the_shared_registry_twice(machine):
    machine.register()

    printed(
        machine.run("t", user=STRANGER),
        """\
ZOR installer version: 22/12/02zor_9.2.30.0000
Default install type: local
Corvan common dir = /usr/kel/corvan/common

Status of shared (global) installation:
INI file = /etc/zor/zor.ini
Install dir = /opt/corvan/zor
Install version = 9.2.30.0000
Exploiter list = ABC:

Status of installation for current user:
*** Error: cannot retrieve home directory for current user.
INI file = /etc/zor/zor.ini
Install dir = /opt/corvan/zor
Install version = 9.2.30.0000
Exploiter list = ABC:
""",
    )


def test_a_home_directory_of_slash_gives_no_doubled_slash(machine):
    machine.write_users(root_home="/")

    printed_lines(machine.run("t"), "INI file = /.zor/zor.ini")


@pytest.mark.parametrize(
    "registry",
    [
        "ZOR_Version = 9.2.30.0000\nZOR_Exploiters = ABC:\n",
        "ZOR_Version = 9.2.30.0000\nZOR_HomeDirectory = /opt/corvan/zor\n",
        "ZOR_Exploiters = ABC:\nZOR_HomeDirectory = /opt/corvan/zor\n",
        "ZOR_Version = 9.x\nZOR_Exploiters = ABC:\nZOR_HomeDirectory = /opt/corvan/zor\n",
        "",
    ],
    ids=["no home", "no exploiters", "no version", "bad version", "empty"],
)
def test_a_registry_that_does_not_read_cleanly_counts_as_not_installed(machine, registry):
    machine.plant("/etc/zor/zor.ini", registry)

    printed_lines(machine.run("t"), "INI file = /etc/zor/zor.ini", "Not installed")


def test_a_registry_that_cannot_be_read_counts_as_not_installed(machine):
    machine.register(path="/home/ann/.zor/zor.ini")
    machine.change_mode("/home/ann/.zor/zor.ini", 0)

    printed_lines(machine.run("t", user=ANN), "INI file = /home/ann/.zor/zor.ini", "Not installed")


def test_the_home_directory_is_not_verified(machine):
    machine.register(home="/no/such/home")

    printed_lines(machine.run("t"), "Install dir = /no/such/home")


def test_an_empty_exploiter_list_prints_nothing_after_its_name(machine):
    machine.plant("/etc/zor/zor.ini", "ZOR_Version=1\nZOR_Exploiters=\nZOR_HomeDirectory=/x\n")

    printed_lines(machine.run("t"), "Install version = 1.0.0.0000", "Exploiter list = ")


@pytest.mark.parametrize("exploiters", [":", "A::B:", "ABC", "A B:"])
def test_the_exploiter_list_is_printed_as_stored(machine, exploiters):
    machine.register(exploiters=exploiters)

    printed_lines(machine.run("t"), f"Exploiter list = {exploiters}")


@pytest.mark.parametrize(
    "stored, shown",
    [
        ("9.2.30.0", "9.2.30.0000"),
        ("", "0.0.0.0000"),
        ("2", "2.0.0.0000"),
        ("2.3.", "2.3.0.0000"),
        ("2.3.0.12.5", "2.3.0.0012.5"),
        ("2.3.0.12.0", "2.3.0.0012"),
        ("1.2.3.12345", "1.2.3.12345"),
        ("01.02.03.04.05", "1.2.3.0004.5"),
        ("1.2.3.4.3000000000", "1.2.3.0004"),
    ],
)
def test_the_version_is_shown_with_a_padded_level_and_the_fifth_number_above_0(
    machine, stored, shown
):
    machine.register(version=stored)

    printed_lines(machine.run("t"), f"Install version = {shown}")


@pytest.mark.parametrize(
    "setting",
    [
        "corvan_common_dir=/srv/common\n",
        "corvan_common_dir = \t/srv/common \r\n",
        "  corvan_common_dir=/srv/common",
        "# comment\n\nother=1\ncorvan_common_dir=/srv/common\n",
        "corvan_common_dir=/srv/common\ncorvan_common_dir=/srv/second\n",
    ],
)
def test_the_common_directory_comes_from_its_setting_file(machine, setting):
    machine.plant(COMMON_SETTING, setting)

    printed_lines(machine.run("t"), "Corvan common dir = /srv/common")


@pytest.mark.parametrize(
    "setting", ["", "corvan_common_dir\n", "#corvan_common_dir=/srv\n", "Corvan_Common_Dir=/srv\n"]
)
def test_a_setting_file_without_the_key_gives_the_default_common_directory(machine, setting):
    machine.plant(COMMON_SETTING, setting)

    printed_lines(machine.run("t"), "Corvan common dir = /usr/kel/corvan/common")


def test_a_common_directory_with_an_equals_sign_is_kept_completely(machine):
    machine.plant(COMMON_SETTING, "corvan_common_dir=/srv/a=b\n")

    printed_lines(machine.run("t"), "Corvan common dir = /srv/a=b")


def test_an_empty_common_directory_is_shown_empty(machine):
    machine.plant(COMMON_SETTING, "corvan_common_dir=\n")

    printed_lines(machine.run("t"), "Corvan common dir = ")
