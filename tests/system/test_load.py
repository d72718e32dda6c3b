"""Packages of many files or of much content: all of it arrives, and memory follows the entries."""

import os

import pytest

from harness import load
from harness.load import Load
from harness.machine import SPB

# What the installer may hold for one entry, by itself and with the address sanitizer, and for
# everything else.
KIB_AN_ENTRY = {False: 1, True: 4}
KIB_OTHERWISE = 2048

LOADS = (
    Load("many_files", small_files=2_000),
    Load("many_files_without_a_directory", small_files=2_000, commented=True),
    Load("a_large_file", huge_size=64 << 20),
)


@pytest.mark.parametrize("each", LOADS, ids=[each.name for each in LOADS])
def test_a_large_package_is_installed_and_removed_within_its_memory(machine, binary, each):
    with open(binary, "rb") as file:
        is_sanitized = b"__asan_init" in file.read()
    load.write_package(machine.at(SPB), Load("the toolkit alone"))
    small = load.install(machine, Load("the toolkit alone")), load.remove(machine)
    entries = load.write_package(machine.at(SPB), each)

    large = load.install(machine, each), load.remove(machine)

    allowed = KIB_OTHERWISE + KIB_AN_ENTRY[is_sanitized] * entries
    for before, after in zip(small, large):
        assert after.peak - before.peak <= allowed


def test_a_removal_deletes_a_directory_of_more_names_than_it_holds(machine):
    assert machine.run("i", "ABC", "-s", SPB).status == 0
    cache = machine.at("/opt/corvan/zor/cache_data")
    names = 140_000  # of 240 bytes: more than the 32 MiB that a removal holds at once
    for number in range(names):
        if number % 10_000 == 0:  # a file has only some ten thousand links, depending on its system
            first = f"{cache}/{number:0240}"
            with open(first, "wb"):
                continue
        os.link(first, f"{cache}/{number:0240}")

    assert machine.run("r", "ABC", "-o", "/dev/null").status == 0

    assert not machine.exists("/opt/corvan/zor")
