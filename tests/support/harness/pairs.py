"""Two runs of the installer at once, and what may come of them.

Both run on one machine, the second a moment after the first. A round is right when statuses and
tree are those of the two runs one after the other, in either order. Without a lock that is only
measured; but whatever happens, the registry must be whole, and not from before both runs.
"""

import json
import random
from dataclasses import dataclass, field, replace

from harness.machine import ANN, BINARY, ROOT, SPB
from harness.scenarios import (
    COMMAND_LOG,
    REGISTRY,
    last_exploiter,
    newer_version,
    nothing_installed,
    older_version,
    tree_of,
    two_exploiters,
)

LOCK = "/run/wzorinst.lock"
USER_LOCK = "/home/ann/.wzorinst.lock"
USER_REGISTRY = "/home/ann/.zor/zor.ini"


@dataclass(frozen=True)
class Pair:
    """Two command lines of the installer, and the machine on which they meet."""

    name: str
    title: str
    runs: tuple
    furnish: object
    user: object = ROOT

    @property
    def registry(self):
        return REGISTRY if self.user is ROOT else USER_REGISTRY

    @property
    def lock(self):
        return LOCK if self.user is ROOT else USER_LOCK


def install_for(exploiter):
    return ("i", exploiter, "-s", SPB)


PAIRS = {
    pair.name: pair
    for pair in (
        Pair(
            "register",
            "two registrations on a newer version",
            (install_for("CLUB"), install_for("TEAM")),
            newer_version,
        ),
        Pair(
            "fresh",
            "two fresh installations",
            (install_for("SHOP"), install_for("DESK")),
            nothing_installed,
        ),
        Pair(
            "upgrade",
            "two upgrades",
            (install_for("CLUB"), install_for("TEAM")),
            older_version,
        ),
        Pair(
            "upgrade-remove",
            "an upgrade and the last removal",
            (install_for("CLUB"), ("r", "SHOP")),
            last_exploiter,
        ),
        Pair("remove", "two removals", (("r", "SHOP"), ("r", "DESK")), two_exploiters),
        Pair(
            "user",
            "two fresh installations of one user",
            (install_for("SHOP"), install_for("DESK")),
            nothing_installed,
            ANN,
        ),
    )
}

# Starts commands after a time each, in sessions of their own, and prints how they ended. With
# "interrupt", the first one gets what Ctrl-C sends, after that time; the others then start only
# when it has its lock. The last thing printed is how long it took.
DRIVER = """
import json, os, signal, subprocess, sys, time
plan = json.loads(sys.argv[1])
started = []
def name_of(process):
    with open(f"/proc/{process.pid}/comm") as file:
        return file.read().strip()
for delay, command in plan["runs"]:
    time.sleep(delay)
    if plan["interrupt"] is not None and started:
        while name_of(started[0]) == "flock":
            time.sleep(0.001)
    started.append(subprocess.Popen(command, start_new_session=True, stdin=subprocess.DEVNULL,
                                    stdout=subprocess.PIPE, stderr=subprocess.STDOUT))
if plan["interrupt"] is not None:
    time.sleep(plan["interrupt"])
    if started[0].poll() is None:
        os.killpg(started[0].pid, signal.SIGINT)
begun = time.monotonic()
ended = [[process.communicate()[0].decode(), process.returncode] for process in started]
print(json.dumps([ended, time.monotonic() - begun]))
"""


@dataclass
class Round:
    """What came of one round."""

    pair: Pair
    number: int
    statuses: list
    outputs: list
    tree: dict
    is_right: bool = False
    findings: list = field(default_factory=list)
    violations: list = field(default_factory=list)


class Meeting:
    """A pair on machines of a laboratory: the tree it finds, and the ends that are right."""

    def __init__(self, pair, machine, before, restore):
        self.pair = pair
        self.before = before
        self.restore = restore
        self.seconds = [0, 0]
        self.alone = [self.end_of(machine, [number]) for number in (0, 1)]
        self.in_order = [self.end_of(machine, order) for order in ((0, 1), (1, 0))]
        self.registries = {tree.get(pair.registry) for _, tree in (*self.alone, *self.in_order)}

    def end_of(self, machine, order):
        """The statuses by run, and the tree, of runs one after the other."""
        self.restore(machine, self.before)
        statuses = [None, None]
        for number in order:
            run = (0, self.pair.runs[number])
            [[_, statuses[number]]], self.seconds[number] = start(machine, self.pair, [run])
        return statuses, tree_of(machine)

    def meet(self, machine, number, lock=(), interrupts=False):
        """Plays one round. `lock` is the command under which both run."""
        self.restore(machine, self.before)
        chance = random.Random(number)
        first, second = chance.sample((0, 1), 2)
        length = max(self.seconds)
        runs = [(0, self.pair.runs[first]), (chance.random() ** 2 * length, self.pair.runs[second])]
        if interrupts:
            runs[1] = (0, runs[1][1])
        ended, _ = start(
            machine, self.pair, runs, lock, chance.uniform(0, length) if interrupts else None
        )
        if lock:
            machine.remove(self.pair.lock)
        played = Round(self.pair, number, [None, None], [None, None], tree_of(machine))
        for run, (output, status) in zip((first, second), ended):
            played.statuses[run], played.outputs[run] = status, output
        ends = self.in_order
        if interrupts:
            ends = [self.interrupted(self.alone[second], first), self.in_order[first]]
            ends.append(self.interrupted(self.in_order[first], first))
        if interrupts:
            # The index of an interrupted run outlives its rollback: the next one adds to it.
            ends = [(statuses, with_sorted_index(tree)) for statuses, tree in ends]
            played.is_right = (played.statuses, with_sorted_index(played.tree)) in ends
        else:
            played.is_right = (played.statuses, played.tree) in ends
        self.find(played)
        return played

    @staticmethod
    def interrupted(end, number):
        statuses, tree = end
        return [-2 if run == number else status for run, status in enumerate(statuses)], tree

    def find(self, played):
        """Names what is not as it would be one after the other."""
        if any(status not in (0, 1) for status in played.statuses):
            played.findings.append("died")
        if any(status != 0 for status in played.statuses):
            played.findings.append("run failed")
        wanted = [tree for _, tree in self.in_order]
        registry = played.tree.get(self.pair.registry)
        contents = [node and node.content for node in self.registries]
        if registry is None and None not in contents:
            played.findings.append("no registry")
            if 0 in played.statuses:
                played.violations.append("the registry is gone")
        elif registry is not None and not is_whole(registry.content):
            played.violations.append("the registry is not whole")
        elif 0 in played.statuses and registry == self.before.get(self.pair.registry):
            if registry not in self.registries:
                played.violations.append("the registry is older than both runs")
        if all(registry != tree.get(self.pair.registry) for tree in wanted):
            played.findings.append("registration lost")
        others = [{p: n for p, n in tree.items() if p != self.pair.registry} for tree in wanted]
        if {p: n for p, n in played.tree.items() if p != self.pair.registry} not in others:
            played.findings.append("other files")


def with_sorted_index(tree):
    """The tree with each line of a file index once, in order."""
    return {
        path: (
            replace(node, content=b"\n".join(sorted(set(node.content.split(b"\n")))))
            if path.endswith("/ZOR_files")
            else node
        )
        for path, node in tree.items()
    }


def is_whole(content):
    """True for the text of a complete registry."""
    keys = [line.partition(b" = ")[0] for line in content.split(b"\n")]
    return keys == [
        b"ZOR_Version",
        b"ZOR_BuildDate",
        b"ZOR_HomeDirectory",
        b"ZOR_Exploiters",
        b"ZOR_ConfigRootDirectory",
        b"",
    ]


def start(machine, pair, runs, lock=(), interrupt=None):
    """Starts command lines, each after a time.

    Returns the output and the status of each, and how long they took.
    """
    plan = {"runs": [[delay, [*lock, BINARY, *run]] for delay, run in runs], "interrupt": interrupt}
    outcome = machine.execute(
        ["/usr/bin/python3", "-I", "-c", DRIVER, json.dumps(plan)],
        pair.user,
        0o022,
        {"ZOR_COMMAND_LOG": COMMAND_LOG},
        (),
        False,
    )
    assert outcome.status == 0, outcome
    return json.loads(outcome.stdout)
