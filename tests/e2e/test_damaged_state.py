"""What the appliance keeps is cut, emptied or overwritten: one line in the log, the rest goes on, and what was good
stays good."""

import json

import pytest

from appliance import assert_cleared
from client import DIRECTORY, DOMAIN, EVENTS, SCHEDULE
from lab import password
from obstacles import Log, files_under, replaced
from processes import wait_for_tasks

ADMINISTRATOR = ("Administrator", password("LAB", "Administrator"))
ETC = "/usr/vorn/etc"
LISTS = f"{ETC}/private/directory"
TASKS = "/var/lib/vorn/tasks.db"
EVENT_FILE = "/var/lib/vorn/events.db"
STEPS = "/run/vorn/join_steps.json"
PROGRESS = "/run/vorn/refresh.json"
DOMAINS = "/var/lib/vorn/domains.json"
JOURNAL = f"{ETC}/private/join/journal.json"
SECRETS = "/var/lib/samba/private/secrets.tdb"

JUNK = 'head -c 6000 /dev/urandom >"$1"'
EMPTY = ': >"$1"'
CUT = 'truncate -s -100 "$1"'
HALF = 'truncate -s 5000 "$1"'
DEEP = 'head -c 100000 /dev/zero | tr "\\0" "[" >"$1"'
MISSING = 'rm -f "$1"'
OTHER_JSON = 'printf "[1,{\\"a\\":null},\\"x\\"]" >"$1"'
PAGE = 'dd if=/dev/urandom of="$1" bs=1000 seek=5 count=3 conv=notrunc status=none'


def damages(*texts):
    names = {JUNK: "junk", EMPTY: "empty", CUT: "cut", HALF: "half", DEEP: "deep", OTHER_JSON: "other", PAGE: "page",
             MISSING: "missing"}
    return [pytest.param(text, id=names[text]) for text in texts]


@pytest.fixture(scope="module")
def machine(joined):
    assert joined.client.refresh().ok
    return joined


@pytest.fixture
def membership_unchanged(machine):
    before = machine.configuration()
    yield
    assert machine.configuration() == before
    assert machine.client.get()["domain_name"] == "LAB"
    assert machine.trust_works()


def still_serves(machine):
    client = machine.client
    assert client.get()["domain_name"] == "LAB"
    assert client.test_dc() is True
    assert client.domains()[0] == "LAB"


def names(machine, domain="LAB"):
    page = machine.client.call(DIRECTORY, 1, "users", {"domain": domain, "limit": 1000})
    return page.code or {entry["name"] for entry in page.data["entries"]}


@pytest.mark.parametrize("damage", damages(JUNK, EMPTY, HALF, PAGE))
def test_a_list_of_users(machine, membership_unchanged, damage):
    machine.client.refresh("LAB")
    good, others = names(machine), names(machine, "OTHER")
    log = Log(machine)
    machine.must("sh", "-c", damage, "damage", f"{LISTS}/user_LAB.db")
    answer = machine.client.call(DIRECTORY, 1, "users", {"domain": "LAB", "limit": 1000})
    if not answer.ok:
        assert answer.code == 2617
        machine.wait_until(lambda: log.says(f"{LISTS}/user_LAB.db"), 5, f"the log holds {log.lines}")
    kinds = {(row["domain"], row["kind"]) for row in machine.client.call(DIRECTORY, 1, "domains").data["domains"]}
    assert ("LAB", "group") in kinds and ("OTHER", "user") in kinds
    assert names(machine, "OTHER") == others
    result = machine.ctl("users", "--json")
    assert result.code in (0, 1)
    if result.code == 0:
        json.loads(result.out)
    assert machine.ctl("status").code == 0
    still_serves(machine)
    assert machine.client.refresh("LAB").data == {"status": "finish"}
    assert names(machine) == good


@pytest.mark.parametrize("damage", damages(JUNK, HALF, EMPTY))
def test_records_of_tasks(machine, membership_unchanged, damage):
    task = machine.client.start_refresh("LAB").data["task_id"]
    machine.wait_until(lambda: machine.client.refresh_status(task).data == {"status": "finish"}, 30, "the refresh")
    # One that still has the file open could put it right when it ends.
    wait_for_tasks(machine)
    machine.stop()
    machine.must("sh", "-c", damage, "damage", TASKS)
    log = Log(machine)
    machine.start()
    if damage != EMPTY:
        machine.wait_until(lambda: log.says("vornd", TASKS, "damaged"), 5, f"the log holds {log.lines}")
    answer = machine.client.refresh_status(task)
    assert (answer.code, answer.body["error"]["errors"]) == (117, 122)
    still_serves(machine)
    assert machine.client.refresh().data == {"status": "finish"}
    machine.must("rm", "-f", TASKS + ".damaged")


def test_records_of_tasks_damaged_while_it_runs(machine, membership_unchanged):
    wait_for_tasks(machine)
    machine.must("sh", "-c", JUNK + f'; rm -f {TASKS}-wal {TASKS}-shm', "damage", TASKS)
    log = Log(machine)
    answer = machine.client.start_refresh()
    assert answer.code in (117, 125), answer.body
    machine.wait_until(lambda: log.says("vornd", TASKS, "not a database"), 5, f"the log holds {log.lines}")
    assert not machine.client.refresh_status("DomainUpdate_1").ok
    still_serves(machine)
    machine.stop()
    machine.start()
    assert machine.client.refresh().data == {"status": "finish"}
    machine.must("rm", "-f", TASKS + ".damaged")


@pytest.mark.parametrize("damage", damages(JUNK, HALF, EMPTY))
def test_the_event_log(machine, membership_unchanged, damage):
    log = Log(machine)
    with replaced(machine, EVENT_FILE, damage):
        answer = machine.client.call(EVENTS, 1, "list")
        if damage == EMPTY:
            assert answer.data == {"total": 0, "events": []}
        else:
            assert answer.code == 2617, answer.body
            machine.wait_until(lambda: log.says("vornd", EVENT_FILE), 5, f"the log holds {log.lines}")
            assert machine.ctl("events").code == 1
        still_serves(machine)
    assert machine.client.call(EVENTS, 1, "list").data["total"] > 0


@pytest.mark.parametrize("file, method", [(STEPS, "join_steps"), (PROGRESS, "refresh_progress")])
@pytest.mark.parametrize("damage", damages(JUNK, EMPTY, CUT, DEEP, OTHER_JSON))
def test_what_accompanies_a_call(machine, membership_unchanged, file, method, damage):
    log = Log(machine)
    with replaced(machine, file, damage):
        answer = machine.client.call(DIRECTORY, 1, method)
        assert (answer.status, answer.code) == (200, 2617), answer.body
        machine.wait_until(lambda: log.says("vornd", file), 5, f"the log holds {log.lines}")
        assert machine.ctl("steps").code == (1 if file == STEPS else 0)
        still_serves(machine)
    assert machine.client.call(DIRECTORY, 1, method).ok


@pytest.mark.parametrize("damage", damages(JUNK, EMPTY, CUT, DEEP, OTHER_JSON))
def test_the_domains_in_sight(machine, membership_unchanged, damage):
    with replaced(machine, DOMAINS, damage):
        assert machine.client.domains() == ["LAB", "OTHER"]
        assert machine.client.refresh().data == {"status": "finish"}
        assert [row["name"] for row in json.loads(machine.read(DOMAINS))] == ["LAB", "OTHER"]


@pytest.mark.parametrize("damage", damages(JUNK, DEEP) + [
    pytest.param('printf "[0]\\nhour = 99\\n" >"$1"', id="hour"),
    pytest.param('printf "[0]\\ncommand = a\\nno such key = 1\\n" >>"$1"', id="key"),
    pytest.param('truncate -s -3 "$1"', id="cut"),
    pytest.param('printf "\\000" >>"$1"', id="nul"),
])
def test_scheduled_tasks(machine, damage):
    client = machine.client
    schedule = {"date_type": 0, "week_name": "1", "hour": 3, "min": 4}
    assert client.call(SCHEDULE, 1, "set", schedule).ok
    table = machine.read("/etc/cron.d/vorn")
    log = Log(machine)
    with replaced(machine, f"{ETC}/schedule.conf", damage):
        damaged = machine.read(f"{ETC}/schedule.conf")
        machine.stop()
        machine.start()
        assert machine.read("/etc/cron.d/vorn") == table
        answer = client.call(SCHEDULE, 1, "set", {**schedule, "hour": 5})
        assert answer.code == 2617, answer.body
        machine.wait_until(lambda: log.says("vornd", f"{ETC}/schedule.conf"), 5, f"the log holds {log.lines}")
        assert machine.read(f"{ETC}/schedule.conf") == damaged
        assert machine.read("/etc/cron.d/vorn") == table
        client.call(SCHEDULE, 1, "get")
        still_serves(machine)
    assert client.schedule()["hour"] == 3
    assert client.call(SCHEDULE, 1, "set", {"date_type": 2}).ok


def test_the_table_of_cron(machine):
    client = machine.client
    assert client.call(SCHEDULE, 1, "set", {"date_type": 0, "week_name": "1", "hour": 3, "min": 4}).ok
    table = machine.read("/etc/cron.d/vorn")
    machine.write("/etc/cron.d/vorn", b"junk\0" * 100)
    machine.stop()
    machine.start()
    assert machine.read("/etc/cron.d/vorn") == table
    assert client.call(SCHEDULE, 1, "set", {"date_type": 2}).ok


@pytest.mark.parametrize("damage", damages(JUNK, EMPTY, DEEP, OTHER_JSON) + [
    pytest.param('printf "{\\"phase\\":\\"swapping\\",\\"before\\":{\\"kind\\":5},\\"after\\":[]}" >"$1"', id="types"),
])
def test_the_journal_of_a_join(machine, membership_unchanged, damage):
    secrets = machine.read(SECRETS)
    machine.stop()
    machine.must("sh", "-c", damage, "damage", JOURNAL)
    log = Log(machine)
    machine.start()
    machine.wait_until(lambda: log.says("vornd", JOURNAL), 5, f"the log holds {log.lines}")
    assert machine.read(SECRETS) == secrets
    still_serves(machine)


def test_nothing_is_thrown_away_with_a_journal_that_nobody_can_read(machine, membership_unchanged):
    machine.stop()
    machine.must("sh", "-c", f'echo kept >"${{1%/*}}/old.smb.conf"; {JUNK}', "damage", JOURNAL)
    machine.start()
    kept = files_under(machine, f"{ETC}/private")
    assert b"kept\n" in kept.values(), sorted(kept)
    machine.must("sh", "-c", f"rm -rf {ETC}/private/join.damaged")


def test_a_join_after_all_that(machine):
    answer = machine.client.join("lab.test", *ADMINISTRATOR)
    assert answer.ok, machine.ctl("steps").text
    assert machine.client.call(DOMAIN, 1, "update_stop").ok
    assert machine.client.refresh().data == {"status": "finish"}


@pytest.mark.parametrize("damage", damages(JUNK, EMPTY))
def test_the_secrets_of_the_membership(machine, damage):
    client = machine.client
    with replaced(machine, SECRETS, damage):
        assert client.test_dc() is False
        # Configured as a member, so that it can be left or joined again.
        assert client.call(DOMAIN, 1, "get").status == 200
        assert machine.ctl("test").code != 0
    assert client.test_dc() is True


@pytest.mark.parametrize("damage", damages(JUNK, EMPTY, MISSING))
def test_a_membership_without_its_secrets_can_be_left_and_joined_again(machine, damage):
    client = machine.client
    machine.must("sh", "-c", damage, "damage", SECRETS)
    assert client.leave().ok, machine.ctl("steps").text
    assert_cleared(machine)
    for _ in range(2):
        # From the workgroup, then as a member whose secrets are gone again.
        machine.must("sh", "-c", damage, "damage", SECRETS)
        assert client.get() == {"enable_domain": False}
        answer = client.join("lab.test", *ADMINISTRATOR)
        assert answer.ok, machine.ctl("steps").text
        assert machine.left_by_joins() == []
        still_serves(machine)
    assert "SECRETS/MACHINE_PASSWORD/LAB" in machine.secrets()
    assert machine.trust_works()
