"""Starts a fleet: hosts that Ansible reaches by ssh, on this machine and apart from it.

Each host is an sshd in mount, process, IPC and host name namespaces of its own. Its root is in
memory: a few files made here, and the machine's /usr below a layer that takes what the host writes.
Nothing else of the machine is seen. The hosts listen on addresses of the loopback network, 127/8.

A fleet has one directory, with its keys, an inventory and an ansible.cfg. The supervisor
(run_fleet) starts the hosts and ends them when it ends, whatever ends it: the kernel kills each
host when its parent is gone, and mounts go with the last process of their namespace.
"""

import contextlib
import ctypes
import json
import os
import random
import shutil
import signal
import socket
import subprocess
from dataclasses import dataclass
from pathlib import Path

from harness import REPOSITORY

PORT = 2222
HOST_ROOT = REPOSITORY / "fleet/host_root.sh"
HOSTS_FILE = "hosts.json"

PASSWD = """\
root:*:0:0::/root:/bin/sh
ann:*:1000:1000::/home/ann:/bin/sh
sshd:*:100:65534::/run/sshd:/usr/sbin/nologin
nobody:*:65534:65534::/nonexistent:/usr/sbin/nologin
"""
GROUP = "root:x:0:\nann:x:1000:\nnogroup:x:65534:\n"
NAME_SERVICES = "passwd: files\ngroup: files\nhosts: files\n"

# "su", for become: root may become anybody, nobody else may become anyone.
PAM_RULES = "auth sufficient pam_rootok.so\nauth required pam_deny.so\n"
PAM_RULES += "account required pam_permit.so\nsession required pam_permit.so\n"

SSHD_CONFIG = """\
ListenAddress {address}:{port}
HostKey /etc/ssh/host_key
PermitRootLogin prohibit-password
PasswordAuthentication no
KbdInteractiveAuthentication no
UsePAM no
UseDNS no
MaxStartups 200
PidFile /run/sshd.pid
Subsystem sftp internal-sftp
"""

ANSIBLE_CONFIG = """\
[defaults]
home = {directory}/home
inventory = {directory}/inventory.ini
collections_path = {directory}/collections
local_tmp = {directory}/tmp
remote_user = root
private_key_file = {directory}/key
interpreter_python = /usr/bin/python3
retry_files_enabled = False

[ssh_connection]
pipelining = True
control_path_dir = {directory}/control
ssh_args = -F /dev/null -o UserKnownHostsFile={directory}/known_hosts \
-o ControlMaster=auto -o ControlPersist=60
"""


@dataclass(frozen=True)
class Host:
    """A running host; `pid` is the machine's number of the host's first process."""

    name: str
    address: str
    pid: int

    @property
    def root(self):
        """The host's root directory, as the machine can reach it."""
        return f"/proc/{self.pid}/root"

    def line(self, command):
        """The command line that runs the list `command` in the host, without ssh."""
        line = ["nsenter", "--target", str(self.pid), "--mount", "--pid", "--uts", "--ipc"]
        return line + ["--root", "--wdns=/", "--", *command]

    def run(self, command, **options):
        """Runs a command of the shell in the host, without ssh."""
        options = {"check": True, "capture_output": True, "text": True, **options}
        line = self.line(["/bin/sh", "-c", command])
        return subprocess.run(line, **options)  # pylint: disable=subprocess-run-check


def addresses(count):
    """`count` addresses of a part of the loopback network that nobody else listens on."""
    while True:
        first = (127 << 24) + (random.randrange(1, 255) << 16) + (random.randrange(240) << 8)
        found = [first + number // 250 * 256 + number % 250 + 1 for number in range(count)]
        found = [socket.inet_ntoa(address.to_bytes(4, "big")) for address in found]
        with socket.socket() as probe:
            with contextlib.suppress(OSError):
                probe.bind((found[0], PORT))
                return found


def make_key(path):
    subprocess.run(
        ["ssh-keygen", "-q", "-t", "ed25519", "-N", "", "-C", "", "-f", path], check=True
    )


def write(path, text, mode=0o644):
    path.parent.mkdir(parents=True, exist_ok=True)
    path.write_text(text, encoding="utf-8")
    path.chmod(mode)


def prepare(directory, count):
    """Makes the files of a fleet of `count` hosts in `directory`; returns names and addresses."""
    width = len(str(count))
    named = {f"host{n + 1:0{width}}": address for n, address in enumerate(addresses(count))}
    for name in ("control", "home", "tmp", "root"):
        (directory / name).mkdir(mode=0o700)
    make_key(directory / "key")
    make_key(directory / "host_key")
    write(directory / "known_hosts", "* " + (directory / "host_key.pub").read_text())
    write(directory / "ansible.cfg", ANSIBLE_CONFIG.format(directory=directory))
    lines = [
        f"{name} ansible_host={address} ansible_port={PORT}\n" for name, address in named.items()
    ]
    write(directory / "inventory.ini", "[fleet]\n" + "".join(lines))
    collection = directory / "collections/ansible_collections/corvan/zor"
    collection.parent.mkdir(parents=True)
    collection.symlink_to(REPOSITORY / "fleet")
    furnish(directory / "furniture", directory)
    for name, address in named.items():
        shutil.copytree(directory / "furniture", directory / "hosts" / name, symlinks=True)
        config = SSHD_CONFIG.format(address=address, port=PORT)
        write(directory / "hosts" / name / "etc/ssh/sshd_config", config)
    return named


def furnish(furniture, directory):
    """Makes what the roots of all hosts begin with."""
    write(furniture / "etc/passwd", PASSWD)
    write(furniture / "etc/group", GROUP)
    write(furniture / "etc/nsswitch.conf", NAME_SERVICES)
    write(furniture / "etc/pam.d/other", PAM_RULES)
    write(furniture / "etc/ssh/host_key", (directory / "host_key").read_text(), 0o600)
    (furniture / "root").mkdir(mode=0o700)
    write(furniture / "root/.ssh/authorized_keys", (directory / "key.pub").read_text(), 0o600)
    if os.path.exists("/etc/ld.so.cache"):
        shutil.copy("/etc/ld.so.cache", furniture / "etc/ld.so.cache")
    if os.path.isdir("/etc/alternatives"):
        shutil.copytree("/etc/alternatives", furniture / "etc/alternatives", symlinks=True)


def die_with_parent():
    """Has the kernel kill this process when its parent ends."""
    prctl_set_pdeathsig = 1
    ctypes.CDLL(None).prctl(prctl_set_pdeathsig, signal.SIGKILL)


def adopt_orphans():
    """Makes this process the parent of all its descendants that lose theirs."""
    prctl_set_child_subreaper = 36
    ctypes.CDLL(None).prctl(prctl_set_child_subreaper, 1)


def end_children():
    """Kills the hosts, and with them what a command left: the connections of ssh, for example."""
    children = Path(f"/proc/self/task/{os.getpid()}/children")
    while found := children.read_text(encoding="ascii").split():
        for number in found:
            os.kill(int(number), signal.SIGKILL)
        for number in found:
            os.waitpid(int(number), 0)


def start_host(directory, name):
    """Starts one host; returns the process that is the parent of its first process."""
    line = ["unshare", "--mount", "--pid", "--ipc", "--uts", "--fork", "--kill-child=KILL"]
    line += [str(HOST_ROOT), str(directory / "root"), str(directory / "hosts" / name), name]
    # Not in our session: a Ctrl-C ends the hosts through us, when nobody needs them any more.
    # pylint: disable-next=subprocess-popen-preexec-fn # this process has no other threads
    return subprocess.Popen(
        line, preexec_fn=die_with_parent, stdin=subprocess.DEVNULL, start_new_session=True
    )


def check_for_a_moment(parent):
    """Waits a moment, and fails if the process `parent` ends in it."""
    with contextlib.suppress(subprocess.TimeoutExpired):
        raise ChildProcessError(f"a host ended with status {parent.wait(timeout=0.01)}")


def first_process(parent):
    """The number of the only child of the process `parent`."""
    children = Path(f"/proc/{parent.pid}/task/{parent.pid}/children")
    while not (found := children.read_text(encoding="ascii").split()):
        check_for_a_moment(parent)
    return int(found[0])


def wait_until_it_listens(address, parent):
    while True:
        with socket.socket() as probe:
            if probe.connect_ex((address, PORT)) == 0:
                return
        check_for_a_moment(parent)


def run_fleet(directory, count, ready, wait):
    """Runs a fleet of `count` hosts, its files in the empty `directory`, until `wait` returns.

    Calls `ready` with the hosts once all listen. Afterwards the hosts are gone and so is
    `directory`.
    """
    adopt_orphans()
    try:
        parents = {}
        named = prepare(directory, count)
        for name in named:
            parents[name] = start_host(directory, name)
        hosts = []
        for name, address in named.items():
            wait_until_it_listens(address, parents[name])
            hosts.append(Host(name, address, first_process(parents[name])))
        write(directory / HOSTS_FILE, json.dumps([vars(host) for host in hosts]))
        ready(hosts)
        wait()
    finally:
        for number in (signal.SIGINT, signal.SIGTERM, signal.SIGHUP):
            signal.signal(number, signal.SIG_IGN)
        end_children()
        shutil.rmtree(directory, ignore_errors=True)


def load_hosts(directory):
    """The hosts of the fleet in `directory`, by name."""
    found = json.loads((directory / HOSTS_FILE).read_text())
    return {host["name"]: Host(**host) for host in found}
