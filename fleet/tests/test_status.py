"""The role corvan.zor.status: local facts about the installations of a host."""


def facts(fleet, host="host1"):
    tasks = [{"name": "show", "ansible.builtin.debug": {"var": "ansible_local.corvan_zor"}}]
    roles = ["corvan.zor.status"]
    play = fleet.play(
        [{"hosts": host, "gather_facts": False, "roles": roles, "tasks": tasks}],
        ANSIBLE_INJECT_FACT_VARS="True",
    )
    assert (play.status, play.warnings) == (0, [])
    changed = [task for (task, _), result in play.results.items() if result["changed"]]
    return play.result("show", host)["ansible_local.corvan_zor"], changed


def test_the_facts_are_those_of_zorctl(media, start_fleet):
    fleet = start_fleet(1)
    call = {"exploiter": "SHOP", "spb": str(media.v1), "programs": str(media.programs)}
    tasks = [{"name": "install", "corvan.zor.toolkit": call}]

    without, changed = facts(fleet)
    fleet.play([{"hosts": "host1", "gather_facts": False, "tasks": tasks}])
    fleet.hosts["host1"].run("rm /opt/corvan/zor/bin/trawlcfg")
    found, changed_again = facts(fleet)

    assert without == {"installations": []}
    assert len(changed) == 2 and changed_again == []
    assert found["tool"] == {"version": "9.2.30.0000", "build_date": "22/12/02"}
    shared = found["installations"][0]
    assert (shared["type"], shared["health"]) == ("global", "damaged")
    assert shared["exploiters"] == ["SHOP"]
