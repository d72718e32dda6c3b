"""Every test file is run, for a limited time.

A new file that its CMakeLists.txt does not name would never fail, and a test that hangs would hold
up everything. The environment variable WZOR_BUILD names the build directory.
"""

import json
import os
import re
import subprocess

import pytest

from harness import REPOSITORY

TESTS = REPOSITORY / "tests"


def words(folder):
    text = (TESTS / folder / "CMakeLists.txt").read_text()
    return set(re.findall(r"[\w.]+", text))


@pytest.mark.parametrize("folder", ["checks", "system", "../fleet/tests"])
def test_every_python_test_is_registered(folder):
    names = {path.stem.removeprefix("test_") for path in (TESTS / folder).glob("test_*.py")}
    assert names and names - words(folder) == set()


@pytest.mark.parametrize("folder", ["unit", "support/cpp"])
def test_every_source_is_built(folder):
    names = {path.name for path in (TESTS / folder).glob("*.cpp")}
    assert names and names - words(folder) == set()


def test_every_test_has_a_time_limit():
    shown = subprocess.run(
        ["ctest", "--show-only=json-v1"],
        cwd=os.environ["WZOR_BUILD"],
        capture_output=True,
        check=True,
    ).stdout
    tests = json.loads(shown)["tests"]
    limited = {
        test["name"]
        for test in tests
        if any(each["name"] == "TIMEOUT" for each in test["properties"])
    }
    assert tests and {test["name"] for test in tests} - limited == set()
