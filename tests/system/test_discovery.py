"""Where a run looks for an installation, and how it reads the registry that it finds."""

import pytest

from harness.checks import not_printed, printed, printed_lines, same_text, same_tree
from harness.installations import FOUND, HOMES, SETTINGS
from harness.machine import ANN, SPB, STRANGER

NOT_REGISTERED = """\
ZOR not installed for exploiter XYZ, nothing to do
Uninstallation successful, removing temporary files
Done.
"""

WELL_FORMED = """\
ZOR_Version = 9.2.30.0000
ZOR_BuildDate = 22/12/02
ZOR_HomeDirectory = /opt/corvan/zor
ZOR_Exploiters = ABC:
ZOR_ConfigRootDirectory = /opt/corvan/zor
"""


def without(key):
    return "".join(line for line in WELL_FORMED.splitlines(True) if not line.startswith(key))


def look(machine, registry):
    """Runs a removal that changes nothing, on a machine with the text `registry`."""
    machine.plant_scanner_control()
    machine.plant("/etc/zor/zor.ini", registry)
    return machine.run("r", "XYZ")


def test_root_works_on_the_shared_installation(machine):
    printed_lines(
        machine.run("r", "XYZ"),
        "Install type: global",
        "Register exploiter: yes",
        "Default dest: /opt/corvan/zor",
        "INI location: /etc/zor/zor.ini",
        "Looking for INI file: /etc/zor/zor.ini",
    )


def test_a_user_works_on_the_installation_in_the_home_directory(machine):
    printed(
        machine.run("r", "XYZ", user=ANN),
        """\
ZOR version: 22/12/02zor_9.2.30.0000
Install type: local
Register exploiter: yes
Default dest: /home/ann/corvan/zor
INI location: /home/ann/.zor/zor.ini
Looking for INI file: /home/ann/.zor/zor.ini
INI file not found or outdated (code=1)
Log file is: /home/ann/corvan/zor/ZOR_files
currentZorHome = '/home/ann/corvan/zor' currentCfgHome = '/home/ann/corvan/zor'
*** Error: INI file not found: nothing to remove.
Done.
""",
        status=1,
    )


def test_the_home_directory_comes_from_the_password_entry_and_not_from_the_environment(machine):
    printed_lines(
        machine.run("r", "XYZ", user=ANN, environment={"HOME": "/tmp"}),
        "Default dest: /home/ann/corvan/zor",
        "INI location: /home/ann/.zor/zor.ini",
    )


def test_a_user_without_a_home_directory_gets_the_shared_places_and_one_error_line(machine):
    printed(
        machine.run("r", "XYZ", user=STRANGER),
        """\
ZOR version: 22/12/02zor_9.2.30.0000
Install type: local
Register exploiter: yes
*** Error: cannot retrieve home directory for current user.
Default dest: /opt/corvan/zor
INI location: /etc/zor/zor.ini
Looking for INI file: /etc/zor/zor.ini
INI file not found or outdated (code=1)
Log file is: /opt/corvan/zor/ZOR_files
currentZorHome = '/opt/corvan/zor' currentCfgHome = '/opt/corvan/zor'
*** Error: INI file not found: nothing to remove.
Done.
""",
        status=1,
    )


def test_a_user_without_a_home_directory_has_no_error_in_a_shared_run(machine):
    outcome = machine.run("r", "XYZ", "-eeo", "-g", user=STRANGER)

    not_printed(outcome, "cannot retrieve home directory")
    printed_lines(outcome, "Register exploiter: yes", "Default dest: /opt/corvan/zor")


def test_a_missing_home_directory_is_reported_with_a_given_target_too(machine):
    printed_lines(
        machine.run("r", "XYZ", "-d", "/tmp/zor", user=STRANGER),
        "Register exploiter: yes",
        "*** Error: cannot retrieve home directory for current user.",
        "Default dest: /opt/corvan/zor",
    )


def test_a_home_directory_of_slash_gives_no_doubled_slash(machine):
    machine.write_users(root_home="/")

    printed_lines(
        machine.run("r", "XYZ", "-eeo", "-l"),
        "Default dest: /corvan/zor",
        "INI location: /.zor/zor.ini",
        "Looking for INI file: /.zor/zor.ini",
    )


def test_an_empty_home_directory_counts_as_none(machine):
    machine.write_users(root_home="")

    printed_lines(
        machine.run("r", "XYZ", "-eeo", "-l"),
        "*** Error: cannot retrieve home directory for current user.",
        "Default dest: /opt/corvan/zor",
        "INI location: /etc/zor/zor.ini",
    )


def test_an_intact_installation_is_found_and_verified(machine):
    printed(
        look(machine, WELL_FORMED),
        FOUND + NOT_REGISTERED,
    )


def test_discovery_changes_nothing(machine):
    machine.plant_scanner_control()
    machine.register()
    before = machine.tree()

    machine.run("r", "XYZ")

    same_tree(machine.tree(), before)


def test_the_registered_home_wins_over_the_given_directory(machine):
    machine.plant_scanner_control("/opt/elsewhere")
    machine.register(home="/opt/elsewhere")

    printed_lines(
        machine.run("r", "XYZ", "-d", "/opt/given"),
        "Log file is: /opt/elsewhere/ZOR_files",
        "currentZorHome = '/opt/elsewhere' currentCfgHome = '/opt/elsewhere'",
    )


def test_a_user_does_not_see_the_shared_registry(machine):
    machine.plant_scanner_control()
    machine.register()

    printed_lines(
        machine.run("r", "XYZ", user=ANN),
        "Looking for INI file: /home/ann/.zor/zor.ini",
        "INI file not found or outdated (code=1)",
    )


def test_a_registry_that_cannot_be_read_has_code_1(machine):
    machine.plant("/home/ann/.zor/zor.ini", WELL_FORMED, mode=0)

    outcome = machine.run("r", "XYZ", user=ANN)

    assert outcome.status == 1
    printed_lines(
        outcome,
        "INI file not found or outdated (code=1)",
        "Log file is: /home/ann/corvan/zor/ZOR_files",
    )


@pytest.mark.parametrize(
    "registry",
    [
        without("ZOR_Version"),
        without("ZOR_Exploiters"),
        without("ZOR_HomeDirectory"),
        "",
        "no entry at all\n",
        WELL_FORMED.replace("ZOR_Version", "zor_version"),
        WELL_FORMED.replace("ZOR_HomeDirectory", "ZOR_HOMEDIRECTORY"),
        WELL_FORMED.replace("ZOR_Exploiters =", "ZOR_Exploiters :"),
    ],
    ids=[
        "no version",
        "no exploiters",
        "no home",
        "empty",
        "no line with =",
        "small key",
        "large key",
        "no =",
    ],
)
def test_a_registry_without_a_required_key_has_code_2(machine, registry):
    outcome = look(machine, registry)

    assert outcome.status == 1
    printed_lines(
        outcome,
        "Looking for INI file: /etc/zor/zor.ini",
        "INI file not found or outdated (code=2)",
        "Log file is: /opt/corvan/zor/ZOR_files",
        "currentZorHome = '/opt/corvan/zor' currentCfgHome = '/opt/corvan/zor'",
        "*** Error: INI file not found: nothing to remove.",
        "Done.",
    )


@pytest.mark.parametrize(
    "version", ["2.x", "x", "2..3", "-1", "+1", "2.3.0.12 beta", "1,2", "1.2.3.4.5.6", ".1"]
)
def test_a_registry_with_a_bad_version_has_code_3(machine, version):
    outcome = look(machine, WELL_FORMED.replace("9.2.30.0000", version))

    assert outcome.status == 1
    printed_lines(
        outcome, "INI file not found or outdated (code=3)", "Log file is: /opt/corvan/zor/ZOR_files"
    )


def test_a_bad_version_counts_before_a_missing_key(machine):
    outcome = look(machine, "ZOR_Version = 2.x\n")

    printed_lines(outcome, "INI file not found or outdated (code=3)")


@pytest.mark.parametrize("version", ["", "9", "2.3.", "2.3", "  2.3.0.12\t", "1.2.3.4.5", "007.08"])
def test_every_version_of_up_to_five_numbers_is_accepted(machine, version):
    printed_lines(
        look(machine, WELL_FORMED.replace("9.2.30.0000", version)),
        "INI file found, verifying...",
        "ZOR directory verified ok",
    )


@pytest.mark.parametrize(
    "registry",
    [
        without("ZOR_BuildDate"),
        without("ZOR_ConfigRootDirectory"),
        WELL_FORMED.rstrip("\n"),
        WELL_FORMED.replace(" = ", "="),
        WELL_FORMED.replace(" = ", "\t=\t  "),
        WELL_FORMED.replace("\n", "\r\n"),
        WELL_FORMED.replace("ZOR_", "  ZOR_"),
        "# a comment\n\n[section]\n" + WELL_FORMED,
        "Other = key\n" + WELL_FORMED,
        "".join(reversed(WELL_FORMED.splitlines(True))),
    ],
    ids=[
        "no build date",
        "no configuration root",
        "no last newline",
        "no blanks",
        "other blanks",
        "carriage returns",
        "indented",
        "comments",
        "another key",
        "another order",
    ],
)
def test_a_registry_of_another_layout_is_accepted(machine, registry):
    printed_lines(
        look(machine, registry), "INI file found, verifying...", "ZOR directory verified ok"
    )


def test_of_a_key_that_occurs_twice_the_later_line_counts(machine):
    outcome = look(machine, "ZOR_HomeDirectory = /nowhere\n" + WELL_FORMED)

    printed_lines(outcome, "Log file is: /opt/corvan/zor/ZOR_files")


def test_a_value_keeps_its_further_equals_signs(machine):
    machine.plant_scanner_control("/opt/a=b")
    machine.register(home="/opt/a=b")

    printed_lines(
        machine.run("r", "XYZ"), "ZOR directory verified ok", "Log file is: /opt/a=b/ZOR_files"
    )


def test_a_registered_home_with_a_final_slash_is_used_unchanged(machine):
    machine.plant_scanner_control("/opt/x")
    machine.register(home="/opt/x/")

    printed_lines(
        machine.run("r", "XYZ"),
        "ZOR directory verified ok",
        "Log file is: /opt/x//ZOR_files",
        "currentZorHome = '/opt/x/' currentCfgHome = '/opt/x/'",
    )


def test_a_missing_home_directory_is_no_installation(machine):
    machine.register()

    printed(
        machine.run("r", "ABC"),
        SETTINGS
        + "INI file found, verifying...\n"
        + "*** Error: cannot create file in INI home dir.\n"
        + HOMES
        + """\
*** Error: INI file not found: nothing to remove.
Done.
""",
        status=1,
    )


def test_a_home_directory_that_cannot_be_written_is_no_installation(machine):
    machine.plant_scanner_control("/home/ann/corvan/zor")
    machine.register(home="/home/ann/corvan/zor", path="/home/ann/.zor/zor.ini")
    machine.change_mode("/home/ann/corvan/zor", 0o555)

    outcome = machine.run("r", "ABC", user=ANN)

    assert outcome.status == 1
    printed_lines(
        outcome,
        "INI file found, verifying...",
        "*** Error: cannot create file in INI home dir.",
        "Log file is: /home/ann/corvan/zor/ZOR_files",
        "currentZorHome = '/home/ann/corvan/zor' currentCfgHome = '/home/ann/corvan/zor'",
        "*** Error: INI file not found: nothing to remove.",
    )


def test_a_missing_home_directory_leads_to_a_fresh_installation(machine):
    machine.register(home="/opt/gone", exploiters="OLD:")

    outcome = machine.run("i", "ABC", "-s", SPB)

    assert outcome.status == 0
    printed_lines(
        outcome,
        "*** Error: cannot create file in INI home dir.",
        "Log file is: /opt/corvan/zor/ZOR_files",
    )
    printed_lines(
        outcome, "Performing fresh install on /opt/corvan/zor (config=/opt/corvan/zor/config)"
    )
    same_text(machine.read("/etc/zor/zor.ini"), WELL_FORMED)


def test_a_missing_scanner_control_is_reported(machine):
    machine.make_directory("/opt/corvan/zor")
    machine.register()

    outcome = machine.run("r", "ABC")

    assert outcome.status == 1
    printed_lines(
        outcome,
        "INI file found, verifying...",
        "*** Error: cannot find /opt/corvan/zor/bin/trawlcfg in INI home dir.",
        "Log file is: /opt/corvan/zor/ZOR_files",
        "currentZorHome = '/opt/corvan/zor' currentCfgHome = '/opt/corvan/zor'",
        "*** Error: INI file not found: nothing to remove.",
        "Done.",
    )


def test_an_empty_scanner_control_is_reported(machine):
    machine.plant("/opt/corvan/zor/bin/trawlcfg", "")
    machine.register()

    outcome = machine.run("r", "ABC")

    assert outcome.status == 1
    printed_lines(
        outcome,
        "INI file found, verifying...",
        "*** Error: found /opt/corvan/zor/bin/trawlcfg with invalid size.",
        "Log file is: /opt/corvan/zor/ZOR_files",
        "currentZorHome = '/opt/corvan/zor' currentCfgHome = '/opt/corvan/zor'",
        "*** Error: INI file not found: nothing to remove.",
        "Done.",
    )


def test_the_scanner_control_is_joined_to_a_home_with_a_final_slash(machine):
    machine.make_directory("/opt/x")
    machine.register(home="/opt/x/")

    printed_lines(
        machine.run("r", "ABC"), "*** Error: cannot find /opt/x/bin/trawlcfg in INI home dir."
    )


def test_the_probe_file_is_deleted(machine):
    look(machine, WELL_FORMED)

    assert not machine.exists("/opt/corvan/zor/$_ZOR_$")


def test_a_probe_file_of_an_interrupted_run_is_deleted(machine):
    machine.plant("/opt/corvan/zor/$_ZOR_$", "left behind")

    look(machine, WELL_FORMED)

    assert not machine.exists("/opt/corvan/zor/$_ZOR_$")


def test_a_directory_in_place_of_the_probe_file_is_no_installation(machine):
    machine.make_directory("/opt/corvan/zor/$_ZOR_$")

    printed_lines(look(machine, WELL_FORMED), "*** Error: cannot create file in INI home dir.")


@pytest.mark.parametrize(
    "recorded",
    [
        "ZOR_InstallType=local\n",
        "ZOR_InstallType =\t local \n",
        "# note\nZOR_InstallType=local",
        "ZOR_InstallType=local\nZOR_InstallType=global\n",
    ],
)
def test_a_per_user_installation_refuses_a_shared_one(machine, recorded):
    machine.plant("/opt/x/install/zor_install.properties", recorded)
    before = machine.tree()

    outcome = machine.run("i", "ABC", "-s", SPB, "-d", "/opt/x/")

    printed(
        outcome,
        """\
SPB file: /media/toolkit.spb
Target directory: /opt/x/
ZOR version: 22/12/02zor_9.2.30.0000
Install type: global
Register exploiter: yes
Default dest: /opt/corvan/zor
INI location: /etc/zor/zor.ini
Looking for INI file: /etc/zor/zor.ini
INI file not found or outdated (code=1)
Log file is: /opt/x/ZOR_files
currentZorHome = '/opt/x' currentCfgHome = '/opt/x'
*** Error: incompatible install type
ZOR already installed as local in /opt/x
Done.
""",
        status=1,
    )
    same_tree(machine.tree(), before)


@pytest.mark.parametrize(
    "recorded",
    [
        "ZOR_InstallType=global\n",
        "ZOR_InstallType=LOCAL\n",
        "ZOR_InstallType=\n",
        "",
        "#ZOR_InstallType=local\n",
        "ZOR_InstallType\n",
        "zor_installtype=local\n",
    ],
)
def test_a_shared_installation_refuses_a_per_user_one(machine, recorded):
    machine.plant("/home/ann/zor/install/zor_install.properties", recorded)
    before = machine.tree()

    outcome = machine.run("i", "ABC", "-s", SPB, "-d", "/home/ann/zor", user=ANN)

    assert outcome.status == 1
    printed_lines(
        outcome,
        "currentZorHome = '/home/ann/zor' currentCfgHome = '/home/ann/zor'",
        "*** Error: incompatible install type",
        "ZOR already installed as global in /home/ann/zor",
        "Done.",
    )
    same_tree(machine.tree(), before)


@pytest.mark.parametrize(
    "recorded, options",
    [("ZOR_InstallType=local\n", ("-eeo", "-l")), ("ZOR_InstallType=global\n", ()), ("", ())],
)
def test_an_installation_of_the_same_type_is_accepted(machine, recorded, options):
    machine.plant("/opt/x/install/zor_install.properties", recorded)

    outcome = machine.run("i", "ABC", "-s", SPB, "-d", "/opt/x", *options)

    assert outcome.status == 0
    not_printed(outcome, "incompatible install type")


def test_an_install_type_file_that_cannot_be_read_allows_every_type(machine):
    machine.plant("/home/ann/zor/install/zor_install.properties", "ZOR_InstallType=global\n", 0)

    outcome = machine.run("i", "ABC", "-s", SPB, "-d", "/home/ann/zor", user=ANN)

    printed_lines(
        outcome,
        "Loading file /home/ann/zor/install/zor_install.properties "
        "error: 13 (Permission denied)",
    )
    not_printed(outcome, "incompatible install type")


def test_the_install_type_is_checked_in_the_given_directory_and_not_in_the_registered_one(machine):
    machine.plant_scanner_control()
    machine.register()
    machine.plant("/opt/x/install/zor_install.properties", "ZOR_InstallType=local\n")

    outcome = machine.run("i", "ABC", "-s", SPB, "-d", "/opt/x")

    assert outcome.status == 1
    printed_lines(
        outcome,
        "ZOR directory verified ok",
        "Log file is: /opt/corvan/zor/ZOR_files",
        "currentZorHome = '/opt/corvan/zor' currentCfgHome = '/opt/corvan/zor'",
        "*** Error: incompatible install type",
        "ZOR already installed as local in /opt/x",
        "Done.",
    )


def rewritten(machine, registry):
    """The registry after one more exploiter was added to the newer one in `registry`."""
    machine.plant_scanner_control()
    machine.plant("/etc/zor/zor.ini", registry)
    assert machine.run("i", "NEW", "-s", SPB).status == 0
    return machine.read("/etc/zor/zor.ini")


def test_a_rewritten_registry_has_five_lines_with_a_padded_version(machine):
    registry = rewritten(
        machine,
        "Other=1\nZOR_HomeDirectory=/opt/corvan/zor\n"
        "ZOR_Exploiters=ABC:\nZOR_Version=22.3.0.12\n"
        "ZOR_BuildDate=23/01/01\n# comment\n"
        "ZOR_ConfigRootDirectory=/opt/config\n",
    )

    same_text(
        registry,
        """\
ZOR_Version = 22.3.0.0012
ZOR_BuildDate = 23/01/01
ZOR_HomeDirectory = /opt/corvan/zor
ZOR_Exploiters = ABC:NEW:
ZOR_ConfigRootDirectory = /opt/config
""",
    )


def test_a_rewritten_registry_has_lost_the_fifth_number(machine):
    registry = rewritten(machine, WELL_FORMED.replace("9.2.30.0000", "9.2.30.0000.7"))

    assert registry.startswith("ZOR_Version = 9.2.30.0000\n")


def test_a_level_of_five_digits_is_written_completely(machine):
    registry = rewritten(machine, WELL_FORMED.replace("9.2.30.0000", "9.2.30.12345"))

    assert registry.startswith("ZOR_Version = 9.2.30.12345\n")


@pytest.mark.parametrize(
    "line", ["", "ZOR_ConfigRootDirectory =\n", "ZOR_ConfigRootDirectory = \t \n"]
)
def test_an_empty_configuration_root_becomes_the_home_directory(machine, line):
    registry = rewritten(machine, without("ZOR_Config").replace("9.2", "22.2") + line)

    assert registry.endswith("\nZOR_ConfigRootDirectory = /opt/corvan/zor\n")


def test_an_exploiter_list_of_one_blank_keeps_it_when_an_exploiter_is_added(machine):
    registry = rewritten(machine, WELL_FORMED.replace("9.2", "22.2").replace("ABC:", ""))

    assert "\nZOR_Exploiters =  NEW:\n" in registry


def test_an_empty_exploiter_list_takes_the_new_exploiter_alone(machine):
    registry = rewritten(machine, WELL_FORMED.replace("9.2", "22.2").replace(" = ABC:", "="))

    assert "\nZOR_Exploiters = NEW:\n" in registry


def test_an_exploiter_list_with_an_empty_piece_is_kept(machine):
    registry = rewritten(machine, WELL_FORMED.replace("9.2", "22.2").replace("ABC:", "A::B:"))

    assert "\nZOR_Exploiters = A::B:NEW:\n" in registry


def test_an_exploiter_after_an_empty_piece_of_the_list_is_found(machine):
    machine.plant_scanner_control()
    machine.register(version="22.0.0.0000", exploiters="ABC::XYZ:")
    before = machine.tree("/etc/zor")

    assert machine.run("i", "XYZ", "-s", SPB).status == 0

    same_tree(machine.tree("/etc/zor"), before)


def test_an_exploiter_whose_identifier_ends_another_one_is_not_found_in_it(machine):
    machine.plant_scanner_control()
    machine.register(version="22.0.0.0000", exploiters="XABC:")

    assert machine.run("i", "ABC", "-s", SPB).status == 0

    assert "\nZOR_Exploiters = XABC:ABC:\n" in machine.read("/etc/zor/zor.ini")
