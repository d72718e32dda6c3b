"""Short lives of two installations on one machine, drawn from seeds.

For a longer run, WZOR_LIVES sets the number of lives and WZOR_FIRST_LIFE the first seed:

    WZORINST=build/release/src/install/standalone/wzorinst WZOR_LIVES=5000 \\
        /usr/bin/python3 -m pytest -q -p no:cacheprovider tests/system/test_random_life.py
"""

import os

import pytest

from harness.life import Life

FIRST = int(os.environ.get("WZOR_FIRST_LIFE", "1"))
LIVES = int(os.environ.get("WZOR_LIVES", "150"))


@pytest.mark.parametrize("seed", range(FIRST, FIRST + LIVES))
def test_a_random_life(binary, seed):
    failure = None
    try:
        Life(binary, seed).live(steps=12)
    except AssertionError as error:
        failure = str(error)
    if failure:
        pytest.fail(failure, pytrace=False)
