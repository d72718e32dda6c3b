"""What a power cut may leave of an installation, judged by named rules.

Until an installation syncs what it wrote, every old file must be complete, under its own path or in
its backup. From the first step of the commit on, and after status 0, everything must be new and
complete. Only contents count: the modes of the tree are set at the very end, after the sync.
"""

from dataclasses import dataclass

from harness.cases import BACKUP, Case, RuleBook, is_below
from harness.scenarios import CONTROL_STATE, HOME, INDEX, OBSOLETE_FILES, SETTINGS

UNDECIDED = "undecided"  # before the commit, or after a rollback
COMMITTED = "committed"


@dataclass(kw_only=True)
class PowerCut(Case):
    """One snapshot; `status` is one of the two above.

    `live` is the tree that a reader saw just before the cut, `after` what the disk held.
    """

    live: dict
    place: str
    file_system: str

    def holds(self, path, *contents):
        """True when the disk has one of `contents` at `path`."""
        node = self.after.get(path)
        return node is not None and node.kind == "f" and node.content in contents

    def is_gone(self, path):
        """True when the run itself, not the cut, had replaced or deleted the old content."""
        return not has_old_content(self.before, self.live, path)


RULES = RuleBook()
rule = RULES.rule


def has_old_content(before, tree, path):
    wanted = before[path].content
    return any(
        node is not None and node.kind == "f" and node.content == wanted
        for node in (tree.get(path), tree.get(path + BACKUP))
    )


@rule(
    "an upgrade's deletions have no backup",
    'Obsolete files and the old "properties" are deleted before the package is extracted.',
    UNDECIDED,
)
def deletions_have_no_backup(case, path):
    deleted = path in OBSOLETE_FILES or is_below(path, HOME + "/properties")
    return deleted and case.scenario.name.endswith("upgrade") and case.is_gone(path)


@rule(
    "the index has no backup",
    "The index of installed files grows in place during an extraction.",
    UNDECIDED,
)
def index_has_no_backup(case, path):
    return path == INDEX and case.is_gone(path)


@rule(
    "settings are replaced without a backup",
    "Zor.properties goes from its old content to the new one in one step.",
    UNDECIDED,
)
def settings_have_no_backup(case, path):
    return path == SETTINGS and case.is_gone(path) and case.holds(path, case.live[path].content)


@rule(
    'the second pass over "config/xss" takes the backup',
    "Its files are extracted twice; the second backup replaces the first.",
    UNDECIDED,
)
def second_pass_takes_the_backup(case, path):
    return is_below(path, HOME + "/config/xss") and path in case.package and case.is_gone(path)


@rule(
    "the scanners' state is their own",
    "The scanner control writes its state itself and syncs nothing.",
    UNDECIDED,
    COMMITTED,
)
def state_is_the_scanners(case, path):
    if path != CONTROL_STATE:
        return False
    known = [tree[path].content for tree in (case.before, case.live, case.normal) if path in tree]
    return path not in case.after or case.holds(path, b"", *known)


def is_kept(case, path):
    """True when the disk has what it must have of the file `path`."""
    if case.status == COMMITTED:
        return case.holds(path, case.normal[path].content)
    return has_old_content(case.before, case.after, path)


def judge(case):
    """Fills in what is excused by which rule, and what by none."""
    wanted = case.normal if case.status == COMMITTED else case.before
    files = [path for path, node in wanted.items() if node.kind == "f"]
    for path in files:
        if is_kept(case, path):
            continue
        name = RULES.first(case, path)
        if name:
            case.excused[path] = name
        else:
            case.violations.append(path)


def commit_of(points):
    """The number of the point with which a commit begins: it deletes the first backup for good.

    A backup that is deleted only to make place for another one does not count. Returns the number
    of all points when there is no such deletion.
    """
    made_again = set()
    first = len(points)
    for number in range(len(points) - 1, -1, -1):
        point = points[number]
        if point.kind == "rename":
            made_again.add(point.target)
        elif point.kind == "open to create":
            made_again.add(point.path)
        elif point.kind == "unlink" and point.path.endswith(BACKUP):
            if point.path not in made_again and not point.result.startswith("-1"):
                first = number
    return first
