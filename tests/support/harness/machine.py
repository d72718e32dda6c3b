"""The machine on which a system test runs the real binary.

A `Machine` is a sandbox's root directory: the test plants files in it, runs `wzorinst` on it as
root or as another user, and inspects output, tree, modes and bytes. Paths are the sandbox's own
("/opt/corvan/zor"), in arguments and in results alike.
"""

import os
import re
import stat
import subprocess
from dataclasses import dataclass

from harness import bubblewrap, toolkit

BINARY = "/media/wzorinst"
SPB = "/media/toolkit.spb"

# What a tree or listing leaves out: the real machine, the media and the scanners' logs.
UNLISTED = (
    "/dev",
    "/media",
    "/proc",
    "/usr/sbin",
    "/var",
    "/sbin",
    "/etc/alternatives",
    "/etc/ld.so.cache",
    "/etc/nsswitch.conf",
    "/etc/passwd",
    "/etc/group",
    *("/" + name for name in bubblewrap.MERGED_DIRECTORIES),
)

TIME_STAMP = re.compile(r"^\d{4}-\d\d-\d\dT\d\d:\d\d:\d\d$")


@dataclass(frozen=True)
class User:
    """A user of the machine; `writable` are the places this user may change (None: all)."""

    uid: int
    name: str
    home: str
    writable: tuple | None


ROOT = User(0, "root", "/root", None)
ANN = User(1000, "ann", "/home/ann", ("/home/ann", "/tmp", "/var"))
# Without a password entry, and so without a home directory.
STRANGER = User(4711, "", "/", ("/tmp", "/var"))


@dataclass(frozen=True)
class Outcome:
    """What one run of a program printed, how it ended, and the scanner commands it gave."""

    stdout: str
    stderr: str
    status: int
    commands: list


@dataclass(frozen=True)
class Node:
    """One name of a tree. `content` is a file's bytes or a link's target.

    `owner` is a user's and a group's number, root's on a machine that maps its users.
    """

    kind: str
    mode: int
    content: bytes = b""
    owner: tuple = (0, 0)

    def __str__(self):
        owner = "" if self.owner == (0, 0) else f" {self.owner[0]}:{self.owner[1]}"
        return f"{self.kind} {self.mode:04o}{owner}"


class Machine:
    """One machine; `root` is its path on the host."""

    def __init__(self, binary):
        self.root = bubblewrap.new_root()
        self.binary = binary
        self.has_selinux = False
        self.maps_users = True
        self.write_users()
        self.make_directory("/home/ann")
        self.make_directory("/var/scanners", 0o777)
        self.plant("/media/wzorinst")
        self.plant(SPB, toolkit.package())

    def write_users(self, root_home="/root"):
        bubblewrap.write_users(self.root, [("root", 0, root_home), ("ann", 1000, "/home/ann")])

    def delete(self):
        bubblewrap.delete_root(self.root)

    # Planting.

    def at(self, path):
        """The host's name of the machine's `path`."""
        assert path.startswith("/"), path
        return self.root + path

    def make_directory(self, path, mode=0o755):
        """Makes a directory with exactly `mode`, and its missing parents with 0755."""
        missing = []
        while not os.path.lexists(self.at(path)):
            assert path != "/", f"{self.root} is not there, or out of reach"
            missing.append(path)
            path = os.path.dirname(path)
        for directory in reversed(missing):
            os.mkdir(self.at(directory))
            os.chmod(self.at(directory), mode if directory == missing[0] else 0o755)

    def plant(self, path, content=b"", mode=0o644):
        """Writes a file with exactly these bytes and this mode, making its directories."""
        self.make_directory(os.path.dirname(path))
        if os.path.lexists(self.at(path)):
            os.unlink(self.at(path))
        with open(self.at(path), "wb") as file:
            file.write(content.encode() if isinstance(content, str) else content)
        os.chmod(self.at(path), mode)

    def link(self, path, target):
        """Makes a symbolic link."""
        self.make_directory(os.path.dirname(path))
        os.symlink(target, self.at(path))

    def change_mode(self, path, mode):
        os.chmod(self.at(path), mode)

    def give(self, path, owner):
        """Gives `path` to a user and a group, where the machine does not map its users."""
        if not self.maps_users:
            mode = self.mode(path)
            os.chown(self.at(path), *owner, follow_symlinks=False)
            if not os.path.islink(self.at(path)):
                os.chmod(self.at(path), mode)  # a change of owner can take bits away

    def remove(self, path):
        """Deletes a file or a whole tree."""
        if os.path.isdir(self.at(path)) and not os.path.islink(self.at(path)):
            bubblewrap.delete_root(self.at(path))
        else:
            os.unlink(self.at(path))

    def pack(self, changes=None, without=()):
        """Plants another package; the arguments are those of `toolkit.package`."""
        self.plant(SPB, toolkit.package(changes, without))

    def register(
        self,
        home="/opt/corvan/zor",
        version="9.2.30.0000",
        date="22/12/02",
        exploiters="ABC:",
        path="/etc/zor/zor.ini",
    ):
        """Plants a registry as the installer writes it."""
        self.plant(
            path,
            f"ZOR_Version = {version}\n"
            f"ZOR_BuildDate = {date}\n"
            f"ZOR_HomeDirectory = {home}\n"
            f"ZOR_Exploiters = {exploiters}\n"
            f"ZOR_ConfigRootDirectory = {home}\n",
        )

    def plant_scanner_control(self, home="/opt/corvan/zor"):
        """Plants the two scanner programs, which make an installation count as intact."""
        for name in ("trawlcfg", "trawlfs"):
            self.plant(f"{home}/bin/{name}", toolkit.SCANNER_PROGRAM, 0o755)

    def let_commands_fail(self, *failures):
        """Makes scanner programs exit with a status: pairs of a text to look for and a status."""
        self.plant(toolkit.FAILURES, "".join(f"{text} {status}\n" for text, status in failures))

    def add_selinux(self, enabled_status=0, chcon_status=0):
        """Plants stand-ins for the SELinux tools, which log their command lines too."""
        for path, status in (
            ("/usr/sbin/selinuxenabled", enabled_status),
            ("/media/chcon", chcon_status),
        ):
            script = toolkit.SCANNER_PROGRAM.replace(b"[ -e", b"exit %d\n[ -e" % status)
            self.plant(path, script, 0o755)
        self.has_selinux = True

    # Running.

    def run(
        self, *arguments, user=ROOT, umask=0o022, environment=None, options=(), everywhere=False
    ):
        """Runs wzorinst with `arguments`.

        A user other than root finds everything read-only but the user's own places, unless
        `everywhere` is set. `options` are further bwrap options.
        """
        return self.execute([BINARY, *arguments], user, umask, environment, options, everywhere)

    def run_in_shell(self, script, *arguments, user=ROOT, umask=0o022, options=()):
        """Runs `script` by the shell, with the binary as $0 and `arguments` as $1 and on."""
        command = ["/bin/sh", "-c", script, BINARY, *arguments]
        return self.execute(command, user, umask, None, options, False)

    def execute(self, command, user, umask, environment, options, everywhere):
        before = len(self.logged_commands())
        read_only = {BINARY: self.binary}
        if self.has_selinux:
            read_only["/usr/bin/chcon"] = self.at("/media/chcon")
        line = bubblewrap.command_line(
            self.root,
            command,
            uid=user.uid,
            environment=bubblewrap.environment_of(user.home, environment),
            read_only=read_only,
            writable=None if everywhere else user.writable,
            options=options,
            maps_users=self.maps_users or user.uid != 0,
        )
        done = subprocess.run(
            line, stdin=subprocess.DEVNULL, capture_output=True, check=False, umask=umask
        )
        return Outcome(
            as_text(done.stdout),
            as_text(done.stderr),
            done.returncode,
            self.logged_commands()[before:],
        )

    def logged_commands(self):
        """The command lines of the scanner programs so far, oldest first."""
        return self.log_lines(toolkit.COMMAND_LOG)

    def library_paths(self):
        """LD_LIBRARY_PATH as each scanner program saw it, oldest first."""
        return self.log_lines(toolkit.LIBRARY_PATH_LOG)

    def log_lines(self, path):
        return self.read(path).splitlines() if self.exists(path) else []

    # Inspecting.

    def exists(self, path):
        return os.path.lexists(self.at(path))

    def read(self, path):
        """A file's text."""
        with open(self.at(path), "rb") as file:
            return as_text(file.read())

    def read_bytes(self, path):
        with open(self.at(path), "rb") as file:
            return file.read()

    def mode(self, path):
        """The permission bits of `path`, not following a link."""
        return stat.S_IMODE(os.lstat(self.at(path)).st_mode)

    def tree(self, *places):
        """Everything at and below `places` (default: the whole machine): path to `Node`."""
        found = {}
        for place in places or ("/",):
            self.collect(place, found)
        return found

    def collect(self, path, found):
        if path in UNLISTED or (os.path.dirname(path) == "/usr" and path != "/usr/kel"):
            return
        host = self.at(path)
        status = os.lstat(host)
        mode = stat.S_IMODE(status.st_mode)
        owner = (0, 0) if self.maps_users else (status.st_uid, status.st_gid)
        if stat.S_ISLNK(status.st_mode):
            found[path] = Node("l", mode, os.fsencode(os.readlink(host)), owner)
        elif stat.S_ISDIR(status.st_mode):
            found[path] = Node("d", mode, b"", owner)
            with readable(host, mode):
                for name in sorted(os.listdir(host)):
                    self.collect(os.path.join(path, name), found)
        else:
            with readable(host, mode), open(host, "rb") as file:
                found[path] = Node("f", mode, file.read(), owner)

    def listing(self, *places):
        """The tree of `places` as lines of kind, mode and path."""
        return "".join(f"{node} {path}\n" for path, node in self.tree(*places).items())

    def index(self, home):
        """The file index of `home`, its time stamp checked and written as TIME."""
        first, rest = self.read(home + "/ZOR_files").split("\n", 1)
        head, separator, stamp = first.rpartition(" installed on ")
        assert separator and TIME_STAMP.match(stamp), first
        return f"{head}{separator}TIME\n{rest}"


class readable:
    """Lets an ordinary user look into what a test or the installer closed."""

    def __init__(self, host, mode):
        self.host = host
        self.mode = mode
        self.closed = mode & 0o500 != (0o500 if os.path.isdir(host) else mode & 0o100 | 0o400)

    def __enter__(self):
        if self.closed:
            os.chmod(self.host, self.mode | 0o500)

    def __exit__(self, *_):
        if self.closed:
            os.chmod(self.host, self.mode)


def as_text(data):
    return data.decode("utf-8", "surrogateescape")
