"""A fresh installation, shared and per-user: transcript, tree, bytes, registry, commands."""

import pytest

from harness.checks import not_printed, printed, printed_lines, same_lines, same_text
from harness.installations import ANNS_TREE, SHARED_INDEX, SHARED_TRANSCRIPT, SHARED_TREE
from harness.machine import ANN, ROOT, SPB, STRANGER


def install(machine, *options, **how):
    """Installs for exploiter ABC; the installation must succeed."""
    outcome = machine.run("i", "ABC", "-s", SPB, *options, **how)
    assert outcome.status == 0, outcome.stdout + outcome.stderr
    return outcome


def test_a_shared_installation_prints_its_progress(machine):
    printed(machine.run("i", "ABC", "-s", SPB), SHARED_TRANSCRIPT)


def test_a_shared_installation_makes_its_tree(machine):
    install(machine)

    same_text(machine.listing("/etc", "/opt", "/usr/kel"), SHARED_TREE)


def test_a_reader_of_the_output_that_goes_away_does_not_end_the_installation(machine):
    script = """
        mkfifo /tmp/output
        (exec 4</tmp/output) &
        exec 3>/tmp/output
        wait
        "$0" "$@" >&3
        echo "status $?"
    """

    outcome = machine.run_in_shell(script, "i", "ABC", "-s", SPB)

    same_text(outcome.stdout, "status 0\n")
    same_text(machine.listing("/etc", "/opt", "/usr/kel"), SHARED_TREE)


def test_a_shared_installation_leaves_homes_and_temporary_directory_alone(machine):
    before = machine.tree("/home", "/root", "/tmp")

    install(machine)

    assert machine.tree("/home", "/root", "/tmp") == before


def test_the_packages_files_arrive_byte_by_byte(machine):
    install(machine)

    assert machine.read_bytes("/opt/corvan/zor/bin/libzorcore.so") == b"core library\n" * 700
    assert machine.read_bytes("/opt/corvan/zor/bin/trawlhw") == b"\x7fELF hardware scanner\x00\xff"
    assert machine.read_bytes("/opt/corvan/zor/properties/scan.properties") == b"depth=4\n"
    assert machine.read_bytes("/opt/corvan/zor/config/ZorHWConfig.xml") == b"<hardware/>\n"
    assert machine.read_bytes("/opt/corvan/zor/config/xss/schema.xss") == b"<schema/>\n"


def test_the_index_lists_the_packages_files_and_the_installers_own(machine):
    install(machine)

    same_text(machine.index("/opt/corvan/zor"), SHARED_INDEX)


def test_the_registry_holds_the_installation(machine):
    install(machine)

    same_text(
        machine.read("/etc/zor/zor.ini"),
        """\
ZOR_Version = 9.2.30.0000
ZOR_BuildDate = 22/12/02
ZOR_HomeDirectory = /opt/corvan/zor
ZOR_Exploiters = ABC:
ZOR_ConfigRootDirectory = /opt/corvan/zor
""",
    )


def test_the_setting_of_the_common_directory_is_written(machine):
    install(machine)

    same_text(
        machine.read("/etc/kel/corvan/common/cfg/log.properties"),
        "corvan_common_dir=/usr/kel/corvan/common\n",
    )


def test_the_install_type_of_a_shared_installation_is_recorded(machine):
    install(machine)

    same_text(
        machine.read("/opt/corvan/zor/install/zor_install.properties"), "ZOR_InstallType=global\n"
    )


def test_the_main_property_file_is_filled_in(machine):
    install(machine)

    same_text(
        machine.read("/opt/corvan/zor/config/Zor.properties"),
        """\
# Settings of the toolkit
version=9.2.30.0000
build_date=22/12/02

trace_level=3
trace_file_path=/opt/corvan/zor/logs
trace_file=zor.log
fscanner.default_provider=provider_cache
fscanner.cache_dir=/opt/corvan/zor/cache_data
common_dir=$(CorvanCommonDir)
two=/opt/corvan/zor:/opt/corvan/zor
""",
    )


def test_the_trace_property_file_is_filled_in(machine):
    install(machine)

    same_text(
        machine.read("/opt/corvan/zor/config/ZorTrace.properties"),
        """\
handlers.traceFile.fileName=/opt/corvan/zor/logs/default.log
zor.loggers.trcLogger.level=DEBUG_MIN
config.root=/opt/corvan/zor
unknown=$(NoSuchPlaceholder)
separator=$(FileSeparator)
""",
    )


def test_the_scripts_are_filled_in(machine):
    install(machine)

    same_text(
        machine.read("/opt/corvan/zor/install/trawlcfg.sh"),
        """\
#!/bin/sh
ZOR_HOME=/opt/corvan/zor
PAIR=/opt/corvan/zor:/opt/corvan/zor
ZOR_CONFIG=/opt/corvan/zor
COMMON=/usr/kel/corvan/common
OTHER=$(NoSuchPlaceholder)
""",
    )
    same_text(
        machine.read("/opt/corvan/zor/install/rmdirs.sh"),
        """\
#!/bin/sh
rmdir "/opt/corvan/zor/cache_data" "/usr/kel/corvan/common/ZOR"
""",
    )


def test_the_toolkits_trace_directory_is_configured_once(machine):
    same_lines(
        install(machine).commands,
        [
            "/opt/corvan/zor/bin/trawlcfg [-s] [common_trace_path] "
            "[/usr/kel/corvan/common/ZOR/logs]"
        ],
    )


def test_a_per_user_installation_prints_its_progress(machine):
    printed(
        machine.run("i", "ABC", "-s", SPB, user=ANN),
        """\
SPB file: /media/toolkit.spb
ZOR version: 22/12/02zor_9.2.30.0000
Install type: local
Register exploiter: yes
Default dest: /home/ann/corvan/zor
INI location: /home/ann/.zor/zor.ini
Looking for INI file: /home/ann/.zor/zor.ini
INI file not found or outdated (code=1)
Log file is: /home/ann/corvan/zor/ZOR_files
currentZorHome = '/home/ann/corvan/zor' currentCfgHome = '/home/ann/corvan/zor'
Loading file /home/ann/corvan/zor/install/zor_install.properties \
error: 2 (No such file or directory)
Performing fresh install on /home/ann/corvan/zor (config=/home/ann/corvan/zor/config)
Starting file extraction...
Extracting configs to '/home/ann/corvan/zor/config'
Exec '/usr/sbin/selinuxenabled >/dev/null 2>&1' returned 32512
SELinux not enabled or not supported
Customizing property file: /home/ann/corvan/zor/config/Zor.properties
Customizing property file: /home/ann/corvan/zor/config/ZorTrace.properties
Updating file with variables /home/ann/corvan/zor/install/trawlcfg.sh
Updating: /home/ann/corvan/zor/install/trawlcfg.sh
Updating file with variables /home/ann/corvan/zor/install/rmdirs.sh
Updating: /home/ann/corvan/zor/install/rmdirs.sh
Saving INI file to /home/ann/.zor/zor.ini
Installation successful, committing changes
Done.
""",
    )


def test_a_per_user_installation_makes_its_tree(machine):
    install(machine, user=ANN)

    same_text(machine.listing("/home"), "d 0755 /home\n" + ANNS_TREE)


def test_a_per_user_installation_is_registered_in_the_home_directory(machine):
    install(machine, user=ANN)

    same_text(
        machine.read("/home/ann/.zor/zor.ini"),
        """\
ZOR_Version = 9.2.30.0000
ZOR_BuildDate = 22/12/02
ZOR_HomeDirectory = /home/ann/corvan/zor
ZOR_Exploiters = ABC:
ZOR_ConfigRootDirectory = /home/ann/corvan/zor
""",
    )


def test_the_install_type_of_a_per_user_installation_is_recorded(machine):
    install(machine, user=ANN)

    same_text(
        machine.read("/home/ann/corvan/zor/install/zor_install.properties"),
        "ZOR_InstallType=local\n",
    )


def test_a_per_user_installation_never_runs_the_scanner_control(machine):
    same_lines(install(machine, user=ANN).commands, [])


def test_a_per_user_installation_needs_nothing_of_the_shared_places(machine):
    before = machine.tree("/etc", "/opt")

    install(machine, user=ANN)

    assert machine.tree("/etc", "/opt") == before
    assert not machine.exists("/usr/kel")


def test_a_per_user_installation_of_root_writes_the_setting_of_the_common_directory(machine):
    install(machine, "-eeo", "-l")

    same_text(
        machine.listing("/etc", "/opt"),
        """\
d 0755 /etc
d 0775 /etc/kel
d 0775 /etc/kel/corvan
d 0775 /etc/kel/corvan/common
d 0775 /etc/kel/corvan/common/cfg
f 0664 /etc/kel/corvan/common/cfg/log.properties
d 0755 /opt
""",
    )
    assert not machine.exists("/usr/kel")


def test_a_per_user_installation_of_root_ends_with_a_closed_cache_directory(machine):
    install(machine, "-eeo", "-l")

    assert machine.mode("/root/corvan/zor/cache_data") == 0o770
    assert (
        machine.read("/root/corvan/zor/install/zor_install.properties") == "ZOR_InstallType=local\n"
    )


def test_a_user_without_a_home_directory_installs_into_the_shared_places_if_allowed(machine):
    outcome = install(machine, user=STRANGER, everywhere=True)

    printed_lines(
        outcome,
        "Saving INI file to /etc/zor/zor.ini",
        "Installation successful, committing changes",
    )
    assert machine.mode("/opt/corvan/zor/cache_data") == 0o770
    assert (
        machine.read("/opt/corvan/zor/install/zor_install.properties") == "ZOR_InstallType=local\n"
    )


def test_a_user_without_rights_to_the_shared_places_fails_and_leaves_nothing(machine):
    before = machine.tree()

    outcome = machine.run("i", "ABC", "-s", SPB, "-eeo", "-g", user=ANN)

    assert outcome.status == 1
    printed_lines(
        outcome,
        "Starting file extraction...",
        "Warning! Failed to create install log file: /opt/corvan/zor/ZOR_files",
        "Bin dir file extraction failed",
        "File extraction failed, error = 11 (Cannot create directory)",
    )
    printed_lines(outcome, "Installation failed, rolling back", "Done.")
    assert machine.tree() == before


def test_a_user_who_may_write_everywhere_makes_a_shared_cache_directory(machine):
    install(machine, "-eeo", "-g", user=ANN, everywhere=True)

    assert machine.mode("/opt/corvan/zor/cache_data") == 0o777


def test_a_given_directory_is_made_with_its_parents(machine):
    outcome = install(machine, "-d", "/opt/a/b/c/")

    printed_lines(outcome, "Performing fresh install on /opt/a/b/c (config=/opt/a/b/c/config)")
    assert machine.mode("/opt/a") == 0o755
    assert machine.mode("/opt/a/b") == 0o755
    assert machine.mode("/opt/a/b/c") == 0o755
    assert "\nZOR_HomeDirectory = /opt/a/b/c\n" in machine.read("/etc/zor/zor.ini")
    assert "\nZOR_ConfigRootDirectory = /opt/a/b/c\n" in machine.read("/etc/zor/zor.ini")
    assert "\nfscanner.cache_dir=/opt/a/b/c/cache_data\n" in machine.read(
        "/opt/a/b/c/config/Zor.properties"
    )


def test_the_mode_of_a_home_directory_that_was_there_is_kept(machine):
    machine.make_directory("/opt/corvan/zor", 0o700)

    install(machine)

    assert machine.mode("/opt/corvan/zor") == 0o700


def test_files_that_are_not_the_toolkits_stay(machine):
    machine.plant("/opt/corvan/zor/bin/mine", "my own", 0o600)

    install(machine)

    assert machine.read("/opt/corvan/zor/bin/mine") == "my own"
    assert machine.mode("/opt/corvan/zor/bin/mine") == 0o600
    assert "/opt/corvan/zor/bin/mine\n" not in machine.index("/opt/corvan/zor")


def test_a_file_in_the_way_is_replaced_and_its_backup_deleted(machine):
    machine.plant("/opt/corvan/zor/bin/trawlhw", "older", 0o600)

    install(machine)

    assert machine.read_bytes("/opt/corvan/zor/bin/trawlhw") == b"\x7fELF hardware scanner\x00\xff"
    assert machine.mode("/opt/corvan/zor/bin/trawlhw") == 0o755
    assert not machine.exists("/opt/corvan/zor/bin/trawlhw.bak")


def test_an_older_backup_of_a_replaced_file_is_lost(machine):
    machine.plant("/opt/corvan/zor/bin/trawlhw", "older")
    machine.plant("/opt/corvan/zor/bin/trawlhw.bak", "oldest")

    install(machine)

    assert not machine.exists("/opt/corvan/zor/bin/trawlhw.bak")


def test_a_backup_of_a_file_that_is_not_replaced_stays(machine):
    machine.plant("/opt/corvan/zor/bin/trawlhw.bak", "not ours")

    install(machine)

    assert machine.read("/opt/corvan/zor/bin/trawlhw.bak") == "not ours"


def test_an_invalid_registry_is_replaced_completely(machine):
    machine.plant(
        "/etc/zor/zor.ini",
        "ZOR_Exploiters = OLD:\nZOR_ConfigRootDirectory = /old\n"
        "ZOR_BuildDate = 99/01/01\nZOR_HomeDirectory = /old\n"
        "ZOR_Version = 7.x\n",
        0o600,
    )

    outcome = install(machine)

    printed_lines(
        outcome, "INI file not found or outdated (code=3)", "Log file is: /opt/corvan/zor/ZOR_files"
    )
    same_text(
        machine.read("/etc/zor/zor.ini"),
        """\
ZOR_Version = 9.2.30.0000
ZOR_BuildDate = 22/12/02
ZOR_HomeDirectory = /opt/corvan/zor
ZOR_Exploiters = ABC:
ZOR_ConfigRootDirectory = /opt/corvan/zor
""",
    )
    assert machine.mode("/etc/zor/zor.ini") == 0o644
    assert not machine.exists("/etc/zor/zor.ini.bak")


@pytest.mark.parametrize("exploiter", ["A", "com.corvan.product", "with blank", "-s"])
def test_every_identifier_without_a_colon_is_registered(machine, exploiter):
    assert machine.run("i", exploiter, "-s", SPB).status == 0

    assert f"\nZOR_Exploiters = {exploiter}:\n" in machine.read("/etc/zor/zor.ini")


def test_missing_scripts_are_reported_and_ignored(machine):
    machine.pack(without=("install/trawlcfg.sh", "install/rmdirs.sh"))

    outcome = install(machine)

    printed_lines(
        outcome,
        "Updating file with variables /opt/corvan/zor/install/trawlcfg.sh",
        "Script does not exist /opt/corvan/zor/install/trawlcfg.sh",
        "Updating file with variables /opt/corvan/zor/install/rmdirs.sh",
        "Script does not exist /opt/corvan/zor/install/rmdirs.sh",
        "Saving INI file to /etc/zor/zor.ini",
    )


def test_an_install_type_file_that_cannot_be_written_is_ignored(machine):
    machine.pack({"install/zor_install.properties/": b""})

    outcome = install(machine)

    printed_lines(
        outcome,
        "Saving INI file to /etc/zor/zor.ini",
        "Could not create file /opt/corvan/zor/install/zor_install.properties",
        "Created Corvan Common Dir='/usr/kel/corvan/common' result=0",
    )
    assert "zor_install.properties\n" not in machine.index("/opt/corvan/zor")


def test_the_install_directory_is_made_when_the_package_has_none(machine):
    machine.pack(without=("install/", "install/trawlcfg.sh", "install/rmdirs.sh"))

    install(machine, user=ANN)

    assert machine.mode("/home/ann/corvan/zor/install") == 0o750
    assert (
        machine.read("/home/ann/corvan/zor/install/zor_install.properties")
        == "ZOR_InstallType=local\n"
    )


def test_an_existing_common_directory_and_log_directory_are_used_as_they_are(machine):
    machine.make_directory("/usr/kel/corvan/common/ZOR/logs", 0o700)

    outcome = install(machine)

    printed_lines(
        outcome,
        "Created Corvan Common Dir='/usr/kel/corvan/common' result=0",
        "Updating common trace path='/usr/kel/corvan/common' result=0",
    )
    not_printed(outcome, "Setting logs dir=")
    assert machine.mode("/usr/kel/corvan/common/ZOR/logs") == 0o700


def test_a_common_directory_that_the_administrator_chose_is_used(machine):
    machine.plant(
        "/etc/kel/corvan/common/cfg/log.properties", "corvan_common_dir = /opt/c d \n", 0o600
    )

    outcome = install(machine)

    printed_lines(
        outcome,
        "Created Corvan Common Dir='/opt/c d' result=0",
        "Setting logs dir='/opt/c d/ZOR/logs'",
        "Updating common trace path='/opt/c d' result=0",
        'Exec \'/opt/corvan/zor/bin/trawlcfg -s common_trace_path "/opt/c d/ZOR/logs" '
        ">/dev/null 2>&1' returned 0",
        "Setting common trace path='/opt/c d/ZOR/logs' result=0",
    )
    same_lines(
        outcome.commands,
        ["/opt/corvan/zor/bin/trawlcfg [-s] [common_trace_path] [/opt/c d/ZOR/logs]"],
    )
    assert (
        machine.read("/etc/kel/corvan/common/cfg/log.properties")
        == "corvan_common_dir = /opt/c d \n"
    )
    assert machine.mode("/etc/kel/corvan/common/cfg/log.properties") == 0o600
    assert "\nCOMMON=/opt/c d\n" in machine.read("/opt/corvan/zor/install/trawlcfg.sh")
    assert not machine.exists("/usr/kel")


def test_a_common_directory_that_cannot_be_made_is_ignored(machine):
    machine.plant("/usr/kel/corvan", "a file")

    outcome = install(machine)

    printed_lines(
        outcome,
        "Created Corvan Common Dir='/usr/kel/corvan/common' result=11",
        "Setting logs dir='/usr/kel/corvan/common/ZOR/logs'",
        "Updating common trace path='/usr/kel/corvan/common' result=0",
    )
    printed_lines(outcome, "Installation successful, committing changes")


def test_a_setting_file_that_cannot_be_written_is_ignored(machine):
    machine.plant("/etc/kel", "a file")

    outcome = install(machine)

    printed_lines(outcome, "Created Corvan Common Dir='/usr/kel/corvan/common' result=0")
    assert machine.read("/etc/kel") == "a file"


@pytest.mark.parametrize(
    "path, mode",
    [
        ("bin/customscanners", 0o777),
        ("bin/etc", 0o777),
        ("bin/etc/trawlfs", 0o777),
        ("bin/etc/trawlhw", 0o777),
        ("bin/etc/trawlvpd", 0o777),
        ("bin/etc/trawlsw", 0o777),
        ("bin/etc/trawlcfg", 0o777),
        ("bin/plugins", 0o755),
        ("logs", 0o777),
        ("_uninst", 0o750),
        ("cache_data", 0o777),
        ("config", 0o755),
        ("config/xss", 0o755),
        ("bin", 0o755),
        ("install", 0o750),
    ],
)
def test_the_permission_pass_sets_the_mode_of_a_directory_that_was_there(machine, path, mode):
    machine.make_directory("/opt/corvan/zor/" + path, 0o711)

    install(machine)

    assert machine.mode("/opt/corvan/zor/" + path) == mode


@pytest.mark.parametrize(
    "path, mode",
    [
        ("install/trawlcfg.sh", 0o750),
        ("config/ZorHWConfig.xml", 0o644),
        ("config/Zor.properties", 0o644),
        ("config/ZorTrace.properties", 0o644),
    ],
)
def test_the_permission_pass_sets_the_mode_of_a_file_that_the_package_does_not_contain(
    machine, path, mode
):
    machine.pack(without=(path,))
    machine.plant("/opt/corvan/zor/" + path, "text\n", 0o604)

    install(machine)

    assert machine.mode("/opt/corvan/zor/" + path) == mode


@pytest.mark.parametrize(
    "path, mode",
    [("logs", 0o777), ("_uninst", 0o750), ("bin/plugins", 0o755), ("bin/customscanners", 0o777)],
)
def test_the_permission_pass_takes_files_as_well(machine, path, mode):
    machine.plant("/opt/corvan/zor/" + path, "text", 0o600)

    install(machine)

    assert machine.mode("/opt/corvan/zor/" + path) == mode


@pytest.mark.parametrize("path", ["bin/etc/trawluse", "bin/etc/trawlnet", "mine", "config/mine"])
def test_the_permission_pass_leaves_other_directories_alone(machine, path):
    machine.make_directory("/opt/corvan/zor/" + path, 0o711)

    install(machine)

    assert machine.mode("/opt/corvan/zor/" + path) == 0o711


def test_the_permission_pass_sets_the_mode_of_a_registry_directory_that_was_there(machine):
    machine.make_directory("/etc/zor", 0o700)

    install(machine)

    assert machine.mode("/etc/zor") == 0o755


def test_a_mode_that_cannot_be_changed_is_reported_and_ignored(machine):
    machine.make_directory("/media/logs")
    machine.make_directory("/opt/corvan/zor/logs")

    outcome = install(
        machine, options=("--ro-bind", machine.at("/media/logs"), "/opt/corvan/zor/logs")
    )

    printed_lines(
        outcome,
        "Installation successful, committing changes",
        "Unable to change permissions to '/opt/corvan/zor/logs' file/directory",
        "Done.",
    )


def test_the_permission_pass_continues_after_a_mode_that_cannot_be_changed(machine):
    machine.make_directory("/media/logs")
    machine.make_directory("/opt/corvan/zor/logs")
    machine.make_directory("/opt/corvan/zor/_uninst", 0o700)

    install(machine, options=("--ro-bind", machine.at("/media/logs"), "/opt/corvan/zor/logs"))

    assert machine.mode("/opt/corvan/zor/_uninst") == 0o750


def test_a_fresh_installation_keeps_a_cache_that_was_there(machine):
    machine.plant("/opt/corvan/zor/cache_data/entry", "cached")

    install(machine)

    assert machine.read("/opt/corvan/zor/cache_data/entry") == "cached"


def test_shared_and_per_user_installations_can_coexist(machine):
    install(machine)
    shared = machine.tree("/opt", "/etc")

    install(machine, user=ANN)

    assert machine.tree("/opt", "/etc") == shared
    printed_lines(
        machine.run("t", user=ANN),
        "INI file = /etc/zor/zor.ini",
        "Install dir = /opt/corvan/zor",
        "Install version = 9.2.30.0000",
        "Exploiter list = ABC:",
        "",
        "Status of installation for current user:",
        "INI file = /home/ann/.zor/zor.ini",
        "Install dir = /home/ann/corvan/zor",
        "Install version = 9.2.30.0000",
        "Exploiter list = ABC:",
    )


def test_an_installed_index_of_an_earlier_installation_is_merged(machine):
    machine.plant(
        "/opt/corvan/zor/ZOR_files",
        "# old header\n/opt/corvan/zor/zz\n\n/opt/corvan/zor/bin/trawlcfg\n/a/x \n"
        "#/opt/commented\n/a/x",
    )

    install(machine)

    same_text(
        machine.index("/opt/corvan/zor"),
        SHARED_INDEX.replace(
            "/opt/corvan/zor/bin/libzor.so\n", "/a/x\n/a/x \n/opt/corvan/zor/bin/libzor.so\n", 1
        ).replace(
            "/opt/corvan/zor/zor.log.bak\n", "/opt/corvan/zor/zor.log.bak\n/opt/corvan/zor/zz\n"
        ),
    )


@pytest.mark.parametrize("user, place", [(ROOT, "/opt/corvan/zor"), (ANN, "/home/ann/corvan/zor")])
def test_the_time_stamp_of_the_index_follows_the_time_zone(machine, user, place):
    install(machine, user=user, environment={"TZ": "EAST-14"})
    east = machine.read(place + "/ZOR_files").splitlines()[0][-19:-6]
    install(machine, user=user, environment={"TZ": "WEST+10"})
    west = machine.read(place + "/ZOR_files").splitlines()[0][-19:-6]

    assert east > west, "14 hours ahead of UTC and 10 hours behind it"
