"""Fixtures of the packaging tests.

The environment variable WZORINST names the binary under test, WZOR_BUILD its build directory.
"""

import os
from pathlib import Path

import pytest

from harness import REPOSITORY
from harness.machine import Machine


@pytest.fixture(scope="session")
def tree():
    """The source tree."""
    return REPOSITORY


@pytest.fixture(scope="session")
def build():
    return Path(os.environ["WZOR_BUILD"]).resolve()


@pytest.fixture(scope="session")
def binary():
    return Path(os.environ["WZORINST"]).resolve()


@pytest.fixture
def machine(binary):
    """A machine on which nothing is installed, with the toolkit's package at /media/toolkit.spb."""
    fresh = Machine(binary)
    yield fresh
    fresh.delete()
