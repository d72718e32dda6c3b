"""Packing a tree into an SPB: the bytes of the archive, and what is refused."""

import os
import random
import signal
import struct
import subprocess
import zipfile
from pathlib import Path

import pytest

from harness import spb_tool

ROOT = "/home/zorbuild/zor_src_dir/ZOR/zor_pkgs/images/linux-ix86/"


def plant(tree, files):
    """Writes `files`, names and contents, below `tree`."""
    for name, content in files.items():
        path = tree / name
        path.parent.mkdir(parents=True, exist_ok=True)
        path.write_bytes(content)
    return tree


# What the small trees of these tests lack of a package that installs.
ACCEPTED = [
    f"--accept={code}"
    for code in (
        "directory-stays",
        "missing-file-scanner",
        "missing-placeholder",
        "missing-property-file",
        "missing-scanner-control",
        "missing-script",
    )
]


def pack(tree, output, *options, **environment):
    return subprocess.run(
        [spb_tool.TOOL, "pack", tree, "-o", output, *ACCEPTED, *options],
        capture_output=True,
        text=True,
        check=False,
        env={**os.environ, **environment},
    )


@pytest.fixture
def tree(tmp_path):
    return plant(
        tmp_path / "tree",
        {
            "bin/trawlcfg": b"#!/bin/sh\n",
            "bin/plugins/dmi": b"dmi " * 100,
            "config/Zor.properties": b"version=9.2.30.0000\n",
            "config/xss/a.xss": b"<a/>",
            "install/trawlcfg.sh": b"#!/bin/sh\n",
            "properties/trawlfs.properties": b"title = t\n",
        },
    )


@pytest.fixture
def spb(tmp_path):
    return tmp_path / "toolkit.spb"


def refusal(tree, spb, *options):
    """Packs `tree`, which must fail and leave nothing; returns what was said."""
    before = set(spb.parent.iterdir())

    run = pack(tree, spb, *options)

    assert run.returncode == 1
    assert run.stdout == ""
    assert set(spb.parent.iterdir()) == before
    return run.stderr


def test_every_directory_comes_before_its_content(tree, spb):
    assert pack(tree, spb).returncode == 0

    assert zipfile.ZipFile(spb).namelist() == [
        ROOT + "bin/",
        ROOT + "bin/plugins/",
        ROOT + "bin/plugins/dmi",
        ROOT + "bin/trawlcfg",
        ROOT + "config/",
        ROOT + "config/Zor.properties",
        ROOT + "config/xss/",
        ROOT + "config/xss/a.xss",
        ROOT + "install/",
        ROOT + "install/trawlcfg.sh",
        ROOT + "properties/",
        ROOT + "properties/trawlfs.properties",
    ]


def test_a_one_file_package_has_exactly_these_bytes(tmp_path, spb):
    tree = plant(tmp_path / "tree", {"bin/a": b"hello"})

    assert pack(tree, spb, "--stored").returncode == 0

    directory = b"/home/zorbuild/zor_src_dir/ZOR/zor_pkgs/images/linux-ix86/bin/"
    fixed_dir = bytes.fromhex("1400 0000 0000 0000 2100 00000000 00000000 00000000 3e00 0000")
    fixed_file = bytes.fromhex("1400 0000 0000 0000 2100 86a61036 05000000 05000000 3f00 0000")
    assert spb.read_bytes() == (
        b"PK\3\4" + fixed_dir + directory
        + b"PK\3\4" + fixed_file + directory + b"a" + b"hello"
        + b"PK\1\2\x14\3" + fixed_dir + bytes.fromhex("0000 0000 0000 0000ed41 00000000")
        + directory
        + b"PK\1\2\x14\3" + fixed_file + bytes.fromhex("0000 0000 0000 0000ed81 5c000000")
        + directory + b"a"
        + b"PK\5\6" + bytes.fromhex("0000 0000 0200 0200 d9000000 be000000 0000")
    )  # fmt: skip


def test_deflated_and_stored_entries_give_back_the_files(tree, spb):
    for options, method in ([], zipfile.ZIP_DEFLATED), (["--stored"], zipfile.ZIP_STORED):
        assert pack(tree, spb, *options).returncode == 0

        archive = zipfile.ZipFile(spb)
        assert archive.read(ROOT + "bin/plugins/dmi") == b"dmi " * 100
        assert archive.read(ROOT + "config/xss/a.xss") == b"<a/>"
        assert archive.getinfo(ROOT + "bin/plugins/dmi").compress_type == method
        assert archive.getinfo(ROOT + "bin/plugins/").compress_type == zipfile.ZIP_STORED


def test_a_file_larger_than_one_piece_is_packed_whole(tree, spb):
    content = bytes(range(256)) * 5000
    plant(tree, {"bin/large": content})

    assert pack(tree, spb).returncode == 0

    assert zipfile.ZipFile(spb).read(ROOT + "bin/large") == content


def test_local_headers_carry_the_sizes(tree, spb):
    assert pack(tree, spb).returncode == 0

    archive = zipfile.ZipFile(spb)
    image = spb.read_bytes()
    for entry in archive.infolist():
        flags, method, crc, packed, size = struct.unpack_from(
            "<HHxxxxIII", image, entry.header_offset + 6
        )
        assert (flags, method, crc, packed, size) == (
            0,
            entry.compress_type,
            entry.CRC,
            entry.compress_size,
            entry.file_size,
        )


def test_the_same_tree_gives_the_same_bytes(tree, tmp_path):
    copy = tmp_path / "copy"
    for path in sorted(tree.rglob("*"), reverse=True):  # made in another order
        target = copy / path.relative_to(tree)
        if path.is_file():
            target.parent.mkdir(parents=True, exist_ok=True)
            target.write_bytes(path.read_bytes())
            target.chmod(0o600)
            os.utime(target, (1_500_000_000, 1_500_000_000))

    assert pack(tree, tmp_path / "one.spb").returncode == 0
    assert pack(copy, tmp_path / "two.spb").returncode == 0

    assert (tmp_path / "one.spb").read_bytes() == (tmp_path / "two.spb").read_bytes()


def test_the_archive_shows_the_modes_that_the_installer_sets(tree, spb):
    assert pack(tree, spb).returncode == 0

    modes = {e.filename: e.external_attr >> 16 for e in zipfile.ZipFile(spb).infolist()}
    assert modes[ROOT + "bin/"] == 0o040755
    assert modes[ROOT + "config/Zor.properties"] == 0o100755
    assert modes[ROOT + "install/"] == 0o040750
    assert modes[ROOT + "install/trawlcfg.sh"] == 0o100750


@pytest.mark.parametrize(
    "epoch, stamp",
    [
        ("0", (1980, 1, 1, 0, 0, 0)),
        ("1669999999", (2022, 12, 2, 16, 53, 18)),
        ("99999999999", (2107, 12, 31, 23, 59, 58)),
    ],
)
def test_source_date_epoch_dates_the_entries(tree, spb, epoch, stamp):
    assert pack(tree, spb, SOURCE_DATE_EPOCH=epoch).returncode == 0

    assert {entry.date_time for entry in zipfile.ZipFile(spb).infolist()} == {stamp}


def test_a_source_date_epoch_that_is_no_number_is_refused(tree, spb):
    run = pack(tree, spb, SOURCE_DATE_EPOCH="yesterday")

    assert run.returncode == 1
    assert run.stderr == "spb: SOURCE_DATE_EPOCH is no number of seconds: yesterday\n"
    assert not spb.exists()


def test_an_empty_directory_is_packed(tree, spb):
    (tree / "bin" / "customscanners").mkdir()

    assert pack(tree, spb).returncode == 0

    assert ROOT + "bin/customscanners/" in zipfile.ZipFile(spb).namelist()


def test_a_link_to_a_file_is_packed_as_the_file(tree, spb):
    (tree / "bin" / "linked").symlink_to("trawlcfg")

    assert pack(tree, spb).returncode == 0

    archive = zipfile.ZipFile(spb)
    assert archive.read(ROOT + "bin/linked") == b"#!/bin/sh\n"
    assert archive.getinfo(ROOT + "bin/linked").external_attr >> 16 == 0o100755


def test_a_name_beyond_ascii_keeps_its_bytes(tree, spb):
    plant(tree, {"bin/größe": b"1"})
    (Path(os.fsdecode(os.fsencode(tree) + b"/bin/\xff"))).write_bytes(b"2")

    assert pack(tree, spb).returncode == 0

    image = spb.read_bytes()
    for name, utf8 in ("größe".encode(), 0x800), (b"\xff", 0):
        at = image.index(ROOT.encode() + b"bin/" + name)
        assert struct.unpack_from("<H", image, at - 24) == (utf8,)


def test_what_is_next_to_the_package_directories_is_left_out_with_a_note(tree, spb):
    plant(tree, {"README": b"read me"})

    run = pack(tree, spb)

    assert run.returncode == 0
    assert run.stderr == "spb: note: README is no package directory and is left out\n"
    assert not any("README" in name for name in zipfile.ZipFile(spb).namelist())


def test_the_package_replaces_an_older_one_under_the_umask(tree, spb):
    spb.write_bytes(b"old")
    umask = os.umask(0o027)
    try:
        assert pack(tree, spb).returncode == 0
    finally:
        os.umask(umask)

    assert zipfile.is_zipfile(spb)
    assert spb.stat().st_mode & 0o7777 == 0o640


def test_an_empty_file_is_refused(tree, spb):
    plant(tree, {"bin/empty": b""})

    assert refusal(tree, spb) == "spb: bin/empty: an empty file cannot be installed\n"


def test_an_entry_name_of_2048_bytes_is_packed_and_a_longer_one_refused(tree, spb):
    directory = tree / "bin"
    for _ in range(7):
        directory /= "d" * 250
    directory.mkdir(parents=True)
    room = 2048 - len(ROOT) - len("bin/") - 7 * 251
    (directory / ("f" * room)).write_bytes(b"1")
    assert pack(tree, spb).returncode == 0
    assert max(len(name) for name in zipfile.ZipFile(spb).namelist()) == 2048

    (directory / ("f" * (room + 1))).write_bytes(b"1")

    said = refusal(tree, spb)
    assert said.endswith("f: the entry's name has 2049 bytes with the image root, more than 2048\n")
    assert said.count("\n") == 1


def test_a_file_of_2_gib_is_refused_before_it_is_read(tree, spb):
    os.truncate(plant(tree, {"bin/huge": b"1"}) / "bin" / "huge", 2**31)

    assert refusal(tree, spb) == "spb: bin/huge: a file of 2 GiB or more cannot be installed\n"


def test_a_package_of_2_gib_is_refused(tree, spb):
    for name in "one", "two":
        os.truncate(plant(tree, {f"bin/{name}": b"1"}) / "bin" / name, 2**30)

    assert refusal(tree, spb, "--stored") == (
        "spb: the package would reach 2 GiB, more than the installer can read\n"
    )


@pytest.mark.parametrize(
    "make, reason",
    [
        (lambda path: path.symlink_to("nowhere"), "No such file or directory"),
        (lambda path: path.symlink_to("plugins"), "a link to a directory cannot be packed"),
        (os.mkfifo, "neither a file nor a directory"),
    ],
)
def test_what_is_neither_a_file_nor_a_directory_is_refused(tree, spb, make, reason):
    make(tree / "bin" / "odd")

    assert refusal(tree, spb) == f"spb: bin/odd: {reason}\n"


def test_a_newline_in_a_name_is_refused(tree, spb):
    plant(tree, {"bin/a\nb": b"1"})

    assert refusal(tree, spb) == (
        "spb: bin/a\\nb: a newline in a name would break the index of installed files\n"
    )


def test_a_file_name_that_leaves_no_room_for_a_backup_is_refused(tree, spb):
    plant(tree, {"bin/" + "n" * 251: b"1"})
    assert pack(tree, spb).returncode == 0

    plant(tree, {"bin/" + "n" * 252: b"1"})

    assert refusal(tree, spb) == (
        f"spb: bin/{'n' * 252}: a file's name of more than 251 bytes leaves an upgrade no room for"
        " a backup\n"
    )


def test_every_reason_is_reported_in_one_run(tree, spb):
    plant(tree, {"bin/empty": b"", "install/empty": b""})

    assert refusal(tree, spb) == (
        "spb: bin/empty: an empty file cannot be installed\n"
        "spb: install/empty: an empty file cannot be installed\n"
    )


def test_more_entries_than_the_directory_can_count_are_refused(tmp_path, spb):
    tree = tmp_path / "tree"
    (tree / "bin").mkdir(parents=True)
    for number in range(65535):  # with "bin" itself one too many
        (tree / "bin" / str(number)).symlink_to("/proc/self/nothing")

    said = refusal(tree, spb)

    assert said.startswith(
        "spb: 65536 files and directories are more than the 65535 entries that the installer sees\n"
    )


def test_a_tree_without_package_directories_is_refused(tmp_path, spb):
    plant(tmp_path / "tree", {"bin": b"no directory"})

    assert refusal(tmp_path / "tree", spb) == (
        f"spb: {tmp_path}/tree: holds none of the package directories"
        " bin, properties, config, install\n"
    )


def test_a_tree_that_does_not_exist_is_an_error(tmp_path, spb):
    assert refusal(tmp_path / "tree", spb) == f"spb: {tmp_path}/tree: No such file or directory\n"


def test_a_package_inside_the_packed_tree_is_refused(tree):
    output = tree / "bin" / "toolkit.spb"

    assert refusal(tree, output) == f"spb: {output}: is inside a directory that is packed\n"


def test_a_directory_that_cannot_take_the_package_is_named(tree, tmp_path):
    output = tmp_path / "nowhere" / "toolkit.spb"

    run = pack(tree, output)

    assert run.returncode == 1
    assert run.stderr == f"spb: {output}: No such file or directory\n"


def test_a_missing_output_file_is_a_usage_error(tree):
    run = subprocess.run([spb_tool.TOOL, "pack", tree], capture_output=True, text=True, check=False)

    assert run.returncode == 2
    assert run.stderr.startswith("usage: spb pack [-h] -o FILE [--stored] [--accept CODE] DIR\n")


def test_a_large_tree_shows_its_progress_on_a_terminal(tree, spb):
    plant(tree, {f"bin/{number}": b"1" for number in range(1000)})

    shown = spb_tool.shown_on_a_terminal("pack", tree, "-o", spb, *ACCEPTED)

    assert shown.startswith(b"\rspb: packing, ")
    assert shown.endswith(b" %\x1b[K\r\x1b[K")


def test_a_small_tree_is_packed_silently_on_a_terminal(tree, spb):
    assert spb_tool.shown_on_a_terminal("pack", tree, "-o", spb, *ACCEPTED) == b""


def test_a_large_tree_shows_no_progress_without_a_terminal(tree, spb):
    plant(tree, {f"bin/{number}": b"1" for number in range(1000)})

    run = pack(tree, spb)

    assert (run.returncode, run.stdout, run.stderr) == (0, "", "")


def test_files_of_many_chunks_are_joined_the_same_way_on_one_processor(tree, tmp_path):
    dice = random.Random(1)
    words = [bytes(dice.choices(range(97, 123), k=dice.randint(2, 9))) for _ in range(3000)]
    contents = {
        "words": b" ".join(dice.choices(words, k=1_000_000)),
        "zeros": bytes(5_000_000),
        "noise": dice.randbytes(4_500_000),
        "mixed": b"".join(bytes(70_000) + dice.randbytes(50_000) for _ in range(60)),
        "exact": dice.randbytes(2 << 20) + b"a" * (2 << 20),
        "one-more": b"ab" * (1 << 20) + b"c",
    }
    plant(tree, {f"bin/{name}": content for name, content in contents.items()})
    processors = os.sched_getaffinity(0)

    assert pack(tree, tmp_path / "all.spb").returncode == 0
    os.sched_setaffinity(0, {min(processors)})
    try:
        assert pack(tree, tmp_path / "one.spb").returncode == 0
    finally:
        os.sched_setaffinity(0, processors)

    assert (tmp_path / "all.spb").read_bytes() == (tmp_path / "one.spb").read_bytes()
    archive = zipfile.ZipFile(tmp_path / "all.spb")
    for name, content in contents.items():
        assert archive.read(ROOT + "bin/" + name) == content, name
    assert archive.getinfo(ROOT + "bin/noise").compress_type == zipfile.ZIP_STORED


def test_packing_ends_with_the_check_and_refuses_what_cannot_be_installed(tree, spb):
    run = subprocess.run(
        [spb_tool.TOOL, "pack", tree, "-o", spb, "--accept=missing-placeholder"],
        capture_output=True,
        text=True,
        check=False,
    )

    assert (run.returncode, run.stdout) == (1, "")
    assert run.stderr == (
        "spb: fails: missing-property-file: config/ZorTrace.properties: without this property file"
        " an installation fails\n"
        "spb: surprises: missing-file-scanner: bin/trawlfs: without the file-system scanner its"
        " service cannot be stopped\n"
        "spb: surprises: missing-script: install/rmdirs.sh: the installer looks for this script\n"
    )
    assert not spb.exists()


def test_a_dash_packs_to_standard_output(tree, spb):
    assert pack(tree, spb).returncode == 0

    run = subprocess.run(
        [spb_tool.TOOL, "pack", tree, "-o", "-", *ACCEPTED], capture_output=True, check=False
    )

    assert (run.returncode, run.stdout, run.stderr) == (0, spb.read_bytes(), b"")


@pytest.mark.parametrize("ending", [signal.SIGTERM, signal.SIGHUP, signal.SIGINT])
def test_a_signal_leaves_no_temporary_file(tree, spb, ending):
    os.truncate(plant(tree, {"bin/huge": b"1"}) / "bin" / "huge", 2**31 - 2**20)
    before = set(spb.parent.iterdir())
    with subprocess.Popen([spb_tool.TOOL, "pack", tree, "-o", spb, *ACCEPTED]) as process:
        while set(spb.parent.iterdir()) == before:
            assert process.poll() is None, "ended before it wrote anything"

        process.send_signal(ending)

        assert process.wait() == -ending
    assert set(spb.parent.iterdir()) == before
