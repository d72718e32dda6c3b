"""The points at which a run of the installer can fail, and runs that fail at one of them.

A point is one system call on files or directories, as strace counts them: by kind, from the start
of the process. Only the installer's own calls count, not those of the programs that it starts, and
only those that it makes itself, from its first step on: the dynamic loader's come before.

strace was chosen over a preloaded library by measurement: it adds some 15 ms to a run of 60, and it
fails the calls that the C library makes on its own account as well, in 64-bit and in 32-bit.
"""

import os
import re
import signal
from dataclasses import dataclass, replace

from harness.machine import Outcome
from harness.scenarios import INDEX, PACKAGES

TRACE = "/var/strace/trace"
TIME_LIMIT = 30  # seconds

# Which of the four errors each kind of call can return. A write and a close can give what a network
# file system reports late; on a local one a close never fails.
ERRORS = {
    "access": ("EIO", "EACCES"),
    "chmod": ("EIO", "EACCES"),
    "chown": ("EIO", "EPERM"),
    "close": ("EIO", "ENOSPC"),
    "fallocate": ("EIO", "ENOSPC", "EOPNOTSUPP"),
    "fchmod": ("EIO",),
    "fchown": ("EIO", "EPERM"),
    "fgetxattr": ("EIO",),
    "flistxattr": ("EIO",),
    "fremovexattr": ("EIO", "EPERM"),
    "fsetxattr": ("EIO", "ENOSPC", "EPERM"),
    "fstat": ("EIO",),
    "fstatfs": ("EIO",),
    "fsync": ("EIO", "ENOSPC", "EDQUOT"),
    "ftruncate": ("EIO",),
    "getdents64": ("EIO",),
    "lseek": ("EIO",),
    "mkdir": ("EIO", "ENOSPC", "EACCES"),
    "open": ("EIO", "EACCES", "EMFILE"),
    "open to create": ("EIO", "ENOSPC", "EACCES", "EMFILE"),
    "read": ("EIO",),
    "readlink": ("EIO", "EACCES"),
    "rename": ("EIO", "ENOSPC", "EACCES"),
    "rmdir": ("EIO", "EACCES"),
    "sendfile": ("EIO", "ENOSPC", "EACCES"),
    "stat": ("EIO", "EACCES"),
    "statfs": ("EIO", "EACCES"),
    "sync_file_range": ("EIO", "ENOSPC"),
    "syncfs": ("EIO", "ENOSPC", "EDQUOT"),
    "unlink": ("EIO", "EACCES"),
    "walk": ("EIO", "EACCES", "EMFILE"),
    "write": ("EIO", "ENOSPC", "EACCES"),
}

# The kernel's names, of both builds, that go by another name above.
KINDS = {
    "_llseek": "lseek",
    "faccessat": "access",
    "faccessat2": "access",
    "fchmodat": "chmod",
    "fchmodat2": "chmod",
    "fchown32": "fchown",
    "fchownat": "chown",
    "fdatasync": "fsync",
    "fstatfs64": "fstatfs",
    "ftruncate64": "ftruncate",
    "lchown": "chown",
    "lchown32": "chown",
    "mkdirat": "mkdir",
    "openat": "open",
    "openat2": "open",
    "pread64": "read",
    "readlinkat": "readlink",
    "renameat": "rename",
    "renameat2": "rename",
    "sendfile64": "sendfile",
    "statfs64": "statfs",
    "sync_file_range2": "sync_file_range",
}

# What makes earlier changes durable.
SYNCS = ("fsync", "sync_file_range", "syncfs")

# Calls that a trace of files and descriptors shows as well, but that touch no file system.
NOT_OF_FILES = {
    "close_range",
    "dup",
    "dup2",
    "dup3",
    "execve",
    "fcntl",
    "fcntl64",
    "flock",
    "mmap",
    "mmap2",
    "pipe",
    "pipe2",
    "poll",
    "ppoll",
}

# The first thing that the installer does itself is to ask who runs it.
FIRST_CALL = re.compile(r"getuid(32)?\(")

CALL = re.compile(r"(\w+)\((.*)\) += +(.*)$")
# A path, with the directory that it starts from, and a descriptor with what it refers to.
PATH = re.compile(r'(?:(?:AT_FDCWD|\d+)<([^>]*)>(?:\(deleted\))?, )?"((?:[^"\\]|\\.)*)"')
OPENED = re.compile(r"(\d+)<(/[^>]*)>")
DESCRIPTOR = re.compile(r"^\d+<(.*?)>(?:\(deleted\))?(?:, |$)")


@dataclass(frozen=True)
class Point:
    """The `count`th call by the name `name`, on `path`, or on the path of a descriptor.

    `late` is true once the procedure of an installation is over: its commit or rollback and the
    modes of the tree follow. `result` is what the call gave in the traced run, `entry` the file
    that was being extracted meanwhile, if one was. `target` is the new name that a renaming gives.
    """

    name: str
    count: int
    kind: str
    path: str
    arguments: str
    late: bool
    result: str
    entry: str = ""
    target: str = ""

    @property
    def label(self):
        return f"{self.name}#{self.count}"

    @property
    def errors(self):
        return ERRORS[self.kind]


# For a run in which no call failed.
NO_POINT = Point("", 0, "", "", "", False, "")


def kind_of(name, arguments):
    kind = KINDS.get(name, name)
    if kind in ("newfstatat", "fstatat64", "lstat", "lstat64", "stat64", "statx"):
        return "fstat" if "AT_EMPTY_PATH" in arguments else "stat"
    if kind == "unlinkat":
        return "rmdir" if "AT_REMOVEDIR" in arguments else "unlink"
    if kind == "open" and "O_CREAT" in arguments:
        return "open to create"
    return kind


# Calls whose first argument is a descriptor and whose strings are no paths.
OF_DESCRIPTORS = {
    "read",
    "write",
    "fgetxattr",
    "flistxattr",
    "fremovexattr",
    "fsetxattr",
    "fstatfs",
}


def paths_of(kind, arguments):
    """The paths that a call's arguments name, or that of its descriptor."""
    named = (
        []
        if kind in OF_DESCRIPTORS
        else [
            os.path.join(directory, name)
            for directory, name in PATH.findall(arguments)
            if name or not directory
        ]
    )
    if named:
        return tuple(named[:2])
    descriptor = DESCRIPTOR.match(arguments.replace("AT_FDCWD", "0"))
    assert descriptor, arguments
    path = descriptor.group(1)
    return (path if path.startswith("/") else "standard output",)


def points_of(trace):
    """The points of a trace of a whole run, in the order made."""
    points, counts, begun, late = [], {}, False, False
    opened = {}  # what the names of descriptors below /proc refer to
    for line in trace.splitlines():
        begun = begun or FIRST_CALL.match(line) is not None
        call = CALL.match(line)
        if not call or FIRST_CALL.match(line):
            continue
        name, arguments, result = call.groups()
        counts[name] = counts.get(name, 0) + 1
        if not begun or name in NOT_OF_FILES:
            continue
        kind = kind_of(name, arguments)
        assert kind in ERRORS, f"a call that is not known here: {line}"
        path, *others = paths_of(kind, arguments)
        path = opened.get(path, path)
        if new := OPENED.match(result):
            opened["/proc/self/fd/" + new.group(1)] = new.group(2)
        points.append(
            Point(
                name,
                counts[name],
                kind,
                path,
                arguments,
                late,
                result,
                target=others[0] if others else "",
            )
        )
        late = late or (kind == "chmod" and path == INDEX)
    assert begun, "the trace shows no first call of the installer"
    return with_entries(with_walks(points))


def with_walks(points):
    """Makes a directory that is only opened to reach a name a point of kind "walk" on that name.

    The name is that of the next call below the directory.
    """
    result = []
    for number, point in enumerate(points):
        opened = OPENED.match(point.result)
        if point.kind == "open" and "O_PATH" in point.arguments and opened:
            below = opened.group(0) + ", "
            reached = next(
                (p.path for p in points[number + 1 :] if p.arguments.startswith(below)), point.path
            )
            point = replace(point, kind="walk", path=reached)
        result.append(point)
    return result


def with_entries(points):
    """Notes in the points between an entry's opening and its closing which file it becomes."""
    entry, result = "", []
    for number, point in enumerate(points):
        if point.path in PACKAGES and point.kind == "open":
            after = points[number + 1 :]
            created = next(
                (
                    p
                    for p in after
                    if p.kind == "open to create" or p.path == point.path and p.kind == "close"
                ),
                point,
            )
            entry = created.path if created.kind == "open to create" else ""
        result.append(replace(point, entry=entry))
        if point.path in PACKAGES and point.kind == "close":
            entry = ""
    return result


# What strace reports besides the calls: nothing, or only how the process ended.
CALLS_ONLY = ("-qq", "-e", "signal=none")
WITH_THE_END = ("-e", "quiet=attach,personality", "-e", "signal=all")


def strace(*options, reports=CALLS_ONLY):
    return (
        "/usr/bin/timeout",
        "--kill-after=1",
        str(TIME_LIMIT),
        "/usr/bin/strace",
        *reports,
        "-y",
        "-s",
        "512",
        "-o",
        TRACE,
        *options,
    )


NAME_CHANGES = "rename,renameat,renameat2,unlink,unlinkat"

# The command under which a run leaves a trace for points_of().
TRACING = strace("-e", "trace=%file,%desc,sync,getuid,getuid32")


def trace(scenario, machine):
    """Runs `scenario` undisturbed; returns the outcome and the points of the run."""
    outcome = scenario.run(machine, TRACING)
    return outcome, points_of(machine.read(TRACE))


def run_failing(scenario, machine, point, error):
    """Runs `scenario` with the call of `point` failing with `error`.

    Returns the outcome and the renamings and deletions that the run tried.
    """
    outcome = scenario.run(
        machine,
        strace(
            "-e",
            f"trace={point.name},{NAME_CHANGES}",
            "-e",
            f"inject={point.name}:error={error}:when={point.count}",
        ),
    )
    trace = machine.read(TRACE)
    hit = [line for line in trace.splitlines() if line.endswith("(INJECTED)")]
    assert len(hit) == 1, f"{point.label} was not met as expected: {hit}"
    return outcome, name_changes_of(trace)


@dataclass(frozen=True)
class NameChange:
    """A renaming or a deletion that a run tried. `done` is false when it failed."""

    kind: str
    path: str
    target: str
    done: bool


def name_changes_of(trace):
    """The renamings and deletions that a run tried, in the order tried."""
    changes = []
    for call in filter(None, map(CALL.match, trace.splitlines())):
        name, arguments, result = call.groups()
        if (kind := kind_of(name, arguments)) in ("rename", "unlink"):
            path, *others = paths_of(kind, arguments)
            target = others[0] if others else ""
            changes.append(NameChange(kind, path, target, not result.startswith("-1")))
    return changes


def run_killed(scenario, machine, point):
    """Runs `scenario` and kills the installer just before the call of `point` is made."""
    outcome = scenario.run(
        machine,
        strace(
            "-e", f"trace={point.name}", "-e", f"inject={point.name}:signal=KILL:when={point.count}"
        ),
    )
    met = outcome.status == 128 + signal.SIGKILL and machine.read(TRACE).endswith("= ?\n")
    assert met, f"{point.label} was not met as expected: status {outcome.status}"


STARTS = "clone,clone3,fork,vfork"


@dataclass(frozen=True)
class Signalled:
    """What a run did that got a signal: also the commands that it started after that."""

    outcome: Outcome
    died: bool
    commands_after: int
    name_changes: list


def run_signalled(scenario, machine, point, name):
    """Runs `scenario` and sends the installer a signal as the call of `point` is made."""
    outcome = scenario.run(
        machine,
        strace(
            "-e",
            f"trace={point.name},{NAME_CHANGES},{STARTS}",
            "-e",
            f"inject={point.name}:signal={name}:when={point.count}",
            reports=WITH_THE_END,
        ),
    )
    trace = machine.read(TRACE)
    _, met, rest = trace.partition(f"--- SIG{name} ")
    assert met, f"{point.label} was not met as expected: {trace}"
    died = rest.endswith(
        (f"+++ killed by SIG{name} +++\n", f"+++ killed by SIG{name} (core dumped) +++\n")
    )
    commands = [line for line in rest.splitlines() if line.startswith(tuple(STARTS.split(",")))]
    return Signalled(outcome, died, len(commands), name_changes_of(trace))
