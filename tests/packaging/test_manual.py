"""The manual pages render cleanly; wzorinst(8) says what the program does."""

import os
import re
import subprocess

import pytest
from parser_options import parser_options


@pytest.fixture(scope="module")
def page(build):
    return build / "docs/man/wzorinst.8.gz"


@pytest.fixture(scope="module")
def sections(page):
    """The page as it is read: the name of each section and its text."""
    environment = {**os.environ, "MANWIDTH": "1000", "MANPAGER": "cat", "LC_ALL": "C.UTF-8"}
    rendered = subprocess.run(
        ["man", "-l", page], env=environment, capture_output=True, text=True, check=True
    ).stdout
    parts = re.split(r"^([A-Z][A-Z ]+)$", rendered, flags=re.MULTILINE)
    return dict(zip(parts[1::2], parts[2::2]))


@pytest.fixture
def usage(machine):
    """The usage text: what each of its lines explains, and how."""
    text = machine.run().stdout
    return dict(re.findall(r"^  (\S+(?: <[\w ]+>)?) +(.+)$", text, re.MULTILINE))


def entries(section):
    """What a section explains, and the first paragraph on each."""
    found = re.findall(r"^( +)(\S.*)\n\1 +(\S.*)$", section, re.MULTILINE)
    return {heading: paragraph for _, heading, paragraph in found}


def documented_options(sections):
    """As `parser_options`, from the page."""
    options = {}
    for heading, text in {
        **entries(sections["OPTIONS"]),
        **entries(sections["UNLISTED OPTIONS"]),
    }.items():
        before = "-eeo " if text.startswith("after -eeo: ") else ""
        options[before + heading.split()[0]] = "<" in heading
    return options


@pytest.mark.parametrize("name", ["wzorinst.8", "spb.1", "zorctl.8", "dh_wzorinst.1"])
def test_rendering_gives_no_warning(build, tmp_path, name):
    page = build / f"docs/man/{name}.gz"
    source = tmp_path / name
    source.write_bytes(subprocess.run(["zcat", page], capture_output=True, check=True).stdout)

    checked = subprocess.run(
        ["groff", "-ww", "-man", "-Tutf8", "-z", source], capture_output=True, text=True, check=True
    )

    assert (checked.stdout, checked.stderr) == ("", "")


def test_man_shows_the_page_without_a_warning(page):
    shown = subprocess.run(
        ["man", "--warnings", "-Tutf8", "-Z", "-l", page],
        capture_output=True,
        text=True,
        check=True,
    )

    assert shown.stderr == ""


def test_the_page_has_the_sections_of_a_manual_page(sections):
    assert list(sections) == [
        "NAME",
        "SYNOPSIS",
        "DESCRIPTION",
        "ACTIONS",
        "OPTIONS",
        "UNLISTED OPTIONS",
        "EXIT STATUS",
        "SIGNALS",
        "ENVIRONMENT",
        "FILES",
        "MESSAGES",
        "EXAMPLES",
        "SEE ALSO",
    ]


def test_every_line_of_the_usage_text_is_explained_in_the_same_words(sections, usage):
    explained = {**entries(sections["ACTIONS"]), **entries(sections["OPTIONS"])}

    assert len(usage) == 12
    assert [
        what
        for what, words in usage.items()
        if not re.match(re.escape(words) + "[.:;]", explained.get(what, ""))
    ] == []


def test_the_options_of_the_usage_text_and_the_others_have_sections_of_their_own(sections, usage):
    listed = [what for what in usage if what.startswith("-")]

    assert list(entries(sections["OPTIONS"])) == listed
    assert list(entries(sections["UNLISTED OPTIONS"])) == [
        "-v",
        "-norollback",
        "-eeo",
        "-l",
        "-g",
        "-z",
    ]


def test_the_page_explains_the_options_that_the_program_takes_and_no_other(sections, machine):
    taken = parser_options(machine)
    documented = documented_options(sections)
    words = {option: wants for option, wants in documented.items() if len(option.split()[-1]) > 2}

    assert {option: wants for option, wants in documented.items() if option not in words} == taken
    assert words == {"-norollback": False, "-eeo": False}


def test_the_options_that_are_words_are_those_of_the_command_line_reader(tree):
    source = (tree / "src/install/standalone/command_line.cpp").read_text()

    assert set(re.findall(r'"(-[a-z]{2,})"', source)) == {"-eeo", "-norollback"}


@pytest.mark.parametrize("word", ["-eeo", "-norollback"])
def test_the_program_takes_the_option_that_is_a_word(machine, word):
    assert machine.run("r", "ABC", word, "%").stderr == "Invalid option: %\n"


def test_the_providers_are_those_that_the_program_takes(sections, machine):
    paragraph = next(
        text for heading, text in entries(sections["OPTIONS"]).items() if heading.startswith("-f ")
    )
    providers = re.findall(r"provider_\w+", paragraph)

    assert len(set(providers)) == 6
    for provider in providers:
        assert machine.run("r", "ABC", "-f", provider, "%").stderr == "Invalid option: %\n"


def test_the_files_are_those_that_an_installation_leaves(sections, machine):
    assert machine.run("i", "ABC", "-s", "/media/toolkit.spb", "-r").status == 0
    home = "/opt/corvan/zor"
    named = [path for heading in entries(sections["FILES"]) for path in heading.split(", ")]

    assert len(named) == 13
    there = [
        path if path.startswith("/") else f"{home}/{path}" for path in named if path[0] not in "~*"
    ]
    assert [path for path in there if not machine.exists(path)] == []


def test_the_messages_are_in_the_sources(sections, tree):
    sources = "".join(
        re.sub(r'"\s*\n\s*"', "", path.read_text())
        for path in (tree / "src/install/standalone").glob("*.cpp")
    )
    messages = list(entries(sections["MESSAGES"]))

    assert len(messages) == 9
    for message in messages:
        for part in re.split(r"\d|[()]", message):
            assert part.strip() in sources, message


def test_the_footer_names_the_version_and_the_date_of_the_release(sections):
    footer = r"^wzorinst 9\.2\.30 +2022-12-02 +wzorinst\(8\)$"
    assert re.search(footer, sections["SEE ALSO"], re.MULTILINE)


def test_the_examples_are_command_lines_that_the_program_takes(sections, machine):
    examples = re.findall(r"^ {8,}(?:flock .* )?wzorinst (.*)$", sections["EXAMPLES"], re.MULTILINE)
    machine.make_directory("/var/log")

    assert len(examples) == 4
    for example in examples:
        assert machine.run(*example.split()).stderr == "", example
