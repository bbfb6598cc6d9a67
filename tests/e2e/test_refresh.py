"""The local lists of users and groups: complete or as they were, whatever happens to the controllers."""

import time

from client import DIRECTORY


def names(machine, kind, domain):
    page = machine.client.call(DIRECTORY, 1, kind, {"domain": domain, "offset": 0, "limit": 1000}).data
    return {entry["name"] for entry in page["entries"]}


def test_users_and_groups_of_both_domains(member):
    assert member.client.refresh().data == {"status": "finish"}
    assert {"alice", "jörg", "norights"} <= names(member, "users", "LAB")
    assert {"zed"} <= names(member, "users", "OTHER")
    assert {"nasusers", "Büro Süd Leute"} <= names(member, "groups", "LAB")
    assert {"zgroup"} <= names(member, "groups", "OTHER")
    for kind in ("users", "groups"):
        assert not any(name.endswith("$") for name in names(member, kind, "LAB"))
    assert not member.exists("/tmp/domain_updating")
    for kind in ("user", "group"):
        assert member.exists(f"/usr/vorn/etc/private/domain_{kind}_LAB.db")


def test_one_domain(member):
    assert member.client.refresh("OTHER").data == {"status": "finish"}
    assert names(member, "users", "OTHER")
    assert names(member, "users", "LAB") == set()


def test_an_unknown_domain(member):
    answer = member.client.refresh("NOWHERE")
    assert answer.code == 2623


def test_a_dead_trusted_domain_keeps_nobody_from_being_fetched(member, lab):
    assert member.client.refresh().ok
    zed = names(member, "users", "OTHER")
    with lab.fault("dead", "dc2"):
        answer = member.client.refresh(deadline=180)
        assert answer.code == 2623
        assert member.client.domains(1) == ["LAB", "OTHER"]
        assert "alice" in names(member, "users", "LAB")
        assert names(member, "users", "OTHER") == zed


def test_a_dead_controller_never_empties_a_list(member, lab):
    assert member.client.refresh().ok
    before = names(member, "users", "LAB")
    with lab.fault("dead", "dc1", only=member.host):
        assert member.client.refresh(deadline=180).code == 2623
        assert names(member, "users", "LAB") == before


def test_twice_at_once(member, lab):
    with lab.fault("slow", "dc1"):
        first = member.client.start_refresh().data["task_id"]
        second = member.client.start_refresh()
        assert second.code == 2626
    end = time.monotonic() + 120
    while member.client.refresh_status(first).data["status"] != "finish":
        assert time.monotonic() < end
        time.sleep(0.2)


def test_stopped(member, lab):
    with lab.fault("dead", "dc1", only=member.host):
        task = member.client.start_refresh().data["task_id"]
        time.sleep(1)
        assert member.client.call("VORN.Core.Directory.Domain", 1, "update_stop").ok
        assert member.client.refresh_status(task).code == 121
        assert member.exec("pgrep", "-f", "vornd --task").code != 0
    # The next one is not kept from starting.
    assert member.client.refresh().ok
