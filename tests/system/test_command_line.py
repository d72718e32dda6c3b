"""The command line: usage errors, options, and where each message goes."""

import pytest

from harness.checks import not_printed, printed, printed_lines, same_text
from harness.installations import NOT_FOUND
from harness.machine import ANN, SPB

USAGE = """\
Usage: wzorinst i|r|t <exploiterID> [-o <log file>] [-s <spblock_path>] [-d <target_dir>] \
[-f <fs_provider>] [-n] [-r]

  i                 install/upgrade specified software package block
  r                 remove ZOR for specified exploiter
  t                 display install info
  <exploiterID>     name of exploiter that is installing/removing ZOR
  -s <spblock_path> full path of SPB file (required to install or upgrade)
  -o <log file>     redirect output to a file
  -d <target_dir>   directory where ZOR must be installed
  -f <fs_provider>  default provider for file system scanner
  -n                does not add <exploiterID> to the ZOR install registry
  -r                enable single user mode
  -p                private mode
  -c <target_path>  directory for ZOR trace files

"""

# What `r` says on a machine without an installation, once its options are accepted.
NOTHING_TO_REMOVE = (
    NOT_FOUND
    + """\
*** Error: INI file not found: nothing to remove.
Done.
"""
)


def test_no_argument_prints_the_usage(machine):
    printed(machine.run(), USAGE, status=1)


@pytest.mark.parametrize("action", ["i", "r", "x", "tt", "T", ""])
def test_a_lone_argument_other_than_t_prints_the_usage_without_a_message(machine, action):
    printed(machine.run(action), USAGE, status=1)


def test_t_with_an_exploiter_is_an_invalid_command(machine):
    printed(machine.run("t", "ABC"), USAGE, status=1, stderr="Invalid command: t\n")


@pytest.mark.parametrize("action", ["x", "I", "R", "ii", "-i", "ir", "install"])
def test_an_action_other_than_i_and_r_is_an_invalid_command(machine, action):
    printed(machine.run(action, "ABC"), USAGE, status=1, stderr=f"Invalid command: {action}\n")


def test_an_empty_action_is_an_invalid_command(machine):
    printed(machine.run("", "ABC"), USAGE, status=1, stderr="Invalid command: \n")


def test_an_invalid_command_is_found_before_a_colon_in_the_exploiter(machine):
    printed(machine.run("x", "A:B"), USAGE, status=1, stderr="Invalid command: x\n")


@pytest.mark.parametrize("exploiter", ["AB:C", ":", "ABC:", ":ABC"])
def test_a_colon_in_the_exploiter_ends_the_run_without_usage(machine, exploiter):
    printed(
        machine.run("i", exploiter, "-s", "x.spb"),
        "",
        status=1,
        stderr="Exploiter name must not contain ':'\n",
    )


def test_a_colon_in_the_exploiter_is_found_before_the_options_are_read(machine):
    printed(
        machine.run("r", "A:B", "-q"), "", status=1, stderr="Exploiter name must not contain ':'\n"
    )


@pytest.mark.parametrize(
    "option",
    [
        "-l",
        "-g",
        "-z",
        "-q",
        "-S",
        "-i",
        "--",
        "-e",
        "-",
        "",
        "s",
        "ss",
        "-sd",
        "ABC",
        "norollback",
        "-norollbac",
        "-norollbackk",
        "-NOROLLBACK",
        "-EEO",
        "eeo",
        "-eeoo",
    ],
)
def test_an_unknown_option_is_invalid(machine, option):
    printed(machine.run("r", "ABC", option), USAGE, status=1, stderr=f"Invalid option: {option}\n")


def test_an_install_type_before_the_switch_is_invalid(machine):
    printed(machine.run("r", "ABC", "-l", "-eeo"), USAGE, status=1, stderr="Invalid option: -l\n")


def test_an_unknown_option_is_invalid_after_the_switch_too(machine):
    printed(machine.run("r", "ABC", "-eeo", "-q"), USAGE, status=1, stderr="Invalid option: -q\n")


@pytest.mark.parametrize("option", ["-d", "-f", "-s", "-o", "-c"])
def test_an_option_at_the_end_lacks_its_argument(machine, option):
    printed(
        machine.run("r", "ABC", option),
        USAGE,
        status=1,
        stderr=f"Missing argument for option: {option}\n",
    )


def test_the_lines_of_earlier_options_stay_printed_before_a_missing_argument(machine):
    printed(
        machine.run("i", "ABC", "-s", "x.spb", "-d"),
        "SPB file: x.spb\n" + USAGE,
        status=1,
        stderr="Missing argument for option: -d\n",
    )


def test_an_option_takes_whatever_follows_as_its_argument(machine):
    printed(machine.run("r", "ABC", "-s", "-d"), "SPB file: -d\n" + NOTHING_TO_REMOVE, status=1)


def test_options_stop_at_the_first_wrong_one(machine):
    printed(
        machine.run("r", "ABC", "-s", "a", "-q", "-s", "b"),
        "SPB file: a\n" + USAGE,
        status=1,
        stderr="Invalid option: -q\n",
    )


def test_a_wrong_option_leaves_the_machine_as_it_was(machine):
    before = machine.tree()

    machine.run("i", "ABC", "-s", SPB, "-q")

    assert machine.tree() == before


@pytest.mark.parametrize(
    "provider",
    [
        "provider_standard",
        "provider_cache",
        "provider_cache2",
        "provider_cache3",
        "provider_remote_cache",
        "provider_remote_cache2",
    ],
)
def test_each_provider_is_accepted(machine, provider):
    printed(
        machine.run("r", "ABC", "-f", provider),
        f"File scanner mode: {provider}\n" + NOTHING_TO_REMOVE,
        status=1,
    )


@pytest.mark.parametrize(
    "provider",
    [
        "provider_",
        "provider",
        "cache",
        "provider_cache4",
        "PROVIDER_CACHE",
        "provider_cache ",
        "provider_cache|provider_cache2",
        "|",
        "provider_cache||provider_remote_cache",
    ],
)
def test_a_text_that_is_no_provider_is_refused(machine, provider):
    printed(
        machine.run("r", "ABC", "-f", provider),
        f"Invalid provider specified: {provider}\n" + USAGE,
        status=1,
    )


def test_two_neighbouring_providers_with_their_separators_are_accepted(machine):
    printed(
        machine.run("r", "ABC", "-f", "provider_standard||provider_cache"),
        "File scanner mode: provider_standard||provider_cache\n" + NOTHING_TO_REMOVE,
        status=1,
    )


def test_an_empty_provider_is_accepted_between_two_separators(machine):
    printed(
        machine.run("r", "ABC", "-f", ""), "File scanner mode: \n" + NOTHING_TO_REMOVE, status=1
    )


def test_an_invalid_provider_is_reported_in_the_log_file_and_the_usage_on_the_terminal(machine):
    printed(machine.run("r", "ABC", "-o", "/tmp/log", "-f", "none"), USAGE, status=1)
    same_text(machine.read("/tmp/log"), "Invalid provider specified: none\n")


def test_private_mode_without_a_directory_ends_before_the_settings(machine):
    printed(
        machine.run("r", "ABC", "-p"),
        "",
        status=1,
        stderr="For privatePath -d parameter is mandatory\n",
    )


def test_private_mode_without_a_directory_is_found_before_a_missing_package(machine):
    printed(
        machine.run("i", "ABC", "-p", "-eeo", "-l", "-g"),
        "",
        status=1,
        stderr="For privatePath -d parameter is mandatory\n",
    )


def test_an_installation_needs_a_package(machine):
    printed(
        machine.run("i", "ABC"),
        "Error: an SPB file is required to install or upgrade\n" + USAGE,
        status=1,
    )


def test_an_empty_package_path_counts_as_none(machine):
    printed(
        machine.run("i", "ABC", "-s", ""),
        "SPB file: \nError: an SPB file is required to install or upgrade\n" + USAGE,
        status=1,
    )


def test_a_missing_package_is_reported_in_the_log_file_and_the_usage_on_the_terminal(machine):
    printed(machine.run("i", "ABC", "-o", "/tmp/log"), USAGE, status=1)
    same_text(machine.read("/tmp/log"), "Error: an SPB file is required to install or upgrade\n")


def test_a_removal_needs_no_package(machine):
    printed(machine.run("r", "ABC"), NOTHING_TO_REMOVE, status=1)


def test_every_option_with_an_argument_is_printed_in_the_order_of_the_command_line(machine):
    outcome = machine.run(
        "r", "ABC", "-c", "/tmp/trace", "-f", "provider_cache2", "-s", "p.spb", "-d", "/opt/x"
    )

    printed(
        outcome,
        """\
ZOR custom trace path: /tmp/trace
File scanner mode: provider_cache2
SPB file: p.spb
Target directory: /opt/x
ZOR version: 22/12/02zor_9.2.30.0000
Install type: global
Register exploiter: yes
Default dest: /opt/corvan/zor
INI location: /etc/zor/zor.ini
Looking for INI file: /etc/zor/zor.ini
INI file not found or outdated (code=1)
Log file is: /opt/x/ZOR_files
currentZorHome = '/opt/x' currentCfgHome = '/opt/x'
*** Error: INI file not found: nothing to remove.
Done.
""",
        status=1,
    )


@pytest.mark.parametrize(
    "options",
    [
        ("-r",),
        ("-v",),
        ("-norollback",),
        ("-eeo",),
        ("-eeo", "-z"),
        ("-eeo", "-g"),
        ("-eeo", "-r", "-v", "-norollback", "-eeo"),
    ],
)
def test_options_without_an_argument_print_nothing(machine, options):
    printed(machine.run("r", "ABC", *options), NOTHING_TO_REMOVE, status=1)


def test_a_skipped_registration_shows_in_the_settings(machine):
    printed_lines(
        machine.run("r", "ABC", "-n"),
        "Install type: global",
        "Register exploiter: no",
        "Default dest: /opt/corvan/zor",
    )


def test_root_can_choose_the_installation_of_its_own(machine):
    printed_lines(
        machine.run("r", "ABC", "-eeo", "-l"),
        "ZOR version: 22/12/02zor_9.2.30.0000",
        "Install type: local",
        "Register exploiter: yes",
        "Default dest: /root/corvan/zor",
        "INI location: /root/.zor/zor.ini",
        "Looking for INI file: /root/.zor/zor.ini",
    )


def test_a_user_can_choose_the_shared_installation(machine):
    printed(machine.run("r", "ABC", "-eeo", "-g", user=ANN), NOTHING_TO_REMOVE, status=1)


def test_of_two_install_types_the_last_one_wins_with_a_warning(machine):
    printed(
        machine.run("r", "ABC", "-eeo", "-l", "-g"),
        "Warning: install type has been specified multiple times\n" + NOTHING_TO_REMOVE,
        status=1,
    )


def test_of_two_install_types_the_last_one_wins_the_other_way_too(machine):
    printed_lines(
        machine.run("r", "ABC", "-eeo", "-g", "-l"),
        "Warning: install type has been specified multiple times",
        "ZOR version: 22/12/02zor_9.2.30.0000",
        "Install type: local",
    )


def test_the_same_install_type_twice_is_warned_about(machine):
    printed(
        machine.run("r", "ABC", "-eeo", "-g", "-g"),
        "Warning: install type has been specified multiple times\n" + NOTHING_TO_REMOVE,
        status=1,
    )


def test_one_install_type_is_not_warned_about(machine):
    not_printed(machine.run("r", "ABC", "-eeo", "-l"), "Warning")


def test_the_warning_comes_before_the_missing_package(machine):
    printed(
        machine.run("i", "ABC", "-eeo", "-l", "-g"),
        "Warning: install type has been specified multiple times\n"
        "Error: an SPB file is required to install or upgrade\n" + USAGE,
        status=1,
    )


def test_an_installation_with_two_install_types_is_made_in_the_last_one(machine):
    outcome = machine.run("i", "ABC", "-s", SPB, "-eeo", "-l", "-g")

    assert outcome.status == 0
    printed_lines(
        outcome,
        "SPB file: /media/toolkit.spb",
        "Warning: install type has been specified multiple times",
        "ZOR version: 22/12/02zor_9.2.30.0000",
        "Install type: global",
    )
    assert machine.exists("/etc/zor/zor.ini")
    assert not machine.exists("/root/.zor")


def test_the_last_directory_wins(machine):
    printed_lines(
        machine.run("r", "ABC", "-d", "/opt/a", "-d", "/opt/b"),
        "Target directory: /opt/a",
        "Target directory: /opt/b",
    )
    printed_lines(
        machine.run("r", "ABC", "-d", "/opt/a", "-d", "/opt/b"),
        "Log file is: /opt/b/ZOR_files",
        "currentZorHome = '/opt/b' currentCfgHome = '/opt/b'",
    )


def test_one_slash_is_dropped_from_the_end_of_the_directory(machine):
    printed_lines(machine.run("r", "ABC", "-d", "/opt/x/"), "Target directory: /opt/x/")
    printed_lines(
        machine.run("r", "ABC", "-d", "/opt/x/"),
        "Log file is: /opt/x/ZOR_files",
        "currentZorHome = '/opt/x' currentCfgHome = '/opt/x'",
    )


def test_of_two_slashes_at_the_end_of_the_directory_one_stays(machine):
    printed_lines(
        machine.run("r", "ABC", "-d", "/opt/x//"),
        "Log file is: /opt/x//ZOR_files",
        "currentZorHome = '/opt/x/' currentCfgHome = '/opt/x/'",
    )


def test_the_root_directory_as_target_becomes_an_empty_path(machine):
    printed_lines(
        machine.run("r", "ABC", "-d", "/"),
        "Log file is: /ZOR_files",
        "currentZorHome = '' currentCfgHome = ''",
    )


def test_an_empty_directory_counts_as_none(machine):
    printed(machine.run("r", "ABC", "-d", ""), "Target directory: \n" + NOTHING_TO_REMOVE, status=1)


def test_an_empty_directory_is_none_for_private_mode(machine):
    outcome = machine.run("r", "ABC", "-d", "", "-p")

    assert outcome.stderr == "For privatePath -d parameter is mandatory\n"
    assert outcome.status == 1
    same_text(outcome.stdout, "Target directory: \n")


def test_the_log_file_takes_all_lines_from_its_option_on(machine):
    printed(
        machine.run("r", "ABC", "-s", "before", "-o", "/tmp/log", "-c", "after"),
        "SPB file: before\n",
        status=1,
    )
    same_text(machine.read("/tmp/log"), "ZOR custom trace path: after\n" + NOTHING_TO_REMOVE)


def test_the_log_file_is_emptied_first(machine):
    machine.plant("/tmp/log", "old text " * 1000)

    machine.run("r", "ABC", "-o", "/tmp/log")

    same_text(machine.read("/tmp/log"), NOTHING_TO_REMOVE)


def test_of_two_log_files_the_second_takes_over(machine):
    printed(machine.run("r", "ABC", "-o", "/tmp/1", "-s", "x", "-o", "/tmp/2"), "", status=1)
    same_text(machine.read("/tmp/1"), "SPB file: x\n")
    same_text(machine.read("/tmp/2"), NOTHING_TO_REMOVE)


def test_command_line_errors_go_to_standard_error_despite_a_log_file(machine):
    printed(
        machine.run("r", "ABC", "-o", "/tmp/log", "-q"),
        USAGE,
        status=1,
        stderr="Invalid option: -q\n",
    )
    same_text(machine.read("/tmp/log"), "")


def test_a_log_file_that_cannot_be_opened_only_loses_the_output(machine):
    outcome = machine.run("i", "ABC", "-o", "/no/such/directory/log", "-s", SPB)

    printed(outcome, "")
    assert machine.exists("/opt/corvan/zor/bin/trawlcfg")


def test_an_installation_writes_its_whole_progress_to_the_log_file(machine):
    printed(machine.run("i", "ABC", "-s", SPB, "-o", "/tmp/log"), "SPB file: /media/toolkit.spb\n")
    log = machine.read("/tmp/log")
    assert log.startswith("ZOR version: 22/12/02zor_9.2.30.0000\nInstall type: global\n")
    assert log.endswith("Installation successful, committing changes\nDone.\n")


def test_the_locale_of_the_caller_changes_nothing(machine):
    outcome = machine.run("r", "ABC", environment={"LC_ALL": "de_DE.UTF-8", "LANG": "de_DE"})

    printed(outcome, NOTHING_TO_REMOVE, status=1)
