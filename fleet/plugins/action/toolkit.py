"""The part of corvan.zor.toolkit that runs on the controller.

It calls the module with checksums of the programs and the package. If the host lacks some of them,
the module names these, they are transferred, and the module is called once more.
"""

# pylint: disable=protected-access,import-error # how Ansible calls action plugins
import os

from ansible.errors import AnsibleError
from ansible.plugins.action import ActionBase
from ansible_collections.corvan.zor.plugins.plugin_utils import controller_files

MODULE = "corvan.zor.toolkit"


class ActionModule(ActionBase):
    """The action plugin, as Ansible finds it."""

    TRANSFERS_FILES = True
    _supports_check_mode = True
    _supports_diff = True

    def run(self, tmp=None, task_vars=None):
        result = super().run(tmp, task_vars)
        arguments = {**self._task.args}
        arguments.pop("_offer", None)
        try:
            arguments["_offer"] = self._offer(arguments)
        except OSError as error:
            raise AnsibleError(f"cannot read {error.filename}: {error.strerror}") from error
        answer = self._execute_module(MODULE, arguments, task_vars=task_vars)
        if "missing" in answer:
            arguments["_offer"]["sources"] = self._transfer(arguments, answer["missing"])
            answer = self._execute_module(MODULE, arguments, task_vars=task_vars)
        result.update(answer)
        result.pop("invocation", None)
        return result

    def _offer(self, arguments):
        """What this controller has: checksums and sizes, and the text of small files."""
        offer = {}
        if arguments.get("programs"):
            arguments["programs"] = self._find(arguments["programs"])
            offer["programs"] = controller_files.offered_programs(arguments["programs"])
        if arguments.get("state", "present") == "present" and arguments.get("spb"):
            arguments["spb"] = self._find(arguments["spb"])
            offer["spb"] = controller_files.offered_package(arguments["spb"])
            if arguments.get("signers"):
                signature = arguments.get("signature") or arguments["spb"] + ".sig"
                offer["signers"] = controller_files.text_of(self._find(arguments["signers"]))
                offer["signature"] = controller_files.text_of(self._find(signature))
        return offer

    def _find(self, name):
        return self._find_needle("files", os.path.expanduser(name))

    def _transfer(self, arguments, missing):
        """Transfers what the host named; returns where it is there."""
        directory = self._connection._shell.tmpdir or self._make_tmp_path()
        sources = {}
        for name in missing:
            if name == "spb":
                source = arguments["spb"]
            else:
                width = name.removeprefix("programs-")
                source = controller_files.bundle_of(arguments["programs"], width)
            target = self._connection._shell.join_path(directory, name)
            sources[name] = self._transfer_file(source, target)
        self._fixup_perms2([directory, *sources.values()])
        return sources
