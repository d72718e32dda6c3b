"""Packages of many files or of much content, and what an installation of one takes.

A `Load` is the toolkit and more: small files, half of them flat in "bin", half in directories of
a hundred below "config/load", stored and deflated in turn; or one stored file of zeros, of which
neither the package nor this program ever holds the bytes.
"""

import os
from dataclasses import dataclass

from harness import toolkit
from harness.machine import BINARY, ROOT, SPB
from harness.zip_archive import DEFLATED, IMAGE_ROOT, STORED, Entry, Writer

HOME = "/opt/corvan/zor"
HUGE_FILE = "bin/huge"
FILES_A_DIRECTORY = 100
BLOCK = bytes(1 << 20)

# A sanitized build holds on to what was freed: to no more than this, or that is all one measures.
KEEPS_LITTLE = {"ASAN_OPTIONS": "quarantine_size_mb=1"}


@dataclass(frozen=True)
class Load:
    """`small_files` besides the toolkit, or one of `huge_size` zeros.

    With `commented` the first central header carries a comment, so that the installer reads the
    local headers instead: the only way to more files than a central directory can count.
    """

    name: str
    small_files: int = 0
    huge_size: int = 0
    commented: bool = False


@dataclass(frozen=True)
class Usage:
    """What one run took: the peak of its memory in KiB, and seconds of processor time."""

    peak: int
    seconds: float


def content_of(number):
    """The content of a small file; its size goes from 30 to 1000 bytes."""
    return b"This is small file %8d.\n" % number * (number % 30 + 1)


def small_file_names(load):
    for number in range(load.small_files):
        if number % 2:
            yield f"bin/load{number:06}"
        else:
            yield f"config/load/{number // FILES_A_DIRECTORY:04}/{number:06}"


def entries_of(load):
    """The package's entries, one at a time."""
    files = dict(toolkit.FILES)
    if load.small_files:
        files["config/load/"] = b""
    for number, (name, data) in enumerate(files.items()):
        yield entry(name, data, STORED if number % 2 else DEFLATED)
    for number, name in enumerate(small_file_names(load)):
        if number % FILES_A_DIRECTORY == 0:
            yield entry(os.path.dirname(name) + "/", b"", STORED)
        yield entry(name, content_of(number), STORED if number % 4 < 2 else DEFLATED)
    if load.huge_size:
        huge = entry(HUGE_FILE, b"", STORED)
        huge.size = huge.packed_size = load.huge_size
        yield huge


def entry(name, data, method):
    return Entry((IMAGE_ROOT + name).encode(), data, STORED if name.endswith("/") else method)


def write_package(path, load):
    """Writes the package; a huge file's bytes are a hole in it. Returns the number of entries."""
    with open(path, "wb") as file:
        writer = Writer(file)
        for each in entries_of(load):
            if load.commented and writer.count == 0:
                each.comment = b"hides the directory"
            writer.add(each, hole=each.packed_size - len(each.packed))
        writer.finish()
    return writer.count


def run(machine, *arguments):
    """Runs the installer, which must succeed."""
    command = ["/usr/bin/time", "-o", "/tmp/usage", "-f", "%M %U %S", BINARY, *arguments]
    outcome = machine.execute(command, ROOT, 0o022, KEEPS_LITTLE, (), False)
    assert outcome.status == 0, outcome.stdout[-2000:] + outcome.stderr[-2000:]
    peak, user, system = machine.read("/tmp/usage").split()
    return Usage(int(peak), float(user) + float(system))


def install(machine, load):
    """Installs the package at SPB and checks every byte; returns the run's usage."""
    usage = run(machine, "i", "ABC", "-s", SPB)
    for number, name in enumerate(small_file_names(load)):
        assert machine.read_bytes(f"{HOME}/{name}") == content_of(number), name
    if load.huge_size:
        check_huge_file(machine.at(f"{HOME}/{HUGE_FILE}"), load.huge_size)
    return usage


def check_huge_file(path, size):
    assert os.path.getsize(path) == size
    with open(path, "rb") as file:
        while block := file.read(len(BLOCK)):
            assert block == BLOCK[: len(block)], f"before {file.tell()}"


def remove(machine):
    """Removes the installation and checks that nothing is left; returns the run's usage."""
    usage = run(machine, "r", "ABC")
    assert not machine.exists(HOME)
    assert not machine.exists("/etc/zor")
    return usage
