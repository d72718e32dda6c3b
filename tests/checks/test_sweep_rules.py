"""Each rule of the sweeps excuses what it is for, and not a defect that looks like it.

The cases are made by hand: what a run found and left at the paths that matter.
"""

import pytest

from harness import exemptions, interruptions, power
from harness.cases import FailedCall
from harness.failure_points import NO_POINT, NameChange, Point
from harness.interruptions import Interruption
from harness.machine import SPB, Node
from harness.power import COMMITTED, UNDECIDED, PowerCut
from harness.scenarios import (
    COMMON_SETTING,
    CONTROL,
    CONTROL_STATE,
    HOME,
    INDEX,
    INSTALL_TYPE,
    PROBE,
    REGISTRY,
    SCENARIOS,
    SCRIPTS,
    SETTINGS,
    SINGLE_USER_FLAG,
)

TOOL = HOME + "/bin/trawlhw"
OBSOLETE = HOME + "/bin/trawlnet"
XSS = HOME + "/config/xss/vpd.xss"
SCRATCH = HOME + "/config/Zor.tmp"
LOGS = "/usr/kel/corvan/common/ZOR/logs"
PACKAGE = {TOOL: b"new", XSS: b"new", SCRIPTS[0]: b"$(home)", SPB: b"zip", SETTINGS: b"$(home)"}
DIRECTORY = Node("d", 0o755)
DEPLOYING = "performing upgrade (deploying files)\n"
TRACED = "Setting common trace path='/t' result=0\n"
CONTROL_FAILED = "Exec '/opt/corvan/zor/bin/trawlcfg -s' returned 256\n"


def tree(files):
    """A tree of `files`: bytes by path, or nodes."""
    return {
        path: content if isinstance(content, Node) else Node("f", 0o644, content)
        for path, content in files.items()
    }


def failed(scenario, status, kind, hit, *, before=None, after=None, normal=None, **more):
    """A run in which the call of `kind` on `hit` failed."""
    references = more.get("references", {})
    return FailedCall(
        scenario=SCENARIOS[scenario],
        point=Point("name", 1, kind, hit, "", more.get("late", False), "0", more.get("entry", "")),
        error="EIO",
        status=status,
        output=more.get("output", ""),
        before=tree(before or {}),
        after=tree(after or {}),
        normal=tree(normal or {}),
        package=PACKAGE,
        reference=lambda name: tree(references[name]),
        name_changes=more.get("name_changes", []),
    )


def killed(scenario, status, *, before=None, between=None, after=None, normal=None, twice=None):
    """A run that was killed, and the same command again."""
    return Interruption(
        scenario=SCENARIOS[scenario],
        point=NO_POINT,
        status=status,
        output="",
        before=tree(before or {}),
        between=tree(between or {}),
        after=tree(after or {}),
        normal=tree(normal or {}),
        package=PACKAGE,
        reference=lambda name: tree({"the same command again": twice}[name]),
    )


def cut(status, before, live, after, normal=None, scenario="upgrade"):
    """A power cut; arguments as those of PowerCut."""
    return PowerCut(
        scenario=SCENARIOS[scenario],
        point=NO_POINT,
        status=status,
        output="",
        before=tree(before),
        live=tree(live),
        after=tree(after),
        normal=tree(normal or {}),
        package=PACKAGE,
        reference=lambda name: {},
        place="",
        file_system="ext4",
    )


def moved(path, done=True):
    return NameChange("rename", path, path + ".bak", done)


def deleted(path):
    return NameChange("unlink", path, "", True)


OF_SHOP, OF_DESK = b"exploiters SHOP", b"exploiters SHOP DESK"
INDEXED = b"# index\n/a\n/b\n"
OLD, NEW = b"old", b"new"

# The rule, a path, a case that it excuses there, and defects that it must not excuse.
OF_FAILED_CALLS = [
    (
        "a failed deletion of the probe",
        PROBE,
        failed("upgrade", 0, "unlink", PROBE, after={PROBE: b""}),
        [
            failed("upgrade", 0, "unlink", TOOL, after={PROBE: b""}),
            failed("upgrade", 0, "unlink", PROBE, after={PROBE: b"text"}),
        ],
    ),
    (
        "a failed step of a commit",
        TOOL + ".bak",
        failed(
            "upgrade", 0, "unlink", TOOL + ".bak", before={TOOL: OLD}, after={TOOL + ".bak": OLD}
        ),
        [
            failed(
                "upgrade",
                0,
                "unlink",
                TOOL + ".bak",
                before={TOOL: OLD},
                after={TOOL + ".bak": b"ol"},
            ),
            failed(
                "upgrade", 0, "unlink", XSS + ".bak", before={TOOL: OLD}, after={TOOL + ".bak": OLD}
            ),
        ],
    ),
    (
        "a failed step of a rollback",
        TOOL,
        failed(
            "failing-upgrade",
            1,
            "rename",
            TOOL + ".bak",
            late=True,
            before={TOOL: OLD},
            after={TOOL + ".bak": OLD},
        ),
        [
            failed("failing-upgrade", 1, "rename", TOOL + ".bak", late=True, before={TOOL: OLD}),
            failed(
                "failing-upgrade",
                1,
                "rename",
                TOOL + ".bak",
                before={TOOL: OLD},
                after={TOOL + ".bak": OLD},
            ),
            failed(
                "failing-upgrade",
                1,
                "rename",
                XSS + ".bak",
                late=True,
                before={TOOL: OLD},
                after={TOOL + ".bak": OLD},
            ),
        ],
    ),
    (
        "a removal is best effort",
        TOOL,
        failed("remove", 0, "unlink", TOOL, before={TOOL: OLD}, after={TOOL: OLD}),
        [
            failed("remove", 0, "unlink", TOOL, before={TOOL: OLD}, after={TOOL: b""}),
            failed("remove", 0, "unlink", XSS, before={TOOL: OLD}, after={TOOL: OLD}),
        ],
    ),
    (
        "deletions of an upgrade are best effort",
        OBSOLETE,
        failed("upgrade", 0, "unlink", OBSOLETE, before={OBSOLETE: OLD}, after={OBSOLETE: OLD}),
        [
            failed("upgrade", 0, "unlink", OBSOLETE, before={OBSOLETE: OLD}, after={OBSOLETE: NEW}),
            failed("upgrade", 0, "unlink", TOOL, before={OBSOLETE: OLD}, after={OBSOLETE: OLD}),
        ],
    ),
    (
        "the index is not journalled",
        INDEX,
        failed("upgrade", 1, "write", TOOL, before={INDEX: INDEXED}, after={INDEX: b"# index\n/a"}),
        [
            failed("upgrade", 1, "write", TOOL, before={INDEX: INDEXED}, after={INDEX: b"\0\0"}),
            failed("upgrade", 1, "write", TOOL, before={INDEX: INDEXED}),
        ],
    ),
    (
        "the index is best effort",
        INDEX,
        failed(
            "upgrade",
            0,
            "write",
            INDEX,
            before={INDEX: INDEXED},
            normal={INDEX: INDEXED},
            after={INDEX: b"# index\n/a\n"},
        ),
        [
            failed(
                "upgrade",
                0,
                "write",
                INDEX,
                before={INDEX: INDEXED},
                normal={INDEX: INDEXED},
                after={INDEX: b"# index\n/etc/passwd\n"},
            ),
            failed(
                "upgrade",
                0,
                "write",
                TOOL,
                before={INDEX: INDEXED},
                normal={INDEX: INDEXED},
                after={INDEX: b"# index\n/a\n"},
            ),
        ],
    ),
    (
        "a removal deletes what the index lists",
        TOOL,
        failed(
            "remove",
            0,
            "read",
            INDEX,
            before={TOOL: OLD},
            after={TOOL: OLD},
            references={"with an index that lists nothing": {TOOL: OLD}},
        ),
        [
            failed(
                "remove",
                0,
                "read",
                INDEX,
                before={TOOL: OLD},
                after={TOOL: b""},
                references={"with an index that lists nothing": {TOOL: OLD}},
            ),
            failed(
                "remove",
                0,
                "read",
                REGISTRY,
                before={TOOL: OLD},
                after={TOOL: OLD},
                references={"with an index that lists nothing": {TOOL: OLD}},
            ),
        ],
    ),
    (
        "the install type is best effort",
        INSTALL_TYPE,
        failed("install", 0, "rename", INSTALL_TYPE, normal={INSTALL_TYPE: NEW}),
        [
            failed(
                "install",
                0,
                "rename",
                INSTALL_TYPE,
                normal={INSTALL_TYPE: NEW},
                after={INSTALL_TYPE: b"n"},
            ),
            failed("install", 0, "rename", TOOL, normal={INSTALL_TYPE: NEW}),
            failed("install", 1, "rename", TOOL, after={INSTALL_TYPE: b"ZOR_Install"}),
        ],
    ),
    (
        "the single-user flag is not journalled",
        SINGLE_USER_FLAG,
        failed("failing-install", 1, "write", TOOL, after={SINGLE_USER_FLAG: b""}),
        [
            failed("failing-install", 1, "write", TOOL, before={SINGLE_USER_FLAG: b""}),
            failed("failing-install", 1, "write", TOOL, after={SINGLE_USER_FLAG: b"text"}),
        ],
    ),
    (
        "the common setting outlives a rollback",
        COMMON_SETTING,
        failed(
            "install",
            1,
            "write",
            TOOL,
            after={COMMON_SETTING: b"corvan_common_dir=/usr/kel/corvan/common\n"},
        ),
        [
            failed("install", 1, "write", TOOL, after={COMMON_SETTING: b""}),
            failed(
                "upgrade",
                1,
                "write",
                TOOL,
                before={COMMON_SETTING: OLD},
                after={COMMON_SETTING: b"corvan_common_dir=/usr/kel/corvan/common\n"},
            ),
            failed(
                "install",
                0,
                "write",
                COMMON_SETTING,
                normal={COMMON_SETTING: NEW},
                after={COMMON_SETTING: b""},
            ),
        ],
    ),
    (
        "a common setting that cannot be read is left alone",
        LOGS,
        failed(
            "upgrade",
            0,
            "read",
            COMMON_SETTING,
            after={LOGS: DIRECTORY},
            references={"without a common setting": {LOGS: DIRECTORY}},
        ),
        [
            failed(
                "upgrade",
                0,
                "read",
                TOOL,
                after={LOGS: DIRECTORY},
                references={"without a common setting": {LOGS: DIRECTORY}},
            ),
            failed(
                "upgrade",
                0,
                "read",
                COMMON_SETTING,
                after={LOGS: Node("d", 0o700)},
                references={"without a common setting": {LOGS: DIRECTORY}},
            ),
        ],
    ),
    (
        "the common directory is best effort",
        LOGS,
        failed("install", 0, "mkdir", LOGS, normal={LOGS: DIRECTORY}),
        [
            failed("install", 0, "mkdir", HOME, normal={LOGS: DIRECTORY}),
            failed("install", 0, "write", LOGS, normal={LOGS: DIRECTORY}),
        ],
    ),
    (
        "an upgrade's deletions are not undone",
        OBSOLETE,
        failed("upgrade", 1, "write", TOOL, before={OBSOLETE: OLD}, output=DEPLOYING),
        [
            failed("register", 1, "write", REGISTRY, before={OBSOLETE: OLD}),
            failed(
                "upgrade",
                1,
                "write",
                TOOL,
                before={OBSOLETE: OLD},
                after={OBSOLETE: NEW},
                output=DEPLOYING,
            ),
        ],
    ),
    (
        "the settings are not journalled",
        SETTINGS,
        failed(
            "upgrade",
            1,
            "write",
            REGISTRY,
            before={SETTINGS: OLD},
            normal={SETTINGS: NEW},
            after={SETTINGS: NEW},
        ),
        [
            failed(
                "upgrade",
                1,
                "write",
                REGISTRY,
                before={SETTINGS: OLD},
                normal={SETTINGS: NEW},
                after={SETTINGS: b"ne"},
            ),
            failed("upgrade", 1, "write", REGISTRY, before={SETTINGS: OLD}, normal={SETTINGS: NEW}),
        ],
    ),
    (
        "a property file that cannot be written keeps its old content",
        SETTINGS,
        failed(
            "upgrade",
            0,
            "write",
            SETTINGS + ".wzorinst-new",
            before={SETTINGS: OLD},
            normal={SETTINGS: NEW},
            after={SETTINGS: OLD},
        ),
        [
            failed(
                "upgrade",
                0,
                "write",
                SETTINGS,
                before={SETTINGS: OLD},
                normal={SETTINGS: NEW},
                after={SETTINGS: b""},
            ),
            failed(
                "upgrade",
                0,
                "write",
                SETTINGS,
                before={SETTINGS: OLD},
                normal={SETTINGS: NEW},
                after={SETTINGS: b"ne"},
            ),
            failed(
                "upgrade",
                0,
                "write",
                TOOL,
                before={SETTINGS: OLD},
                normal={SETTINGS: NEW},
                after={SETTINGS: OLD},
            ),
        ],
    ),
    (
        'the second pass over "config/xss" takes the backup',
        XSS,
        failed(
            "upgrade",
            1,
            "write",
            TOOL,
            before={XSS: OLD},
            name_changes=[moved(XSS), moved(XSS, False), deleted(XSS + ".bak"), moved(XSS)],
        ),
        [
            # A rollback that deletes the backups instead of restoring them.
            failed(
                "upgrade",
                1,
                "write",
                TOOL,
                before={XSS: OLD},
                name_changes=[moved(XSS), deleted(XSS + ".bak")],
            ),
            failed(
                "upgrade",
                1,
                "write",
                TOOL,
                before={XSS: OLD},
                name_changes=[moved(XSS), moved(XSS, False)],
            ),
            failed("upgrade", 1, "write", TOOL, before={XSS: OLD}),
        ],
    ),
    (
        "modes are best effort",
        TOOL,
        failed(
            "upgrade", 0, "chmod", TOOL, normal={TOOL: NEW}, after={TOOL: Node("f", 0o600, NEW)}
        ),
        [
            failed(
                "upgrade", 0, "chmod", TOOL, normal={TOOL: NEW}, after={TOOL: Node("f", 0o600, OLD)}
            ),
            failed(
                "upgrade",
                0,
                "chmod",
                TOOL,
                normal={TOOL: NEW},
                after={TOOL: Node("f", 0o600, NEW, (1, 1))},
            ),
            failed(
                "upgrade", 0, "chmod", XSS, normal={TOOL: NEW}, after={TOOL: Node("f", 0o600, NEW)}
            ),
        ],
    ),
    (
        "scripts are best effort",
        SCRIPTS[0],
        failed(
            "upgrade",
            0,
            "read",
            SCRIPTS[0],
            normal={SCRIPTS[0]: NEW},
            after={SCRIPTS[0]: b"$(home)"},
        ),
        [
            failed(
                "upgrade", 0, "read", SCRIPTS[0], normal={SCRIPTS[0]: NEW}, after={SCRIPTS[0]: b""}
            ),
            failed(
                "upgrade", 0, "read", TOOL, normal={SCRIPTS[0]: NEW}, after={SCRIPTS[0]: b"$(home)"}
            ),
        ],
    ),
    (
        "a damaged entry is a shorter file",
        TOOL,
        failed("upgrade", 0, "read", SPB, entry=TOOL, normal={TOOL: NEW}, after={TOOL: b"ne"}),
        [
            failed("upgrade", 0, "read", SPB, entry=TOOL, normal={TOOL: NEW}, after={TOOL: b"xx"}),
            failed("upgrade", 0, "read", SPB, entry=XSS, normal={TOOL: NEW}, after={TOOL: b"ne"}),
            failed("upgrade", 0, "write", SPB, entry=TOOL, normal={TOOL: NEW}, after={TOOL: b"ne"}),
        ],
    ),
    (
        "a scanner control that does not run changes no state",
        CONTROL_STATE,
        failed(
            "upgrade",
            0,
            "write",
            TOOL,
            output=CONTROL_FAILED,
            after={CONTROL_STATE: b"scanners=disabled\n"},
        ),
        [
            failed("upgrade", 0, "write", TOOL, after={CONTROL_STATE: b"scanners=disabled\n"}),
            failed(
                "upgrade", 0, "write", TOOL, output=CONTROL_FAILED, after={CONTROL_STATE: b"text"}
            ),
        ],
    ),
    (
        "the common trace path is the scanner control's",
        CONTROL_STATE,
        failed(
            "install",
            1,
            "syncfs",
            HOME,
            output=TRACED,
            normal={CONTROL_STATE: NEW},
            after={CONTROL_STATE: NEW},
        ),
        [
            failed(
                "install", 1, "write", HOME, normal={CONTROL_STATE: NEW}, after={CONTROL_STATE: NEW}
            ),
            failed(
                "install",
                1,
                "syncfs",
                HOME,
                output=TRACED,
                normal={CONTROL_STATE: NEW},
                after={CONTROL_STATE: b""},
            ),
            failed(
                "upgrade",
                1,
                "syncfs",
                HOME,
                output=TRACED,
                normal={CONTROL_STATE: NEW},
                after={CONTROL_STATE: NEW},
            ),
        ],
    ),
    (
        "the toolkit's programs leave their own files",
        SCRATCH,
        failed("install", 1, "write", TOOL, output=CONTROL_FAILED, after={SCRATCH: b""}),
        [
            failed("install", 1, "write", TOOL, after={SCRATCH: b""}),
            failed("install", 1, "write", TOOL, output=CONTROL_FAILED, after={SCRATCH: b"text"}),
        ],
    ),
    (
        "a registry that cannot be read or verified counts as none",
        REGISTRY,
        failed(
            "register",
            0,
            "read",
            REGISTRY,
            after={REGISTRY: NEW},
            references={"with an empty registry": {REGISTRY: NEW}},
        ),
        [
            failed(
                "register",
                0,
                "read",
                REGISTRY,
                after={REGISTRY: b""},
                references={"with an empty registry": {REGISTRY: NEW}},
            ),
            failed(
                "register",
                0,
                "write",
                REGISTRY,
                after={REGISTRY: NEW},
                references={"with an empty registry": {REGISTRY: NEW}},
            ),
        ],
    ),
    (
        "a scanner control that cannot be looked at counts as broken",
        REGISTRY,
        failed(
            "register",
            0,
            "stat",
            CONTROL,
            after={REGISTRY: NEW},
            references={"without a scanner control": {REGISTRY: NEW}},
        ),
        [
            failed(
                "register",
                0,
                "stat",
                CONTROL,
                after={REGISTRY: OLD},
                references={"without a scanner control": {REGISTRY: NEW}},
            ),
            failed(
                "register",
                0,
                "stat",
                TOOL,
                after={REGISTRY: NEW},
                references={"without a scanner control": {REGISTRY: NEW}},
            ),
        ],
    ),
    (
        "a removal is not rolled back",
        REGISTRY + ".bak",
        failed(
            "unregister",
            1,
            "write",
            REGISTRY,
            before={REGISTRY: OF_DESK},
            after={REGISTRY: OF_DESK, REGISTRY + ".bak": OF_DESK},
        ),
        [
            failed(
                "unregister",
                1,
                "write",
                REGISTRY,
                before={REGISTRY: OF_DESK},
                after={REGISTRY: OF_DESK, REGISTRY + ".bak": b"text"},
            ),
            failed(
                "register",
                1,
                "write",
                REGISTRY,
                before={REGISTRY: OF_DESK},
                after={REGISTRY: OF_DESK, REGISTRY + ".bak": OF_DESK},
            ),
        ],
    ),
]

OF_KILLED_RUNS = [
    (
        "the installation was registered already",
        SETTINGS,
        killed("install", 0, between={REGISTRY: NEW}, after={SETTINGS: NEW}, twice={SETTINGS: NEW}),
        [
            killed(
                "install", 0, between={REGISTRY: NEW}, after={SETTINGS: b""}, twice={SETTINGS: NEW}
            ),
            killed("install", 0, after={SETTINGS: NEW}, twice={SETTINGS: NEW}),
        ],
    ),
    (
        "what only a fresh installation makes",
        INSTALL_TYPE,
        killed("install", 0, between={REGISTRY: NEW}, normal={INSTALL_TYPE: NEW}),
        [
            killed(
                "install", 0, between={REGISTRY: NEW, INSTALL_TYPE: NEW}, normal={INSTALL_TYPE: NEW}
            ),
            killed("install", 0, normal={INSTALL_TYPE: NEW}),
        ],
    ),
    (
        "the index was being written",
        INDEX,
        killed(
            "upgrade",
            0,
            before={INDEX: INDEXED},
            between={INDEX: b"# index\n"},
            after={INDEX: b"# index\n/a\n"},
            normal={INDEX: INDEXED},
        ),
        [
            killed(
                "upgrade",
                0,
                before={INDEX: INDEXED},
                between={INDEX: INDEXED},
                after={INDEX: b"# index\n/a\n"},
                normal={INDEX: INDEXED},
            ),
            killed(
                "upgrade",
                0,
                before={INDEX: INDEXED},
                between={INDEX: b"# index\n"},
                after={INDEX: b"# index\n/etc/passwd\n"},
                normal={INDEX: INDEXED},
            ),
        ],
    ),
    (
        "the scanner control was deleted already",
        TOOL,
        killed("remove", 1, between={REGISTRY: OLD, TOOL: OLD}, after={REGISTRY: OLD, TOOL: OLD}),
        [
            killed("remove", 1, between={REGISTRY: OLD, TOOL: OLD}, after={REGISTRY: OLD}),
            killed(
                "remove",
                1,
                between={REGISTRY: OLD, CONTROL: OLD},
                after={REGISTRY: OLD, CONTROL: OLD},
            ),
        ],
    ),
    (
        "the registry was deleted already",
        "/etc/zor",
        killed("remove", 1, between={"/etc/zor": DIRECTORY}, after={"/etc/zor": DIRECTORY}),
        [
            killed(
                "remove",
                1,
                between={"/etc/zor": DIRECTORY, TOOL: OLD},
                after={"/etc/zor": DIRECTORY, TOOL: OLD},
            ),
            killed("unregister", 1, between={"/etc/zor": DIRECTORY}, after={"/etc/zor": DIRECTORY}),
        ],
    ),
]

OF_POWER_CUTS = [
    (
        "an upgrade's deletions have no backup",
        OBSOLETE,
        cut(UNDECIDED, {OBSOLETE: OLD}, {}, {}),
        [
            cut(UNDECIDED, {OBSOLETE: OLD}, {OBSOLETE: OLD}, {}),
            cut(UNDECIDED, {OBSOLETE: OLD}, {}, {}, scenario="register"),
        ],
    ),
    (
        "the index has no backup",
        INDEX,
        cut(UNDECIDED, {INDEX: OLD}, {INDEX: b""}, {INDEX: b""}),
        [cut(UNDECIDED, {INDEX: OLD}, {INDEX: OLD}, {INDEX: b""})],
    ),
    (
        "settings are replaced without a backup",
        SETTINGS,
        cut(UNDECIDED, {SETTINGS: OLD}, {SETTINGS: NEW}, {SETTINGS: NEW}),
        [
            cut(UNDECIDED, {SETTINGS: OLD}, {SETTINGS: NEW}, {SETTINGS: b""}),
            cut(UNDECIDED, {SETTINGS: OLD}, {SETTINGS: OLD}, {SETTINGS: NEW}),
        ],
    ),
    (
        'the second pass over "config/xss" takes the backup',
        XSS,
        cut(UNDECIDED, {XSS: OLD}, {XSS: NEW, XSS + ".bak": NEW}, {XSS + ".bak": b""}),
        [
            cut(UNDECIDED, {XSS: OLD}, {XSS: NEW, XSS + ".bak": OLD}, {XSS + ".bak": b""}),
            cut(UNDECIDED, {XSS: OLD}, {XSS: OLD}, {}),
        ],
    ),
    (
        "the scanners' state is their own",
        CONTROL_STATE,
        cut(COMMITTED, {}, {CONTROL_STATE: NEW}, {CONTROL_STATE: b""}),
        [cut(COMMITTED, {}, {CONTROL_STATE: NEW}, {CONTROL_STATE: b"\0\0\0"})],
    ),
]

TABLES = (
    (exemptions.RULES, OF_FAILED_CALLS),
    (interruptions.RULES, OF_KILLED_RUNS),
    (power.RULES, OF_POWER_CUTS),
)

EACH_RULE = [
    pytest.param(next(r for r in rules if r.name == row[0]), *row[1:], id=row[0])
    for rules, table in TABLES
    for row in table
]


@pytest.mark.parametrize("rules, table", TABLES)
def test_there_are_defects_for_every_rule(rules, table):
    assert [rule.name for rule in rules] == [name for name, *_ in table]
    assert all(defects for *_, defects in table)


@pytest.mark.parametrize("rule, path, case, defects", EACH_RULE)
def test_a_rule_excuses_what_it_is_for(rule, path, case, defects):
    assert case.status in rule.statuses
    assert rule.excuses(case, path)


@pytest.mark.parametrize("rule, path, case, defects", EACH_RULE)
def test_a_rule_excuses_no_defect(rule, path, case, defects):
    excused = [
        defect
        for defect in defects
        if defect.status in rule.statuses and rule.excuses(defect, path)
    ]

    assert not excused


def test_a_directory_stays_only_for_what_is_excused_in_it():
    flag = {HOME: DIRECTORY, SINGLE_USER_FLAG: b""}
    other = {HOME: DIRECTORY, TOOL: b""}
    kept = failed("failing-install", 1, "write", "/x", after=flag)
    defect = failed("failing-install", 1, "write", "/x", after=other)

    exemptions.judge(kept)
    exemptions.judge(defect)

    assert not kept.violations
    assert defect.violations == [TOOL, HOME]


@pytest.mark.parametrize(
    "status, after, lost",
    [
        (UNDECIDED, {REGISTRY: OF_SHOP}, []),
        (UNDECIDED, {REGISTRY: b"", REGISTRY + ".bak": OF_SHOP}, []),
        (UNDECIDED, {REGISTRY: OF_DESK, REGISTRY + ".bak": b""}, [REGISTRY]),
        (UNDECIDED, {}, [REGISTRY]),
        (COMMITTED, {REGISTRY: OF_DESK}, []),
        (COMMITTED, {REGISTRY: OF_SHOP, REGISTRY + ".bak": OF_SHOP}, [REGISTRY]),
        (COMMITTED, {REGISTRY: b""}, [REGISTRY]),
    ],
)
def test_a_power_cut_is_judged_by_what_is_complete(status, after, lost):
    case = cut(status, {REGISTRY: OF_SHOP}, {REGISTRY: OF_DESK}, after, {REGISTRY: OF_DESK})

    power.judge(case)

    assert case.violations == lost
