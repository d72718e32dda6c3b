"""The documents are right: their links, commands, messages, transcript and examples."""

import json
import os
import re
import subprocess

import pytest

from harness import REPOSITORY
from harness.machine import ROOT, SPB, Machine

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


def source_text():
    """The sources, with the pieces of each split string literal joined."""
    sources = (REPOSITORY / "src/install/standalone").glob("*.cpp")
    return "".join(re.sub(r'"\s*\n\s*"', "", source.read_text()) for source in sources)


def documented_messages():
    text = (REPOSITORY / "docs/administrators.md").read_text()
    table = text[text.index("| Message | Meaning |") : text.index("| Code | Text |")]
    cells = [row.split(" | ")[0] for row in table.splitlines()[2:] if row.startswith("|")]
    return [message for cell in cells for message in re.findall(r"`([^`]+)`", cell)]


def fixed_parts(message):
    """What a message holds besides its values: <file>, N, X, (text), ... and the code."""
    parts = re.split(r"<\w+>|\bN\b|\bX\b|\(text\)|\.\.\.|\d", message)
    return [part.strip() for part in parts if len(part.strip()) > 2]


@pytest.mark.parametrize("message", documented_messages())
def test_a_documented_message_stands_in_the_sources(message):
    text = source_text()
    assert [part for part in fixed_parts(message) if part not in text] == []


def test_every_error_line_of_the_sources_is_documented():
    errors = set(re.findall(r'"(\*\*\* Error: [^"\\]+)', source_text()))
    documented = "\n".join(documented_messages())
    assert len(errors) > 8
    assert [error for error in errors if error.rstrip() not in documented] == []


@pytest.fixture(scope="module")
def example_spb(tmp_path_factory):
    work = tmp_path_factory.mktemp("example")
    subprocess.run([REPOSITORY / "scripts/build_toolkit.sh", work / "toolkit"], check=True)
    subprocess.run(
        [REPOSITORY / "scripts/pack_toolkit.py", work / "toolkit", "-o", work / "spb"], check=True
    )
    return (work / "spb").read_bytes()


def test_the_transcript_of_the_readme_is_what_the_example_toolkit_gives(machine, example_spb):
    machine.plant(SPB, example_spb)
    [transcript] = [block for block in code_blocks("README.md") if block.startswith("$ wzorinst i")]
    lines = transcript.splitlines()
    command, expected = lines[0].split()[2:], lines[1:-2]

    outcome = machine.run(*command)

    assert outcome.stdout.splitlines() == expected
    assert outcome.status == 0 and lines[-2:] == ["$ echo $?", "0"]


SHELL_EXAMPLE, POSTINST, PRERM = [
    block for block in code_blocks("docs/exploiters.md", "sh") if block.startswith("#!")
]
[RPM_EXAMPLE] = [
    block for block in code_blocks("docs/exploiters.md", "sh") if block.startswith("%")
]


def rpm_script(section):
    return RPM_EXAMPLE.split(f"%{section}\n")[1].split("\n%")[0]


def exploiters(machine):
    lines = [line for line in machine.run("t").stdout.splitlines() if line.startswith("Exploiter")]
    return [line.removeprefix("Exploiter list = ") for line in lines]


def with_media(machine):
    """Puts the installer and the package where the packages of the examples carry them."""
    machine.make_directory("/var/log")
    machine.link("/opt/shop/media", "/media")
    return machine


def run_script(machine, script, *arguments):
    machine.plant("/media/script.sh", script, 0o755)
    return machine.execute(
        ["/bin/sh", "/media/script.sh", *arguments],
        user=ROOT,
        umask=0o022,
        environment=None,
        options=(),
        everywhere=False,
    )


def test_the_shell_example_installs(machine):
    outcome = run_script(with_media(machine), SHELL_EXAMPLE)

    assert (outcome.status, outcome.stderr) == (0, "")
    assert exploiters(machine) == ["SHOP:"]
    assert machine.read("/var/log/shop-zor.log").endswith("committing changes\nDone.\n")


def test_the_shell_example_tells_a_failure(machine):
    machine.plant(SPB, b"no package")

    outcome = run_script(with_media(machine), SHELL_EXAMPLE)

    assert outcome.status == 1
    assert outcome.stderr == (
        "The inventory toolkit could not be installed; see /var/log/shop-zor.log\n"
    )


def test_the_rpm_example_installs_keeps_and_removes(machine):
    with_media(machine)

    assert run_script(machine, rpm_script("post"), "1").status == 0
    assert exploiters(machine) == ["SHOP:"]
    assert run_script(machine, rpm_script("preun"), "1").status == 0
    assert exploiters(machine) == ["SHOP:"]
    assert run_script(machine, rpm_script("preun"), "0").status == 0
    assert exploiters(machine) == []


def test_the_debian_example_installs_and_removes(machine):
    with_media(machine)

    assert run_script(machine, POSTINST, "configure").status == 0
    assert exploiters(machine) == ["SHOP:"]
    assert run_script(machine, PRERM, "upgrade").status == 0
    assert exploiters(machine) == ["SHOP:"]
    assert run_script(machine, PRERM, "remove").status == 0
    assert exploiters(machine) == []
