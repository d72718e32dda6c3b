"""Fixtures of the packaging tests.

The environment variable WZORINST names the binary under test, WZOR_BUILD its build directory.
"""

import os
import sys
from pathlib import Path

import pytest

sys.path.insert(0, os.path.join(os.path.dirname(__file__), "../support"))

from machine import Machine  # noqa: E402 (needs the path above)


@pytest.fixture(scope="session")
def tree():
    """The source tree."""
    return Path(__file__).resolve().parents[2]


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
