"""Every test file is run: a new one that its CMakeLists.txt does not name would pass unseen."""

import re

import pytest

from harness import REPOSITORY

TESTS = REPOSITORY / "tests"


def words(folder):
    text = (TESTS / folder / "CMakeLists.txt").read_text()
    return set(re.findall(r"[\w.]+", text))


@pytest.mark.parametrize("folder", ["checks", "system"])
def test_every_python_test_is_registered(folder):
    names = {path.stem.removeprefix("test_") for path in (TESTS / folder).glob("test_*.py")}
    assert names and names - words(folder) == set()


@pytest.mark.parametrize("folder", ["unit", "support/cpp"])
def test_every_source_is_built(folder):
    names = {path.name for path in (TESTS / folder).glob("*.cpp")}
    assert names and names - words(folder) == set()
