"""Calls of zorctl on a host, and what its answers mean."""

import json
import os
import re

MEANING = {
    2: "zorctl could not check the installation",
    65: "the package cannot be installed",
    75: "another run holds the lock",
    77: "the package has no valid signature of an allowed signer",
}
STATE_KEYS = ("health", "version", "build_date", "home", "single_user_mode")
LOG_LIMIT = 200  # lines


class ZorctlError(Exception):
    """A call that failed; `details` are return values of the module."""

    def __init__(self, message, **details):
        super().__init__(message)
        self.details = details


class Zorctl:
    """The program in the directory `programs`, for the installation of the running user."""

    def __init__(self, module, programs):
        self.module = module
        self.program = os.path.join(programs, "zorctl")
        self.type = "global" if os.geteuid() == 0 else "local"

    def _report(self, arguments, statuses):
        line = [self.program] + arguments
        status, output, errors = self.module.run_command(line, encoding="utf-8")
        if status not in statuses:
            reason = errors.strip() or MEANING.get(status, "zorctl failed")
            raise ZorctlError(reason, rc=status, cmd=line, log=lines_of(output + errors))
        return json.loads(output)

    def status(self):
        """The state of the installation, as `status --json` has it, and the program's version."""
        found = self._report(["status", "--json", "--type", self.type], (0, 1, 3))
        return found["installations"][0], found["tool"]

    def differences(self, package):
        """Files that are not as in `package`, but for changed settings and files of others."""
        arguments = ["verify", "--json", "--no-foreign", "--no-customised"]
        found = self._report(arguments + ["--type", self.type, package], (0, 1))
        return found["differences"]

    def plan(self, arguments):
        return self._report(["plan", "--json"] + arguments, (0, 1))

    def repair(self):
        """Has the doctor repair what an interrupted run left.

        The result is ignored: the next status shows it. A lock that is held means that no run was
        interrupted, but that one is going on.
        """
        line = [self.program, "doctor", "--apply", "--type", self.type]
        self.module.run_command(line, encoding="utf-8")

    def check_signature(self, package, signers, signature):
        """Raises ZorctlError unless one of `signers` signed the package; "run" does it again."""
        line = [os.path.join(os.path.dirname(self.program), "spb"), "verify", package]
        line += ["-s", signers, "-i", signature]
        status, output, errors = self.module.run_command(line, encoding="utf-8")
        if status != 0:
            log = lines_of(output + errors)
            raise ZorctlError(": ".join([MEANING[77]] + log[-1:]), rc=77, log=log)

    def run_line(self, arguments, options):
        return [self.program, "run"] + options + ["--"] + arguments

    def run(self, line):
        """Runs wzorinst. Raises ZorctlError with the run's log if it fails."""
        status, output, errors = self.module.run_command(line, encoding="utf-8")
        if status != 0:
            log = lines_of(output + errors)
            raise ZorctlError(reason_of(status, log), rc=status, log=log)
        return output


def lines_of(text):
    return text.splitlines()[-LOG_LIMIT:]


def reason_of(status, log):
    """One line for what a run that failed said."""
    if status < 0:
        return "wzorinst was ended by signal {0}".format(-status)
    if status in MEANING:
        detail = [line for line in log if line.startswith("zorctl: ")]
        return ": ".join([MEANING[status]] + detail[-1:])
    telling = [
        line
        for line in log
        if re.search(r"^\*\*\* Error|failed, error = |^Could not|returned (?!0$|32512)", line)
    ]
    return ": ".join(["wzorinst failed"] + telling[-1:])


def summary(installation):
    """The part of a status that the module reports as "before" and "after"."""
    state = {key: installation[key] for key in STATE_KEYS}
    exploiters = installation["exploiters"]
    state["exploiters"] = sorted(exploiters) if isinstance(exploiters, list) else []
    return state


def is_newer(installation, tool):
    """True if the installation is newer than the program, which would then only register."""
    return build_key(installation) > build_key(tool)


def is_older(installation, tool):
    return build_key(installation) < build_key(tool)


def build_key(build):
    """Sorts builds as the installer compares them: by version, then by date."""
    version = [int(number) for number in re.findall("[0-9]+", build["version"] or "")]
    return version, build["build_date"] or ""
