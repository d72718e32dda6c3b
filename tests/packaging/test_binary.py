"""The shipping binary as a file: what it needs, its debug symbols, and what it must not contain."""

import os
import re
import subprocess
import zlib

import pytest

# Built with the C library of a newer system than releases are, the program needs more: the C++
# library inside asks for it.
BUILT_WITH = os.confstr("CS_GNU_LIBC_VERSION")
RELEASES_BUILT_WITH = "glibc 2.36"  # Debian 12


def check(tree, *arguments):
    return subprocess.run(
        [tree / "scripts/check_binary", *arguments], capture_output=True, text=True, check=False
    )


@pytest.fixture
def debug_file(binary):
    return binary.with_name("wzorinst.debug")


@pytest.fixture
def needs(tree, binary):
    """The lines of the list of what this binary may need."""
    if BUILT_WITH != RELEASES_BUILT_WITH:
        pytest.skip(f"releases are built with {RELEASES_BUILT_WITH}, this one with {BUILT_WITH}")
    is_32_bit = binary.read_bytes()[4] == 1
    name = "needs-i686.txt" if is_32_bit else "needs-x86_64.txt"
    return (tree / "packaging" / name).read_text().splitlines()


def check_against(tree, binary, lines, tmp_path):
    (tmp_path / "needs").write_text("\n".join(lines) + "\n")
    return check(tree, "--needs", tmp_path / "needs", binary)


@pytest.mark.usefixtures("needs")
def test_the_binary_needs_what_is_listed_and_has_every_protection(tree, binary):
    outcome = check(tree, binary)

    assert (outcome.returncode, outcome.stderr) == (0, "")
    assert "\n  libc.so.6: GLIBC_2.34\n" in outcome.stdout
    assert outcome.stdout.endswith(
        """\
Protections:
  position-independent
  read-only relocations
  all symbols bound at start
  stack not executable
  nothing both writable and executable
  no relocation in code
  no library search path
  stack protector
  checked calls of the C library
  stripped
  names its debug symbols
"""
    )


def test_a_newer_version_than_listed_fails_and_names_its_symbols(tree, binary, needs, tmp_path):
    lines = [line.replace("libc.so.6: GLIBC_2.34", "libc.so.6: GLIBC_2.33") for line in needs]

    outcome = check_against(tree, binary, lines, tmp_path)

    assert outcome.returncode == 1
    assert re.fullmatch(
        r"new need: libc\.so\.6: GLIBC_2\.34, for .*\b__libc_start_main\b.*\n", outcome.stderr
    )


def test_a_library_that_is_not_listed_fails(tree, binary, needs, tmp_path):
    lines = [line for line in needs if not line.startswith("libc.so.6")]

    outcome = check_against(tree, binary, lines, tmp_path)

    assert outcome.returncode == 1
    assert outcome.stderr.startswith("new need: libc.so.6: GLIBC_2.34, for ")


def test_another_interpreter_than_listed_fails(tree, binary, needs, tmp_path):
    lines = [re.sub("^interpreter: .*", "interpreter: /lib/other.so", line) for line in needs]

    outcome = check_against(tree, binary, lines, tmp_path)

    assert outcome.returncode == 1
    assert re.fullmatch(r"new need: interpreter: /lib\S*/ld-linux\S*\n", outcome.stderr)


def test_a_newer_kernel_than_listed_fails(tree, binary, needs, tmp_path):
    lines = [line.replace("kernel: 3.2.0", "kernel: 2.6.32") for line in needs]

    outcome = check_against(tree, binary, lines, tmp_path)

    assert (outcome.returncode, outcome.stderr) == (1, "new need: kernel: 3.2.0\n")


def test_a_smaller_need_is_reported_and_passes(tree, binary, needs, tmp_path):
    lines = [line.replace("GLIBC_2.34", "GLIBC_2.100") for line in needs] + ["libz.so.1: ZLIB_1.2"]

    outcome = check_against(tree, binary, lines, tmp_path)

    assert (outcome.returncode, outcome.stderr) == (0, "")
    assert outcome.stdout.endswith(
        "Listed, but not needed: libc.so.6: GLIBC_2.100\n"
        "Listed, but not needed: libz.so.1: ZLIB_1.2\n"
    )


def compile_and_check(tree, tmp_path, source, *options):
    (tmp_path / "program.c").write_text(source)
    subprocess.run(
        ["gcc", *options, "-o", tmp_path / "program", tmp_path / "program.c"],
        check=True,
        stderr=subprocess.DEVNULL,
    )
    return check(tree, tmp_path / "program")


def test_every_protection_that_a_program_lacks_is_named(tree, tmp_path):
    outcome = compile_and_check(
        tree,
        tmp_path,
        "int main(void) { return 0; }\n",
        "-fno-stack-protector",
        "-no-pie",
        "-Wl,-z,norelro,-z,lazy,-z,execstack,-rpath,/opt",
        "-g",
    )

    assert outcome.returncode == 1
    assert (
        outcome.stderr
        == """\
missing: position-independent
missing: read-only relocations
missing: all symbols bound at start
missing: stack not executable
missing: no library search path
missing: stack protector
missing: checked calls of the C library
missing: stripped
missing: names its debug symbols
"""
    )


CHANGEABLE_CODE = r"""
__attribute__((section(".changeable,\"awx\",@progbits#"))) int changeable(void) { return 0; }
char text[9];
char *absolute_address(void) { return text; }
int main(void) { return changeable() + *absolute_address(); }
"""


def test_code_that_can_be_written_to_is_named(tree, tmp_path):
    outcome = compile_and_check(
        tree, tmp_path, CHANGEABLE_CODE, "-m32", "-fno-pic", "-pie", "-Wl,-z,notext"
    )

    assert outcome.returncode == 1
    assert "missing: nothing both writable and executable\n" in outcome.stderr
    assert "missing: no relocation in code\n" in outcome.stderr


def test_what_is_not_a_program_cannot_be_checked(tree):
    outcome = check(tree, tree / "README.md")

    assert outcome.returncode == 2
    assert outcome.stderr.startswith("check_binary: ")


def section(path, name):
    """The bytes of one section of a program."""
    return subprocess.run(
        [
            "objcopy",
            "--output-target=binary",
            "--only-section",
            name,
            "--set-section-flags",
            f"{name}=alloc",
            path,
            "/dev/stdout",
        ],
        capture_output=True,
        check=True,
    ).stdout


def test_the_binary_names_its_debug_file_and_its_checksum(binary, debug_file):
    link = section(binary, ".gnu_debuglink")

    assert link[:-4].rstrip(b"\0") == b"wzorinst.debug"
    assert int.from_bytes(link[-4:], "little") == zlib.crc32(debug_file.read_bytes())


def test_the_debug_file_has_the_names_and_lines_of_the_sources(debug_file):
    names = subprocess.run(
        ["nm", "--demangle", debug_file], capture_output=True, text=True, check=True
    ).stdout
    address = re.search(r"^(\w+) T main$", names, re.MULTILINE).group(1)
    place = subprocess.run(
        ["addr2line", "-e", debug_file, address], capture_output=True, text=True, check=True
    ).stdout

    assert re.fullmatch(
        r"/usr/src/wzorinst-9\.2\.30/src/install/standalone/wzorinst\.cpp:\d+\n", place
    )


def test_neither_file_contains_the_place_of_its_build(binary, debug_file, tree, build):
    for path in (binary, debug_file):
        content = path.read_bytes()
        assert [place for place in (tree, build) if bytes(place) in content] == [], path
