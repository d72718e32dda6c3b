"""The packages: names, contents, and the life of an installed .deb and .rpm.

A package is installed into a root directory of the test's own, while the machine's own files can
only be read. That directory holds nothing but the package, so a program that runs there needs
nothing else than the C library, which alone is borrowed.
"""

import gzip
import os
import re
import subprocess
import tarfile
from pathlib import Path

import pytest

from harness import bubblewrap

VERSION = "9.2.30"

# What differs between the two builds: names of the processor, and rpm's name of the C library.
I686 = {"processor": "i686", "debian": "i386", "library": "libc.so.6(GLIBC_2.34)"}
X86_64 = {"processor": "x86_64", "debian": "amd64", "library": "libc.so.6(GLIBC_2.34)(64bit)"}

INSTALLED = """\
755 /usr/bin/wzorinst
644 /usr/share/bash-completion/completions/wzorinst
644 /usr/share/doc/wzorinst/CHANGELOG.md
644 /usr/share/doc/wzorinst/SECURITY.md
644 /usr/share/doc/wzorinst/administrators.md
644 /usr/share/doc/wzorinst/exploiters.md
644 /usr/share/man/man8/wzorinst.8.gz
"""

SPB_INSTALLED = """\
755 /usr/bin/dh_wzorinst
755 /usr/bin/spb
644 /usr/lib/rpm/macros.d/macros.wzorinst
644 /usr/share/bash-completion/completions/spb
644 /usr/share/debhelper/autoscripts/postinst-wzorinst
644 /usr/share/debhelper/autoscripts/postrm-wzorinst
644 /usr/share/debhelper/autoscripts/prerm-wzorinst
644 /usr/share/man/man1/dh_wzorinst.1.gz
644 /usr/share/man/man1/spb.1.gz
644 /usr/share/perl5/Debian/Debhelper/Sequence/wzorinst.pm
"""

ZORCTL_INSTALLED = """\
755 /usr/bin/zorctl
644 /usr/share/bash-completion/completions/zorctl
644 /usr/share/man/man8/zorctl.8.gz
"""

STATUS_REPORT = """\
ZOR installer version: 22/12/02zor_9.2.30.0000
Default install type: global
Corvan common dir = /usr/kel/corvan/common

Status of shared (global) installation:
INI file = /etc/zor/zor.ini
Not installed

Status of installation for current user:
*** Error: cannot retrieve home directory for current user.
INI file = /etc/zor/zor.ini
Not installed
"""


@pytest.fixture(scope="module")
def names(binary):
    return I686 if binary.read_bytes()[4] == 1 else X86_64


@pytest.fixture(scope="module")
def packages(build, tmp_path_factory):
    """The directory that holds the packages of this build."""
    directory = tmp_path_factory.mktemp("packages")
    made = subprocess.run(
        ["cpack", "--config", build / "CPackConfig.cmake", "-B", directory],
        capture_output=True,
        text=True,
        check=False,
    )
    assert made.returncode == 0, made.stdout + made.stderr
    return directory


@pytest.fixture
def root(tmp_path):
    """The root directory of a machine on which nothing but the C library is installed."""
    directory = tmp_path / "root"
    for path in (
        "etc",
        "var/lib/dpkg/info",
        "var/lib/dpkg/updates",
        "var/lib/rpm",
        "usr/lib",
        "usr/lib32",
        "usr/lib64",
        "proc",
        "dev",
    ):
        (directory / path).mkdir(parents=True)
    for name in ("lib", "lib32", "lib64"):
        (directory / name).symlink_to(f"usr/{name}")
    for name in ("status", "available"):
        (directory / "var/lib/dpkg" / name).touch()
    yield directory
    bubblewrap.delete_root(str(directory))


def sandbox(*options):
    return [
        "bwrap",
        "--die-with-parent",
        "--unshare-user",
        "--unshare-pid",
        "--uid",
        "0",
        "--gid",
        "0",
        "--cap-add",
        "ALL",
        *options,
        "--proc",
        "/proc",
        "--dev",
        "/dev",
        "--",
    ]


def manage(root, *command):
    """Runs a package manager, which can write to nothing but the root directory."""
    done = subprocess.run(
        [*sandbox("--ro-bind", "/", "/", "--bind", root, root), *command],
        capture_output=True,
        text=True,
        check=False,
    )
    assert done.returncode == 0, done.stdout + done.stderr


def dpkg(root, *arguments):
    # The other architecture and the missing record of the C library are no hindrance here.
    manage(
        root,
        "dpkg",
        f"--root={root}",
        "--log=/dev/null",
        "--force-architecture",
        "--force-depends",
        "--force-not-root",
        *arguments,
    )


def rpm(root, *arguments):
    manage(root, "rpm", "--root", root, "--dbpath", "/var/lib/rpm", *arguments)


def run_installed(root, *command):
    libraries = [
        word
        for path in ("/usr/lib", "/usr/lib32", "/usr/lib64")
        if os.path.isdir(path)
        for word in ("--ro-bind", path, path)
    ]
    return subprocess.run(
        [
            *sandbox("--bind", root, "/", *libraries, "--clearenv", "--setenv", "PATH", "/usr/bin"),
            *command,
        ],
        capture_output=True,
        text=True,
        check=False,
    )


def with_debian_files(installed, package):
    """The files of a .deb: `installed`, and the two that only such packages have."""
    lines = installed.splitlines(keepends=True) + [
        f"644 /usr/share/doc/{package}/changelog.Debian.gz\n",
        f"644 /usr/share/lintian/overrides/{package}\n",
    ]
    return "".join(sorted(lines, key=lambda line: line.split()[1]))


def installed_files(root):
    """Mode and path of every file below the root directory's /usr."""
    found = [path for path in (root / "usr").rglob("*") if not path.is_dir()]
    return "".join(
        f"{path.stat().st_mode & 0o7777:o} /{path.relative_to(root)}\n" for path in sorted(found)
    )


def whole_tree(root):
    return sorted(str(path) for path in root.rglob("*") if "/var/lib/" not in str(path))


def debian_fields(package):
    lines = subprocess.run(
        ["dpkg-deb", "--field", package], capture_output=True, text=True, check=True
    ).stdout.splitlines()
    return dict(line.split(": ", 1) for line in lines if line and not line.startswith(" "))


def rpm_query(package, *query):
    return subprocess.run(
        ["rpm", "--query", "--package", *query, package], capture_output=True, text=True, check=True
    ).stdout


def test_the_packages_have_the_names_that_their_systems_expect(packages, names):
    processor, debian = names["processor"], names["debian"]

    assert sorted(path.name for path in packages.iterdir() if path.is_file()) == sorted(
        [
            f"wzorinst-{VERSION}-linux-{processor}.tar.gz",
            f"wzorinst-debug-{VERSION}-linux-{processor}.tar.gz",
            f"wzorinst-spb-{VERSION}-linux-{processor}.tar.gz",
            f"wzorinst-zorctl-{VERSION}-linux-{processor}.tar.gz",
            f"wzorinst_{VERSION}-1_{debian}.deb",
            f"wzorinst-dbgsym_{VERSION}-1_{debian}.deb",
            f"wzorinst-spb_{VERSION}-1_{debian}.deb",
            f"wzorinst-zorctl_{VERSION}-1_{debian}.deb",
            f"wzorinst-{VERSION}-1.{processor}.rpm",
            f"wzorinst-debuginfo-{VERSION}-1.{processor}.rpm",
            f"wzorinst-spb-{VERSION}-1.{processor}.rpm",
            f"wzorinst-zorctl-{VERSION}-1.{processor}.rpm",
        ]
    )


@pytest.fixture
def deb(packages, names):
    return packages / f"wzorinst_{VERSION}-1_{names['debian']}.deb"


@pytest.fixture
def rpm_package(packages, names):
    return packages / f"wzorinst-{VERSION}-1.{names['processor']}.rpm"


def test_the_deb_needs_the_c_library_alone(deb, names):
    fields = debian_fields(deb)

    assert fields["Architecture"] == names["debian"]
    assert fields["Version"] == "9.2.30-1"
    assert fields["Depends"] == "libc6 (>= 2.34)"
    assert fields["Description"] == "installer of the ZOR inventory-scanning toolkit"


def test_an_installed_deb_runs_and_its_removal_leaves_nothing(deb, root, binary):
    before = whole_tree(root)

    dpkg(root, "--install", deb)

    assert installed_files(root) == with_debian_files(INSTALLED, "wzorinst")
    assert (root / "usr/bin/wzorinst").read_bytes() == binary.read_bytes()
    report = run_installed(root, "wzorinst", "t")
    assert (report.returncode, report.stdout, report.stderr) == (0, STATUS_REPORT, "")

    dpkg(root, "--remove", "wzorinst")

    assert whole_tree(root) == before


def test_the_rpm_needs_the_c_library_alone(rpm_package, names):
    needs = rpm_query(rpm_package, "--requires").splitlines()

    assert names["library"] in needs
    assert [
        need for need in needs if not need.startswith(("libc.so.6", "ld-linux", "rtld(", "rpmlib("))
    ] == []
    assert rpm_query(rpm_package, "--queryformat", "%{NAME} %{VERSION}-%{RELEASE} %{ARCH}") == (
        f"wzorinst 9.2.30-1 {names['processor']}"
    )


def test_an_installed_rpm_runs_and_its_removal_leaves_nothing(rpm_package, root, binary):
    before = whole_tree(root)

    rpm(root, "--install", "--nodeps", "--ignorearch", rpm_package)

    assert installed_files(root) == INSTALLED
    assert (root / "usr/bin/wzorinst").read_bytes() == binary.read_bytes()
    report = run_installed(root, "wzorinst", "t")
    assert (report.returncode, report.stdout, report.stderr) == (0, STATUS_REPORT, "")

    rpm(root, "--erase", "wzorinst")

    assert [path for path in whole_tree(root) if Path(path).is_file()] == []
    assert set(before) - set(whole_tree(root)) == set()


def test_neither_package_runs_a_script_of_its_own(deb, rpm_package):
    members = subprocess.run(["dpkg-deb", "--ctrl-tarfile", deb], capture_output=True, check=True)
    names = subprocess.run(["tar", "-t"], input=members.stdout, capture_output=True, check=True)

    assert sorted(names.stdout.decode().split()) == ["./control", "./md5sums"]
    assert rpm_query(rpm_package, "--scripts") == ""


def test_the_archive_unpacks_into_a_directory_of_its_name(packages, names):
    top = f"wzorinst-{VERSION}-linux-{names['processor']}"

    with tarfile.open(packages / f"{top}.tar.gz") as archive:
        files = sorted(f"{member.mode:o} {member.name}" for member in archive if member.isfile())

    assert "".join(line + "\n" for line in files) == "".join(
        sorted(INSTALLED.replace("/usr/", f"{top}/").splitlines(keepends=True))
    )


def test_the_tool_for_spbs_is_a_deb_that_needs_the_c_library_alone(packages, names, root):
    deb = packages / f"wzorinst-spb_{VERSION}-1_{names['debian']}.deb"

    dpkg(root, "--install", deb)

    assert installed_files(root) == with_debian_files(SPB_INSTALLED, "wzorinst-spb")
    assert debian_fields(deb)["Depends"] == "libc6 (>= 2.34)"
    shown = run_installed(root, "spb", "--version")
    assert (shown.returncode, shown.stdout, shown.stderr) == (0, f"spb {VERSION}\n", "")


def test_the_tool_for_spbs_is_an_rpm_that_needs_the_c_library_alone(packages, names):
    package = packages / f"wzorinst-spb-{VERSION}-1.{names['processor']}.rpm"

    needs = rpm_query(package, "--requires").splitlines()
    assert names["library"] in needs
    expected = ("libc.so.6", "ld-linux", "rtld(", "rpmlib(")
    assert [need for need in needs if not need.startswith(expected)] == []
    assert rpm_query(package, "--list").split() == [
        line.split()[1] for line in SPB_INSTALLED.splitlines()
    ]


def test_zorctl_is_a_deb_that_needs_both_programs_of_its_version(packages, names, root):
    deb = packages / f"wzorinst-zorctl_{VERSION}-1_{names['debian']}.deb"

    dpkg(root, "--install", deb)

    assert installed_files(root) == with_debian_files(ZORCTL_INSTALLED, "wzorinst-zorctl")
    assert debian_fields(deb)["Depends"] == (
        "libc6 (>= 2.34), wzorinst (= 9.2.30-1), wzorinst-spb (= 9.2.30-1)"
    )
    shown = run_installed(root, "zorctl", "--version")
    assert (shown.returncode, shown.stdout, shown.stderr) == (
        0,
        "zorctl 9.2.30\n",
        "",
    )


def test_zorctl_is_an_rpm_that_needs_both_programs_of_its_version(packages, names):
    package = packages / f"wzorinst-zorctl-{VERSION}-1.{names['processor']}.rpm"

    needs = rpm_query(package, "--requires").splitlines()
    expected = ("libc.so.6", "ld-linux", "rtld(", "rpmlib(")
    assert [need for need in needs if not need.startswith(expected)] == [
        "wzorinst = 9.2.30-1",
        "wzorinst-spb = 9.2.30-1",
    ]
    assert rpm_query(package, "--list").split() == [
        line.split()[1] for line in ZORCTL_INSTALLED.splitlines()
    ]


def test_programs_of_either_architecture_serve_products_of_the_other_one(packages):
    kinds = {
        path.name.split("_")[0]: debian_fields(path)["Multi-Arch"]
        for path in packages.glob("*.deb")
    }

    assert kinds == {
        "wzorinst": "foreign",
        "wzorinst-dbgsym": "same",
        "wzorinst-spb": "foreign",
        "wzorinst-zorctl": "foreign",
    }


def test_the_debian_changelog_is_that_of_the_version(deb, root):
    dpkg(root, "--install", deb)

    with gzip.open(root / "usr/share/doc/wzorinst/changelog.Debian.gz", "rt") as changelog:
        assert changelog.readline() == "wzorinst (9.2.30-1) unstable; urgency=medium\n"


def test_lintian_finds_no_errors(packages):
    checked = subprocess.run(
        ["lintian", "--allow-root", "--fail-on", "error", *packages.glob("*.deb")],
        capture_output=True,
        text=True,
        check=False,
    )

    assert checked.returncode == 0, checked.stdout + checked.stderr


def test_rpmlint_finds_no_errors(packages, tree):
    checked = subprocess.run(
        ["rpmlint", "--rpmlintrc", tree / "packaging/rpmlintrc", *packages.glob("*.rpm")],
        capture_output=True,
        text=True,
        check=False,
    )

    # Not every version finds what another one has to be told not to report.
    errors = set(re.findall(r" E: (\S+)", checked.stdout)) - {"unused-rpmlintrc-filter"}
    assert errors == set(), checked.stdout + checked.stderr
    assert "4 packages and 0 specfiles checked; " in checked.stdout, checked.stderr


def test_the_debug_symbols_are_where_a_debugger_looks_for_them(packages, names, root):
    deb = packages / f"wzorinst-dbgsym_{VERSION}-1_{names['debian']}.deb"

    dpkg(root, "--install", deb)

    symbols = "644 /usr/lib/debug/usr/bin/wzorinst.debug\n"
    assert installed_files(root) == with_debian_files(symbols, "wzorinst-dbgsym")
    assert debian_fields(deb)["Depends"] == "wzorinst (= 9.2.30-1)"


def test_everything_in_a_package_has_the_time_of_the_release(deb, rpm_package):
    listing = subprocess.run(
        ["dpkg-deb", "--contents", deb],
        env={**os.environ, "TZ": "UTC"},
        capture_output=True,
        text=True,
        check=True,
    ).stdout

    assert {" ".join(line.split()[3:5]) for line in listing.splitlines()} == {"2022-12-02 00:00"}
    times = rpm_query(rpm_package, "--queryformat", "%{BUILDTIME} [%{FILEMTIMES} ]")
    assert set(times.split()) == {"1669939200"}


def test_install_goes_below_the_prefix_that_is_given(build, tmp_path):
    subprocess.run(
        ["cmake", "--install", build, "--prefix", tmp_path], check=True, capture_output=True
    )

    found = sorted(
        str(path.relative_to(tmp_path)) for path in tmp_path.rglob("*") if not path.is_dir()
    )
    assert found == sorted(
        line.split()[1].removeprefix("/usr/")
        for line in (INSTALLED + SPB_INSTALLED + ZORCTL_INSTALLED).splitlines()
    )
