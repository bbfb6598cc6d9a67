"""Controllers that die, are cut off, stand still, are slow or turn clients away, before a call and in its middle: each
call ends within its deadline with the right answer, nothing is lost, and all is well once the controller is back."""

import contextlib

import pytest

from appliance import Appliance, Directory
from conftest import remove_computer
from controller_faults import (
    ASK_SECONDS, SET_SECONDS, Calls, administrator, fault, fetched_in, lists, names_in, record_of, tools, wait_for_step)
from processes import held, programs, tasks

ADMINISTRATOR = administrator("LAB")
KNOWN = ["LAB", "OTHER"]


@pytest.fixture(scope="module")
def member(joined):
    """nas1, a member with lists; nothing of it is started anew between the tests."""
    assert joined.client.refresh().ok
    return joined


@pytest.fixture(scope="module")
def other_machine(lab):
    machine = Appliance(lab, "nas2")
    machine.renew()
    remove_computer(lab, "nas2")
    yield machine
    lab.must("renew", "nas2")


@pytest.fixture
def newcomer(other_machine):
    """nas2, no member before and after the test, without an account; vornd runs all along."""
    yield other_machine
    if other_machine.client.get()["enable_domain"]:
        assert other_machine.client.leave().ok
    remove_computer(other_machine.lab, other_machine.host)


@pytest.fixture(autouse=True)
def no_faults(lab):
    yield
    lab.must("fault", "none")


def assert_kept(before, after):
    """The lists of the domain that could not be asked are the old ones; those of the other may be new."""
    assert names_in(after) == names_in(before)
    assert fetched_in(after, "LAB") == fetched_in(before, "LAB")


def assert_put_back(machine, directory, configuration, objects):
    """Nothing has changed but the account on a controller that was gone; then it is named."""
    assert machine.configuration() == configuration
    assert machine.client.get() == {"enable_domain": False}
    account = machine.host.upper()
    changed = {name for name, _ in directory.objects() ^ objects}
    assert all(f"CN={account}," in name for name in changed), changed
    record = record_of(machine)
    assert not changed or any(f"{account}$" in text for text in record["leftovers"]), record


def assert_well(machine):
    """Everything works, at the first attempt and without a start of anything."""
    assert machine.client.test_dc() is True, machine.syslog()[-3000:]
    assert machine.client.domains(1) == KNOWN
    assert machine.client.refresh().data == {"status": "finish"}


# (fault, what test_dc answers, code of the refresh or none, code of a join, more for the join)
DNS = {"dns": "10.77.0.10"}
BEFORE = [
    ("killed", False, 2623, 2605, {}),
    ("frozen", False, 2623, 2602, DNS),
    ("unplugged", False, 2623, 2605, {}),
    ("dead", False, 2623, 2602, DNS),
    ("dns-drop", False, 2623, 2602, DNS),
    ("ldap-drop", False, 2623, 2605, DNS),
    ("kdc-drop", False, 2623, 2615, {}),
    ("smb-rst", True, None, 2606, DNS),
    ("rpc-drop", True, None, None, {}),
]


@pytest.mark.parametrize("name, works, refresh, join, more", BEFORE, ids=[case[0] for case in BEFORE])
def test_a_fault_before_the_calls(lab, member, newcomer, name, works, refresh, join, more):
    before, configuration, objects = lists(member, KNOWN), newcomer.configuration(), Directory(lab, "dc1").objects()
    with fault(lab, name):
        calls = Calls(member)
        calls.ask()
        calls.refresh()
        calls.start("set", newcomer.client.join, "lab.test", *ADMINISTRATOR, **more)
        answers = calls.end()
        assert answers["test_dc"].data == {"test_join_success": works}
        assert answers["list"].data == {"domain_list": KNOWN}
        assert [row[:2] for row in answers["list 2"].data["domain_list"]] == [[domain, domain] for domain in KNOWN]
        assert answers["refresh"].code == refresh
        assert answers["set"].code == join, newcomer.ctl("steps").text
        if refresh:
            assert_kept(before, lists(member, KNOWN))
    if join:
        assert newcomer.configuration() == configuration
        assert Directory(lab, "dc1").objects() == objects
    assert_well(member)


@pytest.mark.parametrize("name", ["frozen", "killed"])
def test_a_fault_in_the_middle_of_questions_and_a_refresh(lab, member, name):
    before = lists(member, KNOWN)
    with contextlib.ExitStack() as faults, contextlib.ExitStack() as stopped:
        calls = Calls(member)
        # A question takes some milliseconds: it is caught because its answer is slow, winbind's does not come yet.
        with lab.fault("slow", "dc1"):
            calls.refresh()
            member.wait_until(lambda: member.exists("/tmp/domain_user.pid"), 20, "a fetch")
            assert stopped.enter_context(held(lambda: tasks(member)))
            with held(lambda: programs(member, "winbindd")):
                calls.ask()
                member.wait_until(lambda: programs(member, "net") and programs(member, "wbinfo"), 10, "a question")
                caught = stopped.enter_context(held(lambda: tools(member)))
            assert {process.name for process in caught.values()} >= {"net", "wbinfo"}
        faults.enter_context(fault(lab, name))
        stopped.close()
        answers = calls.end()
        assert answers["test_dc"].data == {"test_join_success": False}
        assert answers["list"].data == {"domain_list": KNOWN}
        assert answers["refresh"].code == 2623, member.syslog()[-3000:]
        # What was complete before the fault is new.
        assert names_in(lists(member, KNOWN)) == names_in(before)
    assert_well(member)


def test_a_fault_in_the_middle_of_a_leave(lab, newcomer):
    configuration = newcomer.configuration()
    assert newcomer.client.join("lab.test", *ADMINISTRATOR).ok
    before = record_of(newcomer)["id"]
    with contextlib.ExitStack() as faults:
        calls = Calls(newcomer)
        calls.start("leave", newcomer.client.leave)
        wait_for_step(newcomer, before, "dns")
        with held(lambda: tools(newcomer)):
            faults.enter_context(fault(lab, "frozen"))
        answer = calls.end()["leave"]
        assert answer.ok and answer.seconds < ASK_SECONDS
        assert newcomer.client.get() == {"enable_domain": False}
        assert newcomer.client.domains(1) == []
    assert newcomer.configuration().keys() == configuration.keys()
    assert newcomer.client.join("lab.test", *ADMINISTRATOR).ok


def test_a_slow_controller(lab, member, newcomer):
    directory = Directory(lab, "dc1")
    configuration, objects = newcomer.configuration(), directory.objects()
    with lab.fault("slow", "dc1"):
        calls = Calls(member)
        calls.ask()
        calls.refresh("LAB")
        calls.start("set", newcomer.client.join, "lab.test", *ADMINISTRATOR)
        answers = calls.end()
        assert answers["test_dc"].data == {"test_join_success": True}
        assert answers["refresh"].data == {"status": "finish"}
        assert answers["list"].data == {"domain_list": KNOWN}
    if answers["set"].ok:
        assert newcomer.client.test_dc() is True
    else:
        assert answers["set"].code == 2617, record_of(newcomer)
        assert_put_back(newcomer, directory, configuration, objects)
    assert_well(member)


def test_a_join_while_a_trusted_domain_is_dead(lab, newcomer):
    def administrators():
        return newcomer.net("sam", "listmem", "Administrators").out

    with lab.fault("dead", "dc2"):
        answer = newcomer.client.join("lab.test", *ADMINISTRATOR)
        assert answer.ok, newcomer.ctl("steps").text
        assert answer.seconds < SET_SECONDS
        assert newcomer.client.test_dc() is True
        assert "LAB" in newcomer.client.domains(1)
    # Winbind had no time for them during the join.
    newcomer.wait_until(lambda: "Domain Admins" in administrators(), 60, "the domain's administrators")
    assert newcomer.client.refresh().data == {"status": "finish"}
    assert newcomer.client.domains(1) == KNOWN
