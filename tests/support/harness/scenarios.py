"""The scenarios of the sweeps: what is on the machine, and the command given.

A `Scenario` is a command line of the installer together with the tree that it finds. Its machine is
prepared once, with the real binary and the example toolkit, and kept as a tree; `restore` brings
any machine back to such a tree, byte for byte and mode for mode, and owner for owner where root
runs the sweep.
"""

import os
import re
import subprocess
import tempfile
from dataclasses import dataclass, field, replace
from pathlib import PurePosixPath

from harness import REPOSITORY, bubblewrap
from harness.machine import BINARY, ROOT, SPB, Machine

HOME = "/opt/corvan/zor"
INDEX = HOME + "/ZOR_files"
CONTROL = HOME + "/bin/trawlcfg"
CONTROL_STATE = HOME + "/config/trawlcfg.state"
SETTINGS = HOME + "/config/Zor.properties"
TRACE_SETTINGS = HOME + "/config/ZorTrace.properties"
SCRIPTS = (HOME + "/install/trawlcfg.sh", HOME + "/install/rmdirs.sh")
INSTALL_TYPE = HOME + "/install/zor_install.properties"
SINGLE_USER_FLAG = HOME + "/config/SingleUserMode"
PROBE = HOME + "/$_ZOR_$"
REGISTRY = "/etc/zor/zor.ini"
COMMON_SETTING = "/etc/kel/corvan/common/cfg/log.properties"
SITE_COMMON = "/usr/kel/site/common"

# The same toolkit, its files stored instead of deflated.
STORED_SPB = "/media/stored.spb"
PACKAGES = (SPB, STORED_SPB)

# Outside of what a tree shows, so that the number of commands does not matter.
COMMAND_LOG = "/var/commands"

OLD_FILE = HOME + "/bin/trawlold"
OLD_PROPERTIES = HOME + "/properties/old.properties"
OBSOLETE_FILES = tuple(
    HOME + "/bin/" + name for name in ("trawlnet", "libzor.so", "kpo_config.xml")
)

# What an administrator has given to a user and a group of operators.
OPERATORS = (1002, 1003)
GIVEN_AWAY = (REGISTRY, COMMON_SETTING, INDEX, SETTINGS, HOME + "/bin/trawlhw", HOME + "/config")


@dataclass(frozen=True)
class Scenario:
    """One way through the installer. `fails` is true if an undisturbed run fails."""

    name: str
    title: str
    arguments: tuple
    prepare: object
    fails: bool = False
    environment: dict = field(default_factory=dict)

    def run(self, machine, tool=()):
        """Runs the installer on `machine`, under the command `tool`."""
        environment = {"ZOR_COMMAND_LOG": COMMAND_LOG, **self.environment}
        return machine.execute(
            [*tool, BINARY, *self.arguments], ROOT, 0o022, environment, (), False
        )


def toolkit_packages():
    """The example toolkit as SPBs: their bytes by the paths that they get on a machine."""
    scripts = REPOSITORY / "scripts"
    with tempfile.TemporaryDirectory(prefix="toolkit-") as directory:
        tree, package = os.path.join(directory, "tree"), os.path.join(directory, "spb")
        subprocess.run([scripts / "build_toolkit.sh", tree], check=True)
        packages = {}
        for path, options in ((SPB, ()), (STORED_SPB, ("--stored",))):
            subprocess.run(
                [scripts / "pack_toolkit.py", tree, "-o", package, *options],
                check=True,
                stdout=subprocess.DEVNULL,
            )
            with open(package, "rb") as file:
                packages[path] = file.read()
        return packages


def new_machine(binary, packages):
    """An empty machine with `binary` and `packages`."""
    machine = Machine(binary)
    machine.maps_users = not can_give_files_away(machine)
    for path, content in packages.items():
        machine.plant(path, content)
    machine.make_directory("/var/strace", 0o777)
    machine.make_directory("/run")
    return machine


def can_give_files_away(machine):
    """True where every user exists and this one may give files to others."""
    machine.plant("/tmp/trial")
    try:
        os.chown(machine.at("/tmp/trial"), *OPERATORS)
        return True
    except OSError:
        return False
    finally:
        machine.remove("/tmp/trial")


# Preparing.


def nothing_installed(_):
    """A machine that never saw the toolkit."""


def two_exploiters(machine):
    """A shared installation of this version, used by SHOP and DESK."""
    machine.plant(COMMON_SETTING, f"# ours\ncorvan_common_dir={SITE_COMMON}\n", 0o664)
    for exploiter in ("SHOP", "DESK"):
        environment = {"ZOR_COMMAND_LOG": COMMAND_LOG}
        outcome = machine.run("i", exploiter, "-s", SPB, environment=environment)
        assert outcome.status == 0, outcome.stdout


def register_version(machine, version, build_date):
    text = machine.read(REGISTRY)
    text = re.sub(r"(?m)^ZOR_Version = .*$", f"ZOR_Version = {version}", text)
    text = re.sub(r"(?m)^ZOR_BuildDate = .*$", f"ZOR_BuildDate = {build_date}", text)
    machine.plant(REGISTRY, text, 0o640)


def older_version(machine):
    """An older version with other contents and modes, more files and an owner's changes."""
    two_exploiters(machine)
    register_version(machine, "9.1.7.0003", "21/03/04")
    for path, node in machine.tree(HOME).items():
        if node.kind == "f" and path not in (INDEX, SETTINGS, INSTALL_TYPE, CONTROL_STATE):
            machine.plant(path, node.content + b"# 9.1.7.0003\n", node.mode)
    machine.change_mode(HOME + "/bin/trawlhw", 0o700)
    machine.change_mode(HOME + "/config/ZorHWConfig.xml", 0o600)

    for path in (*OBSOLETE_FILES, OLD_FILE, OLD_PROPERTIES):
        machine.plant(path, "of 9.1.7.0003\n")
    listed = machine.read(INDEX) + "".join(f"{path}\n" for path in (OLD_FILE, OLD_PROPERTIES))
    machine.plant(INDEX, listed)

    settings = machine.read(SETTINGS).replace("version=9.2.30.0000", "version=9.1.7.0003")
    settings = settings.replace("fscanner.changepriority=normal", "fscanner.changepriority=low")
    settings = settings.replace("swscanner.firsttimeonly=false\n", "")
    machine.plant(SETTINGS, settings + "trawlnet.cputhreshold=1:1:1:1\nsite.note=kept\n")

    machine.plant(HOME + "/bin/etc/site.conf", "of the owner\n")
    machine.plant(HOME + "/config/site.xml", "<site/>\n")
    machine.plant(HOME + "/cache_data/deep/old.cache", "stale\n")


def newer_version(machine):
    """An installation that is newer than the installer."""
    older_version(machine)
    register_version(machine, "9.9.0.0001", "23/01/02")


def last_exploiter(machine):
    """An older installation that only SHOP uses."""
    older_version(machine)
    machine.plant(REGISTRY, machine.read(REGISTRY).replace("SHOP:DESK:", "SHOP:"), 0o640)


def with_registry_that_cannot_be_saved(prepare):
    """A directory at the registry's backup name stops the last fatal step."""

    def prepare_so(machine):
        prepare(machine)
        machine.make_directory(REGISTRY + ".bak")

    return prepare_so


SCENARIOS = {
    scenario.name: scenario
    for scenario in (
        Scenario(
            "install", "fresh installation", ("i", "SHOP", "-s", STORED_SPB), nothing_installed
        ),
        Scenario("upgrade", "upgrade of an older version", ("i", "CLUB", "-s", SPB), older_version),
        Scenario(
            "register", "registration on a newer version", ("i", "CLUB", "-s", SPB), newer_version
        ),
        Scenario("unregister", "removal of one of two exploiters", ("r", "DESK"), two_exploiters),
        Scenario("remove", "removal of the last exploiter", ("r", "SHOP"), last_exploiter),
        Scenario(
            "failing-install",
            "fresh installation whose last step fails",
            ("i", "SHOP", "-s", SPB, "-r"),
            nothing_installed,
            True,
            {"ZOR_FAIL": "-s common_trace_path:9"},
        ),
        Scenario(
            "failing-upgrade",
            "upgrade whose last step fails",
            ("i", "CLUB", "-s", SPB),
            with_registry_that_cannot_be_saved(older_version),
            True,
        ),
        Scenario(
            "failing-register",
            "registration whose last step fails",
            ("i", "CLUB", "-s", SPB),
            with_registry_that_cannot_be_saved(newer_version),
            True,
        ),
    )
}


# Trees.


def tree_of(machine):
    """The machine's whole tree; the time in the first line of an index is left out."""
    tree = machine.tree()
    for path, node in tree.items():
        if os.path.basename(path) == os.path.basename(INDEX):
            content = re.sub(rb"( installed on )[-0-9T:]+\n", rb"\1TIME\n", node.content, count=1)
            tree[path] = replace(node, content=content)
    return tree


def restore(machine, tree):
    """Makes the machine's tree equal to `tree` again.

    Some file systems list names in the order in which they were created. For the same order each
    time, a directory of the installation in which a name is missing is filled anew.
    """
    now = tree_of(machine)
    incomplete = {
        os.path.dirname(path)
        for path, node in tree.items()
        if path.startswith(HOME + "/") and (path not in now or now[path].kind != node.kind)
    }
    for path in sorted(now, reverse=True):
        is_below_one = not incomplete.isdisjoint(map(str, PurePosixPath(path).parents))
        if path not in tree or tree[path].kind != now[path].kind or is_below_one:
            machine.remove(path)
            del now[path]
    for path in sorted(tree):
        if now.get(path) == tree[path]:
            continue
        node = tree[path]
        if node.kind == "f":
            machine.plant(path, node.content, node.mode)
        elif node.kind == "d":
            machine.make_directory(path, node.mode)
            machine.change_mode(path, node.mode)
        elif path not in now or now[path].content != node.content:
            machine.link(path, node.content.decode())
        machine.give(path, node.owner)


def differences(wanted, got):
    """The paths at which two trees differ."""
    return [path for path in sorted(set(wanted) | set(got)) if wanted.get(path) != got.get(path)]


def prepared(scenario, binary, packages):
    """The tree of the machine on which `scenario` begins."""
    machine = new_machine(binary, packages)
    try:
        scenario.prepare(machine)
        for path in filter(machine.exists, GIVEN_AWAY):
            machine.give(path, OPERATORS)
        return tree_of(machine)
    finally:
        bubblewrap.delete_root(machine.root)
