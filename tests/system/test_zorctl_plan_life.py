"""Short lives at random in which every plan is compared with what then happens.

WZOR_LIVES sets the number of lives, WZOR_FIRST_LIFE the first seed.
"""

import os

import pytest

from harness.planned_life import PlannedLife

FIRST = int(os.environ.get("WZOR_FIRST_LIFE", "1"))
LIVES = int(os.environ.get("WZOR_LIVES", "60"))


@pytest.mark.parametrize("seed", range(FIRST, FIRST + LIVES))
def test_every_plan_comes_true(binary, seed):
    failure = None
    try:
        PlannedLife(binary, seed).live(steps=12)
    except AssertionError as error:
        failure = str(error)
    if failure:
        pytest.fail(failure, pytrace=False)
