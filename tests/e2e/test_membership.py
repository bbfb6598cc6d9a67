"""A membership: joined again, tested, damaged, with trusted domains and without, changed for another."""

import json
import threading
import time

from appliance import assert_cleared
from client import DIRECTORY, DOMAIN
from lab import password
from obstacles import replaced

ADMINISTRATOR = ("Administrator", password("LAB", "Administrator"))
NT_ADMINISTRATOR = ("Administrator", password("NT4DOM", "Administrator"))


def test_a_member_can_join_again(member):
    answer = member.client.join("lab.test", *ADMINISTRATOR)
    assert answer.ok, member.ctl("steps").text
    assert member.trust_works()
    assert member.client.test_dc() is True


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


def lists(machine):
    rows = machine.client.call(DIRECTORY, 1, "domains").data["domains"]
    return {row["domain"] for row in rows if row["count"] > 0}


def test_trusted_domains_can_be_left_out_and_come_back(appliance):
    answer = appliance.client.join("lab.test", *ADMINISTRATOR, manage_mode=1)
    assert answer.ok, appliance.ctl("steps").text
    assert appliance.client.get()["manage_mode"] == 1
    assert appliance.client.domains(1) == ["LAB"]
    rows = appliance.client.domains(2)
    assert rows[0] == ["--", "", "LAB"]
    assert any("Sales, West" in row[0] for row in rows), rows
    assert appliance.option_of_samba("allow trusted domains") == "No"
    assert appliance.client.refresh().data == {"status": "finish"}
    assert lists(appliance) == {"LAB"}

    assert appliance.client.join("lab.test", *ADMINISTRATOR, manage_mode=0).ok, appliance.ctl("steps").text
    assert appliance.client.get()["manage_mode"] == 0
    assert appliance.client.domains(1) == ["LAB", "OTHER"]
    assert appliance.option_of_samba("allow trusted domains") == "Yes"
    assert appliance.client.refresh().data == {"status": "finish"}
    assert lists(appliance) == {"LAB", "OTHER"}


def test_an_account_that_was_damaged_on_the_controller(member, lab, directory):
    """The membership says so, and joining again repairs it, at once or after a leave."""
    disable = ("user", "disable", "NAS1$")
    new_password = ("user", "setpassword", "NAS1$", "--newpassword=Another.passw0rd")
    for damage, leave in [(disable, False), (new_password, True)]:
        result = lab.exec("dc1", "samba-tool", *damage, deadline=30)
        assert result.code == 0, result
        answer = member.client.call(DOMAIN, 1, "test_dc")
        assert answer.data == {"test_join_success": False} and answer.seconds < 13, (damage, answer.body)
        assert member.client.refresh("LAB").code == 2623, damage
        if leave:
            assert member.client.leave().ok
            assert_cleared(member)
            leftovers = member.client.call(DIRECTORY, 1, "join_steps").data["leftovers"]
            assert any("NAS1$ stays in the domain LAB" in text for text in leftovers), leftovers
        answer = member.client.join("lab.test", *ADMINISTRATOR)
        assert answer.ok, (damage, member.ctl("steps").text)
        assert member.client.test_dc() is True
        assert "userAccountControl: 4096" in directory.search("(sAMAccountName=NAS1$)", "userAccountControl")
    assert member.client.refresh("LAB").data == {"status": "finish"}


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


def test_a_member_changes_its_domain(member):
    answer = member.client.join("NT4DOM", *NT_ADMINISTRATOR)
    assert answer.ok, member.ctl("steps").text
    assert member.client.get()["domain_name"] == "NT4DOM"
    assert member.client.test_dc() is True
