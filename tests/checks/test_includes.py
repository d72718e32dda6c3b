"""Includes point down the rows of docs/architecture.md and never form a cycle."""

import re

import pytest

from harness import REPOSITORY

SOURCES = REPOSITORY / "src/install/standalone"

# From top to bottom; what one row holds may include its own row and the lower ones.
ROWS = [
    "wzorinst command_line discovery status_report permissions private_mode",
    "installation fresh_install upgrade removal",
    "extraction scanner_control environment install_log template_variables tree_removal",
    "registry exploiters common_directory locations property_file",
    "file_operations sound_entry transaction",
    "zip_file settings build_stamp version file_codes file_writing paths text time_stamps scoped"
    " unwind_tables",
]
ROW_OF = {name: number for number, row in enumerate(ROWS) for name in row.split()}


def units():
    return sorted({path.stem for path in SOURCES.glob("*.cpp")}
                  | {path.stem for path in SOURCES.glob("*.h")})


def includes(path):
    if not path.exists():
        return []
    return re.findall(r'^#include "(\w+)\.h"', path.read_text(), re.MULTILINE)


def included_by(name):
    """Names that the header or the source of `name` includes, itself left out."""
    found = includes(SOURCES / f"{name}.h") + includes(SOURCES / f"{name}.cpp")
    return sorted(set(found) - {name})


def test_every_file_has_its_row():
    assert units() == sorted(ROW_OF)


@pytest.mark.parametrize("name", units())
def test_no_include_runs_up(name):
    assert [other for other in included_by(name) if ROW_OF[other] < ROW_OF[name]] == []


def test_no_include_closes_a_circle():
    done = set()

    def visit(name, road):
        assert name not in road, " -> ".join([*road, name])
        if name not in done:
            for other in included_by(name):
                visit(other, [*road, name])
            done.add(name)

    for name in units():
        visit(name, [])
    assert done == set(units())
