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


def case(**arguments):
    """The arguments of a case, for the functions below."""
    return arguments


def but(**changes):
    """What differs from a case."""
    return changes


def failed(scenario, status, kind, hit, before=None, after=None, normal=None, **more):
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


def killed(scenario, status, before=None, between=None, after=None, normal=None, twice=None):
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

# The rule, a path, a case that it excuses there, and how the defects that it must not excuse differ
# from that case.
OF_FAILED_CALLS = [
    (
        "a failed deletion of the probe",
        PROBE,
        case(scenario="upgrade", status=0, kind="unlink", hit=PROBE, after={PROBE: b""}),
        [but(hit=TOOL), but(after={PROBE: b"text"})],
    ),
    (
        "a failed step of a commit",
        TOOL + ".bak",
        case(
            scenario="upgrade",
            status=0,
            kind="unlink",
            hit=TOOL + ".bak",
            before={TOOL: OLD},
            after={TOOL + ".bak": OLD},
        ),
        [but(after={TOOL + ".bak": b"ol"}), but(hit=XSS + ".bak")],
    ),
    (
        "a failed step of a rollback",
        TOOL,
        case(
            scenario="failing-upgrade",
            status=1,
            kind="rename",
            hit=TOOL + ".bak",
            late=True,
            before={TOOL: OLD},
            after={TOOL + ".bak": OLD},
        ),
        [but(after=None), but(late=False), but(hit=XSS + ".bak")],
    ),
    (
        "a removal is best effort",
        TOOL,
        case(
            scenario="remove",
            status=0,
            kind="unlink",
            hit=TOOL,
            before={TOOL: OLD},
            after={TOOL: OLD},
        ),
        [but(after={TOOL: b""}), but(hit=XSS)],
    ),
    (
        "deletions of an upgrade are best effort",
        OBSOLETE,
        case(
            scenario="upgrade",
            status=0,
            kind="unlink",
            hit=OBSOLETE,
            before={OBSOLETE: OLD},
            after={OBSOLETE: OLD},
        ),
        [but(after={OBSOLETE: NEW}), but(hit=TOOL)],
    ),
    (
        "the index is not journalled",
        INDEX,
        case(
            scenario="upgrade",
            status=1,
            kind="write",
            hit=TOOL,
            before={INDEX: INDEXED},
            after={INDEX: b"# index\n/a"},
        ),
        [but(after={INDEX: b"\0\0"}), but(after=None)],
    ),
    (
        "the index is best effort",
        INDEX,
        case(
            scenario="upgrade",
            status=0,
            kind="write",
            hit=INDEX,
            before={INDEX: INDEXED},
            normal={INDEX: INDEXED},
            after={INDEX: b"# index\n/a\n"},
        ),
        [but(after={INDEX: b"# index\n/etc/passwd\n"}), but(hit=TOOL)],
    ),
    (
        "a removal deletes what the index lists",
        TOOL,
        case(
            scenario="remove",
            status=0,
            kind="read",
            hit=INDEX,
            before={TOOL: OLD},
            after={TOOL: OLD},
            references={"with an index that lists nothing": {TOOL: OLD}},
        ),
        [but(after={TOOL: b""}), but(hit=REGISTRY)],
    ),
    (
        "the install type is best effort",
        INSTALL_TYPE,
        case(
            scenario="install",
            status=0,
            kind="rename",
            hit=INSTALL_TYPE,
            normal={INSTALL_TYPE: NEW},
        ),
        [
            but(after={INSTALL_TYPE: b"n"}),
            but(hit=TOOL),
            but(status=1, hit=TOOL, after={INSTALL_TYPE: b"ZOR_Install"}, normal=None),
        ],
    ),
    (
        "the single-user flag is not journalled",
        SINGLE_USER_FLAG,
        case(
            scenario="failing-install",
            status=1,
            kind="write",
            hit=TOOL,
            after={SINGLE_USER_FLAG: b""},
        ),
        [but(before={SINGLE_USER_FLAG: b""}, after=None), but(after={SINGLE_USER_FLAG: b"text"})],
    ),
    (
        "the common setting outlives a rollback",
        COMMON_SETTING,
        case(
            scenario="install",
            status=1,
            kind="write",
            hit=TOOL,
            after={COMMON_SETTING: b"corvan_common_dir=/usr/kel/corvan/common\n"},
        ),
        [
            but(after={COMMON_SETTING: b""}),
            but(scenario="upgrade", before={COMMON_SETTING: OLD}),
            but(
                status=0,
                hit=COMMON_SETTING,
                normal={COMMON_SETTING: NEW},
                after={COMMON_SETTING: b""},
            ),
        ],
    ),
    (
        "a common setting that cannot be read is left alone",
        LOGS,
        case(
            scenario="upgrade",
            status=0,
            kind="read",
            hit=COMMON_SETTING,
            after={LOGS: DIRECTORY},
            references={"without a common setting": {LOGS: DIRECTORY}},
        ),
        [but(hit=TOOL), but(after={LOGS: Node("d", 448)})],
    ),
    (
        "the common directory is best effort",
        LOGS,
        case(scenario="install", status=0, kind="mkdir", hit=LOGS, normal={LOGS: DIRECTORY}),
        [but(hit=HOME), but(kind="write")],
    ),
    (
        "an upgrade's deletions are not undone",
        OBSOLETE,
        case(
            scenario="upgrade",
            status=1,
            kind="write",
            hit=TOOL,
            before={OBSOLETE: OLD},
            output=DEPLOYING,
        ),
        [but(scenario="register", hit=REGISTRY, output=""), but(after={OBSOLETE: NEW})],
    ),
    (
        "the settings are not journalled",
        SETTINGS,
        case(
            scenario="upgrade",
            status=1,
            kind="write",
            hit=REGISTRY,
            before={SETTINGS: OLD},
            normal={SETTINGS: NEW},
            after={SETTINGS: NEW},
        ),
        [but(after={SETTINGS: b"ne"}), but(after=None)],
    ),
    (
        "a property file that cannot be written keeps its old content",
        SETTINGS,
        case(
            scenario="upgrade",
            status=0,
            kind="write",
            hit=SETTINGS + ".wzorinst-new",
            before={SETTINGS: OLD},
            normal={SETTINGS: NEW},
            after={SETTINGS: OLD},
        ),
        [
            but(hit=SETTINGS, after={SETTINGS: b""}),
            but(hit=SETTINGS, after={SETTINGS: b"ne"}),
            but(hit=TOOL),
        ],
    ),
    (
        'the second pass over "config/xss" takes the backup',
        XSS,
        case(
            scenario="upgrade",
            status=1,
            kind="write",
            hit=TOOL,
            before={XSS: OLD},
            name_changes=[moved(XSS), moved(XSS, False), deleted(XSS + ".bak"), moved(XSS)],
        ),
        [
            # A rollback that deletes the backups instead of restoring them.
            but(name_changes=[moved(XSS), deleted(XSS + ".bak")]),
            but(name_changes=[moved(XSS), moved(XSS, False)]),
            but(name_changes=[]),
        ],
    ),
    (
        "modes are best effort",
        TOOL,
        case(
            scenario="upgrade",
            status=0,
            kind="chmod",
            hit=TOOL,
            normal={TOOL: NEW},
            after={TOOL: Node("f", 384, NEW)},
        ),
        [
            but(after={TOOL: Node("f", 384, OLD)}),
            but(after={TOOL: Node("f", 384, NEW, (1, 1))}),
            but(hit=XSS),
        ],
    ),
    (
        "scripts are best effort",
        SCRIPTS[0],
        case(
            scenario="upgrade",
            status=0,
            kind="read",
            hit=SCRIPTS[0],
            normal={SCRIPTS[0]: NEW},
            after={SCRIPTS[0]: b"$(home)"},
        ),
        [but(after={SCRIPTS[0]: b""}), but(hit=TOOL)],
    ),
    (
        "a damaged entry is a shorter file",
        TOOL,
        case(
            scenario="upgrade",
            status=0,
            kind="read",
            hit=SPB,
            entry=TOOL,
            normal={TOOL: NEW},
            after={TOOL: b"ne"},
        ),
        [but(after={TOOL: b"xx"}), but(entry=XSS), but(kind="write")],
    ),
    (
        "a scanner control that does not run changes no state",
        CONTROL_STATE,
        case(
            scenario="upgrade",
            status=0,
            kind="write",
            hit=TOOL,
            output=CONTROL_FAILED,
            after={CONTROL_STATE: b"scanners=disabled\n"},
        ),
        [but(output=""), but(after={CONTROL_STATE: b"text"})],
    ),
    (
        "the common trace path is the scanner control's",
        CONTROL_STATE,
        case(
            scenario="install",
            status=1,
            kind="syncfs",
            hit=HOME,
            output=TRACED,
            normal={CONTROL_STATE: NEW},
            after={CONTROL_STATE: NEW},
        ),
        [but(kind="write", output=""), but(after={CONTROL_STATE: b""}), but(scenario="upgrade")],
    ),
    (
        "the toolkit's programs leave their own files",
        SCRATCH,
        case(
            scenario="install",
            status=1,
            kind="write",
            hit=TOOL,
            output=CONTROL_FAILED,
            after={SCRATCH: b""},
        ),
        [but(output=""), but(after={SCRATCH: b"text"})],
    ),
    (
        "a registry that cannot be read or verified counts as none",
        REGISTRY,
        case(
            scenario="register",
            status=0,
            kind="read",
            hit=REGISTRY,
            after={REGISTRY: NEW},
            references={"with an empty registry": {REGISTRY: NEW}},
        ),
        [but(after={REGISTRY: b""}), but(kind="write")],
    ),
    (
        "a scanner control that cannot be looked at counts as broken",
        REGISTRY,
        case(
            scenario="register",
            status=0,
            kind="stat",
            hit=CONTROL,
            after={REGISTRY: NEW},
            references={"without a scanner control": {REGISTRY: NEW}},
        ),
        [but(after={REGISTRY: OLD}), but(hit=TOOL)],
    ),
    (
        "a removal is not rolled back",
        REGISTRY + ".bak",
        case(
            scenario="unregister",
            status=1,
            kind="write",
            hit=REGISTRY,
            before={REGISTRY: OF_DESK},
            after={REGISTRY: OF_DESK, REGISTRY + ".bak": OF_DESK},
        ),
        [but(after={REGISTRY: OF_DESK, REGISTRY + ".bak": b"text"}), but(scenario="register")],
    ),
]

OF_KILLED_RUNS = [
    (
        "the installation was registered already",
        SETTINGS,
        case(
            scenario="install",
            status=0,
            between={REGISTRY: NEW},
            after={SETTINGS: NEW},
            twice={SETTINGS: NEW},
        ),
        [but(after={SETTINGS: b""}), but(between=None)],
    ),
    (
        "what only a fresh installation makes",
        INSTALL_TYPE,
        case(scenario="install", status=0, between={REGISTRY: NEW}, normal={INSTALL_TYPE: NEW}),
        [but(between={REGISTRY: NEW, INSTALL_TYPE: NEW}), but(between=None)],
    ),
    (
        "the index was being written",
        INDEX,
        case(
            scenario="upgrade",
            status=0,
            before={INDEX: INDEXED},
            between={INDEX: b"# index\n"},
            after={INDEX: b"# index\n/a\n"},
            normal={INDEX: INDEXED},
        ),
        [but(between={INDEX: INDEXED}), but(after={INDEX: b"# index\n/etc/passwd\n"})],
    ),
    (
        "the scanner control was deleted already",
        TOOL,
        case(
            scenario="remove",
            status=1,
            between={REGISTRY: OLD, TOOL: OLD},
            after={REGISTRY: OLD, TOOL: OLD},
        ),
        [
            but(after={REGISTRY: OLD}),
            but(between={REGISTRY: OLD, CONTROL: OLD}, after={REGISTRY: OLD, CONTROL: OLD}),
        ],
    ),
    (
        "the registry was deleted already",
        "/etc/zor",
        case(
            scenario="remove",
            status=1,
            between={"/etc/zor": DIRECTORY},
            after={"/etc/zor": DIRECTORY},
        ),
        [
            but(
                between={"/etc/zor": DIRECTORY, TOOL: OLD}, after={"/etc/zor": DIRECTORY, TOOL: OLD}
            ),
            but(scenario="unregister"),
        ],
    ),
]

OF_POWER_CUTS = [
    (
        "an upgrade's deletions have no backup",
        OBSOLETE,
        case(status=UNDECIDED, before={OBSOLETE: OLD}, live={}, after={}),
        [but(live={OBSOLETE: OLD}), but(scenario="register")],
    ),
    (
        "the index has no backup",
        INDEX,
        case(status=UNDECIDED, before={INDEX: OLD}, live={INDEX: b""}, after={INDEX: b""}),
        [but(live={INDEX: OLD})],
    ),
    (
        "settings are replaced without a backup",
        SETTINGS,
        case(status=UNDECIDED, before={SETTINGS: OLD}, live={SETTINGS: NEW}, after={SETTINGS: NEW}),
        [but(after={SETTINGS: b""}), but(live={SETTINGS: OLD})],
    ),
    (
        'the second pass over "config/xss" takes the backup',
        XSS,
        case(
            status=UNDECIDED,
            before={XSS: OLD},
            live={XSS: NEW, XSS + ".bak": NEW},
            after={XSS + ".bak": b""},
        ),
        [but(live={XSS: NEW, XSS + ".bak": OLD}), but(live={XSS: OLD}, after={})],
    ),
    (
        "the scanners' state is their own",
        CONTROL_STATE,
        case(status=COMMITTED, before={}, live={CONTROL_STATE: NEW}, after={CONTROL_STATE: b""}),
        [but(after={CONTROL_STATE: b"\0\0\0"})],
    ),
]

TABLES = (
    (exemptions.RULES, failed, OF_FAILED_CALLS),
    (interruptions.RULES, killed, OF_KILLED_RUNS),
    (power.RULES, cut, OF_POWER_CUTS),
)

EACH_RULE = [
    pytest.param(
        next(rule for rule in rules if rule.name == name),
        path,
        make(**arguments),
        [make(**{**arguments, **difference}) for difference in differences],
        id=name,
    )
    for rules, make, table in TABLES
    for name, path, arguments, differences in table
]


@pytest.mark.parametrize("rules, table", [(rules, table) for rules, _, table in TABLES])
def test_there_are_defects_for_every_rule(rules, table):
    assert [rule.name for rule in rules] == [name for name, *_ in table]
    assert all(differences for *_, differences in table)


@pytest.mark.parametrize("rule, path, excused, defects", EACH_RULE)
def test_a_rule_excuses_what_it_is_for(rule, path, excused, defects):
    assert excused.status in rule.statuses
    assert rule.excuses(excused, path)


@pytest.mark.parametrize("rule, path, excused, defects", EACH_RULE)
def test_a_rule_excuses_no_defect(rule, path, excused, defects):
    missed = [
        defect
        for defect in defects
        if defect.status in rule.statuses and rule.excuses(defect, path)
    ]

    assert not missed


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
    run = cut(status, {REGISTRY: OF_SHOP}, {REGISTRY: OF_DESK}, after, {REGISTRY: OF_DESK})

    power.judge(run)

    assert run.violations == lost
