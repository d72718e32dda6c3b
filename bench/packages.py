"""The benchmark's packages: what an installation needs, and files of one kind by the thousand.

Each package comes twice, with the same entries: as an SPB, whose names carry the image root, and
as a zip with relative names for other unpackers, which warn about absolute ones. The content is
taken from the programs and texts of this machine by a seeded generator, so the same machine gives
the same bytes.
"""

import itertools
import os
import random
from dataclasses import dataclass

from harness import toolkit
from harness.zip_archive import DEFLATED, IMAGE_ROOT, MADE_BY_UNIX, STORED, Entry, Writer

SEED = 20221202

MB = 1_000_000
LARGE_FILE = 2_500_000

LEVEL = 6  # what zip programs take by default

# The smallest package that installs: six files, and scanner programs that do nothing.
SMALLEST = ("bin/", "bin/trawlcfg", "bin/trawlfs", "properties/", "config/",
            "config/Zor.properties", "config/ZorTrace.properties", "install/",
            "install/trawlcfg.sh", "install/rmdirs.sh")
NO_SCANNER = b"#!/bin/sh\nexit 0\n"


def smallest_toolkit():
    for name in SMALLEST:
        content = toolkit.FILES[name]
        yield name, NO_SCANNER if content == toolkit.SCANNER_PROGRAM else content


@dataclass(frozen=True)
class Package:
    """`entries` makes the (name, content) pairs that are added to SMALLEST."""

    name: str
    entries: object
    method: int = DEFLATED
    # More files than a central directory can count: a comment on the first central header makes
    # the installer read the local headers instead.
    commented: bool = False


def tiny():
    return []


def typical():
    """About 60 files, 25 MB: programs and libraries, and a few texts."""
    rng = random.Random(SEED)
    binaries = take(machine_files(rng, is_program, 200_000, 2 * MB), 25 * MB)
    texts = itertools.islice(machine_files(rng, is_text, 2_000, 60_000), 8)
    for number, content in enumerate(binaries):
        yield f"bin/program{number:02}", content
    places = ["properties/text", "config/text", "config/xss/text", "install/text"]
    yield "config/xss/", b""
    for number, content in enumerate(texts):
        yield f"{places[number % len(places)]}{number:02}", content


def large(size):
    """`size` bytes of programs and libraries in files of LARGE_FILE bytes."""
    def make():
        whole = bytearray()
        done = 0
        for content in itertools.cycle(machine_files(random.Random(SEED), is_program, 0, 50 * MB)):
            whole += content
            while len(whole) >= LARGE_FILE and done < size:
                yield f"bin/large{done // LARGE_FILE:03}", bytes(whole[:LARGE_FILE])
                del whole[:LARGE_FILE]
                done += LARGE_FILE
            if done >= size:
                return
    return make


def many(count, smallest, largest):
    """`count` files of `smallest` to `largest` bytes, pieces of texts."""
    def make():
        rng = random.Random(SEED)
        texts = b"".join(take(machine_files(rng, is_text, 2_000, 60_000), 10 * MB))
        for number in range(count):
            size = rng.randint(smallest, largest)
            start = rng.randrange(len(texts) - size)
            yield f"bin/part{number:06}", texts[start:start + size]
    return make


PACKAGES = {package.name: package for package in (
    Package("tiny", tiny),
    Package("typical", typical),
    Package("stored", typical, method=STORED),
    Package("large", large(300 * MB)),
    Package("many", many(20_000, 1_000, 4_000)),
    Package("many100k", many(100_000, 100, 300), commented=True),
    Package("files1k", many(1_000, 100, 300), commented=True),
    Package("files10k", many(10_000, 100, 300), commented=True),
    Package("megabytes10", large(10 * MB)),
    Package("megabytes100", large(100 * MB)),
)}


def is_program(head):
    return head == b"\x7fELF"


def is_text(head):
    return all(32 <= byte < 127 or byte in b"\n\t" for byte in head)


def take(contents, size):
    """The first of `contents` that make up `size` bytes."""
    for content in contents:
        if size <= 0:
            return
        size -= len(content)
        yield content


def machine_files(rng, wanted, smallest, largest):
    """The contents of this machine's files of one kind and size, shuffled."""
    paths = sorted(os.path.join(directory, name)
                   for top in ("/usr/bin", "/usr/lib", "/usr/share", "/usr/include")
                   for directory, _, names in os.walk(top) for name in names)
    rng.shuffle(paths)
    for path in paths:
        if os.path.islink(path) or not os.path.isfile(path):
            continue
        if not max(smallest, 4) <= os.path.getsize(path) <= largest:
            continue
        with open(path, "rb") as file:
            if wanted(file.read(4)):
                file.seek(0)
                yield file.read()


def build(package, directory):
    """Writes NAME.spb and NAME.zip into `directory`; returns the number of files and of bytes."""
    files = size = 0
    with (open(os.path.join(directory, package.name + ".spb"), "wb") as spb_file,
          open(os.path.join(directory, package.name + ".zip"), "wb") as twin_file):
        spb, twin = Writer(spb_file), Writer(twin_file)
        for name, content in itertools.chain(smallest_toolkit(), package.entries()):
            entry = Entry(name.encode(), content, package.method if content else STORED, LEVEL)
            entry.made_by = MADE_BY_UNIX
            entry.attributes = (0o40755 if name.endswith("/") else 0o100755) << 16
            twin.add(entry)
            entry.name = IMAGE_ROOT.encode() + entry.name
            if package.commented and spb.count == 0:
                entry.comment = b"first"
            spb.add(entry)
            files += not name.endswith("/")
            size += len(content)
        spb.finish()
        twin.finish(zip64=True)
    return files, size
