"""`spb list` shows an SPB as the installer sees it."""

import subprocess

import pytest

from harness import spb_tool
from harness.machine import SPB
from harness.zip_archive import IMAGE_ROOT, STORED, Archive


@pytest.fixture
def spb(tmp_path):
    return tmp_path / "toolkit.spb"


def listed(spb, archive):
    """Lists `archive`; returns the lines below the heading."""
    spb.write_bytes(archive if isinstance(archive, bytes) else archive.content())
    done = spb_tool.run("list", spb)
    assert (done.returncode, done.stderr) == (0, "")
    return done.stdout.split("\n")[1:-1]


def names(lines):
    """The last column, without the image root."""
    return [line.split(" ")[-1].removeprefix(IMAGE_ROOT) for line in lines]


def small():
    return Archive().add(IMAGE_ROOT + "bin/").add(IMAGE_ROOT + "bin/a", b"1").add("x/b", b"22")


def test_each_entry_has_its_mode_size_place_and_name(spb):
    archive = Archive()
    archive.add(IMAGE_ROOT + "bin/")
    archive.add(IMAGE_ROOT + "bin/trawlcfg", b"#!/bin/sh\n")
    archive.add(IMAGE_ROOT + "config/xss/a.xss", b"<a/>", STORED)
    archive.add(IMAGE_ROOT + "install/")
    archive.add(IMAGE_ROOT + "install/rmdirs.sh", b"x" * 123456)
    spb.write_bytes(archive.content())

    done = spb_tool.run("list", spb)

    root = "/home/zorbuild/zor_src_dir/ZOR/zor_pkgs/images/linux-ix86/"
    assert (done.returncode, done.stderr) == (0, "")
    assert done.stdout == (
        "mode        size  lands at           entry\n"
        f"0755           0  bin/               {root}bin/\n"
        f"0755          10  bin/trawlcfg       {root}bin/trawlcfg\n"
        f"0755           4  config/xss/a.xss   {root}config/xss/a.xss\n"
        f"0750           0  install/           {root}install/\n"
        f"0750      123456  install/rmdirs.sh  {root}install/rmdirs.sh\n"
    )


@pytest.mark.parametrize(
    "name",
    [
        "bin/a",
        "/bin/a",
        IMAGE_ROOT,
        IMAGE_ROOT + "doc/a",
        IMAGE_ROOT + "bin",
        IMAGE_ROOT + "binary/a",
        IMAGE_ROOT.replace("ix86", "x64") + "bin/a",
    ],
)
def test_an_entry_that_lands_nowhere_is_marked(spb, name):
    assert listed(spb, Archive().add(name, b"data")) == [f"   -           4  (passed over)  {name}"]


def test_slashes_in_a_row_become_one_where_an_entry_lands(spb):
    line = listed(spb, Archive().add(IMAGE_ROOT + "bin///a//b", b"data"))[0]

    assert line == f"0755           4  bin/a/b   {IMAGE_ROOT}bin///a//b"


def test_entries_are_in_the_order_of_the_central_directory(spb):
    archive = small()
    local, offsets = archive.local_part()
    central = b"".join(
        entry.central_header(offset)
        for entry, offset in reversed(list(zip(archive.entries, offsets)))
    )
    end = archive.content()[-22:]

    assert names(listed(spb, local + central + end)) == ["x/b", "bin/a", "bin/"]
    assert names(listed(spb, local + central + end[:-2] + b"\1\0c")) == ["bin/", "bin/a", "x/b"]


def test_a_name_is_that_of_the_local_header_cut_at_its_nul(spb):
    content = Archive().add(IMAGE_ROOT + "bin/a\0b", b"1").content()
    head, _, tail = content.rpartition(b"bin/a\0b")

    assert names(listed(spb, head + b"bin/c\0d" + tail)) == ["bin/a"]


def test_an_entry_that_occurs_twice_is_listed_twice(spb):
    assert names(listed(spb, small().add(IMAGE_ROOT + "bin/a", b"2"))) == [
        "bin/",
        "bin/a",
        "x/b",
        "bin/a",
    ]


def test_a_name_of_any_bytes_stays_on_one_line(spb):
    assert names(listed(spb, Archive().add(b"\xff\n\x1b[m", b"1"))) == ["\\xff\\n\\x1b[m"]


def test_a_file_without_a_package_in_it_is_an_error(spb):
    spb.write_bytes(b"no package")

    done = spb_tool.run("list", spb)

    assert (done.returncode, done.stdout) == (1, "")
    assert done.stderr == (
        f"spb: {spb}: surprises: central-directory: there is no end record at the end; the central"
        " directory is not used, only the local headers are\n"
        f"spb: {spb}: fails: unreadable: the installer finds no package: at byte 0, the file ends"
        " before a central directory\n"
    )


def test_a_file_that_does_not_exist_is_an_error(spb):
    done = spb_tool.run("list", spb)

    assert (done.returncode, done.stdout) == (1, "")
    assert done.stderr == f"spb: {spb}: No such file or directory\n"


def test_a_reader_that_stops_ends_the_list_silently(spb):
    spb.write_bytes(spb_tool.archive({f"bin/{n}": b"1" for n in range(5000)}).content())

    done = subprocess.run(
        ["sh", "-c", '"$0" list "$1" | head -n 1', spb_tool.TOOL, spb],
        capture_output=True,
        text=True,
        check=False,
    )

    assert done.stdout.startswith("mode")
    assert done.stderr == ""


def test_a_full_disk_is_an_error(spb):
    spb.write_bytes(small().content())

    done = subprocess.run(
        ["sh", "-c", '"$0" list "$1" >/dev/full', spb_tool.TOOL, spb],
        capture_output=True,
        text=True,
        check=False,
    )

    assert (done.returncode, done.stderr) == (1, "spb: list: No space left on device\n")


@pytest.mark.parametrize("comment", [b"", b"c"])
def test_the_list_names_what_the_installer_looks_at_in_its_order(machine, comment):
    archive = spb_tool.archive({"bin/a\0b": b"1", "bin//c": b"2"}).add("elsewhere", b"3")
    archive.comment = comment
    machine.plant(SPB, archive.content())

    outcome = machine.run("i", "ABC", "-s", SPB, "-v")

    seen = [
        line.removeprefix("Looking at file ").removesuffix(" inside spb")
        for line in outcome.stdout.splitlines()
        if line.startswith("Looking at file ")
    ]
    lines = spb_tool.run("list", machine.at(SPB)).stdout.splitlines()[1:]
    first_pass = [line.split(" ")[-1] for line in lines]
    assert seen[: len(first_pass)] == first_pass


def test_everything_lands_where_the_list_says_with_its_mode_and_size(machine):
    machine.plant(SPB, spb_tool.archive({"bin//plugins/": b"", "bin/plugins//a": b"1"}).content())
    rows = [
        line.split()[:3] for line in spb_tool.run("list", machine.at(SPB)).stdout.splitlines()[1:]
    ]
    # The installer fills these in, or sets another mode afterwards.
    changed = ["config/Zor.properties", "config/ZorTrace.properties", "config/ZorHWConfig.xml",
               "install/trawlcfg.sh", "install/rmdirs.sh"]  # fmt: skip

    assert machine.run("i", "ABC", "-s", SPB).status == 0

    for mode, size, place in rows:
        path = "/opt/corvan/zor/" + place.rstrip("/")
        assert machine.exists(path)
        if place not in changed:
            assert machine.mode(path) == int(mode, 8), path
            assert place.endswith("/") or len(machine.read_bytes(path)) == int(size), path
