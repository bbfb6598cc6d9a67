"""The KDC, the NetBIOS name and the FQDN of a request are the ones that the join goes by."""

from lab import password
from obstacles import name_server

ADMINISTRATOR = ("Administrator", password("LAB", "Administrator"))
NT_ADMINISTRATOR = ("Administrator", password("NT4DOM", "Administrator"))
KEYS = ("workgroup", "security", "realm", "password server")


def advanced(**values):
    return {"advance_domain_conf": {"enable_advance_option": True, **values}}


def written(machine):
    """The keys that name the domain, as smb.conf has them."""
    lines = [line.split("=", 1) for line in machine.read("/usr/vorn/etc/smb.conf").decode().splitlines() if "=" in line]
    return {key.strip(): value.strip() for key, value in lines if key.strip() in KEYS}


def told(machine):
    """What "get" says of them: domain, kind, switch, KDC, NetBIOS name, FQDN."""
    status = machine.client.get()
    options = status["advance_domain_conf"]
    return (status["domain_name"], status["domain_type"], options["enable_advance_option"], options["kdc"],
            options["netbios_name"], options["fqdn_name"])


def test_a_join_goes_by_the_names_of_its_request(appliance):
    client = appliance.client
    lab = {"workgroup": "LAB", "security": "ads", "realm": "LAB.TEST"}
    # No service record tells of a controller: only the one that was given can be found.
    with name_server(appliance, "none"):
        assert client.join("lab.test", *ADMINISTRATOR, dns="127.0.0.53").code == 2605
        given = advanced(kdc="10.77.0.10", netbios_name="LAB", fqdn_name="lab.test")
        answer = client.join("lab.test", *ADMINISTRATOR, dns="127.0.0.53", **given)
        assert answer.ok, appliance.ctl("steps").text
        assert written(appliance) == {**lab, "password server": "10.77.0.10"}
        assert told(appliance) == ("LAB", "AD", True, "10.77.0.10", "LAB", "LAB.TEST")
        assert client.test_dc() is True

    assert client.join("lab.test", *ADMINISTRATOR, dns="10.77.0.10").ok, appliance.ctl("steps").text
    assert written(appliance) == lab
    assert told(appliance) == ("LAB", "AD", False, "", "LAB", "LAB.TEST")

    # The FQDN alone says where LAB is to be found, since this resolver has no search domain; the KDC is a host's name.
    assert client.join("LAB", *ADMINISTRATOR).code == 2605
    answer = client.join("LAB", *ADMINISTRATOR, **advanced(kdc="dc1.lab.test", fqdn_name="lab.test"))
    assert answer.ok, appliance.ctl("steps").text
    assert written(appliance) == {**lab, "password server": "dc1.lab.test"}
    assert told(appliance) == ("LAB", "AD", True, "dc1.lab.test", "LAB", "LAB.TEST")
    assert client.test_dc() is True

    answer = client.join("NT4DOM", *NT_ADMINISTRATOR, **advanced(kdc="10.77.0.40"))
    assert answer.ok, appliance.ctl("steps").text
    assert written(appliance) == {"workgroup": "NT4DOM", "security": "domain", "password server": "10.77.0.40"}
    assert told(appliance) == ("NT4DOM", "NT4", True, "10.77.0.40", "NT4DOM", "")
    assert client.test_dc() is True
