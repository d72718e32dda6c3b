"""What the controller offers to the hosts: checksums of files, and the bundle of programs.

A run of Ansible forks a process for every host and task. What one of them worked out is left in the
directory that Ansible makes for the run and deletes afterwards, so that the others find it there.
"""

import contextlib
import fcntl
import hashlib
import json
import os
import tarfile

from ansible import constants
from ansible.errors import AnsibleError

# pylint: disable-next=import-error # the path that Ansible gives the collection
from ansible_collections.corvan.zor.plugins.module_utils.host_files import NAMES, digest_of

WIDTHS = ("i686", "x86_64")


@contextlib.contextmanager
def notes_of_run():
    """The directory of what was worked out, while nobody else writes to it."""
    # pylint: disable-next=no-member # Ansible makes its constants at run time
    directory = os.path.join(constants.DEFAULT_LOCAL_TMP, "corvan_zor")
    os.makedirs(directory, mode=0o700, exist_ok=True)
    with open(os.path.join(directory, "lock"), "wb") as lock:
        fcntl.flock(lock, fcntl.LOCK_EX)
        yield directory


def noted_digest(paths):
    """One SHA-256 of the content of all `paths`, worked out once a run for each state of them."""
    states = []
    for path in paths:
        found = os.stat(path)
        states.append((path, found.st_dev, found.st_ino, found.st_size, found.st_mtime_ns))
    key = hashlib.sha256(json.dumps(states).encode()).hexdigest()
    with notes_of_run() as directory:
        note = os.path.join(directory, key)
        with contextlib.suppress(FileNotFoundError), open(note, encoding="utf-8") as file:
            return file.read()
        digest = digest_of(paths)
        with open(note, "w", encoding="utf-8") as file:
            file.write(digest)
        return digest


def offered_package(path):
    return {"sha256": noted_digest([path]), "size": os.path.getsize(path)}


def offered_programs(directory):
    """What is offered of each width that `directory` has."""
    offer = {}
    for width in WIDTHS:
        paths = paths_of(directory, width)
        if os.path.isdir(os.path.join(directory, width)):
            sizes = {name: os.path.getsize(path) for name, path in zip(NAMES, paths)}
            offer[width] = {"digest": noted_digest(paths), "sizes": sizes}
    if not offer:
        raise AnsibleError(f"{directory} has neither a directory x86_64 nor one i686")
    return offer


def paths_of(directory, width):
    return [os.path.join(directory, width, name) for name in NAMES]


def bundle_of(directory, width):
    """The path of a compressed archive of the programs, made once a run."""
    paths = paths_of(directory, width)
    digest = noted_digest(paths)
    with notes_of_run() as notes:
        bundle = os.path.join(notes, digest + ".tar.gz")
        if not os.path.exists(bundle):
            with tarfile.open(bundle + ".new", "w:gz") as archive:
                for name, path in zip(NAMES, paths):
                    archive.add(path, name)
            os.rename(bundle + ".new", bundle)
        return bundle


def text_of(path):
    with open(path, encoding="utf-8") as file:
        return file.read()
