"""Decides whether an installation is as wanted, runs zorctl if it is not, and reports both."""

# pylint: disable=relative-beyond-top-level
from .zorctl import ZorctlError, is_newer, is_older, summary

ABSENT = {
    "health": "absent",
    "version": None,
    "build_date": None,
    "home": None,
    "single_user_mode": None,
    "exploiters": [],
}


class Toolkit:
    """One exploiter's use of the installation. `wish` are the module's parameters."""

    def __init__(self, zorctl, wish, package):
        self.zorctl = zorctl
        self.wish = wish
        self.package = package
        self.exploiter = wish["exploiter"]
        self.installation, self.tool = zorctl.status()

    def look(self):
        self.installation, self.tool = self.zorctl.status()

    @property
    def state(self):
        return summary(self.installation)

    def registered(self):
        """True if the exploiter is in the list.

        The installer searches the list for the identifier as a text. Where that finds the end of
        another product's identifier, it would take the one for the other.
        """
        exploiters = self.state["exploiters"]
        if self.exploiter in exploiters:
            return True
        for other in exploiters:
            if other.endswith(self.exploiter):
                raise ZorctlError(
                    "{0} is the end of {1}, which is registered: the installer could not tell "
                    "them apart".format(self.exploiter, other)
                )
        return False

    def is_as_wanted(self):
        """Returns whether nothing has to be done, and the reason for it or against it."""
        if self.installation["health"] == "unknown":
            raise ZorctlError("the state of the installation could not be determined")
        if self.wish["state"] == "absent":
            return self._is_absent()
        return self._is_present()

    def _is_absent(self):
        if self.installation["health"] == "absent":
            return True, "not-installed"
        if not self.registered():
            return True, "not-registered"
        return False, "registered"

    def _is_present(self):
        health = self.installation["health"]
        if health == "absent":
            return bool(self.wish["installed_only"]), "not-installed"
        registered = self.registered()
        if not registered and self.wish["installed_only"]:
            return True, "not-registered"
        self._check_home()
        if health == "damaged":
            return False, "damaged"
        if not registered:
            return False, "not-registered"
        return self._is_current()

    def _check_home(self):
        home = self.installation["home"]
        if self.wish["dest"] and home and home.rstrip("/") != self.wish["dest"].rstrip("/"):
            raise ZorctlError(
                "the toolkit is installed in {0}: it cannot be moved to {1}, only removed and "
                "installed there".format(home, self.wish["dest"])
            )

    def _is_current(self):
        if is_newer(self.installation, self.tool):
            return True, "newer-installed"
        if is_older(self.installation, self.tool):
            return False, "older-installed"
        if self.wish["single_user"] and self.installation["single_user_mode"] is False:
            return False, "shared-mode"
        if self.zorctl.differences(self.package):
            return False, "content-differs"
        return True, "as-wanted"

    def arguments(self):
        """What wzorinst is called with."""
        if self.wish["state"] == "absent":
            return ["r", self.exploiter]
        line = ["i", self.exploiter, "-s", self.package]
        for name, option in (("dest", "-d"), ("trace_dir", "-c")):
            if self.wish[name]:
                line += [option, self.wish[name]]
        return line + (["-r"] if self.wish["single_user"] else [])

    def planned(self):
        """What the run would do. Raises ZorctlError if it would fail."""
        plan = self.zorctl.plan(self.arguments())
        if not plan["succeeds"]:
            raise ZorctlError("the installation would fail: " + plan["failure"])
        return plan

    def predicted_state(self, plan):
        """The state after a run of `plan`."""
        before = self.state
        if plan["operation"] == "removal":
            return ABSENT
        if plan["operation"] == "unregistration":
            left = [name for name in before["exploiters"] if name != self.exploiter]
            return dict(before, exploiters=left)
        after = dict(before, health="intact", home=plan["home"])
        after["exploiters"] = sorted(set(before["exploiters"]) | {self.exploiter})
        if plan["operation"] != "registration":
            after.update(version=self.tool["version"], build_date=self.tool["build_date"])
        flag = before["single_user_mode"] is True
        after["single_user_mode"] = flag or bool(self.wish["single_user"])
        return after

    def check_result(self):
        """Raises ZorctlError if the installation is not as wanted after a run that succeeded."""
        done, reason = self.is_as_wanted()
        if not done:
            differences = []
            if reason == "content-differs":
                differences = self.zorctl.differences(self.package)
            raise ZorctlError(
                "the run succeeded, but the installation is not as wanted: " + reason,
                differences=differences[:20],
            )
