"""What the sweeps of failures share: their command line, their machines, and their tables.

A `Laboratory` has one machine a job; a `Bench` is one scenario on it: the tree that it finds, the
one that an undisturbed run leaves, the points of that run, and further trees to compare with.
"""

import argparse
import collections
import io
import os
import queue
import subprocess
import textwrap
import threading
import zipfile
from concurrent.futures import ThreadPoolExecutor
from dataclasses import replace

from harness import REPOSITORY, exemptions, failure_points
from harness.machine import SPB
from harness.scenarios import (
    COMMON_SETTING,
    CONTROL,
    HOME,
    INDEX,
    REGISTRY,
    SCENARIOS,
    new_machine,
    prepared,
    restore,
    toolkit_packages,
    tree_of,
)
from harness.zip_archive import IMAGE_ROOT

PRESETS = ("release", "release-i686")


def parser_of(description):
    """A parser of the options that every sweep has."""
    parser = argparse.ArgumentParser(
        description=description, formatter_class=argparse.RawDescriptionHelpFormatter
    )
    binary = parser.add_mutually_exclusive_group()
    binary.add_argument(
        "--preset",
        choices=PRESETS,
        default=PRESETS[0],
        help="build and run the 64-bit or the 32-bit program (default: release)",
    )
    binary.add_argument("--binary", metavar="FILE", help="run this wzorinst instead")
    parser.add_argument(
        "--jobs",
        type=int,
        default=os.cpu_count(),
        metavar="N",
        help="runs at the same time (default: one a processor)",
    )
    return parser


def parsed(parser):
    """Parses the command line; `binary` becomes the path of the installer, built if need be."""
    arguments = parser.parse_args()
    if arguments.jobs < 1:
        parser.error("N must be at least 1")
    arguments.binary = os.path.realpath(arguments.binary or built(arguments.preset))
    return arguments


def arguments_of(description, scenarios, sample=False):
    """Parses a sweep's command line. `scenarios` are the names of those that it can take.

    `sample` adds an option for a sweep that has a better sample than every Nth point.
    """
    parser = parser_of(description)
    parser.add_argument(
        "--scenario",
        action="append",
        choices=scenarios,
        metavar="SCENARIO",
        help="take only this scenario; can be given again. Scenarios: "
        + ", ".join(f"{name} ({SCENARIOS[name].title})" for name in scenarios),
    )
    parser.add_argument(
        "--every", type=int, default=1, metavar="N", help="try every Nth point only"
    )
    parser.add_argument(
        "--point",
        metavar="POINT",
        help="try only this point, as the list of violations names it, and show everything about "
        "it; with one --scenario",
    )
    if sample:
        parser.add_argument(
            "--sample", action="store_true", help="try only what can be done in some seconds"
        )
    arguments = parsed(parser)
    if arguments.every < 1:
        parser.error("N must be at least 1")
    if arguments.point and len(arguments.scenario or ()) != 1:
        parser.error("--point needs one --scenario")
    arguments.scenarios = [SCENARIOS[name] for name in arguments.scenario or scenarios]
    return arguments


def built(preset):
    """Builds the installer; returns its path."""
    for command in (
        ["cmake", "--preset", preset],
        ["cmake", "--build", "--preset", preset, "--target", "wzorinst"],
    ):
        subprocess.run(command, cwd=REPOSITORY, check=True, stdout=subprocess.DEVNULL)
    return os.path.join(REPOSITORY, "build", preset, "src/install/standalone/wzorinst")


class Laboratory:
    """The binary, the packages and the machines of a sweep; use it by `with`."""

    def __init__(self, binary, jobs, packages=None):
        self.binary = binary
        self.jobs = jobs
        self.packages = packages or toolkit_packages()
        self.free = queue.Queue()

    def __enter__(self):
        self.all_machines = [new_machine(self.binary, self.packages) for _ in range(self.jobs + 1)]
        self.spare, *others = self.all_machines
        for machine in others:
            self.free.put(machine)
        return self

    def __exit__(self, *_):
        for machine in self.all_machines:
            machine.delete()

    def run_all(self, jobs, work):
        """The results of `work`(machine, job) for each job, in the order of the jobs."""

        def on_a_free_machine(job):
            machine = self.free.get()
            try:
                return work(machine, job)
            finally:
                self.free.put(machine)

        pool = ThreadPoolExecutor(self.jobs)
        try:
            return list(pool.map(on_a_free_machine, jobs))
        finally:
            pool.shutdown(cancel_futures=True)  # after Ctrl-C, the rest is not run


class Bench:
    """One scenario of a laboratory."""

    def __init__(self, laboratory, scenario):
        self.scenario = scenario
        self.spare = laboratory.spare
        self.before = prepared(scenario, laboratory.binary, laboratory.packages)
        restore(self.spare, self.before)
        self.undisturbed, self.points = failure_points.trace(scenario, self.spare)
        self.normal = tree_of(self.spare)
        assert self.undisturbed.status == int(scenario.fails), self.undisturbed.stdout
        self.package = package_files(laboratory.packages)
        self.trees = {}
        self.lock = threading.Lock()

    def facts(self):
        """What every case of this scenario holds: arguments for the making of one."""
        return {
            "scenario": self.scenario,
            "before": self.before,
            "normal": self.normal,
            "package": self.package,
            "reference": self.reference,
        }

    def reference(self, name):
        """The tree of a run on a machine that differs as `name` says."""
        with self.lock:
            if name not in self.trees:
                restore(self.spare, self.before)
                self.trees[name] = REFERENCES[name](self.scenario, self.spare)
            return self.trees[name]


def package_files(packages):
    """The packages' bytes by their paths, and their files' bytes by the paths that these get."""
    files = dict(packages)
    with zipfile.ZipFile(io.BytesIO(packages[SPB])) as archive:
        for name in archive.namelist():
            if not name.endswith("/"):
                files[HOME + "/" + name.removeprefix(IMAGE_ROOT)] = archive.read(name)
    return files


# Trees to compare with.


def run_without(*paths):
    """The tree that a scenario leaves on a machine without these paths."""

    def run(scenario, machine):
        for path in paths:
            if machine.exists(path):
                machine.remove(path)
        scenario.run(machine)
        return tree_of(machine)

    return run


def run_with_empty(path):
    """The tree that a scenario leaves on a machine where the file `path` is empty."""

    def run(scenario, machine):
        with open(machine.at(path), "wb"):
            pass
        return run_without()(scenario, machine)

    return run


def run_without_its_failure(scenario, machine):
    return run_without(REGISTRY + ".bak")(replace(scenario, environment={}), machine)


def run_twice(scenario, machine):
    scenario.run(machine)
    return run_without()(scenario, machine)


REFERENCES = {
    "with an empty registry": run_with_empty(REGISTRY),
    "without a scanner control": run_without(CONTROL),
    "without a common setting": run_without(COMMON_SETTING),
    "with an index that lists nothing": run_with_empty(INDEX),
    "without its failure": run_without_its_failure,
    "the same command again": run_twice,
}


# Tables.


def table(heading, rows):
    """Lines of columns: the first to the left, all others to the right."""
    texts = [[str(cell) for cell in row] for row in (heading, *rows)]
    widths = [max(len(row[i]) for row in texts) for i in range(len(heading))]
    return "".join(
        "  ".join(
            [row[0].ljust(widths[0])]
            + [cell.rjust(width) for cell, width in zip(row[1:], widths[1:])]
        ).rstrip()
        + "\n"
        for row in texts
    )


def shortened(names):
    """The first of many names, and how many more there are."""
    others = f" and {len(names) - 3} more" if len(names) > 3 else ""
    return " ".join(names[:3]) + others


def paragraph(first, text):
    """`first` and, indented below it, `text`."""
    return (
        first
        + "\n"
        + textwrap.fill(text, 96, initial_indent="    ", subsequent_indent="    ")
        + "\n"
    )


def print_exemptions(cases):
    """Prints which rules of the fault sweep excused something, and in how many cases."""
    print_rules([*exemptions.RULES, exemptions.KEPT_DIRECTORY], cases)


def print_rules(rules, cases):
    """Prints which rules excused something, and in how many cases of which scenario."""
    used = collections.Counter()
    for case in cases:
        used.update({(name, case.scenario.name) for name in case.excused.values()})
    print("Exemptions used (runs)\n")
    for rule in rules:
        scenarios = [
            f"{scenario} {used[rule.name, scenario]}"
            for scenario in SCENARIOS
            if used[rule.name, scenario]
        ]
        print(paragraph(f"{rule.name}: {', '.join(scenarios) or 'none'}", rule.reason))
