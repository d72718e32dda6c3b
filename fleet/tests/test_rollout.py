"""The role corvan.zor.rollout: an upgrade that stops, and what comes after it.

One story of eight hosts, told by the runs of the fixture. The tests look at how each ended.
"""

import json
import re
from dataclasses import dataclass

import pytest

from harness.fleet_trials import Fleet, Play, tree_of

INSTALL = "corvan.zor.rollout : Install the toolkit"
JUDGE = "corvan.zor.rollout : Judge the batch"
ALL = [f"host{number}" for number in range(1, 9)]
KILLED, BROKEN, FULL, SILENT = "host2", "host3", "host4", "host5"
HELD_BACK = ["host6", "host7", "host8"]
CONTROL = "opt/corvan/zor/bin/trawlcfg"


@dataclass
class Chapter:
    """A run of the playbook, the report that it left, and the hosts afterwards."""

    play: Play
    report: dict
    unfinished: list
    versions: dict  # registered, by host
    trees: dict

    @property
    def changed(self):
        """The hosts on which the module changed something."""
        return sorted(
            host
            for (task, host), result in self.play.results.items()
            if task == INSTALL and result.get("changed")
        )

    @property
    def asked(self):
        """The hosts on which the module was run, reached or not."""
        return sorted(host for task, host in self.play.results if task == INSTALL)


class Story:
    """The fleet and the media, and a way to roll out."""

    def __init__(self, media, count):
        self.media = media
        self.fleet = Fleet(count)
        self.directory = self.fleet.directory / "report"

    def roll_out(self, spb, programs, *arguments, plays=None, **variables):
        variables = {
            "zor_rollout_exploiter": "SHOP",
            "zor_rollout_programs": str(programs),
            "zor_rollout_report": str(self.directory),
            **variables,
        }
        values = self.fleet.directory / "values.json"
        values.write_text(json.dumps(variables))
        packages = self.fleet.directory / "host_vars"
        packages.mkdir(exist_ok=True)
        for host in self.fleet.hosts:
            package = self.media.broken if host in variables.get("broken", []) else spb
            (packages / f"{host}.json").write_text(json.dumps({"zor_rollout_spb": str(package)}))
        plays = plays or [{"import_playbook": "corvan.zor.rollout"}]
        play = self.fleet.play(plays, f"-e@{values}", *arguments)
        report = self.directory / "report.json"
        return Chapter(
            play,
            json.loads(report.read_text()) if report.exists() else None,
            (self.directory / "unfinished").read_text().split() if report.exists() else None,
            {name: self.version(host) for name, host in self.fleet.hosts.items()},
            {name: tree_of(host) for name, host in self.fleet.hosts.items()},
        )

    @staticmethod
    def version(host):
        with open(host.root + "/etc/zor/zor.ini", encoding="utf-8") as file:
            return re.search("^ZOR_Version = (.*)$", file.read(), re.MULTILINE)[1]

    def spoil(self):
        """Prepares a host for each kind of failure."""
        hosts = self.fleet.hosts
        hosts[KILLED].run("touch /etc/interrupt")
        hosts[FULL].run(
            "mkdir /srv/disk; size=$(du -sk /opt | cut -f1);"
            'mount -t tmpfs -o mode=0755,size="$((size + 40))k" disk /srv/disk;'
            "cp -a /opt/. /srv/disk; mount --move /srv/disk /opt"
        )
        hosts[SILENT].run("kill -9 -1", check=False)

    def mend(self):
        hosts = self.fleet.hosts
        hosts[KILLED].run("rm /etc/interrupt")
        hosts[FULL].run("mount -o remount,size=100m /opt")
        hosts[SILENT].run("/usr/sbin/sshd -E /var/log/sshd.log")


@pytest.fixture(scope="module")
def story(media):
    found = Story(media, len(ALL))
    media = found.media
    found.first = found.roll_out(media.v1, media.older, zor_rollout_batches=[8])
    found.spoil()
    upgrade = {"zor_rollout_batches": [1, 4, 3], "zor_rollout_max_failures": 75}
    found.check = found.roll_out(media.v2, media.programs, "--check", broken=[BROKEN], **upgrade)
    found.stopped = found.roll_out(media.v2, media.programs, broken=[BROKEN], **upgrade)
    found.mend()
    rest = f"@{found.directory}/unfinished"
    found.page = (found.directory / "report.html").read_text()
    found.resumed = found.roll_out(
        media.v2, media.programs, "--limit", rest, zor_rollout_batches=[1, "100%"]
    )
    found.again = found.roll_out(media.v2, media.programs, zor_rollout_batches=[8])
    back = {"zor_rollout_batches": [1, "100%"], "zor_rollout_rollback": True}
    found.refused = found.roll_out(media.v1, media.older, **back)
    found.back = found.roll_out(media.v1, media.programs, **back)
    yield found
    found.fleet.close()


def test_no_run_warns(story):
    chapters = (story.first, story.check, story.stopped, story.resumed, story.again, story.back)
    assert [chapter.play.warnings for chapter in chapters] == [[]] * 6


def test_a_first_roll_out_installs_everywhere(story):
    assert story.first.play.status == 0
    assert story.first.changed == ALL
    assert set(story.first.versions.values()) == {"9.1.30.0000"}
    assert story.first.unfinished == []


def test_a_roll_out_stops_after_the_batch_that_failed(story):
    assert story.stopped.play.status == 2
    assert story.stopped.asked == ["host1", KILLED, BROKEN, FULL, SILENT]
    assert story.stopped.unfinished == [KILLED, BROKEN, FULL, SILENT, *HELD_BACK]
    assert story.stopped.report["stopped"] is True
    assert story.stopped.report["reason"] == "4 of 4 hosts of a batch failed"


def test_hosts_that_were_not_upgraded_keep_their_version(story):
    kept = [BROKEN, FULL, SILENT, *HELD_BACK]
    assert story.stopped.versions["host1"] == "9.2.30.0000"
    assert {story.stopped.versions[host] for host in kept} == {"9.1.30.0000"}
    for host in kept:
        assert story.stopped.trees[host][CONTROL] == story.first.trees[host][CONTROL]


@pytest.mark.parametrize(
    "host, message",
    [
        (KILLED, "wzorinst was ended by signal 9"),
        (BROKEN, "the installation would fail: the package /var/cache/corvan.zor/packages/"),
        (FULL, "the installation would fail: "),
        (SILENT, "unreachable: (Task failed: )?Failed to connect to the host via ssh: "),
    ],
)
def test_the_report_names_each_failure(story, host, message):
    found = story.stopped.report["hosts"][host]

    assert (found["state"], found["version"]) == ("failed", "9.1.30.0000")
    assert re.match(message, found["message"])


def test_the_report_counts_the_hosts(story):
    states = {host: found["state"] for host, found in story.stopped.report["hosts"].items()}
    versions = {host: found["version"] for host, found in story.stopped.report["hosts"].items()}

    assert states == {
        "host1": "healthy",
        **dict.fromkeys([KILLED, BROKEN, FULL, SILENT], "failed"),
        **dict.fromkeys(HELD_BACK, "waiting"),
    }
    assert versions == {**dict.fromkeys(ALL, "9.1.30.0000"), "host1": "9.2.30.0000"}
    assert "<strong>8 hosts: 1 healthy, 4 failed, 3 waiting.</strong>" in story.page
    assert "<td>9.1.30.0000 of 22/12/02</td><td>7</td>" in story.page


def test_a_check_predicts_the_failures_and_changes_nothing(story):
    judged = story.check.play.result(JUDGE, KILLED)

    assert story.check.play.status == 2
    assert judged["failed_hosts"] == [BROKEN, FULL, SILENT]
    assert story.check.report == story.first.report
    assert story.check.versions == story.first.versions
    reached = [host for host in ALL if host not in (KILLED, FULL, SILENT)]
    for host in reached:
        assert story.check.trees[host] == story.first.trees[host]


def test_a_second_run_finishes_the_job(story):
    assert story.resumed.play.status == 0
    assert story.resumed.changed == [host for host in ALL if host != "host1"]
    assert story.resumed.unfinished == []
    assert story.resumed.report["stopped"] is False
    assert set(story.resumed.versions.values()) == {"9.2.30.0000"}
    assert {host["state"] for host in story.resumed.report["hosts"].values()} == {"healthy"}
    assert sorted(story.resumed.report["hosts"]) == ALL


def test_all_hosts_have_the_same_files_then(story):
    def toolkit(host):
        tree = story.resumed.trees[host]
        return {
            path: (mode, uid, gid, content)
            for path, (mode, uid, gid, _, content) in tree.items()
            if path.startswith("opt/corvan/zor/") and not path.endswith(("ZOR_files", "cfg.log"))
        }

    assert CONTROL in toolkit("host1")
    for host in ALL[1:]:
        assert toolkit(host) == toolkit("host1")


def test_a_roll_out_of_what_is_there_changes_nothing(story):
    assert story.again.play.status == 0
    assert story.again.changed == []
    assert story.again.asked == ALL
    assert story.again.trees == story.resumed.trees


def test_an_older_program_cannot_roll_back(story):
    """It would only register, so the canary stops it."""
    message = "a newer version is installed, and an older one cannot replace it"

    assert story.refused.play.status == 2
    assert story.refused.asked == ["host1"]
    assert story.refused.report["hosts"]["host1"]["message"] == message
    assert set(story.refused.versions.values()) == {"9.2.30.0000"}


def test_the_previous_package_is_rolled_back_by_the_programs_of_today(story):
    assert story.back.play.status == 0
    assert story.back.changed == ALL
    assert set(story.back.versions.values()) == {"9.2.30.0000"}
    for host in ALL:
        assert story.back.trees[host][CONTROL][-1] == story.first.trees[host][CONTROL][-1]


def test_another_strategy_than_linear_is_refused(story):
    for strategy in ("free", "host_pinned"):
        play = {"hosts": "all", "gather_facts": False, "strategy": strategy}
        play["roles"] = ["corvan.zor.rollout"]
        chapter = story.roll_out(story.media.v2, story.media.programs, plays=[play])

        assert chapter.play.status == 2
        assert f"with {strategy}, hosts do not wait for each other" in chapter.play.output
        assert chapter.asked == []
