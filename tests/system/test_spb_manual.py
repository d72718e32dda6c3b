"""The manual page of `spb` renders, and says what the tool does."""

import re
import subprocess

import pytest

from harness import REPOSITORY, spb_tool

SOURCE = REPOSITORY / "docs" / "man" / "spb.1.scd"


COMMANDS = ["pack", "list", "check", "info", "diff", "extract", "sbom", "sign", "verify"]


@pytest.fixture(scope="module")
def page():
    with SOURCE.open("rb") as source:
        return subprocess.run(["scdoc"], stdin=source, capture_output=True, check=True).stdout


def section(title):
    """The text below the heading `title`, up to the next one."""
    text = SOURCE.read_text().split(f"\n{title}\n", 1)[1]
    return re.split(r"^#", text, flags=re.MULTILINE)[0]


def test_the_manual_page_renders_without_a_warning(page):
    done = subprocess.run(
        ["groff", "-ww", "-man", "-Tutf8", "-P-cbou"], input=page, capture_output=True, check=False
    )

    assert (done.returncode, done.stderr) == (0, b"")
    assert b"make, check, compare and sign SPBs" in b" ".join(done.stdout.split())


def test_the_manual_page_explains_every_code_under_its_kind():
    explained = {}
    for kind, title in [
        ("fails", "## Kind fails: an installation of this package fails"),
        ("damaged", "## Kind damaged: it installs, but not what was packed"),
        ("surprises", "## Kind surprises: it installs, but not as its maker may think"),
    ]:
        codes = re.findall(r"^\*([a-z0-9-]+)\*\n\t\S", section(title), flags=re.MULTILINE)
        assert codes == sorted(codes)
        explained.update(dict.fromkeys(codes, kind))

    assert explained == spb_tool.codes()


@pytest.mark.parametrize("command", COMMANDS)
def test_the_manual_page_names_the_options_of_the_command(command):
    help_text = spb_tool.run(command, "--help").stdout
    synopsis = re.search(rf"^\*spb {command}\*.*", section("# SYNOPSIS"), re.MULTILINE)[0]

    known = set(re.findall(r"^  (--?[a-z]+)", help_text, re.MULTILINE)) - {"-h"}
    assert set(re.findall(r"\*(--?[a-z]+)\*", synopsis)) == known


def test_the_help_of_the_tool_names_its_commands():
    assert re.findall(r"^    ([a-z]+)  ", spb_tool.run("--help").stdout, re.MULTILINE) == COMMANDS


def test_no_command_is_a_usage_error():
    done = spb_tool.run()

    assert (done.returncode, done.stdout) == (2, "")
    assert done.stderr.startswith("usage: spb [-h] COMMAND ...\n")
