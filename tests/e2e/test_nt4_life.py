"""A membership in a domain of the NT4 style, from refused joins to the end; the controller's accounts are looked at all
along."""

import pytest

from appliance import assert_cleared
from client import DIRECTORY
from lab import password
from obstacles import without_trust

ADMINISTRATOR = ("Administrator", password("NT4DOM", "Administrator"))
REFUSED = [
    ("Administrator", "wrong", 2610),
    ("nobody-here", "wrong", 2610),
    ("nina", password("NT4DOM", "nina"), 2611),
    ("ntdisabled", password("NT4DOM", "ntdisabled"), 2609),
    ("ntlocked", password("NT4DOM", "ntlocked"), 2608),
    ("ntmustch", password("NT4DOM", "ntmustch"), 2612),
]
SECRETS = {f"SECRETS/{key}/NT4DOM" for key in ("MACHINE_PASSWORD", "MACHINE_SEC_CHANNEL_TYPE", "SID")}
STAYS = "the computer account NAS1$ stays in the domain NT4DOM"


class Controller:
    """The accounts of pdc, as its own tools tell."""

    def __init__(self, lab):
        self.lab = lab

    def run(self, *words):
        return self.lab.exec("pdc", *words, deadline=30)

    def accounts(self):
        """Those of the domain, with all that is known of each."""
        result = self.run("pdbedit", "-L", "-v")
        assert result.code == 0 and "Unix username:        nina\n" in result.out, result
        return result.out

    def users(self):
        """Those of the system."""
        return self.run("cat", "/etc/passwd").out.splitlines()

    def without_appliance(self):
        self.run("pdbedit", "-x", "nas1$")
        self.run("userdel", "nas1$")
        assert "nas1$" not in self.accounts().lower()


@pytest.fixture
def controller(lab):
    controller = Controller(lab)
    controller.without_appliance()
    yield controller
    controller.without_appliance()


def leftovers(machine):
    return machine.client.call(DIRECTORY, 1, "join_steps").data["leftovers"]


def refuse_all(machine, controller):
    """Each refused join has its code and changes nothing, neither here nor there."""
    before, accounts, users = machine.configuration(), controller.accounts(), controller.users()
    for user, secret, code in REFUSED:
        answer = machine.client.join("NT4DOM", user, secret)
        assert answer.code == code, (user, machine.ctl("steps").text)
        assert answer.seconds < 30
        assert machine.client.get() == {"enable_domain": False}
        assert machine.configuration() == before, user
        assert controller.accounts() == accounts, user
        assert controller.users() == users, user
    assert machine.left_by_joins() == []


def test_joins_that_fail_leave_no_account(appliance, controller):
    refuse_all(appliance, controller)
    before, accounts, users = appliance.configuration(), controller.accounts(), controller.users()
    with without_trust(appliance):
        answer = appliance.client.join("NT4DOM", *ADMINISTRATOR)
    steps = appliance.ctl("steps").text
    assert answer.code == 2601 and "Join to 'NT4DOM' is OK" in steps, steps
    assert appliance.configuration() == before
    assert_cleared(appliance, "NT4DOM", "NT4DOM")
    assert controller.accounts() == accounts
    # The controller's own script has made an account of its system; nobody told it how to remove one.
    assert [user for user in controller.users() if not user.startswith("nas1$:")] == users
    assert leftovers(appliance) == []


def test_the_whole_life_in_an_nt4_style_domain(appliance, lab, controller):
    client = appliance.client
    workgroup = appliance.read("/usr/vorn/etc/smb.conf")
    answer = client.join("NT4DOM", *ADMINISTRATOR)
    assert answer.ok, appliance.ctl("steps").text
    status = client.get()
    assert (status["domain_name"], status["domain_type"]) == ("NT4DOM", "NT4")
    assert appliance.secrets() > SECRETS
    assert "Unix username:        nas1$\n" in controller.accounts()
    assert client.test_dc() is True
    assert client.domains(1) == ["NT4DOM"]
    assert client.refresh().data == {"status": "finish"}
    users = client.call(DIRECTORY, 1, "users", {"domain": "NT4DOM", "offset": 0, "limit": 100}).data["entries"]
    assert "nina" in {user["name"] for user in users}
    assert client.join("NT4DOM", *ADMINISTRATOR).ok
    assert client.test_dc() is True

    # The leave needs no controller, and names what it can't remove.
    accounts = controller.accounts()
    with lab.fault("dead", "pdc", only=appliance.host):
        answer = client.leave()
    assert answer.ok and answer.seconds < 15, answer.seconds
    assert_cleared(appliance, "NT4DOM", "NT4DOM")
    assert appliance.read("/usr/vorn/etc/smb.conf") == workgroup
    assert leftovers(appliance) == [STAYS]
    assert controller.accounts() == accounts

    # The account that stays is not touched by joins that are refused, and is joined again by one that is not.
    refuse_all(appliance, controller)
    assert client.join("NT4DOM", *ADMINISTRATOR).ok, appliance.ctl("steps").text
    assert client.test_dc() is True
    assert controller.accounts().count("nas1$\n") == 1

    # With the controller's administrator, the account goes; without a controller, a member stays one.
    deletion = {"delete_account": True, "username": ADMINISTRATOR[0], "password": ADMINISTRATOR[1]}
    with lab.fault("dead", "pdc", only=appliance.host):
        answer = client.call(DIRECTORY, 1, "leave", deletion)
    assert answer.code in (2605, 2606), answer.body
    assert client.get()["domain_name"] == "NT4DOM" and client.test_dc() is True
    assert client.call(DIRECTORY, 1, "leave", deletion).ok
    assert_cleared(appliance, "NT4DOM", "NT4DOM")
    assert "nas1$" not in controller.accounts()
    assert leftovers(appliance) == []
