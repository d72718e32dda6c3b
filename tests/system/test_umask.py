"""The process umask does not affect what an installation leaves behind."""

import pytest

from harness.checks import same_text
from harness.installations import ANNS_TREE, SHARED_TREE
from harness.machine import ANN, SPB

UMASKS = pytest.mark.parametrize(
    "umask", [0o000, 0o022, 0o077, 0o777], ids=["000", "022", "077", "777"]
)

REPORTING_SCANNER_CONTROL = b'#!/bin/sh\necho "$1 $(umask)" >>/var/scanners/umasks\n'


@UMASKS
def test_a_shared_installation_has_the_same_modes(machine, umask):
    assert machine.run("i", "ABC", "-s", SPB, umask=umask).status == 0

    same_text(machine.listing("/etc", "/opt", "/usr/kel"), SHARED_TREE)


@UMASKS
def test_a_per_user_installation_has_the_same_modes(machine, umask):
    assert machine.run("i", "ABC", "-s", SPB, user=ANN, umask=umask).status == 0

    same_text(machine.listing("/home/ann"), ANNS_TREE)


@UMASKS
def test_every_directory_on_the_way_to_a_directory_entry_gets_the_packages_mode(machine, umask):
    machine.pack({"bin/etc/trawlhw/deep/": b"", "install/a/b/": b""})

    assert machine.run("i", "ABC", "-s", SPB, umask=umask).status == 0

    assert machine.mode("/opt/corvan/zor/bin/etc/trawlhw/deep") == 0o755
    assert machine.mode("/opt/corvan/zor/install/a") == 0o750
    assert machine.mode("/opt/corvan/zor/install/a/b") == 0o750


@UMASKS
def test_commands_run_under_the_umask_of_the_process(machine, umask):
    machine.pack({"bin/trawlcfg": REPORTING_SCANNER_CONTROL})
    machine.plant("/var/scanners/umasks", "", 0o666)

    assert machine.run("i", "ABC", "-s", SPB, umask=umask).status == 0

    assert machine.read("/var/scanners/umasks") == f"-s {umask:04o}\n"


@pytest.mark.parametrize("umask, mode", [(0o000, 0o666), (0o022, 0o644), (0o077, 0o600)])
def test_the_registry_of_a_failed_run_has_the_mode_of_the_process_umask(machine, umask, mode):
    machine.let_commands_fail(("common_trace_path", 1))

    machine.run("i", "ABC", "-s", SPB, "-norollback", umask=umask)

    assert machine.mode("/etc/zor/zor.ini") == mode


@pytest.mark.parametrize("umask, mode", [(0o000, 0o666), (0o022, 0o644), (0o077, 0o600)])
def test_the_log_file_has_the_mode_of_the_process_umask(machine, umask, mode):
    machine.run("r", "ABC", "-o", "/tmp/log", umask=umask)

    assert machine.mode("/tmp/log") == mode


@UMASKS
def test_a_reinstallation_has_the_same_modes_again(machine, umask):
    assert machine.run("i", "ABC", "-s", SPB).status == 0
    machine.remove("/opt/corvan/zor/bin/etc")
    machine.remove("/usr/kel")

    assert machine.run("i", "ABC", "-s", SPB, umask=umask).status == 0

    assert machine.mode("/opt/corvan/zor/bin/trawlcfg") == 0o755
    assert machine.mode("/opt/corvan/zor/properties") == 0o755
    assert machine.mode("/opt/corvan/zor/ZOR_files") == 0o644
    assert machine.mode("/etc/zor/zor.ini") == 0o644
    assert machine.mode("/usr/kel") == 0o777
    assert machine.mode("/usr/kel/corvan/common/ZOR/logs") == 0o777
