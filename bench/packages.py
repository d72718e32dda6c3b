"""The benchmark's packages: what an installation needs, and files of one kind by the thousand.

Each package comes in up to four forms, with the same files: as an SPB, whose names carry the image
root; as a zip with relative names for other unpackers, which warn about absolute ones; and as a
.deb and an .rpm without scripts. The content is taken from the programs and texts of this machine
by a seeded generator, so the same machine gives the same bytes.
"""

import itertools
import os
import random
import shutil
import subprocess
import tempfile
from dataclasses import dataclass

import hostile_streams

from harness import toolkit
from harness.zip_archive import DEFLATED, IMAGE_ROOT, MADE_BY_UNIX, STORED, Entry, Writer

SEED = 20221202

MB = 1_000_000
LARGE_FILE = 2_500_000

HOSTILE_COPIES = 16

LEVEL = 6  # what zip programs take by default

# The smallest package that installs: six files, and scanner programs that do nothing.
SMALLEST = (
    "bin/",
    "bin/trawlcfg",
    "bin/trawlfs",
    "properties/",
    "config/",
    "config/Zor.properties",
    "config/ZorTrace.properties",
    "install/",
    "install/trawlcfg.sh",
    "install/rmdirs.sh",
)
HOME = "opt/corvan/zor"  # of the files in a .deb and an .rpm
NO_SCANNER = b"#!/bin/sh\nexit 0\n"


def smallest_toolkit():
    for name in SMALLEST:
        content = toolkit.FILES[name]
        yield name, NO_SCANNER if content == toolkit.SCANNER_PROGRAM else content


@dataclass(frozen=True)
class Package:
    """`entries` makes the (name, content) pairs that come after those of SMALLEST.

    If `hostile`, they are (name, (content, deflate stream)).
    """

    name: str
    entries: object
    method: int = DEFLATED
    # More files than a central directory can count: a comment on the first central header makes
    # the installer read the local headers instead.
    commented: bool = False
    hostile: bool = False


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


def large(size, file_size=LARGE_FILE):
    """`size` bytes of programs and libraries in files of `file_size` bytes."""

    def make():
        whole = bytearray()
        done = 0
        for content in itertools.cycle(machine_files(random.Random(SEED), is_program, 0, 50 * MB)):
            whole += content
            while len(whole) >= file_size and done < size:
                yield f"bin/large{done // file_size:03}", bytes(whole[:file_size])
                del whole[:file_size]
                done += file_size
            if done >= size:
                return

    return make


def hostile(stream):
    """Four files whose data is what `stream` makes of a program or text, each many times over.

    So what a run takes besides is little, as the floor does nothing but inflate.
    """

    def make():
        rng = random.Random(SEED)
        for part in range(4):
            made = stream(rng)
            for copy in range(HOSTILE_COPIES):
                yield f"bin/hostile{part}-{copy}", made

    return make


def some_bytes(wanted):
    """A function that gives 2 MB of this machine's files."""
    return lambda rng: b"".join(take(machine_files(rng, wanted, 2_000, 2 * MB), 2 * MB))


HOSTILE = {
    "one-block": lambda rng: hostile_streams.one_block(some_bytes(is_text)(rng)),
    "tiny-blocks": lambda rng: hostile_streams.tiny_blocks(50_000 + rng.randrange(1000)),
    "flushed-blocks": lambda rng: hostile_streams.flushed_blocks(some_bytes(is_program)(rng)),
    "stored-blocks": lambda rng: hostile_streams.stored_blocks(some_bytes(is_program)(rng)),
}


def many(count, smallest, largest):
    """`count` files of `smallest` to `largest` bytes, pieces of texts."""

    def make():
        rng = random.Random(SEED)
        texts = b"".join(take(machine_files(rng, is_text, 2_000, 60_000), 10 * MB))
        for number in range(count):
            size = rng.randint(smallest, largest)
            start = rng.randrange(len(texts) - size)
            yield f"bin/part{number:06}", texts[start : start + size]

    return make


PACKAGES = {
    package.name: package
    for package in (
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
        Package("one-entry", large(500 * MB, 500 * MB)),
        *(Package(name, hostile(stream), hostile=True) for name, stream in HOSTILE.items()),
    )
}

# Of these there are a .deb and an .rpm.
MANAGED = (
    "typical",
    "stored",
    "large",
    "many",
    "many100k",
    "files1k",
    "files10k",
    "megabytes10",
    "megabytes100",
)


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
    paths = sorted(
        os.path.join(directory, name)
        for top in ("/usr/bin", "/usr/lib", "/usr/share", "/usr/include")
        for directory, _, names in os.walk(top)
        for name in names
    )
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
    """Writes the package in its forms into `directory`; returns the numbers of files and bytes."""
    files = size = 0
    with (
        open(os.path.join(directory, package.name + ".spb"), "wb") as spb_file,
        open(os.path.join(directory, package.name + ".zip"), "wb") as twin_file,
        tempfile.TemporaryDirectory(dir=directory) as tree,
    ):
        spb, twin = Writer(spb_file), Writer(twin_file)
        for name, content in all_entries(package):
            entry = made_entry(package, name, content)
            twin.add(entry)
            entry.name = IMAGE_ROOT.encode() + entry.name
            if package.commented and spb.count == 0:
                entry.comment = b"first"
            spb.add(entry)
            files += not name.endswith("/")
            size += entry.size
            if package.name in MANAGED:
                write_file(os.path.join(tree, HOME, name), content)
        spb.finish()
        twin.finish(zip64=True)
        if package.name in MANAGED:
            build_deb(tree, os.path.join(directory, package.name + ".deb"))
            build_rpm(tree, os.path.join(directory, package.name + ".rpm"))
    return files, size


def all_entries(package):
    return itertools.chain(smallest_toolkit(), package.entries())


def made_entry(package, name, content):
    packed = None
    if isinstance(content, tuple):
        content, packed = content
    method = package.method if content else STORED
    entry = Entry(name.encode(), content, method, LEVEL)
    if packed is not None:
        entry.packed, entry.packed_size = packed, len(packed)
    entry.made_by = MADE_BY_UNIX
    entry.attributes = (0o40755 if name.endswith("/") else 0o100755) << 16
    return entry


def write_file(path, content):
    os.makedirs(os.path.dirname(path), exist_ok=True)
    if not path.endswith("/"):
        with open(path, "wb") as file:
            file.write(content)
        os.chmod(path, 0o755)


def build_deb(tree, path):
    """A package of dpkg of the files in `tree`, compressed like the zip."""
    os.mkdir(os.path.join(tree, "DEBIAN"))
    with open(os.path.join(tree, "DEBIAN/control"), "w", encoding="ascii") as file:
        file.write(
            "Package: toolkit\nVersion: 1\nArchitecture: all\nDescription: benchmark\n"
            "Maintainer: Nobody <nobody@localhost>\n"
        )
    run("dpkg-deb", "--build", "--root-owner-group", "-Zgzip", f"-z{LEVEL}", tree, path)
    shutil.rmtree(os.path.join(tree, "DEBIAN"))


RPM_BUILD_FILE = f"""
%define __os_install_post %{{nil}}
%define _build_id_links none
%define _binaries_in_noarch_packages_terminate_build 0
%define _binary_payload w{LEVEL}.gzdio
Name: toolkit
Version: 1
Release: 1
Summary: Benchmark
License: none
BuildArch: noarch
AutoReqProv: no
%description
Benchmark
%files
%defattr(0755,root,root,0755)
/{HOME}
"""


def build_rpm(tree, path):
    """A package of rpm of the files in `tree`, which rpmbuild deletes, compressed like the zip."""
    with tempfile.TemporaryDirectory() as work:
        with open(os.path.join(work, "toolkit.spec"), "w", encoding="ascii") as file:
            file.write(RPM_BUILD_FILE)
        run(
            "rpmbuild",
            "-bb",
            "--quiet",
            "--define",
            f"_topdir {work}",
            "--buildroot",
            tree,
            os.path.join(work, "toolkit.spec"),
        )
        shutil.move(os.path.join(work, "RPMS/noarch/toolkit-1-1.noarch.rpm"), path)
    os.makedirs(tree, exist_ok=True)


def run(*command):
    subprocess.run(command, check=True, stdout=subprocess.DEVNULL)
