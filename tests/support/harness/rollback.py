"""What a rollback restores, and the named rules for what it does not.

The journal holds the files that were backed up or extracted and the directories that were made.
Each rule below names one thing that a run changes without the journal, so that a rollback leaves it
changed. A difference that no rule excuses is a defect, and so is a rule that a test names without
need.
"""

import os

from harness.cases import Change, Rule
from harness.checks import describe

COMMON_SETTING_PLACES = (
    "/etc/kel",
    "/etc/kel/corvan",
    "/etc/kel/corvan/common",
    "/etc/kel/corvan/common/cfg",
    "/etc/kel/corvan/common/cfg/log.properties",
)

OBSOLETE_FILES = (
    "trawlnet",
    "trawlnet.so",
    "trawluse",
    "trawluse.so",
    "libzor.so",
    "kpo_config.xml",
    "libxerces-c.so.26",
)


FILE_INDEX = Rule(
    "the file index is written without the journal, and deleted when the extraction fails",
    excuses=lambda change, path: os.path.basename(path) == "ZOR_files",
)

INSTALL_TYPE_FILE = Rule(
    "the install-type file is written without the journal",
    excuses=lambda change, path: path.endswith("/install/zor_install.properties")
    and path in change.after,
)

SINGLE_USER_FLAG = Rule(
    "the single-user flag is written without the journal, after failures too",
    excuses=lambda change, path: path.endswith("/config/SingleUserMode") and path in change.after,
)

COMMON_SETTING = Rule(
    "the setting of the common directory is written in a transaction that is dropped",
    excuses=lambda change, path: path in COMMON_SETTING_PLACES and change.new(path),
)

OLDER_BACKUP = Rule(
    "only one backup generation exists: an older backup of a replaced file is deleted",
    excuses=lambda change, path: path.endswith(".bak") and change.lost(path),
)

XSS_FILES = Rule(
    "the second pass over config/xss puts the first pass's file in place of the backup",
    excuses=lambda change, path: "/config/xss/" in path and change.lost(path),
)

PROPERTIES_DIRECTORY = Rule(
    "an upgrade deletes the properties directory without the journal",
    excuses=lambda change, path: "/properties" in path
    and not path.startswith("/etc")
    and change.lost(path),
)

OBSOLETE_FILE = Rule(
    "an upgrade deletes obsolete files without the journal",
    excuses=lambda change, path: os.path.basename(path) in OBSOLETE_FILES and change.lost(path),
)

MAIN_PROPERTY_FILE = Rule(
    "a Zor.properties that is not extracted is edited in place, without the journal",
    excuses=lambda change, path: path.endswith("/config/Zor.properties") and change.kept(path),
)

TRACE_PROPERTY_FILE = Rule(
    "a ZorTrace.properties that is not extracted is edited in place, without the journal",
    excuses=lambda change, path: path.endswith("/config/ZorTrace.properties") and change.kept(path),
)

SCRIPTS_OF_OLD = Rule(
    "a script that the package does not carry is edited in place, without the journal",
    excuses=lambda change, path: path.endswith(("/install/trawlcfg.sh", "/install/rmdirs.sh"))
    and change.kept(path)
    and change.before[path].mode == change.after[path].mode,
)


def unexplained(before, after, rules):
    """The differences of two trees that no rule excuses, as lines, and the rules in use."""
    change = Change(before=before, after=after)
    differing = {path for path in set(before) | set(after) if before.get(path) != after.get(path)}
    used = {path: rule for path in differing for rule in rules if rule.excuses(change, path)}
    # A directory made for something that stays cannot be removed by the rollback.
    kept_open = {parent for path in used if path in after for parent in parents(path)}
    lines = []
    for path in sorted(differing - set(used)):
        is_new_directory = path not in before and after[path].kind == "d"
        if not (path in kept_open and is_new_directory):
            lines.append(
                f"{path}\n    before: {describe(before.get(path))}\n    after:  "
                f"{describe(after.get(path))}\n"
            )
    return lines, set(used.values())


def parents(path):
    while path != "/":
        path = os.path.dirname(path)
        yield path


def rolled_back(machine, before, *rules):
    """Checks that the machine is as in the tree `before`, except for what `rules` excuse.

    Each rule must be needed.
    """
    lines, used = unexplained(before, machine.tree(), rules)
    if lines:
        raise AssertionError("\nnot restored by the rollback:\n" + "".join(lines))
    for rule in rules:
        assert rule in used, "not needed: " + rule.name
