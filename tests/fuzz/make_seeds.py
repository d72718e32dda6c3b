#!/usr/bin/python3 -B
"""Writes the seed corpora of the fuzz targets: make_seeds.py DIR

Each target finds its inputs in a directory of its name below DIR. The archives come from
the writer of the system tests: valid ones, and one for each kind of damage.
"""

import os
import struct
import sys

from harness import toolkit
from harness.zip_archive import DEFLATED, STORED, Archive, deflate

TEXT = b"One line like the next.\n" * 40
NOISE = bytes(value * 73 & 0xFF for value in range(1000))

REGISTRY = (
    b"ZOR_Version = 9.2.30.0000\nZOR_BuildDate = 22/12/02\n"
    b"ZOR_HomeDirectory = /opt/corvan/zor\nZOR_Exploiters = ABC:XYZ:\n"
    b"ZOR_ConfigRootDirectory = /opt/corvan/zor\n"
)


def two_files():
    """A valid archive, still open to changes."""
    return (
        Archive().add("/bin/").add("/bin/a", TEXT).add("/config/").add("/config/b", NOISE, STORED)
    )


def changed(**fields):
    """The same archive with `fields` of its second entry changed."""
    archive = two_files()
    for field, value in fields.items():
        setattr(archive.entries[1], field, value)
    return archive.content()


def with_comment():
    archive = two_files()
    archive.comment = b"a comment hides the directory"
    return archive.content()


def wrong_archives():
    sound = two_files().content()
    return {
        "comment": with_comment(),
        "file_comment": changed(comment=b"misaligns"),
        "streamed": changed(flags=8, local_sizes=False),
        "other_method": changed(local_method=12),
        "unknown_method": changed(method=12, local_method=12),
        "extra": changed(local_extra=b"x" * 9, central_extra=b"y" * 7),
        "nul": changed(name=b"/bin/a\0b"),
        "longest_name": changed(name=b"/bin/" + b"n/" * 1021 + b"n"),
        "too_long_name": changed(name=b"/bin/" + b"n/" * 1022),
        "short_size": changed(packed_size=20),
        "small_size": changed(size=20),
        "large_size": changed(size=0x80000000),
        "truncated": sound[:200],
        "no_directory": two_files().local_part()[0],
        "end_only": Archive().content(),
        "empty": b"",
    }


def zip_directory():
    return {"sound": two_files().content(), **wrong_archives()}


def extraction():
    collisions = (
        Archive()
        .add("/bin/d/")
        .add("/bin/d/x", TEXT)
        .add("/bin/d", TEXT)
        .add("/bin/d", NOISE)
        .add("/bin/d.bak", TEXT)
        .add("/bin/d", TEXT, STORED)
    )
    everywhere = Archive()
    for name in (
        "/bin/",
        "/bin/a",
        "/properties/p",
        "/config//Zor.properties",
        "/config/xss/",
        "/config/xss/x",
        "/install/i.sh",
        "/elsewhere/e",
        "/bin//",
        "/bin/deep/er/",
    ):
        everywhere.add(name, b"" if name.endswith("/") else TEXT)
    whole = Archive()
    for name, data in toolkit.FILES.items():
        whole.add("/" + name, data)
    return {
        "sound": two_files().content(),
        "collisions": collisions.content(),
        "everywhere": everywhere.content(),
        "empty_file": Archive().add("/bin/a", TEXT).add("/bin/e").content(),
        "bomb": Archive().add("/bin/zeros", bytes(1 << 20)).content(),
        "toolkit": whole.content(),
        **wrong_archives(),
    }


def spb():
    paths = Archive()
    for name in (
        "/bin/../../x",
        "/bin/..",
        "/bin/a/../../../x",
        "/bin/a\0b",
        "bin/relative",
        "/config/.",
        "/install/x\ny",
        "/bin/long" + "g" * 300,
    ):
        paths.add(name, TEXT)
    return {"paths": paths.content(), **extraction()}


def entry(method, how, size, data, *, offset=0, packed_size=None):
    packed_size = len(data) if packed_size is None else packed_size
    head = struct.pack("<BBII", how << 1 | (method == DEFLATED), offset, packed_size, size)
    return head + b"?" * offset + data


def entry_stream():
    seeds = {}
    for how in range(8):
        seeds[f"stored_{how}"] = entry(STORED, how, len(NOISE), NOISE)
        seeds[f"deflated_{how}"] = entry(DEFLATED, how, len(TEXT), deflate(TEXT))
        seeds[f"noise_{how}"] = entry(DEFLATED, how, len(NOISE), deflate(NOISE), offset=3)
        seeds[f"more_{how}"] = entry(DEFLATED, how, 100, deflate(TEXT))
        seeds[f"truncated_{how}"] = entry(DEFLATED, how, 1 << 14, deflate(bytes(1 << 14))[:-4])
    for size in (8191, 8192, 8193, 16384, 65536, 131072, 300000):
        seeds[f"zeros_{size}"] = entry(DEFLATED, 0, size, deflate(bytes(size)))
    seeds["empty"] = entry(STORED, 0, 0, b"")
    seeds["short"] = entry(STORED, 0, 5000, NOISE)
    seeds["negative"] = entry(STORED, 0, 0x80000000, NOISE)
    seeds["damaged"] = entry(DEFLATED, 0, len(TEXT), b"\xff" + deflate(TEXT))
    return seeds


def registry():
    lines = REGISTRY.split(b"\n")
    return {
        "written": REGISTRY,
        "tight": REGISTRY.replace(b" = ", b"="),
        "without_last_newline": REGISTRY[:-1],
        "windows": REGISTRY.replace(b"\n", b"\r\n"),
        "without_home": b"\n".join(lines[:2] + lines[3:]),
        "twice": REGISTRY + REGISTRY.replace(b"9.2", b"9.3"),
        "bad_version": REGISTRY.replace(b"9.2", b"9.x"),
        "no_version": REGISTRY.replace(b"9.2.30.0000", b""),
        "five_numbers": REGISTRY.replace(b"30.0000", b"30.12.7"),
        "huge_version": REGISTRY.replace(b"9.2", b"4294967295.2147483648"),
        "blanks": b"ZOR_Version=1\nZOR_Exploiters= \t \nZOR_HomeDirectory=\n",
        "comments": b"# text\n\n[zor]\n" + REGISTRY + b"other = 1\n",
    }


def property_file():
    def seed(key, value, old, new, content):
        return b"\n".join((key, value, old, new, content))

    return {
        "replace": seed(
            b"trace_level",
            b"3",
            b"$(ZOR_DestinationDir)",
            b"/opt/corvan/zor",
            toolkit.ZOR_PROPERTIES,
        ),
        "separator": seed(
            b"handlers", b"x=y", b"$(FileSeparator)", b"/", toolkit.ZOR_TRACE_PROPERTIES
        ),
        "whole_line": seed(b"key", b"", b"ab", b"", b"key\n key \nkey=1\n#key=1\naabb\n"),
        "blanks": seed(b" ", b" ", b"\t", b"", b" \n\t\n = \n"),
        "no_newline": seed(b"c", b"4", b"=", b":", b"a = 1\n#b=2\n\nc=3"),
    }


def file_index():
    paths = b"".join(b"/opt/corvan/zor/bin/%d\n" % number for number in range(9))
    return {
        "written": b"# File created by ZOR: 22/12/02zor_9.2.30.0000 installed on "
        b"2022-12-02T10:00:00\n" + paths,
        "transient": b"# File created by ZOR: 22/12/02zor_9.2.30.0000\n" + paths + paths,
        "comments": b"/a/x\n#comment\n\n/a/b",
        "blanks": b"/a \n/a\n \n",
        "long": b"/" + b"n" * 2500 + b"\n" + b"m" * 1023 + b"\n#" + b"c" * 1500 + b"\n",
    }


def hostile_stream():
    def seed(kind, letters, block_size, content):
        return struct.pack("<BBH", kind, letters, block_size) + content

    return {
        "tiny_blocks": seed(1, 1, 40, b"a"),
        "many_letters": seed(1, 250, 40, NOISE),
        "one_block": seed(1, 100, 0, NOISE),
        "stored": seed(0, 0, 65535, TEXT),
        "tiny_stored": seed(0, 0, 5, TEXT),
    }


def journal():
    return {
        "written": b"D /opt/corvan/zor\nB /opt/corvan/zor/bin/x\nC /opt/corvan/zor/bin/x\n",
        "unknown": b"X /tmp/a\n",
        "short": b"C\n",
        "other_blank": b"Cx/tmp/a\nB\0/tmp/b",
        "bad_at_end": b"C /tmp/a\n\n",
    }


def main():
    for target in (
        entry_stream,
        extraction,
        file_index,
        hostile_stream,
        journal,
        property_file,
        registry,
        spb,
        zip_directory,
    ):
        directory = os.path.join(sys.argv[1], target.__name__)
        os.makedirs(directory, exist_ok=True)
        for name, content in target().items():
            with open(os.path.join(directory, name), "wb") as file:
                file.write(content)


if __name__ == "__main__":
    if len(sys.argv) != 2:
        sys.exit(__doc__)
    main()
