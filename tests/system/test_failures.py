"""Runs that meet one failing system call, or are killed: what the sweeps of failures rely on."""

import pytest

from harness import failure_points, sweep
from harness.checks import same_tree
from harness.machine import SPB
from harness.scenarios import (
    COMMAND_LOG,
    COMMON_SETTING,
    HOME,
    INDEX,
    INSTALL_TYPE,
    REGISTRY,
    SCENARIOS,
    SCRIPTS,
    SETTINGS,
    TRACE_SETTINGS,
    restore,
    tree_of,
)


@pytest.fixture(scope="module")
def laboratory(binary):
    with sweep.Laboratory(binary, 1) as made:
        yield made


def point_on(bench, kind, path, number=-1):
    """The point of `kind` on `path` with this number, the last by default, before the modes of the
    tree are set."""
    return [
        point
        for point in bench.points
        if point.kind == kind and point.path == path and not point.late
    ][number]


def fail(bench, kind, path, error, number=-1):
    """Runs the scenario of `bench` with this call failing; returns the outcome and the tree."""
    restore(bench.spare, bench.before)
    point = point_on(bench, kind, path, number)
    outcome, _ = failure_points.run_failing(bench.scenario, bench.spare, point, error)
    return outcome, tree_of(bench.spare)


@pytest.mark.parametrize("error", ["EIO", "EACCES"])
def test_a_file_that_cannot_be_looked_at_is_backed_up_anyway(laboratory, error):
    bench = sweep.Bench(laboratory, SCENARIOS["failing-upgrade"])
    scanner = HOME + "/bin/trawlhw"

    outcome, after = fail(bench, "stat", scanner, error)

    assert outcome.status == 1
    assert after.get(scanner) == bench.before[scanner]
    assert after[scanner].content.endswith(b"# 9.1.7.0003\n")


@pytest.mark.parametrize("error", ["EIO", "EACCES"])
def test_a_registry_that_cannot_be_looked_at_is_not_overwritten_without_a_backup(laboratory, error):
    bench = sweep.Bench(laboratory, SCENARIOS["failing-register"])

    outcome, after = fail(bench, "stat", REGISTRY, error, 0)

    assert "*** Error: could not open or write to INI file. Error = 2\n" in outcome.stdout
    assert outcome.status == 1
    same_tree(after, bench.before)


# A removal that was killed. The second run refuses, because the scanner control is gone.


def kill_removal_before(bench, path):
    restore(bench.spare, bench.before)
    failure_points.run_killed(bench.scenario, bench.spare, point_on(bench, "unlink", path))
    refused = bench.scenario.run(bench.spare)
    assert "*** Error: INI file not found: nothing to remove.\n" in refused.stdout
    assert refused.status == 1


def run(machine, *arguments):
    return machine.run(*arguments, environment={"ZOR_COMMAND_LOG": COMMAND_LOG}).status


def test_a_removal_killed_before_the_settings_went_is_finished_by_a_repair_and_a_removal(
    laboratory,
):
    bench = sweep.Bench(laboratory, SCENARIOS["remove"])
    kill_removal_before(bench, SETTINGS)

    assert run(bench.spare, "i", "SHOP", "-s", SPB) == 0
    assert run(bench.spare, "r", "SHOP") == 0

    left = [path for path in tree_of(bench.spare) if path not in bench.normal]
    assert left == []


def test_a_removal_killed_after_the_settings_went_is_finished_once_its_registry_is_deleted(
    laboratory,
):
    bench = sweep.Bench(laboratory, SCENARIOS["remove"])
    kill_removal_before(bench, HOME + "/config/ZorHWConfig.xml")

    assert run(bench.spare, "i", "SHOP", "-s", SPB) == 1
    bench.spare.remove(REGISTRY)
    assert run(bench.spare, "i", "SHOP", "-s", SPB) == 0
    assert run(bench.spare, "r", "SHOP") == 0

    left = [path for path in tree_of(bench.spare) if path not in bench.normal]
    assert left == []


# New content that was not renamed when its run was killed.

NEW_CONTENTS = [
    path + ".wzorinst-new"
    for path in (REGISTRY, COMMON_SETTING, INDEX, SETTINGS, TRACE_SETTINGS, *SCRIPTS, INSTALL_TYPE)
]


def test_the_last_removal_deletes_what_killed_runs_had_not_renamed(machine):
    assert machine.run("i", "SHOP", "-s", SPB).status == 0
    assert machine.run("r", "SHOP").status == 0
    removed = tree_of(machine)
    assert machine.run("i", "SHOP", "-s", SPB).status == 0
    for path in NEW_CONTENTS:
        machine.plant(path, "cut sho", 0o600)

    assert machine.run("r", "SHOP").status == 0

    same_tree(tree_of(machine), removed)


def test_the_next_run_replaces_what_a_killed_one_had_not_renamed(laboratory):
    bench = sweep.Bench(laboratory, SCENARIOS["upgrade"])
    restore(bench.spare, bench.before)
    for path in (REGISTRY, INDEX, SETTINGS, TRACE_SETTINGS, *SCRIPTS):
        bench.spare.plant(path + ".wzorinst-new", "cut sho", 0o600)

    outcome = bench.scenario.run(bench.spare)

    assert outcome.status == 0
    same_tree(tree_of(bench.spare), bench.normal)


@pytest.mark.parametrize("path", [REGISTRY, SETTINGS])
def test_an_old_file_is_complete_until_the_new_one_replaces_it(laboratory, path):
    bench = sweep.Bench(laboratory, SCENARIOS["upgrade"])
    points = [point for point in bench.points if point.kind == "rename" and point.target == path]
    restore(bench.spare, bench.before)

    failure_points.run_killed(bench.scenario, bench.spare, points[-1])

    between = tree_of(bench.spare)
    assert between[path] == bench.before[path]
    assert between[path + ".wzorinst-new"].content == bench.normal[path].content
    assert between[path + ".wzorinst-new"].owner == bench.before[path].owner
