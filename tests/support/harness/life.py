"""A random life: a seeded sequence of actions, options, packages, planted files and failures.

After each action the model (life_model.py) says what must have happened. A failing life prints
its seed and its steps; the same seed gives the same life.
"""

import random
import shlex

from harness import rollback
from harness.checks import same_lines, same_text
from harness.life_model import (
    OWN_VERSION,
    PACKAGES,
    UNEDITED,
    Package,
    Record,
    expect_fresh_failure,
    expect_index,
    expect_installation,
    expect_removal,
    is_file,
    places,
)
from harness.machine import SPB, Machine

# Parts of one another, so that the text search of a removal reaches its edge cases.
EXPLOITERS = ("ABC", "XABC", "BC", "Q")

FAILING_COMMANDS = ("common_trace_path", "-enable", "-shutdown", "-disable")

# Where files are planted below a home directory, and the actions that delete them.
PLANTED = {
    "mine": (),
    "bin/mine": (),
    "bin/plugins/mine": (),
    "bin/other/deep/mine": (),
    "install/sub/mine": (),
    "logs/sub/mine": (),
    "bin/trawlhw.bak": ("replace",),
    "bin/trawlnet": ("upgrade",),
    "bin/libzor.so": ("upgrade", "remove"),
    "properties/mine": ("upgrade", "remove"),
    "cache_data/deep/mine": ("upgrade", "remove"),
    "config/mine": ("remove",),
    "config/xss/mine": ("remove",),
    "install/mine": ("remove",),
    "logs/mine": ("remove",),
    "_uninst/mine": ("remove",),
    "bin/etc/mine": ("remove",),
    "bin/etc/trawlfs/mine": ("remove",),
    "zor.log": ("remove",),
}

VERSIONS = ((1, 0, 0, 0), (9, 2, 29, 9999), OWN_VERSION, (9, 2, 30, 1), (10, 0, 0, 0))
DATES = ("21/06/30", "22/12/02", "23/01/01")

# Directories that an installation leaves behind for good, besides those of the setting.
COMMON_DIRECTORIES = ("/usr/kel", "/usr/kel/corvan", "/usr/kel/corvan/common")

# Removed with the shared installation, but made by private ones of root as well.
COMMON_LOGS = "/usr/kel/corvan/common/ZOR"

RULES = (
    rollback.FILE_INDEX,
    rollback.INSTALL_TYPE_FILE,
    rollback.SINGLE_USER_FLAG,
    rollback.COMMON_SETTING,
    rollback.OLDER_BACKUP,
    rollback.XSS_FILES,
    rollback.MAIN_PROPERTY_FILE,
    rollback.TRACE_PROPERTY_FILE,
    rollback.SCRIPTS_OF_OLD,
)

UPGRADE_RULES = RULES + (rollback.PROPERTIES_DIRECTORY, rollback.OBSOLETE_FILE)


class Life:
    """One life of `steps` actions on a fresh machine, drawn from `seed`."""

    def __init__(self, binary, seed):
        self.seed = seed
        self.random = random.Random(seed)
        self.machine = Machine(binary)
        self.places = places()
        self.steps = []
        self.failures = ()
        self.planted = {}  # path: bytes, as long as they must be there
        self.leftovers = set()  # what failed runs, and installations given up, left behind
        self.installed = set()  # every path that a package ever brought
        self.beginning = self.machine.tree()

    def live(self, steps):
        actions = (
            [self.install] * 6
            + [self.remove] * 4
            + [self.plant] * 3
            + [
                self.change_the_version,
                self.change_a_setting,
                self.break_the_scanner_control,
                self.let_commands_fail,
                self.delete_the_home,
                self.spoil_the_registry,
                self.install_privately,
                self.remove_privately,
                self.report,
            ]
        )
        try:
            for _ in range(steps):
                self.random.choice(actions)()
                self.check_always()
        except AssertionError as failure:
            raise AssertionError(
                f"\nseed {self.seed} failed in its last step:\n"
                + "".join(f"    {number}. {step}\n" for number, step in enumerate(self.steps, 1))
                + str(failure)
            ) from None
        finally:
            self.machine.delete()

    def chance(self, one_in):
        return self.random.randrange(one_in) == 0

    def place(self):
        return self.random.choice(self.places)

    # What the administrator, the machine and chance do.

    def plant(self):
        place = self.place()
        home = place.record.home if place.record else place.homes[0]
        name = self.random.choice(sorted(PLANTED) + ["(registry directory)"])
        path = f"{home}/{name}"
        if name == "(registry directory)":
            path = place.registry.rsplit("/", 1)[0] + "/mine"
        content = b"planted in step %d\n" % len(self.steps)
        self.steps.append(f"plant {path}")
        self.machine.plant(path, content, self.random.choice((0o600, 0o644, 0o755)))
        self.planted[path] = content

    def change_the_version(self):
        place = self.place()
        if place.record:
            place.record = Record(
                self.random.choice(VERSIONS),
                self.random.choice(DATES),
                place.record.home,
                place.record.exploiters,
            )
            self.steps.append(f"write {place.registry}: {place.record}")
            self.machine.plant(place.registry, place.record.text())

    def change_a_setting(self):
        place = self.place()
        path = place.record.home + "/config/Zor.properties" if place.record else ""
        if path and self.machine.exists(path):
            self.steps.append(f"append a setting to {path}")
            self.machine.plant(path, self.machine.read(path) + "my.setting=1\n")

    def break_the_scanner_control(self):
        place = self.place()
        path = place.record.home + "/bin/trawlcfg" if place.record else ""
        if path and self.machine.exists(path):
            if self.chance(2):
                self.steps.append(f"delete {path}")
                self.machine.remove(path)
            else:
                self.steps.append(f"empty {path}")
                self.machine.plant(path, b"", 0o644)

    def let_commands_fail(self):
        count = self.random.randrange(3)
        self.failures = tuple(self.random.sample(FAILING_COMMANDS, count))
        self.steps.append(f"let these commands fail: {self.failures}")
        self.machine.let_commands_fail(*((text, 3) for text in self.failures))

    def delete_the_home(self):
        place = self.place()
        if place.record and self.chance(2) and self.machine.exists(place.record.home):
            self.steps.append(f"delete {place.record.home}")
            self.machine.remove(place.record.home)
            self.forget_below(place.record.home)

    def spoil_the_registry(self):
        place = self.place()
        if place.record and self.chance(2):
            text = self.random.choice(("ZOR_Version = 9.x\n", "ZOR_Version = 9.2\n", ""))
            self.steps.append(f"spoil {place.registry}: {text!r}")
            self.machine.plant(place.registry, text)
            if self.machine.exists(place.record.home):
                self.leftovers |= set(self.machine.tree(place.record.home))
            self.leftovers.add(place.registry)
            place.record = None

    def forget_below(self, directory):
        self.planted = {
            path: content
            for path, content in self.planted.items()
            if not path.startswith(directory + "/")
        }

    # What exploiters do.

    def draw_options(self, place):
        options = []
        for option, one_in in (("-n", 6), ("-r", 6), ("-v", 6), ("-norollback", 10)):
            if self.chance(one_in):
                options.append(option)
        if self.chance(6):
            options += ["-c", place.traces]
        return options

    def run(self, place, *arguments):
        umask = self.random.choice((0o000, 0o022, 0o077))
        self.steps.append(
            f"{place.user.name}: wzorinst {shlex.join(arguments)} (umask {umask:03o})"
        )
        return self.machine.run(*arguments, user=place.user, umask=umask)

    def draw_package(self):
        good_or_any = ["the toolkit", "another build"] * 5 + sorted(PACKAGES)
        package = Package(self.random.choice(good_or_any))
        self.steps.append(f"the package is {package.name}")
        self.machine.plant(SPB, package.content)
        return package

    def install(self):
        place, package = self.place(), self.draw_package()
        exploiter, options = self.random.choice(EXPLOITERS), self.draw_options(place)
        directory = self.random.choice((None, *place.homes))
        before = self.machine.tree()
        expected = expect_installation(
            place, before, package, exploiter, options, directory, self.failures
        )
        index = self.index_text(expected.home)

        outcome = self.run(
            place, "i", exploiter, "-s", SPB, *options, *(("-d", directory) if directory else ())
        )

        after = self.machine.tree()
        self.status_is(outcome, 1 if expected.failure else 0)
        if expected.failure is None:
            if f"{expected.home}/bin/trawlhw" in before and expected.deploys:
                self.expect_deleted(expected.home, "replace")
            self.check_installed(place, package, options, expected, index, after)
        else:
            self.check_failed(place, options, expected, before, after)

    def check_installed(self, place, package, options, expected, index, after):
        place.record = expected.record
        self.leftovers.discard(place.registry)
        if expected.deploys:
            self.installed |= {f"{expected.home}/{name}" for name in package.files}
            for name, content in package.files.items():
                if UNEDITED.match(name):
                    assert after[f"{expected.home}/{name}"].content == content, name
        if expected.kind == "upgrade":
            self.expect_deleted(expected.home, "upgrade")
            assert expected.home + "/cache_data" not in after
        listed = [
            line for line in self.index_text(expected.home).splitlines() if not line.startswith("#")
        ]
        if expected.deploys or "-r" in options:
            same_lines(listed, expect_index(index, package, expected, options), "index")
        # What an earlier run left in this home is the installation's own now, if it is listed.
        self.leftovers = {
            path
            for path in self.leftovers
            if not (path + "/").startswith(expected.home + "/")
            or (
                is_file(after, path) and path not in listed and path != expected.home + "/ZOR_files"
            )
        }

    def check_failed(self, place, options, expected, before, after):
        self.leftovers |= set(after) - set(before)
        if "-norollback" in options:
            # What it replaced and deleted before it failed stays replaced and deleted.
            self.planted = {
                path: content for path, content in self.planted.items() if path in after
            }
            if expected.failure == "late":
                place.record = expected.record
            return
        rules = UPGRADE_RULES if expected.kind == "upgrade" else RULES
        lines, _ = rollback.unexplained(before, after, rules)
        assert not lines, "not restored by the rollback:\n" + "".join(lines)
        self.planted = {path: content for path, content in self.planted.items() if path in after}

    def remove(self):
        place, exploiter = self.place(), self.random.choice(EXPLOITERS)
        before = self.machine.tree()
        expected = expect_removal(place, before, exploiter)
        home = place.record.home if place.record else ""
        listed = self.index_text(home).splitlines()

        outcome = self.run(place, "r", exploiter)

        self.status_is(outcome, 0 if expected.found else 1)
        if expected.deletes:
            self.check_deleted(place, home, listed, is_private=False)
        else:
            place.record = expected.record
            after = self.machine.tree()
            before.pop(place.registry, None)
            after.pop(place.registry, None)
            assert after == before, "a removal that deletes nothing changed the tree"

    def check_deleted(self, place, home, listed, is_private):
        """After the last exploiter left: every new name is planted, named here, or elsewhere's.

        `listed` are the lines that the index had.
        """
        place.record = None
        after = self.machine.tree()
        self.expect_deleted(home, "remove")
        self.leftovers.discard(place.registry)
        # A failed extraction deletes the index, so later ones list their own files only.
        self.leftovers |= {path for path in self.installed - set(listed) if path in after}

        known = set(self.planted) | self.leftovers | {home}
        known.update(rollback.COMMON_SETTING_PLACES, COMMON_DIRECTORIES)
        elsewhere = [other.record.home for other in self.places if other.record]
        elsewhere += [other.private for other in self.places]
        if is_private or not place.is_shared:
            elsewhere.append(COMMON_LOGS)
        for other in self.places:
            known.add(other.traces)
            known.update(parent for name in other.homes for parent in rollback.parents(name))
            if other.record:
                known.add(other.registry)
        explained = known | {parent for path in known for parent in rollback.parents(path)}
        for path in set(after) - set(self.beginning):
            if path == home and after[path].kind == "d":
                held = [p for p in explained if p.startswith(home + "/") and p in after]
                assert held, f"an empty home directory is left: {home}"
            elif path not in explained and not path.startswith(tuple(elsewhere)):
                raise AssertionError(f"left behind by the last exploiter: {path}")

    def install_privately(self):
        place, package = self.place(), self.draw_package()
        exploiter, options = self.random.choice(EXPLOITERS), self.draw_options(place)
        before = self.machine.tree()
        removal = expect_removal(place, before, exploiter)
        failure = expect_fresh_failure(
            place, before, package, place.private, options, self.failures
        )
        home = place.record.home if place.record else ""
        listed = self.index_text(home).splitlines()

        outcome = self.run(place, "i", exploiter, "-s", SPB, *options, "-d", place.private, "-p")

        self.status_is(outcome, 1 if failure else 0)
        self.leave_for_private_mode(place, removal, home, listed)
        for name, content in package.files.items():
            if failure is None and UNEDITED.match(name):
                assert self.machine.read_bytes(f"{place.private}/{name}") == content, name

    def remove_privately(self):
        place, exploiter = self.place(), self.random.choice(EXPLOITERS)
        removal = expect_removal(place, self.machine.tree(), exploiter)
        home = place.record.home if place.record else ""
        listed = self.index_text(home).splitlines()

        outcome = self.run(place, "r", exploiter, "-d", place.private, "-p")

        self.status_is(outcome, 0)
        self.leave_for_private_mode(place, removal, home, listed)
        assert not self.machine.exists(place.private)

    def leave_for_private_mode(self, place, removal, home, listed):
        """The removal that precedes every private action."""
        if removal.deletes:
            self.check_deleted(place, home, listed, is_private=True)
        else:
            place.record = removal.record

    def report(self):
        place = self.place()
        outcome = self.run(place, "t")
        lines = []
        for number, shown in enumerate(self.places):
            lines += [
                "",
                (
                    "Status of shared (global) installation:",
                    "Status of installation for current user:",
                )[number],
            ]
            if shown is not place and number == 1:
                # Root's own installation, which no life uses.
                lines += ["INI file = /root/.zor/zor.ini", "Not installed"]
                continue
            lines.append(f"INI file = {shown.registry}")
            if shown.record:
                lines += [
                    f"Install dir = {shown.record.home}",
                    "Install version = {}.{}.{}.{:04}".format(*shown.record.version),
                    f"Exploiter list = {shown.record.exploiters}",
                ]
            else:
                lines.append("Not installed")
        same_lines(outcome.stdout.splitlines()[3:], lines, "status report")
        self.status_is(outcome, 0)

    # What holds after every action.

    def check_always(self):
        tree = self.machine.tree()
        self.leftovers &= set(tree)
        for place in self.places:
            if place.record:
                same_text(
                    tree[place.registry].content.decode(), place.record.text(), place.registry
                )
            else:
                assert (
                    place.registry not in tree or place.registry in self.leftovers
                ), f"{place.registry} is there, but nothing is installed"
        for path, content in self.planted.items():
            assert path in tree and tree[path].content == content, f"planted file gone: {path}"
        for path in tree:
            if path.endswith(".bak") and path not in self.leftovers:
                assert path in self.planted, f"backup left: {path}"

    def expect_deleted(self, home, action):
        """Takes the files that `action` deletes out of those that must be there."""
        for name, actions in PLANTED.items():
            if action in actions:
                self.planted.pop(f"{home}/{name}", None)

    def index_text(self, home):
        path = home + "/ZOR_files"
        return self.machine.read(path) if home and self.machine.exists(path) else ""

    def status_is(self, outcome, status):
        assert outcome.status == status and outcome.stderr.count("\n") == outcome.stderr.count(
            "scanner control error: "
        ) + outcome.stderr.count("not found\n") + outcome.stderr.count("Permission denied\n"), (
            f"exit status expected: {status}, came: {outcome.status}\n{outcome.stdout}"
            f"{outcome.stderr}"
        )
