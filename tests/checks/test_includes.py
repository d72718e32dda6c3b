"""Includes go one way: down the rows that CMake's source lists declare, and never in a cycle."""

import re
from pathlib import Path

import pytest

from harness import REPOSITORY

SOURCES = REPOSITORY / "src/install/standalone"


def declared_rows():
    """The rows from top to bottom: their names, each with the names of its files."""
    lists = re.findall(
        r"^set\((\w+)_row\s+([\w.\s]+)\)$", (SOURCES / "CMakeLists.txt").read_text(), re.MULTILINE
    )
    return {
        row.replace("_", " "): [Path(file).stem for file in files.split()] for row, files in lists
    }


def documented_rows():
    """The same, as the table of the architecture document shows it."""
    text = (REPOSITORY / "docs/architecture.md").read_text()
    table = text[text.index("| Row | Files |") :].split("\n\n")[0]
    cells = [line.strip("| ").split(" | ") for line in table.splitlines()[2:]]
    return {row: re.findall(r"`(\w+)`", files) for row, files in cells}


ROWS = declared_rows()
ROW_OF = {name: number for number, row in enumerate(ROWS.values()) for name in row}
UNITS = sorted({path.stem for path in [*SOURCES.glob("*.cpp"), *SOURCES.glob("*.h")]})


def includes(path):
    if not path.exists():
        return []
    return re.findall(r'^#include "(\w+)\.h"', path.read_text(), re.MULTILINE)


def included_by(name):
    """Names that the header or the source of `name` includes, without itself."""
    found = includes(SOURCES / f"{name}.h") + includes(SOURCES / f"{name}.cpp")
    return sorted(set(found) - {name})


def test_every_file_belongs_to_one_row():
    assert sorted(name for row in ROWS.values() for name in row) == UNITS


def test_the_document_shows_the_same_rows():
    documented = documented_rows()

    assert list(documented) == list(ROWS)
    assert {row: sorted(files) for row, files in documented.items()} == {
        row: sorted(files) for row, files in ROWS.items()
    }


@pytest.mark.parametrize("name", UNITS)
def test_no_include_goes_up(name):
    assert [other for other in included_by(name) if ROW_OF[other] < ROW_OF[name]] == []


def test_no_include_closes_a_cycle():
    done = set()

    def visit(name, chain):
        assert name not in chain, " -> ".join([*chain, name])
        if name not in done:
            for other in included_by(name):
                visit(other, [*chain, name])
            done.add(name)

    for name in UNITS:
        visit(name, [])
    assert done == set(UNITS)
