"""Every state that corvan.zor.toolkit may find, what is asked of it there, and what it answers.

Each is tried on a host of its own. `begin` are calls of the module that lead to the state, and
`prepare` a command of the shell afterwards. A text "@NAME" stands for that file of the media.

The states of SAMPLE are tried unless the environment variable WZOR_STATES is "all".
"""

import os
from dataclasses import dataclass, field

HOME = "/opt/corvan/zor"
ABSENT = {
    "health": "absent",
    "version": None,
    "build_date": None,
    "home": None,
    "single_user_mode": None,
    "exploiters": [],
}
INTACT = {
    "health": "intact",
    "version": "9.2.30.0000",
    "build_date": "22/12/02",
    "home": HOME,
    "single_user_mode": False,
    "exploiters": ["SHOP"],
}
OLDER = {**INTACT, "version": "9.1.30.0000"}
NEWER = {**INTACT, "version": "9.3.30.0000"}
BOTH = ["DESK", "SHOP"]


@dataclass
class State:
    """One state, and the answers to the first run and to `later` ones.

    `copies` is for a run that does nothing but copy files to the host.
    """

    name: str
    reason: str
    operation: str = "none"
    before: dict = field(default_factory=lambda: INTACT)
    after: dict = field(default_factory=lambda: INTACT)
    begin: list = field(default_factory=lambda: [{}])
    prepare: str = ""
    ask: dict = field(default_factory=dict)
    user: str = "root"
    later: str = "as-wanted"
    copies: bool = False

    @property
    def changes(self):
        return self.operation != "none" or self.copies


@dataclass
class Refusal:
    """A state in which the module fails, in a check as in a run, and changes nothing."""

    name: str
    message: str
    begin: list = field(default_factory=list)
    prepare: str = ""
    ask: dict = field(default_factory=dict)
    user: str = "root"


STATES = [
    State("nothing is installed", "not-installed", "fresh", before=ABSENT, begin=[]),
    State("all is as wanted", "as-wanted"),
    State(
        "another product uses the toolkit",
        "not-registered",
        "upgrade",
        ask={"exploiter": "DESK"},
        after={**INTACT, "exploiters": BOTH},
    ),
    State(
        "an older version",
        "older-installed",
        "upgrade",
        begin=[{"programs": "@older"}],
        before=OLDER,
    ),
    State(
        "a newer version",
        "newer-installed",
        begin=[{"programs": "@newer"}],
        before=NEWER,
        after=NEWER,
        later="newer-installed",
        copies=True,
    ),
    State(
        "a newer version of another product",
        "not-registered",
        "registration",
        begin=[{"programs": "@newer"}],
        ask={"exploiter": "DESK"},
        before=NEWER,
        after={**NEWER, "exploiters": BOTH},
        later="newer-installed",
    ),
    State(
        "another package of the same version",
        "content-differs",
        "upgrade",
        ask={"spb": "@v2"},
    ),
    State(
        "a program that somebody changed",
        "content-differs",
        "upgrade",
        prepare=f"echo >>{HOME}/bin/trawlhw",
    ),
    State(
        "a program with another mode",
        "content-differs",
        "upgrade",
        prepare=f"chmod 0700 {HOME}/bin/plugins/dmi",
    ),
    State(
        "settings of the administrator",
        "as-wanted",
        prepare=f"sed -i s/^trace_level=.*/trace_level=9/ {HOME}/config/Zor.properties",
    ),
    State(
        "files of the administrator",
        "as-wanted",
        prepare=f"echo >{HOME}/bin/plugins/own",
    ),
    State(
        "the scanner control is empty",
        "damaged",
        "upgrade",
        prepare=f": >{HOME}/bin/trawlcfg",
        before={**INTACT, "health": "damaged"},
    ),
    State(
        "a shared installation, to be closed",
        "shared-mode",
        "upgrade",
        ask={"single_user": True},
        after={**INTACT, "single_user_mode": True},
    ),
    State(
        "a home of one's own",
        "not-installed",
        "fresh",
        before=ABSENT,
        begin=[],
        ask={"dest": "/opt/zor", "trace_dir": "/var/log/zor"},
        after={**INTACT, "home": "/opt/zor"},
    ),
    State(
        "a user of their own",
        "not-installed",
        "fresh",
        before=ABSENT,
        begin=[],
        user="ann",
        after={**INTACT, "home": "/home/ann/corvan/zor"},
    ),
    State(
        "the last product goes",
        "registered",
        "removal",
        ask={"state": "absent"},
        after=ABSENT,
        later="not-installed",
    ),
    State(
        "one of two products goes",
        "registered",
        "unregistration",
        begin=[{}, {"exploiter": "DESK"}],
        ask={"state": "absent"},
        before={**INTACT, "exploiters": BOTH},
        after={**INTACT, "exploiters": ["DESK"]},
        later="not-registered",
    ),
    State(
        "a product goes that is not there",
        "not-registered",
        ask={"state": "absent", "exploiter": "DESK"},
        later="not-registered",
    ),
    State(
        "installed by hand",
        "as-wanted",
        copies=True,
        prepare="rm -r /var/cache/corvan.zor",
    ),
    State(
        "only where it is installed",
        "not-installed",
        copies=True,
        before=ABSENT,
        after=ABSENT,
        begin=[],
        ask={"installed_only": True},
        later="not-installed",
    ),
    State(
        "a signed package",
        "not-installed",
        "fresh",
        before=ABSENT,
        begin=[],
        ask={"spb": "@signed", "signers": "@signers"},
    ),
]

REFUSALS = [
    Refusal(
        "a broken package",
        "the installation would fail: the package /var/cache/corvan.zor/packages/",
        ask={"spb": "@broken"},
    ),
    Refusal(
        "a signature of somebody else",
        "no valid signature of an allowed signer",
        ask={"spb": "@signed", "signers": "@strangers"},
    ),
    Refusal(
        "a disk that is full",
        "the installation would fail: ",
        prepare="mount -t tmpfs -o size=64k disk /opt",
    ),
    Refusal(
        "an installation elsewhere",
        "the toolkit is installed in /opt/corvan/zor: it cannot be moved to /opt/zor, only removed "
        "and installed there",
        begin=[{}],
        ask={"dest": "/opt/zor"},
    ),
    Refusal(
        "an identifier that ends another one",
        "HOP is the end of SHOP, which is registered: the installer could not tell them apart",
        begin=[{}],
        ask={"exploiter": "HOP"},
    ),
    Refusal("a relative home", "dest must be an absolute path", ask={"dest": "zor"}),
    Refusal(
        "a programs' directory that others can write to",
        "/var/cache/corvan.zor is not a directory that only its user can write to",
        prepare="mkdir -m 0777 -p /var/cache/corvan.zor && chmod 0777 /var/cache/corvan.zor",
    ),
]

SAMPLE = (
    "nothing is installed",
    "another product uses the toolkit",
    "an older version",
    "a newer version",
    "the scanner control is empty",
    "a user of their own",
    "the last product goes",
    "installed by hand",
    "a broken package",
    "a signature of somebody else",
)
if os.environ.get("WZOR_STATES") != "all":
    STATES = [state for state in STATES if state.name in SAMPLE]
    REFUSALS = [state for state in REFUSALS if state.name in SAMPLE]
