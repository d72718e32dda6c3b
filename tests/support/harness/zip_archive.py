"""Writes SPB archives, valid and damaged ones, byte by byte.

An SPB is a zip archive whose entry names begin with the image root. Local headers, data, central
directory and end record are assembled here, so that each field of each record can be made wrong on
its own. `Archive` holds an archive in memory and stays open to changes until its bytes are wanted;
`Writer` streams one of any size to a file.
"""

import io
import os
import struct
import zlib

IMAGE_ROOT = "/home/zorbuild/zor_src_dir/ZOR/zor_pkgs/images/linux-ix86/"

STORED = 0
DEFLATED = 8

SIZES_FOLLOW_THE_DATA = 8

MADE_BY_UNIX = 3 << 8 | 20
MAX_COUNT = 0xFFFF


def deflate(data, level=9):
    """`data` as raw deflate bytes, without a zlib header."""
    compressor = zlib.compressobj(level, zlib.DEFLATED, -15)
    return compressor.compress(data) + compressor.flush()


class Entry:
    """One entry; every attribute but `name` and `packed` is a field of its headers."""

    def __init__(self, name, data, method, level=9):
        self.name = name
        self.packed = deflate(data, level) if method == DEFLATED else data
        self.method = method
        self.local_method = method
        self.flags = 0
        self.crc = zlib.crc32(data)
        self.packed_size = len(self.packed)
        self.size = len(data)
        self.local_sizes = True
        self.local_extra = b""
        self.central_extra = b""
        self.comment = b""
        self.made_by = 20
        self.attributes = 0

    def local_header(self):
        sizes = (self.crc, self.packed_size, self.size) if self.local_sizes else (0, 0, 0)
        return (
            struct.pack(
                "<4sHHHHHIIIHH",
                b"PK\3\4",
                20,
                self.flags,
                self.local_method,
                0,
                0x21,
                *sizes,
                len(self.name),
                len(self.local_extra),
            )
            + self.name
            + self.local_extra
        )

    def central_header(self, offset):
        return (
            struct.pack(
                "<4sHHHHHHIIIHHHHHII",
                b"PK\1\2",
                self.made_by,
                20,
                self.flags,
                self.method,
                0,
                0x21,
                self.crc,
                self.packed_size,
                self.size,
                len(self.name),
                len(self.central_extra),
                len(self.comment),
                0,
                0,
                self.attributes,
                offset,
            )
            + self.name
            + self.central_extra
            + self.comment
        )


class Writer:
    """Streams an archive to `file`: the entries as they are added, the directory at the end."""

    def __init__(self, file):
        self.file = file
        self.count = 0
        self.central = bytearray()

    def add(self, entry, hole=0):
        """Writes an entry, followed by a hole of `hole` bytes."""
        self.central += entry.central_header(self.file.tell())
        self.file.write(entry.local_header() + entry.packed)
        self.file.seek(hole, os.SEEK_CUR)
        self.count += 1

    def finish(self, comment=b"", zip64=False):
        """Writes the directory; `zip64` adds the record that counts more than MAX_COUNT entries."""
        start = self.file.tell()
        self.file.write(self.central)
        count = self.count & MAX_COUNT
        if zip64 and self.count > MAX_COUNT:
            end = self.file.tell()
            self.file.write(
                struct.pack(
                    "<4sQHHIIQQQQ",
                    b"PK\6\6",
                    44,
                    45,
                    45,
                    0,
                    0,
                    self.count,
                    self.count,
                    len(self.central),
                    start,
                )
            )
            self.file.write(struct.pack("<4sIQI", b"PK\6\7", 0, end, 1))
            count = MAX_COUNT
        self.file.write(
            struct.pack(
                "<4sHHHHIIH", b"PK\5\6", 0, 0, count, count, len(self.central), start, len(comment)
            )
            + comment
        )


class Archive:
    """An archive under construction; `comment` is the archive's own comment."""

    def __init__(self):
        self.entries = []
        self.comment = b""

    def add(self, name, data=b"", method=DEFLATED, **fields):
        """Appends an entry with the full name `name`; `fields` override the correct values.

        With a method other than stored and deflated, the data are written unchanged.
        """
        if isinstance(name, str):
            name = name.encode()
        if name.endswith(b"/"):
            method = STORED
        entry = Entry(name, data, method)
        for field, value in fields.items():
            assert hasattr(entry, field), field
            setattr(entry, field, value)
        self.entries.append(entry)
        return self

    def local_part(self):
        """Local headers and data, and the offset of each local header."""
        content, offsets = b"", []
        for entry in self.entries:
            offsets.append(len(content))
            content += entry.local_header() + entry.packed
        return content, offsets

    def content(self):
        """The archive's bytes."""
        file = io.BytesIO()
        writer = Writer(file)
        for entry in self.entries:
            writer.add(entry)
        writer.finish(self.comment)
        return file.getvalue()
