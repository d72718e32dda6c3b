"""`spb` looks into packages, compares, unpacks and signs them."""

import contextlib
import json
import os
import subprocess
import sys

import pytest

from harness import REPOSITORY, spb_tool
from harness.zip_archive import DEFLATED, IMAGE_ROOT, STORED, Archive

SCHEMAS = REPOSITORY / "build" / "cyclonedx"
OF_ABC = "ba7816bf8f01cfea414140de5dae2223b00361a396177a9cb410ff61f20015ad"


def planted(path, *entries):
    """A package of `entries`: names below the image root and contents."""
    archive = Archive()
    for name, data in entries:
        archive.add(IMAGE_ROOT + name, data)
    path.write_bytes(archive.content())
    return path


@pytest.fixture(name="spb")
def fixture_spb(tmp_path):
    return tmp_path / "toolkit.spb"


def test_info_shows_digests_and_what_an_upgrade_changes(spb):
    properties = b"version=1.2.3.4\nlsof.bin=/usr/bin/lsof\ntrawlnet.cputhreshold=0\n"
    planted(spb, ("bin/", b""), ("bin/abc", b"abc"), ("config/Zor.properties", properties))

    done = spb_tool.run("info", "--json", spb)

    assert (done.returncode, done.stderr) == (0, "")
    info = json.loads(done.stdout)
    assert info["size"] == spb.stat().st_size
    assert info["version"] == "1.2.3.4"
    assert (info["directories"], info["passed_over"], info["content"]) == (1, 0, 66)
    assert info["files"][0] == {"place": "bin/abc", "size": 3, "sha256": OF_ABC, "sound": True}
    assert info["upgrade_blanks"] == ["lsof.bin", "trawlnet.cputhreshold"]
    assert "hwscanner.changepriority=normal" in info["upgrade_adds"]
    assert (
        subprocess.run(["sha256sum", spb], capture_output=True, check=True)
        .stdout.decode()
        .split()[0]
        == info["sha256"]
    )
    lines = spb_tool.run("info", spb).stdout.splitlines()
    assert f"{OF_ABC}           3  bin/abc" in lines
    assert "upgrade blanks: lsof.bin" in lines


def test_diff_reports_files_modes_and_keys(tmp_path):
    one = planted(
        tmp_path / "one",
        ("bin/", b""),
        ("bin/gone", b"1"),
        ("bin/same", b"2"),
        ("config/a.properties", b"x=1\ny=2\n#z=3\n"),
    )
    two = planted(
        tmp_path / "two",
        ("bin/", b""),
        ("bin/new", b"1"),
        ("bin/same", b"2"),
        ("config/a.properties", b"x=5\nw=2\n"),
    )

    done = spb_tool.run("diff", one, two)

    assert (done.returncode, done.stderr) == (1, "")
    assert done.stdout == (
        "removed: bin/gone\n"
        "added: bin/new\n"
        "changed: config/a.properties: 13 -> 8\n"
        "key-added: config/a.properties: w=2\n"
        "key-changed: config/a.properties: x: 1 -> 5\n"
        "key-removed: config/a.properties: y=2\n"
    )
    assert json.loads(spb_tool.run("diff", "--json", one, two).stdout)["differences"][0] == {
        "what": "removed",
        "place": "bin/gone",
        "from": "1",
        "to": "",
    }
    same = spb_tool.run("diff", one, one)
    assert (same.returncode, same.stdout, same.stderr) == (0, "", "")
    assert spb_tool.run("diff", one, tmp_path / "three").returncode == 2


def test_diff_reports_the_modes_that_the_archives_record(tmp_path):
    for name, mode in (("one", 0o100755), ("two", 0o100644)):
        archive = Archive().add(IMAGE_ROOT + "bin/a", b"1", made_by=3 << 8, attributes=mode << 16)
        (tmp_path / name).write_bytes(archive.content())

    done = spb_tool.run("diff", tmp_path / "one", tmp_path / "two")

    assert (done.returncode, done.stdout) == (1, "mode: bin/a: 0755 -> 0644\n")


def tree_of(directory):
    """Every path below `directory`, with its permissions and, for files, the content."""
    return {
        str(path.relative_to(directory)): (
            path.stat().st_mode & 0o7777,
            path.read_bytes() if path.is_file() else None,
        )
        for path in directory.rglob("*")
    }


def test_extract_unpacks_what_the_installer_would_install(tmp_path, spb):
    planted(
        spb,
        ("bin/", b""),
        ("bin//a", b"1"),
        ("bin/a", b"2"),
        ("install/x.sh", b"3"),
        ("config/Zor.properties", b"4"),
        ("doc/no", b"5"),
    )
    target = tmp_path / "target"

    done = subprocess.run(
        [spb_tool.TOOL, "extract", spb, "-d", target],
        capture_output=True,
        text=True,
        check=False,
        umask=0o022,
    )

    assert (done.returncode, done.stdout, done.stderr) == (0, "", "")
    assert tree_of(target) == {
        "bin": (0o755, None),
        "bin/a": (0o755, b"2"),
        "install": (0o750, None),
        "install/x.sh": (0o750, b"3"),
        "config": (0o755, None),
        "config/Zor.properties": (0o644, b"4"),
    }


@pytest.mark.parametrize("name", ["bin/../../evil", "bin/../evil", "bin/x/../../../evil"])
def test_extract_refuses_a_name_that_leads_out(tmp_path, spb, name):
    target = tmp_path / "target"
    planted(spb, ("bin/", b""), (name, b"evil"))

    done = spb_tool.run("extract", spb, "-d", target)

    assert (done.returncode, done.stdout) == (1, "")
    assert done.stderr == f"spb: {target}/{name}: leads out of its directory\n"
    assert sorted(tree_of(tmp_path)) == ["target", "target/bin", "toolkit.spb"]


def test_extract_lists_nothing_for_an_absolute_name(tmp_path, spb):
    spb.write_bytes(Archive().add("/etc/evil", b"1").add(IMAGE_ROOT + "bin/a", b"2").content())

    assert spb_tool.run("extract", spb, "-d", tmp_path / "target").returncode == 0

    assert sorted(tree_of(tmp_path)) == ["target", "target/bin", "target/bin/a", "toolkit.spb"]


def test_extract_follows_no_link_and_replaces_no_file(tmp_path, spb):
    outside, target = tmp_path / "outside", tmp_path / "target"
    outside.mkdir()
    (outside / "file").write_bytes(b"old")
    (target / "config").mkdir(parents=True)
    (target / "bin").symlink_to(outside)
    (target / "config" / "link").symlink_to(outside / "file")
    (target / "config" / "file").write_bytes(b"old")
    planted(spb, ("bin/a", b"1"), ("config/link", b"2"), ("config/file", b"3"), ("config/b", b"4"))

    done = spb_tool.run("extract", spb, "-d", target)

    assert done.returncode == 1
    assert done.stderr == (
        f"spb: {target}/bin/a: Not a directory\n"
        f"spb: {target}/config/link: File exists\n"
        f"spb: {target}/config/file: File exists\n"
    )
    assert os.listdir(outside) == ["file"] and (outside / "file").read_bytes() == b"old"
    assert (target / "config" / "file").read_bytes() == b"old"
    assert (target / "config" / "b").read_bytes() == b"4"


# Exchanges two names as fast as it can.
EXCHANGE = """
import ctypes, sys
libc = ctypes.CDLL(None)
here, there = (name.encode() for name in sys.argv[1:])
print("ready", flush=True)
while True:
    libc.renameat2(-100, here, -100, there, 2)
"""


@contextlib.contextmanager
def exchanging(here, there):
    """Somebody exchanges the names `here` and `there` meanwhile."""
    command = [sys.executable, "-c", EXCHANGE, here, there]
    with subprocess.Popen(command, stdout=subprocess.PIPE) as attacker:
        assert attacker.stdout.readline() == b"ready\n"
        yield
        assert attacker.poll() is None
        attacker.kill()


@pytest.mark.skipif(os.geteuid() != 0, reason="needs root, to give away a link")
def test_extract_goes_through_no_link_of_another_user(tmp_path, spb):
    planted(spb, ("bin/", b""), ("bin/abc", b"abc"))
    (tmp_path / "elsewhere").mkdir()
    (tmp_path / "target").symlink_to("elsewhere")
    os.chown(tmp_path / "target", 4242, 4242, follow_symlinks=False)

    done = spb_tool.run("extract", spb, "-d", tmp_path / "target")

    assert (done.returncode, os.listdir(tmp_path / "elsewhere")) == (2, [])
    assert done.stderr == f"spb: {tmp_path}/target: No such file or directory\n"


def test_extract_writes_nothing_outside_while_directories_become_links(tmp_path, spb):
    """Writing by paths would reach the link's target within the first dozen files."""
    names = [f"bin/deep/{number:03}" for number in range(400)]
    planted(spb, ("bin/", b""), *((name, b"1") for name in names))
    outside = tmp_path / "outside"
    outside.mkdir()
    exchanged = set()
    for number in range(5):
        target = tmp_path / f"target{number}"
        deep, link = target / "bin" / "deep", target / "link"
        deep.mkdir(parents=True)
        link.symlink_to(outside)

        with exchanging(deep, link):
            done = spb_tool.run("extract", spb, "-d", target)

        assert done.returncode in (0, 1)
        exchanged.add(done.returncode)
        assert set(done.stderr.splitlines()) <= {
            f"spb: {target}/{name}: Not a directory" for name in names
        }
        assert os.listdir(outside) == []
    assert 1 in exchanged  # the link was met


@pytest.mark.parametrize(
    "method, fields, reason",
    [
        (STORED, {"crc": 1}, "is damaged"),
        (DEFLATED, {"size": 3}, "is damaged"),
        (STORED, {"flags": 1}, "is encrypted"),
        (12, {}, "cannot be opened"),
    ],
    ids=["crc", "size", "encrypted", "method"],
)
def test_extract_leaves_nothing_of_a_damaged_entry(tmp_path, spb, method, fields, reason):
    spb.write_bytes(Archive().add(IMAGE_ROOT + "bin/a", b"data", method, **fields).content())
    target = tmp_path / "target"

    done = spb_tool.run("extract", spb, "-d", target)

    assert (done.returncode, done.stderr) == (1, f"spb: {target}/bin/a: {reason}\n")
    assert os.listdir(target / "bin") == []


def test_the_bill_of_materials_names_every_file_with_its_hash(spb):
    planted(spb, ("bin/", b""), ("bin/abc", b"abc"))

    bill = json.loads(spb_tool.run("sbom", spb).stdout)

    assert (bill["bomFormat"], bill["specVersion"]) == ("CycloneDX", "1.5")
    assert bill["components"] == [
        {
            "type": "file",
            "bom-ref": "bin/abc",
            "name": "bin/abc",
            "hashes": [{"alg": "SHA-256", "content": OF_ABC}],
        }
    ]


def test_the_bill_of_materials_is_valid(spb):
    jsonschema = pytest.importorskip("jsonschema")
    if not SCHEMAS.exists():
        pytest.skip("scripts/fetch_cyclonedx_schema has not been run")
    spb.write_bytes(spb_tool.archive({"bin/\xff\n": b"odd"}).content())
    schemas = {path.name: json.loads(path.read_text()) for path in SCHEMAS.glob("*.json")}
    store = {schema["$id"]: schema for schema in schemas.values() if "$id" in schema}
    schema = schemas["bom-1.5.SNAPSHOT.schema.json"]
    resolver = jsonschema.RefResolver.from_schema(
        schema,
        store={
            **store,
            **{
                schema["$id"].rsplit("/", 1)[0] + "/" + name: content
                for name, content in schemas.items()
            },
        },
    )

    bill = json.loads(spb_tool.run("sbom", spb).stdout)

    jsonschema.Draft7Validator(schema, resolver=resolver).validate(bill)
    bill["components"][0]["hashes"][0]["content"] = "no hash"
    with pytest.raises(jsonschema.ValidationError):
        jsonschema.Draft7Validator(schema, resolver=resolver).validate(bill)


@pytest.fixture(name="signers")
def fixture_signers(tmp_path):
    """The list of those who may sign; the key of the one is tmp_path/key."""
    for name in "key", "other":
        subprocess.run(
            ["ssh-keygen", "-q", "-t", "ed25519", "-N", "", "-f", tmp_path / name], check=True
        )
    signers = tmp_path / "signers"
    signers.write_text("maker@example.org " + (tmp_path / "key.pub").read_text())
    return signers


def test_a_signature_of_an_allowed_signer_is_good(tmp_path, spb, signers):
    planted(spb, ("bin/a", b"1"))
    assert spb_tool.run("sign", spb, "-k", tmp_path / "key").returncode == 0

    done = spb_tool.run("verify", spb, "-s", signers)

    assert (done.returncode, done.stderr) == (0, "")
    assert done.stdout == f"{spb}: signed by maker@example.org\n"
    assert json.loads(spb_tool.run("verify", "--json", spb, "-s", signers).stdout) == {
        "file": str(spb),
        "signature": f"{spb}.sig",
        "good": True,
        "principal": "maker@example.org",
    }
    # As everybody can verify it without this tool, in the namespace "spb".
    with spb.open("rb") as file:
        subprocess.run(
            [
                "ssh-keygen",
                "-Y",
                "verify",
                "-f",
                signers,
                "-I",
                "maker@example.org",
                "-n",
                "spb",
                "-s",
                f"{spb}.sig",
            ],
            stdin=file,
            check=True,
            stdout=subprocess.DEVNULL,
        )


def test_who_is_excluded_has_not_signed(tmp_path, spb, signers):
    planted(spb, ("bin/a", b"1"))
    signers.write_text("!other@example.org,*@example.org " + (tmp_path / "key.pub").read_text())
    assert spb_tool.run("sign", spb, "-k", tmp_path / "key").returncode == 0

    done = spb_tool.run("verify", spb, "-s", signers)

    assert (done.returncode, done.stdout) == (0, f"{spb}: signed by *@example.org\n")


@pytest.mark.parametrize(
    "program, message",
    [
        (None, "spb: ssh-keygen: No such file or directory\n"),
        (b"no program", "spb: {path}/ssh-keygen could not be run\n"),
    ],
    ids=["missing", "not executable"],
)
def test_without_ssh_keygen_nothing_is_known(tmp_path, spb, signers, program, message):
    planted(spb, ("bin/a", b"1"))
    assert spb_tool.run("sign", spb, "-k", tmp_path / "key").returncode == 0
    if program:
        (tmp_path / "ssh-keygen").write_bytes(program)
        (tmp_path / "ssh-keygen").chmod(0o755)

    done = spb_tool.run("verify", spb, "-s", signers, env={"PATH": str(tmp_path)})

    assert (done.returncode, done.stdout) == (2, "")
    assert done.stderr == message.format(path=tmp_path)


@pytest.mark.parametrize(
    "key, changed", [("key", True), ("other", False)], ids=["changed package", "other signer"]
)
def test_another_signature_is_bad(tmp_path, spb, signers, key, changed):
    planted(spb, ("bin/a", b"1"))
    assert spb_tool.run("sign", spb, "-k", tmp_path / key).returncode == 0
    if changed:
        planted(spb, ("bin/a", b"2"))

    done = spb_tool.run("verify", spb, "-s", signers)

    assert (done.returncode, done.stderr) == (1, "")
    assert done.stdout == f"{spb}: no good signature of an allowed signer\n"


def test_a_signature_that_cannot_be_looked_at_is_trouble(spb, signers):
    planted(spb, ("bin/a", b"1"))

    done = spb_tool.run("verify", spb, "-s", signers)

    assert (done.returncode, done.stdout) == (2, "")
    assert done.stderr == f"spb: {spb}.sig: No such file or directory\n"


def test_a_key_that_cannot_sign_leaves_no_signature(tmp_path, spb):
    planted(spb, ("bin/a", b"1"))

    assert spb_tool.run("sign", spb, "-k", tmp_path / "nowhere").returncode == 2

    assert os.listdir(tmp_path) == ["toolkit.spb"]


@pytest.mark.parametrize("command", ["info", "sbom", "extract"])
def test_a_file_that_is_no_package_is_trouble(tmp_path, spb, command):
    spb.write_bytes(b"no package")
    options = ["-d", tmp_path / "target"] if command == "extract" else []

    done = spb_tool.run(command, spb, *options)

    assert (done.returncode, done.stdout) == (2, "")
    assert done.stderr.startswith(f"spb: {spb}: surprises: central-directory: ")
    assert not (tmp_path / "target").exists()


def test_a_fifo_does_not_block(tmp_path):
    os.mkfifo(tmp_path / "fifo")

    done = spb_tool.run("check", tmp_path / "fifo", timeout=60)

    assert (done.returncode, done.stderr) == (2, f"spb: {tmp_path}/fifo: Invalid argument\n")
