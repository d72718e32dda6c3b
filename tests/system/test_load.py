"""Packages of many files or of much content: all of it arrives, and memory follows the entries."""

import pytest

from harness import load
from harness.load import Load
from harness.machine import SPB

# What the installer may hold for one entry, sanitizers included, and for everything else.
KIB_AN_ENTRY = 1
KIB_OTHERWISE = 2048

LOADS = (
    Load("many_files", small_files=2_000),
    Load("many_files_without_a_directory", small_files=2_000, commented=True),
    Load("a_large_file", huge_size=64 << 20),
)


@pytest.mark.parametrize("each", LOADS, ids=[each.name for each in LOADS])
def test_a_large_package_is_installed_and_removed_within_its_memory(machine, each):
    load.write_package(machine.at(SPB), Load("the toolkit alone"))
    small = load.install(machine, Load("the toolkit alone")), load.remove(machine)
    entries = load.write_package(machine.at(SPB), each)

    large = load.install(machine, each), load.remove(machine)

    allowed = KIB_OTHERWISE + KIB_AN_ENTRY * entries
    for before, after in zip(small, large):
        assert after.peak - before.peak <= allowed
