"""Joins that fail: the right code, and nothing changed, neither on the appliance nor in the directory."""

import time

import pytest

from lab import password

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


@pytest.fixture
def unchanged(appliance, directory):
    """Holds that a test leaves the appliance's configuration and the directory as they were."""
    appliance.must("sh", "-c", "touch /etc/krb5.conf")
    before, objects = appliance.configuration(), directory.objects()
    yield
    assert appliance.configuration() == before
    assert directory.objects() == objects
    assert not appliance.exists("/var/log/winlock.state")
    leftovers = appliance.must("find", "/usr/vorn/etc", "/etc", "-maxdepth", "2", "-name", ".*.tmp*", "-o", "-name",
                               "*.conf.tmp").out
    assert leftovers == ""


@pytest.mark.parametrize("what, user, secret, more, code", REFUSED, ids=[case[0] for case in REFUSED])
def test_refused(appliance, unchanged, what, user, secret, more, code):
    answer = appliance.client.join("lab.test", user, secret, **more)
    assert (answer.status, answer.code) == (200, code), appliance.ctl("steps").text
    assert answer.seconds < 30
    assert appliance.client.get() == {"enable_domain": False}
    assert secret not in answer.body.__repr__()


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


@pytest.mark.parametrize("name", CONTROL, ids=repr)
def test_odd_domain_names_reach_no_file(appliance, unchanged, name):
    answer = appliance.client.join(name, "Administrator", ADMINISTRATOR)
    assert answer.code == 2605, answer.body
    assert answer.seconds < 30


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
