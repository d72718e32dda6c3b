"""The gate's judgement of a batch, and its count of hosts that gave no answer."""

import pytest

from harness import fleet_plugins

GOOD = {"changed": True, "after": {"version": "9.2.30.0000", "build_date": "22/12/02"}}


@pytest.fixture(name="gate")
def fixture_gate():
    return fleet_plugins.load("plugin_utils/gate.py")


def outcomes(healthy, failed):
    states = ["healthy"] * healthy + ["failed"] * failed
    return {f"host{number}": {"state": state} for number, state in enumerate(states)}


@pytest.mark.parametrize(
    "healthy, failed, is_canary, limit, closes",
    [
        (1, 0, True, 0, False),
        (0, 1, True, 100, True),
        (10, 0, False, 0, False),
        (9, 1, False, 0, True),
        (9, 1, False, 10, False),
        (8, 2, False, 10, True),
        (0, 10, False, 100, False),
        (199, 1, False, 0.4, True),
        (199, 1, False, 0.5, False),
    ],
)
def test_a_batch_closes_the_gate_above_the_limit(gate, healthy, failed, is_canary, limit, closes):
    assert gate.closes(outcomes(healthy, failed), is_canary, limit) is closes


@pytest.mark.parametrize(
    "installed, rollback, state",
    [
        ({**GOOD, "reason": "newer-installed"}, False, "healthy"),
        ({**GOOD, "reason": "newer-installed"}, True, "failed"),
        ({**GOOD, "operation": "registration"}, True, "failed"),
        ({**GOOD, "operation": "upgrade"}, True, "healthy"),
    ],
)
def test_a_rollback_fails_where_a_newer_version_stays(gate, installed, rollback, state):
    variables = {"zor_rollout_installed": installed, "zor_rollout_health": {"rc": 0}}

    assert gate.outcome_of(variables, rollback)["state"] == state


@pytest.mark.parametrize(
    "installed, health, state, message",
    [
        (GOOD, {"rc": 0}, "healthy", None),
        (GOOD, {"skipped": True}, "healthy", None),
        (GOOD, {}, "failed", "did not report back"),
        ({}, {}, "failed", "did not report back"),
        ({"unreachable": True, "msg": "timed out\n"}, {}, "failed", "unreachable: timed out"),
        ({"failed": True, "msg": "full disk"}, {"skipped": True}, "failed", "full disk"),
        (GOOD, {"failed": True, "msg": "non-zero"}, "failed", "non-zero"),
        (
            GOOD,
            {"failed": True, "msg": "non-zero", "stdout": "missing  /a\nmissing  /b"},
            "failed",
            "missing  /a",
        ),
        (GOOD, {"unreachable": True, "msg": "gone"}, "failed", "unreachable: gone"),
    ],
)
def test_a_host_is_healthy_only_if_it_proved_it(gate, installed, health, state, message):
    variables = {"zor_rollout_installed": installed, "zor_rollout_health": health}

    outcome = gate.outcome_of(variables)

    assert (outcome["state"], outcome["message"]) == (state, message)
