"""What lasts on an appliance, and that a call which is refused changes none of it."""

from client import CONF, SCHEDULE
from lab import password
from obstacles import files_under
from processes import wait_for_tasks

ADMINISTRATOR = ("Administrator", password("LAB", "Administrator"))
ETC = "/usr/vorn/etc"
NO_ROOM = "No space left on device"
READ_ONLY = "Read-only file system"
EVERY_NIGHT = {"date_type": 0, "week_name": "0,1,2,3,4,5,6", "hour": 3, "min": 4}


def everything(machine):
    """All that lasts, to the byte; not what only accompanies a call."""
    files = files_under(machine, ETC)
    # The first is the answer to a name's check; a join writes keys ahead into the second, which the next line allows.
    for name in ("private/dns_query", "smbinfo.conf"):
        files.pop(f"{ETC}/{name}", None)
    # A refresh begins with the removal of these links; the lists themselves stay.
    files = {path: text for path, text in files.items() if "/private/domain_" not in path}
    return {**files, **machine.configuration()}


def changes(before, after):
    return [path for path in {**before, **after} if before.get(path) != after.get(path)]


def set_options(client):
    return client.call(CONF, 1, "set", {"enable_server_signing": True, "domain_nested_group": 7})


def set_time(client):
    return client.call(CONF, 1, "set", {"enable_sync_time": True})


def set_schedule(client):
    return client.call(SCHEDULE, 1, "set", EVERY_NIGHT)


def join(client):
    return client.join("lab.test", *ADMINISTRATOR)


def leave(client):
    return client.leave()


def refused(machine, log, call, code, *words):
    """The call fails with the code; nothing is changed, and a line of the log says what and where."""
    before = everything(machine)
    answer = call(machine.client)
    assert (answer.status, answer.code) == (200, code), (call.__name__, answer.body, log.lines)
    assert changes(before, everything(machine)) == []
    machine.wait_until(lambda: log.says(*words), 5, f"the log holds {log.lines}")


def works_again(machine):
    client = machine.client
    assert client.test_dc() is True
    assert set_options(client).ok
    assert client.options()["domain_nested_group"] == 7
    assert set_schedule(client).ok
    assert {**client.schedule(), **EVERY_NIGHT} == client.schedule()
    assert b"vornwin -updateDomain" in machine.read("/etc/cron.d/vorn")
    assert client.refresh().data == {"status": "finish"}


def refresh(machine):
    """To the end of its task, which comes a moment after its status: until then it is in the way of the next one."""
    assert machine.client.refresh().ok
    wait_for_tasks(machine)
