"""The model of the random lives: what an action must do, from the history alone.

A life takes place on one machine with two places: the shared installation of root and the one of
the user ann. For each place the model holds the `Record` that its registry must contain.
Everything else that an action depends on it reads from the tree as it was before the action.
"""

import re
from dataclasses import dataclass, replace

from harness import toolkit
from harness.machine import ANN, ROOT, User

OWN_VERSION = (9, 2, 30, 0)
OWN_DATE = "22/12/02"

# The packages of the lives: what differs from the toolkit, what is left out, and whether its
# extraction succeeds. None for the first two means a file that is not an archive.
EMPTY = b""
PACKAGES = {
    "the toolkit": ({}, (), True),
    "another build": (
        {
            "bin/trawlhw": b"another hardware scanner",
            "bin/extra": b"extra",
            "properties/more.properties": b"more=1\n",
            "config/xss/other.xss": b"<other/>\n",
        },
        (),
        True,
    ),
    "one without scripts": ({}, ("install/trawlcfg.sh", "install/rmdirs.sh"), True),
    "one without scanner control": ({}, ("bin/trawlcfg",), True),
    "one without Zor.properties": ({}, ("config/Zor.properties",), True),
    "one without ZorTrace.properties": ({}, ("config/ZorTrace.properties",), True),
    "one with an empty file in bin": ({"bin/empty": EMPTY}, (), False),
    "one with an empty file in properties": ({"properties/empty": EMPTY}, (), False),
    "one with an empty file in install": ({"install/empty": EMPTY}, (), False),
    "no archive": (None, None, False),
}

# Files that are copied unchanged and never edited afterwards.
UNEDITED = re.compile(r"^(bin/|properties/|config/xss/|config/ZorHWConfig.xml)")

OWN_FILES = ("bin/libzor.so", "config/Zor.tmp", "config/SingleUserMode", "zor.log", "zor.log.bak")


@dataclass(frozen=True)
class Record:
    """What a registry holds."""

    version: tuple
    date: str
    home: str
    exploiters: str

    def text(self):
        return (
            "ZOR_Version = {}.{}.{}.{:04}\n".format(*self.version)
            + f"ZOR_BuildDate = {self.date}\n"
            f"ZOR_HomeDirectory = {self.home}\n"
            f"ZOR_Exploiters = {self.exploiters}\n"
            f"ZOR_ConfigRootDirectory = {self.home}\n"
        )

    def is_not_newer(self):
        """Whether files of the installer's own version are deployed over this installation."""
        return self.version < OWN_VERSION or (self.version == OWN_VERSION and self.date <= OWN_DATE)

    def knows(self, exploiter):
        return exploiter in self.exploiters.split(":")


@dataclass
class Place:
    """One of the two installations, and the directories that its lives use."""

    user: User
    registry: str
    homes: tuple
    private: str
    traces: str
    record: Record | None = None

    @property
    def is_shared(self):
        return self.user is ROOT


def places():
    return [
        Place(
            ROOT,
            "/etc/zor/zor.ini",
            ("/opt/corvan/zor", "/opt/my zor"),
            "/opt/private",
            "/opt/traces/zor",
        ),
        Place(
            ANN,
            "/home/ann/.zor/zor.ini",
            ("/home/ann/corvan/zor", "/home/ann/zor"),
            "/home/ann/private",
            "/home/ann/traces/zor",
        ),
    ]


class Package:
    """One of PACKAGES, by its name."""

    def __init__(self, name):
        self.name = name
        changes, without, self.is_extractable = PACKAGES[name]
        self.files = {}
        self.content = b"no archive"
        if changes is not None:
            self.files = {
                n: d
                for n, d in {**toolkit.FILES, **changes}.items()
                if not n.endswith("/") and n not in without
            }
            self.content = toolkit.package(changes, without)


def is_file(tree, path):
    return path in tree and tree[path].kind == "f"


def find_record(place, tree):
    """The record a run works with, and whether its scanner control must be repaired."""
    record = place.record
    if record is None or record.home not in tree:
        return None, False
    control = tree.get(record.home + "/bin/trawlcfg")
    return record, control is None or control.content == b""


@dataclass(frozen=True)
class Installation:
    """What `i` must do. `failure` is None, "early" or, with the registry saved, "late"."""

    kind: str
    home: str
    failure: str | None
    record: Record | None

    @property
    def deploys(self):
        return self.kind != "registration"


def expect_installation(place, tree, package, exploiter, options, directory, failures):
    """What installing `package` must do on a machine with `tree`."""
    record, is_broken = find_record(place, tree)
    if record is None:
        home = directory or place.homes[0]
        failure = expect_fresh_failure(place, tree, package, home, options, failures)
        exploiters = ":" if "-n" in options else exploiter + ":"
        return Installation("fresh", home, failure, Record(OWN_VERSION, OWN_DATE, home, exploiters))

    if is_broken:
        record = replace(record, version=OWN_VERSION)
    if record.is_not_newer():
        kind, failure = "upgrade", expect_upgrade_failure(tree, package, record.home)
        changed = replace(record, version=OWN_VERSION)
    else:
        kind, failure, changed = "registration", None, record
    if not record.knows(exploiter) and "-n" not in options:
        changed = replace(changed, exploiters=record.exploiters + exploiter + ":")
    if OWN_DATE > record.date:
        changed = replace(changed, date=OWN_DATE)
    if kind == "registration" and changed == record:
        changed = place.record  # nothing to save: a version lowered for the repair is forgotten
    return Installation(kind, record.home, failure, changed)


def expect_fresh_failure(place, tree, package, home, options, failures):
    def has(name):
        return name in package.files or is_file(tree, f"{home}/{name}")

    if not (
        package.is_extractable
        and has("config/Zor.properties")
        and has("config/ZorTrace.properties")
    ):
        return "early"
    if place.is_shared or "-c" in options:
        control = tree.get(home + "/bin/trawlcfg")
        works = "bin/trawlcfg" in package.files or (control and control.content)
        if not works or "common_trace_path" in failures:
            return "late"
    return None


def expect_upgrade_failure(tree, package, home):
    works = (
        package.is_extractable
        and is_file(tree, home + "/config/Zor.properties")
        and (
            "config/ZorTrace.properties" in package.files
            or is_file(tree, home + "/config/ZorTrace.properties")
        )
    )
    return None if works else "early"


@dataclass(frozen=True)
class Removal:
    """What `r` must do: whether an installation is found and whether it is deleted."""

    found: bool
    deletes: bool
    record: Record | None


def expect_removal(place, tree, exploiter):
    record, is_broken = find_record(place, tree)
    if record is None or is_broken:
        return Removal(False, False, place.record)
    if not record.knows(exploiter) and record.exploiters != ":":
        return Removal(True, False, record)
    before, found, after = record.exploiters.partition(exploiter + ":")
    if found and ":" in before + after:
        return Removal(True, False, replace(record, exploiters=before + after))
    return Removal(True, True, None)


def expect_index(before, package, expected, options):
    """The path lines of the index after an installation that succeeds; `before` is its text."""
    lines = [line for line in before.splitlines() if line and not line.startswith("#")]
    if expected.deploys:
        found = set(lines) | {
            f"{expected.home}/{name}"
            for name in package.files
            if expected.kind == "fresh" or name != "config/Zor.properties"
        }
        found |= {f"{expected.home}/{name}" for name in OWN_FILES}
        lines = sorted(found)
    if expected.kind == "fresh":
        lines.append(expected.home + "/install/zor_install.properties")
    if "-r" in options:
        lines.append(expected.home + "/config/SingleUserMode")
    return lines
