"""Removal: who still needs the toolkit, and how it is deleted once no one does."""

import pytest

from harness.checks import not_printed, printed, printed_lines, same_lines, same_text, same_tree
from harness.installations import FOUND, STOPPED
from harness.machine import ANN, SPB

HOME = "/opt/corvan/zor"

LISTED_FILES = """\
RM FILE: /opt/corvan/zor/bin/libzor.so
RM FILE: /opt/corvan/zor/bin/libzorcore.so
RM FILE: /opt/corvan/zor/bin/trawlcfg
RM FILE: /opt/corvan/zor/bin/trawlfs
RM FILE: /opt/corvan/zor/bin/trawlhw
RM FILE: /opt/corvan/zor/config/SingleUserMode
RM FILE: /opt/corvan/zor/config/Zor.properties
RM FILE: /opt/corvan/zor/config/Zor.tmp
RM FILE: /opt/corvan/zor/config/ZorHWConfig.xml
RM FILE: /opt/corvan/zor/config/ZorTrace.properties
RM FILE: /opt/corvan/zor/config/xss/schema.xss
RM FILE: /opt/corvan/zor/install/rmdirs.sh
RM FILE: /opt/corvan/zor/install/trawlcfg.sh
RM FILE: /opt/corvan/zor/install/zor_install.properties
RM FILE: /opt/corvan/zor/properties/scan.properties
RM FILE: /opt/corvan/zor/zor.log
RM FILE: /opt/corvan/zor/zor.log.bak
"""

DIRECTORIES = """\
RMDIR: /opt/corvan/zor/install
RMDIR: /opt/corvan/zor/bin/etc
RMDIR: /opt/corvan/zor/properties
RMDIR: /opt/corvan/zor/config/xss
RMDIR: /opt/corvan/zor/config
RMDIR: /opt/corvan/zor/cache_data
"""

SHARED_END = """\
RMDIR: /usr/kel/corvan/common/ZOR/logs
RMDIR: /usr/kel/corvan/common/ZOR
DEL: /etc/zor/zor.ini
RMDIR: /etc/zor
Uninstallation successful, removing temporary files
Done.
"""

# What a shared installation leaves behind for good: the common directory and its setting.
LEFT = """\
d 0755 /etc
d 0775 /etc/kel
d 0775 /etc/kel/corvan
d 0775 /etc/kel/corvan/common
d 0775 /etc/kel/corvan/common/cfg
f 0664 /etc/kel/corvan/common/cfg/log.properties
d 0755 /opt
d 0755 /opt/corvan
d 0777 /usr/kel
d 0777 /usr/kel/corvan
d 0777 /usr/kel/corvan/common
"""


def install(machine, exploiters="ABC:", *options, **how):
    """Installs the toolkit for `exploiters`, a list as the registry holds it."""
    outcome = machine.run("i", "ABC", "-s", SPB, *options, **how)
    assert outcome.status == 0, outcome.stdout
    if exploiters != "ABC:":
        registry = machine.read("/etc/zor/zor.ini")
        machine.plant("/etc/zor/zor.ini", registry.replace("ABC:", exploiters))


def remove(machine, exploiter="ABC", *options, **how):
    """Removes for `exploiter`, which must succeed."""
    outcome = machine.run("r", exploiter, *options, **how)
    assert outcome.status == 0, outcome.stdout + outcome.stderr
    return outcome


def without_index(machine):
    """Replaces the index by something that cannot be written."""
    machine.remove(HOME + "/ZOR_files")
    machine.link(HOME + "/ZOR_files", "/nowhere/index")


def with_sorted_deletions(text):
    """`text` with each run of "DEL: " lines sorted: directories list files in any order."""
    lines, run = [], []
    for line in text.splitlines(True) + [""]:
        if line.startswith("DEL: "):
            run.append(line)
        else:
            lines += sorted(run) + [line]
            run = []
    return "".join(lines)


# The exploiter list.


def test_the_first_of_two_exploiters_only_leaves_the_registry(machine):
    install(machine, "ABC:XYZ:")
    before = machine.tree()

    outcome = remove(machine)

    printed(
        outcome,
        FOUND
        + """\
Exploiter list not empty, updating INI file only
Saving INI file to /etc/zor/zor.ini
Uninstallation successful, removing temporary files
Done.
""",
    )
    same_lines(outcome.commands, [])
    after = machine.tree()
    same_text(
        after.pop("/etc/zor/zor.ini").content.decode(),
        """\
ZOR_Version = 9.2.30.0000
ZOR_BuildDate = 22/12/02
ZOR_HomeDirectory = /opt/corvan/zor
ZOR_Exploiters = XYZ:
ZOR_ConfigRootDirectory = /opt/corvan/zor
""",
    )
    before.pop("/etc/zor/zor.ini")
    same_tree(after, before)


@pytest.mark.parametrize("first, second", [("ABC", "XYZ"), ("XYZ", "ABC")])
def test_the_last_of_two_exploiters_removes_the_toolkit(machine, first, second):
    install(machine)
    assert machine.run("i", "XYZ", "-s", SPB).status == 0

    remove(machine, first)
    assert machine.exists(HOME + "/bin/trawlcfg")

    remove(machine, second)
    assert not machine.exists(HOME)
    assert not machine.exists("/etc/zor")


def test_an_exploiter_that_is_not_registered_changes_nothing(machine):
    install(machine)
    before = machine.tree()

    printed(
        remove(machine, "XYZ"),
        FOUND
        + """\
ZOR not installed for exploiter XYZ, nothing to do
Uninstallation successful, removing temporary files
Done.
""",
    )

    same_tree(machine.tree(), before)


@pytest.mark.parametrize("exploiters", ["", " ", "::", "XABC:", "ABCX:", "abc:", "A:B:C:"])
def test_whole_identifiers_are_compared(machine, exploiters):
    install(machine, exploiters)
    before = machine.tree()

    printed_lines(
        remove(machine),
        "ZOR not installed for exploiter ABC, nothing to do",
        "Uninstallation successful, removing temporary files",
    )

    same_tree(machine.tree(), before)


def test_a_list_of_one_colon_lets_anybody_remove_the_toolkit(machine):
    install(machine, ":")

    printed(
        remove(machine, "ANYBODY"),
        FOUND
        + """\
ZOR not installed for exploiter ANYBODY, nothing to do
Exploiter list empty, ok to remove anyway
"""
        + STOPPED
        + LISTED_FILES
        + DIRECTORIES
        + SHARED_END,
    )


def test_an_unregistered_installation_is_removed_by_anybody(machine):
    assert machine.run("i", "ABC", "-s", SPB, "-n").status == 0

    remove(machine, "XYZ")

    same_text(machine.listing("/etc", "/opt", "/usr/kel"), LEFT)


@pytest.mark.parametrize(
    "before, after",
    [
        ("XABC:ABC:", "XABC:"),
        ("XABC:Q:ABC:", "XQ:ABC:"),
        ("ABC:ABC:", "ABC:"),
        ("A::ABC:", "A::"),
        (":ABC:", ":"),
    ],
)
def test_the_identifier_is_cut_out_where_its_text_first_occurs(machine, before, after):
    install(machine, before)

    printed_lines(remove(machine), "Exploiter list not empty, updating INI file only")

    assert f"\nZOR_Exploiters = {after}\n" in machine.read("/etc/zor/zor.ini")


def test_an_identifier_without_its_colon_cannot_be_cut_out_and_the_toolkit_is_removed(machine):
    install(machine, "XYZ:ABC")

    not_printed(remove(machine), "Exploiter list")

    same_text(machine.listing("/etc", "/opt", "/usr/kel"), LEFT)


def test_a_list_without_a_colon_after_the_cut_counts_as_empty(machine):
    install(machine, "ABC:XYZ")

    printed_lines(
        remove(machine),
        "currentZorHome = '/opt/corvan/zor' currentCfgHome = '/opt/corvan/zor'",
        "Exec '/opt/corvan/zor/bin/trawlfs -shutdown >/dev/null 2>&1' returned 0",
    )

    assert not machine.exists(HOME)


def test_a_registry_that_cannot_be_saved_fails_the_removal_and_stays(machine):
    install(machine, "ABC:XYZ:")
    machine.make_directory("/etc/zor/zor.ini.bak")
    before = machine.tree()

    outcome = machine.run("r", "ABC")

    printed(
        outcome,
        FOUND
        + """\
Exploiter list not empty, updating INI file only
Saving INI file to /etc/zor/zor.ini
*** Error: could not open or write to INI file. Error = 2
Done.
""",
        status=1,
    )
    same_tree(machine.tree(), before)


def test_the_rewritten_registry_keeps_its_mode(machine):
    install(machine, "ABC:XYZ:")
    machine.change_mode("/etc/zor/zor.ini", 0o640)

    remove(machine, umask=0o077)

    assert machine.mode("/etc/zor/zor.ini") == 0o640


# The full removal.


def test_a_removal_prints_its_progress(machine):
    install(machine)

    printed(remove(machine), FOUND + STOPPED + LISTED_FILES + DIRECTORIES + SHARED_END)


def test_a_removal_leaves_only_the_common_directory_and_its_setting(machine):
    install(machine)

    remove(machine)

    same_text(machine.listing("/etc", "/opt", "/usr/kel"), LEFT)


def test_a_removal_stops_the_scanners(machine):
    install(machine)

    same_lines(
        remove(machine).commands,
        [
            "/opt/corvan/zor/bin/trawlfs [-shutdown]",
            "/opt/corvan/zor/bin/trawlcfg [-disable] [all]",
            "/opt/corvan/zor/bin/trawlcfg [-shutdown] [all] [-timeout] [60] [-force]",
            "/opt/corvan/zor/bin/trawlcfg [-shutdown] [all] [-timeout] [120]",
        ],
    )


def test_failing_stop_commands_do_not_prevent_a_removal(machine):
    install(machine)
    machine.let_commands_fail(("trawl", 1))

    outcome = remove(machine)

    printed_lines(
        outcome,
        "Exec '/opt/corvan/zor/bin/trawlfs -shutdown >/dev/null 2>&1' returned 256",
        "Exec '/opt/corvan/zor/bin/trawlcfg -disable all >/dev/null 2>&1' returned 256",
        "Exec '/opt/corvan/zor/bin/trawlcfg -shutdown all -timeout 60 -force >/dev/null 2>&1' "
        "returned 256",
        "Exec '/opt/corvan/zor/bin/trawlcfg -shutdown all -timeout 120 >/dev/null 2>&1' "
        "returned 256",
        "RM FILE: /opt/corvan/zor/bin/libzor.so",
    )
    assert not machine.exists(HOME)


def test_debug_mode_shows_what_the_scanner_control_prints(machine):
    install(machine)

    printed_lines(
        remove(machine, "ABC", "-v"),
        "Setting 'LD_LIBRARY_PATH' to 'LD_LIBRARY_PATH=/opt/corvan/zor/bin'",
        "scanner control output: -shutdown",
        "Exec '/opt/corvan/zor/bin/trawlfs -shutdown' returned 0",
        "scanner control output: -disable all",
    )


def test_a_per_user_removal_prints_its_progress_and_leaves_nothing(machine):
    before = machine.tree()
    install(machine, user=ANN)

    outcome = remove(machine, user=ANN)

    home = "/home/ann/corvan/zor"
    shared = FOUND + STOPPED + LISTED_FILES + DIRECTORIES
    printed(
        outcome,
        shared.replace(HOME, home)
        .replace("/etc/zor", "/home/ann/.zor")
        .replace("Install type: global", "Install type: local")
        + """\
DEL: /home/ann/.zor/zor.ini
RMDIR: /home/ann/.zor
Uninstallation successful, removing temporary files
Done.
""",
    )
    machine.remove("/home/ann/corvan")
    same_tree(machine.tree(), before)


def test_a_per_user_removal_leaves_the_common_directory_alone(machine):
    machine.plant("/usr/kel/corvan/common/ZOR/logs/log", "kept")
    install(machine, "ABC:", "-eeo", "-l")

    remove(machine, "ABC", "-eeo", "-l")

    assert machine.read("/usr/kel/corvan/common/ZOR/logs/log") == "kept"


def test_a_shared_removal_leaves_the_per_user_installation_alone(machine):
    install(machine, user=ANN)
    before = machine.tree("/home")
    install(machine)

    remove(machine)

    same_tree(machine.tree("/home"), before)


def test_a_removal_works_where_the_registry_says(machine):
    install(machine, "ABC:", "-d", "/opt/first")
    machine.plant("/opt/second/file", "kept")

    remove(machine, "ABC", "-d", "/opt/second")

    assert not machine.exists("/opt/first")
    assert machine.read("/opt/second/file") == "kept"


def test_a_removal_in_a_home_with_a_blank_is_complete(machine):
    install(machine, "ABC:", "-d", "/opt/my zor")

    outcome = remove(machine)

    assert outcome.commands[0] == "/opt/my zor/bin/trawlfs [-shutdown]"
    assert not machine.exists("/opt/my zor")


def test_an_index_file_is_deleted_silently(machine):
    install(machine)

    not_printed(remove(machine), "ZOR_files\nRM")

    assert not machine.exists(HOME + "/ZOR_files")


def test_the_installers_own_files_are_deleted(machine):
    install(machine)
    for path in (
        "bin/libzor.so",
        "config/Zor.tmp",
        "config/SingleUserMode",
        "zor.log",
        "zor.log.bak",
    ):
        machine.plant(f"{HOME}/{path}", "x")

    remove(machine)

    assert not machine.exists(HOME)


def test_every_path_of_the_index_is_deleted_wherever_it_is(machine):
    install(machine)
    machine.plant("/opt/elsewhere/file ", "x")
    machine.plant("/opt/elsewhere/file", "kept")
    machine.plant(HOME + "/ZOR_files", machine.read(HOME + "/ZOR_files") + "/opt/elsewhere/file ")

    remove(machine)

    assert not machine.exists("/opt/elsewhere/file ")
    assert machine.read("/opt/elsewhere/file") == "kept"


def test_comments_and_empty_lines_of_the_index_are_no_files(machine):
    install(machine)
    machine.plant("/tmp/#file", "kept")
    machine.plant(HOME + "/ZOR_files", "#file\n\n" + machine.read(HOME + "/ZOR_files"))

    outcome = remove(machine)

    printed_lines(outcome, *LISTED_FILES.splitlines())
    not_printed(outcome, "RM FILE: \n")
    assert machine.read("/tmp/#file") == "kept"


def test_a_listed_directory_is_not_deleted_as_a_file(machine):
    install(machine)
    machine.make_directory("/opt/elsewhere")
    machine.plant(HOME + "/ZOR_files", machine.read(HOME + "/ZOR_files") + "/opt/elsewhere\n")

    printed_lines(remove(machine), "RM FILE: /opt/elsewhere")

    assert machine.exists("/opt/elsewhere")


def test_a_line_longer_than_1023_bytes_is_split_into_pieces(machine):
    install(machine)
    machine.plant("/tmp/victim", "x")
    machine.plant(HOME + "/ZOR_files", "~" * 1023 + "victim\n")

    printed_lines(remove(machine), "RM FILE: " + "~" * 1023, "RM FILE: victim")

    assert not machine.exists("/tmp/victim")


def test_a_line_of_1023_bytes_leaves_an_empty_piece_of_its_newline(machine):
    install(machine)
    machine.plant(HOME + "/ZOR_files", "~" * 1023 + "\n")

    printed_lines(remove(machine), "RM FILE: " + "~" * 1023, "RM FILE: ")


def test_without_an_index_the_files_of_the_binaries_are_not_known(machine):
    install(machine)
    machine.remove(HOME + "/ZOR_files")

    outcome = remove(machine)

    # The refreshed index lists the installer's own five files, so it counts as one.
    before, rest = with_sorted_deletions(outcome.stdout).split(
        "RMDIR: /opt/corvan/zor/properties\n"
    )
    config, after = rest.split("RMDIR: /opt/corvan/zor/config\n")
    same_text(
        before,
        FOUND
        + STOPPED
        + """\
RM FILE: /opt/corvan/zor/bin/libzor.so
RM FILE: /opt/corvan/zor/config/SingleUserMode
RM FILE: /opt/corvan/zor/config/Zor.tmp
RM FILE: /opt/corvan/zor/zor.log
RM FILE: /opt/corvan/zor/zor.log.bak
DEL: /opt/corvan/zor/install/rmdirs.sh
DEL: /opt/corvan/zor/install/trawlcfg.sh
DEL: /opt/corvan/zor/install/zor_install.properties
RMDIR: /opt/corvan/zor/install
RMDIR: /opt/corvan/zor/bin/etc
DEL: /opt/corvan/zor/properties/scan.properties
""",
    )
    same_lines(
        sorted(config.splitlines()),
        [
            "DEL: /opt/corvan/zor/config/Zor.properties",
            "DEL: /opt/corvan/zor/config/ZorHWConfig.xml",
            "DEL: /opt/corvan/zor/config/ZorTrace.properties",
            "DEL: /opt/corvan/zor/config/xss/schema.xss",
            "RMDIR: /opt/corvan/zor/config/xss",
        ],
    )
    same_text(after, "RMDIR: /opt/corvan/zor/cache_data\n" + SHARED_END)
    same_text(
        machine.listing("/opt"),
        """\
d 0755 /opt
d 0755 /opt/corvan
d 0755 /opt/corvan/zor
d 0755 /opt/corvan/zor/bin
f 0755 /opt/corvan/zor/bin/libzorcore.so
f 0755 /opt/corvan/zor/bin/trawlcfg
f 0755 /opt/corvan/zor/bin/trawlfs
f 0755 /opt/corvan/zor/bin/trawlhw
""",
    )


def test_with_an_index_that_cannot_be_written_the_known_places_are_deleted(machine):
    install(machine)
    without_index(machine)

    outcome = remove(machine)

    same_text(
        with_sorted_deletions(outcome.stdout),
        FOUND
        + STOPPED
        + """\
DEL: /opt/corvan/zor/install/rmdirs.sh
DEL: /opt/corvan/zor/install/trawlcfg.sh
DEL: /opt/corvan/zor/install/zor_install.properties
RMDIR: /opt/corvan/zor/install
RMDIR: /opt/corvan/zor/bin/etc
DEL: /opt/corvan/zor/bin/libzorcore.so
DEL: /opt/corvan/zor/bin/trawlcfg
DEL: /opt/corvan/zor/bin/trawlfs
DEL: /opt/corvan/zor/bin/trawlhw
RMDIR: /opt/corvan/zor/bin
DEL: /opt/corvan/zor/properties/scan.properties
RMDIR: /opt/corvan/zor/properties
DEL: /opt/corvan/zor/config/xss/schema.xss
RMDIR: /opt/corvan/zor/config/xss
DEL: /opt/corvan/zor/config/Zor.properties
DEL: /opt/corvan/zor/config/ZorHWConfig.xml
DEL: /opt/corvan/zor/config/ZorTrace.properties
RMDIR: /opt/corvan/zor/config
RMDIR: /opt/corvan/zor/cache_data
DEL: /opt/corvan/zor/ZOR_files
RMDIR: /opt/corvan/zor
"""
        + SHARED_END,
    )
    same_text(machine.listing("/etc", "/opt", "/usr/kel"), LEFT)


# Files that somebody added.

ORDERS = pytest.mark.parametrize(
    "prepare", [lambda machine: None, without_index], ids=["by the index", "by known places"]
)


@ORDERS
@pytest.mark.parametrize(
    "path",
    [
        "config/mine",
        "config/deep/er/mine",
        "config/xss/mine",
        "properties/mine",
        "properties/deep/mine",
        "cache_data/mine",
        "cache_data/deep/mine",
        "install/mine",
        "logs/mine",
        "_uninst/mine",
        "bin/etc/mine",
        "bin/etc/trawlhw/mine",
        "bin/etc/trawluse/mine",
        "bin/etc/trawlnet/mine",
        "bin/etc/trawlfs/mine",
        "bin/etc/trawlsw/mine",
        "bin/etc/trawlvpd/mine",
        "install/QMX_CLI/mine",
        "install/QMX_CLI/linux-ix86/mine",
        "install/QMX_CLI/linux-ix86/msg_cat/mine",
    ],
)
def test_an_added_file_is_deleted_with_the_toolkit(machine, prepare, path):
    install(machine)
    prepare(machine)
    machine.plant(f"{HOME}/{path}", "mine")

    outcome = remove(machine)

    printed_lines(outcome, f"DEL: /opt/corvan/zor/{path}")
    same_text(machine.listing("/etc", "/opt", "/usr/kel"), LEFT)


KEPT_UNLESS_EMPTY = pytest.mark.parametrize(
    "path",
    [
        "bin/mine",
        "bin/plugins/mine",
        "bin/customscanners/mine",
        "mine",
        "install/QMX_CLI/linux-ix86/bin/mine",
        "install/QMX_CLI/linux-ix86/lib/mine",
        "install/QMX_CLI/linux-ix86/msg_cat/C/mine",
    ],
)


@KEPT_UNLESS_EMPTY
def test_an_added_file_stays_where_only_empty_directories_are_removed(machine, path):
    install(machine)
    machine.plant(f"{HOME}/{path}", "mine")

    not_printed(remove(machine), f"DEL: /opt/corvan/zor/{path}")

    files = [p for p, node in machine.tree(HOME).items() if node.kind == "f"]
    assert files == [f"{HOME}/{path}"]
    assert not machine.exists("/etc/zor")


@KEPT_UNLESS_EMPTY
def test_by_known_places_an_added_file_is_deleted_there_too(machine, path):
    install(machine)
    without_index(machine)
    machine.plant(f"{HOME}/{path}", "mine")

    printed_lines(remove(machine), f"DEL: /opt/corvan/zor/{path}")

    same_text(machine.listing("/etc", "/opt", "/usr/kel"), LEFT)


@ORDERS
@pytest.mark.parametrize(
    "path",
    [
        "logs/deep/mine",
        "_uninst/deep/mine",
        "bin/etc/other/mine",
        "bin/etc/trawlhw/deep/mine",
        "bin/other/mine",
        "other/mine",
        "install/other/mine",
        "install/QMX_CLI/other/mine",
    ],
)
def test_an_added_directory_stays_where_only_files_are_deleted(machine, prepare, path):
    install(machine)
    prepare(machine)
    machine.plant(f"{HOME}/{path}", "mine")

    remove(machine)

    files = [p for p, node in machine.tree(HOME).items() if node.kind == "f"]
    assert files == [f"{HOME}/{path}"]
    assert not machine.exists("/etc/zor")


@ORDERS
def test_files_next_to_a_directory_that_stays_are_deleted(machine, prepare):
    install(machine)
    prepare(machine)
    machine.plant(HOME + "/logs/deep/mine", "mine")
    machine.plant(HOME + "/logs/log", "x")

    outcome = remove(machine)

    printed_lines(outcome, "DEL: /opt/corvan/zor/logs/log")
    not_printed(outcome, "RMDIR: /opt/corvan/zor/logs")
    assert machine.listing(HOME + "/logs").count("\n") == 3


def install_with_every_directory(machine):
    """Installs the toolkit, with every directory that a removal knows."""
    install(machine)
    for path in (
        "_uninst",
        "install/QMX_CLI/linux-ix86/bin",
        "install/QMX_CLI/linux-ix86/lib",
        "install/QMX_CLI/linux-ix86/msg_cat/C",
        "bin/etc/trawlhw",
        "bin/etc/trawluse",
        "bin/etc/trawlnet",
        "bin/etc/trawlfs",
        "bin/etc/trawlsw",
        "bin/etc/trawlvpd",
        "bin/plugins",
        "bin/customscanners",
        "logs",
    ):
        machine.make_directory(f"{HOME}/{path}")


@ORDERS
def test_empty_directories_of_the_layout_are_removed(machine, prepare):
    install_with_every_directory(machine)
    prepare(machine)

    remove(machine)

    same_text(machine.listing("/opt"), "d 0755 /opt\nd 0755 /opt/corvan\n")


def test_the_directories_are_removed_in_a_fixed_order_by_the_index(machine):
    install_with_every_directory(machine)

    # Those removed only if empty are removed without a message.
    printed_lines(
        remove(machine),
        "RM FILE: /opt/corvan/zor/zor.log.bak",
        "RMDIR: /opt/corvan/zor/_uninst",
        "RMDIR: /opt/corvan/zor/install/QMX_CLI/linux-ix86/msg_cat",
        "RMDIR: /opt/corvan/zor/install/QMX_CLI/linux-ix86",
        "RMDIR: /opt/corvan/zor/install/QMX_CLI",
        "RMDIR: /opt/corvan/zor/install",
        "RMDIR: /opt/corvan/zor/bin/etc/trawlhw",
        "RMDIR: /opt/corvan/zor/bin/etc/trawluse",
        "RMDIR: /opt/corvan/zor/bin/etc/trawlnet",
        "RMDIR: /opt/corvan/zor/bin/etc/trawlfs",
        "RMDIR: /opt/corvan/zor/bin/etc/trawlsw",
        "RMDIR: /opt/corvan/zor/bin/etc/trawlvpd",
        "RMDIR: /opt/corvan/zor/bin/etc",
        "RMDIR: /opt/corvan/zor/properties",
        "RMDIR: /opt/corvan/zor/config/xss",
        "RMDIR: /opt/corvan/zor/config",
        "RMDIR: /opt/corvan/zor/logs",
        "RMDIR: /opt/corvan/zor/cache_data",
        "RMDIR: /usr/kel/corvan/common/ZOR/logs",
    )


def test_the_directories_are_removed_in_a_fixed_order_by_known_places(machine):
    install_with_every_directory(machine)
    without_index(machine)

    outcome = remove(machine)

    same_lines(
        [line for line in outcome.stdout.splitlines() if line.startswith("RMDIR: ")],
        [
            "RMDIR: /opt/corvan/zor/_uninst",
            "RMDIR: /opt/corvan/zor/install/QMX_CLI/linux-ix86/bin",
            "RMDIR: /opt/corvan/zor/install/QMX_CLI/linux-ix86/lib",
            "RMDIR: /opt/corvan/zor/install/QMX_CLI/linux-ix86/msg_cat/C",
            "RMDIR: /opt/corvan/zor/install/QMX_CLI/linux-ix86/msg_cat",
            "RMDIR: /opt/corvan/zor/install/QMX_CLI/linux-ix86",
            "RMDIR: /opt/corvan/zor/install/QMX_CLI",
            "RMDIR: /opt/corvan/zor/install",
            "RMDIR: /opt/corvan/zor/bin/etc/trawlhw",
            "RMDIR: /opt/corvan/zor/bin/etc/trawluse",
            "RMDIR: /opt/corvan/zor/bin/etc/trawlnet",
            "RMDIR: /opt/corvan/zor/bin/etc/trawlfs",
            "RMDIR: /opt/corvan/zor/bin/etc/trawlsw",
            "RMDIR: /opt/corvan/zor/bin/etc/trawlvpd",
            "RMDIR: /opt/corvan/zor/bin/etc",
            "RMDIR: /opt/corvan/zor/bin/plugins",
            "RMDIR: /opt/corvan/zor/bin/customscanners",
            "RMDIR: /opt/corvan/zor/bin",
            "RMDIR: /opt/corvan/zor/properties",
            "RMDIR: /opt/corvan/zor/config/xss",
            "RMDIR: /opt/corvan/zor/config",
            "RMDIR: /opt/corvan/zor/logs",
            "RMDIR: /opt/corvan/zor/cache_data",
            "RMDIR: /opt/corvan/zor",
            "RMDIR: /usr/kel/corvan/common/ZOR/logs",
            "RMDIR: /usr/kel/corvan/common/ZOR",
            "RMDIR: /etc/zor",
        ],
    )


@ORDERS
@pytest.mark.parametrize("path", ["config/link", "cache_data/link", "logs/link"])
def test_a_link_is_deleted_and_its_target_kept(machine, prepare, path):
    install(machine)
    prepare(machine)
    machine.plant("/opt/precious/file", "kept")
    machine.link(f"{HOME}/{path}", "/opt/precious")

    remove(machine)

    assert machine.read("/opt/precious/file") == "kept"
    assert not machine.exists(HOME)


def test_a_linked_directory_of_the_layout_is_emptied_but_its_link_stays(machine):
    install(machine)
    machine.plant("/opt/logs/log", "x")
    machine.link(HOME + "/logs", "/opt/logs")

    outcome = remove(machine)

    printed_lines(outcome, "DEL: /opt/corvan/zor/logs/log")
    not_printed(outcome, "RMDIR: /opt/corvan/zor/logs")
    assert machine.tree("/opt/logs").keys() == {"/opt/logs"}
    assert machine.exists(HOME + "/logs")


def test_files_that_a_user_may_not_delete_stay_and_the_removal_succeeds(machine):
    install(machine, user=ANN)
    home = "/home/ann/corvan/zor"
    machine.change_mode(home + "/bin", 0o555)
    machine.change_mode(home + "/config/xss", 0o555)

    outcome = remove(machine, user=ANN)

    printed_lines(outcome, "RM FILE: /home/ann/corvan/zor/bin/trawlcfg")
    printed_lines(outcome, "DEL: /home/ann/corvan/zor/config/xss/schema.xss")
    same_text(
        machine.listing("/home/ann"),
        """\
d 0755 /home/ann
d 0755 /home/ann/corvan
d 0755 /home/ann/corvan/zor
d 0555 /home/ann/corvan/zor/bin
d 0777 /home/ann/corvan/zor/bin/etc
f 0755 /home/ann/corvan/zor/bin/libzorcore.so
f 0755 /home/ann/corvan/zor/bin/trawlcfg
f 0755 /home/ann/corvan/zor/bin/trawlfs
f 0755 /home/ann/corvan/zor/bin/trawlhw
d 0755 /home/ann/corvan/zor/config
d 0555 /home/ann/corvan/zor/config/xss
f 0755 /home/ann/corvan/zor/config/xss/schema.xss
""",
    )


def test_a_directory_that_a_user_may_not_read_stays(machine):
    install(machine, user=ANN)
    machine.plant("/home/ann/corvan/zor/cache_data/entry", "x")
    machine.change_mode("/home/ann/corvan/zor/cache_data", 0o300)

    not_printed(remove(machine, user=ANN), "cache_data")

    assert machine.mode("/home/ann/corvan/zor/cache_data") == 0o300


# The common directory and the registry's directory.


def test_files_of_the_common_log_directory_are_deleted(machine):
    install(machine)
    machine.plant("/usr/kel/corvan/common/ZOR/logs/log", "x")
    machine.plant("/usr/kel/corvan/common/ZOR/file", "x")

    printed_lines(
        remove(machine),
        "DEL: /usr/kel/corvan/common/ZOR/logs/log",
        "RMDIR: /usr/kel/corvan/common/ZOR/logs",
        "DEL: /usr/kel/corvan/common/ZOR/file",
        "RMDIR: /usr/kel/corvan/common/ZOR",
        "DEL: /etc/zor/zor.ini",
    )


def test_a_directory_in_the_common_log_directory_keeps_it(machine):
    install(machine)
    machine.plant("/usr/kel/corvan/common/ZOR/logs/deep/log", "kept")

    printed_lines(remove(machine), "RMDIR: /opt/corvan/zor/cache_data", "DEL: /etc/zor/zor.ini")

    assert machine.read("/usr/kel/corvan/common/ZOR/logs/deep/log") == "kept"


def test_other_products_in_the_common_directory_are_left_alone(machine):
    install(machine)
    machine.plant("/usr/kel/corvan/common/OTHER/file", "kept")
    machine.plant("/usr/kel/corvan/common/file", "kept")

    remove(machine)

    assert machine.read("/usr/kel/corvan/common/OTHER/file") == "kept"
    assert machine.read("/usr/kel/corvan/common/file") == "kept"


def test_a_missing_common_directory_is_ignored(machine):
    install(machine)
    machine.remove("/usr/kel")

    printed_lines(
        remove(machine),
        "RMDIR: /opt/corvan/zor/cache_data",
        "DEL: /etc/zor/zor.ini",
        "RMDIR: /etc/zor",
    )


def test_a_common_directory_that_the_administrator_chose_is_cleaned(machine):
    machine.plant("/etc/kel/corvan/common/cfg/log.properties", "corvan_common_dir=/srv/c\n")
    install(machine)
    machine.make_directory("/usr/kel/corvan/common/ZOR/logs")

    printed_lines(
        remove(machine), "RMDIR: /srv/c/ZOR/logs", "RMDIR: /srv/c/ZOR", "DEL: /etc/zor/zor.ini"
    )

    assert machine.exists("/srv/c")
    assert machine.exists("/usr/kel/corvan/common/ZOR/logs")


def test_a_removal_does_not_write_the_setting_of_the_common_directory(machine):
    install(machine)
    machine.remove("/etc/kel")

    printed_lines(remove(machine), "RMDIR: /usr/kel/corvan/common/ZOR/logs")

    assert not machine.exists("/etc/kel")


def test_a_registry_directory_that_is_not_empty_is_reported_as_removed_anyway(machine):
    install(machine)
    machine.plant("/etc/zor/other", "kept")

    printed_lines(
        remove(machine),
        "DEL: /etc/zor/zor.ini",
        "RMDIR: /etc/zor",
        "Uninstallation successful, removing temporary files",
    )

    assert machine.read("/etc/zor/other") == "kept"
    assert not machine.exists("/etc/zor/zor.ini")


def test_a_backup_of_the_registry_keeps_its_directory(machine):
    install(machine)
    machine.plant("/etc/zor/zor.ini.bak", "kept")

    remove(machine)

    assert machine.read("/etc/zor/zor.ini.bak") == "kept"


def test_after_the_removal_the_report_finds_nothing(machine):
    install(machine)

    remove(machine)

    printed_lines(machine.run("t"), "INI file = /etc/zor/zor.ini", "Not installed")


def test_a_second_removal_finds_nothing_to_remove(machine):
    install(machine)
    remove(machine)

    outcome = machine.run("r", "ABC")

    assert outcome.status == 1
    printed_lines(outcome, "*** Error: INI file not found: nothing to remove.", "Done.")


def test_a_removed_toolkit_can_be_installed_again(machine):
    install(machine)
    before = machine.tree("/opt", "/etc", "/usr/kel")
    remove(machine)

    install(machine)

    after = machine.tree("/opt", "/etc", "/usr/kel")
    for tree in (before, after):
        del tree[HOME + "/ZOR_files"]
    same_tree(after, before)


@pytest.mark.parametrize(
    "options",
    [
        ("-n",),
        ("-r",),
        ("-norollback",),
        ("-eeo", "-z"),
        ("-f", "provider_cache"),
        ("-c", "/var/trace"),
        ("-s", "/no/such.spb"),
    ],
)
def test_options_of_the_installation_change_nothing_in_a_removal(machine, options):
    install(machine)

    remove(machine, "ABC", *options)

    same_text(machine.listing("/etc", "/opt", "/usr/kel"), LEFT)
    assert not machine.exists("/var/trace")
