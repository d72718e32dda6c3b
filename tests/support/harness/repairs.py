"""What `zorctl doctor --apply` does with an installation whose run was killed.

Afterwards the installation must be the old one, the new one, or none at all, and sound. Where it
can only be one of them with an exception, the exception is named here.
"""

from dataclasses import dataclass, field

from harness.cases import BACKUP
from harness.scenarios import HOME, REGISTRY, SCRIPTS, SETTINGS, TRACE_SETTINGS

UNTRUSTED = (
    "of somebody else, or in a directory that somebody else may write to: such a backup is "
    "left to the administrator"
)
NEW_FILE = "brought by the package, and nothing had been there: it stays as a file nobody listed"
PROPERTIES = "in properties, which an upgrade deletes first: install again to have them back"
SECOND_PASS = "in config/xss, whose second extraction takes the place of the old file's backup"


@dataclass
class Repair:
    """A run of `scenario` killed at `point`, and what the doctor did.

    `state` is "old", "new", "none", or "again": the interrupted removal has to be run again, which
    the doctor says and a second run does.
    """

    scenario: object
    point: object
    before: dict
    normal: dict
    package: dict
    between: dict
    after: dict
    status: int
    output: str
    health: int
    again: object
    state: str = ""
    exceptions: dict = field(default_factory=dict)
    violations: list = field(default_factory=list)


def programs(package):
    """The installed files of the package that nobody edits."""
    edited = {SETTINGS, TRACE_SETTINGS, *SCRIPTS}
    return sorted(path for path in package if path.startswith(HOME + "/") and path not in edited)


def content(tree, path):
    return tree[path].content if path in tree else None


def is_untrusted(case, path):
    """Whether somebody else owned the old file or may write to a directory above it."""
    old = case.before.get(path)
    if old is not None and old.owner[0] != 0:
        return True
    while path := path.rpartition("/")[0]:
        directory = case.before.get(path)
        if directory is not None and (directory.owner[0] != 0 or directory.mode & 0o022):
            return True
    return False


def exception_for(case, path):
    """Why the old file at `path` is not back; None if nothing excuses that."""
    if path not in case.before:
        return NEW_FILE
    if path.startswith(HOME + "/properties/"):
        return PROPERTIES
    if is_untrusted(case, path):
        return UNTRUSTED
    if path.startswith(HOME + "/config/xss/") and (
        content(case.between, path + BACKUP) == content(case.normal, path)
    ):
        return SECOND_PASS
    return None


def compare_programs(case, wanted):
    for path in programs(case.package):
        if content(case.after, path) == content(wanted, path):
            continue
        reason = exception_for(case, path) if wanted is case.before else None
        if reason:
            case.exceptions[path] = reason
        else:
            case.violations.append(path)


def look_for_backups(case):
    for path in case.after:
        if path.endswith(BACKUP) and path.removesuffix(BACKUP) in {*case.package, REGISTRY}:
            if is_untrusted(case, path.removesuffix(BACKUP)):
                case.exceptions[path] = UNTRUSTED
            else:
                case.violations.append(path)


def judge(case):
    """Fills in state, exceptions and violations."""
    registered = content(case.after, REGISTRY)
    removes = case.scenario.name == "remove"
    if registered is None:
        case.state = "none"
        if REGISTRY in case.before and not removes:
            case.violations.append("(the registry is gone)")
        if removes:
            compare_programs(case, case.normal)
    elif removes and "files-missing" in case.output:
        case.state = "again"
        tree, status = case.again()
        if status != 0 or REGISTRY in tree or any(path in tree for path in programs(case.package)):
            case.violations.append("(running it again does not finish it)")
        return
    elif (
        registered == content(case.normal, REGISTRY)
        and case.scenario.name != "unregister"
        and (
            all(
                content(case.after, path) == content(case.normal, path)
                for path in programs(case.package)
            )
        )
    ):
        case.state = "new"
    elif registered == content(case.before, REGISTRY):
        case.state = "old"
        compare_programs(case, case.before)
    elif registered == content(case.normal, REGISTRY):
        case.state = "new"
        compare_programs(case, case.normal)
    else:
        case.violations.append("(the registry is neither old nor new)")
    look_for_backups(case)
    excused = any(reason == UNTRUSTED for reason in case.exceptions.values())
    if case.health not in (0, 3) and not excused:
        case.violations.append(f"(status {case.health})")
