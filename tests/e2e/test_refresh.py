"""The local lists of users and groups: complete or as they were, whatever happens to the controllers."""

import contextlib
import threading
import time

from client import DIRECTORY
from controller_faults import REFRESH_SECONDS, Calls, administrator, lists, names_in
from processes import held, tasks, wait_for_tasks

KNOWN = ["LAB", "OTHER"]


def progress(machine):
    overview = machine.client.call(DIRECTORY, 1, "overview").data["refresh"]
    assert overview is None or {"running", "finished"} < set(overview)
    return overview


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
    wait_for_tasks(member)
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


def ripened(machine):
    """All lists; what is fetched from now on has a later time, which counts in seconds."""
    before = lists(machine, KNOWN)
    newest = max(fetched for fetched, _ in before.values())
    machine.wait_until(lambda: time.time() >= newest + 1, 5, "the next second")
    return before


def assert_new(before, after, *keys):
    """These lists are new, all others are as they were."""
    assert {key for key in before if after[key][0] > before[key][0]} == set(keys)
    assert names_in(after) == names_in(before)


def test_a_dead_trusted_domain_keeps_nobody_from_being_fetched(member, lab):
    assert member.client.refresh().ok
    before = ripened(member)
    with lab.fault("dead", "dc2"):
        calls = Calls(member)
        calls.ask()
        calls.refresh()
        answers = calls.end()
        assert answers["refresh"].code == 2623
        assert answers["test_dc"].data == {"test_join_success": True}
        assert answers["list"].data == {"domain_list": KNOWN}
        assert [row[0] for row in answers["list 2"].data["domain_list"]] == KNOWN
        assert_new(before, lists(member, KNOWN), ("LAB", "users"))
        # The appliance's own program goes on with the groups.
        before = ripened(member)
        ended = member.exec("/usr/vorn/sbin/vornwin", "-updateDomain", deadline=120)
        assert ended.code == 1, ended
        assert_new(before, lists(member, KNOWN), ("LAB", "users"), ("LAB", "groups"))


def test_a_trusted_domain_that_stands_still_keeps_nobody_waiting(member, lab):
    assert member.client.refresh().ok
    before = ripened(member)
    with lab.frozen("dc2"):
        task = member.client.start_refresh().data["task_id"]
        users = ("LAB", "users")
        member.wait_until(lambda: lists(member, KNOWN)[users][0] > before[users][0], 20, "LAB's users")
        end = time.monotonic() + REFRESH_SECONDS
        while (answer := member.client.refresh_status(task)).ok and answer.data["status"] != "finish":
            assert time.monotonic() < end, "the refresh does not end"
            time.sleep(0.1)
        assert answer.code == 2623
        assert_new(before, lists(member, KNOWN), ("LAB", "users"))


def test_a_controller_that_dies_while_groups_are_fetched(member, lab):
    assert member.client.refresh().ok
    before = ripened(member)
    calls = Calls(member)
    with contextlib.ExitStack() as faults, contextlib.ExitStack() as stopped:
        with lab.fault("slow", "dc1", only=member.host):
            calls.refresh()
            member.wait_until(lambda: member.exists("/tmp/domain_group.pid"), 20, "the fetch of groups")
            assert stopped.enter_context(held(lambda: tasks(member)))
        faults.enter_context(lab.killed("dc1"))
        stopped.close()
        assert calls.end()["refresh"].code == 2623
        after = lists(member, KNOWN)
        assert after["LAB", "users"][0] > before["LAB", "users"][0]
        assert after["LAB", "groups"] == before["LAB", "groups"]
        assert names_in(after) == names_in(before)
    assert member.client.refresh().data == {"status": "finish"}


def test_units_are_listed_as_last_known_while_the_controller_is_dead(appliance, lab):
    joined = appliance.client.join("lab.test", *administrator("LAB"), manage_mode=1)
    assert joined.ok, appliance.ctl("steps").text
    units = appliance.client.domains(2)
    assert ["--", "", "LAB"] in units and any("Sales, West" in row[0] for row in units), units
    with lab.fault("dead", "dc1", only=appliance.host):
        calls = Calls(appliance)
        calls.ask()
        answers = calls.end()
        assert answers["list"].data == {"domain_list": ["LAB"]}
        assert answers["list 2"].data == {"domain_list": units}
        assert answers["test_dc"].data == {"test_join_success": False}


def test_a_dead_controller_never_empties_a_list(member, lab):
    assert member.client.refresh().ok
    before = names(member, "users", "LAB")
    with lab.fault("dead", "dc1", only=member.host):
        assert member.client.refresh(deadline=180).code == 2623
        assert names(member, "users", "LAB") == before


def test_the_overview_follows_a_refresh_and_keeps_its_result(member, lab):
    assert progress(member) is None
    task = member.client.start_refresh().data["task_id"]
    seen = [progress(member)]
    while member.client.refresh_status(task).data["status"] != "finish":
        seen.append(progress(member))
        time.sleep(0.02)
    # It runs from the request on without a gap, and its counts are those of users and of groups.
    states = [state["running"] for state in seen]
    assert states[0] is True and states == sorted(states, reverse=True), states
    done = progress(member)
    assert done["running"] is False and done["finished"] >= done["started"] and done["errors"] == []
    assert (done["kind"], done["domains_done"], done["domains"]) == ("group", 2, 2)
    member.kill()
    member.start()
    assert progress(member) == done
    # One of the appliance's own.
    with lab.fault("slow", "dc1"):
        fetch = threading.Thread(target=member.exec, args=("/usr/vorn/sbin/vornwin", "-updateDomain"))
        fetch.start()
        member.wait_until(lambda: progress(member)["running"], 10, "the fetch")
        fetch.join()
    own = progress(member)
    assert own["running"] is False and own["finished"] >= done["finished"] and own["started"] >= done["finished"], own
    # One that finds no controller is the last one, and has failed.
    with lab.fault("dead", "dc1", only=member.host):
        assert member.client.refresh(deadline=180).code == 2623
    failed = progress(member)
    assert failed["running"] is False and failed["errors"], failed
    assert {error["domain"] for error in failed["errors"]} <= {"LAB", "OTHER"}


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
        assert progress(member)["running"] is True and progress(member)["finished"] is None
        assert member.client.call("VORN.Core.Directory.Domain", 1, "update_stop").ok
        member.wait_until(lambda: not progress(member)["running"], 5, "the end of the refresh")
        stopped = progress(member)
        assert stopped["finished"] and stopped["errors"][-1]["reason"] == "ended before it was done", stopped
        assert member.client.refresh_status(task).code == 121
        assert member.exec("pgrep", "-f", "vornd --task").code != 0
    # The next one is not kept from starting.
    assert member.client.refresh().ok
