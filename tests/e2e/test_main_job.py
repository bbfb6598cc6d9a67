"""The whole life of a membership, through the web API: status, join, test, lists, refresh, options, schedule, leave."""

from client import DOMAIN, EVENTS
from lab import password
from obstacles import Log

ADMINISTRATOR = ("Administrator", password("LAB", "Administrator"))


JOINED = {"code": 0x11800404, "kind": 2, "level": 1, "text": "The appliance joined the domain LAB."}
LEFT = {"code": 0x11800506, "kind": 2, "level": 1,
        "text": "The appliance left its domain and is back in the workgroup WORKGROUP."}


def newest_event(client):
    event = client.call(EVENTS, 1, "list").data["events"][0]
    return {key: event[key] for key in JOINED}


def test_the_whole_main_job(appliance, directory):
    client = appliance.client
    assert client.get() == {"enable_domain": False}
    assert client.test_dc() is False
    assert client.domains(1) == []

    answer = client.join("lab.test", *ADMINISTRATOR)
    assert answer.body == {"success": True, "data": None}, appliance.ctl("steps").text + appliance.syslog()
    assert directory.computer(appliance.host)
    assert newest_event(client) == JOINED

    status = client.get()
    assert status["enable_domain"] is True
    assert status["domain_name"] == "LAB"
    assert status["domain_type"] == "AD"
    assert status["manage_mode"] == 0
    assert status["dns"] == "10.77.0.10"
    assert status["advance_domain_conf"] == {
        "enable_advance_option": False,
        "kdc": "",
        "netbios_name": "LAB",
        "fqdn_name": "LAB.TEST",
        "register_nics": ["all"],
    }
    assert appliance.trust_works()
    assert client.test_dc() is True

    assert client.domains(1) == ["LAB", "OTHER"]
    rows = client.domains(2)
    assert [row[:2] for row in rows] == [["LAB", "LAB"], ["OTHER", "OTHER"]]
    assert [row[2].lower() for row in rows] == ["lab.test", "other.test"]

    assert client.refresh().data == {"status": "finish"}
    users = client.call("VORN.Appliance.Directory", 1, "users", {"domain": "LAB", "offset": 0, "limit": 1000}).data
    names = {entry["name"] for entry in users["entries"]}
    assert {"Administrator", "alice", "jörg"} <= names
    assert not any(name.endswith("$") for name in names)
    assert users["total"] == len(users["entries"])

    client.options(enable_server_signing=True, domain_nested_group=3)
    assert client.options() == {
        "enable_sync_time": False,
        "enable_server_signing": True,
        "enable_rpc_enum_usergroup": False,
        "domain_nested_group": 3,
        "disable_domain_admins": False,
    }
    assert appliance.option_of_samba("winbind expand groups") == "3"

    assert client.schedule() == {"date_type": 2}
    client.schedule(date_type=0, week_name="0,3", hour=3, min=30)
    stored = client.schedule()
    assert (stored["date_type"], stored["week_name"], stored["hour"], stored["min"]) == (0, "0,3", 3, 30)
    client.schedule(date_type=2)
    assert client.schedule() == {"date_type": 2}

    log = Log(appliance)
    assert client.leave().body == {"success": True, "data": None}
    assert client.get() == {"enable_domain": False}
    assert not appliance.trust_works()
    assert newest_event(client) == LEFT
    assert log.says("vornjoin[", "the computer account NAS1$ stays in the domain LAB"), log.lines
    assert client.call(DOMAIN, 1, "get_domain_list").data == {"domain_list": []}
