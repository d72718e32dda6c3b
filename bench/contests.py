#!/usr/bin/python3
"""The measuring half of bench/run: runs inside of its sandbox, prints its results as JSON.

    contests.py PLAN        (PLAN: JSON, see bench/run)

A race is one job on one package. Its contestants take turns, A B C A B C, each from an empty
target on the same file system. Only the contestant's own process and the processes that it waits
for are timed, not the sandbox, the cleaning of targets and the preparation of states.
"""

import json
import os
import re
import statistics
import subprocess
import sys
import tempfile

MEDIA = "/media"
PEER_DIR = "/opt/peer"
WRITTEN_BY_RUNS = ("/opt", "/etc/zor", "/etc/kel", "/usr/kel")
HEADROOM_MB = 128
PIECE = str(256 * 1024)
DPKG_DIR = PEER_DIR + "/var/lib/dpkg"


class Bench:
    """Runs the races of a plan."""

    def __init__(self, plan):
        self.plan = plan

    # Contestants: a name is "wzorinst", "wzorinst, no commands", "zlib floor" ... and, if the
    # program comes in both widths, " 64" or " 32" after it.

    def command(self, name, job, package):
        """What the contestant `name` runs to do `job`."""
        program, _, bits = name.rpartition(" ")
        if bits not in ("64", "32"):
            return self.peer(name, package)
        directory = self.plan["builds"][bits]
        if program == "line":
            return [directory + "/bench/line"]
        if program.startswith("wzorinst"):
            binary = "src/install/standalone/wzorinst"
            if program == "wzorinst, no commands":
                binary = "bench/wzorinst_no_commands"
            action = "r" if job == "removal" else "i"
            line = [f"{directory}/{binary}", action, "BENCH", "-o", "/tmp/log"]
            return line + (["-s", f"{MEDIA}/{package}.spb"] if action == "i" else [])
        floor = [directory + "/bench/floor", f"{MEDIA}/{package}.zip", PEER_DIR]
        how = {
            "zlib floor": ["zlib"],
            "zlib floor in pieces": ["zlib", PIECE],
            "libdeflate floor": ["libdeflate"],
        }
        return floor + how[program]

    @staticmethod
    def peer(name, package):
        twin = f"{MEDIA}/{package}.zip"
        rpm = ["/usr/bin/rpm", "--root", PEER_DIR, "-i", "--nodeps", "--replacepkgs"]
        return {
            "unzip": ["/usr/bin/unzip", "-q", "-o", twin, "-d", PEER_DIR],
            "bsdtar": ["/usr/bin/bsdtar", "-x", "-f", twin, "-C", PEER_DIR],
            "7zz": ["/usr/bin/7zz", "x", "-y", "-bso0", "-bsp0", "-o" + PEER_DIR, twin],
            "dpkg": [
                "/usr/bin/dpkg",
                "--root=" + PEER_DIR,
                "--force-bad-path",
                "--unpack",
                f"{MEDIA}/{package}.deb",
            ],
            "rpm": [*rpm, f"{MEDIA}/{package}.rpm"],
            "rpm, flushed": [*rpm, "--define", "_flush_io 1", f"{MEDIA}/{package}.rpm"],
            "rm -rf": [
                "/usr/bin/rm",
                "-rf",
                "/opt/corvan",
                "/etc/zor",
                "/usr/kel/corvan/common/ZOR",
            ],
        }[name]

    def preparation(self, name, job, package):
        """The command that makes the state in which `job` begins; None for an empty target."""
        if job == "upgrade":
            return self.command(name, "install", package)
        if job == "removal":
            return self.command(name if "wzorinst" in name else "wzorinst 64", "install", package)
        return None

    # Measuring.

    def sample(self, name, job, package):
        """One timed run."""
        run("/usr/bin/rm", "-rf", *WRITTEN_BY_RUNS)
        os.makedirs(DPKG_DIR + "/updates")
        os.makedirs(DPKG_DIR + "/info")
        with open(DPKG_DIR + "/status", "w", encoding="ascii"):
            pass
        if preparation := self.preparation(name, job, package):
            run(*preparation)
        if self.plan["syncs"]:
            os.sync()  # so that no contestant writes out what another left
        return self.timed(self.command(name, job, package), package)

    def timed(self, command, package):
        facts = self.plan["packages"][package]
        megabytes = HEADROOM_MB + 2 * min(facts["size"] // 1_000_000, 400) + facts["files"] // 100
        measure = self.plan["builds"]["64"] + "/bench/measure"
        line = run(measure, str(megabytes), *command).stdout
        wall, user, system, memory, status = map(int, line.split())
        if status != 0:
            sys.exit(f"{command}: wait status {status}")
        return {"wall": wall / 1e6, "cpu": (user + system) / 1e3, "memory": memory}

    def race(self, job, package, contestants, rounds):
        """`rounds` samples of each contestant, in turns, after one that does not count."""
        samples = {name: [] for name in contestants}
        for number in range(rounds + 1):
            print(f"{package}, {job}: round {number} of {rounds}", file=sys.stderr, flush=True)
            for name in contestants:
                samples[name].append(self.sample(name, job, package))
        return {
            "job": job,
            "package": package,
            "contestants": {name: columns(taken[1:]) for name, taken in samples.items()},
        }

    def system_calls(self, package):
        """How often the installer and the floor make each system call."""
        return {
            "package": package,
            "ours": self.count_calls("wzorinst 64", package),
            "floor": self.count_calls("libdeflate floor 64", package),
        }

    def count_calls(self, name, package):
        run("/usr/bin/rm", "-rf", *WRITTEN_BY_RUNS)
        os.makedirs(PEER_DIR)
        with tempfile.NamedTemporaryFile("r") as file:
            run(
                "/usr/bin/strace",
                "-c",
                "-U",
                "calls,name",
                "-o",
                file.name,
                *self.command(name, "install", package),
            )
            rows = [line.split() for line in file.read().splitlines()]
        return {row[1]: int(row[0]) for row in rows if row[0].isdigit() and row[1] != "total"}

    def run(self):
        return {
            "file_system": file_system(),
            "system_calls": [self.system_calls(package) for package in self.plan["system_calls"]],
            "races": [self.race(*race) for race in self.plan["races"]],
        }


def file_system():
    return re.sub(r"/.*", "", run("/usr/bin/stat", "-f", "-c", "%T", "/opt").stdout.strip())


def run(*command):
    done = subprocess.run(
        command, check=False, capture_output=True, text=True, stdin=subprocess.DEVNULL
    )
    if done.returncode != 0:
        sys.exit(f"{command}: exit status {done.returncode}\n{done.stdout}{done.stderr}")
    return done


def columns(samples):
    """The medians and the samples of each measure."""
    return {
        measure: {
            "median": statistics.median(sample[measure] for sample in samples),
            "samples": [sample[measure] for sample in samples],
        }
        for measure in ("wall", "cpu", "memory")
    }


if __name__ == "__main__":
    with open(sys.argv[1], encoding="utf-8") as plan_file:
        json.dump(Bench(json.load(plan_file)).run(), sys.stdout)
