"""The schedule of the refresh: what is set comes back, stands in cron's table as it should, and is run by cron."""

import re
import time

import pytest

from appliance import Appliance
from client import DIRECTORY, SCHEDULE
from conftest import remove_computer
from lab import password

ADMINISTRATOR = ("Administrator", password("LAB", "Administrator"))
CRON = "/etc/cron.d/vorn"
STORE = "/usr/vorn/etc/schedule.conf"
NEVER = {"date_type": 2}
LINE = re.compile(r"(\S+ \S+ \S+ \S+ \S+) root (?:if (.*); then )?exec env -i .* sh -c -- "
                  r"'/usr/vorn/sbin/vornwin -updateDomain'(?:; fi)?")


@pytest.fixture(scope="module")
def member(joined):
    return joined


@pytest.fixture
def second(lab):
    machine = Appliance(lab, "nas2")
    machine.renew()
    remove_computer(lab, "nas2")
    assert machine.client.join("lab.test", *ADMINISTRATOR).ok, machine.ctl("steps").text
    yield machine
    lab.must("renew", "nas2")


@pytest.fixture(autouse=True)
def unscheduled(member):
    assert member.client.schedule() == NEVER
    yield
    member.client.schedule(**NEVER)


def weekly(week_name="1", **more):
    return {"date_type": 0, "week_name": week_name, "hour": 3, "min": 30, "repeat_hour": 0, "last_work_hour": 0, **more}


def dated(repeat, date="2031/5/7", **more):
    return {"date_type": 1, "date": date, "repeat": repeat, "hour": 3, "min": 30, "repeat_hour": 0, "last_work_hour": 0,
            **more}


def lines(machine):
    """What stands in cron's table about the refresh: the five fields, and what must hold on the day."""
    found = []
    for line in (machine.read(CRON) or b"").decode().splitlines():
        if "-updateDomain" in line:
            match = LINE.fullmatch(line)
            assert match, line
            found.append((match.group(1), (match.group(2) or "").replace("\\%", "%")))
    return found


def since(day):
    return f'[ "$(date +%Y%m%d)" -ge {day} ]'


LAST = """[ "$(date -d 'tomorrow 12:00' +%d)" = 01 ]"""
FORMS = [
    (weekly("0"), [("30 3 * * 0", "")]),
    (weekly("6,0,3,3"), [("30 3 * * 0,3,6", "")]),
    (weekly("0,1,2,3,4,5,6", hour=0, min=0), [("0 0 * * 0,1,2,3,4,5,6", "")]),
    (weekly("1", hour=8, min=5, repeat_hour=4, last_work_hour=17), [("5 8,12,16 * * 1", "")]),
    (weekly("1", hour=8, repeat_hour=23, last_work_hour=8), [("30 8 * * 1", "")]),
    (weekly("1", hour=22, repeat_hour=1, last_work_hour=23), [("30 22,23 * * 1", "")]),
    (weekly("1", hour=9, last_work_hour=3), [("30 9 * * 1", "")]),
    (dated(0), [("30 3 7 5 *", '[ "$(date +%Y%m%d)" = 20310507 ]')]),
    (dated(1), [("30 3 * * *", since(20310507))]),
    (dated(2), [("30 3 * * 3", since(20310507))]),
    (dated(3), [("30 3 7 * *", since(20310507))]),
    (dated(4), [("30 3 7 5 *", since(20310507))]),
    (dated(1, hour=0, min=59, repeat_hour=12, last_work_hour=12), [("59 0,12 * * *", since(20310507))]),
    (dated(3, "2031/01/31"), [
        ("30 3 31 * *", since(20310131)),
        ("30 3 30 4,6,9,11 *", since(20310131)),
        ("30 3 29 2 *", since(20310131)),
        ("30 3 28 2 *", since(20310131) + " && " + LAST),
    ]),
    (dated(4, "2032/2/29"), [
        ("30 3 29 2 *", since(20320229)),
        ("30 3 28 2 *", since(20320229) + " && " + LAST),
    ]),
]


def test_every_form_comes_back_and_stands_in_crons_table(member):
    for values, rendered in FORMS:
        assert member.client.call(SCHEDULE, 1, "set", values).body == {"success": True, "data": None}
        # All eight values come back as they were set.
        assert member.client.schedule() == {"date": "", "week_name": "", "repeat": 0, **values}
        assert lines(member) == rendered, values
    # One schedule at a time, kept by a restart of the server.
    last = member.client.schedule()
    table = member.read(CRON)
    member.stop()
    member.start()
    assert member.client.schedule() == last and member.read(CRON) == table
    assert member.must("stat", "-c", "%U %a", CRON).out == "root 644\n"
    # Cron passes over a table without a last newline.
    assert table.endswith(b"\n")
    member.client.schedule(**NEVER)
    assert member.client.schedule() == NEVER and lines(member) == []


IMPOSSIBLE = [
    (weekly(hour=24), 2617),
    (weekly(hour=-1), 2617),
    (weekly(min=60), 2617),
    (weekly("7"), 2617),
    (weekly(""), 2617),
    (weekly("1, 2"), 2617),
    (weekly("1,"), 2617),
    (weekly("1;* * * * * root id"), 2617),
    (weekly("1\n* * * * * root id"), 2617),
    (weekly(hour=9, repeat_hour=1, last_work_hour=8), 2617),
    (weekly(repeat_hour=24), 2617),
    (weekly(last_work_hour=24), 2617),
    (dated(5), 2617),
    (dated(-1), 2617),
    (dated(0, "2031/2/29"), 2617),
    (dated(0, "2031/13/1"), 2617),
    (dated(0, "2031-05-07"), 2617),
    (dated(0, "1969/12/31"), 2617),
    (dated(0, ""), 2617),
    (dated(0, "2031/5/7\n"), 2617),
    ({"date_type": 3, "hour": 1, "min": 1}, 2618),
    ({"date_type": "0"}, 2618),
    ({}, 2618),
    ({"date_type": 0, "week_name": "1", "hour": 3}, 2618),
    ({"date_type": 0, "week_name": 1, "hour": 3, "min": 30}, 2618),
    ({"date_type": 0, "hour": 3, "min": 30}, 2618),
    ({"date_type": 1, "date": "2031/5/7", "hour": 3, "min": 30}, 2618),
    (weekly(hour="3"), 2618),
    (weekly(hour=3.5), 2618),
    (weekly(repeat_hour="1"), 2618),
]


def test_impossible_times_change_nothing(member):
    member.client.schedule(**weekly("2", hour=4))
    before = [member.read(path) for path in (CRON, STORE)]
    for values, code in IMPOSSIBLE:
        answer = member.client.call(SCHEDULE, 1, "set", values)
        assert answer.code == code, (values, answer.body)
        assert [member.read(path) for path in (CRON, STORE)] == before, values


def fetched(machine):
    rows = machine.client.call(DIRECTORY, 1, "domains").data["domains"]
    return {(row["domain"], row["kind"]): row["fetched"] for row in rows}


def local_time(machine, moment):
    """Fields of the time as the appliance has it; the moment is told in words."""
    text = machine.must("date", "-d", moment, "+%Y/%m/%d %w %H %M").out.split()
    return {"date": text[0], "week_name": text[1], "hour": int(text[2]), "min": int(text[3])}


def minute_ahead(machine):
    """The next minute that is at least fifteen seconds away: cron has read its table by then."""
    left = 60 - int(machine.must("date", "+%S").out)
    return local_time(machine, f"{left + (1 if left >= 15 else 61)} seconds")


def runs_by_cron(machine):
    return len(re.findall(r"vornwin\[\d+\]: the lists of domain users and groups are new", machine.syslog()))


def test_cron_runs_it_on_its_day_and_on_no_other(member, second):
    times = 0
    for kinds in (("once", "weekly"), ("daily", "once")):
        when = minute_ahead(member)
        # Of that minute's day, which at midnight is not today's.
        tomorrow = local_time(member, f"{when['date']} 1 day")
        now = {"hour": when["hour"], "min": when["min"]}
        forms = {
            "once": {"date_type": 1, "repeat": 0, **now},
            "daily": {"date_type": 1, "repeat": 1, **now},
            "weekly": {"date_type": 0, **now},
        }
        # On the one machine it is the day, on the other it is not.
        member.client.schedule(**forms[kinds[0]], date=when["date"], week_name=when["week_name"])
        second.client.schedule(**forms[kinds[1]], date=tomorrow["date"], week_name=tomorrow["week_name"])
        began = int(time.time())
        member.wait_until(lambda: runs_by_cron(member) > times, 100, "the refresh by cron")
        times += 1
        assert len(fetched(member)) == 4 and all(moment >= began for moment in fetched(member).values())
        # It stays as long as nobody takes it away, also what runs only once.
        stored = member.client.schedule()
        assert (stored["date"], stored["min"]) == (when["date"], when["min"]) and len(lines(member)) == 1
        # The other machine's cron has had this minute, too.
        assert "vornwin" not in second.syslog()
        assert fetched(second) == {} and len(lines(second)) == 1
    assert runs_by_cron(member) == times
    # Neither a task of the server's nor its marker had a part in it.
    assert not member.exists("/tmp/domain_updating")
    assert not any(member.exists(f"/tmp/domain_{kind}.pid") for kind in ("user", "group"))
