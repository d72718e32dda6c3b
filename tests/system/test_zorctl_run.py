"""zorctl run: the installer under a lock, on the bytes that were verified."""

import fcntl
import os
import subprocess

import pytest

from harness.checks import printed
from harness.machine import ANN, SPB
from harness.zorctl import zorctl

HOME = "/opt/corvan/zor"
LOGS = "/var/log/zorctl"


@pytest.fixture
def ready(machine):
    """A machine with the tools next to one another, and a place for locks and logs."""
    for path in ("/run", "/var/tmp", "/var/log"):
        machine.make_directory(path)
    with open(os.environ["SPB"], "rb") as file:
        machine.plant("/media/spb", file.read(), 0o755)
    return machine


@pytest.fixture
def signed(ready, tmp_path):
    """A signed package; /media/signers allows its signer."""
    for name in ("key", "other"):
        subprocess.run(
            ["ssh-keygen", "-q", "-t", "ed25519", "-N", "", "-f", tmp_path / name], check=True
        )
    key = (tmp_path / "key.pub").read_text()
    ready.plant("/media/signers", f'maker@example.org namespaces="spb" {key}')
    sign(ready, tmp_path / "key")
    return ready


def sign(machine, key, namespace="spb"):
    package = machine.at(SPB)
    if os.path.exists(package + ".sig"):
        os.unlink(package + ".sig")
    subprocess.run(
        ["ssh-keygen", "-q", "-Y", "sign", "-f", key, "-n", namespace, package],
        check=True,
        stderr=subprocess.DEVNULL,
    )


def logs(machine):
    names = os.listdir(machine.at(LOGS))
    return [machine.read(f"{LOGS}/{name}") for name in sorted(names)]


def nothing_was_done(machine):
    return not machine.exists(HOME) and not machine.exists("/etc/zor")


def test_an_installation_and_its_removal(ready):
    outcome = zorctl(ready, "run", "--", "i", "SHOP", "-s", SPB)

    assert (outcome.status, outcome.stderr) == (0, "")
    assert outcome.stdout.endswith("Installation successful, committing changes\nDone.\n")
    assert "SPB file: /var/tmp/zorctl-" in outcome.stdout
    [log] = logs(ready)
    assert "zorctl: plan: Operation: fresh (global) in /opt/corvan/zor\n" in log
    assert "\nInstallation successful, committing changes\nDone.\n" in log
    assert log.endswith(" zorctl: wzorinst ended with status 0\n")
    assert os.listdir(ready.at("/var/tmp")) == []

    assert zorctl(ready, "run", "r", "SHOP").status == 0
    assert not ready.exists(HOME)


def test_the_log_is_for_root_alone(ready):
    zorctl(ready, "run", "--", "i", "SHOP", "-s", SPB)

    [name] = os.listdir(ready.at(LOGS))
    assert (ready.mode(LOGS), ready.mode(f"{LOGS}/{name}")) == (0o700, 0o600)


def test_an_ordinary_user_has_a_lock_and_a_log_of_its_own(ready):
    outcome = zorctl(ready, "run", "--", "i", "SHOP", "-s", SPB, user=ANN)

    assert (outcome.status, outcome.stderr) == (0, "")
    assert ready.mode("/home/ann/.wzorinst.lock") == 0o600
    assert len(os.listdir(ready.at("/home/ann/.local/state/zorctl"))) == 1


def test_the_installers_failure_is_passed_on(ready):
    ready.let_commands_fail(("common_trace_path", 3))

    outcome = zorctl(ready, "run", "--", "i", "SHOP", "-s", SPB)

    assert outcome.status == 1
    assert outcome.stdout.endswith("Installation failed, rolling back\nDone.\n")


def test_a_package_that_cannot_be_installed_ends_with_65(ready):
    ready.pack({"bin/empty": b""})

    outcome = zorctl(ready, "run", "--", "i", "SHOP", "-s", SPB)

    assert (outcome.status, outcome.stdout) == (65, "")
    assert outcome.stderr.startswith("zorctl: /media/toolkit.spb cannot be installed; see /var/log")
    assert "fails: empty-file: bin/empty: " in logs(ready)[0]
    assert nothing_was_done(ready)


def test_a_missing_package_ends_with_65(ready):
    printed(
        zorctl(ready, "run", "--", "i", "SHOP", "-s", "/media/none"),
        "",
        status=65,
        stderr="zorctl: /media/none: No such file or directory\n",
    )


def test_another_run_that_holds_the_lock_ends_with_75(ready):
    ready.plant("/run/wzorinst.lock")
    with open(ready.at("/run/wzorinst.lock"), "rb") as lock:
        fcntl.flock(lock, fcntl.LOCK_EX)

        outcome = zorctl(ready, "run", "--wait", "0", "--", "i", "SHOP", "-s", SPB)

    printed(outcome, "", status=75, stderr="zorctl: another run holds /run/wzorinst.lock\n")
    assert nothing_was_done(ready)


def test_a_lock_that_flock_made_is_closed_to_other_users(ready):
    ready.plant("/run/wzorinst.lock", b"", 0o644)

    outcome = zorctl(ready, "run", "--", "i", "SHOP", "-s", SPB)

    assert outcome.status == 0
    assert ready.mode("/run/wzorinst.lock") == 0o600


def test_a_link_in_place_of_the_lock_is_not_followed(ready):
    ready.link("/run/wzorinst.lock", "/etc/planted")

    outcome = zorctl(ready, "run", "--", "i", "SHOP", "-s", SPB)

    assert outcome.status == 75
    assert not ready.exists("/etc/planted")


IGNORING_CHILDREN = """
import os, signal, sys
signal.signal(signal.SIGCHLD, signal.SIG_IGN)
os.execv(sys.argv[1], sys.argv[1:])
"""


@pytest.mark.parametrize(
    "caller",
    [
        ("/usr/bin/python3", "-I", "-c", IGNORING_CHILDREN),
        ("/bin/sh", "-c", 'exec "$0" "$@" <&-'),
        ("/bin/sh", "-c", 'exec "$0" "$@" >&-'),
    ],
    ids=["SIGCHLD ignored", "standard input closed", "standard output closed"],
)
def test_it_works_whatever_its_caller_leaves_it(ready, caller):
    installed = zorctl(ready, "run", "--", "i", "SHOP", "-s", SPB, tool=caller)
    removed = zorctl(ready, "run", "--", "r", "SHOP", tool=caller)

    assert (installed.status, removed.status) == (0, 0)
    assert "returned -1" not in logs(ready)[0]
    assert not ready.exists("/etc/zor/zor.ini")


def test_a_signed_package_is_installed(signed):
    outcome = zorctl(signed, "run", "--signers", "/media/signers", "--", "i", "SHOP", "-s", SPB)

    assert (outcome.status, outcome.stderr) == (0, "")
    assert "zorctl: signed by maker@example.org\n" in logs(signed)[0]


def test_the_signature_can_have_another_name(signed):
    os.rename(signed.at(SPB + ".sig"), signed.at("/media/signature"))

    outcome = zorctl(
        signed,
        "run",
        "--signers",
        "/media/signers",
        "--signature",
        "/media/signature",
        "--",
        "i",
        "SHOP",
        "-s",
        SPB,
    )

    assert outcome.status == 0


@pytest.mark.parametrize(
    "spoil",
    [
        lambda machine, keys: machine.remove(SPB + ".sig"),
        lambda machine, keys: machine.plant(SPB + ".sig", b"no signature"),
        lambda machine, keys: machine.plant(SPB, machine.read_bytes(SPB) + b"x"),
        lambda machine, keys: sign(machine, keys / "other"),
        lambda machine, keys: sign(machine, keys / "key", "file"),
    ],
    ids=["none", "damaged", "of other bytes", "by somebody else", "for something else"],
)
def test_without_a_valid_signature_it_ends_with_77(signed, tmp_path, spoil):
    spoil(signed, tmp_path)

    outcome = zorctl(signed, "run", "--signers", "/media/signers", "--", "i", "SHOP", "-s", SPB)

    assert (outcome.status, outcome.stdout) == (77, "")
    assert nothing_was_done(signed)
    assert os.listdir(signed.at("/var/tmp")) == []


def test_a_command_line_that_the_installer_refuses_ends_with_2(ready):
    printed(
        zorctl(ready, "run", "--", "i", "SHOP"),
        "",
        status=2,
        stderr="zorctl: wzorinst would not accept this command line: "
        "Error: an SPB file is required to install or upgrade\n",
    )


def test_what_is_installed_is_what_was_verified(ready):
    """The package is exchanged while it is checked: the copy is installed."""
    ready.plant("/media/spb", b"#!/bin/sh\necho exchanged >/media/toolkit.spb\n", 0o755)

    outcome = zorctl(ready, "run", "--", "i", "SHOP", "-s", SPB)

    assert outcome.status == 0
    assert ready.read(SPB) == "exchanged\n"
    assert ready.exists(HOME + "/bin/trawlcfg")


def test_a_daemon_that_a_command_leaves_keeps_neither_the_lock_nor_the_run(ready):
    program = ready.read_bytes(SPB)  # the toolkit's scanner control, with a daemon
    from harness import toolkit  # pylint: disable=import-outside-toplevel

    control = toolkit.SCANNER_PROGRAM.replace(b"#!/bin/sh\n", b"#!/bin/sh\nsleep 60 &\n", 1)
    ready.pack({"bin/trawlcfg": control})
    assert ready.read_bytes(SPB) != program

    outcome = zorctl(ready, "run", "--", "i", "SHOP", "-s", SPB)
    again = zorctl(ready, "run", "--wait", "0", "--", "i", "DESK", "-s", SPB)

    assert (outcome.status, again.status) == (0, 0)
