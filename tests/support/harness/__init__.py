"""What the tests and the measuring scripts written in Python share.

pytest finds this package by `pythonpath` in pyproject.toml. scripts/harness and bench/harness are
links to it: Python looks for imports in the directory of the script that it runs.
"""

from pathlib import Path

REPOSITORY = Path(__file__).resolve().parents[3]
