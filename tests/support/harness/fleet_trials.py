"""Runs playbooks on hosts of a fleet, and makes the packages and programs for them.

The environment variables WZORINST, ZORCTL and SPB name the programs under test.
"""

import hashlib
import json
import os
import re
import shutil
import stat
import subprocess
from dataclasses import dataclass
from pathlib import Path

from harness import REPOSITORY
from harness.fleet_hosts import load_hosts

PROGRAMS = {"wzorinst": "WZORINST", "zorctl": "ZORCTL", "spb": "SPB"}

# The version in the stamp of a program, "9.2.30.0000": the compiler keeps it as one text or as the
# operands of instructions.
STAMP = re.compile(rb"(zor_.{0,12}?)9\.2\.", re.DOTALL)

# Where a run may change something (".usr" is what the host changed in /usr), and what changes by
# Ansible's visit alone.
WATCHED = ("etc", "home", "opt", "root", "tmp", ".usr", "var")
VISITS = re.compile(
    r"(root|home/ann|tmp|var/tmp|var/log|var/log/(sshd\.log|host\.log|wtmp\.db)"
    r"|home/ann/\.wzorinst\.lock)$"
    r"|(root|home/ann)/\.ansible(/|$)"
)


@dataclass(frozen=True)
class Play:
    """A run of ansible-playbook: results by task and host, its status and all that it printed."""

    results: dict
    status: int
    output: str

    def result(self, task, host):
        return self.results[task, host]

    @property
    def warnings(self):
        """All but the one about the directory that Ansible itself makes for an ordinary user."""
        found = re.findall(r"\[(?:DEPRECATION )?WARNING\].*", self.output)
        return [line for line in found if "remote_tmp" not in line]


class Fleet:
    """Hosts that run until close() is called, or until this process ends."""

    def __init__(self, count):
        line = [REPOSITORY / "fleet/hosts", "run", str(count)]
        line += ["--", "sh", "-c", 'echo "$FLEET"; exec cat']
        self._process = subprocess.Popen(
            line, stdin=subprocess.PIPE, stdout=subprocess.PIPE, text=True
        )
        self.directory = Path(self._process.stdout.readline().strip())
        self.hosts = load_hosts(self.directory)

    def close(self):
        self._process.stdin.close()
        self._process.stdout.close()
        assert self._process.wait() == 0

    def play(self, playbook, *arguments, quiet=False, **environment):
        """Runs a playbook, a path or a list of plays, with further arguments."""
        if isinstance(playbook, list):
            path = self.directory / "playbook.json"
            path.write_text(json.dumps(playbook))
            playbook = path
        notes = self.directory / "results.jsonl"
        notes.unlink(missing_ok=True)
        environment = {
            **os.environ,
            "ANSIBLE_CONFIG": str(self.directory / "ansible.cfg"),
            "ANSIBLE_CALLBACK_PLUGINS": str(REPOSITORY / "fleet/tests/callback"),
            "ANSIBLE_CALLBACKS_ENABLED": "trial_results",
            "ANSIBLE_INJECT_FACT_VARS": "False",
            "ANSIBLE_FORKS": "10",
            "LC_ALL": "C.UTF-8",
            "TRIAL_RESULTS": str(notes),
            **environment,
        }
        done = subprocess.run(
            ["ansible-playbook", playbook, *arguments],
            env=environment,
            cwd=self.directory,
            stdout=subprocess.PIPE,
            stderr=subprocess.STDOUT,
            text=True,
            check=False,
        )
        if not quiet:
            print(done.stdout)
        lines = notes.read_text().splitlines() if notes.exists() else []
        entries = [json.loads(line) for line in lines]
        results = {
            (entry["task"], entry["host"]): {**entry["result"], "outcome": entry["outcome"]}
            for entry in entries
        }
        return Play(results, done.returncode, done.stdout)


def tree_of(host):
    """Everything of a host that a run may change: names with kind, mode, owner, time and bytes."""
    found = {}
    for top in WATCHED:
        base = os.path.join(host.root, top)
        for directory, names, files in os.walk(base):
            for name in [".", *names, *files]:
                path = os.path.normpath(os.path.join(directory, name))
                short = os.path.relpath(path, host.root)
                if not VISITS.match(short):
                    found[short] = node(path)
    return found


def node(path):
    status = os.lstat(path)
    content = ""
    if stat.S_ISREG(status.st_mode):
        with open(path, "rb") as file:
            content = hashlib.sha256(file.read()).hexdigest()
    elif stat.S_ISLNK(status.st_mode):
        content = os.readlink(path)
    return status.st_mode, status.st_uid, status.st_gid, status.st_mtime_ns, content


def make_package(directory, name, changes=None):
    """Packs the example toolkit, with changed files {path: bytes}; returns the package's path."""
    tree = directory / "toolkit"
    if not tree.exists():
        subprocess.run([REPOSITORY / "scripts/build_toolkit.sh", tree], check=True)
    copy = directory / (name + "-tree")
    shutil.copytree(tree, copy)
    for path, content in (changes or {}).items():
        (copy / path).write_bytes(content)
    package = directory / (name + ".spb")
    line = [os.environ["SPB"], "pack", copy, "-o", package]
    subprocess.run(line, check=True, capture_output=True)
    return package


def width_of_programs():
    with open(os.environ["ZORCTL"], "rb") as file:
        return {1: "i686", 2: "x86_64"}[file.read(5)[4]]


def make_programs(directory, version=b"9.2."):
    """Copies the programs under test. Another `version` makes them those of 9.1.30.0000, say."""
    target = directory / width_of_programs()
    target.mkdir(parents=True)
    for name, variable in PROGRAMS.items():
        content, count = STAMP.subn(rb"\g<1>" + version, Path(os.environ[variable]).read_bytes())
        assert count == 1 or name == "spb"
        (target / name).write_bytes(content)
        (target / name).chmod(0o755)
    return directory
