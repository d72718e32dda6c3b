"""Private mode: a copy of the toolkit for one product alone, in no registry."""

import pytest

from harness.checks import not_printed, printed, printed_lines, same_lines, same_text, same_tree
from harness.installations import HOMES, SETTINGS
from harness.machine import ANN, SPB

PRIVATE = "/opt/private"

TO_PRIVATE = "Target directory: /opt/private\n" + SETTINGS

NOT_FOUND = """\
Log file is: /opt/private/ZOR_files
currentZorHome = '/opt/private' currentCfgHome = '/opt/private'
*** Error: INI file not found: nothing to remove.
"""

PRIVATE_START = """\
Now perform privateMode
Performing private installation
Performing private installation to /opt/private
Performing fresh install on /opt/private (config=/opt/private/config)
Starting file extraction...
"""

PRIVATE_REST = """\
Extracting configs to '/opt/private/config'
Exec '/usr/sbin/selinuxenabled >/dev/null 2>&1' returned 32512
SELinux not enabled or not supported
Customizing property file: /opt/private/config/Zor.properties
Customizing property file: /opt/private/config/ZorTrace.properties
Updating file with variables /opt/private/install/trawlcfg.sh
Updating: /opt/private/install/trawlcfg.sh
Updating file with variables /opt/private/install/rmdirs.sh
Updating: /opt/private/install/rmdirs.sh
Created Corvan Common Dir='/usr/kel/corvan/common' result=0
Setting logs dir='/usr/kel/corvan/common/ZOR/logs'
Updating common trace path='/usr/kel/corvan/common' result=0
Exec '/opt/private/bin/trawlcfg -s common_trace_path /usr/kel/corvan/common/ZOR/logs \
>/dev/null 2>&1' returned 0
Setting common trace path='/usr/kel/corvan/common/ZOR/logs' result=0
PrivMode Action finished with RC: 0
Done.
"""

PRIVATE_STOPPED = """\
Exec '/opt/private/bin/trawlfs -shutdown >/dev/null 2>&1' returned 0
Exec '/opt/private/bin/trawlcfg -disable all >/dev/null 2>&1' returned 0
Exec '/opt/private/bin/trawlcfg -shutdown all -timeout 60 -force >/dev/null 2>&1' returned 0
Exec '/opt/private/bin/trawlcfg -shutdown all -timeout 120 >/dev/null 2>&1' returned 0
"""


def install(machine, *options, **how):
    """Installs privately for exploiter ABC, which must succeed."""
    outcome = machine.run("i", "ABC", "-s", SPB, "-d", PRIVATE, "-p", *options, **how)
    assert outcome.status == 0, outcome.stdout + outcome.stderr
    return outcome


def remove(machine, *options, **how):
    """Removes the private installation of exploiter ABC, which must succeed."""
    outcome = machine.run("r", "ABC", "-d", PRIVATE, "-p", *options, **how)
    assert outcome.status == 0, outcome.stdout + outcome.stderr
    return outcome


def install_shared(machine, exploiters="ABC:"):
    assert machine.run("i", "ABC", "-s", SPB).status == 0
    machine.register(exploiters=exploiters)


def test_a_private_installation_prints_its_progress(machine):
    printed(
        install(machine),
        "SPB file: /media/toolkit.spb\n"
        + TO_PRIVATE
        + """\
INI file not found or outdated (code=1)
Private mode enabled
Changing Global install to remove
"""
        + NOT_FOUND
        + PRIVATE_START
        + PRIVATE_REST,
    )


def test_a_private_installation_makes_its_tree_without_a_permission_pass(machine):
    install(machine)

    same_text(
        machine.listing("/etc", "/opt", "/usr/kel"),
        """\
d 0755 /etc
d 0775 /etc/kel
d 0775 /etc/kel/corvan
d 0775 /etc/kel/corvan/common
d 0775 /etc/kel/corvan/common/cfg
f 0664 /etc/kel/corvan/common/cfg/log.properties
d 0755 /opt
d 0755 /opt/private
f 0644 /opt/private/ZOR_files
d 0755 /opt/private/bin
d 0777 /opt/private/bin/etc
f 0755 /opt/private/bin/libzorcore.so
f 0755 /opt/private/bin/trawlcfg
f 0755 /opt/private/bin/trawlfs
f 0755 /opt/private/bin/trawlhw
d 0777 /opt/private/cache_data
d 0755 /opt/private/config
f 0755 /opt/private/config/Zor.properties
f 0755 /opt/private/config/ZorHWConfig.xml
f 0755 /opt/private/config/ZorTrace.properties
d 0755 /opt/private/config/xss
f 0755 /opt/private/config/xss/schema.xss
d 0750 /opt/private/install
f 0750 /opt/private/install/rmdirs.sh
f 0750 /opt/private/install/trawlcfg.sh
f 0666 /opt/private/install/zor_install.properties
d 0755 /opt/private/properties
f 0755 /opt/private/properties/scan.properties
d 0777 /usr/kel
d 0777 /usr/kel/corvan
d 0777 /usr/kel/corvan/common
d 0777 /usr/kel/corvan/common/ZOR
d 0777 /usr/kel/corvan/common/ZOR/logs
""",
    )


def test_a_private_installation_is_in_no_registry(machine):
    install(machine)

    assert not machine.exists("/etc/zor")
    printed_lines(machine.run("t"), "INI file = /etc/zor/zor.ini", "Not installed")


def test_a_private_installation_has_an_index_of_its_own(machine):
    install(machine)

    same_text(
        machine.index(PRIVATE),
        """\
# File created by ZOR: 22/12/02zor_9.2.30.0000 installed on TIME
/opt/private/bin/libzor.so
/opt/private/bin/libzorcore.so
/opt/private/bin/trawlcfg
/opt/private/bin/trawlfs
/opt/private/bin/trawlhw
/opt/private/config/SingleUserMode
/opt/private/config/Zor.properties
/opt/private/config/Zor.tmp
/opt/private/config/ZorHWConfig.xml
/opt/private/config/ZorTrace.properties
/opt/private/config/xss/schema.xss
/opt/private/install/rmdirs.sh
/opt/private/install/trawlcfg.sh
/opt/private/properties/scan.properties
/opt/private/zor.log
/opt/private/zor.log.bak
/opt/private/install/zor_install.properties
""",
    )


def test_a_private_installation_fills_in_its_directory(machine):
    install(machine)

    assert "\nfscanner.cache_dir=/opt/private/cache_data\n" in machine.read(
        PRIVATE + "/config/Zor.properties"
    )
    assert "\nZOR_HOME=/opt/private\n" in machine.read(PRIVATE + "/install/trawlcfg.sh")


def test_a_private_installation_records_its_install_type(machine):
    install(machine)

    assert machine.read(PRIVATE + "/install/zor_install.properties") == "ZOR_InstallType=global\n"


def test_the_given_directory_is_taken_with_its_final_slash(machine):
    outcome = machine.run("i", "ABC", "-s", SPB, "-d", "/opt/private/", "-p")

    assert outcome.status == 0
    printed_lines(
        outcome,
        "Log file is: /opt/private/ZOR_files",
        "currentZorHome = '/opt/private' currentCfgHome = '/opt/private'",
    )
    printed_lines(
        outcome,
        "Performing private installation to /opt/private/",
        "Performing fresh install on /opt/private/ (config=/opt/private/config)",
    )
    assert "\n/opt/private/bin/trawlcfg\n" in machine.index(PRIVATE)


def test_the_last_directory_is_the_private_one(machine):
    outcome = machine.run("i", "ABC", "-s", SPB, "-d", "/opt/a", "-p", "-d", "/opt/b")

    printed_lines(outcome, "Performing private installation to /opt/b")
    assert not machine.exists("/opt/a")
    assert machine.exists("/opt/b/bin/trawlcfg")


def test_a_private_installation_unregisters_the_exploiter_of_the_shared_one(machine):
    install_shared(machine, "ABC:XYZ:")

    printed(
        install(machine),
        "SPB file: /media/toolkit.spb\n"
        + TO_PRIVATE
        + """\
INI file found, verifying...
ZOR directory verified ok
Private mode enabled
Changing Global install to remove
"""
        + HOMES
        + """\
Exploiter list not empty, updating INI file only
Saving INI file to /etc/zor/zor.ini
Uninstallation successful, removing temporary files
"""
        + PRIVATE_START
        + PRIVATE_REST.replace("Setting logs dir='/usr/kel/corvan/common/ZOR/logs'\n", ""),
    )

    assert "\nZOR_Exploiters = XYZ:\n" in machine.read("/etc/zor/zor.ini")
    assert not machine.exists("/etc/zor/zor.ini.bak")
    assert machine.exists("/opt/corvan/zor/bin/trawlcfg")


def test_a_private_installation_of_the_last_exploiter_removes_the_shared_one(machine):
    install_shared(machine)

    outcome = install(machine)

    same_lines(
        outcome.commands,
        [
            "/opt/corvan/zor/bin/trawlfs [-shutdown]",
            "/opt/corvan/zor/bin/trawlcfg [-disable] [all]",
            "/opt/corvan/zor/bin/trawlcfg [-shutdown] [all] [-timeout] [60] [-force]",
            "/opt/corvan/zor/bin/trawlcfg [-shutdown] [all] [-timeout] [120]",
            "/opt/private/bin/trawlcfg [-s] [common_trace_path] [/usr/kel/corvan/common/ZOR/logs]",
        ],
    )
    printed_lines(
        outcome,
        "RMDIR: /etc/zor",
        "Uninstallation successful, removing temporary files",
        "Now perform privateMode",
    )
    assert not machine.exists("/opt/corvan/zor")
    assert machine.exists(PRIVATE + "/bin/trawlcfg")


def test_a_private_installation_leaves_a_shared_one_of_others_alone(machine):
    install_shared(machine, "XYZ:")
    before = machine.tree("/opt/corvan", "/etc")

    printed_lines(
        install(machine),
        "ZOR not installed for exploiter ABC, nothing to do",
        "Uninstallation successful, removing temporary files",
        "Now perform privateMode",
    )

    same_tree(machine.tree("/opt/corvan", "/etc"), before)


def test_a_broken_shared_installation_is_not_repaired_in_private_mode(machine):
    install_shared(machine)
    machine.remove("/opt/corvan/zor/bin/trawlcfg")
    before = machine.tree("/opt/corvan")

    outcome = install(machine)

    printed_lines(
        outcome,
        "*** Error: cannot find /opt/corvan/zor/bin/trawlcfg in INI home dir.",
        "Private mode enabled",
        "Changing Global install to remove",
        "Log file is: /opt/private/ZOR_files",
        "currentZorHome = '/opt/private' currentCfgHome = '/opt/private'",
        "*** Error: INI file not found: nothing to remove.",
        "Now perform privateMode",
    )
    same_tree(machine.tree("/opt/corvan"), before)


def test_the_install_type_of_the_directory_is_not_checked_in_private_mode(machine):
    machine.plant(PRIVATE + "/install/zor_install.properties", "ZOR_InstallType=local\n")

    not_printed(install(machine), "incompatible install type")


def test_a_per_user_private_installation_runs_no_command(machine):
    outcome = machine.run("i", "ABC", "-s", SPB, "-d", "/home/ann/private", "-p", user=ANN)

    assert outcome.status == 0
    same_lines(outcome.commands, [])
    assert (
        machine.read("/home/ann/private/install/zor_install.properties")
        == "ZOR_InstallType=local\n"
    )
    assert machine.mode("/home/ann/private/cache_data") == 0o770
    assert not machine.exists("/home/ann/.zor")


def test_a_private_installation_takes_a_custom_trace_directory(machine):
    outcome = install(machine, "-c", "/var/trace")

    printed_lines(
        outcome, "Setting logs dir='/var/trace'", "Updating common trace path='/var/trace' result=0"
    )
    same_lines(
        outcome.commands, ["/opt/private/bin/trawlcfg [-s] [common_trace_path] [/var/trace]"]
    )
    assert not machine.exists("/usr/kel")


def test_a_private_installation_takes_single_user_mode(machine):
    outcome = install(machine, "-r")

    printed_lines(
        outcome, "Creating single user mode flag file: /opt/private/config/SingleUserMode"
    )
    assert machine.mode(PRIVATE + "/cache_data") == 0o755
    assert machine.mode(PRIVATE + "/bin/etc") == 0o755
    assert machine.index(PRIVATE).endswith("\n/opt/private/config/SingleUserMode\n")


def test_a_file_in_the_way_of_a_private_installation_is_overwritten_in_place(machine):
    machine.plant(PRIVATE + "/bin/trawlhw", "older", 0o700)
    machine.plant(PRIVATE + "/bin/trawlhw.bak", "not ours")

    install(machine)

    assert machine.read_bytes(PRIVATE + "/bin/trawlhw") == b"\x7fELF hardware scanner\x00\xff"
    assert machine.read(PRIVATE + "/bin/trawlhw.bak") == "not ours"


def test_a_private_installation_can_be_made_twice_without_stopping_anything(machine):
    install(machine)
    first = machine.tree(PRIVATE)

    same_lines(
        install(machine).commands,
        ["/opt/private/bin/trawlcfg [-s] [common_trace_path] [/usr/kel/corvan/common/ZOR/logs]"],
    )

    second = machine.tree(PRIVATE)
    assert machine.index(PRIVATE).count("zor_install.properties\n") == 2
    for tree in (first, second):
        del tree[PRIVATE + "/ZOR_files"]
    same_tree(second, first)


def test_a_failing_private_installation_ends_with_its_code_and_stays_as_it_is(machine):
    machine.plant(PRIVATE + "/bin/trawlhw", "older")
    machine.pack({"properties/empty": b""})

    outcome = machine.run("i", "ABC", "-s", SPB, "-d", PRIVATE, "-p")

    assert outcome.status == 1
    assert outcome.stdout.endswith(
        PRIVATE_START
        + """\
File extraction failed, error = 1 (Cannot open file for reading)
Exec '/usr/sbin/selinuxenabled >/dev/null 2>&1' returned 32512
SELinux not enabled or not supported
PrivMode Action finished with RC: 1
Done.
"""
    )
    assert machine.read_bytes(PRIVATE + "/bin/trawlhw") == b"\x7fELF hardware scanner\x00\xff"
    assert machine.exists(PRIVATE + "/properties/scan.properties")
    assert not machine.exists(PRIVATE + "/ZOR_files")
    not_printed(outcome, "rolling back")


@pytest.mark.parametrize(
    "without, code", [(("config/Zor.properties",), 2), (("bin/trawlcfg",), 32512)]
)
def test_the_code_of_a_failing_private_installation_is_printed(machine, without, code):
    machine.pack(without=without)

    outcome = machine.run("i", "ABC", "-s", SPB, "-d", PRIVATE, "-p")

    assert outcome.status == 1
    assert outcome.stdout.endswith(f"PrivMode Action finished with RC: {code}\nDone.\n")


def test_a_failing_trace_path_command_fails_the_private_installation(machine):
    machine.let_commands_fail(("common_trace_path", 1))

    outcome = machine.run("i", "ABC", "-s", SPB, "-d", PRIVATE, "-p")

    assert outcome.status == 1
    assert outcome.stdout.endswith("PrivMode Action finished with RC: 256\nDone.\n")
    assert machine.exists(PRIVATE + "/bin/trawlcfg")


def test_a_failing_private_installation_has_unregistered_the_exploiter_anyway(machine):
    install_shared(machine, "ABC:XYZ:")

    outcome = machine.run("i", "ABC", "-s", "/no/such.spb", "-d", PRIVATE, "-p")

    assert outcome.status == 1
    assert "\nZOR_Exploiters = XYZ:\n" in machine.read("/etc/zor/zor.ini")


def test_a_private_removal_prints_its_progress(machine):
    install(machine)
    for name in ("bin", "config", "properties", "install"):
        if name != "bin":
            machine.remove(f"{PRIVATE}/{name}")
    for name in ("bin/etc", "bin/libzorcore.so", "bin/trawlhw", "ZOR_files", "cache_data"):
        machine.remove(f"{PRIVATE}/{name}")

    outcome = remove(machine)

    head, _, deleted = outcome.stdout.partition(PRIVATE_STOPPED)
    same_text(
        head,
        TO_PRIVATE
        + """\
INI file not found or outdated (code=1)
Private mode enabled
"""
        + NOT_FOUND
        + "Now perform privateMode\n",
    )
    same_lines(
        sorted(deleted.splitlines()[:2]) + deleted.splitlines()[2:],
        [
            "DEL: /opt/private/bin/trawlcfg",
            "DEL: /opt/private/bin/trawlfs",
            "RMDIR: /opt/private/bin",
            "RMDIR: /opt/private",
            "Performing private remove",
            "Done.",
        ],
    )


def test_a_private_removal_leaves_nothing_but_the_common_directories(machine):
    install(machine)
    machine.plant(PRIVATE + "/deep/er/mine", "mine")

    remove(machine)

    same_text(machine.listing("/opt"), "d 0755 /opt\n")
    assert machine.exists("/usr/kel/corvan/common/ZOR/logs")


def test_a_private_removal_stops_the_private_scanners(machine):
    install(machine)

    same_lines(
        remove(machine).commands,
        [
            "/opt/private/bin/trawlfs [-shutdown]",
            "/opt/private/bin/trawlcfg [-disable] [all]",
            "/opt/private/bin/trawlcfg [-shutdown] [all] [-timeout] [60] [-force]",
            "/opt/private/bin/trawlcfg [-shutdown] [all] [-timeout] [120]",
        ],
    )


def test_the_private_scanners_see_the_callers_library_path(machine):
    install(machine)
    before = len(machine.library_paths())

    remove(machine, environment={"LD_LIBRARY_PATH": "/x"})

    same_lines(machine.library_paths()[before:], ["/x"] * 4)


def test_a_private_removal_of_nothing_succeeds(machine):
    before = machine.tree()

    outcome = remove(machine)

    printed(
        outcome,
        TO_PRIVATE
        + """\
INI file not found or outdated (code=1)
Private mode enabled
"""
        + NOT_FOUND
        + "Now perform privateMode\n"
        + PRIVATE_STOPPED.replace("returned 0", "returned 32512")
        + "Performing private remove\nDone.\n",
    )
    same_tree(machine.tree(), before)


def test_failing_stop_commands_do_not_prevent_a_private_removal(machine):
    install(machine)
    machine.let_commands_fail(("trawl", 1))

    printed_lines(remove(machine), "Performing private remove", "Done.")

    assert not machine.exists(PRIVATE)


def test_a_private_removal_unregisters_the_exploiter_of_the_shared_one(machine):
    install(machine)
    install_shared(machine, "ABC:XYZ:")

    printed_lines(
        remove(machine),
        "Exploiter list not empty, updating INI file only",
        "Saving INI file to /etc/zor/zor.ini",
        "Uninstallation successful, removing temporary files",
        "Now perform privateMode",
        "Exec '/opt/private/bin/trawlfs -shutdown >/dev/null 2>&1' returned 0",
    )

    assert "\nZOR_Exploiters = XYZ:\n" in machine.read("/etc/zor/zor.ini")
    assert not machine.exists(PRIVATE)


def test_a_private_removal_succeeds_although_the_registry_could_not_be_saved(machine):
    install(machine)
    install_shared(machine, "ABC:XYZ:")
    machine.make_directory("/etc/zor/zor.ini.bak")

    printed_lines(
        remove(machine),
        "*** Error: could not open or write to INI file. Error = 2",
        "Now perform privateMode",
    )

    assert not machine.exists(PRIVATE)


def test_a_private_removal_does_not_follow_links(machine):
    install(machine)
    machine.plant("/opt/precious/file", "kept")
    machine.link(PRIVATE + "/link", "/opt/precious")

    remove(machine)

    assert machine.read("/opt/precious/file") == "kept"
    assert not machine.exists(PRIVATE)


def test_private_directories_that_a_user_may_not_empty_stay_and_the_removal_succeeds(machine):
    machine.plant("/home/ann/private/closed/file", "x")
    machine.plant("/home/ann/private/open/file", "x")
    machine.change_mode("/home/ann/private/closed", 0o555)

    outcome = machine.run("r", "ABC", "-d", "/home/ann/private", "-p", user=ANN)

    assert outcome.status == 0
    same_text(
        machine.listing("/home/ann"),
        """\
d 0755 /home/ann
d 0755 /home/ann/private
d 0555 /home/ann/private/closed
f 0644 /home/ann/private/closed/file
""",
    )


def test_in_debug_mode_a_private_installation_traces_its_extraction(machine):
    printed_lines(install(machine, "-v"), "Dst path: /opt/private/bin", "Mode: 493")
