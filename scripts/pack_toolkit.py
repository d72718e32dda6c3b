#!/usr/bin/python3
"""Packs the example toolkit into an SPB: scripts/pack_toolkit.py DIR -o FILE [--stored]

For the demo and the tests, which need only Python for it. Real packages are made by
`spb pack`, which refuses what cannot be installed, compresses on all processors and is documented.
"""

import argparse
import pathlib
import stat
import zipfile

IMAGE_ROOT = "/home/zorbuild/zor_src_dir/ZOR/zor_pkgs/images/linux-ix86/"
PACKAGE_DIRS = ["bin", "config", "install", "properties"]


def main():
    parser = argparse.ArgumentParser(description=__doc__.split("\n", maxsplit=1)[0])
    parser.add_argument("tree", metavar="DIR", type=pathlib.Path)
    parser.add_argument("-o", dest="output", metavar="FILE", required=True)
    parser.add_argument("--stored", action="store_true", help="do not compress")
    arguments = parser.parse_args()
    method = zipfile.ZIP_STORED if arguments.stored else zipfile.ZIP_DEFLATED

    paths = [path for name in PACKAGE_DIRS for path in (arguments.tree / name).rglob("*")]
    paths += [arguments.tree / name for name in PACKAGE_DIRS]
    with zipfile.ZipFile(arguments.output, "w") as archive:
        for path in sorted(paths):  # every directory before what is in it
            kind = stat.S_IFDIR if path.is_dir() else stat.S_IFREG
            name = IMAGE_ROOT + path.relative_to(arguments.tree).as_posix()
            # The format's first day: the same tree gives the same bytes.
            entry = zipfile.ZipInfo(name + "/" if path.is_dir() else name)
            entry.external_attr = (kind | 0o755) << 16
            entry.compress_type = zipfile.ZIP_STORED if path.is_dir() else method
            archive.writestr(entry, b"" if path.is_dir() else path.read_bytes())


if __name__ == "__main__":
    main()
