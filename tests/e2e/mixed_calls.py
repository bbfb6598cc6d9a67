"""Clients that call all methods of all APIs, each at random, and know what every answer may be."""

import collections
import random
import threading
import time

from client import CONF, DIRECTORY, DOMAIN, EVENTS, SCHEDULE
from lab import password

ADMINISTRATOR = ("Administrator", password("LAB", "Administrator"))
USERS = {"LAB": {"alice", "jörg", "norights"}, "OTHER": {"zed"}}
GROUPS = {"LAB": {"nasusers", "Büro Süd Leute"}, "OTHER": {"zgroup"}}
# Who sets options sets these together, so that a file with one of the first and one of the second is of two writers.
SETTINGS = [
    ({"enable_server_signing": True, "domain_nested_group": 3, "enable_rpc_enum_usergroup": True},
     {"server signing": "yes", "winbind expand groups": "3", "enable nt4 enum": "yes"}),
    ({"enable_server_signing": False, "domain_nested_group": 7, "enable_rpc_enum_usergroup": False},
     {"winbind expand groups": "7"}),
]
# Each of these is set alone, at any time.
SWITCHES = ("enable_sync_time", "disable_domain_admins")
SCHEDULES = [
    {"date_type": 2},
    {"date_type": 0, "week_name": "0,3", "hour": 3, "min": 30, "repeat_hour": 0, "last_work_hour": 0},
    {"date_type": 1, "date": "2031/01/02", "repeat": 3, "hour": 4, "min": 5, "repeat_hour": 2, "last_work_hour": 20},
]
CLIENTS = 8
LONGEST_ANSWER = 30
LONGEST_JOIN = 60
# A join has twenty seconds in all, and eight clients beside it on a slow machine may take them.
OUT_OF_TIME = (2601, 2605, 2613, 2614, 2615, 2617)


def at_once(*functions):
    """Runs them in threads and answers what they answer; the first exception comes through."""
    results = [None] * len(functions)
    errors = []

    def run(number, function):
        try:
            results[number] = function()
        except BaseException as error:
            errors.append(error)

    threads = [threading.Thread(target=run, args=pair, daemon=True) for pair in enumerate(functions)]
    for thread in threads:
        thread.start()
    for thread in threads:
        thread.join(180)
        assert not thread.is_alive(), "a call has no end"
    if errors:
        raise errors[0]
    return results


class Calls:
    """Every call of the clients: what it answered, and what it may."""

    def __init__(self, machine):
        self.machine = machine
        self.counts = collections.Counter()
        self.failures = []
        self.done = set()
        self.joining = 0  # attempts that have begun or ended: odd while one is under way
        self.tasks = {"no_such_task": 0}  # and what `joining` was when they were asked for
        self.longest = (0, "")

    def call(self, api, version, method, parameters=None, codes=(), refused=None, longest=LONGEST_ANSWER):
        """CODES: with which it may fail; REFUSED: with which it must."""
        answer = self.machine.client.call(api, version, method, parameters or {}, deadline=90)
        code = 0 if answer.ok else answer.code
        name = f"{api.removeprefix('VORN.')} {version} {method}"
        self.counts[name, code] += 1
        if answer.ok:
            self.done.add((api, version, method))
        self.longest = max(self.longest, (answer.seconds, name))
        allowed = {0, *codes} if refused is None else {refused}
        if code not in allowed or answer.seconds > longest:
            self.failures.append(f"{name} {parameters}: {answer.body} after {answer.seconds:.1f} s")
        return answer

    def expect(self, condition, what):
        if not condition:
            self.failures.append(what)

    def beside_a_join(self, before):
        """Has one been under way since the moment of which BEFORE tells?"""
        return before % 2 == 1 or self.joining != before

    # One method each.

    def get(self, _):
        data = self.call(DOMAIN, 1, "get").body.get("data") or {}
        self.expect(data.get("domain_name") == "LAB" and data.get("enable_domain") is True, f"get answers {data}")

    def test(self, _):
        # Between the change of its password on the controller and here an account that is joined again does not work.
        before = self.joining
        works = self.call(DOMAIN, 1, "test_dc").body.get("data") == {"test_join_success": True}
        self.expect(works or self.beside_a_join(before), "test_dc")

    def lists(self, dice):
        version = dice.choice((1, 2))
        before = self.joining
        rows = (self.call(DOMAIN, version, "get_domain_list").body.get("data") or {}).get("domain_list")
        rows = [row if version == 1 else row[0] for row in rows or []]
        # A join starts winbind again, which looks for the trusted domains then.
        self.expect(rows == ["LAB", "OTHER"] or (rows == ["LAB"] and self.beside_a_join(before)),
                    f"get_domain_list {version} answers {rows}")

    def start(self, dice):
        words = dice.choice(({}, {"domain_name": "LAB"}, {"domain_name": "@all"}))
        before = self.joining
        answer = self.call(DOMAIN, 1, "update_start", words, codes=(2626,))
        if answer.ok:
            self.tasks[answer.data["task_id"]] = before

    def status(self, dice):
        # 121: it was stopped; 117: there is no such task; 2623: a join has changed the account amid it.
        task, before = dice.choice(list(self.tasks.items()))
        failed = (2623,) if self.beside_a_join(before) else ()
        self.call(DOMAIN, 1, "update_status", {"task_id": task}, codes=(117, 121, *failed))

    def stop(self, _):
        self.call(DOMAIN, 1, "update_stop")

    def get_options(self, _):
        data = self.call(CONF, 1, "get").body.get("data") or {}
        self.expect(set(data) == {"enable_sync_time", "enable_server_signing", "enable_rpc_enum_usergroup",
                                  "domain_nested_group", "disable_domain_admins"}, f"options: {data}")
        shown = {key: data.get(key) for key in SETTINGS[0][0]}
        self.expect(shown in [given for given, _ in SETTINGS], f"options of two writers: {shown}")

    def set_options(self, dice):
        self.call(CONF, 1, "set", dice.choice(SETTINGS)[0], codes=(2617,))

    def set_switch(self, dice):
        self.call(CONF, 1, "set", {dice.choice(SWITCHES): dice.random() < 0.5}, codes=(2617,))

    def overview(self, _):
        data = self.call(DIRECTORY, 1, "overview").body.get("data") or {}
        self.expect(data.get("computer_account") == f"{self.machine.host.upper()}$", f"overview: {data}")

    def get_schedule(self, _):
        data = self.call(SCHEDULE, 1, "get").body.get("data") or {}
        good = [all(data.get(key) == value for key, value in given.items()) for given in SCHEDULES]
        self.expect(any(good), f"a schedule that nobody has set: {data}")

    def set_schedule(self, dice):
        self.call(SCHEDULE, 1, "set", dice.choice(SCHEDULES), codes=(2617,))

    def entries(self, dice):
        kind, known = dice.choice((("users", USERS), ("groups", GROUPS)))
        domain = dice.choice(list(known))
        data = self.call(DIRECTORY, 1, kind, {"domain": domain, "offset": 0, "limit": 1000}).body.get("data") or {}
        found = {entry["name"] for entry in data.get("entries", [])}
        self.expect(known[domain] <= found, f"{kind} of {domain}: {found}")

    def rest(self, dice):
        api, method, words = dice.choice((
            (DIRECTORY, "domains", {}), (DIRECTORY, "join_steps", {}), (DIRECTORY, "refresh_progress", {}),
            (EVENTS, "list", {"offset": 0, "limit": 10}), (DIRECTORY, "users", {"search": "ali", "limit": 5})))
        self.call(api, 1, method, words)

    def refused(self, dice):
        join = {"enable_domain": True, "domain_name": "lab.test", "username": "nobody-here", "password": "x"}
        api, method, words, code = dice.choice((
            (DOMAIN, "set", {**join, "domain_name": "10.0.0.1"}, 2601),
            (DOMAIN, "set", {**join, "password": None}, 2618),
            (DOMAIN, "set", {}, 2618),
            (DOMAIN, "update_status", {}, 2618),
            (DOMAIN, "update_start", {"domain_name": 5}, 2618),
            (CONF, "set", {"domain_nested_group": "3"}, 2618),
            (SCHEDULE, "set", {"date_type": 0, "week_name": "9", "hour": 99, "min": 0}, 2617),
            (DIRECTORY, "leave", {"delete_account": "yes"}, 2618),
            (DOMAIN, "no_such_method", {}, 211),
            ("VORN.No.Such.API", "get", {}, 210),
        ))
        self.call(api, 1, method, words, refused=code)

    def failing_join(self, _):
        answer = self.call(DOMAIN, 1, "set", {
            "enable_domain": True, "domain_name": "lab.test", "username": "nobody-here", "password": "x"},
            codes=(2607, *OUT_OF_TIME))
        self.expect(not answer.ok, "joined by nobody")

    def join_again(self):
        self.joining += 1
        for _ in range(3):
            answer = self.call(DOMAIN, 1, "set", {
                "enable_domain": True, "domain_name": "lab.test", "username": ADMINISTRATOR[0],
                "password": ADMINISTRATOR[1]}, codes=OUT_OF_TIME, longest=LONGEST_JOIN)
            if answer.ok:
                break
        self.joining += 1
        self.expect(answer.ok, "joined again")


MIX = {
    "get": 6, "test": 2, "lists": 3, "start": 3, "status": 4, "stop": 1, "get_options": 5, "set_options": 3,
    "set_switch": 1, "overview": 3, "get_schedule": 3, "set_schedule": 3, "entries": 6, "rest": 5, "refused": 6,
}


def mix(calls, seconds):
    """All clients at once; one of them also tries to join, over and over, and once it may."""
    end = time.monotonic() + seconds

    def work(number):
        dice = random.Random(f"{number} {seconds}")
        if number == 0:
            calls.join_again()
        while time.monotonic() < end:
            getattr(calls, dice.choices(list(MIX), MIX.values())[0])(dice)
            if number == 0 and dice.random() < 0.1:
                calls.failing_join(dice)

    at_once(*(lambda n=number: work(n) for number in range(CLIENTS)))
