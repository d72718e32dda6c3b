"""Placeholders in the installed scripts and property files, and what saving does to a file."""

import pytest

from harness.checks import same_text
from harness.machine import ANN, SPB

HOME = "/opt/corvan/zor"


def installed(machine, name, content, *options):
    """Installs a package whose file `name` holds `content`; returns what it holds then."""
    machine.pack({name: content})
    outcome = machine.run("i", "ABC", "-s", SPB, *options)
    assert outcome.status == 0, outcome.stdout
    return machine.read(f"{HOME}/{name}")


SCRIPTS = pytest.mark.parametrize("script", ["install/trawlcfg.sh", "install/rmdirs.sh"])


@SCRIPTS
def test_a_script_gets_every_occurrence_filled_in(machine, script):
    text = installed(
        machine,
        script,
        b"$(ZOR_DestinationDir)$(ZOR_DestinationDir)x\n"
        b"a $(CorvanCommonDir) b $(CorvanCommonDir)\n",
    )

    same_text(
        text,
        "/opt/corvan/zor/opt/corvan/zorx\na /usr/kel/corvan/common b /usr/kel/corvan/common\n",
    )


@SCRIPTS
def test_the_configuration_root_of_a_script_is_the_home_directory(machine, script):
    same_text(
        installed(machine, script, b"$(ZOR_ConfigRootDirectory)/config\n"),
        "/opt/corvan/zor/config\n",
    )


@SCRIPTS
@pytest.mark.parametrize(
    "text",
    [
        "$(FileSeparator)",
        "$(fscanner_mode)",
        "$(Other)",
        "$(zor_destinationdir)",
        "$ZOR_DestinationDir",
        "${ZOR_DestinationDir}",
        "$(ZOR_DestinationDir",
        "$( ZOR_DestinationDir )",
    ],
)
def test_a_script_keeps_what_is_no_placeholder_of_scripts(machine, script, text):
    same_text(installed(machine, script, text.encode() + b"\n"), text + "\n")


@SCRIPTS
def test_a_script_without_a_last_newline_gets_one(machine, script):
    same_text(installed(machine, script, b"#!/bin/sh\nexit"), "#!/bin/sh\nexit\n")


@SCRIPTS
def test_a_script_keeps_carriage_returns_empty_lines_and_unusual_bytes(machine, script):
    same_text(installed(machine, script, b"a\r\n\n\n\x00b\xff \n"), "a\r\n\n\n\x00b\udcff \n")


@SCRIPTS
def test_a_filled_in_script_keeps_its_mode(machine, script):
    installed(machine, script, b"$(ZOR_DestinationDir)\n")

    assert machine.mode(f"{HOME}/{script}") == 0o750


def test_other_files_of_the_install_directory_are_not_filled_in(machine):
    same_text(
        installed(machine, "install/other.sh", b"$(ZOR_DestinationDir)\n"),
        "$(ZOR_DestinationDir)\n",
    )


def test_property_files_of_the_properties_directory_are_not_filled_in(machine):
    same_text(
        installed(machine, "properties/Zor.properties", b"$(ZOR_DestinationDir)\n"),
        "$(ZOR_DestinationDir)\n",
    )


def test_the_main_property_file_knows_four_placeholders(machine):
    text = installed(
        machine,
        "config/Zor.properties",
        b"$(ZOR_DestinationDir)|$(ZOR_ConfigRootDirectory)|$(FileSeparator)|"
        b"$(fscanner_mode)|$(CorvanCommonDir)|$(ZOR_DestinationDir)\n",
        "-f",
        "provider_cache3",
    )

    same_text(
        text,
        "/opt/corvan/zor|/opt/corvan/zor|/|provider_cache3|$(CorvanCommonDir)|/opt/corvan/zor\n",
    )


def test_the_trace_property_file_knows_two_placeholders(machine):
    text = installed(
        machine,
        "config/ZorTrace.properties",
        b"$(ZOR_DestinationDir)|$(ZOR_ConfigRootDirectory)|$(FileSeparator)|"
        b"$(fscanner_mode)|$(CorvanCommonDir)\n",
    )

    same_text(
        text,
        "/opt/corvan/zor|/opt/corvan/zor|$(FileSeparator)|$(fscanner_mode)|$(CorvanCommonDir)\n",
    )


@pytest.mark.parametrize("name", ["config/Zor.properties", "config/ZorTrace.properties"])
def test_a_property_file_keeps_comments_blanks_order_and_unknown_lines(machine, name):
    text = installed(machine, name, b"# c\r\n\n  b = 2 \na=1\n\x00no equals sign\n\xff")

    same_text(text, "# c\r\n\n  b = 2 \na=1\n\x00no equals sign\n\udcff\n")


def test_a_placeholder_that_forms_when_another_is_filled_in_is_filled_in_later(machine):
    # "$(ZOR_ConfigRootDirectory)" is whole only where "$(FileSeparator)" still follows it.
    text = installed(
        machine,
        "config/Zor.properties",
        b"$(FileSeparator)$(FileSeparator)$(ZOR_ConfigRootDirectory)\n",
    )

    same_text(text, "///opt/corvan/zor\n")


def test_a_per_user_installation_fills_in_the_home_directory_of_the_user(machine):
    assert machine.run("i", "ABC", "-s", SPB, user=ANN).status == 0

    same_text(
        machine.read("/home/ann/corvan/zor/install/rmdirs.sh"),
        """\
#!/bin/sh
rmdir "/home/ann/corvan/zor/cache_data" "/usr/kel/corvan/common/ZOR"
""",
    )


def test_a_dangling_link_counts_as_a_missing_script(machine):
    machine.pack(without=("install/trawlcfg.sh",))
    machine.link(HOME + "/install/trawlcfg.sh", "/nowhere")

    outcome = machine.run("i", "ABC", "-s", SPB)

    assert outcome.status == 0
    assert "\nScript does not exist /opt/corvan/zor/install/trawlcfg.sh\n" in outcome.stdout
    assert not machine.exists("/nowhere")


def test_a_script_that_cannot_be_read_is_ignored(machine):
    machine.pack(without=("install/trawlcfg.sh",))
    machine.plant("/home/ann/corvan/zor/install/trawlcfg.sh", "$(ZOR_DestinationDir)\n", 0)

    outcome = machine.run("i", "ABC", "-s", SPB, user=ANN)

    assert outcome.status == 0
    assert (
        """
Updating file with variables /home/ann/corvan/zor/install/trawlcfg.sh
Updating: /home/ann/corvan/zor/install/trawlcfg.sh
Loading file /home/ann/corvan/zor/install/trawlcfg.sh error: 13 (Permission denied)
Updating file with variables /home/ann/corvan/zor/install/rmdirs.sh
"""
        in outcome.stdout
    )


def test_a_script_that_cannot_be_written_is_ignored(machine):
    machine.pack(without=("install/trawlcfg.sh",))
    machine.plant("/home/ann/corvan/zor/install/trawlcfg.sh", "$(ZOR_DestinationDir)\n", 0o400)

    outcome = machine.run("i", "ABC", "-s", SPB, user=ANN)

    assert outcome.status == 0
    assert (
        """
Updating: /home/ann/corvan/zor/install/trawlcfg.sh
Saving file /home/ann/corvan/zor/install/trawlcfg.sh error: 13 (Permission denied)
Could not save script file /home/ann/corvan/zor/install/trawlcfg.sh
Updating file with variables /home/ann/corvan/zor/install/rmdirs.sh
"""
        in outcome.stdout
    )
    assert machine.read("/home/ann/corvan/zor/install/trawlcfg.sh") == "$(ZOR_DestinationDir)\n"


def test_a_directory_in_place_of_a_script_is_ignored(machine):
    machine.pack({"install/trawlcfg.sh/": b""}, without=("install/trawlcfg.sh",))

    outcome = machine.run("i", "ABC", "-s", SPB)

    assert outcome.status == 0
    assert (
        """
Updating: /opt/corvan/zor/install/trawlcfg.sh
Saving file /opt/corvan/zor/install/trawlcfg.sh error: 21 (Is a directory)
Could not save script file /opt/corvan/zor/install/trawlcfg.sh
Updating file with variables /opt/corvan/zor/install/rmdirs.sh
"""
        in outcome.stdout
    )
