"""The example toolkit: its scanner control, its scanners, and what it carries for the installer."""

import os
import shutil
import subprocess

import pytest

from harness import REPOSITORY

BUILD_TOOLKIT = REPOSITORY / "scripts" / "build_toolkit.sh"


@pytest.fixture(scope="module")
def built(tmp_path_factory):
    out = tmp_path_factory.mktemp("built") / "toolkit"
    subprocess.run([BUILD_TOOLKIT, out], check=True)
    return out


@pytest.fixture
def home(built, tmp_path):
    """A toolkit as it is after an installation; the blank shows that its programs quote."""
    home = tmp_path / "zor home"
    shutil.copytree(built, home)
    (home / "bin" / "etc").mkdir()
    return home


def run(home, program, *arguments, **environment):
    inherited = {k: v for k, v in os.environ.items() if not k.startswith("ZOR_")}
    return subprocess.run(
        [home / "bin" / program, *arguments],
        capture_output=True,
        text=True,
        check=False,
        timeout=60,
        env={**inherited, **environment},
    )


def tree_of(home):
    return {
        path.relative_to(home): (path.stat().st_mode, path.is_file() and path.read_bytes())
        for path in home.rglob("*")
    }


INSTALLER_COMMANDS = [
    ("trawlcfg", "-s", "common_trace_path", "/usr/kel/corvan/common/ZOR/logs"),
    ("trawlcfg", "-s", "common_trace_path", "/a path/with blanks"),
    ("trawlfs", "-shutdown"),
    ("trawlcfg", "-disable", "all"),
    ("trawlcfg", "-shutdown", "all", "-timeout", "60", "-force"),
    ("trawlcfg", "-shutdown", "all", "-timeout", "120"),
    ("trawlcfg", "-enable", "all"),
]


@pytest.mark.parametrize("command", INSTALLER_COMMANDS, ids=" ".join)
def test_every_command_line_of_the_installer_succeeds_silently(home, command):
    done = run(home, *command)

    assert (done.returncode, done.stdout, done.stderr) == (0, "", "")


@pytest.mark.parametrize(
    "command",
    [
        (),
        ("-s", "common_trace_path"),
        ("-s", "other", "/x"),
        ("-disable",),
        ("-disable", "trawlhw"),
        ("-shutdown",),
        ("-shutdown", "all"),
        ("-shutdown", "all", "-timeout", "soon"),
        ("-shutdown", "all", "-timeout", "60", "-gently"),
        ("-enable", "all", "more"),
    ],
    ids=" ".join,
)
def test_any_other_command_line_is_a_usage_error(home, command):
    done = run(home, "trawlcfg", *command)

    assert done.returncode == 2
    assert done.stderr.startswith("Usage: trawlcfg ")


def test_the_command_log_holds_every_command_line_in_order(home, tmp_path):
    log = tmp_path / "commands"

    for command in INSTALLER_COMMANDS:
        run(home, *command, ZOR_COMMAND_LOG=str(log))

    assert log.read_text() == (
        "trawlcfg -s common_trace_path /usr/kel/corvan/common/ZOR/logs\n"
        'trawlcfg -s common_trace_path "/a path/with blanks"\n'
        "trawlfs -shutdown\n"
        "trawlcfg -disable all\n"
        "trawlcfg -shutdown all -timeout 60 -force\n"
        "trawlcfg -shutdown all -timeout 120\n"
        "trawlcfg -enable all\n"
    )
    assert not (home / "config" / "trawlcfg.log").exists()


def test_the_command_log_holds_failed_and_wrong_commands_too(home, tmp_path):
    log = tmp_path / "commands"

    run(home, "trawlcfg", "-disable", "all", ZOR_COMMAND_LOG=str(log), ZOR_FAIL="-disable all:3")
    run(home, "trawlcfg", "-wrong", ZOR_COMMAND_LOG=str(log))

    assert log.read_text() == "trawlcfg -disable all\ntrawlcfg -wrong\n"


def test_a_command_log_that_cannot_be_written_is_reported(home, tmp_path):
    done = run(home, "trawlcfg", "-disable", "all", ZOR_COMMAND_LOG=str(tmp_path / "no" / "log"))

    assert done.returncode == 1
    assert not (home / "config" / "trawlcfg.state").exists()


def test_without_a_place_of_its_own_the_command_log_is_in_the_configuration(home):
    run(home, "trawlcfg", "-disable", "all")
    run(home, "trawlfs", "-shutdown")

    log = home / "config" / "trawlcfg.log"
    assert log.read_text() == "trawlcfg -disable all\ntrawlfs -shutdown\n"


def test_the_state_file_lists_what_differs_from_the_start(home):
    run(home, "trawlcfg", "-s", "common_trace_path", "/a path/with blanks")
    run(home, "trawlcfg", "-disable", "all")

    state = home / "config" / "trawlcfg.state"
    assert state.read_text() == "scanners=disabled\ncommon_trace_path=/a path/with blanks\n"
    assert state.stat().st_mode & 0o7777 == 0o644
    assert not (home / "config" / "Zor.tmp").exists()


def test_enabling_keeps_the_trace_path(home):
    run(home, "trawlcfg", "-s", "common_trace_path", "/traces")
    run(home, "trawlcfg", "-disable", "all")

    run(home, "trawlcfg", "-enable", "all")

    assert (home / "config" / "trawlcfg.state").read_text() == "common_trace_path=/traces\n"


def test_stopping_and_enabling_leaves_the_home_as_it_was(home, tmp_path):
    before = tree_of(home)

    for command in INSTALLER_COMMANDS[2:]:
        run(home, *command, ZOR_COMMAND_LOG=str(tmp_path / "commands"))

    assert tree_of(home) == before


@pytest.mark.parametrize(
    "failure, command, status",
    [
        ("-disable all:3", ("trawlcfg", "-disable", "all"), 3),
        ("trawlcfg -disable all:3", ("trawlcfg", "-disable", "all"), 3),
        ("-disable:3", ("trawlcfg", "-disable", "all"), 3),
        ("-s common_trace_path:9", ("trawlcfg", "-s", "common_trace_path", "/x"), 9),
        ('-s common_trace_path "/x y":9', ("trawlcfg", "-s", "common_trace_path", "/x y"), 9),
        ("trawlfs -shutdown:7", ("trawlfs", "-shutdown"), 7),
        ("-enable all:1;trawlfs -shutdown:7", ("trawlfs", "-shutdown"), 7),
        ("-shutdown all -timeout 120:5", ("trawlcfg", *"-shutdown all -timeout 120".split()), 5),
        ("-enable all:3", ("trawlcfg", "-disable", "all"), 0),
        ("trawlfs -shutdown:7", ("trawlcfg", *"-shutdown all -timeout 120".split()), 0),
        ("-disab:3", ("trawlcfg", "-disable", "all"), 0),
        ("-shutdown all -timeout 120:5", ("trawlcfg", *"-shutdown all -timeout 60".split()), 0),
        ("", ("trawlcfg", "-disable", "all"), 0),
    ],
)
def test_the_environment_makes_one_command_fail(home, failure, command, status):
    assert run(home, *command, ZOR_FAIL=failure).returncode == status


def test_a_command_that_is_made_to_fail_leaves_nothing_behind(home):
    before = tree_of(home)

    run(home, "trawlcfg", "-s", "common_trace_path", "/x", ZOR_FAIL="-s common_trace_path:9")

    assert tree_of(home) == before


def test_the_service_of_the_file_system_scanner_ends_at_its_shutdown(home):
    cache = home / "cache_data" / "trawlfs.cache"
    cache.parent.mkdir()
    os.mkfifo(cache)  # reading it waits until the service has made its first scan
    service = subprocess.Popen([home / "bin" / "trawlfs", "-service", home / "config", "60"])
    assert cache.read_text().startswith("File system\n")
    assert "running=trawlfs\n" in run(home, "trawlcfg", "-status").stdout

    assert run(home, "trawlfs", "-shutdown").returncode == 0

    assert service.wait(timeout=10) == 0
    assert "running=" not in run(home, "trawlcfg", "-status").stdout
    assert not list((home / "bin" / "etc" / "trawlfs").iterdir())


def test_a_number_that_another_process_uses_now_is_not_stopped(home):
    marks = home / "bin" / "etc" / "trawlhw"
    marks.mkdir()
    other = subprocess.Popen(["sleep", "60"])
    (marks / str(other.pid)).touch()

    done = run(home, "trawlcfg", "-shutdown", "all", "-timeout", "0", "-force")

    assert done.returncode == 0
    assert other.poll() is None
    assert not list(marks.iterdir())
    other.kill()
    other.wait()


@pytest.mark.parametrize(
    "scanner", [["trawlhw"], ["trawlsw"], ["trawlvpd"], ["trawlfs", "-scan", "/"]]
)
def test_no_scanner_runs_while_the_scanners_are_disabled(home, scanner):
    run(home, "trawlcfg", "-disable", "all")

    done = run(home, *scanner)

    assert done.returncode == 4
    assert done.stderr == f"{scanner[0]}: the scanners are disabled\n"


def test_the_hardware_scanner_reports_the_fields_of_its_configuration(home):
    lines = run(home, "trawlhw").stdout.splitlines()

    assert lines[0] == "Hardware"
    assert [line.split(" = ")[0] for line in lines[1:]] == [
        "  machine",
        "  processors",
        "  memory_kb",
        "  page_size",
        "  fs_size_kb",
    ]
    assert f"  machine = {os.uname().machine}" in lines
    assert f"  processors = {os.sysconf('SC_NPROCESSORS_ONLN')}" in lines


def test_the_software_scanner_asks_the_custom_scanners_too(home):
    custom = home / "bin" / "customscanners" / "answer"
    custom.write_text("#!/bin/sh\necho 42\n")
    custom.chmod(0o755)

    lines = run(home, "trawlsw").stdout.splitlines()

    assert lines[0] == "Software"
    assert f"  kernel = {os.uname().release}" in lines
    assert "  answer = 42" in lines


def test_the_vital_product_data_scanner_takes_the_first_answer_of_its_plugins(home):
    for name, answer in ("a", "first"), ("b", "second"):
        plugin = home / "bin" / "plugins" / name
        plugin.write_text(f'#!/bin/sh\n[ "$1" != sys_vendor ] || echo {answer}\n')
        plugin.chmod(0o755)

    lines = run(home, "trawlvpd").stdout.splitlines()

    assert lines[:2] == ["Vital product data", "  sys_vendor = first"]


def test_the_file_system_scanner_counts_files(home, tmp_path):
    (tmp_path / "scanned" / "deep").mkdir(parents=True)
    for name in "a", "deep/b", "deep/c\nd":
        (tmp_path / "scanned" / name).write_text("1")

    lines = run(home, "trawlfs", "-scan", tmp_path / "scanned").stdout.splitlines()

    assert lines[0] == "File system"
    assert "  files = 3" in lines


def test_scanners_write_their_traces_to_the_common_trace_path(home, tmp_path):
    run(home, "trawlcfg", "-s", "common_trace_path", str(tmp_path))

    run(home, "trawlvpd")

    assert (tmp_path / "trawl.log").read_text().endswith("] started\n")


@pytest.mark.parametrize(
    "file, placeholders",
    [
        (
            "config/Zor.properties",
            "$(ZOR_DestinationDir) $(ZOR_ConfigRootDirectory) $(CorvanCommonDir)"
            " $(FileSeparator) $(fscanner_mode)",
        ),
        ("config/ZorTrace.properties", "$(ZOR_DestinationDir) $(ZOR_ConfigRootDirectory)"),
        (
            "install/trawlcfg.sh",
            "$(ZOR_DestinationDir) $(ZOR_ConfigRootDirectory) $(CorvanCommonDir)",
        ),
        (
            "install/rmdirs.sh",
            "$(ZOR_DestinationDir) $(ZOR_ConfigRootDirectory) $(CorvanCommonDir)",
        ),
    ],
)
def test_the_files_that_the_installer_fills_in_hold_its_placeholders(built, file, placeholders):
    text = (built / file).read_text()

    assert [word for word in placeholders.split() if word not in text] == []


def test_the_scripts_of_the_install_directory_run_once_they_are_filled_in(home):
    for script in "trawlcfg.sh", "rmdirs.sh":
        path = home / "install" / script
        text = path.read_text()
        for placeholder in "$(ZOR_DestinationDir)", "$(ZOR_ConfigRootDirectory)":
            text = text.replace(placeholder, str(home))
        path.write_text(text.replace("$(CorvanCommonDir)", str(home / "common")))
        path.chmod(0o750)
    (home / "logs").mkdir()

    control, rmdirs = home / "install" / "trawlcfg.sh", home / "install" / "rmdirs.sh"
    where = subprocess.run([control, "-where"], capture_output=True, check=False)
    disable = subprocess.run([control, "-disable", "all"], check=False)
    removed = subprocess.run([rmdirs], capture_output=True, check=False)

    assert where.stdout.decode() == (
        f"home={home}\nconfig={home}/config\ntraces={home}/common/ZOR/logs\n"
    )
    assert disable.returncode == 0
    assert (home / "config" / "trawlcfg.state").read_text() == "scanners=disabled\n"
    assert removed.stdout.decode() == f"Removed {home}/logs\nRemoved {home}/bin/etc\n"


def test_the_toolkit_carries_no_file_that_the_installer_writes(built):
    assert not (built / "install" / "zor_install.properties").exists()
    assert not (built / "config" / "SingleUserMode").exists()


def test_building_twice_gives_the_same_bytes(built, tmp_path):
    subprocess.run([BUILD_TOOLKIT, tmp_path / "again"], check=True)

    assert tree_of(tmp_path / "again") == tree_of(built)


def test_building_into_an_older_build_deletes_what_is_no_longer_there(tmp_path):
    subprocess.run([BUILD_TOOLKIT, tmp_path], check=True)
    (tmp_path / "bin" / "old").write_text("1")
    (tmp_path / "notes").write_text("mine")

    subprocess.run([BUILD_TOOLKIT, tmp_path], check=True)

    assert not (tmp_path / "bin" / "old").exists()
    assert (tmp_path / "notes").read_text() == "mine"
