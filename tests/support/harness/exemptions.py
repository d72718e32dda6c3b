"""What a failure may leave different, and why: the named rules of the sweeps.

A run that ends with status 0 must leave the tree of an undisturbed run; one that ends with status 1
the tree that it found. Each rule names one way in which the installer deliberately does less, and
excuses the difference at one path only where the failing call, the outcome and the content found
there all support that. What no rule excuses is a violation.
"""

import os
import re

from harness.cases import BACKUP, Rule, RuleBook, contents_before, is_below, lines_of
from harness.scenarios import (
    COMMON_SETTING,
    CONTROL,
    CONTROL_STATE,
    HOME,
    INDEX,
    INSTALL_TYPE,
    OBSOLETE_FILES,
    PACKAGES,
    PROBE,
    REGISTRY,
    SCRIPTS,
    SETTINGS,
    SINGLE_USER_FLAG,
    TRACE_SETTINGS,
    differences,
)

RULES = RuleBook()
rule = RULES.rule

COMMON_PROGRAM = HOME + "/bin/trawl_common.sh"
SCRATCH_FILE = HOME + "/config/Zor.tmp"
DEFAULT_SETTING = b"corvan_common_dir=/usr/kel/corvan/common\n"
DISABLED = b"scanners=disabled\n"
TYPE_TEXT = b"ZOR_InstallType=global\n"

NOT_INDEXED = "Warning! Failed to create install log file: "
EXTRACTION_FAILED = "File extraction failed, error = "
DEPLOYING = "performing upgrade (deploying files)"

CONTROL_FAILED = re.compile(r"^Exec '\S*/bin/trawlcfg .*' returned [1-9]", re.M)

TRACE_PATH_SET = re.compile(r"^Setting common trace path='.*' result=0$", re.M)

# Calls that look at a name or at what it refers to.
LOOKS = ("access", "fstat", "open", "read", "stat", "walk")


def is_index(content):
    """True for lines of comments and paths; the last one may be cut."""
    return content is not None and all(line[:1] in (b"", b"#", b"/") for line in lines_of(content))


# Where nothing was lost, only left.


@rule(
    "a failed deletion of the probe",
    "The probe file shows that home can be written; if it cannot be deleted, it stays, empty.",
    0,
    1,
)
def probe_stays(case, path):
    return (
        path == PROBE == case.hit and case.kind in ("unlink", "walk") and case.content(path) == b""
    )


@rule(
    "a failed step of a commit",
    "A commit ignores failures: the backup that cannot be deleted stays next to the new file.",
    0,
)
def backup_stays(case, path):
    return (
        path.endswith(BACKUP)
        and path == case.hit
        and case.kind in ("unlink", "walk")
        and case.new(path)
        and case.content(path) in contents_before(case, path.removesuffix(BACKUP))
    )


@rule(
    "a failed step of a rollback",
    "A rollback ignores failures and goes on: what it cannot delete, remove or rename stays, and "
    "the old content of a file that was not renamed back is in its backup.",
    1,
)
def rollback_step_fails(case, path):
    original = case.hit.removesuffix(BACKUP)
    if not case.point.late or case.kind not in ("unlink", "rename", "rmdir", "walk"):
        return False
    if (
        path == case.hit
        and case.kind in ("rmdir", "walk")
        and case.after.get(path)
        and (case.after[path].kind == "d")
    ):
        return case.new(path)
    if path == original + BACKUP:
        return case.new(path) and case.content(path) in contents_before(case, original)
    if path != original:
        return False
    if case.kind == "unlink" or case.kind == "walk" and case.content(path) is not None:
        return case.content(path) is not None
    # The second backup of a file of "config/xss" holds what the first pass had written.
    in_backup = case.content(original + BACKUP) in contents_before(case, original)
    return in_backup or case.content(path) == case.package.get(original)


@rule(
    "a removal is best effort",
    "What a removal cannot look at or delete stays, with what lies below; it succeeds all the "
    "same.",
    0,
)
def removal_is_best_effort(case, path):
    if case.scenario.arguments[0] != "r" or not (case.hits_above(path) or is_below(case.hit, path)):
        return False
    if case.hit == INDEX:
        return path == INDEX and case.kind in ("unlink", "walk") and is_index(case.content(path))
    disabled = path == CONTROL_STATE and (case.content(path) or b"").startswith(DISABLED)
    return path in case.after and (disabled or case.unchanged(path))


@rule(
    "deletions of an upgrade are best effort",
    'Obsolete files, the old "properties" and the cache that cannot be looked at or deleted '
    "stay; the upgrade succeeds all the same.",
    0,
    1,
)
def upgrade_deletion_is_best_effort(case, path):
    place = next(
        (
            p
            for p in (HOME + "/properties", HOME + "/cache_data", *OBSOLETE_FILES)
            if is_below(path, p)
        ),
        None,
    )
    return (
        place is not None
        and is_below(case.hit, place)
        and case.unchanged(path)
        and case.kind
        in ("access", "open", "fstat", "getdents64", "stat", "unlink", "rmdir", "walk")
    )


# Records that are kept outside of the journal.


@rule(
    "the index is not journalled",
    "The index of installed files stays after a rollback, as it then is, and is deleted after a "
    "failed extraction: a removal without it goes by the known places.",
    1,
)
def index_is_not_journalled(case, path):
    if path != INDEX:
        return False
    if path not in case.after:
        return case.says(EXTRACTION_FAILED)
    return is_index(case.content(path))


@rule(
    "the index is best effort",
    "An index that cannot be read, opened or written lists fewer files: a removal will know "
    "fewer.",
    0,
)
def index_is_best_effort(case, path):
    if path != INDEX or path not in case.wanted or not is_index(case.content(path)):
        return False
    ours = case.hit in (INDEX, INSTALL_TYPE) or (case.hits_above(INDEX) and case.says(NOT_INDEXED))
    known = set(lines_of(case.wanted[path].content)) | set(
        lines_of(case.before[path].content if path in case.before else b"")
    )
    return ours and all(line in known for line in lines_of(case.content(path))[1:])


@rule(
    "a removal deletes what the index lists",
    "A removal whose index cannot be read lists only the installer's own files and leaves the "
    "rest; one whose index is empty takes every file in the known places.",
    0,
)
def removal_goes_by_the_index(case, path):
    if case.scenario.arguments[0] != "r" or case.hit != INDEX:
        return False
    short = case.reference("with an index that lists nothing")
    return case.after.get(path) == short.get(path) or (
        case.lost(path) and is_below(path, HOME) and case.content(INDEX) is None
    )


@rule(
    "the install type is best effort",
    "The install-type file is neither journalled nor checked: one that cannot be written is "
    "missing, and a rollback leaves it.",
    0,
    1,
)
def install_type_is_best_effort(case, path):
    if path != INSTALL_TYPE:
        return False
    if case.status == 1:
        return case.new(path) and case.content(path) == TYPE_TEXT
    return case.hit == INSTALL_TYPE and case.lost(path)


@rule(
    "the single-user flag is not journalled",
    "The flag file is made at the end of every installation that asks for it, of a failing one "
    "too, and stays.",
    1,
)
def flag_is_not_journalled(case, path):
    return path == SINGLE_USER_FLAG and case.new(path) and case.content(path) == b""


@rule(
    "the common setting outlives a rollback",
    "The setting file of the common directory is the house's, not the installation's: once "
    "written, it stays. One that cannot be written is missing: the default counts.",
    0,
    1,
)
def setting_outlives(case, path):
    if not is_below(path, "/etc/kel") or path in case.before:
        return False
    if path == COMMON_SETTING and case.status == 0:
        return case.hit == path and case.lost(path)
    return case.new(path) and case.content(path) in (None, DEFAULT_SETTING)


@rule(
    "a common setting that cannot be read is left alone",
    "The default common directory is used in this run.",
    0,
)
def unreadable_setting(case, path):
    if case.hit != COMMON_SETTING or case.kind not in LOOKS or is_below(path, "/etc/kel"):
        return False
    without = case.reference("without a common setting")
    return case.after.get(path) == without.get(path)


@rule(
    "the common directory is best effort",
    "A common or log directory that cannot be created does not fail an installation.",
    0,
)
def common_directory_is_best_effort(case, path):
    return (
        is_below(path, "/usr/kel")
        and case.lost(path)
        and case.hits_above(path)
        and case.kind in ("mkdir", *LOOKS)
    )


# What an upgrade changes outside of the journal.


@rule(
    "an upgrade's deletions are not undone",
    'Obsolete files and "properties" are deleted without a journal entry: after a failure they '
    "are gone.",
    1,
)
def deletions_are_not_undone(case, path):
    return (
        case.says(DEPLOYING)
        and case.lost(path)
        and (path in OBSOLETE_FILES or is_below(path, HOME + "/properties"))
    )


@rule(
    "the settings are not journalled",
    "An upgrade brings Zor.properties to the new version without a journal entry: after a "
    "failure the edited file stays, with every setting of its owner.",
    1,
)
def settings_are_not_journalled(case, path):
    return path == SETTINGS and case.after.get(path) == case.normal.get(path)


@rule(
    "a property file that cannot be written keeps its old content",
    "Property files and scripts are replaced as a whole; a failure is no error.",
    0,
)
def property_file_keeps_its_content(case, path):
    if path not in (SETTINGS, TRACE_SETTINGS, *SCRIPTS) or path != case.hit:
        return False
    extracted = path in case.package and (path != SETTINGS or path not in case.before)
    old = case.package[path] if extracted else case.before[path].content
    return case.content(path) == old


@rule(
    'the second pass over "config/xss" takes the backup',
    "Its files are extracted twice; the second backup replaces the first, so a rollback from "
    "then on deletes them.",
    1,
)
def second_pass_takes_the_backup(case, path):
    return (
        os.path.dirname(path) == HOME + "/config/xss"
        and path in case.package
        and case.lost(path)
        and case.began_second_backup(path)
    )


# Steps whose failure is ignored.


@rule(
    "modes are best effort",
    "A mode that cannot be set is left as it is; the content is what counts.",
    0,
)
def modes_are_best_effort(case, path):
    return (
        case.only_mode_differs(path)
        and path == case.hit
        and case.kind in ("fchmod", "chmod", *LOOKS)
    )


@rule(
    "scripts are best effort",
    "A script that cannot be looked at, read or opened keeps its placeholders.",
    0,
)
def scripts_are_best_effort(case, path):
    return (
        path in SCRIPTS
        and path == case.hit
        and case.kind in ("open to create", *LOOKS)
        and case.content(path) == case.package[path]
    )


@rule(
    "a damaged entry is a shorter file",
    "A read error or failed seek in the package ends the entry's data without an error.",
    0,
)
def damaged_entry_is_shorter(case, path):
    content = case.content(path)
    if case.hit not in PACKAGES or case.kind not in ("read", "lseek"):
        return False
    return (
        path == case.point.entry
        and content is not None
        and (case.package[path].startswith(content) or case.package[case.hit].startswith(content))
    )


@rule(
    "a scanner control that does not run changes no state",
    "If a failure spoils the scanner control or fills its disk, its commands do nothing: the "
    "scanners stay disabled, or the common trace path unset. The restart comes before the "
    "rollback.",
    0,
    1,
)
def control_does_not_run(case, path):
    content = case.content(path)
    spoilt = case.point.entry in (CONTROL, COMMON_PROGRAM) or CONTROL_FAILED.search(case.output)
    return (
        path == CONTROL_STATE and bool(spoilt) and (content is None or content.startswith(DISABLED))
    )


@rule(
    "the common trace path is the scanner control's",
    "The last step of a fresh installation makes the scanner control keep the path, in a file of "
    "its own. If the installation fails after that, the file stays.",
    1,
)
def trace_path_stays(case, path):
    return (
        path == CONTROL_STATE
        and case.scenario.name == "install"
        and case.new(path)
        and case.content(path) == case.normal[path].content
        and TRACE_PATH_SET.search(case.output) is not None
    )


@rule(
    "the toolkit's programs leave their own files",
    "A scanner control that fails on a full disk leaves its empty scratch file.",
    0,
    1,
)
def scratch_file_stays(case, path):
    return (
        path == SCRATCH_FILE
        and case.content(path) == b""
        and CONTROL_FAILED.search(case.output) is not None
    )


# Judgements about the whole machine.


@rule(
    "a registry that cannot be read or verified counts as none",
    "If zor.ini cannot be opened or read, or home cannot be written, i makes a fresh "
    "installation: other exploiters, a newer version and the owner's settings are replaced.",
    0,
)
def unreadable_registry(case, _):
    unreadable = case.hit == REGISTRY and case.kind in LOOKS
    unwritable = case.hit == PROBE and case.kind in ("open to create", *LOOKS)
    return (
        case.scenario.arguments[0] == "i"
        and (unreadable or unwritable)
        and not differences(case.reference("with an empty registry"), case.after)
    )


@rule(
    "a scanner control that cannot be looked at counts as broken",
    "i then repairs the installation with its own version and registers that, also in place of a "
    "newer one.",
    0,
)
def unreadable_control(case, path):
    if (
        case.scenario.arguments[0] != "i"
        or case.hit != CONTROL
        or case.kind not in ("access", "stat", "walk")
    ):
        return False
    repaired = case.reference("without a scanner control")
    return path == REGISTRY and case.after[path] == repaired[path]


@rule(
    "a removal is not rolled back",
    "A removal that cannot save the registry leaves the old one, and its copy in zor.ini.bak.",
    1,
)
def removal_is_not_rolled_back(case, path):
    return (
        case.scenario.arguments[0] == "r"
        and path == REGISTRY + BACKUP
        and case.new(path)
        and case.hit in (REGISTRY, path)
        and case.before[REGISTRY].content.startswith(case.content(path) or b"")
    )


KEPT_DIRECTORY = Rule(
    "a directory that is not empty stays",
    "A rollback or a removal keeps a directory in which something excused above is left.",
)


def judge(case, points=None):
    """Fills in what is excused by which rule, and what by none.

    `points` are all the failing calls of the run, if there was not only that of the case.
    """
    paths = differences(case.wanted, case.after)
    for case.point in points or [case.point]:
        for path in paths:
            name = case.excused.get(path) or RULES.first(case, path)
            if name:
                case.excused[path] = name
    for path in reversed(paths):
        if path in case.excused:
            continue
        left = [below for below in case.excused if is_below(below, path) and below in case.after]
        if case.new(path) and case.after[path].kind == "d" and left:
            case.excused[path] = KEPT_DIRECTORY.name
        else:
            case.violations.append(path)
