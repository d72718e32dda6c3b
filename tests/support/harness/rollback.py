"""What a rollback brings back, and the named rules for what it does not.

The journal knows files that were backed up or extracted and directories that were made. Each
rule below names one thing that a run changes beside the journal, so that it stays as it is after
a rollback. A difference that no rule explains is a defect, and so is a rule that a test names
without need.
"""

import os
from dataclasses import dataclass
from typing import Callable

from harness.checks import describe

COMMON_SETTING_PLACES = ("/etc/kel", "/etc/kel/corvan", "/etc/kel/corvan/common",
                         "/etc/kel/corvan/common/cfg",
                         "/etc/kel/corvan/common/cfg/log.properties")

OBSOLETE_FILES = ("trawlnet", "trawlnet.so", "trawluse", "trawluse.so", "libzor.so",
                  "kpo_config.xml", "libxerces-c.so.26")


@dataclass(frozen=True)
class Rule:
    """`explains(path, before, after)` answers for one name whose nodes (or None) differ."""

    name: str
    explains: Callable


FILE_INDEX = Rule(
    "the file index is written without the journal, and deleted when the extraction fails",
    lambda path, before, after: os.path.basename(path) == "ZOR_files")

INSTALL_TYPE_FILE = Rule(
    "the install-type file is written without the journal",
    lambda path, before, after: path.endswith("/install/zor_install.properties") and after)

SINGLE_USER_FLAG = Rule(
    "the single-user flag is written without the journal, after failures too",
    lambda path, before, after: path.endswith("/config/SingleUserMode") and after)

COMMON_SETTING = Rule(
    "the setting of the common directory is written in a transaction that is dropped",
    lambda path, before, after: path in COMMON_SETTING_PLACES and not before)

REGISTRY_MODE = Rule(
    "the registry is restored from a copy, which has the mode of the process umask",
    lambda path, before, after: os.path.basename(path) == "zor.ini" and before and after
    and before.content == after.content)

OLDER_BACKUP = Rule(
    "only one backup generation exists: an older backup of a replaced file is deleted",
    lambda path, before, after: path.endswith(".bak") and before and not after)

XSS_FILES = Rule(
    "the second pass over config/xss puts the first pass's file in place of the backup",
    lambda path, before, after: "/config/xss/" in path and before and not after)

PROPERTIES_DIRECTORY = Rule(
    "an upgrade deletes the properties directory without the journal",
    lambda path, before, after: "/properties" in path and not path.startswith("/etc")
    and before and not after)

OBSOLETE_FILE = Rule(
    "an upgrade deletes obsolete files without the journal",
    lambda path, before, after: os.path.basename(path) in OBSOLETE_FILES and before and not after)

MAIN_PROPERTY_FILE = Rule(
    "a Zor.properties that is not extracted is edited in place, without the journal",
    lambda path, before, after: path.endswith("/config/Zor.properties") and before and after)

TRACE_PROPERTY_FILE = Rule(
    "a ZorTrace.properties that is not extracted is edited in place, without the journal",
    lambda path, before, after: path.endswith("/config/ZorTrace.properties") and before and after)

SCRIPTS_OF_OLD = Rule(
    "a script that the package does not carry is edited in place, without the journal",
    lambda path, before, after: path.endswith(("/install/trawlcfg.sh", "/install/rmdirs.sh"))
    and before and after and before.mode == after.mode)


def unexplained(before, after, rules):
    """The differences of two trees that no rule explains, as lines, and the rules in use."""
    differing = {path for path in set(before) | set(after) if before.get(path) != after.get(path)}
    used = {path: rule for path in differing for rule in rules
            if rule.explains(path, before.get(path), after.get(path))}
    # A directory made for something that stays cannot be removed by the rollback.
    kept_open = {parent for path in used if path in after for parent in parents(path)}
    lines = []
    for path in sorted(differing - set(used)):
        is_new_directory = path not in before and after[path].kind == "d"
        if not (path in kept_open and is_new_directory):
            lines.append(f"{path}\n    before: {describe(before.get(path))}\n    after:  "
                         f"{describe(after.get(path))}\n")
    return lines, set(used.values())


def parents(path):
    while path != "/":
        path = os.path.dirname(path)
        yield path


def rolled_back(machine, before, *rules):
    """Checks that the machine is as in the tree `before`, save what `rules` explain.

    Each rule must be needed.
    """
    lines, used = unexplained(before, machine.tree(), rules)
    if lines:
        raise AssertionError("\nnot brought back by the rollback:\n" + "".join(lines))
    for rule in rules:
        assert rule in used, "not needed: " + rule.name
