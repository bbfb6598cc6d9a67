"""The five options of the file-sharing service: what they are set to comes back, and each does what its name says."""

import re
import time

import pytest

from client import CONF, DIRECTORY
from lab import password
from obstacles import Log, replaced
from processes import programs

DEFAULTS = {
    "enable_sync_time": False,
    "enable_server_signing": False,
    "enable_rpc_enum_usergroup": False,
    "domain_nested_group": 1,
    "disable_domain_admins": False,
}
CRON = "/etc/cron.d/vorn"
ACCESS_DENIED = 5
CAP_SYS_TIME = 25


@pytest.fixture(scope="module")
def member(joined):
    return joined


@pytest.fixture(autouse=True)
def as_they_were(member, lab):
    assert member.client.options() == DEFAULTS
    yield
    lab.must("fault", "none")
    member.client.options(**DEFAULTS)


def set_options(machine, **changes):
    """Sets and reads back: what was not given stays as it was."""
    before = machine.client.options()
    answer = machine.client.call(CONF, 1, "set", changes)
    assert answer.body == {"success": True, "data": None}
    assert machine.client.options() == {**before, **changes}


def smb_client(machine, *words, user="alice"):
    return machine.exec("smbclient", f"//{machine.lab.address(machine.host)}/IPC$", "-U", f"LAB/{user}", *words, "-c",
                        "exit", env={"PASSWD": password("LAB", user)})


@pytest.fixture
def old_protocol(member):
    """In the newest protocols there always is signing; only in the old one a server tells whether it offers it."""
    conf = member.read("/usr/vorn/etc/smb.conf")
    member.write("/usr/vorn/etc/smb.conf", conf + b"[global]\n    server min protocol = NT1\n")
    yield
    member.write("/usr/vorn/etc/smb.conf", conf)
    assert member.exec("smbcontrol", "--configfile=/usr/vorn/etc/smb.conf", "smbd", "reload-config").code == 0


# Negotiates the old protocol and prints the server's security mode.
NEGOTIATE = r"""import socket, struct, sys
dialects = b"\x02NT LM 0.12\0"
message = (b"\xffSMB\x72" + bytes(4) + b"\x18" + struct.pack("<H", 0xC843) + bytes(12) +
           struct.pack("<HHHHBH", 0, 1, 0, 0, 0, len(dialects)) + dialects)
connection = socket.create_connection((sys.argv[1], 445), timeout=10)
connection.sendall(struct.pack(">I", len(message)) + message)
answer = connection.recv(4096)
print(answer[39] if answer[4:9] == b"\xffSMB\x72" and len(answer) > 39 else "none")
"""
SIGNATURES_ENABLED = 4


def offers_signing(machine):
    mode = machine.must("python3", "-c", NEGOTIATE, machine.lab.address(machine.host)).out.strip()
    return None if mode == "none" else int(mode) & SIGNATURES_ENABLED != 0


def test_server_signing(member, old_protocol):
    for wanted, stored in ((True, "if_required"), (False, "default")):
        set_options(member, enable_server_signing=wanted)
        assert member.option_of_samba("server signing") == stored
        member.wait_until(lambda: offers_signing(member) is wanted, 10, f"signing offered: {wanted}")
        # A client that insists is signed with, and one that does not is let in.
        for words in (["--client-protection=sign"], ["--option=client signing=disabled"]):
            result = smb_client(member, *words)
            assert result.code == 0, result


@pytest.fixture
def nested(lab):
    """LAB's group outer, with middle in it, with inner in that, with alice in that."""
    groups = ["e2e-inner", "e2e-middle", "e2e-outer"]

    def tool(*words):
        result = lab.exec("dc1", "samba-tool", "group", *words, deadline=30)
        assert result.code == 0, result

    for member, group in zip(["alice", *groups], groups):
        tool("add", group)
        tool("addmembers", group, member)
    yield "LAB\\e2e-outer"
    for group in groups:
        tool("delete", group)


def test_nested_groups(member, nested):
    def members():
        found = member.exec("getent", "group", nested, deadline=30)
        assert found.code == 0, found
        return found.out.strip().split(":")[3].lower()

    for depth, seen in ((2, False), (3, True), (2, False), (99, True), (1, False)):
        set_options(member, domain_nested_group=depth)
        assert member.option_of_samba("winbind expand groups") == str(depth)
        assert ("lab\\alice" in members()) is seen, depth
    for wrong in (0, 100, -1):
        member.client.options(domain_nested_group=wrong)
        assert member.client.options()["domain_nested_group"] == 1


def test_nt4_style_enumeration(member, lab):
    def users():
        page = member.client.call(DIRECTORY, 1, "users", {"domain": "LAB", "offset": 0, "limit": 1000}).data
        return {(entry["name"], entry["id"], entry["display"]) for entry in page["entries"]}

    assert member.client.refresh("LAB").ok
    by_ldap = users()
    with lab.fault("ldap-drop", only=member.host):
        assert member.client.refresh("LAB").code == 2623
        set_options(member, enable_rpc_enum_usergroup=True)
        assert member.client.refresh("LAB").data == {"status": "finish"}
        assert {entry[:2] for entry in users()} == {entry[:2] for entry in by_ldap}
        set_options(member, enable_rpc_enum_usergroup=False)
        assert member.client.refresh("LAB").code == 2623
    # And by RPC alone: with port 445 closed it is the other way round.
    with lab.fault("smb-rst", only=member.host):
        assert member.client.refresh("LAB").ok
        set_options(member, enable_rpc_enum_usergroup=True)
        assert member.client.refresh("LAB").code == 2623


def test_domain_administrators(member):
    def administrators():
        return member.net("sam", "listmem", "Administrators").out

    def may_administer(user):
        """Only administrators are told which files are open."""
        result = member.exec("net", "rpc", "file", "-S", member.lab.address(member.host), "-U", f"LAB/{user}",
                             env={"PASSWD": password("LAB", user)})
        assert result.code in (0, ACCESS_DENIED), result
        return result.code == 0

    assert "LAB\\Domain Admins" in administrators()
    assert may_administer("Administrator") and not may_administer("alice")
    for _ in range(2):
        set_options(member, disable_domain_admins=True)
        assert "Domain Admins" not in administrators()
        assert not may_administer("Administrator")
        set_options(member, disable_domain_admins=False)
        assert "LAB\\Domain Admins" in administrators()
        assert may_administer("Administrator")


def test_time_synchronisation(member, lab):
    def said(text):
        return [line for line in member.syslog().splitlines() if "vornwin" in line and text in line]

    def tasks():
        return re.findall(r"^(\S+ \S+ \S+ \S+ \S+) root .*vornwin -syncTime", (member.read(CRON) or b"").decode(),
                          re.MULTILINE)

    assert not tasks() and not said("clock")
    # Cron's own look would be one too many.
    member.wait_until(lambda: member.must("date", "+%M").out.strip() not in ("42", "43"), 135, "the end of that minute")
    set_options(member, enable_sync_time=True)
    assert tasks() == ["43 " + ",".join(map(str, range(24))) + " * * 0,1,2,3,4,5,6"]
    member.wait_until(lambda: len(said("the clock agrees with that of dc1.lab.test")) == 1, 15, "a first look")
    # Once more, nothing changes.
    set_options(member, enable_sync_time=True)
    assert len(tasks()) == 1
    # It is the controller's word that counts: without it nobody is asked.
    with lab.fault("smb-drop", only=member.host):
        started = time.monotonic()
        assert member.exec("/usr/vorn/sbin/vornwin", "-syncTime").code == 1
        assert time.monotonic() - started < 20
    assert said("no controller of LAB tells the time")
    assert member.exec("/usr/vorn/sbin/vornwin", "-syncTime").code == 0
    looks = len(said("the clock agrees"))
    set_options(member, enable_sync_time=False)
    assert tasks() == []
    time.sleep(2)
    assert len(said("the clock agrees")) == looks


# Samba's tool, but that the controller's clock is so many seconds ahead as /tmp/ahead says.
ODD_TIME = """cat >"$1" <<'SCRIPT'
#!/bin/bash
for word; do
    [ "$word" != time ] || exec date -u -d "now + $(cat /tmp/ahead) seconds" "+%a %b %d %H:%M:%S %Y"
done
exec -a net /usr/bin/net.kept "$@"
SCRIPT
"""


CANT_BE_SET = r"the clock differs by (\S+) s from that of dc1\.lab\.test and can't be set: Operation not permitted"


def test_a_clock_that_differs_is_set_to_the_controllers(member):
    """The lab's hosts may not set the clock, which is one for the whole machine: how far it was to go is in the log."""
    def refusals():
        """By how many seconds the clock was to be set; a second may end between the two looks. Cron may look, too."""
        found = re.findall(CANT_BE_SET, "\n".join(log.lines))
        return list(dict.fromkeys(round(int(ahead), -2) for ahead in found))

    log = Log(member)
    for process in programs(member, "vornd"):
        assert not int(process.status("CapEff")[0], 16) & 1 << CAP_SYS_TIME
    with replaced(member, "/usr/bin/net", ODD_TIME):
        member.write("/tmp/ahead", "605")
        # Off: nothing looks at a clock.
        set_options(member, enable_rpc_enum_usergroup=True)
        assert not [line for line in log.lines if "clock" in line]
        set_options(member, enable_sync_time=True)
        member.wait_until(refusals, 15, "an attempt to set the clock")
        assert refusals() == [600]
        for ahead in (-605, 90005):
            member.write("/tmp/ahead", str(ahead))
            assert member.exec("/usr/vorn/sbin/vornwin", "-syncTime").code == 1
        assert refusals() == [600, -600]
        assert log.says("the clock differs by +900", "more than a day, and is not set")
        member.must("rm", "/tmp/ahead")
    assert member.exec("/usr/vorn/sbin/vornwin", "-syncTime").code == 0


def test_all_at_once_and_what_is_refused(member):
    everything = {"enable_sync_time": True, "enable_server_signing": True, "enable_rpc_enum_usergroup": True,
                  "domain_nested_group": 5, "disable_domain_admins": True}
    set_options(member, **everything)
    files = ("/usr/vorn/etc/smb.conf", "/usr/vorn/etc/smbinfo.conf", CRON)
    before = [member.read(path) for path in files]
    for key, value in (("enable_sync_time", 1), ("enable_server_signing", "yes"), ("domain_nested_group", "5"),
                       ("domain_nested_group", 1.5), ("disable_domain_admins", None)):
        answer = member.client.call(CONF, 1, "set", {"enable_rpc_enum_usergroup": False, key: value})
        assert answer.code == 2618, (key, value, answer.body)
    assert [member.read(path) for path in files] == before
    assert member.client.options() == everything
    set_options(member, **DEFAULTS)
