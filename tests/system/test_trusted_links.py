"""Links of root and of the running user are followed, and pipes serve as log and as package.

What is refused to other users must go on working for the administrator.
"""

import os

import pytest

from harness.attacks import COMMON, HOME, ends, install, prepare, refused_modes
from harness.checks import printed_lines, same_text
from harness.installations import SHARED_TRANSCRIPT
from harness.machine import ANN as HER  # may change her own places only
from harness.machine import SPB, Machine

BIG = "/srv/big"
SETTING = "/etc/kel/corvan/common/cfg/log.properties"


@pytest.fixture
def machine(binary):
    fresh = Machine(binary)
    fresh.make_directory(BIG)
    yield fresh
    fresh.delete()


def target_of(machine, path):
    """Where the link at `path` leads; None when it is no link."""
    return os.readlink(machine.at(path)) if os.path.islink(machine.at(path)) else None


# The home directory.


@pytest.mark.parametrize("link", [HOME, "/opt/corvan"])
def test_the_toolkit_may_be_installed_through_a_link(machine, link):
    machine.link(link, BIG)

    outcome = machine.run("i", "ABC", "-s", SPB)

    same_text(outcome.stdout, SHARED_TRANSCRIPT)
    ends(outcome, 0)
    real = BIG if link == HOME else BIG + "/zor"
    assert machine.read(real + "/config/ZorHWConfig.xml") == "<hardware/>\n"
    assert machine.mode(real + "/bin/etc") == 0o777
    assert target_of(machine, link) == BIG


def test_a_chain_of_links_is_followed(machine):
    machine.link("/opt/corvan", "../srv/second")
    machine.link("/srv/second", "./third/../third")
    machine.link("/srv/third", BIG)

    outcome = machine.run("i", "ABC", "-s", SPB)

    same_text(outcome.stdout, SHARED_TRANSCRIPT)
    assert machine.exists(BIG + "/zor/bin/trawlcfg")


def test_a_loop_of_links_is_an_error(machine):
    machine.link("/opt/corvan", "/opt/again")
    machine.link("/opt/again", "/opt/corvan")

    outcome = machine.run("i", "ABC", "-s", SPB)

    printed_lines(outcome, "File extraction failed, error = 11 (Cannot create directory)")
    ends(outcome, 1)


@pytest.mark.parametrize("action", ["upgrade", "registration"])
def test_an_installation_through_a_link_is_upgraded_or_registered(machine, action):
    machine.link(HOME, BIG)
    prepare(machine, action)

    outcome = machine.run("i", "XYZ", "-s", SPB)

    printed_lines(outcome, "ZOR directory verified ok")
    ends(outcome, 0)
    assert "ZOR_Exploiters = ABC:XYZ:\n" in machine.read("/etc/zor/zor.ini")
    assert not machine.exists(BIG + "/$_ZOR_$")


def test_an_installation_through_a_link_is_removed(machine):
    machine.link(HOME, BIG)
    install(machine)

    outcome = machine.run("r", "ABC")

    ends(outcome, 0)
    # rmdir does not follow links: its empty target is left.
    assert target_of(machine, HOME) == BIG
    assert os.listdir(machine.at(BIG)) == []


def test_users_may_install_through_a_link_of_their_own(machine):
    machine.make_directory("/home/ann/disk")
    machine.link("/home/ann/corvan", "disk")

    outcome = machine.run("i", "ABC", "-s", SPB, user=HER)

    ends(outcome, 0)
    assert machine.exists("/home/ann/disk/zor/bin/trawlcfg")


# Directories of the installation.


def test_modes_are_set_through_links(machine):
    prepare(machine, "registration")
    for name in ("cache_data", "logs", "bin/etc/trawlfs", "bin/plugins"):
        if machine.exists(f"{HOME}/{name}"):
            machine.remove(f"{HOME}/{name}")
        machine.make_directory(f"{BIG}/{name}", 0o700)
        machine.link(f"{HOME}/{name}", f"{BIG}/{name}")

    outcome = machine.run("i", "XYZ", "-s", SPB)

    assert refused_modes(outcome) == []
    ends(outcome, 0)
    assert machine.mode(BIG + "/cache_data") == 0o777
    assert machine.mode(BIG + "/logs") == 0o777
    assert machine.mode(BIG + "/bin/etc/trawlfs") == 0o777
    assert machine.mode(BIG + "/bin/plugins") == 0o755


def test_modes_of_dangling_links_are_skipped(machine):
    prepare(machine, "registration")
    machine.link(HOME + "/logs", "/srv/missing")

    outcome = machine.run("i", "XYZ", "-s", SPB)

    assert refused_modes(outcome) == []
    ends(outcome, 0)
    assert not machine.exists("/srv/missing")


def cache_behind_a_link(machine, action):
    prepare(machine, action)
    machine.remove(HOME + "/cache_data")
    machine.plant(BIG + "/cache/deep/old.cache", "stale\n")
    machine.link(HOME + "/cache_data", BIG + "/cache")


def test_an_upgrade_empties_a_linked_cache(machine):
    cache_behind_a_link(machine, "upgrade")

    outcome = machine.run("i", "XYZ", "-s", SPB)

    printed_lines(
        outcome, f"DEL: {HOME}/cache_data/deep/old.cache", f"RMDIR: {HOME}/cache_data/deep"
    )
    ends(outcome, 0)
    assert target_of(machine, HOME + "/cache_data") == BIG + "/cache"
    assert os.listdir(machine.at(BIG + "/cache")) == []


def test_a_removal_empties_a_linked_cache_and_linked_logs(machine):
    cache_behind_a_link(machine, "removal")
    machine.plant(BIG + "/logs/scan.log", "log\n")
    machine.link(HOME + "/logs", BIG + "/logs")

    outcome = machine.run("r", "ABC")

    printed_lines(outcome, f"DEL: {HOME}/logs/scan.log")
    printed_lines(outcome, f"DEL: {HOME}/cache_data/deep/old.cache")
    ends(outcome, 0)
    assert os.listdir(machine.at(BIG + "/cache")) == []
    assert os.listdir(machine.at(BIG + "/logs")) == []


def test_links_within_a_cache_are_deleted_and_not_followed(machine):
    prepare(machine, "upgrade")
    machine.plant(BIG + "/kept", "kept\n")
    machine.link(HOME + "/cache_data/link", BIG)

    outcome = machine.run("i", "XYZ", "-s", SPB)

    printed_lines(outcome, f"DEL: {HOME}/cache_data/link")
    ends(outcome, 0)
    assert machine.read(BIG + "/kept") == "kept\n"


# The common directory and its setting.


@pytest.mark.parametrize("link", ["/usr/kel", "/usr/kel/corvan", COMMON, COMMON + "/ZOR"])
def test_the_common_directory_may_be_a_link(machine, link):
    machine.link(link, BIG)

    outcome = machine.run("i", "ABC", "-s", SPB)

    same_text(outcome.stdout, SHARED_TRANSCRIPT)
    ends(outcome, 0)
    rest = (COMMON + "/ZOR/logs").removeprefix(link)
    assert machine.mode(BIG + rest) == 0o777


def test_a_dangling_link_above_the_logs_is_an_ignored_error(machine):
    machine.link(COMMON, "/srv/missing")

    outcome = machine.run("i", "ABC", "-s", SPB)

    printed_lines(
        outcome,
        f"Created Corvan Common Dir='{COMMON}' result=11",
        f"Setting logs dir='{COMMON}/ZOR/logs'",
    )
    ends(outcome, 0)
    assert not machine.exists("/srv/missing")


def test_a_removal_empties_linked_common_logs(machine):
    machine.link(COMMON + "/ZOR", BIG)
    install(machine)
    machine.plant(BIG + "/logs/scan.log", "log\n")

    outcome = machine.run("r", "ABC")

    printed_lines(outcome, f"DEL: {COMMON}/ZOR/logs/scan.log", f"RMDIR: {COMMON}/ZOR/logs")
    ends(outcome, 0)
    assert os.listdir(machine.at(BIG)) == []


def test_the_setting_of_the_common_directory_may_be_a_link(machine):
    machine.plant("/srv/site.properties", "corvan_common_dir=/srv/big/common\n")
    machine.link(SETTING, "/srv/site.properties")

    outcome = machine.run("i", "ABC", "-s", SPB)

    printed_lines(outcome, "Created Corvan Common Dir='/srv/big/common' result=0")
    ends(outcome, 0)
    assert machine.mode(BIG + "/common/ZOR/logs") == 0o777
    assert machine.read("/srv/site.properties") == "corvan_common_dir=/srv/big/common\n"
    assert target_of(machine, SETTING) == "/srv/site.properties"


# Files that are replaced.


def test_a_registry_that_is_a_link_stays_one(machine):
    prepare(machine, "registration")
    os.rename(machine.at("/etc/zor/zor.ini"), machine.at("/srv/registry"))
    machine.link("/etc/zor/zor.ini", "../../srv/registry")

    outcome = machine.run("i", "XYZ", "-s", SPB)

    ends(outcome, 0)
    assert target_of(machine, "/etc/zor/zor.ini") == "../../srv/registry"
    assert "ZOR_Exploiters = ABC:XYZ:\n" in machine.read("/srv/registry")
    assert machine.mode("/srv/registry") == 0o644
    assert sorted(os.listdir(machine.at("/srv"))) == ["big", "registry"]


def test_settings_that_are_a_link_stay_one(machine):
    prepare(machine, "upgrade")
    path = HOME + "/config/Zor.properties"
    os.rename(machine.at(path), machine.at("/srv/settings"))
    machine.link(path, "/srv/settings")

    outcome = machine.run("i", "XYZ", "-s", SPB)

    ends(outcome, 0)
    assert target_of(machine, path) == "/srv/settings"
    assert "hwscanner.changepriority=normal\n" in machine.read("/srv/settings")
    assert sorted(os.listdir(machine.at("/srv"))) == ["big", "settings"]


def test_a_file_of_the_package_takes_the_place_of_a_link(machine):
    prepare(machine, "upgrade")
    machine.plant("/srv/own", "own\n")
    machine.remove(HOME + "/bin/trawlhw")
    machine.link(HOME + "/bin/trawlhw", "/srv/own")

    outcome = machine.run("i", "XYZ", "-s", SPB)

    ends(outcome, 0)
    assert target_of(machine, HOME + "/bin/trawlhw") is None
    assert machine.read("/srv/own") == "own\n"


def test_a_file_of_the_package_is_written_through_a_dangling_link(machine):
    prepare(machine, "upgrade")
    machine.remove(HOME + "/bin/trawlhw")
    machine.link(HOME + "/bin/trawlhw", "/srv/new")

    outcome = machine.run("i", "XYZ", "-s", SPB)

    ends(outcome, 0)
    assert target_of(machine, HOME + "/bin/trawlhw") == "/srv/new"
    assert machine.read_bytes("/srv/new").startswith(b"\x7fELF hardware scanner")


def test_hard_links_of_the_administrator_get_their_modes(machine):
    prepare(machine, "registration")
    path = HOME + "/config/ZorHWConfig.xml"
    os.link(machine.at(path), machine.at("/srv/second"))
    machine.change_mode(path, 0o600)

    outcome = machine.run("i", "XYZ", "-s", SPB)

    assert refused_modes(outcome) == []
    ends(outcome, 0)
    assert machine.mode("/srv/second") == 0o644


# The log.


def log_of(machine, path, *, script='"$0" "$@"'):
    """Runs an installation by `script`, in which "$@" is the installer's command line."""
    outcome = machine.run_in_shell(script, "i", "ABC", "-o", path, "-s", SPB)
    ends(outcome, 0)
    return outcome


def test_the_log_goes_to_standard_output_by_its_name(machine):
    outcome = log_of(machine, "/dev/stdout")

    same_text(outcome.stdout, SHARED_TRANSCRIPT)


def test_the_log_goes_to_standard_error_by_its_name(machine):
    outcome = log_of(machine, "/dev/stderr")

    same_text(outcome.stderr, SHARED_TRANSCRIPT)


def test_the_log_goes_into_the_pipe_of_a_descriptor(machine):
    outcome = log_of(machine, "/dev/fd/7", script='{ "$0" "$@" 7>&1 >/tmp/out; } | cat')

    same_text(outcome.stdout, SHARED_TRANSCRIPT)
    assert machine.read("/tmp/out") == ""


def test_the_log_goes_into_a_process(machine):
    # The process ends after the installer: wait for its last word, in a shell without its pipe.
    script = (
        'mkfifo /tmp/end; /bin/bash -c \'"$0" "$@" -o >(cat >/tmp/log; echo >/tmp/end)\' '
        '"$0" "$@"; read -r _ </tmp/end'
    )

    machine.run_in_shell(script, "i", "ABC", "-s", SPB)

    same_text(machine.read("/tmp/log"), SHARED_TRANSCRIPT.split("\n", 1)[1])


def test_the_log_goes_to_a_descriptor_of_a_file(machine):
    log_of(machine, "/proc/self/fd/5", script='"$0" "$@" 5>/tmp/log')

    same_text(machine.read("/tmp/log"), SHARED_TRANSCRIPT)


def test_the_log_goes_through_a_link_of_root(machine):
    machine.link("/root/log", "/root/real.log")

    log_of(machine, "/root/log")

    same_text(machine.read("/root/real.log"), SHARED_TRANSCRIPT)
    assert target_of(machine, "/root/log") == "/root/real.log"


def test_the_log_goes_into_a_fifo_of_root(machine):
    machine.make_directory("/root/pipes", 0o700)
    os.mkfifo(machine.at("/root/pipes/log"))

    outcome = log_of(
        machine, "/root/pipes/log", script='cat /root/pipes/log & "$0" "$@" >/dev/null; wait'
    )

    same_text(outcome.stdout, SHARED_TRANSCRIPT)


def test_the_log_goes_to_a_device(machine):
    outcome = log_of(machine, "/dev/null")

    assert outcome.stdout == ""


# The package.


@pytest.mark.parametrize("name", ["/dev/fd/7", "/proc/self/fd/7", "/dev/stdin"])
def test_the_package_is_read_from_a_descriptor(machine, name):
    redirection = f"0<{SPB}" if name == "/dev/stdin" else f"7<{SPB}"

    outcome = machine.run_in_shell(f'"$0" "$@" {redirection}', "i", "ABC", "-s", name)

    same_text(outcome.stdout, SHARED_TRANSCRIPT.replace(SPB, name, 1))
    ends(outcome, 0)


def test_a_package_out_of_a_pipe_is_not_valid(machine):
    """An archive is read from its end."""
    outcome = machine.run_in_shell(f'cat {SPB} | "$0" "$@" 7<&0', "i", "ABC", "-s", "/dev/fd/7")

    printed_lines(outcome, "*** Error: package not found or not valid.")
    ends(outcome, 1)


def test_the_package_is_read_through_links(machine):
    machine.link("/media/latest.spb", "versions/spb")
    machine.link("/media/versions", "/media")
    machine.link("/media/spb", SPB)

    outcome = machine.run("i", "ABC", "-s", "/media/latest.spb")

    ends(outcome, 0)
    assert machine.exists(HOME + "/bin/trawlcfg")
