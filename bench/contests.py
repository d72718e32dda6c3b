#!/usr/bin/python3
"""The measuring half of bench/run: runs inside of its sandbox, prints its results as JSON.

    contests.py PLAN        (PLAN: JSON, see bench/run)

Only the contestants' own processes are timed; the sandbox, the cleaning of targets and the
preparation of states are not measured. Contestants take turns, A B A B, on the same tmpfs.
"""

import json
import os
import re
import statistics
import subprocess
import sys
import tempfile
from dataclasses import dataclass

MEDIA = "/media"
PEER_DIR = "/opt/peer"
WRITTEN_BY_RUNS = ("/opt", "/etc/zor", "/etc/kel", "/usr/kel")
HEADROOM_MB = 128
PIECE = str(256 * 1024)


@dataclass(frozen=True)
class Contestant:
    """A command on a package. `prepare` are the commands that lead to the state it starts from."""

    name: str
    command: list
    prepare: tuple = ()


class Bench:
    """Runs contests by the plan."""

    def __init__(self, plan):
        self.plan = plan

    # Contestants.

    def program(self, preset, name):
        directory = "bench" if name != "wzorinst" else "src/install/standalone"
        return os.path.join(self.plan["builds"][preset], directory, name)

    def installer(self, preset, action, package, program="wzorinst"):
        command = [self.program(preset, program), action, "BENCH", "-o", "/tmp/log"]
        return command + (["-s", f"{MEDIA}/{package}.spb"] if action == "i" else [])

    def unpacker(self, name, preset, package):
        twin = f"{MEDIA}/{package}.zip"
        return {
            "unzip": ["/usr/bin/unzip", "-q", "-o", twin, "-d", PEER_DIR],
            "bsdtar": ["/usr/bin/bsdtar", "-x", "-f", twin, "-C", PEER_DIR],
            "7zz": ["/usr/bin/7zz", "x", "-y", "-bso0", "-bsp0", "-o" + PEER_DIR, twin],
            "floor": [self.program(preset, "floor"), twin, PEER_DIR],
            "floor in pieces": [self.program(preset, "floor"), twin, PEER_DIR, PIECE],
        }[name]

    # Measuring.

    def empty_target(self):
        run("/usr/bin/rm", "-rf", *WRITTEN_BY_RUNS)
        os.makedirs(PEER_DIR)

    def sample(self, contestant, package):
        """One timed run, from an empty target or from the state that `prepare` makes."""
        self.empty_target()
        for command in contestant.prepare:
            run(*command)
        return self.timed(contestant.command, package)

    def timed(self, command, package):
        megabytes = HEADROOM_MB + 2 * self.plan["packages"][package]["size"] // 1_000_000
        megabytes += self.plan["packages"][package]["files"] // 100
        measure = self.program("release", "measure")
        line = run(measure, str(megabytes), *command).stdout
        wall, user, system, memory, status = map(int, line.split())
        if status != 0:
            sys.exit(f"{command}: wait status {status}")
        return {"wall": wall / 1e6, "cpu": (user + system) / 1e3, "memory": memory}

    def contest(self, package, kind, preset, ours, theirs, pairs):
        """`pairs` samples of both, in turns, after one of each that does not count."""
        progress(f"{package} {kind}: {ours.name} ({preset}) and {theirs.name}")
        samples = {"ours": [], "theirs": []}
        for _ in range(pairs + 1):
            samples["ours"].append(self.sample(ours, package))
            samples["theirs"].append(self.sample(theirs, package))
        return {"package": package, "kind": kind, "preset": preset, "opponent": theirs.name,
                "ours": columns(samples["ours"][1:]), "theirs": columns(samples["theirs"][1:])}

    # The contests.

    def install(self, package, preset, opponent, program="wzorinst"):
        ours = Contestant(program, self.installer(preset, "i", package, program))
        theirs = Contestant(opponent, self.unpacker(opponent, preset, package))
        kind = "install" if program == "wzorinst" else "install, commands aside"
        return self.contest(package, kind, preset, ours, theirs, self.plan["pairs"])

    def upgrade(self, package, preset, opponent):
        again = self.installer(preset, "i", package)
        over = self.unpacker(opponent, preset, package)
        return self.contest(package, "upgrade", preset, Contestant("wzorinst", again, (again,)),
                            Contestant(opponent, over, (over,)), self.plan["pairs"])

    def removal(self, package, preset, program="wzorinst"):
        prepare = (self.installer(preset, "i", package),)
        ours = Contestant(program, self.installer(preset, "r", package, program), prepare)
        everything = ["/usr/bin/rm", "-rf", "/opt/corvan", "/etc/zor", "/usr/kel/corvan/common/ZOR"]
        kind = "removal" if program == "wzorinst" else "removal, commands aside"
        return self.contest(package, kind, preset, ours,
                            Contestant("rm -rf", everything, prepare), self.plan["pairs"])

    def fixed_cost(self, preset):
        """The smallest package, without external commands, against a program that prints a line."""
        bare = self.installer(preset, "i", "tiny", "wzorinst_no_commands")
        whole = self.installer(preset, "i", "tiny")
        line = Contestant("line", [self.program(preset, "line")])
        pairs = self.plan["short_pairs"]
        return [self.contest("tiny", "fixed cost, commands aside", preset,
                             Contestant("wzorinst_no_commands", bare), line, pairs),
                self.contest("tiny", "fixed cost, whole", preset,
                             Contestant("wzorinst", whole), line, pairs)]

    def growth(self, packages, kinds):
        """Medians of each kind of run on packages that differ in size only, in turns."""
        samples = {(package, kind): [] for package in packages for kind in kinds}
        for _ in range(self.plan["growth_rounds"] + 1):
            for package, kind in samples:
                progress(f"growth: {package} {kind}")
                samples[package, kind].append(self.growth_sample(package, kind))
        return [{"package": package, "kind": kind, **columns(taken[1:])}
                for (package, kind), taken in samples.items()]

    def growth_sample(self, package, kind):
        install = self.installer("release", "i", package)
        remove = self.installer("release", "r", package)
        command = remove if kind == "removal" else install
        return self.sample(Contestant(kind, command, () if kind == "install" else (install,)),
                           package)

    def instructions(self, package, preset):
        """Instructions of the installer and of the floor, without external commands."""
        progress(f"{package}: instructions ({preset})")
        return {"package": package, "preset": preset,
                "ours": self.count_instructions(self.installer(preset, "i", package)),
                "floor": self.count_instructions(self.unpacker("floor", preset, package))}

    def count_instructions(self, command):
        self.empty_target()
        done = run("/usr/bin/valgrind", "--tool=callgrind", "--callgrind-out-file=/dev/null",
                   *command)
        return int(re.search(r"Collected : (\d+)", done.stderr).group(1))

    def system_calls(self, package):
        """How often the installer and the floor make each system call."""
        progress(f"{package}: system calls")
        return {"package": package,
                "ours": self.count_calls(self.installer("release", "i", package)),
                "floor": self.count_calls(self.unpacker("floor", "release", package))}

    def count_calls(self, command):
        self.empty_target()
        with tempfile.NamedTemporaryFile("r") as file:
            run("/usr/bin/strace", "-c", "-U", "calls,name", "-o", file.name, *command)
            rows = [line.split() for line in file.read().splitlines()]
        return {row[1]: int(row[0]) for row in rows if row[0].isdigit() and row[1] != "total"}

    def run(self):
        plan = self.plan
        results = {"contests": [], "growth": [], "instructions": [], "system_calls": []}
        for package in plan["system_calls"]:
            results["system_calls"].append(self.system_calls(package))
        for package, preset in plan["instructions"]:
            results["instructions"].append(self.instructions(package, preset))
        contests = results["contests"]
        for kind, package, preset, opponent in plan["contests"]:
            if kind == "install":
                contests.append(self.install(package, preset, opponent))
            elif kind == "install, commands aside":
                contests.append(self.install(package, preset, opponent, "wzorinst_no_commands"))
            elif kind == "upgrade":
                contests.append(self.upgrade(package, preset, opponent))
            elif kind == "removal":
                contests.append(self.removal(package, preset))
                contests.append(self.removal(package, preset, "wzorinst_no_commands"))
            else:
                contests += self.fixed_cost(preset)
        for packages, kinds in plan["growth"]:
            results["growth"] += self.growth(packages, kinds)
        return results


def run(*command):
    done = subprocess.run(command, check=False, capture_output=True, text=True,
                          stdin=subprocess.DEVNULL)
    if done.returncode != 0:
        sys.exit(f"{command}: exit status {done.returncode}\n{done.stdout}{done.stderr}")
    return done


def columns(samples):
    """The medians and the samples of each measure."""
    return {measure: {"median": statistics.median(sample[measure] for sample in samples),
                      "samples": [sample[measure] for sample in samples]}
            for measure in ("wall", "cpu", "memory")}


def progress(text):
    print(text, file=sys.stderr, flush=True)


if __name__ == "__main__":
    with open(sys.argv[1], encoding="utf-8") as plan_file:
        json.dump(Bench(json.load(plan_file)).run(), sys.stdout)
