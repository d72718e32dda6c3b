"""What the comparisons of trees are made of: what a run found and left, and rules about it.

A rule names one way in which the installer deliberately does less than "all or nothing". It excuses
the difference at one path only if everything that is known about the run supports that.
"""

from dataclasses import dataclass, field
from typing import Callable

from harness.failure_points import Point
from harness.scenarios import HOME, Scenario

BACKUP = ".bak"
TEMPORARY = ".wzorinst-new"


@dataclass(frozen=True)
class Rule:
    """`excuses(change, path)` is true if the rule excuses the difference at `path`."""

    name: str
    reason: str = ""
    statuses: tuple = (0, 1)  # of the runs for which the rule is asked
    excuses: Callable | None = None


class RuleBook(list):
    """The rules of a sweep, in the order in which they are asked."""

    def rule(self, name, reason, *statuses):
        """Makes the decorated function a rule for runs that end with one of `statuses`."""

        def add(function):
            self.append(Rule(name, reason, statuses, function))
            return function

        return add

    def first(self, case, path):
        """The name of the first rule that excuses the difference at `path`, or None."""
        return next(
            (
                rule.name
                for rule in self
                if case.status in rule.statuses and rule.excuses(case, path)
            ),
            None,
        )


@dataclass(kw_only=True)
class Change:
    """The trees that a run found and left."""

    before: dict
    after: dict

    @property
    def wanted(self):
        """The tree that it should have left."""
        return self.before

    def content(self, path):
        """The bytes found at `path` afterwards, or None."""
        node = self.after.get(path)
        return node.content if node and node.kind == "f" else None

    def lost(self, path):
        return path in self.wanted and path not in self.after

    def new(self, path):
        return path not in self.wanted and path in self.after

    def kept(self, path):
        """True when there was something at `path` before and after."""
        return path in self.before and path in self.after

    def unchanged(self, path):
        """True when what the run found at `path` is still there, whatever its mode."""
        return is_same_but_for_the_mode(self.before.get(path), self.after.get(path))

    def only_mode_differs(self, path):
        return is_same_but_for_the_mode(self.wanted.get(path), self.after.get(path))


@dataclass(kw_only=True)
class Case(Change):
    """A run of a sweep, disturbed at `point`: how it ended, and what rules say about its trees."""

    scenario: Scenario
    point: Point
    status: int
    output: str
    normal: dict  # the tree that an undisturbed run leaves
    package: dict  # the bytes of each SPB and, by the path that it gets, of each file in it
    reference: Callable  # returns the tree of a run on a machine that differs in a named way
    excused: dict = field(default_factory=dict)  # path to the rule's name
    violations: list = field(default_factory=list)


@dataclass(kw_only=True)
class FailedCall(Case):
    """A run in which one call failed with `error`."""

    error: str
    name_changes: list  # the renamings and deletions that the run tried

    @property
    def wanted(self):
        if self.status != 0:
            return self.before
        return self.reference("without its failure") if self.scenario.fails else self.normal

    @property
    def hit(self):
        """The path of the failing call, without a slash at its end; of the new content of a file
        the path of that file."""
        return self.point.path.rstrip("/").removesuffix(TEMPORARY)

    @property
    def kind(self):
        return self.point.kind

    def hits_above(self, path):
        """True when the call failed on `path` or on a directory that leads to it."""
        return is_below(path, self.hit) and self.hit != ""

    def says(self, text):
        """True when the run printed `text`, or could not print."""
        return text in self.output or self.hit == "standard output"

    def began_second_backup(self, path):
        """True when the run gave up its backup of `path` to make another one."""
        backup = path + BACKUP
        made = given_up = False
        for change in self.name_changes:
            if change.target == backup and (given_up or made and change.done):
                return True
            made = made or change.target == backup and change.done
            given_up = made and (
                given_up or change.kind == "unlink" and change.path == backup and change.done
            )
        return False


def is_same_but_for_the_mode(wanted, got):
    return (
        wanted is not None
        and got is not None
        and wanted.kind == got.kind
        and wanted.content == got.content
        and wanted.owner == got.owner
    )


def is_below(path, directory):
    return path == directory or path.startswith(directory + "/")


def lines_of(content):
    return content.split(b"\n")


def contents_before(case, path):
    """What a backup of `path` may hold: for a file of "config/xss" also what the package brings."""
    node = case.before.get(path)
    found = [node.content] if node else []
    return found + [case.package[path]] if is_below(path, HOME + "/config/xss") else found
