"""Disks whose power can be cut: file systems in images, and snapshots of the images.

A snapshot holds what the file system has given to its disk by then, and nothing of what it only
keeps in memory. Mounting it goes through the recovery of the journal, as after a power cut. The
images are on a file system of their own that can share blocks (XFS), so that a snapshot is one
consistent moment and costs nothing.

Everything is mounted in a private mount namespace of the process (`reenter`),
and all loop devices free themselves: whatever ends the process, nothing is left mounted.
"""

import contextlib
import itertools
import os
import shutil
import signal
import subprocess
import sys
import tempfile
import time
from dataclasses import dataclass

ENTERED = "WZOR_DISKS_ENTERED"


@dataclass(frozen=True)
class FileSystem:
    """How to make and mount one kind of file system."""

    name: str
    size: str
    make: tuple
    options: str


# ext4 by default writes a file's data before it renames the file; that would hide a missing sync.
FILE_SYSTEMS = {
    system.name: system
    for system in (
        FileSystem("ext4", "64M", ("mkfs.ext4", "-q", "-F"), "loop,noatime,noauto_da_alloc"),
        FileSystem("xfs", "300M", ("mkfs.xfs", "-q"), "loop,noatime,nouuid"),
    )
}

STORE = FileSystem("store", "4G", ("mkfs.xfs", "-q", "-m", "reflink=1"), "loop,noatime")


def reenter():
    """Goes on in a private mount namespace; returns why it cannot, or nothing when it is in one."""
    if os.environ.get(ENTERED):
        signal.signal(signal.SIGTERM, lambda *_: sys.exit(128 + signal.SIGTERM))
        return ""
    if os.geteuid() != 0:
        return "only root can mount disks"
    for program in ("mkfs.ext4", "mkfs.xfs", "unshare"):
        if not shutil.which(program):
            return f"there is no {program}"
    unshare = ("unshare", "--mount", "--propagation", "private", "--")
    if reason := why_not(*unshare, sys.executable, "-B", "-c", TRIAL, directory=ABOVE):
        return reason
    os.environ[ENTERED] = "1"
    return os.execvp(unshare[0], [*unshare, sys.executable, "-B", *sys.argv])


# Fails where loop devices, one of the file systems, or shared blocks are missing. Runs in ABOVE,
# where it finds this package.
TRIAL = """
from harness import disks
with disks.Disks() as room:
    for system in disks.FILE_SYSTEMS.values():
        with room.mounted(system, room.make(system)), room.mounted(system, room.snapshot()):
            pass
"""


ABOVE = os.path.dirname(os.path.dirname(os.path.realpath(__file__)))


def why_not(*command, directory=None):
    """The last line of what a command says that fails in the directory, or nothing."""
    done = subprocess.run(command, check=False, capture_output=True, text=True, cwd=directory)
    lines = done.stderr.strip().splitlines() or [f"status {done.returncode}"]
    return "" if done.returncode == 0 else lines[-1]


def run(*command):
    """Runs a command that Ctrl-C does not reach, so that cleaning up goes on to its end."""
    done = subprocess.run(
        command, check=False, capture_output=True, text=True, start_new_session=True
    )
    if done.returncode != 0:
        raise OSError(f"{' '.join(command)}: {done.stderr.strip()}")


def unmount(directory):
    """Unmounts a file system.

    A program that another thread is starting holds our open files, of this file system too, until
    it has replaced its parent's image; so it may be in use for a moment.
    """
    for _ in range(50):
        with contextlib.suppress(OSError):
            return run("umount", directory)
        time.sleep(0.1)
    return run("umount", directory)


class Disks:
    """Images and where they are mounted; use it by `with`. One thread at a time may use it."""

    def __enter__(self):
        self.directory = tempfile.mkdtemp(prefix="wzorinst-disks-")
        self.numbers = itertools.count()
        self.in_use = []
        store = self.new_image(self.directory, STORE)
        self.stack = contextlib.ExitStack()
        self.stack.callback(shutil.rmtree, self.directory)
        self.store = self.stack.enter_context(self.mounted_at(store, STORE.options))
        return self

    def __exit__(self, *exception):
        return self.stack.__exit__(*exception)

    def new_image(self, directory, system):
        path = os.path.join(directory, f"{system.name}-{next(self.numbers)}")
        run("truncate", "--size", system.size, path)
        run(*system.make, path)
        return path

    def make(self, system):
        """A new image with an empty file system; returns its path."""
        return self.new_image(self.store, system)

    def copy(self, image):
        """A copy of an image, in use or not, as it is at this moment; returns its path."""
        path = os.path.join(self.store, f"copy-{next(self.numbers)}")
        run("cp", "--reflink=always", image, path)
        return path

    def snapshot(self):
        """What a power cut would leave now of the disk that was mounted last; returns its path."""
        return self.copy(self.in_use[-1])

    @contextlib.contextmanager
    def mounted(self, system, image):
        """Mounts a disk for a `with`, and deletes its image afterwards; gives the directory."""
        self.in_use.append(image)
        try:
            with self.mounted_at(image, system.options) as directory:
                yield directory
        finally:
            self.in_use.remove(image)
            os.unlink(image)

    @contextlib.contextmanager
    def mounted_at(self, image, options):
        directory = tempfile.mkdtemp(dir=self.directory, prefix="mounted-")
        try:
            run("mount", "-o", options, image, directory)
            try:
                yield directory
            finally:
                unmount(directory)
        finally:
            os.rmdir(directory)


def write_journal(directory):
    """Makes the file system write its journal now, as it does every few seconds by itself.

    Syncs a file that nobody else knows. What the journal says is on the disk then; data that the
    file system still holds back is not.
    """
    path = os.path.join(directory, "unrelated")
    with open(path, "wb") as file:
        file.write(b"unrelated")
        file.flush()
        os.fsync(file.fileno())
    for place in (path, directory):
        opened = os.open(place, os.O_RDONLY)
        os.fsync(opened)
        os.close(opened)
