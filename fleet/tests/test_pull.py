"""The example of docs/fleet.md in which a machine pulls its state from a mirror."""

import functools
import hashlib
import re
import shutil
import subprocess
import threading
from http.server import SimpleHTTPRequestHandler, ThreadingHTTPServer

import pytest

from harness import REPOSITORY

COLLECTION = "usr/share/ansible/collections/ansible_collections/corvan/zor"
GIT = ("git", "-c", "user.name=admin", "-c", "user.email=admin@example.org")


def documented_playbook():
    page = (REPOSITORY / "docs/fleet.md").read_text()
    blocks = [part.partition("```")[0] for part in page.split("```yaml\n")[1:]]
    (found,) = [block for block in blocks if "hosts: localhost" in block]
    return found


class Requests(SimpleHTTPRequestHandler):
    """Serves a directory, and notes what was asked for."""

    def log_message(self, *_):  # pylint: disable=arguments-differ
        self.server.paths.append(self.path)


class Mirror:
    """An HTTP server with the packages and a repository of the playbook."""

    def __init__(self, directory):
        self.directory = directory
        handler = functools.partial(Requests, directory=directory)
        self.server = ThreadingHTTPServer(("127.0.0.1", 0), handler)
        self.server.paths = []
        self.url = f"http://127.0.0.1:{self.server.server_port}"
        threading.Thread(target=self.server.serve_forever).start()

    def publish(self, package):
        """Offers the SPB `package`, and the documented playbook with its checksum."""
        shutil.copy(package, self.directory / "toolkit.spb")
        digest = hashlib.sha256(package.read_bytes()).hexdigest()
        playbook = documented_playbook()
        old_url, old_digest = "https://mirror.example.org", "SHA-256 of the SPB"
        assert playbook.count(old_url) == playbook.count(old_digest) == 1
        tree = self.directory / "site"
        git = (*GIT, "-C", tree)
        if not tree.exists():
            subprocess.run(["git", "init", "-q", tree], check=True)
        text = playbook.replace(old_url, self.url).replace(old_digest, digest)
        (tree / "local.yml").write_text(text)
        for line in (["add", "."], ["commit", "-q", "-m", "State"], ["update-server-info"]):
            subprocess.run([*git, *line], check=True)

    def take_requests(self):
        """How often the SPB was fetched since the last call."""
        paths = list(self.server.paths)
        self.server.paths.clear()
        return paths.count("/toolkit.spb")

    def close(self):
        self.server.shutdown()
        self.server.server_close()


@pytest.fixture
def mirror(tmp_path):
    directory = tmp_path / "mirror"
    directory.mkdir()
    served = Mirror(directory)
    yield served
    served.close()


def equip(host, media):
    """Installs the collection and the programs on a host, as packages would."""
    leave_out = shutil.ignore_patterns("tests", "harness", "__pycache__")
    shutil.copytree(REPOSITORY / "fleet", f"{host.root}/{COLLECTION}", ignore=leave_out)
    (programs,) = media.programs.iterdir()
    for program in programs.iterdir():
        shutil.copy(program, f"{host.root}/usr/local/bin/{program.name}")


def pull(host, mirror):
    """Runs ansible-pull on the host; returns how many tasks changed something, and failed."""
    environment = "env -i PATH=/usr/local/bin:/usr/bin:/bin HOME=/root LC_ALL=C.UTF-8"
    line = f"{environment} ansible-pull --full -U {mirror.url}/site/.git 2>&1"
    output = host.run(line, check=False).stdout
    print(output)
    (counts,) = re.findall(r"localhost +: .*changed=(\d+) .* failed=(\d+)", output)
    return tuple(map(int, counts))


def test_a_machine_pulls_what_it_lacks_and_mends_itself(media, mirror, start_fleet):
    host = start_fleet(1).hosts["host1"]
    equip(host, media)
    status = "/usr/local/bin/zorctl status --format shell"

    mirror.publish(media.v1)
    first = pull(host, mirror), mirror.take_requests()
    again = pull(host, mirror), mirror.take_requests()
    host.run("rm /opt/corvan/zor/bin/trawlcfg")
    mended = pull(host, mirror), mirror.take_requests()
    mirror.publish(media.v2)
    upgraded = pull(host, mirror), mirror.take_requests()

    assert first == ((2, 0), 1)
    assert again == ((0, 0), 0)
    assert mended == ((1, 0), 0)
    assert upgraded == ((2, 0), 1)
    assert "ZORCTL_0_HEALTH='intact'" in host.run(status).stdout
