"""Controllers of an NT4-style domain that die, stand still or can't be reached: each call ends within its deadline with
the right answer, nothing is lost, and all is well once the controller is back."""

import contextlib

import pytest

from appliance import Appliance
from controller_faults import (
    SET_SECONDS, Calls, Join, administrator, failed_step, fault, lists, record_of, remove_nt4_computer, strike,
    wait_for_winbind)
from processes import programs

KNOWN = ["NT4DOM"]
JOIN = ("NT4DOM", *administrator("NT4DOM"))


def as_new(lab, host):
    machine = Appliance(lab, host)
    machine.renew()
    remove_nt4_computer(lab, host)
    return machine


@pytest.fixture(scope="module")
def member(lab):
    """nas1, with lists; each test leaves it a member."""
    machine = as_new(lab, "nas1")
    assert machine.client.join(*JOIN).ok, machine.ctl("steps").text
    assert machine.client.refresh().ok
    yield machine
    lab.must("renew", "nas1")
    remove_nt4_computer(lab, "nas1")


@pytest.fixture(scope="module")
def second_machine(lab):
    yield as_new(lab, "nas2")
    lab.must("renew", "nas2")


@pytest.fixture
def newcomer(lab, second_machine):
    """nas2, no member and without an account before and after the test."""
    yield second_machine
    lab.must("fault", "none", "pdc")
    if second_machine.client.get()["enable_domain"]:
        assert second_machine.client.leave().ok
    remove_nt4_computer(lab, "nas2")


def has_account(lab, host):
    result = lab.exec("pdc", "pdbedit", "-L")
    assert result.code == 0 and "nina:" in result.out, result
    return f"{host}$:" in result.out.lower()


def assert_well(machine):
    assert machine.client.test_dc() is True, machine.syslog()[-3000:]
    assert machine.client.domains(1) == KNOWN
    assert machine.client.refresh().data == {"status": "finish"}


def assert_answered_without_controller(answers):
    assert answers["test_dc"].data == {"test_join_success": False}
    assert answers["list"].data == {"domain_list": KNOWN}
    assert answers["list 2"].data == {"domain_list": [["NT4DOM", "NT4DOM", ""]]}
    assert answers["refresh"].code == 2623


def new_winbind(machine):
    """One that knows nothing of the time when the controller answered."""
    before = {process.pid for process in programs(machine, "winbindd")}
    assert before
    machine.must("sh", "-c", 'kill -KILL "$@"', "kill", *before)
    machine.wait_until(lambda: not programs(machine, "winbindd"), 10, "the end of winbind")
    machine.must("rm", "-f", "/var/cache/samba/winbindd_cache.tdb", "/var/lib/samba/winbindd_cache.tdb")
    machine.must("winbindd", "--configfile=/usr/vorn/etc/smb.conf", "--daemon")
    machine.wait_until(lambda: machine.exec("wbinfo", "--ping").code == 0, 10, "winbind")


# (fault, code of a join)
BEFORE = [("killed", 2605), ("frozen", 2605), ("netbios-drop", 2605), ("smb-rst", 2606)]


@pytest.mark.parametrize("name, code", BEFORE, ids=[case[0] for case in BEFORE])
def test_a_fault_before_the_calls(lab, member, newcomer, name, code):
    before, configuration = lists(member, KNOWN), newcomer.configuration()
    with fault(lab, name, "pdc"):
        calls = Calls(member)
        calls.ask()
        calls.refresh()
        calls.start("set", newcomer.client.join, *JOIN)
        answers = calls.end()
        assert_answered_without_controller(answers)
        assert answers["set"].code == code, newcomer.ctl("steps").text
        assert lists(member, KNOWN) == before
    assert newcomer.configuration() == configuration
    assert not has_account(lab, "nas2")
    assert_well(member)


def test_another_name_than_the_domains(newcomer):
    configuration = newcomer.configuration()
    answer = newcomer.client.join("WRONGNT", *administrator("NT4DOM"))
    assert answer.code == 2605 and answer.seconds < 30, answer
    assert newcomer.configuration() == configuration


def test_the_older_port_is_enough(lab, newcomer):
    with lab.fault("445-drop", "pdc"):
        answer = newcomer.client.join(*JOIN)
        assert answer.ok and answer.seconds < 30, newcomer.ctl("steps").text
        assert newcomer.client.get()["domain_name"] == "NT4DOM"
        assert newcomer.client.test_dc() is True
    assert newcomer.client.leave().ok


def test_a_controller_that_dies_while_a_machine_is_joined(lab, member, newcomer):
    before = lists(member, KNOWN)
    join = Join(newcomer, "join", "NT4DOM", "NT4DOM")
    calls = Calls(member)

    def ask():
        new_winbind(member)
        calls.start("users", member.exec, "wbinfo", "--domain-users")
        calls.ask()
        calls.refresh()

    with contextlib.ExitStack() as dead:
        answer, = strike([join], [], then=[lambda: dead.enter_context(lab.fault("dead", "pdc")), ask])
        assert (failed_step(newcomer), answer.code) == ("join", 2617), record_of(newcomer)
        assert not has_account(lab, "nas2")
        again = newcomer.client.join(*JOIN)
        assert again.code == 2605 and again.seconds < SET_SECONDS
        assert newcomer.configuration() == join.configuration
        answers = calls.end()
        assert_answered_without_controller(answers)
        # Winbind says that there is nobody, and that all went well.
        assert (answers["users"].code, answers["users"].out) == (0, ""), answers["users"]
        assert lists(member, KNOWN) == before
    assert newcomer.client.join(*JOIN).ok, newcomer.ctl("steps").text
    assert newcomer.client.test_dc() is True
    assert_well(member)


# Of a newcomer, and of the member's join again: (step at which the controller dies, code).
MIDDLE = [(("trust", 2601), ("confirm join", 2614)), (("credentials", 2614), ("credentials", 2614))]


@pytest.mark.parametrize("first, again", MIDDLE, ids=[f"{pair[0][0]}, again {pair[1][0]}" for pair in MIDDLE])
def test_a_controller_that_dies_in_the_middle_of_two_joins(lab, member, newcomer, first, again):
    joins = [Join(newcomer, first[0], "NT4DOM", "NT4DOM"), Join(member, again[0], "NT4DOM", "NT4DOM")]
    answers = strike(joins, [lab.fault("dead", "pdc")])
    for join, answer, case in zip(joins, answers, (first, again)):
        assert (failed_step(join.machine), answer.code) == case, record_of(join.machine)
        assert join.machine.configuration() == join.configuration
    record = record_of(newcomer)
    assert newcomer.client.get() == {"enable_domain": False}
    left = has_account(lab, "nas2")
    assert left is (first[0] == "trust")
    assert not left or any("NAS2$" in text for text in record["leftovers"]), record
    assert newcomer.client.join(*JOIN).ok, newcomer.ctl("steps").text
    assert newcomer.client.test_dc() is True
    assert member.client.get()["domain_name"] == "NT4DOM"
    wait_for_winbind(member)
    assert_well(member)


def test_a_leave_needs_no_controller(lab, newcomer):
    assert newcomer.client.join(*JOIN).ok
    with lab.fault("dead", "pdc"):
        answer = newcomer.client.leave()
        assert answer.ok and answer.seconds < 15, (answer.body, answer.seconds)
        assert newcomer.client.get() == {"enable_domain": False}
        assert newcomer.client.domains(1) == []
    assert not programs(newcomer, "winbindd")
    assert has_account(lab, "nas2")
