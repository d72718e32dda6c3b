"""The module corvan.zor.toolkit in every state: a check, a run, a check again, a run again.

Every state is tried on a host of its own, all at the same time.
"""

import subprocess

import pytest
from states import REFUSALS, STATES

from harness.fleet_trials import Fleet, tree_of

ALL = [*STATES, *REFUSALS]
BY_NAME = [pytest.param(state, id=state.name) for state in STATES]
REFUSED = [pytest.param(state, id=state.name) for state in REFUSALS]


class Trial:
    """What the four runs answered, and the trees around them, by the name of the state."""

    def __init__(self, media, fleet):
        self.fleet = fleet
        self.host_of = dict(zip((state.name for state in ALL), fleet.hosts))
        self.variables = {
            self.host_of[state.name]: {
                "begin": [arguments(media, call) for call in state.begin],
                "ask": arguments(media, state.ask),
                "user": state.user,
            }
            for state in ALL
        }
        self.plays = [self.play([step(number) for number in range(2)])]
        for state in ALL:
            if state.prepare:
                fleet.hosts[self.host_of[state.name]].run(state.prepare)
        self.trees = [self.look()]
        for tasks in (["check"], ["run"], ["check again", "run again"]):
            self.plays.append(self.play([task(name) for name in tasks]))
            self.trees.append(self.look())

    def play(self, tasks):
        inventory = {"all": {"vars": {"states": self.variables}}}
        path = self.fleet.directory / "states.yml"
        path.write_text(str(inventory).replace("True", "true"))
        return self.fleet.play(
            [{"hosts": "all", "gather_facts": False, "become_method": "su", "tasks": tasks}],
            f"-i{self.fleet.directory}/inventory.ini",
            f"-i{path}",
        )

    def look(self):
        return {state.name: tree_of(self.fleet.hosts[self.host_of[state.name]]) for state in ALL}

    def answer(self, name, state):
        [found] = [play for play in self.plays if (name, self.host_of[state.name]) in play.results]
        return found.result(name, self.host_of[state.name])


def arguments(media, changes):
    call = {"exploiter": "SHOP", "spb": "@v1", "programs": "@programs", **changes}
    return {
        name: str(getattr(media, value[1:])) if str(value).startswith("@") else value
        for name, value in call.items()
    }


def task(name, call="ask"):
    mine = "states[inventory_hostname]"
    return {
        "name": name,
        "corvan.zor.toolkit": "{{ " + mine + "." + call + " }}",
        "become": "{{ " + mine + ".user != 'root' }}",
        "become_user": "{{ " + mine + ".user }}",
        "check_mode": name.startswith("check"),
        "ignore_errors": True,
    }


def step(number):
    return {
        **task(f"begin {number}", f"begin[{number}]"),
        "when": f"states[inventory_hostname].begin | length > {number}",
    }


def sign(media):
    """Signs v1, and makes lists of signers with and without the key."""
    for name in ("key", "other"):
        line = ["ssh-keygen", "-q", "-t", "ed25519", "-N", "", "-f", media.directory / name]
        subprocess.run(line, check=True)
    media.signed = media.directory / "signed.spb"
    media.signed.write_bytes(media.v1.read_bytes())
    line = ["ssh-keygen", "-q", "-Y", "sign", "-n", "spb", "-f", media.directory / "key"]
    subprocess.run([*line, media.signed], check=True, capture_output=True)
    for name, key in (("signers", "key.pub"), ("strangers", "other.pub")):
        path = media.directory / name
        path.write_text("release " + (media.directory / key).read_text())
        setattr(media, name, path)


@pytest.fixture(scope="module")
def trial(media):
    sign(media)
    fleet = Fleet(len(ALL))
    yield Trial(media, fleet)
    fleet.close()


def test_no_run_warns(trial):
    assert [play.warnings for play in trial.plays] == [[], [], [], []]


@pytest.mark.parametrize("state", BY_NAME)
def test_the_check_predicts_the_run(trial, state):
    check, run = trial.answer("check", state), trial.answer("run", state)

    for key in ("changed", "copied", "reason", "operation", "cmd", "before", "after", "diff"):
        assert check.get(key) == run.get(key)


@pytest.mark.parametrize("state", BY_NAME)
def test_the_run_answers_what_it_did(trial, state):
    run = trial.answer("run", state)

    assert run["outcome"] == "ok"
    assert (run["reason"], run["operation"]) == (state.reason, state.operation)
    assert run["changed"] is state.changes
    assert run["before"] == state.before
    assert run["after"] == state.after
    assert run["diff"] == {"before": state.before, "after": state.after}
    assert bool(run["cmd"]) == (state.operation != "none")


@pytest.mark.parametrize("state", BY_NAME)
def test_a_check_changes_nothing(trial, state):
    assert trial.trees[0][state.name] == trial.trees[1][state.name]


@pytest.mark.parametrize("state", BY_NAME)
def test_a_second_run_changes_nothing(trial, state):
    for name in ("check again", "run again"):
        answer = trial.answer(name, state)
        assert (answer["changed"], answer["copied"]) == (False, False)
        assert answer["reason"] == state.later
        assert (answer["operation"], answer["cmd"]) == ("none", [])
        assert answer["before"] == answer["after"] == state.after
    assert trial.trees[2][state.name] == trial.trees[3][state.name]


@pytest.mark.parametrize("state", [state for state in BY_NAME if state.values[0].changes])
def test_a_run_that_reports_a_change_made_one(trial, state):
    assert trial.trees[1][state.name] != trial.trees[2][state.name]


@pytest.mark.parametrize("state", REFUSED)
def test_a_refusal_is_the_same_in_a_check(trial, state):
    for name in ("check", "run", "check again", "run again"):
        answer = trial.answer(name, state)
        assert answer["outcome"] == "failed"
        assert answer["changed"] is False
        assert state.message in answer["msg"]


@pytest.mark.parametrize("state", REFUSED)
def test_a_refusal_leaves_no_installation(trial, state):
    installed = {"opt/corvan/zor/bin/trawlcfg", "etc/zor/zor.ini"}
    for before, after in zip(trial.trees, trial.trees[1:]):
        assert installed & set(before[state.name]) == installed & set(after[state.name])


def test_a_removal_leaves_nothing_of_the_toolkit(trial):
    left = trial.trees[2]["the last product goes"]

    assert not [path for path in left if path.startswith(("opt/corvan/", "etc/zor"))]
