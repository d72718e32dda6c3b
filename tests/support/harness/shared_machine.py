"""A machine that several users share, each with a real user id: one of them is an attacker.

`Machine` maps a single user id into its sandbox, so there all files belong to the user who runs
the program. Here the ids are the host's own, and what one user may do to another's files is up to
the kernel. That needs a test that runs as root; `why_not()` gives the reason where it cannot.
"""

import os
import stat
import subprocess
import sys
import traceback
from dataclasses import dataclass

from harness import bubblewrap
from harness.machine import BINARY, ROOT, Machine, Outcome, User, as_text

ANN = User(1000, "ann", "/home/ann", None)
# The attacker: an ordinary user, in no group but a group of that user's own.
GUEST = User(2000, "guest", "/home/guest", None)

# A run that takes longer hangs: an undisturbed one takes a small fraction of a second.
TIME_LIMIT = 20

HANGS = "the run hangs"

# What the attacks aim at. No run of the installer has any reason to touch it.
SECRET = "/etc/secret"
KEY = "/etc/secret/key"
SHADOW = "/etc/shadow"
HER_OWN = "/home/ann/private"
HER_LETTER = "/home/ann/private/letter"
NOTHING = "/etc/nothing"

# Where an attack leaves its traces, unless a test says otherwise.
OUTSIDE = ("/etc", "/home", "/root", "/srv", "/tmp")


def why_not():
    """Why tests with several users cannot run here, or None."""
    if os.geteuid() != 0:
        return "needs root: the attacker has a user id of his own"
    for table in ("/proc/self/uid_map", "/proc/self/gid_map"):
        with open(table, encoding="ascii") as file:
            ranges = [[int(number) for number in line.split()] for line in file]
        for user in (ANN, GUEST):
            if not any(first <= user.uid < first + count for first, _, count in ranges):
                return f"user id {user.uid} does not exist in this user namespace"
    return None


@dataclass(frozen=True)
class Thing:
    """One name of a machine. `content` is a file's bytes, a link's target or a device's number."""

    kind: str
    mode: int
    uid: int
    gid: int
    content: bytes = b""

    def __str__(self):
        return f"{self.kind} {self.mode:04o} {self.uid}:{self.gid} {self.content!r}"


class SharedMachine(Machine):
    """A machine on which root, ANN and GUEST each own what is theirs."""

    def __init__(self, binary):
        super().__init__(binary)
        self.maps_users = False
        for user in (ANN, GUEST):
            self.make_directory(user.home)
            os.chown(self.at(user.home), user.uid, user.uid)
        self.make_directory("/srv")
        self.plant(KEY, "the key\n", 0o600)
        self.plant(SECRET + "/sub/deep", "deep\n", 0o600)
        self.change_mode(SECRET, 0o700)
        self.plant(SHADOW, "root:secret:1::::::\n", 0o600)
        self.as_user(ANN, lambda: self.plant(HER_LETTER, "dear guest,\n", 0o600))
        self.as_user(ANN, lambda: self.change_mode(HER_OWN, 0o700))

    def write_users(self, root_home="/root"):
        bubblewrap.write_users(
            self.root,
            [("root", 0, root_home)] + [(user.name, user.uid, user.home) for user in (ANN, GUEST)],
        )

    # Planting.

    def as_user(self, user, act):
        """Calls `act` in a process of `user`, which has no more rights than that user."""
        child = os.fork()
        if child == 0:
            os._exit(self.act_as(user, act))  # pylint: disable=protected-access
        _, status = os.waitpid(child, 0)
        assert status == 0, f"{user.name} could not do this"

    @staticmethod
    def act_as(user, act):
        try:
            os.umask(0o022)
            os.setgroups([])
            os.setresgid(user.uid, user.uid, user.uid)
            os.setresuid(user.uid, user.uid, user.uid)
            act()
            return 0
        except BaseException:  # pylint: disable=broad-exception-caught
            # Whatever it is, the child must not go on as a second pytest.
            traceback.print_exc(file=sys.stderr)
            sys.stderr.flush()
            return 1

    def link_as(self, user, path, target):
        """Makes a symbolic link of `user`, in a directory where that user may do so."""
        self.as_user(user, lambda: os.symlink(target, self.at(path)))

    def fifo_as(self, user, path):
        """Makes a FIFO of `user` that everybody may open."""

        def make():
            os.mkfifo(self.at(path))
            os.chmod(self.at(path), 0o666)

        self.as_user(user, make)

    def give_to(self, user, path):
        """Makes `user` the owner of `path`; a link's own owner, not its target's."""
        os.chown(self.at(path), user.uid, user.uid, follow_symlinks=False)

    # Running.

    def execute(self, command, user, umask, environment, options, everywhere):
        """As in Machine; `everywhere` has no meaning here. A run that hangs is ended."""
        if user is not ROOT:
            command = [
                "setpriv",
                f"--reuid={user.uid}",
                f"--regid={user.uid}",
                "--clear-groups",
                "--inh-caps=-all",
                "--",
                *command,
            ]
        return self.execute_as_root(command, user.home, umask, environment, options)

    def execute_as_root(
        self, command, home, umask=0o022, environment=None, options=(), maps_users=False
    ):
        """Runs `command` as root, by default of the host."""
        before = len(self.logged_commands())
        line = bubblewrap.command_line(
            self.root,
            command,
            uid=0,
            environment=bubblewrap.environment_of(home, environment),
            read_only={BINARY: self.binary},
            options=options,
            maps_users=maps_users,
        )
        try:
            done = subprocess.run(
                line,
                stdin=subprocess.DEVNULL,
                capture_output=True,
                check=False,
                umask=umask,
                timeout=TIME_LIMIT,
            )
        except subprocess.TimeoutExpired as expired:
            raise AssertionError(
                f"{HANGS}, after this output:\n{as_text(expired.stdout or b'')}"
            ) from None
        return Outcome(
            as_text(done.stdout),
            as_text(done.stderr),
            done.returncode,
            self.logged_commands()[before:],
        )

    def run_in_namespace(self, *arguments):
        """Runs wzorinst as root of a user namespace that maps root alone."""
        return self.execute_as_root([BINARY, *arguments], ROOT.home, maps_users=True)

    # Inspecting.

    def state(self, *places, without=()):
        """Everything at and below `places`: path to `Thing`. `without` names what is left out."""
        found = {}
        for place in places:
            if os.path.lexists(self.at(place)):
                self.collect_state(place, found, without)
        return found

    def collect_state(self, path, found, without):
        if path in without:
            return
        host = self.at(path)
        status = os.lstat(host)
        kind, content = kind_and_content(host, status)
        found[path] = Thing(
            kind, stat.S_IMODE(status.st_mode), status.st_uid, status.st_gid, content
        )
        if kind == "d":
            for name in sorted(os.listdir(host)):
                self.collect_state(path.rstrip("/") + "/" + name, found, without)

    def owner(self, path):
        return os.lstat(self.at(path)).st_uid


def kind_and_content(host, status):
    if stat.S_ISLNK(status.st_mode):
        return "l", os.fsencode(os.readlink(host))
    if stat.S_ISDIR(status.st_mode):
        return "d", b""
    if stat.S_ISREG(status.st_mode):
        with open(host, "rb") as file:
            return "f", file.read()
    return "p" if stat.S_ISFIFO(status.st_mode) else "other", b""


def same_state(actual, expected, what="what is outside"):
    """Compares two results of `SharedMachine.state`."""
    lines = [
        f"{path}\n    before: {expected.get(path, 'nothing')}\n    after:  "
        f"{actual.get(path, 'nothing')}\n"
        for path in sorted(set(actual) | set(expected))
        if actual.get(path) != expected.get(path)
    ]
    if lines:
        raise AssertionError(f"\n{what} has changed:\n" + "".join(lines))
