#!/usr/bin/python
"""The module corvan.zor.toolkit: the part that runs on the host."""

DOCUMENTATION = r"""
module: toolkit
short_description: Install, upgrade, share and remove the ZOR toolkit
description:
  - Installs the ZOR toolkit for a product (an exploiter), or removes the product from it.
  - Runs C(wzorinst) only if something has to change, because every installation deploys all files
    and stops the scanners. Whether it has to is decided by C(zorctl status) and C(zorctl verify).
  - Runs it through C(zorctl run), which takes the lock, checks the package and keeps a log.
  - Root gets the shared installation, any other user (I(become_user)) one of their own.
  - Programs and package are kept on the host, in C(/var/cache/corvan.zor) or the user's
    C(~/.cache/corvan.zor), and are transferred once.
options:
  exploiter:
    description: Identifier of the product, without a colon.
    type: str
    required: true
  state:
    description:
      - With C(present), the toolkit is installed, intact and as in the package, or newer than
        I(programs), and the product is registered.
      - With C(absent), the product is not registered. The last one takes the toolkit with it.
    type: str
    choices: [present, absent]
    default: present
  spb:
    description:
      - Path of the package on the controller. Required with I(state=present).
      - A relative path is looked for as C(ansible.builtin.copy) looks for I(src).
    type: str
  programs:
    description:
      - Directory on the controller with the programs C(wzorinst), C(zorctl) and C(spb) in its
        subdirectories C(x86_64) and C(i686), or in one of them. Each host gets the widest ones
        it can run.
      - Without it, the programs that are installed on the host are used.
    type: path
  dest:
    description:
      - Absolute path of the home of a new installation. The default is that of C(wzorinst).
      - An installation that exists elsewhere makes the task fail.
    type: str
  single_user:
    description:
      - Make nothing writable for everybody (C(-r)).
      - C(false) leaves an installation as it is.
    type: bool
    default: false
  trace_dir:
    description:
      - Absolute path of the directory for traces (C(-c)). It counts when C(wzorinst) runs; a
        different directory alone is no reason to run it.
    type: str
  signers:
    description:
      - File on the controller with the signers that are allowed, see ALLOWED SIGNERS in
        ssh-keygen(1). Nothing is installed from a package without a valid signature of one.
    type: path
  signature:
    description: The signature on the controller. The default is I(spb) with C(.sig) appended.
    type: path
  installed_only:
    description:
      - Change only a host where the toolkit is installed and the product registered.
    type: bool
    default: false
  repair:
    description:
      - Let C(zorctl doctor --apply) repair what an interrupted run left, before anything else.
    type: bool
    default: true
  wait:
    description: For how many seconds to wait for another run to end.
    type: int
    default: 600
  _offer:
    description: Filled in by the action plugin.
    type: dict
requirements:
  - Python 3.9 or later on the host.
  - C library 2.34 or later on the host, in the width of the programs.
attributes:
  check_mode:
    description: Predicts the run with C(zorctl plan), and changes nothing.
    support: full
  diff_mode:
    description: Shows the state before and after.
    support: full
  idempotent:
    description: A second run changes nothing and does not call C(wzorinst).
    support: full
  platform:
    description: Systems it works on.
    support: full
    platforms: linux
  action_group:
    description: Member of the action group C(corvan.zor.zor), for I(module_defaults).
    support: full
author:
  - The maintainers of wzorinst
"""

EXAMPLES = r"""
- name: Install the toolkit for SHOP
  corvan.zor.toolkit:
    exploiter: SHOP
    spb: media/toolkit.spb
    programs: media/programs

- name: Install it for the user ann, signed packages only
  become: true
  become_user: ann
  corvan.zor.toolkit:
    exploiter: SHOP
    spb: media/toolkit.spb
    programs: media/programs
    signers: media/signers

- name: SHOP does not need it any more
  corvan.zor.toolkit:
    exploiter: SHOP
    state: absent
    programs: media/programs
"""

RETURN = r"""
reason:
  description:
    - Why the installation was changed. C(not-installed), C(damaged), C(not-registered) (others use
      the toolkit, this product does not), C(older-installed), C(shared-mode) (but I(single_user) is
      wanted), C(content-differs) (files are not as in the package), C(registered) (but should not
      be).
    - Why it was not. C(as-wanted), C(newer-installed), C(not-installed), C(not-registered).
  returned: success
  type: str
  sample: older-installed
operation:
  description:
    - What the run did as C(zorctl plan) names it, C(fresh), C(upgrade), C(registration),
      C(unregistration) or C(removal); C(none) if nothing ran.
  returned: success
  type: str
copied:
  description:
    - Whether programs or the package were copied to the host, or other ones were made the current
      ones. That is a change, too.
  returned: success
  type: bool
cmd:
  description: The command, empty if none was needed.
  returned: success, and failure of the command
  type: list
  elements: str
before:
  description: State of the installation before; its exploiters are sorted.
  returned: always
  type: dict
  contains:
    health:
      description: C(absent), C(intact) or C(damaged).
      type: str
    version:
      description: Version that is registered.
      type: str
    build_date:
      description: Build date that is registered.
      type: str
    home:
      description: Directory of the installation.
      type: str
    single_user_mode:
      description: Whether it was installed with I(single_user).
      type: bool
    exploiters:
      description: Products that use it.
      type: list
      elements: str
after:
  description: The same afterwards; in check mode, as it would be.
  returned: success
  type: dict
programs:
  description: Directory of the programs on the host.
  returned: success
  type: str
package:
  description: The package on the host.
  returned: success with I(state=present)
  type: str
log:
  description: The last lines that the run printed.
  returned: failure of a command
  type: list
  elements: str
rc:
  description:
    - Exit status of the command. 65 stands for a bad package, 75 for a lock that was not free, 77
      for a signature that is not valid.
  returned: failure of a command
  type: int
"""

# The documentation comes first in every module.
# pylint: disable=wrong-import-position,relative-beyond-top-level
import os

from ansible.module_utils.basic import AnsibleModule

from ..module_utils.host_files import HostFiles, HostFilesError
from ..module_utils.toolkit_state import Toolkit
from ..module_utils.zorctl import Zorctl, ZorctlError

ARGUMENTS = {
    "exploiter": {"type": "str", "required": True},
    "state": {"type": "str", "choices": ["present", "absent"], "default": "present"},
    "spb": {"type": "str"},
    "programs": {"type": "path"},
    "dest": {"type": "str"},
    "single_user": {"type": "bool", "default": False},
    "trace_dir": {"type": "str"},
    "signers": {"type": "path"},
    "signature": {"type": "path"},
    "installed_only": {"type": "bool", "default": False},
    "repair": {"type": "bool", "default": True},
    "wait": {"type": "int", "default": 600},
    "_offer": {"type": "dict"},
}


def main():
    module = AnsibleModule(
        argument_spec=ARGUMENTS,
        supports_check_mode=True,
        required_if=[("state", "present", ("spb",))],
    )
    if module.params["_offer"] is None:
        module.fail_json(msg="corvan.zor.toolkit works through its action plugin only")
    for name in ("dest", "trace_dir"):
        if module.params[name] and not os.path.isabs(module.params[name]):
            module.fail_json(msg=name + " must be an absolute path")
    try:
        answer(module)
    except ZorctlError as error:
        module.fail_json(msg=str(error), **error.details)
    except (HostFilesError, OSError) as error:
        module.fail_json(msg=str(error))


def answer(module):
    offer = module.params["_offer"]
    files = HostFiles(offer)
    sources = offer.get("sources") or {}
    if files.missing and not sources:
        module.exit_json(changed=False, missing=files.missing)

    copied = bool(sources) or not files.link_is_right
    if module.check_mode:
        files.use(module.tmpdir)
    files.store(sources)
    toolkit = Toolkit(Zorctl(module, files.programs), module.params, files.package)
    before = toolkit.state
    try:
        result = converge(module, toolkit, files)
    except ZorctlError as error:
        raise ZorctlError(files.kept(str(error)), before=before, **error.details) from error
    result.update(changed=result["operation"] != "none" or copied, copied=copied)
    result["diff"] = {"before": result["before"], "after": result["after"]}
    module.exit_json(programs=files.kept(files.programs), **result)


def converge(module, toolkit, files):
    """Makes the installation as it is wanted, or finds out what that would change."""
    wish, zorctl, before = module.params, toolkit.zorctl, toolkit.state
    done, reason = toolkit.is_as_wanted()
    result = {"before": before, "after": before, "reason": reason, "cmd": [], "operation": "none"}
    if files.package:
        result["package"] = files.kept(files.package)
    if done:
        return result

    if reason == "damaged" and wish["repair"] and not module.check_mode:
        zorctl.repair()
        toolkit.look()
        # Deployed again even if the repair was enough: that also empties the scanners' cache.
        if toolkit.state["health"] == "absent" and wish["state"] == "absent":
            return dict(result, operation="removal", after=toolkit.state)

    if wish["state"] == "present" and wish["signers"]:
        files.store_signature(wish["_offer"])
        zorctl.check_signature(files.package, files.signers, files.signature)
    plan = toolkit.planned()
    options = ["--wait", str(wish["wait"])]
    if files.signers:
        options += ["--signers", files.signers, "--signature", files.signature]
    line = zorctl.run_line(toolkit.arguments(), options)
    result.update(operation=plan["operation"], cmd=[files.kept(word) for word in line])
    if module.check_mode:
        return dict(result, after=toolkit.predicted_state(plan))
    zorctl.run(line)
    toolkit.look()
    toolkit.check_result()
    return dict(result, after=toolkit.state)


if __name__ == "__main__":
    main()
