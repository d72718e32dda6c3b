"""An upgrade: when files are deployed, what is carried over, and in which order."""

import pytest

from harness.checks import not_printed, printed, printed_lines, same_lines, same_text, same_tree
from harness.installations import DEPLOYMENT, FOUND, PACKAGE, SHARED_TREE, UPGRADE_START, tree_with
from harness.machine import ANN, SPB

HOME = "/opt/corvan/zor"
MAIN = HOME + "/config/Zor.properties"
TRACE = HOME + "/config/ZorTrace.properties"

DEFAULTS = """\
vpdscanner.default_config_file=config.xml
hwscanner.config_file=ZorHWConfig.xml
hwscanner.hpux.full_node_npar=
hwscanner.node_active_cores=
fscanner.provider_remote_cache.home=/opt/corvan/zor/cache_data
fscanner.provider_remote_cache.globalCache=false
swscanner.assume_remote_filesystems=
hwscanner.changepriority=normal
swscanner.changepriority=normal
fscanner.changepriority=normal
vpdscanner.changepriority=normal
hwscanner.cputhreshold=0:0:0:0
swscanner.cputhreshold=0:0:0:0
fsscanner.cputhreshold=0:0:0:0
vpdscanner.cputhreshold=0:0:0:0
fscanner.excludeDirs=false
swscanner.excludeDirs=
swscanner.firsttimeonly=false
"""


def install_older(machine, version="9.1.0.0005", date="21/06/30", exploiters="OLD:", **how):
    """Installs the toolkit and makes it look like `version` of `date`."""
    outcome = machine.run("i", "OLD", "-s", SPB, **how)
    assert outcome.status == 0, outcome.stdout
    machine.register(version=version, date=date, exploiters=exploiters)


def upgrade(machine, *options, exploiter="ABC", **how):
    """Installs again for `exploiter`, which must succeed."""
    outcome = machine.run("i", exploiter, "-s", SPB, *options, **how)
    assert outcome.status == 0, outcome.stdout + outcome.stderr
    return outcome


def test_an_upgrade_prints_its_progress(machine):
    install_older(machine)

    printed(
        upgrade(machine),
        UPGRADE_START
        + DEPLOYMENT
        + """\
Adding exploiter ABC to INI file
Updating BuildDate informations to: 22/12/02
Saving INI file to /etc/zor/zor.ini
Exec '/opt/corvan/zor/bin/trawlcfg -enable all >/dev/null 2>&1' returned 0
Installation successful, committing changes
RMDIR: /opt/corvan/zor/cache_data
Done.
""",
    )


def test_an_upgrade_stops_the_scanners_and_starts_them_again(machine):
    install_older(machine)

    same_lines(
        upgrade(machine).commands,
        [
            "/opt/corvan/zor/bin/trawlfs [-shutdown]",
            "/opt/corvan/zor/bin/trawlcfg [-disable] [all]",
            "/opt/corvan/zor/bin/trawlcfg [-shutdown] [all] [-timeout] [60] [-force]",
            "/opt/corvan/zor/bin/trawlcfg [-shutdown] [all] [-timeout] [120]",
            "/opt/corvan/zor/bin/trawlcfg [-enable] [all]",
        ],
    )


def test_an_upgrade_makes_its_tree(machine):
    install_older(machine)

    upgrade(machine)

    same_text(
        machine.listing("/etc", "/opt", "/usr/kel"),
        tree_with(SHARED_TREE, {"/opt/corvan/zor/cache_data": None}),
    )


def test_an_upgrade_stores_its_version_and_date_and_the_exploiter(machine):
    install_older(machine)

    upgrade(machine)

    same_text(
        machine.read("/etc/zor/zor.ini"),
        """\
ZOR_Version = 9.2.30.0000
ZOR_BuildDate = 22/12/02
ZOR_HomeDirectory = /opt/corvan/zor
ZOR_Exploiters = OLD:ABC:
ZOR_ConfigRootDirectory = /opt/corvan/zor
""",
    )


def test_an_upgrade_carries_the_settings_over_and_adds_the_missing_ones(machine):
    install_older(machine)
    machine.plant(
        MAIN,
        machine.read(MAIN)
        .replace("version=9.2.30.0000", "version=9.1.0.0005")
        .replace("22/12/02", "21/06/30")
        .replace("trace_level=3", "trace_level=1"),
    )

    upgrade(machine)

    same_text(
        machine.read(MAIN),
        """\
# Settings of the toolkit
version=9.2.30.0000
build_date=22/12/02

trace_level=1
trace_file_path=/opt/corvan/zor/logs
trace_file=zor.log
fscanner.default_provider=provider_cache
fscanner.cache_dir=/opt/corvan/zor/cache_data
common_dir=/usr/kel/corvan/common
two=/opt/corvan/zor:/opt/corvan/zor
"""
        + DEFAULTS,
    )


def test_an_upgrade_takes_the_trace_settings_into_the_new_trace_property_file(machine):
    install_older(machine)

    upgrade(machine)

    same_text(
        machine.read(TRACE),
        """\
handlers.traceFile.fileName=/opt/corvan/zor/logs/zor.log
zor.loggers.trcLogger.level=DEBUG_3
config.root=$(ZOR_ConfigRootDirectory)
unknown=$(NoSuchPlaceholder)
separator=$(FileSeparator)
""",
    )


def test_an_upgrade_fills_in_the_new_scripts(machine):
    install_older(machine)

    upgrade(machine)

    same_text(
        machine.read(HOME + "/install/rmdirs.sh"),
        """\
#!/bin/sh
rmdir "/opt/corvan/zor/cache_data" "/usr/kel/corvan/common/ZOR"
""",
    )


def test_an_upgrade_replaces_files_and_deletes_their_backups(machine):
    install_older(machine)
    machine.plant(HOME + "/bin/trawlhw", "older", 0o700)
    machine.plant(HOME + "/config/xss/schema.xss", "older", 0o700)

    upgrade(machine)

    assert machine.read_bytes(HOME + "/bin/trawlhw") == b"\x7fELF hardware scanner\x00\xff"
    assert machine.read(HOME + "/config/xss/schema.xss") == "<schema/>\n"
    assert not [path for path in machine.tree() if path.endswith(".bak")]


def test_an_upgrade_keeps_the_settings_file_whatever_the_package_brings(machine):
    install_older(machine)
    machine.pack({"config/Zor.properties": b"another=one\n"})

    outcome = upgrade(machine, "-v")

    assert "another=one" not in machine.read(MAIN)
    assert "\ntrace_level=3\n" in machine.read(MAIN)
    not_printed(outcome, "Skip: ")


def test_an_upgrade_keeps_files_that_are_not_the_toolkits(machine):
    install_older(machine)
    machine.plant(HOME + "/bin/mine", "my own", 0o600)
    machine.plant(HOME + "/config/mine", "my own", 0o600)

    upgrade(machine)

    assert machine.read(HOME + "/bin/mine") == "my own"
    assert machine.mode(HOME + "/config/mine") == 0o600


def test_an_upgrade_deletes_the_whole_properties_directory_first(machine):
    install_older(machine)
    machine.plant(HOME + "/properties/mine/deep/file", "my own")

    outcome = upgrade(machine)

    printed_lines(
        outcome,
        "DEL: /opt/corvan/zor/properties/mine/deep/file",
        "RMDIR: /opt/corvan/zor/properties/mine/deep",
        "RMDIR: /opt/corvan/zor/properties/mine",
    )
    assert machine.listing(HOME + "/properties") == (
        "d 0755 /opt/corvan/zor/properties\nf 0755 /opt/corvan/zor/properties/scan.properties\n"
    )


def test_an_upgrade_deletes_the_obsolete_files(machine):
    install_older(machine)
    for name in (
        "libxerces-c.so.26",
        "kpo_config.xml",
        "libzor.so",
        "trawluse.so",
        "trawluse",
        "trawlnet.so",
        "trawlnet",
    ):
        machine.plant(f"{HOME}/bin/{name}", "obsolete")

    printed_lines(
        upgrade(machine),
        "RMDIR: /opt/corvan/zor/properties",
        "DEL: /opt/corvan/zor/bin/trawlnet",
        "DEL: /opt/corvan/zor/bin/trawlnet.so",
        "DEL: /opt/corvan/zor/bin/trawluse",
        "DEL: /opt/corvan/zor/bin/trawluse.so",
        "DEL: /opt/corvan/zor/bin/libzor.so",
        "DEL: /opt/corvan/zor/bin/kpo_config.xml",
        "DEL: /opt/corvan/zor/bin/libxerces-c.so.26",
        "Starting file extraction...",
    )

    assert sorted(path.rsplit("/", 1)[1] for path in machine.tree(HOME + "/bin")) == [
        "bin",
        "etc",
        "libzorcore.so",
        "trawlcfg",
        "trawlfs",
        "trawlhw",
    ]


@pytest.mark.parametrize(
    "name",
    [
        "trawlnet",
        "trawlnet.so",
        "trawluse",
        "trawluse.so",
        "libzor.so",
        "kpo_config.xml",
        "libxerces-c.so.26",
    ],
)
def test_of_the_obsolete_files_only_those_that_exist_are_logged(machine, name):
    install_older(machine)
    machine.plant(f"{HOME}/bin/{name}", "obsolete")

    printed_lines(
        upgrade(machine),
        "RMDIR: /opt/corvan/zor/properties",
        f"DEL: /opt/corvan/zor/bin/{name}",
        "Starting file extraction...",
    )

    assert not machine.exists(f"{HOME}/bin/{name}")


def test_an_empty_directory_with_an_obsolete_name_is_deleted_too(machine):
    install_older(machine)
    machine.make_directory(HOME + "/bin/trawlnet")

    printed_lines(
        upgrade(machine), "DEL: /opt/corvan/zor/bin/trawlnet", "Starting file extraction..."
    )

    assert not machine.exists(HOME + "/bin/trawlnet")


# The decision.

DEPLOYED = "Installed ZOR is older (or the same version), performing upgrade (deploying files)"
EXPLOITERS_ONLY = "Installed ZOR is not older than this version, updating exploiters only"


@pytest.mark.parametrize(
    "version, date",
    [
        ("9.2.29.9999", "99/12/31"),
        ("9.1.99.0", ""),
        ("8", "22/12/02"),
        ("", ""),
        ("0.0.0.0.9", ""),
        ("9.2.30", "22/12/02"),
        ("9.2.30.0", "22/12/01"),
        ("9.2.30.0", ""),
        ("9.2.30.0", "2022-12-03"),
        ("9.2.30.0", "ab/cd/ef"),
        ("9.2.30.0", "22/12/2"),
    ],
)
def test_files_are_deployed_over_an_older_or_equal_build(machine, version, date):
    install_older(machine, version, date)

    printed_lines(upgrade(machine), DEPLOYED)

    assert machine.read("/etc/zor/zor.ini").startswith("ZOR_Version = 9.2.30.0000\n")


@pytest.mark.parametrize(
    "version, date",
    [
        ("9.2.30.1", ""),
        ("9.2.31", ""),
        ("9.3", ""),
        ("10", ""),
        ("9.2.30.0.1", "22/12/02"),
        ("9.2.30.0", "22/12/03"),
        ("9.2.30.0", "23/01/01"),
        ("9.2.30.0", "99/00/00"),
    ],
)
def test_over_a_newer_build_only_the_exploiter_is_registered(machine, version, date):
    install_older(machine, version, date)

    printed_lines(upgrade(machine), EXPLOITERS_ONLY)

    assert "\nZOR_Exploiters = OLD:ABC:\n" in machine.read("/etc/zor/zor.ini")


def test_a_build_date_that_is_not_year_first_is_compared_unchanged(machine):
    # 31 December 2022, day first: 311222 is more than 221202.
    install_older(machine, "9.2.30.0000", "31/12/22")

    printed_lines(upgrade(machine), EXPLOITERS_ONLY)


def test_an_installation_newer_than_the_package_keeps_all_its_files(machine):
    install_older(machine, "10.0.0.0000", "23/01/01")
    machine.plant(HOME + "/bin/trawlnet", "not obsolete here")
    machine.plant(HOME + "/cache_data/entry", "cached")
    machine.plant(HOME + "/properties/mine", "my own")
    before = machine.tree()

    outcome = upgrade(machine)

    printed(
        outcome,
        PACKAGE
        + FOUND
        + """\
Installed ZOR is not older than this version, updating exploiters only
Created Corvan Common Dir='/usr/kel/corvan/common' result=0
Adding exploiter ABC to INI file
Saving INI file to /etc/zor/zor.ini
Installation successful, committing changes
Done.
""",
    )
    same_lines(outcome.commands, [])
    after = machine.tree()
    same_text(
        after.pop("/etc/zor/zor.ini").content.decode(),
        """\
ZOR_Version = 10.0.0.0000
ZOR_BuildDate = 23/01/01
ZOR_HomeDirectory = /opt/corvan/zor
ZOR_Exploiters = OLD:ABC:
ZOR_ConfigRootDirectory = /opt/corvan/zor
""",
    )
    before.pop("/etc/zor/zor.ini")
    same_tree(after, before)


def test_a_registered_exploiter_changes_nothing_on_a_newer_installation(machine):
    install_older(machine, "10.0.0.0000", "23/01/01")
    before = machine.tree()

    outcome = upgrade(machine, exploiter="OLD")

    printed(
        outcome,
        PACKAGE
        + FOUND
        + """\
Installed ZOR is not older than this version, updating exploiters only
Created Corvan Common Dir='/usr/kel/corvan/common' result=0
Installation successful, committing changes
Done.
""",
    )
    same_tree(machine.tree(), before)


def test_a_newer_installation_needs_no_package(machine):
    install_older(machine, "10.0.0.0000", "23/01/01")
    machine.remove(SPB)

    upgrade(machine)


def test_a_newer_installation_of_an_older_date_takes_the_date(machine):
    install_older(machine, "10.0.0.0000", "20/01/01")

    printed_lines(
        upgrade(machine),
        EXPLOITERS_ONLY,
        "Created Corvan Common Dir='/usr/kel/corvan/common' result=0",
        "Adding exploiter ABC to INI file",
        "Updating BuildDate informations to: 22/12/02",
        "Saving INI file to /etc/zor/zor.ini",
    )

    assert machine.read("/etc/zor/zor.ini").startswith(
        "ZOR_Version = 10.0.0.0000\nZOR_BuildDate = 22/12/02\n"
    )


def test_a_newer_date_alone_saves_the_registry(machine):
    install_older(machine, "10.0.0.0000", "20/01/01")

    printed_lines(
        upgrade(machine, exploiter="OLD"),
        EXPLOITERS_ONLY,
        "Created Corvan Common Dir='/usr/kel/corvan/common' result=0",
        "Updating BuildDate informations to: 22/12/02",
        "Saving INI file to /etc/zor/zor.ini",
        "Installation successful, committing changes",
    )


def test_an_older_version_of_a_newer_date_keeps_its_date(machine):
    install_older(machine, "9.1.0.0000", "23/05/05")

    not_printed(upgrade(machine), "Updating BuildDate")

    assert machine.read("/etc/zor/zor.ini").startswith(
        "ZOR_Version = 9.2.30.0000\nZOR_BuildDate = 23/05/05\n"
    )


def test_the_same_build_is_deployed_again(machine):
    assert machine.run("i", "OLD", "-s", SPB).status == 0
    machine.plant(HOME + "/bin/trawlhw", "damaged")

    outcome = upgrade(machine)

    printed_lines(outcome, DEPLOYED)
    printed_lines(
        outcome,
        "Adding exploiter ABC to INI file",
        "Saving INI file to /etc/zor/zor.ini",
        "Exec '/opt/corvan/zor/bin/trawlcfg -enable all >/dev/null 2>&1' returned 0",
    )
    assert machine.read_bytes(HOME + "/bin/trawlhw") == b"\x7fELF hardware scanner\x00\xff"
    assert machine.read("/etc/zor/zor.ini").startswith(
        "ZOR_Version = 9.2.30.0000\nZOR_BuildDate = 22/12/02\n"
    )


def test_an_installation_is_upgraded_where_it_is_registered(machine):
    assert machine.run("i", "OLD", "-s", SPB, "-d", "/opt/first").status == 0

    outcome = upgrade(machine, "-d", "/opt/second")

    printed_lines(outcome, "Log file is: /opt/first/ZOR_files")
    assert not machine.exists("/opt/second")
    assert "\nZOR_HomeDirectory = /opt/first\n" in machine.read("/etc/zor/zor.ini")
    assert "\nZOR_ConfigRootDirectory = /opt/first\n" in machine.read("/etc/zor/zor.ini")


# Registration.


def test_a_registered_exploiter_is_not_added_twice(machine):
    install_older(machine)

    not_printed(upgrade(machine, exploiter="OLD"), "Adding exploiter")

    assert "\nZOR_Exploiters = OLD:\n" in machine.read("/etc/zor/zor.ini")


def test_without_registration_the_exploiter_is_not_added(machine):
    install_older(machine)

    printed_lines(
        upgrade(machine, "-n"),
        "Created Corvan Common Dir='/usr/kel/corvan/common' result=0",
        "Exploiter registration skipped",
        "Updating BuildDate informations to: 22/12/02",
        "Saving INI file to /etc/zor/zor.ini",
    )

    assert "\nZOR_Exploiters = OLD:\n" in machine.read("/etc/zor/zor.ini")


def test_a_skipped_registration_is_not_logged_for_a_registered_exploiter(machine):
    install_older(machine)

    not_printed(upgrade(machine, "-n", exploiter="OLD"), "registration skipped")


def test_without_registration_a_newer_installation_is_not_saved(machine):
    install_older(machine, "10.0.0.0000", "23/01/01")
    before = machine.tree()

    printed_lines(
        upgrade(machine, "-n"),
        "Exploiter registration skipped",
        "Installation successful, committing changes",
    )

    same_tree(machine.tree(), before)


def test_an_exploiter_joins_a_list_of_one_colon(machine):
    assert machine.run("i", "OLD", "-s", SPB, "-n").status == 0

    upgrade(machine)

    assert "\nZOR_Exploiters = :ABC:\n" in machine.read("/etc/zor/zor.ini")


# The main property file.


def settings_after_upgrade(machine, settings):
    """The installed Zor.properties after an upgrade of one that holds `settings`."""
    install_older(machine)
    machine.plant(MAIN, settings)
    upgrade(machine)
    return machine.read(MAIN)


@pytest.mark.parametrize("key", [line.split("=")[0] for line in DEFAULTS.splitlines()])
def test_a_setting_that_is_there_keeps_its_value(machine, key):
    remaining = "".join(line for line in DEFAULTS.splitlines(True) if line.split("=")[0] != key)

    text = settings_after_upgrade(machine, f"build_date=22/12/02\n {key} = my own \n")

    same_text(text, f"build_date=22/12/02\n {key} = my own \n{remaining}")


def test_a_setting_without_a_value_counts_as_there(machine):
    text = settings_after_upgrade(machine, "build_date=22/12/02\nswscanner.excludeDirs\n")

    same_text(
        text,
        "build_date=22/12/02\nswscanner.excludeDirs\n"
        + DEFAULTS.replace("swscanner.excludeDirs=\n", ""),
    )


def test_a_setting_in_a_comment_counts_as_missing(machine):
    text = settings_after_upgrade(machine, "build_date=22/12/02\n#swscanner.excludeDirs=/x\n")

    same_text(text, "build_date=22/12/02\n#swscanner.excludeDirs=/x\n" + DEFAULTS)


def test_a_missing_build_date_is_appended_before_the_missing_settings(machine):
    same_text(
        settings_after_upgrade(machine, "version=1\n"),
        "version=9.2.30.0000\nbuild_date=22/12/02\n" + DEFAULTS,
    )


def test_a_missing_version_is_not_added(machine):
    same_text(settings_after_upgrade(machine, "build_date=x\n"), "build_date=22/12/02\n" + DEFAULTS)


def test_a_version_keeps_all_before_its_equals_sign(machine):
    same_text(
        settings_after_upgrade(machine, " version\t = 1=2\n build_date =\n"),
        " version\t =9.2.30.0000\n build_date =22/12/02\n" + DEFAULTS,
    )


def test_a_version_and_a_date_without_equals_signs_get_them(machine):
    same_text(
        settings_after_upgrade(machine, " version \nbuild_date\n"),
        " version =9.2.30.0000\nbuild_date=22/12/02\n" + DEFAULTS,
    )


def test_of_two_versions_and_two_dates_the_last_ones_are_set(machine):
    same_text(
        settings_after_upgrade(machine, "version=1\nbuild_date=1\nversion=2\nbuild_date=2\n"),
        "version=1\nbuild_date=1\nversion=9.2.30.0000\nbuild_date=22/12/02\n" + DEFAULTS,
    )


@pytest.mark.parametrize(
    "key",
    [
        "trawlnet.cputhreshold",
        "trawluse.cputhreshold",
        "trawluse.changepriority",
        "trawlnet.changepriority",
        "trawluse.cache_dir",
        "trawlnet.cache_dir",
        "lsof.bin",
    ],
)
def test_the_line_of_an_obsolete_setting_is_emptied(machine, key):
    text = settings_after_upgrade(
        machine, f"build_date=1\n{key}=1\n #{key}.more = 2\nthe end={key}\n"
    )

    same_text(text, f"build_date=22/12/02\n\n\nthe end={key}\n" + DEFAULTS)


def test_every_placeholder_is_filled_in(machine):
    text = settings_after_upgrade(
        machine,
        "build_date=1\na=$(ZOR_DestinationDir)|$(ZOR_ConfigRootDirectory)|"
        "$(CorvanCommonDir)|$(FileSeparator)|$(fscanner_mode)|$(Other)\n",
    )

    same_text(
        text,
        "build_date=22/12/02\na=/opt/corvan/zor|/opt/corvan/zor|"
        "/usr/kel/corvan/common|/|provider_cache|$(Other)\n" + DEFAULTS,
    )


def test_the_given_provider_fills_in_its_placeholder(machine):
    install_older(machine)
    machine.plant(MAIN, "build_date=1\na=$(fscanner_mode)\n")

    upgrade(machine, "-f", "provider_standard")

    assert "\na=provider_standard\n" in machine.read(MAIN)


def test_the_property_file_keeps_carriage_returns_and_comments(machine):
    same_text(
        settings_after_upgrade(machine, "# c\r\n\nbuild_date=1\r\nlast = 1 "),
        "# c\r\n\nbuild_date=22/12/02\nlast = 1 \n" + DEFAULTS,
    )


# The trace property file.


def traces_after_upgrade(machine, settings, traces):
    """The package's trace properties `traces` after an upgrade that keeps `settings`."""
    install_older(machine)
    machine.plant(MAIN, settings)
    machine.pack({"config/ZorTrace.properties": traces.encode()})
    outcome = upgrade(machine)
    return outcome, machine.read(TRACE)


def test_the_kept_trace_settings_are_taken_untrimmed(machine):
    _, text = traces_after_upgrade(
        machine,
        "trace_level= 5 \ntrace_file_path =\t/x=y \ntrace_file= f \n",
        "handlers.traceFile.fileName=1\na.loggers.trcLogger.level.b = 2\n",
    )

    same_text(
        text, "handlers.traceFile.fileName=\t/x=y / f \na.loggers.trcLogger.level.b=DEBUG_ 5 \n"
    )


def test_missing_trace_settings_are_empty(machine):
    outcome, text = traces_after_upgrade(
        machine, "other=1\n", "handlers.traceFile.fileName=1\na.loggers.trcLogger.level=2\n"
    )

    same_text(text, "handlers.traceFile.fileName=/\na.loggers.trcLogger.level=DEBUG_\n")
    printed_lines(
        outcome,
        "Looking for Trace Dir",
        "Customizing property file: /opt/corvan/zor/config/ZorTrace.properties",
    )


def test_without_a_trace_path_an_empty_line_counts_as_the_trace_directory(machine):
    outcome, _ = traces_after_upgrade(machine, "other=1\n\nlast=2\n", "a=1\n")

    printed_lines(
        outcome,
        "Looking for Trace Dir",
        "Trace Dir: ",
        "Customizing property file: /opt/corvan/zor/config/ZorTrace.properties",
    )


def test_a_line_whose_key_is_the_trace_path_names_the_trace_directory(machine):
    outcome, _ = traces_after_upgrade(
        machine, "trace_file_path=/logs\n/logs = /first\n/logs = /second=\n", "a=1\n"
    )

    printed_lines(
        outcome,
        "Looking for Trace Dir",
        "Trace Dir:  /second=",
        "Customizing property file: /opt/corvan/zor/config/ZorTrace.properties",
    )


def test_of_trace_settings_given_twice_the_last_ones_are_kept(machine):
    _, text = traces_after_upgrade(
        machine,
        "trace_level=1\ntrace_level=2\ntrace_file=a\ntrace_file=b\ntrace_file_path=/c\n"
        "trace_file_path=/d\n",
        "handlers.traceFile.fileName=1\na.loggers.trcLogger.level=2\n",
    )

    same_text(text, "handlers.traceFile.fileName=/d/b\na.loggers.trcLogger.level=DEBUG_2\n")


def test_a_trace_setting_without_equals_sign_is_empty(machine):
    _, text = traces_after_upgrade(
        machine,
        "trace_level\ntrace_file_path\ntrace_file\n",
        "handlers.traceFile.fileName=1\na.loggers.trcLogger.level=2\n",
    )

    same_text(text, "handlers.traceFile.fileName=/\na.loggers.trcLogger.level=DEBUG_\n")


def test_every_line_of_the_trace_file_name_and_of_a_level_is_set(machine):
    _, text = traces_after_upgrade(
        machine,
        "trace_level=7\ntrace_file_path=/p\ntrace_file=f\n",
        "handlers.traceFile.fileName=1\n handlers.traceFile.fileName \n"
        "handlers.traceFile.fileName.x=2\n#b.loggers.trcLogger.level=3\n"
        "c.loggers.trcLogger.level\nd.loggers.trclogger.level=4\n",
    )

    same_text(
        text,
        "handlers.traceFile.fileName=/p/f\nhandlers.traceFile.fileName=/p/f\n"
        "handlers.traceFile.fileName.x=2\n#b.loggers.trcLogger.level=DEBUG_7\n"
        "c.loggers.trcLogger.level=DEBUG_7\nd.loggers.trclogger.level=4\n",
    )


def test_missing_lines_are_not_added_to_the_trace_property_file(machine):
    _, text = traces_after_upgrade(machine, "trace_level=7\n", "other=1\n")

    same_text(text, "other=1\n")


# Shared and per-user, directories, options.


def test_a_per_user_upgrade_touches_neither_scripts_nor_common_directory(machine):
    assert machine.run("i", "OLD", "-s", SPB, user=ANN).status == 0

    outcome = upgrade(machine, user=ANN)

    printed(
        outcome,
        """\
SPB file: /media/toolkit.spb
ZOR version: 22/12/02zor_9.2.30.0000
Install type: local
Register exploiter: yes
Default dest: /home/ann/corvan/zor
INI location: /home/ann/.zor/zor.ini
Looking for INI file: /home/ann/.zor/zor.ini
INI file found, verifying...
ZOR directory verified ok
Log file is: /home/ann/corvan/zor/ZOR_files
currentZorHome = '/home/ann/corvan/zor' currentCfgHome = '/home/ann/corvan/zor'
Installed ZOR is older (or the same version), performing upgrade (deploying files)
Exec '/usr/sbin/selinuxenabled >/dev/null 2>&1' returned 32512
SELinux not enabled or not supported
Exec '/home/ann/corvan/zor/bin/trawlfs -shutdown >/dev/null 2>&1' returned 0
Exec '/home/ann/corvan/zor/bin/trawlcfg -disable all >/dev/null 2>&1' returned 0
Exec '/home/ann/corvan/zor/bin/trawlcfg -shutdown all -timeout 60 -force >/dev/null 2>&1' returned 0
Exec '/home/ann/corvan/zor/bin/trawlcfg -shutdown all -timeout 120 >/dev/null 2>&1' returned 0
DEL: /home/ann/corvan/zor/properties/scan.properties
RMDIR: /home/ann/corvan/zor/properties
Starting file extraction...
Extracting configs to '/home/ann/corvan/zor/config'
Exec '/usr/sbin/selinuxenabled >/dev/null 2>&1' returned 32512
SELinux not enabled or not supported
Customizing properties file: /home/ann/corvan/zor/config/Zor.properties
Looking for Trace Dir
Customizing property file: /home/ann/corvan/zor/config/ZorTrace.properties
File saved successfully
Adding exploiter ABC to INI file
Saving INI file to /home/ann/.zor/zor.ini
Exec '/home/ann/corvan/zor/bin/trawlcfg -enable all >/dev/null 2>&1' returned 0
Installation successful, committing changes
RMDIR: /home/ann/corvan/zor/cache_data
Done.
""",
    )
    assert "\nZOR_HOME=$(ZOR_DestinationDir)\n" in machine.read(
        "/home/ann/corvan/zor/install/trawlcfg.sh"
    )
    assert not machine.exists("/usr/kel")


def test_an_upgrade_makes_missing_common_directories(machine):
    install_older(machine)
    machine.remove("/usr/kel")
    machine.remove("/etc/kel")

    outcome = upgrade(machine)

    printed_lines(
        outcome,
        "Created Corvan Common Dir='/usr/kel/corvan/common' result=0",
        "Setting logs dir='/usr/kel/corvan/common/ZOR/logs'",
        "Adding exploiter ABC to INI file",
    )
    assert machine.mode("/usr/kel/corvan/common/ZOR/logs") == 0o777
    assert (
        machine.read("/etc/kel/corvan/common/cfg/log.properties")
        == "corvan_common_dir=/usr/kel/corvan/common\n"
    )


def test_an_upgrade_with_a_custom_trace_directory_makes_no_directory_at_all(machine):
    install_older(machine)
    machine.remove("/usr/kel")
    machine.remove("/etc/kel")

    outcome = upgrade(machine, "-c", "/var/trace")

    not_printed(outcome, "Created Corvan Common Dir")
    not_printed(outcome, "trace path=")
    assert not machine.exists("/usr/kel")
    assert not machine.exists("/etc/kel")
    assert not machine.exists("/var/trace")


def test_an_upgrade_with_a_custom_trace_directory_fills_in_the_common_one(machine):
    install_older(machine)
    machine.plant("/etc/kel/corvan/common/cfg/log.properties", "corvan_common_dir=/srv/c\n")
    machine.plant(MAIN, "a=$(CorvanCommonDir)\n")

    upgrade(machine, "-c", "/var/trace")

    assert machine.read(MAIN).startswith("a=/srv/c\n")
    assert "\nCOMMON=/srv/c\n" in machine.read(HOME + "/install/trawlcfg.sh")


def test_an_upgrade_in_single_user_mode_closes_the_tree(machine):
    install_older(machine)
    machine.change_mode(HOME, 0o711)
    machine.make_directory(HOME + "/logs", 0o777)
    machine.remove("/usr/kel")

    outcome = upgrade(machine, "-r", umask=0)

    printed_lines(
        outcome,
        "Saving INI file to /etc/zor/zor.ini",
        "Creating single user mode flag file: /opt/corvan/zor/config/SingleUserMode",
        "Exec '/opt/corvan/zor/bin/trawlcfg -enable all >/dev/null 2>&1' returned 0",
    )
    assert machine.mode(HOME) == 0o755
    assert machine.mode(HOME + "/logs") == 0o755
    assert machine.mode(HOME + "/bin/etc") == 0o755
    assert machine.mode(HOME + "/config/SingleUserMode") == 0o644
    assert machine.mode("/usr/kel") == 0o755
    assert machine.mode("/usr/kel/corvan/common/ZOR/logs") == 0o755
    assert machine.index(HOME).endswith("\n/opt/corvan/zor/config/SingleUserMode\n")


def test_an_upgrade_finds_the_single_user_flag(machine):
    install_older(machine)
    machine.plant(HOME + "/config/SingleUserMode")

    outcome = upgrade(machine)

    printed_lines(
        outcome,
        "currentZorHome = '/opt/corvan/zor' currentCfgHome = '/opt/corvan/zor'",
        "Single user mode file found",
        "Installed ZOR is older (or the same version), performing upgrade (deploying files)",
    )
    not_printed(outcome, "Creating single user mode flag file")
    assert machine.mode(HOME + "/bin/etc") == 0o755


def test_a_registration_only_finds_the_single_user_flag_too(machine):
    install_older(machine, "10.0.0.0000")
    machine.plant(HOME + "/config/SingleUserMode")

    printed_lines(upgrade(machine), "Single user mode file found", EXPLOITERS_ONLY)

    assert machine.mode(HOME + "/bin/etc") == 0o755


def test_a_registration_only_makes_the_single_user_flag_when_asked(machine):
    install_older(machine, "10.0.0.0000")

    printed_lines(
        upgrade(machine, "-r"),
        "Saving INI file to /etc/zor/zor.ini",
        "Creating single user mode flag file: /opt/corvan/zor/config/SingleUserMode",
        "Installation successful, committing changes",
    )

    assert machine.read(HOME + "/config/SingleUserMode") == ""


def test_an_upgrade_in_a_home_with_a_blank_quotes_the_programs(machine):
    assert machine.run("i", "OLD", "-s", SPB, "-d", "/opt/my zor").status == 0

    outcome = upgrade(machine)

    printed_lines(
        outcome,
        "Exec '\"/opt/my zor/bin/trawlfs\" -shutdown >/dev/null 2>&1' returned 0",
        "Exec '\"/opt/my zor/bin/trawlcfg\" -disable all >/dev/null 2>&1' returned 0",
        "Exec '\"/opt/my zor/bin/trawlcfg\" -shutdown all -timeout 60 -force >/dev/null 2>&1' "
        "returned 0",
        "Exec '\"/opt/my zor/bin/trawlcfg\" -shutdown all -timeout 120 >/dev/null 2>&1' "
        "returned 0",
        "DEL: /opt/my zor/properties/scan.properties",
    )
    same_lines(
        outcome.commands,
        [
            "/opt/my zor/bin/trawlfs [-shutdown]",
            "/opt/my zor/bin/trawlcfg [-disable] [all]",
            "/opt/my zor/bin/trawlcfg [-shutdown] [all] [-timeout] [60] [-force]",
            "/opt/my zor/bin/trawlcfg [-shutdown] [all] [-timeout] [120]",
            "/opt/my zor/bin/trawlcfg [-enable] [all]",
        ],
    )


def test_an_upgrade_in_debug_mode_shows_what_the_scanner_control_prints(machine):
    install_older(machine)

    printed_lines(
        upgrade(machine, "-v"),
        DEPLOYED,
        "Setting 'LD_LIBRARY_PATH' to 'LD_LIBRARY_PATH=/opt/corvan/zor/bin'",
        "Exec '/usr/sbin/selinuxenabled' returned 32512",
        "SELinux not enabled or not supported",
        "scanner control output: -shutdown",
        "Exec '/opt/corvan/zor/bin/trawlfs -shutdown' returned 0",
        "scanner control output: -disable all",
        "Exec '/opt/corvan/zor/bin/trawlcfg -disable all' returned 0",
    )


def test_the_permission_pass_follows_an_upgrade_but_leaves_the_home_directory(machine):
    install_older(machine)
    machine.change_mode(HOME, 0o711)
    machine.change_mode(MAIN, 0o600)
    machine.change_mode("/etc/zor", 0o700)

    upgrade(machine)

    assert machine.mode(HOME) == 0o711
    assert machine.mode(MAIN) == 0o644
    assert machine.mode("/etc/zor") == 0o755


def test_the_cache_is_emptied_by_an_upgrade(machine):
    install_older(machine)
    machine.plant(HOME + "/cache_data/deep/entry", "cached")

    printed_lines(
        upgrade(machine),
        "Installation successful, committing changes",
        "DEL: /opt/corvan/zor/cache_data/deep/entry",
        "RMDIR: /opt/corvan/zor/cache_data/deep",
        "RMDIR: /opt/corvan/zor/cache_data",
        "Done.",
    )

    assert not machine.exists(HOME + "/cache_data")


def test_the_index_keeps_files_that_newer_packages_no_longer_contain(machine):
    machine.pack({"bin/gone": b"1"})
    install_older(machine)
    machine.pack()

    upgrade(machine)

    index = machine.index(HOME)
    assert "\n/opt/corvan/zor/bin/gone\n" in index
    assert "\n/opt/corvan/zor/config/Zor.properties\n" in index
    assert "\n/opt/corvan/zor/install/zor_install.properties\n" in index


def test_without_an_older_index_the_kept_settings_file_is_not_listed(machine):
    install_older(machine)
    machine.remove(HOME + "/ZOR_files")

    upgrade(machine)

    index = machine.index(HOME)
    assert "/Zor.properties\n" not in index
    assert "\n/opt/corvan/zor/config/ZorTrace.properties\n" in index


def test_an_upgrade_leaves_the_install_type_as_it_was(machine):
    install_older(machine)
    machine.plant(HOME + "/install/zor_install.properties", "ZOR_InstallType = global # mine\n")

    upgrade(machine)

    assert (
        machine.read(HOME + "/install/zor_install.properties")
        == "ZOR_InstallType = global # mine\n"
    )


def test_failing_stop_commands_are_ignored(machine):
    install_older(machine)
    machine.let_commands_fail(("-shutdown", 3), ("-disable", 4))

    outcome = upgrade(machine)

    printed_lines(
        outcome,
        "Exec '/opt/corvan/zor/bin/trawlfs -shutdown >/dev/null 2>&1' returned 768",
        "Exec '/opt/corvan/zor/bin/trawlcfg -disable all >/dev/null 2>&1' returned 1024",
        "Exec '/opt/corvan/zor/bin/trawlcfg -shutdown all -timeout 60 -force >/dev/null 2>&1' "
        "returned 768",
        "Exec '/opt/corvan/zor/bin/trawlcfg -shutdown all -timeout 120 >/dev/null 2>&1' "
        "returned 768",
        "DEL: /opt/corvan/zor/properties/scan.properties",
    )


def test_a_failing_restart_is_reported_and_ignored(machine):
    install_older(machine)
    machine.let_commands_fail(("-enable", 9))

    printed_lines(
        upgrade(machine),
        "Exec '/opt/corvan/zor/bin/trawlcfg -enable all >/dev/null 2>&1' returned 2304",
        "*** Error: could not restart ZOR.",
        "Installation successful, committing changes",
    )


def test_an_upgrade_has_the_same_modes_under_a_closed_process_umask(machine):
    install_older(machine)

    upgrade(machine, umask=0o077)

    assert machine.mode(MAIN) == 0o644
    assert machine.mode(HOME + "/properties") == 0o755
    assert machine.mode("/etc/zor/zor.ini") == 0o644
