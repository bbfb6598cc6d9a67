"""Leaving an Active Directory: what goes, what stays, and what is said about it; with controllers that work and that
don't."""

import pytest

from appliance import assert_cleared
from client import DIRECTORY
from lab import password

ADMINISTRATOR = ("Administrator", password("LAB", "Administrator"))
STAYS = "the computer account NAS1$ stays in the domain LAB"


def leftovers(machine):
    return machine.client.call(DIRECTORY, 1, "join_steps").data["leftovers"]


def registered(machine):
    lines = machine.must("dig", "+short", "nas1.lab.test", "@10.77.0.10").out.split()
    return sorted(line for line in lines if not line.startswith(";"))


def delete_account(machine, secret=ADMINISTRATOR[1]):
    parameters = {"delete_account": True, "username": "Administrator", "password": secret}
    return machine.client.call(DIRECTORY, 1, "leave", parameters)


def test_a_leave_leaves_nothing_here_and_the_account_there(member, directory):
    assert b"LAB.TEST" in member.read("/usr/vorn/etc/smb.conf")
    assert "SECRETS/MACHINE_PASSWORD/LAB" in member.secrets()
    assert member.client.refresh().ok
    rows = member.client.call(DIRECTORY, 1, "domains").data["domains"]
    assert [row["count"] > 0 for row in rows] == [True] * 4
    member.wait_until(lambda: member.exec("wbinfo", "-i", "LAB\\alice").code == 0, 20, "winbind knows a user")
    assert member.exists("/var/lib/samba/winbindd_cache.tdb") and registered(member) == ["10.77.0.101"]
    assert member.client.leave().ok
    assert_cleared(member)
    assert not member.exists("/etc/krb5.keytab")
    assert directory.computer(member.host)
    assert member.client.call(DIRECTORY, 1, "domains").data["domains"] == []
    # The network's records of the appliance are gone, too.
    assert registered(member) == [], member.ctl("steps").text
    assert leftovers(member) == [STAYS]


def test_a_leave_names_the_computer_account_beforehand(member):
    overview = member.client.call(DIRECTORY, 1, "overview").data
    assert (overview["host_name"], overview["computer_account"]) == ("NAS1", "NAS1$")
    assert {"name": "eth0", "addresses": ["10.77.0.101"]} in overview["interfaces"]
    # On a terminal, where it asks.
    asked = member.exec("script", "-qec", "/usr/vorn/bin/vornctl leave", "/dev/null", input="n\n")
    assert "The appliance's computer account NAS1$ stays on the domain controller." in asked.out, asked
    assert member.client.get()["enable_domain"] is True
    assert member.client.leave().ok
    assert_cleared(member)
    assert member.client.call(DIRECTORY, 1, "overview").data["computer_account"] is None


@pytest.mark.parametrize("fault", ["dead", "ldap-drop", "smb-drop"])
def test_a_leave_needs_no_controller(member, lab, fault):
    with lab.fault(fault, "dc1", only=member.host):
        answer = member.client.leave()
        assert answer.ok
        assert answer.seconds < 15
        assert_cleared(member)
    assert STAYS in leftovers(member)


def test_a_leave_after_the_account_was_deleted(member, lab, directory):
    # Only the account: what it has in DNS stays, and belongs to nobody then.
    name = f"CN={member.host.upper()},CN=Computers,DC=lab,DC=test"
    result = lab.exec("dc1", "ldbdel", "-r", "-H", "/var/lib/samba/private/sam.ldb", name, deadline=30)
    assert result.code == 0 and not directory.computer(member.host), result
    assert member.client.test_dc() is False
    assert member.client.leave().ok
    assert_cleared(member)
    assert registered(member) == ["10.77.0.101"]
    assert not any("stays in the domain" in text for text in leftovers(member)), leftovers(member)
    assert any("the addresses of nas1.lab.test stay in DNS" in text for text in leftovers(member)), leftovers(member)
    # The new account may not touch the old one's record, so the administrator of the join does it.
    member.must("sh", "-c", "ip link add spare0 type veth peer name spare1 && ip link set spare1 up && "
                "ip link set spare0 up && ip addr add 192.0.2.77/32 dev spare0")
    assert member.client.join("lab.test", *ADMINISTRATOR).ok
    assert registered(member) == ["10.77.0.101", "192.0.2.77"] and leftovers(member) == []
    assert member.client.test_dc() is True
    # Nor may it remove that record; one who deletes the account has credentials for it.
    answer = delete_account(member)
    assert answer.ok, answer.body
    assert registered(member) == [] and leftovers(member) == []


def test_the_account_can_be_deleted_with_the_leave(member, lab, directory):
    # Without a controller, and with wrong credentials, nothing of the membership goes.
    with lab.fault("dead", "dc1", only=member.host):
        answer = delete_account(member)
    assert answer.code in (2605, 2606) and answer.seconds < 15, answer.body
    assert delete_account(member, "wrong").code == 2607
    result = member.ctl("leave", "--yes", "--delete-account", "--user", "Administrator", "--password-stdin",
                        input="wrong\n")
    assert result.code == 1, result
    assert directory.computer(member.host) and registered(member) == ["10.77.0.101"]
    assert not member.exists("/var/log/winlock.state")
    assert member.client.get()["domain_name"] == "LAB" and member.client.test_dc() is True
    result = member.ctl("leave", "--yes", "--delete-account", "--user", "Administrator", "--password-stdin",
                        input=ADMINISTRATOR[1] + "\n")
    assert result.code == 0, result
    assert_cleared(member)
    assert not directory.computer(member.host)
    assert registered(member) == [] and leftovers(member) == []
