"""Fixtures of the fleet's tests: packages, programs, and hosts to install them on.

The environment variables WZORINST, ZORCTL and SPB name the programs under test.
"""

import os
import shutil

import pytest

from harness.fleet_trials import Fleet, make_package, make_programs


def pytest_collection_modifyitems(items):
    """Skips what needs root, or a program that is missing."""
    missing = [] if os.geteuid() == 0 else ["root"]
    for program in ("ansible-playbook", "/usr/sbin/sshd", "nsenter", "pivot_root"):
        if not shutil.which(program):
            missing.append(program)
    for item in items:
        if missing and "media" in getattr(item, "fixturenames", ()):
            item.add_marker(pytest.mark.skip(reason="needs " + ", ".join(missing)))


# Ends a run of wzorinst that enables the scanners, which is after the extraction, on hosts that ask
# for it.
INTERRUPTION = """
if [ -e /etc/interrupt ] && [ "${1-}" = -enable ]; then
    for process in /proc/[0-9]*; do
        [ "$(cat "$process/comm")" != wzorinst ] || kill -9 "${process#/proc/}"
    done
fi
"""


class Media:
    """What an administrator has on the controller: packages v1 and v2, programs of each version."""

    def __init__(self, directory):
        self.directory = directory
        self.v1 = make_package(directory, "v1")
        control = (directory / "toolkit/bin/trawlcfg").read_text()
        changed = control.replace('\nreceive "$@"\n', '\nreceive "$@"\n' + INTERRUPTION)
        assert changed != control
        self.v2 = make_package(directory, "v2", {"bin/trawlcfg": changed.encode()})
        self.broken = directory / "broken.spb"
        self.broken.write_bytes(self.v2.read_bytes()[:200])
        self.programs = make_programs(directory / "programs")
        self.older = make_programs(directory / "older", b"9.1.")
        self.newer = make_programs(directory / "newer", b"9.3.")


@pytest.fixture(scope="session")
def media(tmp_path_factory):
    return Media(tmp_path_factory.mktemp("media"))


@pytest.fixture
def start_fleet(media):
    """Starts fleets that end with the test."""
    started = []

    def start(count):
        started.append(Fleet(count))
        return started[-1]

    yield start
    for fleet in started:
        fleet.close()
