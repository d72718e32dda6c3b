"""The manual page and the completion of zorctl name what the program takes."""

import re

import pytest

from harness import REPOSITORY
from harness.zorctl import zorctl

COMMANDS = ("status", "verify", "plan", "run", "doctor")
PAGE = (REPOSITORY / "docs/man/zorctl.8.scd").read_text()
COMPLETION = (REPOSITORY / "packaging/bash-completion/zorctl").read_text()


def taken(machine, command):
    """The long options that the help of `command` lists."""
    text = zorctl(machine, command, "--help").stdout
    return set(re.findall(r"^  (?:-\w, )?(--[a-z-]+)", text, re.MULTILINE))


def synopsis(command):
    [line] = [line for line in PAGE.splitlines() if line.startswith(f"*zorctl {command}*")]
    return set(re.findall(r"\*(--[a-z-]+)\*", line))


def offered(command):
    [words] = re.findall(rf'^        {command}\) _zorctl_offer "([^"]*)"', COMPLETION, re.MULTILINE)
    return set(words.split())


def test_the_commands_are_those_of_the_help(machine):
    text = zorctl(machine, "--help").stdout
    listed = re.findall(r"^    ([a-z]+) ", text.split("commands:\n")[1], re.MULTILINE)

    assert tuple(listed) == COMMANDS


@pytest.mark.parametrize("command", COMMANDS)
def test_the_page_and_the_completion_know_the_options(machine, command):
    options = taken(machine, command)

    assert len(options) > 3
    assert synopsis(command) | {"--help"} == options
    assert offered(command) == options


def test_the_page_and_the_help_have_the_same_exit_statuses(machine):
    section = PAGE.split("# EXIT STATUS\n")[1].split("\n# ")[0]
    table = zorctl(machine, "--help").stdout.split("Exit status: ")[1]

    assert re.findall(r"^\*(\d+)\*$", section, re.MULTILINE) == [
        "0",
        "1",
        "2",
        "3",
        "65",
        "75",
        "77",
    ]
    assert re.findall(r"(?<!\d)(\d+) [a-z]", table) == ["0", "1", "2", "3", "65", "75", "77"]
