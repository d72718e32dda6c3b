"""The benchmark's packages: what an installation needs, and files of one kind by the thousand.

Each package comes twice, with the same entries: as an SPB, whose names carry the image root, and
as a zip with relative names for other unpackers, which warn about absolute ones. The content is
taken from the programs and texts of this machine by a seeded generator, so the same machine gives
the same bytes.
"""

import itertools
import os
import random
import struct
import zlib
from dataclasses import dataclass

SEED = 20221202
IMAGE_ROOT = "/home/zorbuild/zor_src_dir/ZOR/zor_pkgs/images/linux-ix86/"

STORED, DEFLATED = 0, 8
DOS_TIME, DOS_DATE = 12 << 11, (2022 - 1980) << 9 | 12 << 5 | 2
MAX_COUNT, MAX_OFFSET = 0xFFFF, 0xFFFFFFFF

MB = 1_000_000
LARGE_FILE = 2_500_000

SCRIPT = b"#!/bin/sh\nexit 0\n"
PLACEHOLDERS = b"home=$(ZOR_DestinationDir)\nconfig=$(ZOR_ConfigRootDirectory)\n"

# The smallest package that installs: six files.
TOOLKIT = [
    ("bin/", b""),
    ("bin/trawlcfg", SCRIPT),
    ("bin/trawlfs", SCRIPT),
    ("properties/", b""),
    ("config/", b""),
    ("config/Zor.properties", b"version=9.2.30.0000\nmode=$(fscanner_mode)\n" + PLACEHOLDERS),
    ("config/ZorTrace.properties", b"handlers.traceFile.fileName=trace.log\n" + PLACEHOLDERS),
    ("install/", b""),
    ("install/trawlcfg.sh", b"#!/bin/sh\n" + PLACEHOLDERS),
    ("install/rmdirs.sh", b"#!/bin/sh\n" + PLACEHOLDERS),
]


@dataclass(frozen=True)
class Package:
    """`entries` makes the (name, content) pairs beside those of TOOLKIT."""

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


class Archive:
    """A zip archive that is being written; `prefix` stands before every name."""

    def __init__(self, path, prefix, commented):
        self.file = open(path, "wb")
        self.prefix = prefix
        self.comment = b"first" if commented else b""
        self.central = bytearray()
        self.count = 0

    def add(self, name, method, crc, size, packed):
        name = (self.prefix + name).encode()
        common = struct.pack("<HHHHHIIIHH", 20, 0, method, DOS_TIME, DOS_DATE, crc, len(packed),
                             size, len(name), 0)
        mode = 0o40755 if name.endswith(b"/") else 0o100755
        self.central += struct.pack("<4sH", b"PK\1\2", 3 << 8 | 20) + common
        self.central += struct.pack("<HHHII", len(self.comment), 0, 0, mode << 16,
                                    self.file.tell()) + name + self.comment
        self.comment = b""
        self.file.write(b"PK\3\4" + common + name + packed)
        self.count += 1

    def close(self, countable):
        """Writes the central directory; `countable` adds a Zip64 record when it is needed."""
        start = self.file.tell()
        self.file.write(self.central)
        if countable and self.count > MAX_COUNT:
            end = self.file.tell()
            self.file.write(struct.pack("<4sQHHIIQQQQ", b"PK\6\6", 44, 45, 45, 0, 0, self.count,
                                        self.count, len(self.central), start))
            self.file.write(struct.pack("<4sIQI", b"PK\6\7", 0, end, 1))
            count = MAX_COUNT
        else:
            count = self.count & MAX_COUNT
        self.file.write(struct.pack("<4sHHHHIIH", b"PK\5\6", 0, 0, count, count,
                                    len(self.central), start, 0))
        self.file.close()


def build(package, directory):
    """Writes NAME.spb and NAME.zip into `directory`; returns the number of files and of bytes."""
    spb = Archive(os.path.join(directory, package.name + ".spb"), IMAGE_ROOT, package.commented)
    twin = Archive(os.path.join(directory, package.name + ".zip"), "", False)
    files = size = 0
    for name, content in itertools.chain(TOOLKIT, package.entries()):
        method = package.method if content else STORED
        packed = deflate(content) if method == DEFLATED else content
        for archive in (spb, twin):
            archive.add(name, method, zlib.crc32(content), len(content), packed)
        files += not name.endswith("/")
        size += len(content)
    spb.close(countable=False)
    twin.close(countable=True)
    return files, size


def deflate(content):
    packer = zlib.compressobj(level=6, wbits=-15)
    return packer.compress(content) + packer.flush()
