"""Where a killed run and the same command after it do not end as an undisturbed run, and why.

The journal lives in memory, so a run that is killed undoes nothing; the same command does the work
again. Each rule names one place where that cannot lead to the same tree, and excuses a difference
only if the state that the kill left shows that it was killed there. Left-over backups are counted,
not excused: they must be old contents that the second run did not touch. So is the file with new
content that was not renamed yet, of which there must be at most one.
"""

from dataclasses import dataclass, field

from harness.cases import BACKUP, TEMPORARY, Case, RuleBook, contents_before, lines_of
from harness.scenarios import CONTROL, CONTROL_STATE, INDEX, INSTALL_TYPE, REGISTRY, differences


@dataclass(kw_only=True)
class Interruption(Case):
    """A run killed just before the call of `point`, and the same command after it.

    `between` is the tree that the kill left; `status` and `after` are those of the second run.
    """

    between: dict
    backups: list = field(default_factory=list)
    temporaries: list = field(default_factory=list)

    @property
    def wanted(self):
        return self.normal

    @property
    def installs(self):
        return self.scenario.arguments[0] == "i"

    @property
    def removes_all(self):
        return self.scenario.name == "remove"


RULES = RuleBook()
rule = RULES.rule


def lines_at(tree, path):
    return set(lines_of(tree[path].content)) if path in tree else set()


@rule(
    "the installation was registered already",
    "A fresh installation that is killed after the writing of zor.ini is found by the second "
    "run, which upgrades it: the settings have the keys that an upgrade adds, "
    "ZorTrace.properties is that of an upgrade, the cache is gone.",
    0,
)
def was_registered_already(case, path):
    if not is_finished_installation(case):
        return False
    return case.after.get(path) == case.reference("the same command again").get(path)


@rule(
    "what only a fresh installation makes",
    "After the registry come the install type and the common trace path. An upgrade makes "
    "neither, so what the killed run had not made is missing.",
    0,
)
def only_fresh_installations_make_it(case, path):
    if not is_finished_installation(case):
        return False
    if path in (INSTALL_TYPE, CONTROL_STATE):
        return case.between.get(path) != case.normal[path]
    missing = lines_at(case.normal, INDEX) - lines_at(case.after, INDEX)
    return (
        path == INDEX
        and missing == {INSTALL_TYPE.encode()}
        and (missing.isdisjoint(lines_at(case.between, INDEX)))
    )


def is_finished_installation(case):
    return case.scenario.name == "install" and REGISTRY in case.between


@rule(
    "the index was being written",
    "An installation truncates the index when extraction begins and completes it when it ends; "
    "killed in between, it has lost what earlier versions had listed beyond this package.",
    0,
)
def index_was_being_written(case, path):
    if path != INDEX or not case.installs:
        return False
    missing = lines_at(case.normal, INDEX) - lines_at(case.after, INDEX)
    return missing <= lines_at(case.before, INDEX) - lines_at(case.between, INDEX) and lines_at(
        case.after, INDEX
    ) <= lines_at(case.normal, INDEX)


@rule(
    "the scanner control was deleted already",
    "A removal deletes the scanner control with the other files, the registry last. Killed in "
    "between, the installation counts as broken and the second run refuses to remove it: it "
    "changes nothing. While Zor.properties is left, i repairs it and then r removes it; "
    "afterwards zor.ini must be deleted by hand before i and r help.",
    1,
)
def control_was_deleted_already(case, _):
    return (
        case.removes_all
        and CONTROL not in case.between
        and REGISTRY in case.between
        and not differences(case.between, case.after)
    )


@rule(
    "the registry was deleted already",
    "The registry is the last file that a removal deletes: the second run finds nothing to "
    "remove and ends with status 1. Only its empty directory can be left.",
    1,
)
def registry_was_deleted_already(case, _):
    left = differences(case.normal, case.after)
    return (
        case.removes_all
        and REGISTRY not in case.between
        and left in ([], ["/etc/zor"])
        and not differences(case.between, case.after)
    )


def is_left_backup(case, path):
    """True for a backup that the killed run made and the second one did not touch."""
    return (
        path.endswith(BACKUP)
        and path not in case.normal
        and case.after.get(path) == case.between.get(path)
        and case.after[path].content in contents_before(case, path.removesuffix(BACKUP))
    )


def judge(case):
    """Fills in the left-over backups, what is excused by which rule, and what by none."""
    paths = differences(case.normal, case.after)
    case.backups = [path for path in paths if path in case.after and is_left_backup(case, path)]
    case.temporaries = [
        path
        for path in paths
        if path.endswith(TEMPORARY) and case.after.get(path) == case.between.get(path)
    ][:1]
    paths = [path for path in paths if path not in case.backups + case.temporaries]
    if case.status != 0:
        paths.append("(status)")
    for path in paths:
        name = RULES.first(case, path)
        if name:
            case.excused[path] = name
        else:
            case.violations.append(path)
