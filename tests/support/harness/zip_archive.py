"""Writes SPB archives, right and wrong ones, byte by byte.

An SPB is a zip archive whose entry names begin with the image root. `Archive` keeps its entries
in order and writes local headers, data, central directory and end record itself, so that each
field of each record can be made wrong on its own.
"""

import struct
import zlib

IMAGE_ROOT = "/home/zorbuild/zor_src_dir/ZOR/zor_pkgs/images/linux-ix86/"

STORED = 0
DEFLATED = 8

SIZES_FOLLOW_THE_DATA = 8


def deflate(data):
    """`data` as raw deflate bytes, without a zlib header."""
    compressor = zlib.compressobj(9, zlib.DEFLATED, -15)
    return compressor.compress(data) + compressor.flush()


class Entry:
    """One entry; every attribute but `name` and `packed` is a field of its headers."""

    def __init__(self, name, data, method):
        self.name = name
        self.packed = deflate(data) if method == DEFLATED else data
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

    def local_header(self):
        sizes = (self.crc, self.packed_size, self.size) if self.local_sizes else (0, 0, 0)
        return struct.pack("<4sHHHHHIIIHH", b"PK\3\4", 20, self.flags, self.local_method, 0, 0x21,
                           *sizes, len(self.name), len(self.local_extra)
                           ) + self.name + self.local_extra

    def central_header(self, offset):
        return struct.pack("<4sHHHHHHIIIHHHHHII", b"PK\1\2", 20, 20, self.flags, self.method, 0,
                           0x21, self.crc, self.packed_size, self.size, len(self.name),
                           len(self.central_extra), len(self.comment), 0, 0, 0, offset
                           ) + self.name + self.central_extra + self.comment


class Archive:
    """An archive under construction; `comment` is the archive's own comment."""

    def __init__(self):
        self.entries = []
        self.comment = b""

    def add(self, name, data=b"", method=DEFLATED, **fields):
        """Appends an entry with the full name `name`; `fields` override what would be right.

        A method other than stored and deflated leaves the data as they are.
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

    def central_part(self, offsets):
        return b"".join(e.central_header(o) for e, o in zip(self.entries, offsets))

    def content(self):
        """The archive's bytes."""
        local, offsets = self.local_part()
        central = self.central_part(offsets)
        end = struct.pack("<4sHHHHIIH", b"PK\5\6", 0, 0, len(self.entries), len(self.entries),
                          len(central), len(local), len(self.comment))
        return local + central + end + self.comment
