"""The bash completion, in an interactive bash on a pseudo terminal.

A test types a line and presses the key that puts in all completions; what the line then holds
is compared.
"""

import os
import pty
import re
import select
import subprocess
from pathlib import Path

import pytest
from parser_options import parser_options

from harness import bubblewrap
from harness.machine import BINARY, Machine

DEADLINE = 30  # seconds until a bash that does not answer fails its test

# Bash loads the completion on demand, from where its user keeps them. The keys: Meta-* (readline's
# insert-completions) and Control-G, which shows the line between marks and empties it.
SET_UP = r"""
PS1='ready> '
PATH=/media:/usr/bin
BASH_COMPLETION_USER_DIR=/media/bash-completion
HISTFILE=
source /usr/share/bash-completion/bash_completion
show_line() { echo "<<$READLINE_LINE>>"; READLINE_LINE=; }
bind 'set enable-bracketed-paste off'
bind -x '"\C-g": show_line'
cd /home/work
"""

REGISTRY = """\
ZOR_Version = 9.2.30.0000
ZOR_BuildDate = 22/12/02
ZOR_HomeDirectory = /opt/corvan/zor
ZOR_Exploiters = SHOP:DESK:
ZOR_ConfigRootDirectory = /opt/corvan/zor
"""


class InteractiveBash:
    """A bash on a pseudo terminal, on its own machine."""

    def __init__(self, machine):
        terminal, inside = pty.openpty()
        line = bubblewrap.command_line(
            machine.root,
            ["/bin/bash", "--noprofile", "--rcfile", "/media/set-up", "-i"],
            uid=0,
            environment={"TERM": "dumb", "LC_ALL": "C.UTF-8", "HOME": "/root", "COLUMNS": "1000"},
            read_only={BINARY: machine.binary},
        )
        self.process = subprocess.Popen(
            line, stdin=inside, stdout=inside, stderr=inside, start_new_session=True
        )
        os.close(inside)
        self.terminal = terminal
        self.read_until(r"ready> $")

    def completed(self, typed, key="\033*"):
        """The line after `typed` and the key that completes it."""
        os.write(self.terminal, f"{typed}{key}\007".encode())
        return self.read_until(r"<<(.*)>>\r?\n[^\n]*ready> $").group(1)

    def read_until(self, pattern):
        text = ""
        while not (match := re.search(pattern, text)):
            ready, _, _ = select.select([self.terminal], [], [], DEADLINE)
            assert ready, f"bash stopped at: {text!r}"
            text += os.read(self.terminal, 4096).decode()
        return match

    def end(self):
        self.process.kill()
        self.process.wait()
        os.close(self.terminal)


@pytest.fixture(scope="module")
def bash(binary, tree):
    machine = Machine(binary)
    machine.plant("/media/set-up", SET_UP)
    machine.plant(
        "/media/bash-completion/completions/wzorinst",
        (tree / "packaging/bash-completion/wzorinst").read_bytes(),
    )
    # Newer versions of bash-completion keep helpers of completions there.
    for part in Path("/etc/bash_completion.d").glob("*bash_completion*"):
        machine.plant(str(part), part.read_bytes())
    machine.plant("/etc/zor/zor.ini", REGISTRY)
    for name in ("toolkit.spb", "TOOLS.SPB", "notes.txt", "two words.spb"):
        machine.plant(f"/home/work/{name}", "x")
    machine.make_directory("/home/work/media")
    shell = InteractiveBash(machine)
    yield shell
    shell.end()
    machine.delete()


@pytest.mark.parametrize(
    "typed, completed",
    [
        ("wzorinst ", "wzorinst i r t "),
        ("wzorinst x", "wzorinst x"),
        ("/media/wzorinst ", "/media/wzorinst i r t "),
    ],
    ids=["nothing", "no action", "a path to the program"],
)
def test_the_first_word_is_an_action(bash, typed, completed):
    assert bash.completed(typed) == completed


@pytest.mark.parametrize("action", ["i", "r"])
def test_the_second_word_is_a_registered_exploiter(bash, action):
    assert bash.completed(f"wzorinst {action} ") == f"wzorinst {action} DESK SHOP "
    assert bash.completed(f"wzorinst {action} S") == f"wzorinst {action} SHOP "


def test_nothing_follows_the_action_t(bash):
    assert bash.completed("wzorinst t ") == "wzorinst t "
    assert bash.completed("wzorinst t X -") == "wzorinst t X -"


def test_options_follow_the_exploiter(bash):
    assert bash.completed("wzorinst i X ") == "wzorinst i X -c -d -f -n -o -p -r -s "
    assert bash.completed("wzorinst i X -n -") == "wzorinst i X -n -c -d -f -n -o -p -r -s "


@pytest.mark.parametrize(
    "typed, completed",
    [
        ("-e", "-eeo"),
        ("-no", "-norollback"),
        ("-v", "-v"),
    ],
)
def test_an_unlisted_option_is_completed_once_it_is_begun(bash, typed, completed):
    assert bash.completed(f"wzorinst r X {typed}") == f"wzorinst r X {completed} "


def test_the_extended_options_follow_eeo(bash):
    assert (
        bash.completed("wzorinst i X -eeo -")
        == "wzorinst i X -eeo -c -d -f -g -l -n -o -p -r -s -z "
    )


def test_eeo_as_the_argument_of_an_option_unlocks_nothing(bash):
    assert bash.completed("wzorinst i X -d -eeo -l") == "wzorinst i X -d -eeo -l"


def test_the_package_is_a_file_that_ends_in_spb_or_in_a_directory(bash):
    assert (
        bash.completed("wzorinst i X -s ")
        == r"wzorinst i X -s TOOLS.SPB media toolkit.spb two\ words.spb "
    )


def test_the_log_is_any_file(bash):
    assert (
        bash.completed("wzorinst i X -o ")
        == r"wzorinst i X -o TOOLS.SPB media notes.txt toolkit.spb two\ words.spb "
    )


@pytest.mark.parametrize("option", ["-d", "-c"])
def test_the_target_and_the_traces_are_directories(bash, option):
    assert bash.completed(f"wzorinst i X {option} ") == f"wzorinst i X {option} media "


def test_the_tab_key_completes_a_directory(bash):
    assert bash.completed("wzorinst i X -d m", key="\t") == "wzorinst i X -d media/"


def test_the_provider_is_one_of_six(bash):
    assert bash.completed("wzorinst i X -f ") == (
        "wzorinst i X -f provider_cache provider_cache2 provider_cache3 provider_remote_cache "
        "provider_remote_cache2 provider_standard "
    )


def test_an_argument_that_looks_like_an_option_has_no_argument(bash):
    assert bash.completed("wzorinst i X -d -f -p") == "wzorinst i X -d -f -p "


def test_the_options_offered_are_those_that_the_program_takes(bash, machine):
    taken = {option.split()[-1] for option in parser_options(machine)}
    offered = bash.completed("wzorinst i X -eeo -").split()[4:]
    begun = bash.completed("wzorinst i X -v").split()[3:]

    assert set(offered + begun) == taken
