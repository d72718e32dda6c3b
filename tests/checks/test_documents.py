"""The documents are right: their links, commands, messages, transcript and examples."""

import json
import os
import re
import subprocess

import pytest

from harness import REPOSITORY
from harness.machine import SPB, Machine

DOCUMENTS = sorted([*REPOSITORY.glob("*.md"), *REPOSITORY.glob("docs/*.md")])
IDS = [str(path.relative_to(REPOSITORY)) for path in DOCUMENTS]

# Directories whose files the documents name as commands.
COMMAND_PATH = re.compile(
    r"(?<![\w/.])(?:\./)?((?:scripts|tests|tools|bench|examples)/[\w./*-]*\w)"
)
PRESET = re.compile(r"--preset (\S+?)[\s`;&]")
LINK = re.compile(r"\]\(([^)#]*)(?:#([^)]*))?\)")


@pytest.fixture
def machine():
    fresh = Machine(os.path.realpath(os.environ["WZORINST"]))
    yield fresh
    fresh.delete()


def code_blocks(document, language=""):
    text = (REPOSITORY / document).read_text()
    return re.findall(rf"^```{language}\n(.*?)^```$", text, re.MULTILINE | re.DOTALL)


def anchors(document):
    """The names under which the headings of a document can be reached."""
    headings = re.findall(r"^#+ (.*)$", document.read_text(), re.MULTILINE)
    return {re.sub(r"[^\w -]", "", heading.lower()).replace(" ", "-") for heading in headings}


def leads_somewhere(document, name, anchor):
    target = document.parent / name if name else document
    return target.exists() and (not anchor or anchor in anchors(target))


@pytest.mark.parametrize("document", DOCUMENTS, ids=IDS)
def test_links_lead_to_files_and_headings(document):
    links = [link for link in LINK.findall(document.read_text()) if "://" not in link[0]]
    assert [link for link in links if not leads_somewhere(document, *link)] == []


def test_the_spelling_is_right():
    done = subprocess.run(["codespell"], cwd=REPOSITORY, capture_output=True, check=False)
    assert (done.stdout, done.stderr, done.returncode) == (b"", b"", 0)


@pytest.mark.parametrize("document", DOCUMENTS, ids=IDS)
def test_commands_and_paths_are_there(document):
    paths = COMMAND_PATH.findall(document.read_text())
    assert [path for path in paths if not any(REPOSITORY.glob(path))] == []


@pytest.mark.parametrize("document", DOCUMENTS, ids=IDS)
def test_presets_are_defined(document):
    presets = json.loads((REPOSITORY / "CMakePresets.json").read_text())["configurePresets"]
    known = {preset["name"] for preset in presets}
    assert set(PRESET.findall(document.read_text())) <= known


def test_the_documents_name_presets_and_commands():
    """The patterns above find something: they would not fail otherwise."""
    text = "".join(document.read_text() for document in DOCUMENTS)
    assert "release-i686" in PRESET.findall(text)
    assert "scripts/demo.sh" in COMMAND_PATH.findall(text)
    assert ("docs/architecture.md", "") in LINK.findall(text)


# Messages. Each is reduced to its fixed parts, without its values.

STATEMENT = re.compile(
    r"(?:\*logstream|std::cerr|std::cout)\s*<<"
    r"((?:\"(?:[^\"\\]|\\.)*\"|'(?:[^'\\]|\\.)'|[^;\"'])*);"
)
PIECE = re.compile(r"\"((?:[^\"\\]|\\.)*)\"|'((?:[^'\\]|\\.)*)'|[^\"'\s<][^\"'<]*")
LITERAL = re.compile(r"\"((?:[^\"\\\n]|\\.)*)\"|'(?:[^'\\]|\\.)'")
CHOICE = re.compile(r"\([^()]*\?[^()]*\)")

# Functions that print the text they are given: a text's own message, or the beginning of one.
TRACED = re.compile(r"trace\(debug, \"([^\"]+)\"")
ERROR_OF_FILE = re.compile(r"\w\(\"(\w+ file) \"")

# Texts with a blank that are no messages.
ARGUMENTS = re.compile(
    r" >/dev/null 2>&1|-\w.*|# File created by ZOR: .*|%s=%s|%. %s|%u %u %u"
    r"|virtual int .*|available_ >= .*"
)


def fixed_parts(message):
    """A message without its values: <file>, N, (text)."""
    parts = re.split(r"<[^<>]*>|\bN\b|\(text\)", message)
    return tuple(part.strip() for part in parts if re.search("[A-Za-z]", part))


def sources():
    """The sources without comments, the pieces of each split string literal joined."""
    for source in sorted((REPOSITORY / "src/install/standalone").glob("*.cpp")):
        text = re.sub(r"//.*$", "", source.read_text(), flags=re.MULTILINE)
        yield re.sub(r'"\s*\n\s*"', "", text)


def printed_lines_of(text):
    """The lines that the statements of a source print, with <> for each value."""
    for statement in STATEMENT.findall(text):
        pieces = PIECE.finditer(CHOICE.sub("value", statement))
        line = "".join(piece[1] or piece[2] or "<>" for piece in pieces)
        yield from line.split("\\n")


def source_messages():
    """The fixed parts of every message of the program, but the lines below "Usage:"."""
    found = set()
    for text in sources():
        lines = [line for line in printed_lines_of(text) if not line.startswith("  ")]
        found |= {fixed_parts(line) for line in lines}
        found |= {fixed_parts(begin) for begin in TRACED.findall(text)}
        found |= {fixed_parts(begin + " <> error:") for begin in ERROR_OF_FILE.findall(text)}
    return found - {(), ("error:",)}


def documented_messages():
    text = (REPOSITORY / "docs/administrators.md").read_text().partition("## Messages")[2]
    tables = re.findall(r"\| Message \| Meaning \|\n\|---\|---\|\n((?:\|.*\n)*)", text)
    cells = [row.split(" | ")[0] for table in tables for row in table.splitlines()]
    return {
        fixed_parts(message.replace("\\|", "|"))
        for cell in cells
        for message in re.findall(r"`([^`]+)`", cell)
    }


def test_the_messages_of_the_program_are_those_of_the_document():
    assert len(source_messages()) > 100
    assert sorted(source_messages() - documented_messages()) == []
    assert sorted(documented_messages() - source_messages()) == []


def test_every_text_of_the_sources_is_a_message_or_known_not_to_be():
    """No way of printing escapes the test above."""
    literals = [piece[1] or "" for text in sources() for piece in LITERAL.finditer(text)]
    texts = {line for literal in literals for line in literal.split("\\n") if " " in line.strip()}
    codes = (REPOSITORY / "docs/administrators.md").read_text().partition("| Code | Text |")[2]
    known = "\n".join([codes, *(part for parts in documented_messages() for part in parts)])

    unknown = [
        text
        for text in texts
        if not text.startswith("  ")  # the options of the usage text
        and not ARGUMENTS.fullmatch(text)
        and not all(part in known for part in fixed_parts(text))
    ]

    assert len(texts) > 100
    assert unknown == []


# Examples of calls: two runs must not meet.

CALL = re.compile(r"(?:^|[\s/])wzorinst [ir] ")
GUARDED = re.compile(r"flock -F -w 600 (?:/run/wzorinst\.lock|~/\.wzorinst\.lock) ")


@pytest.mark.parametrize(
    "document", ["README.md", "docs/administrators.md", "docs/exploiters.md", "docs/reliability.md"]
)
def test_every_example_of_a_call_takes_the_lock(document):
    blocks = "".join(code_blocks(document, "\\w*")).replace("\\\n", "")
    calls = [
        line for line in blocks.splitlines() if CALL.search(line) and "<exploiterID>" not in line
    ]
    assert calls != []
    assert [line for line in calls if not GUARDED.search(line)] == []


def test_every_example_of_the_manual_takes_the_lock():
    manual = (REPOSITORY / "docs/man/wzorinst.8.scd").read_text()
    examples = manual.partition("# EXAMPLES")[2].partition("# SEE ALSO")[0]
    calls = [line for line in examples.splitlines() if CALL.search(line)]
    assert len(calls) == 3
    assert [line for line in calls if not GUARDED.search(line)] == []


@pytest.fixture(scope="module")
def example_spb(tmp_path_factory):
    work = tmp_path_factory.mktemp("example")
    subprocess.run([REPOSITORY / "scripts/build_toolkit.sh", work / "toolkit"], check=True)
    subprocess.run(
        [REPOSITORY / "scripts/pack_toolkit.py", work / "toolkit", "-o", work / "spb"], check=True
    )
    return (work / "spb").read_bytes()


def test_the_transcript_of_the_readme_is_that_of_the_example_toolkit(machine, example_spb):
    machine.plant(SPB, example_spb)
    machine.make_directory("/run")
    [transcript] = [block for block in code_blocks("README.md") if block.startswith("$ flock")]
    lines = transcript.splitlines()
    command, expected = lines[0].removeprefix("$ "), lines[1:-2]

    outcome = machine.run_in_shell(command.replace(" wzorinst ", ' "$0" '))

    assert outcome.stdout.splitlines() == expected
    assert outcome.status == 0 and lines[-2:] == ["$ echo $?", "0"]
