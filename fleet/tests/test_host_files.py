"""What the collection keeps on a host: which programs, how many packages, and for whom."""

import os

import pytest

from harness import fleet_plugins


@pytest.fixture
def files():
    return fleet_plugins.load("module_utils/host_files.py")


def test_the_two_newest_packages_are_kept(files, tmp_path):
    for age, name in enumerate(["newest", "previous", "old", "oldest"]):
        (tmp_path / name).mkdir()
        (tmp_path / name / "toolkit.spb").write_text(name)
        os.utime(tmp_path / name, (1000 - age, 1000 - age))
    (tmp_path / "current").symlink_to("oldest")

    files.forget_old(tmp_path)

    assert sorted(os.listdir(tmp_path)) == ["current", "newest", "previous"]


@pytest.mark.parametrize(
    "machine, loaders, offered, width",
    [
        ("x86_64", {"x86_64", "i686"}, {"x86_64", "i686"}, "x86_64"),
        ("x86_64", {"x86_64", "i686"}, {"i686"}, "i686"),
        ("x86_64", {"i686"}, {"x86_64", "i686"}, "i686"),
        ("i686", {"i686"}, {"x86_64", "i686"}, "i686"),
    ],
)
def test_a_host_gets_the_widest_programs_that_it_runs(
    files, monkeypatch, tmp_path, machine, loaders, offered, width
):
    for loader in loaders:
        (tmp_path / loader).touch()
    monkeypatch.setattr(files.platform, "machine", lambda: machine)
    monkeypatch.setattr(files, "LOADERS", {w: tmp_path / w for w in ("x86_64", "i686")})

    assert files.choose_width(offered) == width


def test_a_host_without_a_c_library_of_the_width_is_refused(files, monkeypatch, tmp_path):
    monkeypatch.setattr(files, "LOADERS", {"x86_64": tmp_path / "a", "i686": tmp_path / "b"})

    with pytest.raises(files.HostFilesError, match="libc6:i386 or glibc.i686"):
        files.choose_width({"i686"})


def test_directories_are_for_everybody_to_read_whatever_the_umask(files, tmp_path):
    before = os.umask(0o002)
    files.make_directory(str(tmp_path / "a/b"))
    os.umask(before)

    assert (tmp_path / "a").stat().st_mode & 0o777 == 0o755
    assert (tmp_path / "a/b").stat().st_mode & 0o777 == 0o755


def test_a_directory_that_others_can_write_to_is_refused(files, tmp_path):
    tmp_path.chmod(0o775)

    with pytest.raises(files.HostFilesError, match="only its user can write to"):
        files.check_own_directory(str(tmp_path))
