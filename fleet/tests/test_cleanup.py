"""Nothing is left of a fleet, whenever it is interrupted.

The environment variable WZOR_MOMENTS says how many moments are tried.
"""

import contextlib
import os
import random
import select
import signal
import subprocess
import uuid
from pathlib import Path

import pytest

from harness import REPOSITORY

MOMENTS = int(os.environ.get("WZOR_MOMENTS", "1"))
LONGEST = 8.0  # seconds, about what the command below takes
SEED = 20221202

PLAY = """
- hosts: all
  gather_facts: false
  tasks:
    - corvan.zor.toolkit:
        exploiter: SHOP
        spb: {0.v1}
        programs: {0.programs}
"""


def ours(mark):
    """Handles of all processes whose environment holds `mark`, or whose command line does."""
    found = []
    for process in Path("/proc").glob("[0-9]*"):
        with contextlib.suppress(OSError):
            content = (process / "environ").read_bytes() + (process / "cmdline").read_bytes()
            if mark.encode() in content:
                found.append(os.pidfd_open(int(process.name)))
    return found


@pytest.mark.parametrize("moment", range(MOMENTS))
@pytest.mark.parametrize("number", [signal.SIGINT, signal.SIGTERM, signal.SIGKILL])
def test_nothing_is_left_after_a_signal(media, tmp_path, number, moment):
    mark = uuid.uuid4().hex
    directory = tmp_path / mark[:8]
    playbook = tmp_path / "playbook.yml"
    playbook.write_text(PLAY.format(media))
    line = [REPOSITORY / "fleet/hosts", "run", "--directory", directory, "3"]
    process = subprocess.Popen(
        [*line, "--", "ansible-playbook", playbook],
        env={**os.environ, "MARK": mark},
        start_new_session=True,
        stdout=subprocess.DEVNULL,
        stderr=subprocess.DEVNULL,
    )
    with contextlib.suppress(subprocess.TimeoutExpired):
        process.wait(timeout=random.Random(SEED + moment).uniform(0, LONGEST))

    if number == signal.SIGINT:
        with contextlib.suppress(ProcessLookupError):  # it is done already
            os.killpg(process.pid, number)  # as the terminal does
    else:
        process.send_signal(number)
    process.wait()

    for handle in ours(mark):
        assert select.select([handle], [], [], 60)[0], "a process goes on"
        os.close(handle)
    assert not ours(mark)
    assert str(directory) not in Path("/proc/mounts").read_text("ascii")
    assert not directory.exists() or number == signal.SIGKILL
