"""The report of a roll-out: its page, and how a roll-out continues the report that it finds."""

import html.parser
import json

import pytest

from harness import fleet_plugins

PACKAGE = {"name": "toolkit.spb", "sha256": "ab" * 32}
OTHER = {"name": "toolkit.spb", "sha256": "cd" * 32}


@pytest.fixture(scope="module")
def report():
    fleet_plugins.load("plugin_utils/gate.py")
    return fleet_plugins.load("plugin_utils/report.py")


def host(state, version=None, message=None, operation=None, reason=None):
    return {
        "state": state,
        "version": version,
        "build_date": "22/12/02" if version else None,
        "reason": reason,
        "operation": operation,
        "changed": operation is not None,
        "message": message,
    }


HOSTS = {
    "b": host("failed", "9.1.30.0000", "<b>no & space</b>"),
    "a": host("healthy", "9.2.30.0000", None, "upgrade", "older-installed"),
    "c": host("waiting"),
}


def content(hosts, package=None, stopped=True):
    return {
        "package": package or PACKAGE,
        "stopped": stopped,
        "reason": "1 of 2 hosts of a batch failed" if stopped else None,
        "started": "2026-01-01T10:00:00+00:00",
        "updated": "2026-01-01T10:05:00+00:00",
        "hosts": hosts,
    }


class Outline(html.parser.HTMLParser):
    """The rows of all tables, and whether every element is closed."""

    def __init__(self):
        super().__init__()
        self.rows, self.open = [], []

    def handle_starttag(self, tag, attrs):
        if tag not in ("meta", "br"):
            self.open.append(tag)
        if tag == "tr":
            self.rows.append([])

    def handle_endtag(self, tag):
        assert self.open.pop() == tag

    def handle_data(self, data):
        if self.open and self.open[-1] in ("td", "th"):
            self.rows[-1].append(data)
        elif self.open and self.open[-1] == "b":
            raise AssertionError("a message became markup")


def test_the_page_shows_failures_versions_and_all_hosts(report, tmp_path):
    report.write(tmp_path, content(HOSTS))

    outline = Outline()
    outline.feed((tmp_path / "report.html").read_text())
    assert not outline.open
    assert outline.rows == [
        ["Host", "Message"],
        ["b", "<b>no & space</b>"],
        ["Version", "Hosts"],
        ["9.1.30.0000 of 22/12/02", "1"],
        ["9.2.30.0000 of 22/12/02", "1"],
        ["unknown", "1"],
        ["Host", "State", "Version", "What was done"],
        ["a", "healthy", "9.2.30.0000 of 22/12/02", "upgrade: older-installed"],
        ["b", "failed", "9.1.30.0000 of 22/12/02", "failed"],
        ["c", "waiting", "unknown", "nothing yet"],
    ]


@pytest.mark.parametrize(
    "hosts, stopped, line",
    [
        (HOSTS, True, "3 hosts: 1 healthy, 1 failed, 1 waiting.</strong> Stopped: 1 of 2 hosts"),
        (HOSTS, False, "3 hosts: 1 healthy, 1 failed, 1 waiting.</strong> Not complete."),
        ({"a": HOSTS["a"]}, False, "1 hosts: 1 healthy, 0 failed, 0 waiting.</strong> Complete."),
    ],
)
def test_the_page_begins_with_the_outcome(report, tmp_path, hosts, stopped, line):
    report.write(tmp_path, content(hosts, stopped=stopped))

    assert line in (tmp_path / "report.html").read_text()


def test_unfinished_hosts_are_a_list_for_limit(report, tmp_path):
    report.write(tmp_path, content(HOSTS))

    assert (tmp_path / "unfinished").read_text() == "b\nc\n"


def test_only_the_three_files_are_left(report, tmp_path):
    report.write(tmp_path, content(HOSTS))

    names = sorted(path.name for path in tmp_path.iterdir())
    assert names == ["report.html", "report.json", "unfinished"]
    assert json.loads((tmp_path / "report.json").read_text())["schema"] == 1


def test_the_same_package_continues_the_report(report, tmp_path):
    report.write(tmp_path, content(HOSTS))

    hosts = report.hosts_before(report.load(tmp_path), PACKAGE, ["c", "d"])

    assert hosts == {**HOSTS, "d": host("waiting")}


def test_another_package_keeps_only_versions(report, tmp_path):
    report.write(tmp_path, content(HOSTS))

    hosts = report.hosts_before(report.load(tmp_path), OTHER, ["a", "d"])

    assert hosts == {"a": host("waiting", "9.2.30.0000"), "d": host("waiting")}


def test_a_host_that_could_not_be_asked_keeps_its_version(report):
    hosts = {"a": host("healthy", "9.1.30.0000")}

    report.merge(hosts, {"a": host("failed", None, "unreachable: gone")})

    assert hosts == {"a": host("failed", "9.1.30.0000", "unreachable: gone")}
