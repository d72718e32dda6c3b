"""Fixtures of the system tests, and what a failing one prints.

The environment variable WZORINST names the binary under test.
"""

import os
import shlex

import pytest

from harness.machine import Machine


@pytest.fixture(scope="session")
def binary():
    path = os.environ.get("WZORINST")
    if not path:
        pytest.exit("the environment variable WZORINST must name the binary under test", 2)
    return os.path.realpath(path)


@pytest.fixture
def machine(binary):
    """A machine on which nothing is installed, with the toolkit's package at /media/toolkit.spb."""
    fresh = Machine(binary)
    yield fresh
    fresh.delete()


@pytest.hookimpl(hookwrapper=True)
def pytest_runtest_makereport(item, call):
    report = (yield).get_result()
    if report.failed:
        name = str(item.path) + "::" + item.nodeid.split("::", 1)[1]
        report.sections.append(
            (
                "to run this test again",
                shlex.join(
                    [
                        "WZORINST=" + os.path.realpath(os.environ.get("WZORINST", "")),
                        "/usr/bin/python3",
                        "-m",
                        "pytest",
                        "-q",
                        "-p",
                        "no:cacheprovider",
                        name,
                    ]
                ),
            )
        )
