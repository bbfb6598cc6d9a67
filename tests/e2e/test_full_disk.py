"""Disks without room, folders that can't be written, Samba's tools gone: what is asked for happens, or nothing does,
the log says where, and afterwards everything works again."""

import pytest

from client import DIRECTORY, DOMAIN, EVENTS
from lasting import (ADMINISTRATOR, ETC, NO_ROOM, READ_ONLY, changes, everything, join, leave, refresh, refused,
                     set_options, set_schedule, set_time, works_again)
from obstacles import Log, away, full, read_only, small_disk

VORND = "/usr/vorn/sbin/vornd"


def users(machine):
    return machine.client.call(DIRECTORY, 1, "users", {"domain": "LAB"}).data


@pytest.fixture
def on_small_disk(member):
    def put(folder):
        member.stop()
        small_disk(member, folder)
        member.start()
        return member

    return put


def test_no_room_for_the_configuration(on_small_disk):
    machine = on_small_disk(ETC)
    client = machine.client
    refresh(machine)
    known = users(machine)
    log = Log(machine)
    with full(machine, ETC):
        refused(machine, log, set_options, 2617, f"{ETC}/smbinfo.conf", NO_ROOM)
        refused(machine, log, set_time, 2617, f"{ETC}/smb.conf", NO_ROOM)
        refused(machine, log, set_schedule, 2617, f"{ETC}/schedule.conf", NO_ROOM)
        refused(machine, log, join, 2617, f"{ETC}/private/join/", NO_ROOM)
        refused(machine, log, leave, 2617, f"{ETC}/private/join/", NO_ROOM)
        refused(machine, log, lambda client: client.join("lab.test", "Administrator", "wrong", dns="10.77.0.30"), 2617,
                f"{ETC}/private/resolv.conf.kept", NO_ROOM)
        assert client.test_dc() is True
        assert client.get()["domain_name"] == "LAB"
    # Room for all but the lists.
    with full(machine, ETC, room=8192):
        assert client.refresh().code == 2623
        machine.wait_until(lambda: log.says("LAB: users not fetched", "full"), 5, f"the log holds {log.lines}")
        assert users(machine) == known
    assert machine.must("find", ETC, "-name", ".*").out == ""
    works_again(machine)


def test_no_room_for_the_state(on_small_disk):
    machine = on_small_disk("/var/lib/vorn")
    client = machine.client
    events = client.call(EVENTS, 1, "list").data["total"]
    log = Log(machine)
    with full(machine, "/var/lib/vorn"):
        answer = client.start_refresh()
        assert answer.code == 125, answer.body
        machine.wait_until(lambda: log.says("vornd", "/var/lib/vorn/tasks.db"), 5, f"the log holds {log.lines}")
        assert not machine.exists("/tmp/domain_user.pid")
        # An event that can't be kept stops nobody.
        assert leave(client).ok
        assert client.get() == {"enable_domain": False}
        machine.wait_until(lambda: log.says("vornd", "/var/lib/vorn/events.db", "full"), 5, f"the log: {log.lines}")
        machine.stop()
        machine.start()
        assert client.get() == {"enable_domain": False}
        machine.wait_until(lambda: log.says("vornd", "the records of background tasks can't be used", NO_ROOM), 5,
                           f"the log holds {log.lines}")
    assert client.call(EVENTS, 1, "list").data["total"] == events
    assert join(client).ok
    assert client.call(EVENTS, 1, "list").data["total"] == events + 1
    works_again(machine)


def test_no_room_for_what_runs(on_small_disk):
    machine = on_small_disk("/run/vorn")
    refresh(machine)
    refresh(machine)
    known = users(machine)
    log = Log(machine)
    with full(machine, "/run/vorn"):
        refused(machine, log, join, 2617, "vornjoin", "/run/vorn/", NO_ROOM)
        refused(machine, log, lambda client: client.refresh(), 2623, "users not fetched", "/run/vorn/", NO_ROOM)
        assert users(machine) == known
        assert machine.client.get()["domain_name"] == "LAB"
        assert machine.trust_works()
    assert not machine.exists("/tmp/domain_updating")
    works_again(machine)


def test_no_room_for_the_marks_of_a_refresh(on_small_disk):
    machine = on_small_disk("/tmp")
    # The first one may still find trusted domains for the configuration.
    refresh(machine)
    refresh(machine)
    known = users(machine)
    log = Log(machine)
    with full(machine, "/tmp"):
        refused(machine, log, lambda client: client.refresh(), 2623, "cannot write /tmp/domain_user.pid")
        assert users(machine) == known
    assert not machine.exists("/tmp/domain_updating")
    works_again(machine)


def test_configuration_that_can_not_be_written(member):
    log = Log(member)
    with read_only(member, ETC):
        refused(member, log, set_options, 2617, f"{ETC}/smbinfo.conf", READ_ONLY)
        refused(member, log, set_time, 2617, f"{ETC}/smb.conf", READ_ONLY)
        refused(member, log, set_schedule, 2617, f"{ETC}/schedule.conf", READ_ONLY)
        refused(member, log, join, 2617, f"{ETC}/smbinfo.conf", READ_ONLY)
        refused(member, log, leave, 2617, f"{ETC}/private/", READ_ONLY)
        assert member.client.refresh().code == 2623
        assert member.client.test_dc() is True
        member.stop()
        member.start()
        assert member.client.get()["domain_name"] == "LAB"
    with read_only(member, "/etc"):
        refused(member, log, set_schedule, 2617, "/etc/cron.d/vorn", READ_ONLY)
        refused(member, log, lambda client: client.join("lab.test", *ADMINISTRATOR, manage_mode=1), 2617,
                "/etc/vorninfo.conf", READ_ONLY)
        refused(member, log, lambda client: client.join("lab.test", "Administrator", "wrong", dns="10.77.0.30"), 2617,
                "/etc/resolv.conf", READ_ONLY)
    works_again(member)


def test_a_keytab_that_can_not_be_written_by_a_join_again(member):
    log = Log(member)
    with read_only(member, "/etc"):
        answer = join(member.client)
        assert answer.code == 2617, answer.body
        steps = member.client.call(DIRECTORY, 1, "join_steps").data["steps"]
        assert any("/etc/krb5.keytab" in step["detail"] for step in steps if step["outcome"] == "failed"), steps
        member.wait_until(lambda: log.says("vornjoin", "/etc/krb5.keytab", READ_ONLY), 5, f"the log: {log.lines}")
        assert member.client.test_dc() is True
        assert member.trust_works()
    # The controller has a new password by now, and the keytab must come to hold it.
    member.stop()
    member.start()
    works_again(member)


TOOLS = ("/usr/bin/net", "/usr/bin/wbinfo", "/usr/sbin/smbd", "/usr/sbin/nmbd", "/usr/sbin/winbindd",
         "/usr/bin/rpcclient", "/usr/bin/nmblookup")


def test_samba_gone(member):
    log = Log(member)
    with away(member, *TOOLS):
        assert member.client.test_dc() is False
        before = everything(member)
        code = join(member.client).code
        assert changes(before, everything(member)) == []
        member.wait_until(lambda: log.says("vornjoin", "/usr/bin/net"), 5, f"the log holds {log.lines}")
        assert member.client.get()["domain_name"] == "LAB"
        assert member.client.call(DOMAIN, 1, "get_domain_list").status == 200
        member.stop()
        result = member.exec(VORND, deadline=10)
        assert (result.code, result.err) == (1, "vornd: /usr/sbin/smbd is missing: install the package samba\n"), result
    for program, package in [("/usr/bin/net", "samba-common-bin"), ("/usr/sbin/winbindd", "winbind")]:
        with away(member, program):
            result = member.exec(VORND, deadline=10)
            assert result.code == 1
            assert result.err == f"vornd: {program} is missing: install the package {package}\n", result
    member.start()
    assert member.trust_works()
    works_again(member)
    assert code == 2617
