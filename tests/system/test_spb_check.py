"""What `spb check` reports about a package, and that the installer behaves as reported."""

import json
import random
import struct
import subprocess

import pytest

from harness import spb_tool
from harness.machine import SPB, Machine
from harness.zip_archive import DEFLATED, IMAGE_ROOT, SIZES_FOLLOW_THE_DATA, STORED

END_SIZE = 22

LONG_DIRECTORIES = ["bin/" + "d" * 250 + "/"]
for _ in range(3):
    LONG_DIRECTORIES.append(LONG_DIRECTORIES[-1] + "d" * 250 + "/")


def package(changes=None, without=()):
    return spb_tool.archive(changes, without).content()


def with_entry(name, data=b"data\n", method=STORED, **fields):
    """A sound package with one more entry at its end."""
    return spb_tool.archive().add(IMAGE_ROOT + name, data, method, **fields).content()


def with_comment(length):
    archive = spb_tool.archive()
    archive.comment = b"c" * length
    return archive.content()


def with_changed_end(offset, layout, value):
    content = bytearray(package())
    struct.pack_into(layout, content, len(content) - END_SIZE + offset, value)
    return bytes(content)


def with_zip64_locator():
    content = package()
    return content[:-END_SIZE] + b"PK\6\7" + bytes(16) + content[-END_SIZE:]


def with_an_uncounted_entry():
    content = bytearray(with_entry("bin/last"))
    count = struct.unpack_from("<H", content, len(content) - 12)[0]
    struct.pack_into("<HH", content, len(content) - 14, count - 1, count - 1)
    return bytes(content)


def with_central_name(name):
    """The entry "bin/trawlhw" under another name in the central directory only."""
    head, _, tail = package().rpartition(b"bin/trawlhw")
    return head + name + tail


def with_link():
    """The entry "bin/link" as a symbolic link in the eyes of other tools."""
    content = bytearray(with_entry("bin/link", b"trawlhw"))
    header = content.rindex(b"PK\1\2")
    struct.pack_into("<H", content, header + 4, 3 << 8 | 20)
    struct.pack_into("<I", content, header + 38, 0o120777 << 16)
    return bytes(content)


def streamed():
    """Every local header without sizes, behind a comment that hides the central directory."""
    archive = spb_tool.archive()
    for entry in archive.entries:
        entry.flags = SIZES_FOLLOW_THE_DATA
        entry.local_sizes = False
    archive.comment = b"c"
    return archive.content()


def with_damaged_data():
    archive = spb_tool.archive()
    entry = archive.entries[4]
    assert entry.name.endswith(b"bin/libzorcore.so") and entry.method == DEFLATED
    entry.packed = entry.packed[:20] + b"\xff" * (len(entry.packed) - 20)
    return archive.content()


def as_stored_in_the_directory():
    """An entry that only its local header calls deflated; the scan reads it anyway."""
    archive = spb_tool.archive().add(IMAGE_ROOT + "bin/x", b"x" * 100, DEFLATED)
    archive.entries[-1].method = STORED
    return archive.content()


FAILS = {
    "an empty file, deflated": (
        package({"bin/empty": b""}),
        [("empty-file", "bin/empty")],
    ),
    "an empty file, stored": (
        with_entry("bin/empty", b""),
        [("empty-file", "bin/empty")],
    ),
    "a file without data": (
        with_entry("bin/x", packed_size=0),
        [("empty-file", "bin/x")],
    ),
    "an unsupported method": (
        with_entry("bin/x", method=12),
        [("unsupported-method", "bin/x")],
    ),
    "a directory without an entry": (
        package(without=["properties/"]),
        [("missing-directory", "properties/scan.properties")],
    ),
    "a directory whose entry comes too late": (
        spb_tool.archive(without=["install/"]).add(IMAGE_ROOT + "install/").content(),
        [("missing-directory", "install/trawlcfg.sh")],
    ),
    "a subdirectory without an entry": (
        with_entry("bin/plugins/dmi"),
        [("missing-directory", "bin/plugins/dmi")],
    ),
    "a name that leads to a directory of a later step": (
        with_entry("bin/../config/x"),
        [("dot-dot-in-name", "bin/../config/x"), ("missing-directory", "bin/../config/x")],
    ),
    "a file below a file": (
        with_entry("bin/trawlhw/x"),
        [("not-a-directory", "bin/trawlhw/x")],
    ),
    "a directory below a file": (
        with_entry("bin/trawlhw/x/", b""),
        [("directory-stays", "bin/trawlhw/x/"), ("not-a-directory", "bin/trawlhw/x/")],
    ),
    "a file named as the directory itself": (
        with_entry("bin/."),
        [("dot-name", "bin/.")],
    ),
    "a file named as the directory above": (
        with_entry("config/xss/.."),
        [("dot-dot-in-name", "config/xss/.."), ("dot-name", "config/xss/..")],
    ),
    "a directory in the way of a backup": (
        spb_tool.archive().add(IMAGE_ROOT + "bin/trawlhw.bak/")
        .add(IMAGE_ROOT + "bin/trawlhw", b"data").content(),
        [("directory-stays", "bin/trawlhw.bak/"), ("backup-blocked", "bin/trawlhw")],
    ),
    "a directory in the way of a directory's backup": (
        spb_tool.archive().add(IMAGE_ROOT + "bin/x.bak/y/").add(IMAGE_ROOT + "bin/x/")
        .add(IMAGE_ROOT + "bin/x", b"x").content(),
        [("directory-stays", "bin/x.bak/y/"), ("directory-stays", "bin/x/"),
         ("backup-blocked", "bin/x")],
    ),
    "a directory that became a backup and is in the way of another": (
        spb_tool.archive().add(IMAGE_ROOT + "bin/x/").add(IMAGE_ROOT + "bin/x", b"1")
        .add(IMAGE_ROOT + "bin/x", b"2").content(),
        [("directory-stays", "bin/x/"), ("replaces-directory", "bin/x"),
         ("backup-blocked", "bin/x")],
    ),
    "a file over the directory of the second pass": (
        with_entry("config/xss"),
        [("replaces-directory", "config/xss"), ("not-a-directory", "config/xss/schema.xss")],
    ),
    "an entry twice without room for its backup": (
        spb_tool.archive().add(IMAGE_ROOT + "bin/" + "n" * 252, b"1")
        .add(IMAGE_ROOT + "bin/" + "n" * 252, b"2").content(),
        [("no-room-for-backup", "bin/" + "n" * 252)] * 2 + [("name-too-long", "bin/" + "n" * 252)],
    ),
    "a file's name of 256 bytes": (
        with_entry("bin/" + "n" * 256),
        [("name-too-long", "bin/" + "n" * 256)],
    ),
    "a directory's name of 256 bytes": (
        with_entry("bin/" + "n" * 256 + "/", b""),
        [("directory-stays", "bin/" + "n" * 256 + "/"),
         ("name-too-long", "bin/" + "n" * 256 + "/")],
    ),
    "a name without room for the backup of the second pass": (
        with_entry("config/xss/" + "n" * 252),
        [("name-too-long", "config/xss/" + "n" * 252)],
    ),
    "an entry's name of 2049 bytes": (
        with_entry("bin/" + "n/" * 993 + "n"),
        [("central-directory", None), ("name-too-long", None)],
    ),
    "a name longer than that beyond the image root": (
        spb_tool.archive().add("n" * 2049, b"data").content(),
        [("central-directory", None), ("name-too-long", None)],
    ),
    "no byte at all": (
        b"",
        [("central-directory", None), ("unreadable", None)],
    ),
    "no archive": (
        b"#!/bin/sh\necho no archive\n" * 9,
        [("central-directory", None), ("unreadable", None)],
    ),
    "no entry": (
        b"PK\5\6" + bytes(18),
        [("central-directory", None), ("unreadable", None)],
    ),
    "a central directory and nothing else": (
        package()[package().index(b"PK\1\2"):],
        [("central-directory", None), ("unreadable", None)],
    ),
    "an archive cut short": (
        package()[:1000],
        [("central-directory", None), ("unreadable", None)],
    ),
    "sizes behind the data without a usable directory": (
        streamed(),
        [("archive-comment", None), ("unknown-size", IMAGE_ROOT + "bin/")],
    ),
    "data of 2 GiB without a usable directory": (
        spb_tool.archive().add(IMAGE_ROOT + "bin/x", b"x", comment=b"c", packed_size=2**31)
        .add(IMAGE_ROOT + "bin/y", b"y").content(),
        [("file-comment", IMAGE_ROOT + "bin/x"), ("unreadable", None)],
    ),
    "more data than the entry's size": (
        with_entry("bin/x", b"x" * 100, DEFLATED, size=99),
        [("inflates-beyond-size", "bin/x")],
    ),
    "no name with its leading slash": (
        spb_tool.archive().content().replace(IMAGE_ROOT.encode(), IMAGE_ROOT[1:].encode() + b"/"),
        [("no-leading-slash", None)],
    ),
    "no scanner control": (
        package(without=["bin/trawlcfg"]),
        [("missing-scanner-control", "bin/trawlcfg")],
    ),
    "no main property file": (
        package(without=["config/Zor.properties"]),
        [("missing-property-file", "config/Zor.properties")],
    ),
    "no trace property file": (
        package(without=["config/ZorTrace.properties"]),
        [("missing-property-file", "config/ZorTrace.properties")],
    ),
    "a directory in place of the main property file": (
        spb_tool.archive(without=["config/Zor.properties"])
        .add(IMAGE_ROOT + "config/Zor.properties/").content(),
        [("missing-property-file", "config/Zor.properties")],
    ),
}  # fmt: skip

SURPRISES = {
    "a comment of one byte": (
        with_comment(1),
        [("archive-comment", None)],
    ),
    "a comment of 65535 bytes": (
        with_comment(65535),
        [("archive-comment", None)],
    ),
    "a comment that looks like an end record": (
        package()[:-2] + struct.pack("<H", 24) + b"PK\5\6" + bytes(20),
        [("archive-comment", None)],
    ),
    "a comment of a file": (
        spb_tool.archive().add(IMAGE_ROOT + "bin/x", b"x", comment=b"c")
        .add(IMAGE_ROOT + "bin/y", b"y").content(),
        [("file-comment", IMAGE_ROOT + "bin/x")],
    ),
    "an end record that speaks of more disks": (
        with_changed_end(8, "<H", 1),
        [("central-directory", None)],
    ),
    "an end record that counts too many": (
        with_changed_end(8, "<I", 0x00ff00ff),
        [("central-directory", None)],
    ),
    "an end record that points beyond 2 GiB": (
        with_changed_end(16, "<I", 0x80000000),
        [("central-directory", None)],
    ),
    "an end record that counts too few": (
        with_an_uncounted_entry(),
        [("entries-not-counted", None)],
    ),
    "a Zip64 locator": (
        with_zip64_locator(),
        [("zip64", None)],
    ),
    "a local header with another method": (
        as_stored_in_the_directory(),
        [("method-differs", IMAGE_ROOT + "bin/x")],
    ),
    "another name in the central directory": (
        with_central_name(b"bin/trawlxx"),
        [("name-differs", IMAGE_ROOT + "bin/trawlhw")],
    ),
    "a NUL in a name": (
        with_entry("bin/x\0y"),
        [("nul-in-name", IMAGE_ROOT + "bin/x\\x00y")],
    ),
    "a name that leads to another directory": (
        with_entry("install/../config/x"),
        [("dot-dot-in-name", "install/../config/x")],
    ),
    "a newline in a name": (
        with_entry("bin/x\ny"),
        [("newline-in-name", "bin/x\\ny")],
    ),
    "a file's path too long for the removal": (
        spb_tool.archive({name: b"" for name in LONG_DIRECTORIES})
        .add(IMAGE_ROOT + LONG_DIRECTORIES[-1] + "x", b"data").content(),
        [*(("directory-stays", name) for name in LONG_DIRECTORIES),
         ("long-path", LONG_DIRECTORIES[-1] + "x")],
    ),
    "a name without room for the backup of an upgrade": (
        with_entry("bin/" + "n" * 252),
        [("no-room-for-backup", "bin/" + "n" * 252)],
    ),
    "an entry twice": (
        with_entry("bin/trawlhw"),
        [("duplicate", "bin/trawlhw")],
    ),
    "two entries that land at the same place": (
        with_entry("bin//./trawlhw"),
        [("duplicate", "bin/./trawlhw")],
    ),
    "a file over a directory": (
        spb_tool.archive().add(IMAGE_ROOT + "bin/x/").add(IMAGE_ROOT + "bin/x", b"x").content(),
        [("directory-stays", "bin/x/"), ("replaces-directory", "bin/x")],
    ),
    "a file over a directory whose backup replaces an empty one": (
        spb_tool.archive().add(IMAGE_ROOT + "bin/x.bak/").add(IMAGE_ROOT + "bin/x/")
        .add(IMAGE_ROOT + "bin/x", b"x").content(),
        [("directory-stays", "bin/x.bak/"), ("directory-stays", "bin/x/"),
         ("replaces-directory", "bin/x")],
    ),
    "a backup of a neighbour": (
        with_entry("bin/trawlhw.bak"),
        [("backup-name", "bin/trawlhw.bak")],
    ),
    "the installer's own property file": (
        with_entry("install/zor_install.properties"),
        [("installer-file", "install/zor_install.properties")],
    ),
    "the single-user flag": (
        with_entry("config/SingleUserMode"),
        [("installer-file", "config/SingleUserMode")],
    ),
    "an encrypted entry": (
        with_entry("bin/x", flags=1),
        [("encrypted", "bin/x")],
    ),
    "a symbolic link": (
        with_link(),
        [("symbolic-link", "bin/link")],
    ),
    "a wrong CRC": (
        with_entry("bin/x", crc=1),
        [("crc-mismatch", "bin/x")],
    ),
    "a deflated entry of less than its size": (
        with_entry("bin/x", b"x" * 100, DEFLATED, size=101),
        [("size-mismatch", "bin/x")],
    ),
    "a deflated entry that is damaged": (
        with_damaged_data(),
        [("size-mismatch", "bin/libzorcore.so")],
    ),
    "a deflated entry cut short": (
        with_entry("bin/x", bytes(range(256)) * 100, DEFLATED, packed_size=100),
        [("size-mismatch", "bin/x")],
    ),
    "a stored entry of two sizes": (
        with_entry("bin/x", b"data", packed_size=3),
        [("size-mismatch", "bin/x")],
    ),
    "a stored entry that reaches beyond the file": (
        with_entry("bin/x", size=2**31 - 1, packed_size=2**31 - 1),
        [("size-mismatch", "bin/x")],
    ),
    "a stored entry of 2 GiB": (
        with_entry("bin/x", size=2**31, packed_size=2**31),
        [("size-2-gib", "bin/x")],
    ),
    "a directory that no removal deletes": (
        with_entry("bin/tools/", b""),
        [("directory-stays", "bin/tools/")],
    ),
    "a directory of scripts that no removal deletes": (
        with_entry("install/tools/", b""),
        [("directory-stays", "install/tools/")],
    ),
    "an entry outside the image root": (
        spb_tool.archive().add("bin/x", b"data").content(),
        [("outside-image-root", "bin/x")],
    ),
    "an entry of another platform": (
        spb_tool.archive().add(IMAGE_ROOT.replace("ix86", "x64") + "bin/x", b"data").content(),
        [("outside-image-root", IMAGE_ROOT.replace("ix86", "x64") + "bin/x")],
    ),
    "an entry outside the package directories": (
        with_entry("doc/x"),
        [("outside-package-directories", IMAGE_ROOT + "doc/x")],
    ),
    "an entry that could not be installed, but is passed over": (
        spb_tool.archive().add("empty", b"", method=12).content(),
        [("outside-image-root", "empty")],
    ),
    "no file-system scanner": (
        package(without=["bin/trawlfs"]),
        [("missing-file-scanner", "bin/trawlfs")],
    ),
    "no script": (
        package(without=["install/rmdirs.sh"]),
        [("missing-script", "install/rmdirs.sh")],
    ),
    "a main property file without placeholders": (
        package({"config/Zor.properties": b"version=9.2.30.0000\n"}),
        [("missing-placeholder", "config/Zor.properties")] * 4,
    ),
    "a trace property file without a placeholder": (
        package({"config/ZorTrace.properties": b"a=$(ZOR_DestinationDir)\n"}),
        [("missing-placeholder", "config/ZorTrace.properties")],
    ),
    "a script without a placeholder": (
        package({"install/trawlcfg.sh": b"cd '$(ZOR_DestinationDir)' '$(CorvanCommonDir)'\n"}),
        [("missing-placeholder", "install/trawlcfg.sh")],
    ),
    "a placeholder that is filled in elsewhere only": (
        package({"config/ZorTrace.properties": b"a=$(ZOR_DestinationDir)$(CorvanCommonDir)\n"
                                               b"b=$(ZOR_ConfigRootDirectory)\n"}),
        [("unknown-placeholder", "config/ZorTrace.properties")],
    ),
    "a placeholder that nobody fills in": (
        package({"config/ZorTrace.properties": b"a=$(ZOR_DestinationDir)$(NoSuch)b\n"
                                               b"b=$(ZOR_ConfigRootDirectory)\n"}),
        [("unknown-placeholder", "config/ZorTrace.properties")],
    ),
}  # fmt: skip

# It installs, but not what was packed.
DAMAGED = {
    case: SURPRISES.pop(case)
    for case in (
        "an encrypted entry",
        "a wrong CRC",
        "a deflated entry of less than its size",
        "a deflated entry that is damaged",
        "a deflated entry cut short",
        "a stored entry of two sizes",
        "a stored entry that reaches beyond the file",
        "a stored entry of 2 GiB",
    )
}

NOTHING = {
    "a sound package": package(),
    "a comment of the last file": spb_tool.archive()
    .add(IMAGE_ROOT + "bin/x", b"x", comment=b"c").content(),
    "sizes behind the data": with_entry("bin/x", flags=SIZES_FOLLOW_THE_DATA, local_sizes=False),
    "the image root's own directories": spb_tool.archive().add("/home/").add(IMAGE_ROOT).content(),
    "a directory twice": with_entry("bin/", b""),
    "an entry of exactly one block": with_entry("bin/x", bytes(8192), DEFLATED),
    "a name of 251 bytes": with_entry("bin/" + "n" * 251),
    "extra fields": with_entry("bin/x", local_extra=b"e" * 9, central_extra=b"e" * 5),
    "directories that a removal deletes": spb_tool.archive(
        {name: b"" for name in ("bin/plugins/", "bin/customscanners/", "bin/etc/",
                                "bin/etc/trawlfs/", "config/any/", "properties/any/")}).content(),
    "a backup's name without a neighbour": with_entry("bin/x.bak"),
}  # fmt: skip


def reported(findings, last_kind):
    """`findings` with their kinds: what makes a package fail comes last in its case."""
    triples = [("surprises", code, entry) for code, entry in findings]
    return [*triples[:-1], (last_kind, *findings[-1])]


@pytest.fixture(scope="module")
def empty_machine(binary):
    """One machine for many packages: install() leaves it as empty as it was."""
    fresh = Machine(binary)
    yield fresh
    fresh.delete()


def install(machine, content):
    machine.plant(SPB, content)
    outcome = machine.run("i", "ABC", "-s", SPB)
    for place in "/opt/corvan", "/etc/zor", "/etc/kel", "/usr/kel":
        if machine.exists(place):
            machine.remove(place)
    return outcome


@pytest.fixture
def spb(tmp_path):
    return tmp_path / "toolkit.spb"


@pytest.mark.parametrize("case", FAILS)
def test_what_fails_ends_with_exit_status_2(spb, case):
    content, findings = FAILS[case]
    spb.write_bytes(content)

    assert spb_tool.check(spb) == (2, reported(findings, "fails"))


@pytest.mark.parametrize("case", SURPRISES)
def test_what_surprises_ends_with_exit_status_1(spb, case):
    content, findings = SURPRISES[case]
    spb.write_bytes(content)

    assert spb_tool.check(spb) == (1, reported(findings, "surprises"))


@pytest.mark.parametrize("case", DAMAGED)
def test_damage_is_reported_with_exit_status_2(spb, case):
    content, findings = DAMAGED[case]
    spb.write_bytes(content)

    assert spb_tool.check(spb) == (2, reported(findings, "damaged"))


@pytest.mark.parametrize("case", NOTHING)
def test_a_package_without_findings_gives_exit_status_0(spb, case):
    spb.write_bytes(NOTHING[case])

    assert spb_tool.check(spb) == (0, [])


@pytest.mark.parametrize("case", FAILS)
def test_the_installer_fails_where_the_check_says_so(empty_machine, case):
    assert install(empty_machine, FAILS[case][0]).status != 0


@pytest.mark.parametrize("case", DAMAGED)
def test_the_installer_installs_what_is_damaged(empty_machine, case):
    assert install(empty_machine, DAMAGED[case][0]).status == 0


@pytest.mark.parametrize("case", SURPRISES)
def test_the_installer_installs_what_only_surprises(empty_machine, case):
    assert install(empty_machine, SURPRISES[case][0]).status == 0


@pytest.mark.parametrize("case", NOTHING)
def test_the_installer_installs_what_has_no_findings(empty_machine, case):
    assert install(empty_machine, NOTHING[case]).status == 0


def damaged(seed):
    """A package with a few random bytes changed, most of them in its headers."""
    dice = random.Random(seed)
    content = bytearray(package())
    central = content.index(b"PK\1\2")
    for _ in range(dice.randint(1, 3)):
        start = dice.choice([0, central, len(content) - END_SIZE])
        content[dice.randrange(start, len(content))] = dice.choice([0, 1, 8, 47, 255])
    if dice.random() < 0.2:
        del content[dice.randrange(len(content)) :]
    return bytes(content)


@pytest.mark.parametrize("seed", range(30))
def test_check_and_installer_agree_on_a_damaged_package(empty_machine, seed):
    outcome = install(empty_machine, damaged(seed))

    status, findings = spb_tool.check(empty_machine.at(SPB))

    # What a damaged scanner control does when it is called cannot be predicted.
    if "bin/trawlcfg" not in [entry for _, _, entry in findings]:
        fails = "fails" in [kind for kind, _, _ in findings]
        assert fails == (outcome.status != 0), (status, findings, outcome.stdout)


def test_the_packed_example_toolkit_has_no_findings_and_installs(empty_machine, tmp_path):
    subprocess.run([spb_tool.SCRIPTS / "build_toolkit.sh", tmp_path / "toolkit"], check=True)
    content = tmp_path / "toolkit.spb"
    assert spb_tool.run("pack", tmp_path / "toolkit", "-o", content).returncode == 0

    assert spb_tool.check(content) == (0, [])

    assert install(empty_machine, content.read_bytes()).status == 0


def test_findings_are_printed_one_a_line(spb):
    spb.write_bytes(spb_tool.archive().add("x", b"x").add(IMAGE_ROOT + "bin/e").content())

    done = spb_tool.run("check", spb)

    assert (done.returncode, done.stderr) == (2, "")
    assert done.stdout == (
        "surprises: outside-image-root: x: is passed over: its name does not begin with the image"
        " root\n"
        "fails: empty-file: bin/e: the installer cannot open an empty file\n"
    )


def test_without_findings_nothing_is_printed(spb):
    spb.write_bytes(package())

    done = spb_tool.run("check", spb)

    assert (done.returncode, done.stdout, done.stderr) == (0, "", "")


def test_only_directories_without_a_finding_are_gone_after_removal(empty_machine):
    directories = ["bin/plugins/", "bin/customscanners/", "bin/etc/", "bin/etc/trawlfs/",
                   "bin/etc/trawlhw/", "bin/etc/trawlsw/", "bin/etc/trawlvpd/", "config/any/",
                   "properties/any/", "install/QMX_CLI/", "bin/tools/",
                   "install/tools/"]  # fmt: skip
    package_of_them = spb_tool.archive({name: b"" for name in directories}).content()
    empty_machine.plant(SPB, package_of_them)
    _, findings = spb_tool.check(empty_machine.at(SPB))
    assert empty_machine.run("i", "ABC", "-s", SPB).status == 0

    assert empty_machine.run("r", "ABC").status == 0

    stay = [name for name in directories if empty_machine.exists("/opt/corvan/zor/" + name)]
    assert stay == ["bin/tools/", "install/tools/"]
    assert [entry for _, code, entry in findings if code == "directory-stays"] == stay
    empty_machine.remove("/opt/corvan")


def test_accepted_findings_are_not_reported(spb):
    spb.write_bytes(SURPRISES["a symbolic link"][0])

    done = spb_tool.run("check", "--accept", "symbolic-link", "--accept=long-path", spb)

    assert (done.returncode, done.stdout, done.stderr) == (0, "", "")


def test_a_code_that_there_is_not_cannot_be_accepted(spb):
    done = spb_tool.run("check", "--accept", "no-such", spb)

    assert (done.returncode, done.stdout) == (2, "")
    assert done.stderr.endswith("spb check: error: --accept: there is no code no-such\n")


def test_several_packages_are_checked_in_one_run(tmp_path):
    one, two = tmp_path / "one.spb", tmp_path / "two.spb"
    one.write_bytes(package())
    two.write_bytes(with_comment(1))

    text = spb_tool.run("check", one, two, tmp_path / "three.spb")
    listed = spb_tool.run("check", "--json", one, two)

    assert text.returncode == 2
    assert text.stdout == (
        f"{two}: surprises: archive-comment: the archive has a comment; the central directory is"
        " not used, only the local headers are\n"
    )
    assert text.stderr == f"spb: {tmp_path}/three.spb: No such file or directory\n"
    assert listed.returncode == 1
    assert [(report["file"], len(report["findings"])) for report in json.loads(listed.stdout)] == [
        (str(one), 0),
        (str(two), 1),
    ]


def test_a_damaged_package_does_not_count_as_one_that_installs(spb):
    spb.write_bytes(DAMAGED["a wrong CRC"][0])

    assert json.loads(spb_tool.run("check", "--json", spb).stdout)["installs"] is False


def test_json_says_whether_the_package_installs(spb):
    spb.write_bytes(with_comment(1))

    done = spb_tool.run("check", "--json", spb)

    assert done.returncode == 1
    assert json.loads(done.stdout) == {
        "file": str(spb),
        "installs": True,
        "findings": [
            {
                "kind": "surprises",
                "code": "archive-comment",
                "entry": None,
                "text": "the archive has a comment; the central directory is not used, only the"
                " local headers are",
            }
        ],
    }


def test_a_name_of_any_bytes_is_shown_on_one_line(spb):
    name = (IMAGE_ROOT + "bin/").encode() + b"\xff\x1b\n\xc3\xa4"
    spb.write_bytes(spb_tool.archive().add(name, b"data").content())

    done = spb_tool.run("check", spb)

    assert done.stdout.startswith("surprises: newline-in-name: bin/\\xff\\x1b\\nä: ")
    assert done.stdout.count("\n") == 1


@pytest.mark.parametrize(
    "path, reason",
    [("nowhere", "No such file or directory"), ("", "Is a directory")],
)
def test_a_file_that_cannot_be_read_is_an_error_of_status_2(tmp_path, path, reason):
    done = spb_tool.run("check", str(tmp_path / path))

    assert (done.returncode, done.stdout) == (2, "")
    assert done.stderr == f"spb: {tmp_path / path}: {reason}\n"


def test_a_large_package_shows_its_progress_on_a_terminal(spb):
    spb.write_bytes(package({f"bin/{number}": b"1" for number in range(1000)}))

    shown = spb_tool.shown_on_a_terminal("check", spb)

    assert shown.startswith(b"\rspb: checking, ")
    assert shown.endswith(b" %\x1b[K\r\x1b[K")


def test_every_code_has_a_case():
    """So that no code is without its proof against the installer."""
    met = {}
    for findings in [findings for _, findings in FAILS.values()]:
        met.update({code: kind for kind, code, _ in reported(findings, "fails")})
    for findings in [findings for _, findings in DAMAGED.values()]:
        met.update({code: kind for kind, code, _ in reported(findings, "damaged")})
    for findings in [findings for _, findings in SURPRISES.values()]:
        met.update({code: kind for kind, code, _ in reported(findings, "surprises")})

    assert met == spb_tool.codes()
