"""What each option changes in a fresh installation."""

import pytest

from harness.checks import not_printed, printed, printed_lines, same_lines, same_text, same_tree
from harness.installations import FRESH_START, SHARED_INDEX, SHARED_TREE, tree_with
from harness.machine import ANN, SPB


def install(machine, *options, **how):
    """Installs for exploiter ABC; the installation must succeed."""
    outcome = machine.run("i", "ABC", "-s", SPB, *options, **how)
    assert outcome.status == 0, outcome.stdout + outcome.stderr
    return outcome


def test_the_package_is_looked_for_relative_to_the_working_directory(machine):
    machine.plant("/tmp/here.spb", machine.read_bytes(SPB))

    outcome = machine.run("i", "ABC", "-s", "here.spb")

    assert outcome.status == 0
    assert machine.exists("/opt/corvan/zor/bin/trawlcfg")


def test_the_last_package_wins(machine):
    assert machine.run("i", "ABC", "-s", "/no/such.spb", "-s", SPB).status == 0


def test_the_provider_goes_into_the_property_file(machine):
    install(machine, "-f", "provider_remote_cache2")

    assert "\nfscanner.default_provider=provider_remote_cache2\n" in machine.read(
        "/opt/corvan/zor/config/Zor.properties"
    )


def test_a_custom_trace_directory_takes_the_place_of_the_common_one(machine):
    outcome = install(machine, "-c", "/var/trace/zor")

    printed_lines(
        outcome,
        "SPB file: /media/toolkit.spb",
        "ZOR custom trace path: /var/trace/zor",
        "ZOR version: 22/12/02zor_9.2.30.0000",
    )
    printed_lines(
        outcome,
        "Saving INI file to /etc/zor/zor.ini",
        "Setting logs dir='/var/trace/zor'",
        "Updating common trace path='/var/trace/zor' result=0",
        "Exec '/opt/corvan/zor/bin/trawlcfg -s common_trace_path /var/trace/zor "
        ">/dev/null 2>&1' returned 0",
        "Setting common trace path='/var/trace/zor' result=0",
        "Installation successful, committing changes",
    )
    same_lines(
        outcome.commands, ["/opt/corvan/zor/bin/trawlcfg [-s] [common_trace_path] [/var/trace/zor]"]
    )


def test_a_custom_trace_directory_is_made_with_its_parents_for_everybody(machine):
    install(machine, "-c", "/var/trace/zor", umask=0o077)

    assert machine.mode("/var/trace") == 0o777
    assert machine.mode("/var/trace/zor") == 0o777


def test_a_custom_trace_directory_that_exists_is_left_as_it_is(machine):
    machine.make_directory("/var/trace", 0o700)

    outcome = install(machine, "-c", "/var/trace")

    not_printed(outcome, "Setting logs dir=")
    assert machine.mode("/var/trace") == 0o700


def test_with_a_custom_trace_directory_nothing_of_the_common_directory_is_made(machine):
    install(machine, "-c", "/var/trace")

    assert not machine.exists("/etc/kel")
    assert not machine.exists("/usr/kel")


def test_with_a_custom_trace_directory_the_scripts_still_name_the_common_one(machine):
    install(machine, "-c", "/var/trace")

    assert "\nCOMMON=/usr/kel/corvan/common\n" in machine.read(
        "/opt/corvan/zor/install/trawlcfg.sh"
    )


def test_with_a_custom_trace_directory_the_scripts_name_the_administrators_common_one(machine):
    machine.plant("/etc/kel/corvan/common/cfg/log.properties", "corvan_common_dir=/srv/c\n")

    install(machine, "-c", "/var/trace")

    assert "\nCOMMON=/srv/c\n" in machine.read("/opt/corvan/zor/install/trawlcfg.sh")
    assert not machine.exists("/srv")


def test_a_custom_trace_directory_with_a_blank_is_quoted(machine):
    outcome = install(machine, "-c", "/var/my trace")

    printed_lines(
        outcome,
        "Exec '/opt/corvan/zor/bin/trawlcfg -s common_trace_path "
        '"/var/my trace" >/dev/null 2>&1\' returned 0',
    )
    same_lines(
        outcome.commands, ["/opt/corvan/zor/bin/trawlcfg [-s] [common_trace_path] [/var/my trace]"]
    )


def test_an_empty_custom_trace_directory_makes_none(machine):
    outcome = install(machine, "-c", "")

    printed_lines(
        outcome,
        "Saving INI file to /etc/zor/zor.ini",
        "Updating common trace path='' result=0",
        "Exec '/opt/corvan/zor/bin/trawlcfg -s common_trace_path  >/dev/null 2>&1' returned 0",
        "Setting common trace path='' result=0",
    )


def test_a_per_user_installation_configures_a_custom_trace_directory(machine):
    outcome = install(machine, "-c", "/home/ann/trace", user=ANN)

    printed_lines(
        outcome,
        "Saving INI file to /home/ann/.zor/zor.ini",
        "Setting logs dir='/home/ann/trace'",
        "Updating common trace path='/home/ann/trace' result=0",
        "Exec '/home/ann/corvan/zor/bin/trawlcfg -s common_trace_path /home/ann/trace "
        ">/dev/null 2>&1' returned 0",
        "Setting common trace path='/home/ann/trace' result=0",
    )
    same_lines(
        outcome.commands,
        ["/home/ann/corvan/zor/bin/trawlcfg [-s] [common_trace_path] [/home/ann/trace]"],
    )


def test_a_skipped_registration_leaves_a_list_of_one_colon(machine):
    outcome = install(machine, "-n")

    printed_lines(outcome, "Register exploiter: no")
    same_text(
        machine.read("/etc/zor/zor.ini"),
        """\
ZOR_Version = 9.2.30.0000
ZOR_BuildDate = 22/12/02
ZOR_HomeDirectory = /opt/corvan/zor
ZOR_Exploiters = :
ZOR_ConfigRootDirectory = /opt/corvan/zor
""",
    )


SINGLE_USER_TREE = tree_with(
    SHARED_TREE,
    {
        "/etc/kel": "d 0755",
        "/etc/kel/corvan": "d 0755",
        "/etc/kel/corvan/common": "d 0755",
        "/etc/kel/corvan/common/cfg": "d 0755",
        "/opt/corvan/zor/bin/etc": "d 0755",
        "/opt/corvan/zor/cache_data": "d 0755",
        "/opt/corvan/zor/config/SingleUserMode": "f 0644",
        "/usr/kel": "d 0755",
        "/usr/kel/corvan": "d 0755",
        "/usr/kel/corvan/common": "d 0755",
        "/usr/kel/corvan/common/ZOR": "d 0755",
        "/usr/kel/corvan/common/ZOR/logs": "d 0755",
    },
)


@pytest.mark.parametrize("umask", [0o000, 0o022, 0o077])
def test_single_user_mode_closes_the_tree_whatever_the_process_umask_is(machine, umask):
    install(machine, "-r", umask=umask)

    same_text(machine.listing("/etc", "/opt", "/usr/kel"), SINGLE_USER_TREE)


def test_single_user_mode_leaves_an_empty_flag_file(machine):
    outcome = install(machine, "-r")

    printed_lines(
        outcome,
        "Saving INI file to /etc/zor/zor.ini",
        "Creating single user mode flag file: /opt/corvan/zor/config/SingleUserMode",
        "Created Corvan Common Dir='/usr/kel/corvan/common' result=0",
    )
    assert machine.read("/opt/corvan/zor/config/SingleUserMode") == ""


def test_the_flag_file_is_appended_to_the_index(machine):
    install(machine, "-r")

    same_text(
        machine.index("/opt/corvan/zor"), SHARED_INDEX + "/opt/corvan/zor/config/SingleUserMode\n"
    )


def test_without_single_user_mode_there_is_no_flag_file(machine):
    not_printed(install(machine), "ingle user mode")

    assert not machine.exists("/opt/corvan/zor/config/SingleUserMode")


def test_a_flag_file_in_the_target_switches_single_user_mode_on(machine):
    machine.plant("/opt/corvan/zor/config/SingleUserMode", "content is not read")

    outcome = install(machine, umask=0)

    printed_lines(
        outcome,
        "Single user mode file found",
        "Performing fresh install on /opt/corvan/zor (config=/opt/corvan/zor/config)",
    )
    not_printed(outcome, "Creating single user mode flag file")
    same_text(machine.listing("/etc", "/opt", "/usr/kel"), SINGLE_USER_TREE)
    same_text(machine.index("/opt/corvan/zor"), SHARED_INDEX)
    assert machine.read("/opt/corvan/zor/config/SingleUserMode") == "content is not read"


def test_a_flag_file_of_the_package_comes_too_late_for_its_own_installation(machine):
    machine.pack({"config/SingleUserMode": b"x"})

    not_printed(install(machine), "Single user mode file found")

    assert machine.mode("/opt/corvan/zor/cache_data") == 0o777


def test_an_unreadable_flag_file_counts_as_none(machine):
    machine.plant("/home/ann/corvan/zor/config/SingleUserMode", "", 0)

    not_printed(install(machine, user=ANN), "Single user mode file found")

    assert machine.mode("/home/ann/corvan/zor/bin/etc") == 0o777


def test_a_flag_file_that_cannot_be_made_is_ignored(machine):
    machine.pack({"config/SingleUserMode/": b""})

    outcome = install(machine, "-r")

    printed_lines(
        outcome,
        "Creating single user mode flag file: /opt/corvan/zor/config/SingleUserMode",
        "Unable to create single user mode flag file",
        "Created Corvan Common Dir='/usr/kel/corvan/common' result=0",
    )
    same_text(machine.index("/opt/corvan/zor"), SHARED_INDEX)


def test_single_user_mode_opens_a_shared_home_directory_that_was_there(machine):
    machine.make_directory("/opt/corvan/zor", 0o700)

    install(machine, "-r")

    assert machine.mode("/opt/corvan/zor") == 0o755


def test_single_user_mode_keeps_a_per_user_home_directory_that_was_there(machine):
    machine.make_directory("/home/ann/corvan/zor", 0o700)

    install(machine, "-r", user=ANN)

    assert machine.mode("/home/ann/corvan/zor") == 0o700


def test_single_user_mode_of_a_user_leaves_the_cache_open_to_the_group(machine):
    install(machine, "-r", user=ANN)

    assert machine.mode("/home/ann/corvan/zor/cache_data") == 0o770
    assert machine.mode("/home/ann/corvan/zor/bin/etc") == 0o755


def test_single_user_mode_sets_each_new_level_of_the_trace_directory(machine):
    install(machine, "-r", "-c", "/var/a/b/c", umask=0o077)

    assert [machine.mode(path) for path in ("/var/a", "/var/a/b", "/var/a/b/c")] == [0o755] * 3


def test_single_user_mode_keeps_the_levels_of_the_trace_directory_that_were_there(machine):
    machine.make_directory("/var/a", 0o700)

    install(machine, "-r", "-c", "/var/a/b")

    assert machine.mode("/var/a") == 0o700
    assert machine.mode("/var/a/b") == 0o755


def test_single_user_mode_sets_a_logs_directory_that_was_there(machine):
    machine.make_directory("/opt/corvan/zor/logs", 0o777)
    machine.make_directory("/opt/corvan/zor/bin/customscanners", 0o777)

    install(machine, "-r")

    assert machine.mode("/opt/corvan/zor/logs") == 0o755
    assert machine.mode("/opt/corvan/zor/bin/customscanners") == 0o755


IMAGE = "/home/zorbuild/zor_src_dir/ZOR/zor_pkgs/images/linux-ix86"

TRACED = f"""\
Src path: {IMAGE}/bin/
Dst path: /opt/corvan/zor/bin
Mode: 493
Looking at file {IMAGE}/bin/ inside spb
dstName: /opt/corvan/zor/bin/
createPath: /opt/corvan/zor/bin/
Looking at file {IMAGE}/bin/trawlcfg inside spb
dstName: /opt/corvan/zor/bin/trawlcfg
extractFile: /opt/corvan/zor/bin/trawlcfg
Looking at file {IMAGE}/config/ inside spb
Looking at file {IMAGE}/config/Zor.properties inside spb
Looking at file {IMAGE}/config/ZorTrace.properties inside spb
Looking at file {IMAGE}/config/xss/ inside spb
Looking at file {IMAGE}/config/xss/schema.xss inside spb
Looking at file {IMAGE}/install/ inside spb
Looking at file {IMAGE}/install/rmdirs.sh inside spb
Src path: {IMAGE}/properties/
Dst path: /opt/corvan/zor/properties
Mode: 493
Looking at file {IMAGE}/bin/ inside spb
Looking at file {IMAGE}/bin/trawlcfg inside spb
Looking at file {IMAGE}/config/ inside spb
Looking at file {IMAGE}/config/Zor.properties inside spb
Looking at file {IMAGE}/config/ZorTrace.properties inside spb
Looking at file {IMAGE}/config/xss/ inside spb
Looking at file {IMAGE}/config/xss/schema.xss inside spb
Looking at file {IMAGE}/install/ inside spb
Looking at file {IMAGE}/install/rmdirs.sh inside spb
"""

TRACED_LATER = f"""\
Src path: {IMAGE}/config/xss/
Dst path: /opt/corvan/zor/config/xss
Mode: 493
Looking at file {IMAGE}/bin/ inside spb
Looking at file {IMAGE}/bin/trawlcfg inside spb
Looking at file {IMAGE}/config/ inside spb
Looking at file {IMAGE}/config/Zor.properties inside spb
Looking at file {IMAGE}/config/ZorTrace.properties inside spb
Looking at file {IMAGE}/config/xss/ inside spb
dstName: /opt/corvan/zor/config/xss/
createPath: /opt/corvan/zor/config/xss/
Looking at file {IMAGE}/config/xss/schema.xss inside spb
dstName: /opt/corvan/zor/config/xss/schema.xss
extractFile: /opt/corvan/zor/config/xss/schema.xss
Looking at file {IMAGE}/install/ inside spb
Looking at file {IMAGE}/install/rmdirs.sh inside spb
Src path: {IMAGE}/install/
Dst path: /opt/corvan/zor/install
Mode: 488
Looking at file {IMAGE}/bin/ inside spb
Looking at file {IMAGE}/bin/trawlcfg inside spb
Looking at file {IMAGE}/config/ inside spb
Looking at file {IMAGE}/config/Zor.properties inside spb
Looking at file {IMAGE}/config/ZorTrace.properties inside spb
Looking at file {IMAGE}/config/xss/ inside spb
Looking at file {IMAGE}/config/xss/schema.xss inside spb
Looking at file {IMAGE}/install/ inside spb
dstName: /opt/corvan/zor/install/
createPath: /opt/corvan/zor/install/
Looking at file {IMAGE}/install/rmdirs.sh inside spb
dstName: /opt/corvan/zor/install/rmdirs.sh
extractFile: /opt/corvan/zor/install/rmdirs.sh
"""

LEFT_OUT_OF_THE_TRACED_PACKAGE = (
    "bin/trawlfs",
    "bin/trawlhw",
    "bin/libzorcore.so",
    "properties/",
    "properties/scan.properties",
    "config/ZorHWConfig.xml",
    "install/trawlcfg.sh",
)


def test_debug_mode_traces_the_extraction_and_shows_what_commands_print(machine):
    machine.pack(without=LEFT_OUT_OF_THE_TRACED_PACKAGE)

    outcome = machine.run("i", "ABC", "-s", SPB, "-v")

    printed(
        outcome,
        FRESH_START
        + f"""\
{TRACED}Extracting configs to '/opt/corvan/zor/config'
{TRACED_LATER}Exec '/usr/sbin/selinuxenabled' returned 32512
SELinux not enabled or not supported
Customizing property file: /opt/corvan/zor/config/Zor.properties
Customizing property file: /opt/corvan/zor/config/ZorTrace.properties
Updating file with variables /opt/corvan/zor/install/trawlcfg.sh
Script does not exist /opt/corvan/zor/install/trawlcfg.sh
Updating file with variables /opt/corvan/zor/install/rmdirs.sh
Updating: /opt/corvan/zor/install/rmdirs.sh
Saving INI file to /etc/zor/zor.ini
Created Corvan Common Dir='/usr/kel/corvan/common' result=0
Setting logs dir='/usr/kel/corvan/common/ZOR/logs'
Updating common trace path='/usr/kel/corvan/common' result=0
Setting 'LD_LIBRARY_PATH' to 'LD_LIBRARY_PATH=/opt/corvan/zor/bin'
scanner control output: -s common_trace_path /usr/kel/corvan/common/ZOR/logs
Exec '/opt/corvan/zor/bin/trawlcfg -s common_trace_path /usr/kel/corvan/common/ZOR/logs' returned 0
Setting common trace path='/usr/kel/corvan/common/ZOR/logs' result=0
Installation successful, committing changes
Done.
""",
        stderr="""\
sh: 1: /usr/sbin/selinuxenabled: not found
scanner control error: -s common_trace_path /usr/kel/corvan/common/ZOR/logs
""",
    )


def test_debug_traces_of_the_extraction_go_to_standard_output_despite_a_log_file(machine):
    machine.pack(without=LEFT_OUT_OF_THE_TRACED_PACKAGE)

    outcome = machine.run("i", "ABC", "-o", "/tmp/log", "-s", SPB, "-v")

    same_text(
        outcome.stdout,
        TRACED
        + TRACED_LATER
        + "scanner control output: -s common_trace_path /usr/kel/corvan/common/ZOR/logs\n",
    )
    assert "\nSetting 'LD_LIBRARY_PATH' to 'LD_LIBRARY_PATH=/opt/corvan/zor/bin'\n" in machine.read(
        "/tmp/log"
    )


def test_debug_mode_installs_the_same(machine):
    install(machine, "-v")

    same_text(machine.listing("/etc", "/opt", "/usr/kel"), SHARED_TREE)


@pytest.mark.parametrize("options", [("-norollback",), ("-eeo", "-z"), ("-eeo", "-g")])
def test_options_about_failures_change_nothing_in_an_installation_that_succeeds(machine, options):
    install(machine, *options)

    same_text(machine.listing("/etc", "/opt", "/usr/kel"), SHARED_TREE)
    same_text(machine.index("/opt/corvan/zor"), SHARED_INDEX)


def test_root_can_install_for_itself_alone(machine):
    before = machine.tree("/opt")

    outcome = install(machine, "-eeo", "-l")

    printed_lines(
        outcome,
        "Install type: local",
        "Register exploiter: yes",
        "Default dest: /root/corvan/zor",
        "INI location: /root/.zor/zor.ini",
    )
    same_lines(outcome.commands, [])
    same_tree(machine.tree("/opt"), before)
    assert "\nZOR_HomeDirectory = /root/corvan/zor\n" in machine.read("/root/.zor/zor.ini")
