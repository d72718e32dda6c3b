"""A random life in which every run of the installer is planned first and compared with its plan."""

import json

import jsonschema

from harness.checks import same_lines
from harness.life import Life
from harness.zorctl import schema, zorctl

LOCKS = ("/run/wzorinst.lock", "/home/ann/.wzorinst.lock")


class PlannedLife(Life):
    """A `Life` that fails if a run does anything else than `zorctl plan` said."""

    validator = jsonschema.Draft7Validator(schema("plan"))

    def __init__(self, binary, seed):
        super().__init__(binary, seed)
        self.machine.make_directory("/run")
        self.beginning = self.machine.tree()

    def run(self, place, *arguments):
        if arguments[0] == "t":
            return super().run(place, *arguments)
        before = self.machine.tree()
        outcome = zorctl(self.machine, "plan", "--json", *arguments, user=place.user)
        for lock in LOCKS:
            if self.machine.exists(lock):
                self.machine.remove(lock)
        assert outcome.stdout, outcome.stderr
        plan = json.loads(outcome.stdout)
        self.validator.validate(plan)
        assert self.machine.tree() == before, "the plan changed something"

        outcome = super().run(place, *arguments)

        after = self.machine.tree()
        if not self.depends_on_failing_command(plan, outcome):
            compare(plan, outcome, before, after, "-norollback" in arguments)
        return outcome

    def depends_on_failing_command(self, plan, outcome):
        """A plan assumes that commands succeed: one that fails may make the run fail."""
        return (
            plan["succeeds"]
            and outcome.status == 1
            and "common_trace_path" in self.failures
            and any("common_trace_path" in command for command in plan["commands"])
        )


def names(tree, kind):
    """The paths of the directories of `tree`, or of everything else."""
    return {path for path, node in tree.items() if (node.kind == "d") == (kind == "d")}


def compare(plan, outcome, before, after, keeps_all):
    """Compares what was planned with what happened."""
    assert outcome.status == (0 if plan["succeeds"] else 1), f"{plan}\n{outcome.stdout}"
    changed = {
        path
        for path in names(before, "f") & names(after, "f")
        if before[path].content != after[path].content
    }
    vanished = names(before, "f") - names(after, "f")
    if not plan["succeeds"]:
        lost = (changed | vanished) - set(plan["not_restored"])
        assert keeps_all or not lost, f"not brought back and not foreseen: {sorted(lost)}"
        return
    same_lines(sorted(names(after, "f") - names(before, "f")), sorted(plan["created"]), "created")
    same_lines(sorted(vanished), sorted(plan["deleted"]), "deleted")
    same_lines(
        sorted(names(after, "d") - names(before, "d")),
        sorted(plan["created_directories"]),
        "created directories",
    )
    same_lines(
        sorted(names(before, "d") - names(after, "d")),
        sorted(plan["deleted_directories"]),
        "deleted directories",
    )
    unforeseen = changed - set(plan["replaced"]) - set(plan["edited"])
    assert not unforeseen, f"changed and not foreseen: {sorted(unforeseen)}"
    if plan["unchanged"]:
        assert before == after, "something changed"
