"""Two runs of the installer at once, and their permitted outcomes.

Both run on one machine, the second a moment after the first. A round is right when statuses and
tree are those of the two runs one after the other, in either order. Without a lock that is only
measured; but the registry must always be complete, and newer than before both runs.
"""

import json
import os
import random
import signal
from concurrent.futures import ThreadPoolExecutor
from dataclasses import dataclass, field

from harness.machine import ANN, BINARY, ROOT, SPB
from harness.scenarios import (
    COMMAND_LOG,
    REGISTRY,
    differences,
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
TURN = "/tmp/turn"
WAIT_FOR_TURN = f'read line <{TURN}; exec "$@"'


@dataclass(frozen=True)
class Pair:
    """Two command lines of the installer, and the machine on which they meet."""

    name: str
    title: str
    runs: tuple
    prepare: object
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
# "interrupt", the first one gets what Ctrl-C sends, after that time; the second then starts only
# when the first one has its lock. The last thing printed is how long it took.
DRIVER = """
import json, os, signal, subprocess, sys, time
signal.signal(signal.SIGINT, signal.SIG_DFL)  # ignored by whatever was started in the background
plan = json.loads(sys.argv[1])
started = []
def name_of(process):
    with open(f"/proc/{process.pid}/comm") as file:
        return file.read().strip()
for delay, command in plan["runs"]:
    time.sleep(delay)
    if plan["interrupt"] is not None and started:
        # Just after Popen() it may still have our name, and then has that of flock.
        while name_of(started[0]) != "wzorinst" and started[0].poll() is None:
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
    differing: list = field(default_factory=list)  # paths that make a round wrong


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

    def meet(self, machine, number, lock=()):
        """Plays one round. `lock` is the command under which both run."""
        self.restore(machine, self.before)
        chance = random.Random(number)
        first, second = chance.sample((0, 1), 2)
        delay = chance.random() ** 2 * max(self.seconds)
        runs = [(0, self.pair.runs[first]), (delay, self.pair.runs[second])]
        ended, _ = start(machine, self.pair, runs, lock)
        played = self.round_of(machine, number, dict(zip((first, second), ended)))
        played.is_right = (played.statuses, played.tree) in self.in_order
        if not played.is_right:
            played.differing = min(
                (differences(tree, played.tree) for _, tree in self.in_order), key=len
            )
        return played

    def interrupt(self, machine, number, lock):
        """Plays one round in which the first run gets what Ctrl-C sends, at a random moment.

        It is right if the second run finds what the first one left at its end, and nothing changes
        afterwards but by that second run: its status and tree are those of a third one alone, from
        there. What an interrupted run leaves is the subject of scripts/signal_sweep; here only its
        registry is looked at, which must be the old or the new one.
        """
        self.restore(machine, self.before)
        chance = random.Random(number)
        first, second = chance.sample((0, 1), 2)
        runs = [(0, self.pair.runs[first]), (0, self.pair.runs[second])]
        moment = chance.uniform(0, max(self.seconds))
        with Turn(machine) as turn, ThreadPoolExecutor(1) as pool:
            ending = pool.submit(turn.ended_by, start, machine, self.pair, runs, lock, moment)
            between = turn.tree_before_second(self.pair.lock)
            ended, _ = ending.result()
        played = self.round_of(machine, number, dict(zip((first, second), ended)))

        self.restore(machine, between)
        [[_, status]], _ = start(machine, self.pair, [runs[1]])
        ends = [self.before, self.alone[first][1]]
        played.differing = differences(tree_of(machine), played.tree)
        played.is_right = (
            (played.statuses[second], played.differing) == (status, [])
            and played.statuses[first] in (0, -signal.SIGINT)
            and between.get(self.pair.registry) in [end.get(self.pair.registry) for end in ends]
        )
        return played

    def round_of(self, machine, number, ended):
        """The round that ended with `ended`, an output and a status for each run."""
        if machine.exists(self.pair.lock):
            machine.remove(self.pair.lock)
        outputs, statuses = zip(*(ended[run] for run in (0, 1)))
        played = Round(self.pair, number, list(statuses), list(outputs), tree_of(machine))
        self.find(played)
        return played

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


class Turn:
    """Holds back the second run when it has the lock, until the tree that it finds was read."""

    def __init__(self, machine):
        self.machine = machine
        self.fifo = machine.at(TURN)

    def __enter__(self):
        os.mkfifo(self.fifo)
        os.chmod(self.fifo, 0o666)
        return self

    def __exit__(self, *_):
        if os.path.exists(self.fifo):
            os.unlink(self.fifo)

    def ended_by(self, function, *arguments):
        """Calls `function`; whatever comes of it, tree_before_second() does not wait any longer."""
        try:
            return function(*arguments)
        finally:
            if os.path.exists(self.fifo):
                os.close(os.open(self.fifo, os.O_RDONLY | os.O_NONBLOCK))

    def tree_before_second(self, lock):
        """The machine's tree at the moment when the second run has the lock; then lets it go on."""
        with open(self.fifo, "w", encoding="ascii") as fifo:  # waits for the reader
            os.unlink(self.fifo)
            tree = tree_of(self.machine)
            fifo.write("go\n")
        tree.pop(lock)
        return tree


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
    commands = [[delay, [*lock, BINARY, *run]] for delay, run in runs]
    if interrupt is not None:
        commands[1][1] = [*lock, "/bin/sh", "-c", WAIT_FOR_TURN, "sh", BINARY, *runs[1][1]]
    plan = {"runs": commands, "interrupt": interrupt}
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
