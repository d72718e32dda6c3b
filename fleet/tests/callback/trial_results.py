"""Writes each result of a run as a line of JSON to the file that TRIAL_RESULTS names."""

# pylint: disable=protected-access # what callbacks are given
import json
import os

from ansible.plugins.callback import CallbackBase

DOCUMENTATION = """
name: trial_results
type: notification
short_description: Results as lines of JSON, for the tests
description: See above.
"""


class CallbackModule(CallbackBase):
    """The callback plugin, as Ansible finds it."""

    CALLBACK_VERSION = 2.0
    CALLBACK_TYPE = "notification"
    CALLBACK_NAME = "trial_results"
    CALLBACK_NEEDS_ENABLED = True

    def _note(self, result, outcome):
        entry = {
            "task": result._task.get_name(),
            "host": result._host.get_name(),
            "outcome": outcome,
            "result": result._result,
        }
        with open(os.environ["TRIAL_RESULTS"], "a", encoding="utf-8") as file:
            file.write(json.dumps(entry) + "\n")

    def v2_runner_on_ok(self, result):
        self._note(result, "ok")

    def v2_runner_on_failed(self, result, ignore_errors=False):
        self._note(result, "failed")

    def v2_runner_on_unreachable(self, result):
        self._note(result, "unreachable")

    def v2_runner_on_skipped(self, result):
        self._note(result, "skipped")
