"""How packages are extracted: valid archives, unusual ones and damaged ones."""

import random

import pytest

from harness.checks import not_printed, printed_lines, same_text, same_tree
from harness.machine import ANN, SPB
from harness.toolkit import archive
from harness.zip_archive import DEFLATED, IMAGE_ROOT, SIZES_FOLLOW_THE_DATA, STORED

HOME = "/opt/corvan/zor"

# Bytes that no compressor makes smaller, so that compressed data spans several reads.
NOISE = random.Random(1).randbytes(100_000)


def install(machine, package=None, **how):
    """Installs `package`, an archive or bytes; the installation must succeed."""
    outcome = run(machine, package, **how)
    assert outcome.status == 0, outcome.stdout + outcome.stderr
    return outcome


def run(machine, package=None, *options, **how):
    if package is not None:
        machine.plant(SPB, package if isinstance(package, bytes) else package.content())
    return machine.run("i", "ABC", "-s", SPB, *options, **how)


def refused(machine, package):
    """Checks that `package` counts as no package at all."""
    before = machine.tree()

    outcome = run(machine, package)

    assert outcome.status == 1
    printed_lines(
        outcome,
        "Starting file extraction...",
        "*** Error: package not found or not valid.",
        "Exec '/usr/sbin/selinuxenabled >/dev/null 2>&1' returned 32512",
        "SELinux not enabled or not supported",
        "Installation failed, rolling back",
        "Done.",
    )
    same_tree(machine.tree(), before)


SIZES = (1, 2, 4095, 4096, 4097, 8191, 8192, 8193, 16384, 16385, 100_000)


@pytest.mark.parametrize("method", [STORED, DEFLATED], ids=["stored", "deflated"])
@pytest.mark.parametrize("kind", ["noise", "text"])
def test_a_file_of_every_size_arrives_to_its_last_byte(machine, method, kind):
    package = archive()
    contents = {
        size: NOISE[:size] if kind == "noise" else (b"abc\n" * 25_000)[:size] for size in SIZES
    }
    for size, content in contents.items():
        package.add(f"{IMAGE_ROOT}bin/{size}", content, method)

    install(machine, package)

    for size, content in contents.items():
        assert machine.read_bytes(f"{HOME}/bin/{size}") == content


def test_extra_fields_are_skipped(machine):
    package = archive()
    package.add(IMAGE_ROOT + "bin/a", b"first", local_extra=b"x" * 300, central_extra=b"y" * 9)
    package.add(IMAGE_ROOT + "bin/b", b"second")

    install(machine, package)

    assert machine.read(HOME + "/bin/a") == "first"
    assert machine.read(HOME + "/bin/b") == "second"


def test_an_archive_with_a_comment_installs_the_same(machine):
    package = archive()
    install(machine, package)
    expected = machine.tree(HOME)
    expected.pop(HOME + "/ZOR_files")
    machine.remove("/opt/corvan")
    machine.remove("/etc/zor")
    package.comment = b"a comment"

    install(machine, package)

    found = machine.tree(HOME)
    found.pop(HOME + "/ZOR_files")
    same_tree(found, expected)


def test_an_archive_with_a_comment_on_an_entry_installs_the_same(machine):
    package = archive()
    package.entries[3].comment = b"not the last one"

    install(machine, package)

    assert machine.read(HOME + "/properties/scan.properties") == "depth=4\n"


def test_an_archive_written_by_a_streaming_tool_is_read_by_its_directory(machine):
    package = archive()
    for entry in package.entries:
        if entry.size:
            entry.flags, entry.local_sizes = SIZES_FOLLOW_THE_DATA, False

    install(machine, package)

    assert machine.read_bytes(HOME + "/bin/libzorcore.so") == b"core library\n" * 700


def test_an_archive_written_by_a_streaming_tool_needs_its_directory(machine):
    package = archive()
    for entry in package.entries:
        if entry.size:
            entry.flags, entry.local_sizes = SIZES_FOLLOW_THE_DATA, False
    package.comment = b"hides the directory"

    refused(machine, package)


def test_the_methods_of_the_local_headers_count_when_the_directory_disagrees(machine):
    package = archive()
    package.add(IMAGE_ROOT + "bin/a", b"stored in truth", STORED)
    package.entries[-1].method = DEFLATED

    install(machine, package)

    assert machine.read(HOME + "/bin/a") == "stored in truth"


@pytest.mark.parametrize(
    "content",
    [
        b"",
        b"PK",
        b"not an archive at all, but long enough to hold an end record",
        b"\0" * 100,
        b"PK\5\6" + b"\0" * 18,
    ],
    ids=["empty", "short", "text", "zeros", "no entry"],
)
def test_a_file_that_is_no_archive_is_refused(machine, content):
    refused(machine, content)


def test_a_truncated_archive_is_refused(machine):
    local, _ = archive().local_part()

    refused(machine, local)


def test_an_archive_cut_in_the_middle_of_a_header_is_refused(machine):
    local, offsets = archive().local_part()

    refused(machine, local[: offsets[5] + 20])


def test_a_directory_is_no_package(machine):
    machine.remove(SPB)
    machine.make_directory(SPB)

    refused(machine, None)


def test_a_package_that_cannot_be_read_is_refused(machine):
    machine.plant("/home/ann/toolkit.spb", machine.read_bytes(SPB), 0)

    outcome = machine.run("i", "ABC", "-s", "/home/ann/toolkit.spb", user=ANN)

    printed_lines(
        outcome, "Starting file extraction...", "*** Error: package not found or not valid."
    )


def test_a_name_of_2048_bytes_is_accepted(machine):
    package = archive().add("n" * 2048, b"x")

    install(machine, package)


def test_a_name_of_2049_bytes_makes_the_archive_unreadable(machine):
    refused(machine, archive().add("n" * 2049, b"x"))


def test_a_name_is_cut_at_its_first_nul(machine):
    package = archive().add(IMAGE_ROOT.encode() + b"bin/cut\0here", b"content")

    install(machine, package)

    assert machine.read(HOME + "/bin/cut") == "content"


def test_of_two_entries_with_one_name_the_second_wins(machine):
    package = archive()
    package.add(IMAGE_ROOT + "bin/twice", b"first")
    package.add(IMAGE_ROOT + "bin/twice", b"second")

    install(machine, package)

    assert machine.read(HOME + "/bin/twice") == "second"
    assert not machine.exists(HOME + "/bin/twice.bak")
    assert machine.index(HOME).count("/bin/twice\n") == 1


@pytest.mark.parametrize("method", [1, 9, 12, 99])
def test_an_entry_of_another_method_cannot_be_extracted(machine, method):
    package = archive().add(IMAGE_ROOT + "bin/odd", b"data", method)

    outcome = run(machine, package)

    assert outcome.status == 1
    printed_lines(
        outcome,
        "Bin dir file extraction failed",
        "File extraction failed, error = 1 (Cannot open file for reading)",
    )


def test_an_entry_of_another_method_outside_of_the_package_directories_is_ignored(machine):
    install(machine, archive().add(IMAGE_ROOT + "doc/odd", b"data", 12))


@pytest.mark.parametrize("field", ["size", "packed_size"])
def test_an_entry_with_one_size_of_0_cannot_be_extracted(machine, field):
    package = archive().add(IMAGE_ROOT + "properties/odd", b"data", DEFLATED, **{field: 0})

    outcome = run(machine, package)

    assert outcome.status == 1
    printed_lines(
        outcome,
        "Starting file extraction...",
        "File extraction failed, error = 1 (Cannot open file for reading)",
    )


def test_a_stored_entry_with_too_large_a_size_reads_on_into_the_archive(machine):
    package = archive()
    package.add(IMAGE_ROOT + "bin/long", b"0123456789", STORED, size=14)
    package.add(IMAGE_ROOT + "bin/next", b"next")

    install(machine, package)

    assert machine.read_bytes(HOME + "/bin/long") == b"0123456789PK\3\4"


def test_damaged_deflated_data_lose_the_damaged_block(machine):
    # An intact stored block of five bytes, then a block of a kind that does not exist.
    damaged = b"\x00\x05\x00\xfa\xffhello" + b"\x07" + b"junk"
    package = archive().add(
        IMAGE_ROOT + "bin/damaged",
        b"",
        DEFLATED,
        packed=damaged,
        packed_size=len(damaged),
        size=100,
    )

    install(machine, package)

    assert machine.read(HOME + "/bin/damaged") == ""


def test_deflated_data_damaged_after_a_complete_block_keep_that_block(machine):
    header = b"\x00" + (12000).to_bytes(2, "little") + (12000 ^ 0xFFFF).to_bytes(2, "little")
    damaged = header + NOISE[:12000] + b"\x07" + b"junk"
    package = archive().add(
        IMAGE_ROOT + "bin/damaged",
        b"",
        DEFLATED,
        packed=damaged,
        packed_size=len(damaged),
        size=13000,
    )

    install(machine, package)

    assert machine.read_bytes(HOME + "/bin/damaged") == NOISE[:8192]


def test_deflated_data_cut_short_lose_their_last_partial_block(machine):
    package = archive().add(IMAGE_ROOT + "bin/cut", NOISE[:20_000], DEFLATED)
    package.entries[-1].packed_size -= 10

    install(machine, package)

    assert machine.read_bytes(HOME + "/bin/cut") == NOISE[:16_384]


def test_deflated_data_longer_than_recorded_abort_the_installer(machine):
    package = archive().add(IMAGE_ROOT + "bin/zz", b"0123456789", DEFLATED, size=9)

    outcome = run(machine, package)

    assert outcome.status == 134
    same_text(
        outcome.stderr,
        "wzorinst: zip_file:432: "
        "virtual int X__DeflatedInputStream::read(char*, int): "
        "Assertion `available_ >= (unsigned) result' failed.\n",
    )


def test_an_aborted_installation_is_not_undone(machine):
    machine.plant(HOME + "/bin/trawlcfg", "older", 0o700)
    package = archive().add(IMAGE_ROOT + "bin/zz", b"0123456789", DEFLATED, size=9)

    run(machine, package)

    assert machine.read(HOME + "/bin/trawlcfg.bak") == "older"
    assert machine.read(HOME + "/bin/trawlcfg").startswith("#!/bin/sh\n")
    assert not machine.exists("/etc/zor")


def test_an_abort_loses_no_trace_line(machine):
    package = archive().add(IMAGE_ROOT + "bin/zz", b"0123456789", DEFLATED, size=9)

    outcome = run(machine, package, "-v")

    assert outcome.stdout.endswith("\nextractFile: /opt/corvan/zor/bin/zz\n")


@pytest.mark.parametrize(
    "entry, last_line",
    [
        ("bin/zz", "Starting file extraction..."),
        ("config/zz", "Extracting configs to '/opt/corvan/zor/config'"),
    ],
)
def test_an_abort_loses_no_line_of_the_log_file(machine, entry, last_line):
    package = archive().add(IMAGE_ROOT + entry, b"0123456789", DEFLATED, size=9)

    run(machine, package, "-o", "/tmp/log")

    assert machine.read("/tmp/log").splitlines()[-1] == last_line


@pytest.mark.parametrize(
    "root",
    [
        "",
        "images/linux-ix86/",
        IMAGE_ROOT.replace("linux-ix86", "aix4-r1"),
        IMAGE_ROOT[1:],
        "/x" + IMAGE_ROOT,
        IMAGE_ROOT.upper(),
    ],
)
def test_names_without_the_image_root_of_this_platform_are_ignored(machine, root):
    package = archive()
    for entry in package.entries:
        entry.name = entry.name.replace(IMAGE_ROOT.encode(), root.encode())

    outcome = run(machine, package)

    # The extraction succeeds; what fails is the property file that it did not bring.
    assert outcome.status == 1
    not_printed(outcome, "File extraction failed")
    printed_lines(
        outcome,
        "Customizing property file: /opt/corvan/zor/config/Zor.properties",
        "Loading file /opt/corvan/zor/config/Zor.properties error: 2 "
        "(No such file or directory)",
    )


@pytest.mark.parametrize(
    "name", ["doc/readme", "readme", "bin", "binary/x", "Bin/x", "uninstall/x", "config"]
)
def test_entries_outside_of_the_package_directories_are_ignored(machine, name):
    install(machine)
    expected = sorted(machine.tree(HOME))
    machine.remove("/opt/corvan")
    machine.remove("/etc/zor")

    install(machine, archive({name: b"x"}))

    assert sorted(machine.tree(HOME)) == expected


def test_runs_of_slashes_become_one(machine):
    install(machine, archive({"bin//one": b"1", "bin///sub////": b"", "bin///sub//two": b"2"}))

    assert machine.read(HOME + "/bin/one") == "1"
    assert machine.read(HOME + "/bin/sub/two") == "2"
    assert "/opt/corvan/zor/bin/one\n" in machine.index(HOME)
    assert "/opt/corvan/zor/bin/sub/two\n" in machine.index(HOME)


def test_runs_of_slashes_in_the_target_become_one(machine):
    outcome = machine.run("i", "ABC", "-s", SPB, "-d", "/opt//a//")

    assert outcome.status == 0
    printed_lines(outcome, "Extracting configs to '/opt//a/config'")
    assert "\n/opt/a/bin/trawlcfg\n" in machine.index("/opt/a")


def test_a_name_with_two_dots_is_used_unchanged(machine):
    install(machine, archive({"bin/../sibling": b"x"}))

    assert machine.read(HOME + "/sibling") == "x"
    assert "\n/opt/corvan/zor/bin/../sibling\n" in machine.index(HOME)


def test_names_with_blanks_and_unusual_bytes_are_extracted(machine):
    package = archive()
    package.add(IMAGE_ROOT.encode() + b"bin/a b\xff\n;$(x)'\"", b"odd")

    install(machine, package)

    assert machine.tree(HOME)[HOME + "/bin/a b\udcff\n;$(x)'\""].content == b"odd"


def test_subdirectories_are_extracted_by_the_step_of_their_parent(machine):
    install(
        machine,
        archive(
            {
                "bin/plugins/": b"",
                "bin/plugins/a.so": b"1",
                "install/linux/": b"",
                "install/linux/b": b"2",
            }
        ),
    )

    assert machine.read(HOME + "/bin/plugins/a.so") == "1"
    assert machine.mode(HOME + "/bin/plugins/a.so") == 0o755
    assert machine.mode(HOME + "/install/linux") == 0o750
    assert machine.mode(HOME + "/install/linux/b") == 0o750


def test_a_file_ahead_of_its_directory_cannot_be_written(machine):
    outcome = run(machine, archive({"bin/sub/file": b"x", "bin/sub/": b""}))

    assert outcome.status == 1
    printed_lines(
        outcome,
        "Bin dir file extraction failed",
        "File extraction failed, error = 2 (Cannot open file for writing)",
    )


@pytest.mark.parametrize(
    "failing, extracted",
    [
        ("bin", []),
        ("properties", ["bin"]),
        ("config", ["bin", "properties"]),
        ("install", ["bin", "config", "properties"]),
    ],
)
def test_the_package_directories_are_extracted_in_a_fixed_order(machine, failing, extracted):
    package = archive()
    package.entries.sort(
        key=lambda entry: (
            "/" + failing + "/" not in entry.name.decode(),
            b"/install/" not in entry.name,
        )
    )
    package.entries.insert(0, archive({failing + "/empty": b""}).entries[-1])

    run(machine, package, "-norollback")

    found = {path.split("/")[4] for path in machine.tree(HOME) if path.count("/") == 4}
    assert sorted(found) == extracted


def test_a_directory_in_the_way_of_a_file_ends_under_the_backup_name(machine):
    machine.plant(HOME + "/bin/trawlhw/file", "kept")

    install(machine)

    assert machine.read_bytes(HOME + "/bin/trawlhw") == b"\x7fELF hardware scanner\x00\xff"
    assert machine.read(HOME + "/bin/trawlhw.bak/file") == "kept"


def test_a_link_in_the_way_of_a_file_is_replaced_and_its_target_kept(machine):
    machine.plant("/opt/target", "kept")
    machine.link(HOME + "/bin/trawlhw", "/opt/target")

    install(machine)

    assert machine.read("/opt/target") == "kept"
    assert machine.tree(HOME)[HOME + "/bin/trawlhw"].kind == "f"


def test_a_link_to_itself_in_the_way_of_a_file_cannot_be_replaced(machine):
    machine.link(HOME + "/bin/trawlhw", "trawlhw")

    outcome = run(machine)

    assert outcome.status == 1
    printed_lines(
        outcome,
        "Bin dir file extraction failed",
        "File extraction failed, error = 2 (Cannot open file for writing)",
    )
    assert machine.tree(HOME + "/bin/trawlhw")[HOME + "/bin/trawlhw"].content == b"trawlhw"


def test_a_name_that_the_file_system_rejects_cannot_be_written(machine):
    outcome = run(machine, archive({"bin/" + "n" * 300: b"content"}))

    assert outcome.status == 1
    printed_lines(
        outcome,
        "Bin dir file extraction failed",
        "File extraction failed, error = 2 (Cannot open file for writing)",
    )
    assert not machine.exists(HOME)


def test_without_an_index_the_installation_goes_on(machine):
    machine.make_directory(HOME + "/ZOR_files")

    outcome = install(machine)

    printed_lines(
        outcome,
        "Starting file extraction...",
        "Warning! Failed to create install log file: /opt/corvan/zor/ZOR_files",
        "Extracting configs to '/opt/corvan/zor/config'",
    )
    assert machine.tree(HOME)[HOME + "/ZOR_files"].kind == "d"
    assert machine.exists("/etc/zor/zor.ini")


def test_an_index_line_without_a_newline_at_the_end_of_the_file_counts(machine):
    machine.plant(HOME + "/ZOR_files", "/opt/last")

    install(machine)

    assert "\n/opt/last\n" in machine.index(HOME)


def test_an_old_index_of_any_mode_becomes_readable(machine):
    machine.plant(HOME + "/ZOR_files", "/opt/last\n", 0o600)

    install(machine)

    assert machine.mode(HOME + "/ZOR_files") == 0o644


def test_the_paths_of_the_index_are_ordered_as_unsigned_bytes(machine):
    package = archive()
    for name in (b"bin/z", b"bin/A", b"bin/a", b"bin/\xff", b"bin/a b", b"bin/a-b", b"bin/\x01"):
        package.add(IMAGE_ROOT.encode() + name, b"x")

    install(machine, package)

    lines = [
        line
        for line in machine.read_bytes(HOME + "/ZOR_files").splitlines()
        if line.startswith(b"/opt/corvan/zor/bin/")
    ]
    assert lines == [
        b"/opt/corvan/zor/bin/" + name
        for name in (
            b"\x01",
            b"A",
            b"a",
            b"a b",
            b"a-b",
            b"libzor.so",
            b"libzorcore.so",
            b"trawlcfg",
            b"trawlfs",
            b"trawlhw",
            b"z",
            b"\xff",
        )
    ]


def test_the_index_of_a_home_with_a_final_slash_has_the_plain_join(machine):
    outcome = machine.run("i", "ABC", "-s", SPB, "-d", "/opt/x//")

    assert outcome.status == 0
    index = machine.index("/opt/x")
    for line in (
        "/opt/x/bin/libzor.so",
        "/opt/x/config/Zor.tmp",
        "/opt/x/zor.log",
        "/opt/x/zor.log.bak",
        "/opt/x/bin/trawlcfg",
    ):
        assert f"\n{line}\n" in index
