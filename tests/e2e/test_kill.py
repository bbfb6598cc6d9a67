"""The server, or all of the appliance's programs at once, killed at many points of a join and of a refresh: afterwards
a membership works, old or new, or the appliance is cleanly in its workgroup, and nothing waits for what is gone."""

import time

import pytest

from client import DIRECTORY
from kills import (
    END, VICTIMS, Call, Points, Steps, administrator, check_settled, kill_in_join, server, start_again)
from processes import kill, tasks, wait_for_tasks

MARKER = "/tmp/domain_updating"
LAB_USERS = {"alice", "jörg", "norights"}

# A step of a join, and seconds after its begin.
JOIN_POINTS = [
    (None, 0.0), (None, 0.02), ("request", 0.0), ("ports", 0.0), ("workgroup", 0.05), ("credentials", 0.0),
    ("computer account", 0.0), ("configuration", 0.0), ("join", 0.0), ("join", 0.15), ("join", 0.3), ("join", 0.45),
    ("join", 0.6), ("join", 0.8), ("confirm join", 0.0), ("activate", 0.0), ("winbind", 0.0), ("trust", 0.1),
    ("dns", 0.1), ("domains", 0.05),
]
# The server's own work after the join tool's end.
LATE_POINTS = [("domains", 0.2), ("domains", 0.4)]
# The tool goes on without the server.
SERVER_POINTS = JOIN_POINTS[2:] + LATE_POINTS + [
    ("workgroup", 0.0), ("join", 0.05), ("join", 0.22), ("join", 0.5), ("join", 0.9), ("winbind", 0.05), ("trust", 0.0),
]


@pytest.mark.parametrize("victims, points", [
    ("everything", JOIN_POINTS + LATE_POINTS), ("server", JOIN_POINTS[1:2] + SERVER_POINTS),
])
def test_a_killed_join(appliance, victims, points):
    tried = Points(appliance)
    for step, offset in points:
        with tried.at(victims, step, offset):
            # Without its server a join comes to its end, so that the next one may begin there.
            if victims == "everything" or not appliance.client.get()["enable_domain"]:
                appliance.renew()
            before = appliance.configuration()
            tried.hits += kill_in_join(appliance, VICTIMS[victims], step, offset, "lab.test",
                                       dns="10.77.0.10,10.77.0.1", manage_mode=1)
            log = start_again(appliance)
            goes_on = victims == "server" and step is not None
            check_settled(appliance, before, log, ("LAB",) if goes_on else (None, "LAB"))
    assert tried.done(len(points)) >= {"everything": 15, "server": 20}[victims]


# At the end of a join that fails, when the server is to put back what it has changed ahead of it.
FAILING_POINTS = [
    ("credentials", 0.0), (END, 0.0), (END, 0.003), (END, 0.006), (END, 0.01), (END, 0.02), (END, 0.04), (END, 0.08),
]


@pytest.mark.parametrize("victims", VICTIMS)
def test_a_killed_join_that_fails(appliance, victims):
    tried = Points(appliance)
    before = appliance.configuration()
    for step, offset in FAILING_POINTS:
        with tried.at(victims, step, offset):
            kill_in_join(appliance, VICTIMS[victims], step, offset, "lab.test", password="not the passw0rd",
                         dns="10.77.0.10,10.77.0.1", manage_mode=1)
            log = start_again(appliance)
            check_settled(appliance, before, log, (None,))
            # Named once, whatever is left; then as it was, for the next point.
            appliance.kill()
            log = start_again(appliance)
            assert "are still" not in log and "is still" not in log
            appliance.renew()
    tried.done(len(FAILING_POINTS))


# From the membership of LAB: a join of it again, and of the other kind of domain.
AGAIN_POINTS = [
    ("configuration", 0.0), ("join", 0.1), ("join", 0.3), ("join", 0.5), ("join", 0.7), ("confirm join", 0.0),
    ("activate", 0.0), ("trust", 0.0), ("dns", 0.0),
]
CHANGE_POINTS = [
    ("configuration", 0.0), ("join", 0.0), ("join", 0.1), ("join", 0.2), ("confirm join", 0.0), ("activate", 0.0),
    ("winbind", 0.05), ("trust", 0.0), ("domains", 0.0),
]


def become_member(machine):
    status = machine.client.get()
    if status.get("domain_name") != "LAB":
        answer = machine.client.join("lab.test", *administrator("lab.test"))
        assert answer.ok, machine.ctl("steps").text


@pytest.mark.parametrize("domain, points, left", [
    ("lab.test", AGAIN_POINTS, ("LAB", None)), ("NT4DOM", CHANGE_POINTS, ("LAB", "NT4DOM")),
])
def test_a_killed_join_of_a_member(member, domain, points, left):
    tried = Points(member)
    for number, (step, offset) in enumerate(points):
        victims = "server" if number % 4 == 3 else "everything"
        with tried.at(domain, victims, step, offset):
            become_member(member)
            before = member.configuration()
            kill_in_join(member, VICTIMS[victims], step, offset, domain)
            log = start_again(member)
            check_settled(member, before, log, left)
            if left[1] is None and not member.client.get()["enable_domain"]:
                assert "join again" in log, "nothing says why the appliance is in its workgroup"
    tried.done(len(points))


def users_of(machine, domain="LAB"):
    page = machine.client.call(DIRECTORY, 1, "users", {"domain": domain, "offset": 0, "limit": 1000}).data
    return {entry["name"] for entry in page["entries"]}


def wait_for_end(machine, task):
    """The last status of a refresh, which must have one."""
    end = time.monotonic() + 30
    while True:
        answer = machine.client.refresh_status(task)
        if not (answer.ok and answer.data == {"status": "updating"}):
            return answer
        assert time.monotonic() < end, f"the refresh {task} says \"updating\" for ever"
        time.sleep(0.05)


def check_refresh(machine, task, alone):
    """ALONE: only the server was killed, so the task goes on."""
    if task is not None:
        answer = wait_for_end(machine, task)
        assert not alone or answer.data == {"status": "finish"}, answer.body
    assert LAB_USERS <= users_of(machine), "a killed refresh has emptied a list"
    if not alone:
        assert machine.temporaries() == []
    marker = machine.exists(MARKER)
    end = time.monotonic() + 30
    while True:
        answer = machine.client.start_refresh()
        if answer.ok or answer.code != 2626 or not alone:
            break
        assert time.monotonic() < end, "a refresh counts as running for ever"
        time.sleep(0.05)
    assert wait_for_end(machine, answer.data["task_id"]).data == {"status": "finish"}
    wait_for_tasks(machine)
    assert not machine.exists(MARKER)
    assert machine.temporaries() == []
    for domain in ("LAB", "OTHER"):
        for kind in ("user", "group"):
            assert machine.exists(f"/usr/vorn/etc/private/domain_{kind}_{domain}.db")
    return marker


def seconds_of_a_refresh(machine):
    started = time.monotonic()
    assert machine.client.refresh().data == {"status": "finish"}
    seconds = time.monotonic() - started
    wait_for_tasks(machine)
    return seconds


def test_a_killed_refresh(member):
    whole = min(seconds_of_a_refresh(member) for _ in range(4))  # the first one finds nothing known
    tried = Points(member)
    markers = 0
    # Moments all over the refresh, until enough of them were in it.
    while tried.hits < 20 and len(tried.seen) < 60:
        number = len(tried.seen)
        victims = "server" if number % 3 == 2 else "everything"
        offset = whole * (number * 0.618 % 1)
        with tried.at(victims, "refresh", offset):
            call = Call(member.client.start_refresh)
            time.sleep(offset)
            running = bool(tasks(member))
            kill(lambda: VICTIMS[victims](member))
            tried.hits += running and member.exists(MARKER)
            answer = call.wait()
            start_again(member)
            task = answer.data["task_id"] if answer else None
            markers += check_refresh(member, task, alone=victims == "server")
    assert tried.done(len(tried.seen)) >= 20
    assert markers > 0


def test_what_killed_writers_leave_blocks_no_start_and_goes(member):
    assert member.client.refresh().ok
    member.kill()
    left = ["/usr/vorn/etc/.smbinfo.conf.vorn-aB3dE6", "/usr/vorn/etc/.smb.conf.vorn-000000",
            "/usr/vorn/etc/private/.domain_user_LAB.db.vorn-000000", "/run/vorn/.join_steps.json.vorn-000000",
            "/var/lib/vorn/.domains.json.vorn-000000",
            "/etc/.vorninfo.conf.vorn-000000", "/etc/.resolv.conf.vorn-000000", "/etc/cron.d/.vorn.vorn-000000"]
    for path in left:
        member.write(path, "half")
    for path in ("/usr/vorn/etc/smbinfo.conf.tmp", "/usr/vorn/etc/private/directory/.user_LAB.db.vorn-000000",
                 "/usr/vorn/etc/private/directory/.group_LAB.db.vorn-000000", "/usr/vorn/etc/private/join/staging.new"):
        member.write(path, "half")
    for path in (MARKER, "/tmp/domain_user.pid", "/tmp/domain_group.pid"):
        member.write(path, "99999\n")
    start_again(member)
    assert member.temporaries() == []
    assert LAB_USERS <= users_of(member)
    assert member.client.refresh().data == {"status": "finish"}
    wait_for_tasks(member)
    assert not member.exists(MARKER)


def test_a_killed_server_leaves_a_failing_join_to_its_tool(appliance):
    """Nobody is there to put back what was changed ahead of the join: the next start names it."""
    before = appliance.configuration()
    steps = Steps(appliance)
    call = Call(appliance.client.join, "lab.test", "Administrator", "not the passw0rd", dns="10.77.0.10,10.77.0.1",
                manage_mode=1)
    assert steps.wait_for("request", lambda: not call.is_alive())
    kill(lambda: server(appliance))
    call.wait()
    log = start_again(appliance)
    check_settled(appliance, before, log, (None,))
    assert appliance.read("/etc/resolv.conf") != before["/etc/resolv.conf"][0]
    # Named once.
    appliance.kill()
    assert "are still" not in start_again(appliance)
