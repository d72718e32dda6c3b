#!/usr/bin/python
"""The documentation of corvan.zor.gate, which is an action plugin."""

DOCUMENTATION = r"""
module: gate
short_description: Judge a batch of a roll-out
description:
  - Part of the role C(corvan.zor.rollout). It runs on the controller and changes no host.
  - Every host of the batch that did not prove its health counts as failed, unreachable hosts
    included, which Ansible's own C(max_fail_percentage) and C(any_errors_fatal) do not count.
  - Writes C(report.json), C(report.html) and C(unfinished) (for C(--limit @FILE)), except in check
    mode. A roll-out of the same package continues the report that it finds.
  - Fails with every other strategy than C(linear).
options:
  stage:
    description: Whether a batch begins or ends.
    type: str
    choices: [begin, end]
    required: true
  spb:
    description: The package that is rolled out.
    type: str
    required: true
  directory:
    description: Directory of the report on the controller.
    type: str
    required: true
  max_failures:
    description:
      - How many percent of a batch may fail. Of the first batch, the canary, none may.
    type: float
    required: true
  rollback:
    description: Whether a host that keeps a newer version failed.
    type: bool
    default: false
attributes:
  check_mode:
    description: Judges as it would, and writes no report.
    support: full
  diff_mode:
    description: Has nothing to show.
    support: none
  idempotent:
    description: Never reports a change.
    support: full
author:
  - The maintainers of wzorinst
"""

EXAMPLES = r"""
- name: Judge the batch
  corvan.zor.gate:
    stage: end
    spb: media/toolkit.spb
    directory: rollout
    max_failures: 5
  run_once: true
  register: gate
"""

RETURN = r"""
closed:
  description: Whether the roll-out has to stop.
  returned: with I(stage=end)
  type: bool
failed_hosts:
  description: The hosts of the batch that failed, sorted.
  returned: with I(stage=end)
  type: list
  elements: str
messages:
  description: Why each of them failed.
  returned: with I(stage=end)
  type: dict
"""
