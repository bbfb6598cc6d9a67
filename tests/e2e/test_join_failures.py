"""Joins that fail: the right code, and nothing changed, neither on the appliance nor in the directory."""

import time

import pytest

from appliance import SMBINFO
from lab import password
from obstacles import name_server, without_trust

WRONG = "not the passw0rd"
USER = password("LAB", "alice")
ADMINISTRATOR = password("LAB", "Administrator")
ADVANCED = "advance_domain_conf"


def advanced(**values):
    return {ADVANCED: {"enable_advance_option": True, **values}}


# (what fails, account, password, more parameters, code)
REFUSED = [
    ("wrong password", "Administrator", WRONG, {}, 2607),
    ("unknown user", "nobody-here", WRONG, {}, 2607),
    ("disabled account", "disabled1", USER, {}, 2609),
    ("locked account", "locked1", USER, {}, 2608),
    ("expired account", "expired1", USER, {}, 2608),
    ("password must change", "mustch1", USER, {}, 2612),
    ("no right to join", "norights", USER, {}, 2611),
    ("wrong NetBIOS name", "Administrator", ADMINISTRATOR, advanced(netbios_name="WRONGWG"), 2604),
    ("wrong KDC", "Administrator", ADMINISTRATOR, advanced(kdc="10.77.0.1"), 2603),
]


OPTIONS = "[global]\n\tserver signing = yes\n\twinbind expand groups = 3\n\tsomebody's key = kept  as it is\n"


def options(machine):
    info = machine.path(SMBINFO).stat()
    return machine.smbinfo_but("advanced_domain_option", "register nic"), oct(info.st_mode), info.st_uid, info.st_gid


@pytest.fixture
def unchanged(appliance, directory):
    """Holds that a test leaves the configuration and the directory as they were, and nothing beside them."""
    appliance.write(SMBINFO, OPTIONS)
    appliance.must("sh", "-c", f"touch /etc/krb5.conf; chmod 0640 {SMBINFO}; chown root:daemon {SMBINFO}")
    kept = options(appliance)
    assert kept[0]["somebody's key"] == "kept  as it is" and kept[1].endswith("640")
    before, objects, nodes = appliance.configuration(), directory.objects(), directory.dns_nodes()
    yield
    assert appliance.configuration() == before
    assert options(appliance) == kept
    assert directory.objects() == objects
    assert directory.dns_nodes() == nodes
    assert appliance.left_by_joins() == [] and not appliance.exists("/var/log/winlock.state")


@pytest.mark.parametrize("what, user, secret, more, code", REFUSED, ids=[case[0] for case in REFUSED])
def test_refused(appliance, unchanged, what, user, secret, more, code):
    answer = appliance.client.join("lab.test", user, secret, **more)
    assert (answer.status, answer.code) == (200, code), appliance.ctl("steps").text
    assert answer.seconds < 30
    assert appliance.client.get() == {"enable_domain": False}
    assert secret not in answer.body.__repr__()


def account_of(directory, host):
    text = directory.search(f"(sAMAccountName={host.upper()}$)", "objectGUID", "userAccountControl", "pwdLastSet",
                            "msDS-KeyVersionNumber", "servicePrincipalName")
    lines = sorted(line for line in text.splitlines() if line and not line.startswith(("#", "ref:")))
    assert {"userAccountControl: 4096"} < set(lines), text
    return lines


def test_an_account_that_is_there_already_stays_as_it_is(appliance, directory, request):
    assert appliance.client.join("lab.test", "Administrator", ADMINISTRATOR).ok, appliance.ctl("steps").text
    assert appliance.client.leave().ok
    request.getfixturevalue("unchanged")
    account = account_of(directory, appliance.host)
    cases = {case[0]: case for case in REFUSED}
    for what in ("wrong password", "no right to join", "wrong NetBIOS name", "wrong KDC"):
        _, user, secret, more, code = cases[what]
        answer = appliance.client.join("lab.test", user, secret, **more)
        assert answer.code == code, what + appliance.ctl("steps").text
        assert account_of(directory, appliance.host) == account, what


def test_an_account_that_the_join_made_goes_with_its_failure(appliance, unchanged):
    with without_trust(appliance):
        answer = appliance.client.join("lab.test", "Administrator", ADMINISTRATOR)
    assert answer.code == 2601, answer.body
    steps = appliance.ctl("steps").text
    assert "NAS1$ does not exist yet" in steps and "Join is OK" in steps and "Left behind" not in steps, steps


# (domain, FQDN, KDC, code); each of the other texts is the name of a domain that is there
MIXED_UP = [
    ("lab.test", "other.test", "", 2605),
    ("lab.test", "other.test", "10.77.0.10", 2603),
    ("lab.test", "", "10.77.0.30", 2603),
    ("LAB", "nowhere.test", "", 2605),
    ("LAB", "other.test", "", 2604),
    ("LAB", "other.test", "10.77.0.10", 2603),
    ("NT4DOM", "nt4dom.test", "", 2605),
    ("NT4DOM", "nt4dom.test", "10.77.0.40", 2603),
]


def test_names_that_belong_to_different_domains(appliance, unchanged):
    for domain, realm, controller, code in MIXED_UP:
        more = advanced(fqdn_name=realm, kdc=controller)
        secret = password("NT4DOM", "Administrator") if domain == "NT4DOM" else ADMINISTRATOR
        answer = appliance.client.join(domain, "Administrator", secret, **more)
        assert answer.code == code, (domain, realm, controller, appliance.ctl("steps").text)
    # The name server names a controller that works, but of the other domain.
    with name_server(appliance, "dc2.other.test"):
        secret = password("OTHER", "Administrator")
        answer = appliance.client.join("lab.test", "Administrator", secret, dns="127.0.0.53")
    assert answer.code == 2605, answer.body
    assert "it is a controller of other.test, not of lab.test" in " ".join(appliance.ctl("steps").text.split())


SETTINGS = "/etc/vorninfo.conf"
SETTINGS_BEFORE = {
    "no key": b"enableduserhome=no\n",
    "trailing blanks": b"trustdomain=yes  \nother = x \t\n",
    "no last newline": b"other=x\ntrustdomain=yes",
    "the key twice": b"trustdomain=no\nenableduserhome=no\ntrustdomain=yes\n",
    "empty": b"",
    "missing": None,
    "default": b"trustdomain=yes\nenableduserhome=no\n",
}


def test_the_file_of_the_settings_is_put_back_to_the_byte(appliance, unchanged):
    resolver = appliance.read("/etc/resolv.conf")
    assert appliance.read(SETTINGS) == SETTINGS_BEFORE["default"]
    for what, before in SETTINGS_BEFORE.items():
        if before is None:
            appliance.path(SETTINGS).unlink()
        else:
            appliance.write(SETTINGS, before)
        for more in ({"manage_mode": 1}, {"manage_mode": 1, "dns": "10.77.0.10,10.77.0.30"}):
            assert appliance.client.join("lab.test", "Administrator", WRONG, **more).code == 2607
            assert appliance.read(SETTINGS) == before, (what, more)
            assert appliance.read("/etc/resolv.conf") == resolver


def test_a_domain_that_does_not_exist(appliance, unchanged):
    answer = appliance.client.join("nowhere.test", "Administrator", ADMINISTRATOR)
    assert answer.code == 2605, answer.body


def test_a_domain_that_the_given_name_server_does_not_know(appliance, unchanged):
    # The given server is a switch that answers, but not for this name.
    answer = appliance.client.join("nowhere.test", "Administrator", ADMINISTRATOR, dns="10.77.0.1")
    assert answer.code == 2602, answer.body
    assert answer.seconds < 30


FAULTS = [
    ("smb-drop", 2606),
    ("smb-rst", 2606),
    ("ldap-drop", 2605),
    ("dns-drop", 2605),
    ("dead", 2605),
]


@pytest.mark.parametrize("fault, code", FAULTS)
def test_a_controller_that_can_not_be_reached(appliance, lab, unchanged, fault, code):
    with lab.fault(fault, "dc1", only=appliance.host):
        answer = appliance.client.join("lab.test", "Administrator", ADMINISTRATOR)
    assert answer.code == code, answer.body
    assert answer.seconds < 30


def test_dead_name_servers_in_the_request(appliance, unchanged):
    answer = appliance.client.join(
        "lab.test", "Administrator", ADMINISTRATOR, dns="10.77.0.250,10.77.0.251,10.77.0.252")
    assert answer.code == 2602, answer.body
    assert answer.seconds < 30


def test_a_kdc_that_is_silent(appliance, lab, unchanged):
    with lab.fault("kdc-drop", "dc1", only=appliance.host):
        answer = appliance.client.join("lab.test", "Administrator", ADMINISTRATOR, **advanced(kdc="10.77.0.10"))
    assert answer.code == 2603, answer.body
    assert answer.seconds < 30


def test_bad_requests_change_nothing(appliance, unchanged):
    for request, code in [
        ({"domain_name": "10.0.0.1"}, 2601),
        ({"domain_name": "fe80::1"}, 2601),
        ({"domain_name": 5}, 2618),
        ({"password": None}, 2618),
        ({"dns": ["10.77.0.10"]}, 2618),
        ({ADVANCED: {}}, 2618),
    ]:
        values = {"enable_domain": True, "domain_name": "lab.test", "username": "Administrator", "password": WRONG}
        answer = appliance.client.call("VORN.Core.Directory.Domain", 1, "set", {**values, **request})
        assert answer.code == code, request


CONTROL = ["lab.test\nworkgroup = EVIL", "lab.test\r\n", "lab\x00.test", "-lab.test", "lab.test; id", "$(id).test"]


def test_odd_domain_names_reach_no_file(appliance, unchanged):
    before = appliance.configuration()
    for name in CONTROL:
        answer = appliance.client.join(name, "Administrator", ADMINISTRATOR)
        assert answer.code == 2605, (name, answer.body)
        assert answer.seconds < 30
        assert appliance.configuration() == before, name


def test_a_member_stays_a_member_when_joining_another_domain_fails(member, lab, directory):
    before = member.configuration()
    for domain, user, secret in [("lab.test", "Administrator", WRONG), ("other.test", "Administrator", WRONG)]:
        answer = member.client.join(domain, user, secret)
        assert answer.code == 2607, answer.body
        assert member.configuration() == before
        assert member.trust_works()
        assert member.client.test_dc() is True
    # Winbind still answers for users of the domain.
    deadline = time.monotonic() + 20
    while member.exec("wbinfo", "-i", "LAB\\alice").code != 0:
        assert time.monotonic() < deadline
        time.sleep(0.5)
