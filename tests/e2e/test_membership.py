"""Join, join again, leave: of both kinds of domain, with controllers that work and that don't."""

import json
import threading
import time

import pytest

from client import DIRECTORY, DOMAIN
from lab import password
from obstacles import replaced

ADMINISTRATOR = ("Administrator", password("LAB", "Administrator"))
NT_ADMINISTRATOR = ("Administrator", password("NT4DOM", "Administrator"))


def secrets_of(machine):
    return machine.must("sh", "-c", "tdbdump /var/lib/samba/private/secrets.tdb 2>/dev/null | grep -o 'key([0-9]*) = "
                        "\"[^\"]*\"' || true").out


def lists(machine):
    return machine.client.call(DIRECTORY, 1, "domains").data["domains"]


def winbind_runs(machine):
    return machine.exec("pgrep", "-x", "winbindd").code == 0


def test_a_member_can_join_again(member):
    answer = member.client.join("lab.test", *ADMINISTRATOR)
    assert answer.ok, member.ctl("steps").text
    assert member.trust_works()
    assert member.client.test_dc() is True


def test_a_leave_leaves_nothing_here_and_the_account_there(member, directory):
    first = member.read("/usr/vorn/etc/smb.conf")
    assert b"LAB.TEST" in first
    assert member.client.refresh().ok
    assert [row["count"] > 0 for row in lists(member)] == [True] * 4
    answer = member.client.leave()
    assert answer.ok
    assert not member.exists("/etc/krb5.keytab")
    assert not winbind_runs(member)
    assert b"LAB" not in member.read("/usr/vorn/etc/smb.conf")
    assert directory.computer(member.host)
    assert lists(member) == []
    # The network's records of the appliance are gone, too.
    assert member.exec("dig", "+short", "nas1.lab.test", "@10.77.0.10").out.strip() == "", member.ctl("steps").text
    steps = member.client.call(DIRECTORY, 1, "join_steps").data
    assert any("NAS1$" in text for text in steps["leftovers"]), steps


def test_leaving_and_joining_gives_the_same_configuration(member):
    joined = member.read("/usr/vorn/etc/smb.conf")
    assert member.client.leave().ok
    assert member.client.join("lab.test", *ADMINISTRATOR).ok
    assert member.read("/usr/vorn/etc/smb.conf") == joined


def test_the_last_test_is_told_until_the_membership_changes(member, lab):
    def last_test():
        return member.client.call(DIRECTORY, 1, "overview").data["last_test"]

    assert last_test() is None
    assert "Last test        none yet" in member.ctl("status").out
    before = int(time.time())
    assert member.client.test_dc() is True
    good = last_test()
    assert good["success"] is True and good["time"] >= before and 0 < good["milliseconds"] < 12000
    assert "Last test        worked, " in member.ctl("status").out
    with lab.fault("dead", "dc1", only=member.host):
        assert member.ctl("test").code == 5
    bad = last_test()
    assert bad["success"] is False and bad["time"] >= good["time"] and bad["milliseconds"] > good["milliseconds"]
    assert "Last test        failed, " in member.ctl("status").out
    assert json.loads(member.ctl("--json", "status").out)["data"]["last_test"] == bad
    # It outlives the server, but neither a new join nor a leave.
    member.kill()
    member.start()
    assert last_test() == bad
    assert member.client.join("lab.test", *ADMINISTRATOR).ok
    assert last_test() is None
    assert member.client.test_dc() is True
    assert last_test()["success"] is True
    # A join that fails changes nothing.
    assert member.client.join("lab.test", "Administrator", "wrong").code == 2607
    assert last_test()["success"] is True
    assert member.client.leave().ok
    assert last_test() is None and not member.exists("/var/lib/vorn/last_test.json")
    assert member.client.test_dc() is False
    assert last_test() is None


# Samba's tool, but that its attempts to test the membership end as the words of /tmp/attempts tell, one after the other.
ODD_TESTS = """cat >"$1" <<'SCRIPT'
#!/bin/bash
if [[ " $* " == *" testjoin "* ]]; then
    read -r next others </tmp/attempts
    echo "$others" >/tmp/attempts
    case $next in
        fails) echo 'Join to domain is not valid: No logon servers are currently available' >&2; exit 255 ;;
        hangs) exec sleep 60 ;;
    esac
fi
exec -a net /usr/bin/net.kept "$@"
SCRIPT
"""


def test_an_attempt_of_the_test_that_fails_or_hangs_is_not_the_last(member):
    with replaced(member, "/usr/bin/net", ODD_TESTS):
        for attempts, works in [("hangs", True), ("fails hangs", True), ("fails fails fails", False)]:
            member.must("sh", "-c", 'echo "$1" >/tmp/attempts', "write", attempts)
            answer = member.client.call(DOMAIN, 1, "test_dc")
            assert answer.data == {"test_join_success": works} and answer.seconds < 13, (attempts, answer)
            assert member.must("cat", "/tmp/attempts").out.strip() == "", f"{attempts}: an attempt was not made"


def test_a_leave_names_the_computer_account_beforehand(member):
    overview = member.client.call(DIRECTORY, 1, "overview").data
    assert (overview["host_name"], overview["computer_account"]) == ("NAS1", "NAS1$")
    assert {"name": "eth0", "addresses": ["10.77.0.101"]} in overview["interfaces"]
    # On a terminal, where it asks.
    asked = member.exec("script", "-qec", "/usr/vorn/bin/vornctl leave", "/dev/null", input="n\n")
    assert "The appliance's computer account NAS1$ stays on the domain controller." in asked.out, asked
    assert member.client.get()["enable_domain"] is True
    assert member.client.leave().ok
    assert member.client.call(DIRECTORY, 1, "overview").data["computer_account"] is None


def test_a_join_that_runs_is_told(appliance):
    busy = set()
    answers = []
    join = threading.Thread(target=lambda: answers.append(appliance.client.join("lab.test", *ADMINISTRATOR)))
    join.start()
    while join.is_alive():
        busy.add(appliance.client.call(DIRECTORY, 1, "overview").data["busy"])
        time.sleep(0.05)
    assert answers[0].ok, appliance.ctl("steps").text
    assert "join" in busy and "leave" not in busy
    assert appliance.client.call(DIRECTORY, 1, "overview").data["busy"] is None
    assert appliance.client.get()["enable_domain"] is True


@pytest.mark.parametrize("fault", ["dead", "ldap-drop", "smb-drop"])
def test_a_leave_needs_no_controller(member, lab, fault):
    with lab.fault(fault, "dc1", only=member.host):
        answer = member.client.leave()
    assert answer.ok
    assert answer.seconds < 15
    assert member.client.get() == {"enable_domain": False}
    assert not winbind_runs(member)


def test_a_leave_after_the_account_was_deleted(member, lab):
    assert lab.exec("dc1", "samba-tool", "computer", "delete", "NAS1", deadline=30).code == 0
    assert member.client.test_dc() is False
    assert member.client.leave().ok
    assert member.client.join("lab.test", *ADMINISTRATOR).ok
    assert member.client.test_dc() is True


def test_the_account_can_be_deleted_with_the_leave(member, directory):
    result = member.ctl("leave", "--yes", "--delete-account", "--user", "Administrator", "--password-stdin",
                        input=ADMINISTRATOR[1] + "\n")
    assert result.code == 0, result
    assert not directory.computer(member.host)


def test_wrong_credentials_for_the_deletion_leave_a_member(member, directory):
    result = member.ctl("leave", "--yes", "--delete-account", "--user", "Administrator", "--password-stdin",
                        input="wrong\n")
    assert result.code == 1, result
    assert directory.computer(member.host)
    assert member.client.test_dc() is True


def test_trusted_domains_can_be_left_out(appliance):
    answer = appliance.client.join("lab.test", *ADMINISTRATOR, manage_mode=1)
    assert answer.ok, appliance.ctl("steps").text
    assert appliance.client.get()["manage_mode"] == 1
    assert appliance.client.domains(1) == ["LAB"]
    rows = appliance.client.domains(2)
    assert rows[0] == ["--", "", "LAB"]
    assert any("Sales, West" in row[0] for row in rows), rows
    assert appliance.option_of_samba("allow trusted domains") == "No"


def test_only_the_named_interfaces_are_registered(appliance):
    for words in ("add spare0 type veth peer name spare1", "set spare0 up", "set spare1 up"):
        appliance.must("ip", "link", *words.split())
    appliance.must("ip", "addr", "add", "192.0.2.77/32", "dev", "spare0")

    def registered():
        return sorted(appliance.must("dig", "+short", "nas1.lab.test", "@10.77.0.10").out.split())

    options = {"enable_advance_option": True, "kdc": "", "netbios_name": "", "fqdn_name": ""}
    for interfaces, addresses in [(["spare0"], ["192.0.2.77"]), (["all"], ["10.77.0.101", "192.0.2.77"])]:
        answer = appliance.client.join("lab.test", *ADMINISTRATOR,
                                       advance_domain_conf={**options, "register_nics": interfaces})
        assert answer.ok, appliance.ctl("steps").text
        assert registered() == addresses
        assert appliance.client.get()["advance_domain_conf"]["register_nics"] == interfaces


def test_the_whole_life_in_an_nt4_style_domain(appliance):
    client = appliance.client
    answer = client.join("NT4DOM", *NT_ADMINISTRATOR)
    assert answer.ok, appliance.ctl("steps").text
    status = client.get()
    assert (status["domain_name"], status["domain_type"]) == ("NT4DOM", "NT4")
    assert client.test_dc() is True
    assert client.domains(1) == ["NT4DOM"]
    assert client.refresh().data == {"status": "finish"}
    users = client.call(DIRECTORY, 1, "users", {"domain": "NT4DOM", "offset": 0, "limit": 100}).data["entries"]
    assert "nina" in {user["name"] for user in users}
    assert client.join("NT4DOM", *NT_ADMINISTRATOR).ok
    assert client.test_dc() is True
    assert client.leave().ok
    assert client.get() == {"enable_domain": False}


NT4_REFUSED = [
    ("Administrator", "wrong", 2610),
    ("nobody-here", "wrong", 2610),
    ("nina", password("NT4DOM", "nina"), 2611),
    ("ntdisabled", password("NT4DOM", "ntdisabled"), 2609),
    ("ntlocked", password("NT4DOM", "ntlocked"), 2608),
    ("ntmustch", password("NT4DOM", "ntmustch"), 2612),
]


@pytest.mark.parametrize("user, secret, code", NT4_REFUSED)
def test_refused_by_an_nt4_style_domain(appliance, user, secret, code):
    before = appliance.configuration()
    answer = appliance.client.join("NT4DOM", user, secret)
    assert answer.code == code, appliance.ctl("steps").text
    assert answer.seconds < 30
    assert appliance.configuration() == before
    assert appliance.client.get() == {"enable_domain": False}


def test_a_member_changes_its_domain(member):
    answer = member.client.join("NT4DOM", *NT_ADMINISTRATOR)
    assert answer.ok, member.ctl("steps").text
    assert member.client.get()["domain_name"] == "NT4DOM"
    assert member.client.test_dc() is True
