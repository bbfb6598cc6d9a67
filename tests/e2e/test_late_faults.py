"""Controllers that die amid a join: one code for each step, in time, and everything is put back; the membership that
was there before goes on to work."""

import contextlib

import pytest

from appliance import Appliance, Directory
from controller_faults import (
    SETTLED_SECONDS, Calls, Join, administrator, as_new, failed_step, fault, on_all, record_of, remove_nt4_computer, strike,
    tools, wait_for_winbind)
from processes import held

HOSTS = ("nas1", "nas2")


@pytest.fixture(scope="module")
def machines(lab):
    yield [Appliance(lab, host) for host in HOSTS]
    lab.must("renew", "nas2")


@pytest.fixture
def newcomers(lab, machines):
    """No members, without accounts."""
    on_all(lambda machine: as_new(lab, machine.host), machines)
    yield machines
    lab.must("fault", "none", "dc1")


# Two joins at a time: (step, fault, the step that fails, code; none: the membership is there already, and stays). What
# kills or freezes the controller is the same for both.
MIDDLE = [
    (("computer account", "killed", "join", 2605), ("trust", "killed", "trust", 2601)),
    (("join", "killed", "join", 2605), ("credentials", "killed", "credentials", 2615)),
    (("trust", "frozen", "trust", 2601), ("join", "frozen", "join", 2605)),
    (("computer account", "dead", "join", 2605), ("confirm join", "dead", "confirm join", 2614)),
    (("dns", "dead", "dns", None), ("credentials", "kdc-drop", "credentials", 2615)),
    (("domains", "dead", None, None), ("workgroup", "dead", "workgroup", 2613)),
    (("join", "smb-rst", "join", 2606), ("credentials", "smb-rst", "join", 2606)),
]


@pytest.mark.parametrize("cases", MIDDLE, ids=[", ".join(" ".join(case[:2]) for case in pair) for pair in MIDDLE])
def test_a_fault_in_the_middle_of_a_join(lab, newcomers, cases):
    directory = Directory(lab, "dc1")
    objects = directory.objects()
    joins = [Join(machine, case[0]) for machine, case in zip(newcomers, cases)]
    name = cases[0][1]
    if name in ("killed", "frozen"):
        faults = [fault(lab, name)]
    else:
        faults = [fault(lab, case[1], only=machine.host) for machine, case in zip(newcomers, cases)]
    answers = strike(joins, faults)
    changed = {dn for dn, _ in directory.objects() ^ objects}
    assert all(any(f"CN={host.upper()}," in dn for host in HOSTS) for dn in changed), changed
    for join, answer, (_, _, step, code) in zip(joins, answers, cases):
        machine, record = join.machine, record_of(join.machine)
        assert (failed_step(machine), answer.code) == (step, code), record
        if code is None:
            assert answer.ok, record
        else:
            assert_put_back(machine, join.configuration, changed)
    on_all(assert_joins, [join.machine for join, case in zip(joins, cases) if case[3]])
    for machine in newcomers:
        assert machine.client.test_dc() is True
        assert machine.client.domains(1) == ["LAB", "OTHER"]


def assert_put_back(machine, configuration, changed):
    """Nothing is left but perhaps the account, on a controller that was gone; then it is named."""
    assert machine.configuration() == configuration
    assert machine.client.get() == {"enable_domain": False}
    account, record = machine.host.upper(), record_of(machine)
    left = any(f"CN={account}," in name for name in changed)
    assert not left or any(f"{account}$" in text for text in record["leftovers"]), record


def assert_joins(machine):
    assert machine.client.join("lab.test", *administrator("LAB")).ok, machine.ctl("steps").text


@pytest.fixture(scope="module")
def joined_machines(lab, machines):
    """Members of LAB; each test leaves them so."""
    on_all(lambda machine: as_new(lab, machine.host), machines)
    on_all(assert_joins, machines)
    return machines


@pytest.fixture
def members(lab, joined_machines):
    yield joined_machines
    lab.must("fault", "none")
    for machine in joined_machines:
        remove_nt4_computer(lab, machine.host)


def wait_for_no_journal(machine):
    """What no controller could tell during the join is found out as soon as one is back."""
    machine.wait_until(lambda: machine.exec("find", "/usr/vorn/etc/private/join", "-type", "f").out == "",
                       SETTLED_SECONDS, "the end of the journal")


OTHER = ("other.test", "OTHER", "dc2")
NT4 = ("NT4DOM", "NT4DOM", "pdc")
# (step of a join of its own domain, code; the other domain, step of the other machine's join of it, code)
AGAIN = [
    ("join", 2605, NT4, "trust", 2601),
    ("confirm join", 2614, OTHER, "confirm join", 2614),
    ("trust", 2601, NT4, "confirm join", 2614),
]


@pytest.mark.parametrize("step, code, other, other_step, other_code", AGAIN,
                         ids=[f"{case[0]}, {case[2][0]} {case[3]}" for case in AGAIN])
def test_a_members_join_that_fails_late_leaves_it_a_member(lab, members, step, code, other, other_step, other_code):
    domain, account, controller = other
    again, away = members
    joins = [Join(again, step), Join(away, other_step, domain, account)]
    answers = strike(joins, [fault(lab, "dead", "dc1", only=again.host), fault(lab, "dead", controller)])
    assert (failed_step(again), answers[0].code) == (step, code), record_of(again)
    assert (failed_step(away), answers[1].code) == (other_step, other_code), record_of(away)
    for join in joins:
        machine = join.machine
        after = machine.configuration()
        # The controller has a new password, and so has the appliance.
        keytab = "/etc/krb5.keytab"
        changed = {path for path in after if after[path] != join.configuration.get(path)}
        assert changed <= ({keytab} if machine is again else set()), changed
        assert machine.exists(keytab)
        assert machine.client.test_dc() is True, machine.syslog()[-3000:]
        assert machine.client.get()["domain_name"] == "LAB"
        wait_for_winbind(machine)
        assert machine.client.domains(1) == ["LAB", "OTHER"]
        wait_for_no_journal(machine)


def key_number(lab, host):
    """Grows with each new password of the host's account."""
    return Directory(lab, "dc1").search(f"(sAMAccountName={host.upper()}$)", "msDS-KeyVersionNumber")


def settled(machine):
    """A member that works, or one that has said why it is in its workgroup."""
    if machine.client.get()["enable_domain"]:
        return machine.client.test_dc()
    return "join again" in machine.syslog()


def test_a_controller_that_dies_while_it_is_told_the_new_password(lab, joined_machines):
    """Nobody can tell which password counts, until the controller is back."""
    machine = joined_machines[0]
    before = key_number(lab, machine.host)
    calls = Calls(machine)
    with contextlib.ExitStack() as dead:
        with contextlib.ExitStack() as stopped:
            # Else the tool could have stored what the controller has.
            with lab.fault("slow", "dc1", only=machine.host):
                calls.start("set", machine.client.join, "lab.test", *administrator("LAB"))
                machine.wait_until(lambda: key_number(lab, machine.host) != before, 30, "the new password")
                assert stopped.enter_context(held(lambda: tools(machine)))
            dead.enter_context(lab.fault("dead", "dc1", only=machine.host))
        answer = calls.end()["set"]
        assert (failed_step(machine), answer.code) == ("join", 2617), record_of(machine)
    # Without a call and without a start of anything.
    machine.wait_until(lambda: settled(machine), SETTLED_SECONDS, "a membership that works, or none")
    wait_for_no_journal(machine)
    if not machine.client.get()["enable_domain"]:
        # What the ended tool had sent, to disable the account on its way back, may reach the controller only now.
        machine.wait_until(lambda: machine.client.join("lab.test", *administrator("LAB")).ok, 90, "a join")
        assert machine.client.test_dc() is True
