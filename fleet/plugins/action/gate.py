"""The whole of corvan.zor.gate, which runs on the controller alone."""

# pylint: disable=protected-access,import-error # how Ansible calls action plugins
import datetime
import os

from ansible.errors import AnsibleError
from ansible.module_utils.parsing.convert_bool import boolean
from ansible.plugins.action import ActionBase
from ansible_collections.corvan.zor.plugins.plugin_utils import controller_files, gate, report

REFUSED = (
    "a roll-out needs the strategy linear: with {0}, hosts do not wait for each other, so that no "
    "batch can be judged before the next one"
)


class ActionModule(ActionBase):
    """The action plugin, as Ansible finds it."""

    _supports_check_mode = True
    _requires_connection = False

    def run(self, tmp=None, task_vars=None):
        result = super().run(tmp, task_vars)
        strategy = self._task._parent._play.strategy
        if strategy not in ("linear", "ansible.builtin.linear"):
            raise AnsibleError(REFUSED.format(strategy))
        if self._task.args["stage"] == "begin":
            return result
        return {**result, **self._judge(self._task.args, task_vars)}

    def _judge(self, arguments, variables):
        """Judges the batch that just ended, and writes the report."""
        batch, everyone = variables["ansible_play_batch"], variables["ansible_play_hosts_all"]
        rollback = boolean(arguments.get("rollback", False))
        known = variables["hostvars"]
        outcomes = {name: gate.outcome_of(known[name], rollback) for name in batch}
        closed = gate.closes(outcomes, everyone[0] in batch, float(arguments["max_failures"]))
        failed = sorted(name for name in batch if outcomes[name]["state"] == gate.FAILED)
        reason = f"{len(failed)} of {len(batch)} hosts of a batch failed" if closed else None
        if not self._task.check_mode:
            self._report(arguments, {"stopped": closed, "reason": reason}, everyone, outcomes)
        return {
            "failed_hosts": failed,
            "messages": {name: outcomes[name]["message"] for name in failed},
            "closed": closed,
            "msg": reason or "the roll-out goes on",
        }

    def _report(self, arguments, end, everyone, outcomes):
        path = self._find_needle("files", os.path.expanduser(arguments["spb"]))
        package = {"name": os.path.basename(path)}
        package["sha256"] = controller_files.noted_digest([path])
        directory = os.path.expanduser(arguments["directory"])
        now = datetime.datetime.now(datetime.timezone.utc).isoformat(timespec="seconds")

        earlier = report.load(directory)
        hosts = report.hosts_before(earlier, package, everyone)
        report.merge(hosts, outcomes)
        started = earlier["started"] if earlier.get("package") == package else now
        content = {"package": package, **end, "started": started, "updated": now, "hosts": hosts}
        report.write(directory, content)
