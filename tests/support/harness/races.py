"""Races between a run of the installer as root and an attacker who changes names meanwhile.

The machine of a `Race` is set up once. Each round gets a copy of that machine, starts the attacker
(tests/support/cpp/race_attacker.cpp) with a user id of its own, runs the installer once, and looks
at what the attacker could not have changed alone: if it has changed, the attacker has won.
"""

import contextlib
import copy
import math
import os
import shutil
import signal
import subprocess
import tempfile
from dataclasses import dataclass
from typing import Callable

from harness import bubblewrap
from harness.attacks import BIN_ETC, HOME, PROBE, prepare
from harness.machine import BINARY, ROOT, SPB
from harness.shared_machine import GUEST, HANGS, OUTSIDE, SECRET, SharedMachine

CACHE = HOME + "/cache_data"
CUSTOM = HOME + "/bin/customscanners"
LIBRARY = HOME + "/bin/libbig.so"
SETTING = "/etc/kel/corvan/common/cfg/log.properties"
BOARD = "/srv/board"
GUESTS = "/home/guest"

# Names that a directory of the attacker and one of the administrator have in common.
NAMES = [f"name{number:03}" for number in range(200)]

# The attacker's own places, and those in which the installer works.
NOT_LOOKED_AT = (GUESTS, "/tmp/moved", "/etc/zor", "/etc/kel")

# Of 1,000 defects that let the attacker win one round in N, about one survives 7 N rounds.
ROUNDS_PER_WIN = 7


# Half a millisecond, so that the attacker finds time between two calls of the installer.
DELAY = "strace -qq -o /dev/null -e trace={0} -e inject={0}:delay_enter=500"


@dataclass(frozen=True)
class Race:
    """One race.

    `win_rate` is the share of 50 rounds that the attacker won, on two busy processors, against a
    version that handed its paths to the system as text.
    """

    name: str
    title: str
    win_rate: float
    prepare: Callable
    attack: tuple  # the attacker's command line, paths of the machine
    command: tuple  # the installer's
    stolen: str = ""  # the file that must not hold what the attacker writes
    attackers: int = 1
    delayed: str = ""  # a system call before which strace makes the installer wait

    @property
    def program(self):
        """The installer's command line on the machine."""
        return [
            *(DELAY.format(self.delayed).split() if self.delayed else ()),
            BINARY,
            *self.command,
        ]

    @property
    def rounds(self):
        return math.ceil(ROUNDS_PER_WIN / self.win_rate)


@dataclass
class Result:
    """Rounds run, the numbers of those that the attacker won, and what the last win changed."""

    race: Race
    rounds: int = 0
    wins: int = 0
    damage: str = ""


# What the races begin with.


def as_guest(machine, act, *paths):
    machine.as_user(GUEST, lambda: [act(machine.at(path)) for path in paths])


def fill(machine, directory):
    """Makes a directory with a file for each of NAMES."""
    os.makedirs(machine.at(directory), exist_ok=True)
    for name in NAMES:
        with open(machine.at(f"{directory}/{name}"), "w", encoding="ascii") as file:
            file.write("kept\n")


def cache_of_the_guest(machine):
    """In the cache, the guest has a directory like one of root's."""
    fill(machine, SECRET + "/names")
    machine.as_user(GUEST, lambda: fill(machine, CACHE + "/dir"))
    machine.link_as(GUEST, GUESTS + "/link", SECRET + "/names")


def upgrade_with_cache(machine):
    prepare(machine, "upgrade")
    cache_of_the_guest(machine)


def removal_with_cache(machine):
    prepare(machine, "removal")
    cache_of_the_guest(machine)


def upgrade_with_deep_cache(machine):
    """As above, a level deeper.

    Where the directory is moved to, others have files whose names are next to it in the cache.
    """
    prepare(machine, "upgrade")
    fill(machine, SECRET + "/names")
    fill(machine, "/tmp")
    machine.as_user(GUEST, lambda: fill(machine, CACHE + "/top"))
    machine.as_user(GUEST, lambda: fill(machine, CACHE + "/top/dir"))


SCANNERS = [f"site{number}.sh" for number in range(8)]
CUSTOM_FILES = {
    "bin/customscanners/": b"",
    **{f"bin/customscanners/{name}": b"echo site\n" for name in SCANNERS},
}


def upgrade_with_custom_scanners(machine):
    machine.pack(CUSTOM_FILES)
    prepare(machine, "upgrade")


def upgrade_with_scanners_below(machine):
    machine.pack({**CUSTOM_FILES, "bin/customscanners/sub/run.sh": b"run\n"})
    machine.make_directory(CUSTOM + "/sub")
    prepare(machine, "upgrade")
    as_guest(machine, os.mkdir, GUESTS + "/dir")
    machine.link_as(GUEST, GUESTS + "/link", SECRET)
    os.rename(machine.at(GUESTS + "/dir"), machine.at(CUSTOM + "/guests"))
    machine.remove(CUSTOM + "/sub")
    os.rename(machine.at(CUSTOM + "/guests"), machine.at(CUSTOM + "/sub"))


def big_package(machine):
    """A package with a file that is not written in an instant; its directory exists."""
    machine.pack({"bin/libbig.so": b"\x7fELF" + bytes(range(256)) * 8192})
    machine.make_directory(HOME + "/bin")


def directory_of_the_setting(machine):
    machine.make_directory(os.path.dirname(SETTING))


def board_of_all(machine):
    machine.plant(BOARD, "to all\n", 0o666)


def hard_links_in_bin_etc(machine):
    prepare(machine, "registration")
    board_of_all(machine)
    for name in ("trawlfs", "trawlhw", "trawlsw"):
        own = machine.at(f"{BIN_ETC}/{name}")
        machine.as_user(GUEST, lambda own=own: open(own, "w", encoding="ascii").close())
        machine.as_user(
            GUEST, lambda name=name: os.link(machine.at(BOARD), machine.at(f"{GUESTS}/{name}"))
        )


def hard_link_at_the_probe(machine):
    prepare(machine, "registration")
    board_of_all(machine)
    machine.give_to(GUEST, HOME)
    machine.as_user(GUEST, lambda: open(machine.at(PROBE), "w", encoding="ascii").close())
    machine.as_user(GUEST, lambda: os.link(machine.at(BOARD), machine.at(GUESTS + "/probe")))


def directory_in_bin_etc(machine):
    prepare(machine, "registration")
    as_guest(machine, os.mkdir, BIN_ETC + "/trawlfs")
    machine.link_as(GUEST, GUESTS + "/link", SECRET)


def common_directory_of_the_guest(machine):
    prepare(machine, "registration")
    machine.remove("/usr/kel/corvan")
    as_guest(machine, os.mkdir, "/usr/kel/corvan")
    machine.link_as(GUEST, GUESTS + "/link", SECRET)


UPGRADE = ("i", "XYZ", "-s", SPB)

RACES = (
    Race(
        "swap-upgrade",
        "a directory of the cache is swapped for a link while an upgrade deletes it",
        0.82,
        upgrade_with_cache,
        ("exchange-opened", CACHE + "/dir", GUESTS + "/link"),
        UPGRADE,
    ),
    Race(
        "swap-removal",
        "the same while a removal deletes it",
        0.68,
        removal_with_cache,
        ("exchange-opened", CACHE + "/dir", GUESTS + "/link"),
        ("r", "ABC"),
    ),
    Race(
        "swap-always",
        "the same, swapped from the start",
        0.20,  # of 10 rounds against a removal that enters directories through links
        upgrade_with_cache,
        ("exchange", CACHE + "/dir", GUESTS + "/link"),
        UPGRADE,
        delayed="openat",
    ),
    Race(
        "move",
        "a directory of the cache is moved out of the tree, and a link takes its place",
        0.86,
        upgrade_with_deep_cache,
        ("move", CACHE + "/top/dir", "/tmp/moved", SECRET + "/names"),
        UPGRADE,
    ),
    Race(
        "plant",
        "a link is planted between a file's backup and its creation",
        0.14,
        upgrade_with_custom_scanners,
        ("plant", SECRET + "/new", *(f"{CUSTOM}/{name}" for name in SCANNERS)),
        UPGRADE,
        attackers=3,
    ),
    Race(
        "below",
        "a directory under which the package has a file is swapped for a link",
        0.54,
        upgrade_with_scanners_below,
        ("exchange", CUSTOM + "/sub", GUESTS + "/link"),
        UPGRADE,
    ),
    Race(
        "hold-file",
        "a file of the package is opened while it is written",
        0.30,
        big_package,
        ("hold", LIBRARY),
        ("i", "ABC", "-s", SPB),
        LIBRARY,
        attackers=3,
    ),
    Race(
        "hold-setting",
        "log.properties is opened while it is written",
        0.24,
        directory_of_the_setting,
        ("hold", SETTING, SETTING + ".wzorinst-new"),
        ("i", "ABC", "-s", SPB),
        SETTING,
        attackers=3,
    ),
    Race(
        "hard-link-mode",
        "files below bin/etc are swapped for hard links while modes are set",
        0.84,
        hard_links_in_bin_etc,
        ("exchange",)
        + tuple(
            f"{place}/{name}"
            for name in ("trawlfs", "trawlhw", "trawlsw")
            for place in (BIN_ETC, GUESTS)
        ),
        UPGRADE,
    ),
    Race(
        "hard-link-probe",
        "the probe is swapped for a hard link",
        0.46,
        hard_link_at_the_probe,
        ("exchange", PROBE, GUESTS + "/probe"),
        UPGRADE,
    ),
    Race(
        "mode",
        "a directory below bin/etc is swapped for a link while modes are set",
        0.54,
        directory_in_bin_etc,
        ("exchange", BIN_ETC + "/trawlfs", GUESTS + "/link"),
        UPGRADE,
    ),
    Race(
        "common",
        "the common directory is swapped for a link while directories are made below it",
        0.68,
        common_directory_of_the_guest,
        ("exchange", "/usr/kel/corvan", GUESTS + "/link"),
        UPGRADE,
    ),
)


# Running.


@contextlib.contextmanager
def attack(command):
    """Runs an attacker's `command` from the moment it is ready."""
    with subprocess.Popen(
        command,
        stdout=subprocess.PIPE,
        user=GUEST.uid,
        group=GUEST.uid,
        extra_groups=[],
        cwd="/",
    ) as attacker:
        try:
            assert attacker.stdout.readline() == b"ready\n", "the attacker cannot begin"
            yield
        finally:
            attacker.send_signal(signal.SIGTERM)
            attacker.wait()


class Course:
    """Where one race is run; use it by `with`."""

    def __init__(self, race, binary, attacker):
        self.race = race
        self.attacker = attacker
        self.prepared = SharedMachine(binary)
        race.prepare(self.prepared)

    def __enter__(self):
        return self

    def __exit__(self, *_):
        bubblewrap.delete_root(self.prepared.root)

    def run(self, rounds):
        result = Result(self.race)
        before = self.outside(self.prepared)
        for _ in range(rounds):
            damage = self.round(before)
            result.rounds += 1
            if damage:
                result.wins += 1
                result.damage = damage
        return result

    def round(self, before):
        """Runs one round; returns what the attacker has achieved, or an empty text."""
        machine = copy.copy(self.prepared)
        place = tempfile.mkdtemp(prefix="wzorinst-race-")
        machine.root = os.path.join(place, "root")
        try:
            os.chmod(place, 0o755)
            subprocess.run(["cp", "-a", self.prepared.root, machine.root], check=True)
            hangs = self.contend(machine, shutil.copy(self.attacker, place))
            return hangs or self.damage(before, machine)
        finally:
            shutil.rmtree(place)

    def contend(self, machine, attacker):
        """Runs the installer against `attacker`, a copy that its user can reach."""
        mode, *paths = self.race.attack
        # The target of a link is a path of the machine, all others are used on the host.
        keeps = {"plant": 0, "move": 2}.get(mode)
        paths = [path if i == keeps else machine.at(path) for i, path in enumerate(paths)]
        with contextlib.ExitStack() as attackers:
            for _ in range(self.race.attackers):
                attackers.enter_context(attack([attacker, mode, *paths]))
            try:
                machine.execute(self.race.program, ROOT, 0o022, None, (), False)
            except AssertionError as failure:
                if HANGS not in str(failure):
                    raise
                return HANGS
        return ""

    def outside(self, machine):
        return machine.state(*OUTSIDE, without=NOT_LOOKED_AT)

    def damage(self, before, machine):
        after = self.outside(machine)
        changed = [p for p in {**before, **after} if before.get(p) != after.get(p)]
        if self.race.stolen and machine.exists(self.race.stolen):
            if machine.read_bytes(self.race.stolen).startswith(b"stolen"):
                changed.append(self.race.stolen)
        return ", ".join(sorted(changed)[:3])
