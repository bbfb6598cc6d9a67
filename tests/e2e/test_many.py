"""Many at once: two appliances, and eight clients of one appliance with all methods of all APIs mixed for a minute."""

import collections
import concurrent.futures
import json
import random
import threading
import time

import pytest

from appliance import SMBINFO, Appliance
from client import CONF, DIRECTORY, DOMAIN, EVENTS, SCHEDULE
from conftest import remove_computer
from lab import password
from processes import processes, programs

ADMINISTRATOR = ("Administrator", password("LAB", "Administrator"))
USERS = {"LAB": {"alice", "jörg", "norights"}, "OTHER": {"zed"}}
GROUPS = {"LAB": {"nasusers", "Büro Süd Leute"}, "OTHER": {"zgroup"}}
FOREIGN = {"keys of nobody": "kept as they are", "vorn test": "yes"}
# Who sets options sets these together, so that a file with one of the first and one of the second is of two writers.
SETTINGS = [
    ({"enable_server_signing": True, "domain_nested_group": 3, "enable_rpc_enum_usergroup": True},
     {"server signing": "yes", "winbind expand groups": "3", "enable nt4 enum": "yes"}),
    ({"enable_server_signing": False, "domain_nested_group": 7, "enable_rpc_enum_usergroup": False},
     {"winbind expand groups": "7"}),
]
OF_OTHERS = {"advanced_domain_option": "no"}
SCHEDULES = [
    {"date_type": 2},
    {"date_type": 0, "week_name": "0,3", "hour": 3, "min": 30, "repeat_hour": 0, "last_work_hour": 0},
    {"date_type": 1, "date": "2031/01/02", "repeat": 3, "hour": 4, "min": 5, "repeat_hour": 2, "last_work_hour": 20},
]
CLIENTS = 8
MINUTE = 60
WARM_UP = 20
LONGEST_ANSWER = 30
# What a minute may add to the server, whose heap is still settling after the warm-up: in five minutes it adds no more.
MORE_MEMORY = 1 << 20


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


def names(machine, kind, domain):
    page = machine.client.call(DIRECTORY, 1, kind, {"domain": domain, "offset": 0, "limit": 1000}).data
    return {entry["name"] for entry in page["entries"]}


def test_two_appliances(appliance, lab, directory):
    other = Appliance(lab, "nas2")
    other.renew()
    remove_computer(lab, "nas2")
    machines = (appliance, other)
    for answer in at_once(*(lambda m=m: m.client.join("lab.test", *ADMINISTRATOR) for m in machines)):
        assert answer.ok, answer.body
    for answer in at_once(*(lambda m=m: m.client.refresh() for m in machines)):
        assert answer.data == {"status": "finish"}
    secrets = []
    for machine in machines:
        assert directory.computer(machine.host)
        assert machine.trust_works()
        for domain in USERS:
            assert USERS[domain] <= names(machine, "users", domain)
            assert GROUPS[domain] <= names(machine, "groups", domain)
        assert machine.exec("dig", "+short", f"{machine.host}.lab.test", "@10.77.0.10").out.split() == [
            lab.address(machine.host)]
        secrets.append(machine.must("tdbdump", "-k", "SECRETS/MACHINE_PASSWORD/LAB",
                                    "/var/lib/samba/private/secrets.tdb").out)
    assert secrets[0] != secrets[1]
    for answer in at_once(*(machine.client.leave for machine in machines)):
        assert answer.ok, answer.body
    for machine in machines:
        assert machine.client.get() == {"enable_domain": False}
        assert directory.computer(machine.host)


class Calls:
    """Every call of the clients: what it answered, and what it may."""

    def __init__(self, machine):
        self.machine = machine
        self.counts = collections.Counter()
        self.failures = []
        self.tasks = ["no_such_task"]
        self.longest = (0, "")

    def call(self, api, version, method, parameters=None, codes=(), refused=None):
        """CODES: with which it may fail; REFUSED: with which it must."""
        answer = self.machine.client.call(api, version, method, parameters or {}, deadline=60)
        code = 0 if answer.ok else answer.code
        name = f"{api.removeprefix('VORN.')} {version} {method}"
        self.counts[name, code] += 1
        self.longest = max(self.longest, (answer.seconds, name))
        allowed = {0, *codes} if refused is None else {refused}
        if code not in allowed or answer.seconds > LONGEST_ANSWER:
            self.failures.append(f"{name} {parameters}: {answer.body} after {answer.seconds:.1f} s")
        return answer

    def expect(self, condition, what):
        if not condition:
            self.failures.append(what)

    # One method each.

    def get(self, _):
        data = self.call(DOMAIN, 1, "get").body.get("data") or {}
        self.expect(data.get("domain_name") == "LAB" and data.get("enable_domain") is True, f"get answers {data}")

    def test(self, _):
        self.expect(self.call(DOMAIN, 1, "test_dc").body.get("data") == {"test_join_success": True}, "test_dc")

    def lists(self, dice):
        version = dice.choice((1, 2))
        rows = (self.call(DOMAIN, version, "get_domain_list").body.get("data") or {}).get("domain_list")
        rows = [row if version == 1 else row[0] for row in rows or []]
        self.expect(rows == ["LAB", "OTHER"], f"get_domain_list {version} answers {rows}")

    def start(self, dice):
        words = dice.choice(({}, {"domain_name": "LAB"}, {"domain_name": "@all"}))
        answer = self.call(DOMAIN, 1, "update_start", words, codes=(2626,))
        if answer.ok:
            self.tasks.append(answer.data["task_id"])

    def status(self, dice):
        # 121: it was stopped; 117: there is no such task.
        self.call(DOMAIN, 1, "update_status", {"task_id": dice.choice(self.tasks)}, codes=(117, 121))

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
        self.call(DOMAIN, 1, "set", {
            "enable_domain": True, "domain_name": "lab.test", "username": "nobody-here", "password": "x"}, refused=2607)


MIX = {
    "get": 6, "test": 2, "lists": 3, "start": 3, "status": 4, "stop": 1, "get_options": 5, "set_options": 3,
    "get_schedule": 3, "set_schedule": 3, "entries": 6, "rest": 5, "refused": 6,
}


def mix(calls, seconds):
    """All clients at once; one of them also tries to join, over and over."""
    end = time.monotonic() + seconds

    def work(number):
        dice = random.Random(f"{number} {seconds}")
        while time.monotonic() < end:
            getattr(calls, dice.choices(list(MIX), MIX.values())[0])(dice)
            if number == 0 and dice.random() < 0.1:
                calls.failing_join(dice)

    at_once(*(lambda n=number: work(n) for number in range(CLIENTS)))


class Smbinfo(threading.Thread):
    """Looks at smbinfo.conf again and again."""

    def __init__(self, machine):
        super().__init__(daemon=True)
        self.path = machine.path(SMBINFO)
        self.ended = threading.Event()
        self.looks = 0
        self.seen = collections.Counter()
        self.wrong = set()

    def __enter__(self):
        self.start()
        return self

    def __exit__(self, *_):
        self.ended.set()
        self.join(10)

    def run(self):
        whole = [{**FOREIGN, **stored, **more} for _, stored in SETTINGS for more in (OF_OTHERS, {})]
        while not self.ended.is_set():
            try:
                text = self.path.read_text()
            except FileNotFoundError:
                text = "missing"
            lines = [line.strip() for line in text.splitlines() if line.strip()]
            pairs = dict((part.strip() for part in line.split("=", 1)) for line in lines[1:] if "=" in line)
            self.looks += 1
            if lines[:1] == ["[global]"] and pairs in whole and len(lines) == 1 + len(pairs) and text.endswith("\n"):
                self.seen[json.dumps(pairs)] += 1
            else:
                self.wrong.add(text)
            time.sleep(0.002)


def server(machine):
    return next(process for process in programs(machine, "vornd") if process.arguments[1:2] != ["--task"])


def quiet(machine):
    """Waits until no refresh runs and no call is being worked on; stops nothing."""
    def is_quiet():
        own = [process for process in processes(machine) if process.program.startswith("/usr/vorn/")]
        return len(own) == 1
    machine.wait_until(is_quiet, 60, "the end of all that the appliance does")
    time.sleep(1)


class Held:
    """What the server holds: descriptors, threads, children, memory."""

    def __init__(self, machine):
        process = server(machine)
        self.pid = process.pid
        self.descriptors = len(list(machine.path(f"/proc/{process.pid}/fd").iterdir()))
        self.threads = int(process.status("Threads")[0])
        everyone = processes(machine)
        self.children = [(other.name, other.state) for other in everyone if other.parent == process.pid]
        self.zombies = [other.status("Name") for other in everyone if other.state == "Z"]
        self.memory = sum(int(line.split()[1]) << 10 for line in process.read("smaps_rollup").decode().splitlines()
                          if line.startswith("Pss_Anon:"))

    def __repr__(self):
        return str(vars(self))


@pytest.mark.parametrize("seconds", [MINUTE])
def test_eight_clients(member, seconds):
    assert member.client.refresh().data == {"status": "finish"}
    options = (member.read(SMBINFO) or b"").decode()
    assert options == "" or options.startswith("[global]"), options
    member.write(SMBINFO, "[global]\n" + "".join(f"\t{key} = {value}\n" for key, value in FOREIGN.items())
                 + "\n".join(options.splitlines()[1:]) + "\n")
    member.client.options(**SETTINGS[0][0])
    conf = member.read("/usr/vorn/etc/smb.conf")
    calls = Calls(member)
    with Smbinfo(member) as smbinfo:
        mix(calls, WARM_UP)
        quiet(member)
        before = Held(member)
        calls.counts.clear()
        mix(calls, seconds)
        quiet(member)
        after = Held(member)
    print(f"\n{sum(calls.counts.values())} calls, the longest {calls.longest}\nbefore {before}\nafter  {after}\n"
          f"{dict(calls.counts)}\n{smbinfo.looks} looks: {dict(smbinfo.seen)}")
    assert not calls.failures, "\n".join(calls.failures)
    assert sum(calls.counts.values()) > 5 * seconds
    called = {name for name, _ in calls.counts}
    assert len(called) >= 20, called
    assert smbinfo.wrong == set()
    assert len(smbinfo.seen) >= 2 and smbinfo.looks > 20 * seconds

    assert after.pid == before.pid
    assert after.descriptors <= before.descriptors
    assert after.threads <= before.threads
    assert (after.children, after.zombies) == ([], [])
    assert after.memory <= before.memory + MORE_MEMORY, (before, after)

    assert member.read("/usr/vorn/etc/smb.conf") == conf
    assert member.smbinfo_but().items() >= FOREIGN.items()
    assert member.client.test_dc() is True
    assert member.client.refresh().data == {"status": "finish"}


def test_it_is_a_member_for_every_library_of_the_server(member):
    """Two modules and the server read the machine's secret, each with code of its own, at the same time."""
    end = time.monotonic() + 5
    asked = {"get": (DOMAIN, lambda data: data["enable_domain"]),
             "overview": (DIRECTORY, lambda data: data["computer_account"])}

    def ask(method):
        api, is_member = asked[method]
        answers = []
        while time.monotonic() < end:
            answers.append(bool(is_member(member.client.call(api, 1, method).data)))
        return answers

    with concurrent.futures.ThreadPoolExecutor(8) as pool:
        answers = [answer for each in pool.map(ask, list(asked) * 4) for answer in each]
    assert len(answers) > 1000 and answers.count(False) == 0, (len(answers), answers.count(False))
