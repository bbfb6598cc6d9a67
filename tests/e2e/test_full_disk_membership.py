"""Where a membership lives, no room or nothing to be written, and Samba's tools missing one at a time: a join, a join
again and a leave are refused or wholly done, and the membership works afterwards."""

from client import CONF
from lab import password
from lasting import (ADMINISTRATOR, NO_ROOM, READ_ONLY, changes, everything, join, leave, refused, set_schedule,
                     works_again)
from obstacles import Log, away, full, read_only, small_disk
from processes import programs, wait_for_tasks

SAMBA = "/var/lib/samba"
SECRETS = f"{SAMBA}/private/secrets.tdb"
KEYTAB = "/etc/krb5.keytab"


def restart(machine):
    machine.stop()
    machine.start()


def check_member(machine):
    assert machine.client.get()["domain_name"] == "LAB"
    tested = machine.net("ads", "testjoin", deadline=30)
    assert tested.code == 0 and "OK" in tested.text, tested
    assert machine.client.test_dc() is True, machine.syslog()[-2000:]


def logs(machine):
    """The logger opens its file anew, but not at once."""
    machine.must("logger", "-t", "test", "the disk is new")
    return b"the disk is new" in machine.read("/var/log/syslog")


def left(machine):
    """Wholly: no word of the domain, and winbind does not run."""
    assert machine.client.get() == {"enable_domain": False}
    assert b"LAB" not in machine.read("/usr/vorn/etc/smb.conf").upper()
    assert not programs(machine, "winbindd")


def test_no_room_for_sambas_own_state(appliance, directory):
    machine = appliance
    machine.stop()
    small_disk(machine, SAMBA)
    machine.start()
    log = Log(machine)
    with full(machine, SAMBA):
        refused(machine, log, join, 2617, "vornjoin", SECRETS, NO_ROOM)
        left(machine)
        assert not directory.computer("nas1")
    assert join(machine.client).ok, log.lines
    # The file has its room by now, so that a join again and a leave find enough.
    with full(machine, SAMBA):
        assert join(machine.client).ok, log.lines
        check_member(machine)
        restart(machine)
        check_member(machine)
        assert leave(machine.client).ok, log.lines
        left(machine)
    assert join(machine.client).ok, log.lines
    check_member(machine)
    works_again(machine)


def test_samba_s_own_state_and_the_keytab_can_not_be_written(member):
    machine = member
    log = Log(machine)
    with read_only(machine, SAMBA):
        refused(machine, log, join, 2617, "vornjoin", SECRETS, READ_ONLY)
    check_member(machine)
    with read_only(machine, "/etc"):
        restart(machine)
        check_member(machine)
        # What can't be taken away is named, and the appliance is no member all the same.
        assert leave(machine.client).ok, log.lines
        left(machine)
        machine.wait_until(lambda: log.says("could not be removed", KEYTAB, READ_ONLY), 5, f"the log holds {log.lines}")
        restart(machine)
        left(machine)
    assert join(machine.client).ok, log.lines
    check_member(machine)
    with read_only(machine, SAMBA):
        assert leave(machine.client).ok, log.lines
        left(machine)
        machine.wait_until(lambda: log.says("could not be removed", SECRETS, READ_ONLY), 5, f"the log: {log.lines}")
    assert join(machine.client).ok, log.lines
    check_member(machine)
    works_again(machine)


def test_no_room_for_the_keytab_and_the_log(member):
    machine = member
    machine.stop()
    small_disk(machine, "/etc")
    small_disk(machine, "/var/log")
    machine.wait_until(lambda: logs(machine), 10, "the system's logger writes to the new disk")
    machine.start()
    log = Log(machine)
    with full(machine, "/etc"):
        refused(machine, log, join, 2617, "vornjoin", KEYTAB, NO_ROOM)
        check_member(machine)
        refused(machine, log, lambda client: client.join("lab.test", *ADMINISTRATOR, manage_mode=1), 2617,
                "/etc/vorninfo.conf", NO_ROOM)
        refused(machine, log, lambda client: client.join("lab.test", "Administrator", "wrong", dns="10.77.0.30"), 2617,
                "/etc/resolv.conf", NO_ROOM)
        refused(machine, log, set_schedule, 2617, "/etc/cron.d/vorn", NO_ROOM)
        restart(machine)
        check_member(machine)
        assert leave(machine.client).ok, log.lines
        left(machine)
        restart(machine)
    # There is a log again only when this is over, but the code does not come from it.
    with full(machine, "/var/log"):
        before = everything(machine)
        assert machine.client.join("lab.test", "norights", password("LAB", "norights")).code == 2611
        assert changes(before, everything(machine)) == []
        assert join(machine.client).ok
        assert join(machine.client).ok
        check_member(machine)
        assert leave(machine.client).ok
        left(machine)
    assert join(machine.client).ok, log.lines
    check_member(machine)
    works_again(machine)


def set_option(client, value):
    answer = client.call(CONF, 1, "set", {"disable_domain_admins": value, "domain_nested_group": 5})
    assert answer.ok and client.options()["domain_nested_group"] == 5
    assert client.options()["disable_domain_admins"] is value


def test_samba_s_tools_missing_one_at_a_time(member):
    machine, client = member, member.client
    log = Log(machine)
    with away(machine, "/usr/bin/nmblookup"):
        set_option(client, True)
        assert client.refresh().ok
        wait_for_tasks(machine)
        check_member(machine)
    # Lists come by the tool only with this option.
    assert client.call(CONF, 1, "set", {"enable_rpc_enum_usergroup": True}).ok
    with away(machine, "/usr/bin/rpcclient"):
        refused(machine, log, lambda client: client.refresh(), 2623, "LAB: users not fetched", "rpcclient",
                "No such file or directory")
        wait_for_tasks(machine)
        set_option(client, False)
    with away(machine, "/usr/bin/wbinfo"):
        set_option(client, True)
        assert client.refresh().ok
        wait_for_tasks(machine)
        assert leave(client).ok, log.lines
        left(machine)
    assert join(client).ok, log.lines
    with away(machine, "/usr/bin/net"):
        # The option holds; who administers is put right by whatever is started next.
        set_option(client, False)
        machine.wait_until(lambda: log.says("administrators", "net", "No such file or directory"), 10,
                           f"the log holds {log.lines}")
        assert client.refresh().ok
        wait_for_tasks(machine)
        assert client.test_dc() is False
        assert leave(client).ok, log.lines
        left(machine)
        machine.wait_until(lambda: log.says("stay in DNS", "No such file or directory"), 5, f"the log: {log.lines}")
    assert join(client).ok, log.lines
    check_member(machine)
    works_again(machine)
