"""Many at once: two appliances, and eight clients of one appliance with all methods of all APIs mixed for a minute."""

import collections
import concurrent.futures
import json
import threading
import time

import pytest

from appliance import SMBINFO, Appliance
from client import DIRECTORY, DOMAIN
from conftest import remove_computer
from mixed_calls import ADMINISTRATOR, GROUPS, SETTINGS, SWITCHES, USERS, Calls, at_once, mix
from processes import processes, programs

FOREIGN = {"keys of nobody": "kept as they are", "vorn test": "yes"}
OF_OTHERS = {"advanced_domain_option": "no"}
# A leave would end what all others do: it is only refused.
NOT_DONE = {(DIRECTORY, 1, "leave")}
MINUTE = 60
WARM_UP = 20
# What a minute may add to the server, whose heap is still settling after the warm-up: in five minutes it adds no more.
MORE_MEMORY = 1 << 20


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
        whole = [{**FOREIGN, **stored, **more, **admins} for _, stored in SETTINGS for more in (OF_OTHERS, {})
                 for admins in ({}, {"disable domain admins": "yes"})]
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


def every_method(machine):
    """What the server itself lists."""
    status, body = machine.client.request("GET", "/webapi")
    assert status == 200
    return {(api["api"], version, row["method"]) for api in json.loads(body)["data"]["apis"]
            for row in api["methods"] for version in row["versions"]}


@pytest.mark.parametrize("seconds", [MINUTE])
def test_eight_clients(member, seconds):
    assert member.client.refresh().data == {"status": "finish"}
    options = (member.read(SMBINFO) or b"").decode()
    assert options == "" or options.startswith("[global]"), options
    member.write(SMBINFO, "[global]\n" + "".join(f"\t{key} = {value}\n" for key, value in FOREIGN.items())
                 + "\n".join(options.splitlines()[1:]) + "\n")
    member.client.options(**SETTINGS[0][0])
    for switch in (True, False):
        member.client.options(**dict.fromkeys(SWITCHES, switch))
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
    assert calls.done == every_method(member) - NOT_DONE
    assert any(code == 2607 for _, code in calls.counts), "no join has failed"
    assert smbinfo.wrong == set()
    assert len(smbinfo.seen) >= 2 and smbinfo.looks > 20 * seconds

    assert after.pid == before.pid
    assert after.descriptors <= before.descriptors
    assert after.threads <= before.threads
    assert (after.children, after.zombies) == ([], [])
    assert after.memory <= before.memory + MORE_MEMORY, (before, after)

    member.client.options(**dict.fromkeys(SWITCHES, False))
    assert member.read("/usr/vorn/etc/smb.conf") == conf
    assert member.smbinfo_but().items() >= FOREIGN.items()
    assert member.client.test_dc() is True
    assert member.client.refresh().data == {"status": "finish"}


def test_it_is_a_member_for_every_library_of_the_server(member):
    """Two modules and the server read the machine's secret, each with code of its own, at the same time."""
    asked = {"get": (DOMAIN, lambda data: data["enable_domain"]),
             "overview": (DIRECTORY, lambda data: data["computer_account"])}

    def ask(method):
        api, is_member = asked[method]
        return [bool(is_member(member.client.call(api, 1, method).data)) for _ in range(500)]

    with concurrent.futures.ThreadPoolExecutor(8) as pool:
        answers = [answer for each in pool.map(ask, list(asked) * 4) for answer in each]
    assert len(answers) == 4000 and answers.count(False) == 0, answers.count(False)
