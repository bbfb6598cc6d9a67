"""Control bytes from a request, from DNS and from a domain controller: none ever comes into a configuration file."""

import base64
import contextlib
import json
import pathlib
import signal
import subprocess

import pytest

from client import CONF, DIRECTORY, DOMAIN, SCHEDULE
from lab import COMMAND, password
from obstacles import files_under

ADMINISTRATOR = ("Administrator", password("LAB", "Administrator"))
CONTROL = ["\n", "\r", "\t", "\0", "\x01", "\x1b", "\x7f"]
ODD_DNS = pathlib.Path(__file__).with_name("odd_dns.py")
FILES = ("/etc/resolv.conf", "/etc/vorninfo.conf", "/etc/krb5.conf", "/etc/cron.d/vorn", "/etc/hosts",
         "/etc/nsswitch.conf", "/etc/samba/smb.conf", "/run/vorn/kerberos/krb5.conf")
# These keep what was asked for, as JSON; no program is configured by them.
STATE = ("/var/lib/vorn/domains.json", "/var/lib/vorn/units.json", "/run/vorn/join_steps.json",
         "/run/vorn/refresh.json")


def texts(machine):
    """Every configuration file and what is kept as text."""
    found = {path: machine.read(path) for path in FILES + STATE}
    found.update(files_under(machine, "/usr/vorn/etc"))
    return {path: text for path, text in found.items()
            if text is not None and not path.endswith((".db", ".tdb", "dns_query"))}


def control_bytes(text):
    return {byte for byte in text if (byte < 0x20 and byte not in b"\n\t") or byte == 0x7F}


def clean(machine):
    for path, text in texts(machine).items():
        if path in STATE:
            json.loads(text)
        else:
            assert not control_bytes(text), (path, text)
            assert b"evil" not in text.lower(), (path, text)


def refusals():
    """(API, method, parameters): each text of each method that writes, with each control byte."""
    join = {"enable_domain": True, "domain_name": "nowhere.test", "username": "nobody", "password": "x"}
    advanced = {"enable_advance_option": True, "kdc": "", "netbios_name": "", "fqdn_name": "", "register_nics": []}
    week = {"date_type": 0, "week_name": "1", "hour": 3, "min": 4}
    day = {"date_type": 1, "date": "2030/1/1", "repeat": 1, "hour": 3, "min": 4}
    for byte in CONTROL:
        end = f"{byte}evil = yes"
        yield DOMAIN, "set", {**join, "domain_name": "nowhere.test" + end}
        yield DOMAIN, "set", {**join, "username": "nobody" + end}
        yield DOMAIN, "set", {**join, "dns": "10.77.0.10" + end}
        if byte in "\n\r\t\0":  # blanks, and the end of a text: alone they might count as nothing
            yield DOMAIN, "set", {**join, "dns": f"10.77.0.10,{byte}"}
        for key, value in (("kdc", "10.77.0.10"), ("netbios_name", "LAB"), ("fqdn_name", "lab.test")):
            yield DOMAIN, "set", {**join, "advance_domain_conf": {**advanced, key: value + end}}
        yield DOMAIN, "set", {**join, "advance_domain_conf": {**advanced, "register_nics": ["eth0" + end]}}
        yield SCHEDULE, "set", {**week, "week_name": "1" + end}
        yield SCHEDULE, "set", {**day, "date": "2030/1/1" + end}
        yield DIRECTORY, "users", {"domain": "LAB" + end}
        yield DIRECTORY, "leave", {"delete_account": True, "username": "a" + end, "password": "x"}
        yield DOMAIN, "update_status", {"task_id": "DomainUpdate_" + end}


def test_from_requests(appliance):
    client = appliance.client
    client.call(SCHEDULE, 1, "set", {"date_type": 2})
    before = appliance.configuration()
    for api, method, parameters in refusals():
        answer = client.call(api, 1, method, parameters)
        assert answer.status == 200 and not answer.ok, (method, parameters, answer.body)
    clean(appliance)
    assert appliance.configuration() == before
    assert client.get() == {"enable_domain": False}


@contextlib.contextmanager
def odd_dns(machine, mode):
    """Answers at 127.0.0.53 of the appliance."""
    process = subprocess.Popen(
        [COMMAND, "exec", machine.host, "python3", "-c", ODD_DNS.read_text(), "127.0.0.53", "10.77.0.10", mode],
        env={**machine.lab.env, "PATH": "/usr/bin:/bin"}, stdin=subprocess.DEVNULL, stdout=subprocess.PIPE)
    try:
        assert process.stdout.readline() == b"ready\n"
        yield
    finally:
        process.send_signal(signal.SIGKILL)
        process.wait(timeout=10)
        process.stdout.close()


def test_from_dns(appliance):
    before = appliance.configuration()
    with odd_dns(appliance, "only"):
        answer = appliance.client.join("lab.test", *ADMINISTRATOR, dns="127.0.0.53")
        assert answer.code in (2602, 2605), appliance.ctl("steps").text
    assert appliance.configuration() == before
    clean(appliance)
    with odd_dns(appliance, "add"):
        answer = appliance.client.join("lab.test", *ADMINISTRATOR, dns="127.0.0.53")
        assert answer.ok, appliance.ctl("steps").text
        assert b"nameserver 127.0.0.53" in appliance.read("/etc/resolv.conf")
        assert appliance.client.test_dc() is True
        assert appliance.client.refresh().data == {"status": "finish"}
        assert appliance.client.domains()[0] == "LAB"
        clean(appliance)
        assert not control_bytes(appliance.ctl("steps").out.encode())


def updating(client, task):
    answer = client.refresh_status(task)
    return answer.ok and answer.data["status"] == "updating"


def test_from_requests_of_a_member(joined):
    client = joined.client
    client.call(SCHEDULE, 1, "set", {"date_type": 0, "week_name": "1", "hour": 3, "min": 4})
    before = joined.configuration()
    for api, method, parameters in refusals():
        if api == SCHEDULE or parameters.get("delete_account") or "dns" in parameters:
            answer = client.call(api, 1, method, parameters)
            assert answer.status == 200 and not answer.ok, (method, parameters, answer.body)
    for byte in CONTROL:
        answer = client.start_refresh(f"LAB{byte}EVIL")
        if answer.ok:
            task = answer.data["task_id"]
            joined.wait_until(lambda: not updating(client, task), 20, "the refresh ends")
        client.call(DIRECTORY, 1, "users", {"search": f"a{byte}b"})
    clean(joined)
    assert joined.configuration() == before
    assert client.test_dc() is True


def test_what_is_no_utf8_or_no_json(joined):
    before = joined.configuration()
    for text in [b'{"week_name": "\xff"}', b'{"week_name": "\xc0\x8a"}', b'{"week_name": "\xed\xa0\x80"}',
                 b'{"week_name": "1\n2"}', b'{"week_name": "\x1b"}', b'{"week_name": "\\ud800"}', b'{"\x00": 1}',
                 b'{"week_name": "1\x00"}']:
        for api in (DOMAIN, CONF, SCHEDULE):
            status, body = joined.client.request("POST", f"/webapi/{api}/1/set", text)
            assert status in (200, 400) and json.loads(body)["success"] is False, (text, body)
    assert joined.configuration() == before


ODD_NAMES = """dn: CN=odd1,CN=Users,DC=lab,DC=test
objectClass: user
sAMAccountName: odd1
displayName:: {text}
description:: {text}

dn: CN=odd2,CN=Users,DC=lab,DC=test
objectClass: user
sAMAccountName: odd2
displayName:: {junk}

dn: OU=odd\\0AEVIL unit,DC=lab,DC=test
objectClass: organizationalUnit
description:: {text}

dn: CN=oddgroup,CN=Users,DC=lab,DC=test
objectClass: group
sAMAccountName: oddgroup
displayName:: {text}
"""
ODD_ACCOUNT = """dn: CN=odd3,CN=Users,DC=lab,DC=test
objectClass: user
sAMAccountName:: {name}
"""


@pytest.fixture
def odd_directory(lab):
    """Accounts, a group and a unit whose texts hold control bytes; what the controller itself refuses is left out."""
    sam = ("-H", "/var/lib/samba/private/sam.ldb")
    encoded = {key: base64.b64encode(value).decode() for key, value in {
        "text": b"Eve\nadmin = EVIL\r\x1b[31m\x7f\x01 end", "junk": b"\xff\xfe\x80 Mallory \xc3",
        "name": b"evil\nX = EVIL\x1b"}.items()}
    added = []
    for text in [*ODD_NAMES.format(**encoded).split("\n\n"), ODD_ACCOUNT.format(**encoded)]:
        result = lab.exec("dc1", "ldbadd", *sam, "--relax", input=text.strip() + "\n", deadline=30)
        if result.code == 0:
            added.append(text.strip().split("\n")[0].removeprefix("dn: "))
    yield added
    for name in added:
        result = lab.exec("dc1", "ldbdel", *sam, "--relax", name, deadline=30)
        assert result.code == 0, result


def test_from_a_controller(joined, odd_directory):
    assert {"CN=odd1,CN=Users,DC=lab,DC=test", "OU=odd\\0AEVIL unit,DC=lab,DC=test"} <= set(odd_directory)
    client = joined.client
    assert client.refresh("LAB").data == {"status": "finish"}
    for kind, expected in (("users", {"odd1"}), ("groups", {"oddgroup"})):
        page = client.call(DIRECTORY, 1, kind, {"domain": "LAB", "limit": 1000}).data
        entries = {entry["name"]: entry["display"] for entry in page["entries"]}
        assert expected <= set(entries)
        for name, display in entries.items():
            assert not control_bytes((name + display).encode()), (name, display)
        assert not any("evil" in name for name in entries)
    shown = joined.must("vornctl", "users", "--domain", "LAB", "--limit", "1000")
    assert "odd1" in shown.out and not control_bytes(shown.out.encode())
    rows = json.loads(joined.must("vornctl", "--json", "users", "--domain", "LAB", "--limit", "1000").out)
    assert any(row["name"] == "odd1" for row in rows["data"]["entries"])
    for version in (1, 2):
        listed = client.call(DOMAIN, version, "get_domain_list").data["domain_list"]
        assert not control_bytes(json.dumps(listed, ensure_ascii=False).encode())
    assert client.domains() == ["LAB", "OTHER"]
    # Without trusted domains the units are listed in their place.
    assert client.join("lab.test", *ADMINISTRATOR, manage_mode=1).ok
    rows = client.domains(2)
    assert any("Sales, West" in row[0] for row in rows) and "EVIL" not in json.dumps(rows), rows
    assert not control_bytes(json.dumps(rows, ensure_ascii=False).encode()), rows
    for version in ("1", "2"):
        result = joined.must("vornctl", "call", DOMAIN, version, "get_domain_list")
        assert not control_bytes(result.out.encode())
    clean(joined)
