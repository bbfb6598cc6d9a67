"""Faults of controllers, what is asked of an appliance meanwhile, and joins that stand still at a chosen step."""

import concurrent.futures
import contextlib
import errno
import json
import os
import shlex
import time

from client import DIRECTORY, DOMAIN
from conftest import remove_computer
from lab import DeadlinePassed, password
from obstacles import replaced
from processes import held, programs

GET_SECONDS = 0.1
ASK_SECONDS = 15
SET_SECONDS = 30
REFRESH_SECONDS = 60
SETTLED_SECONDS = 100


def administrator(domain):
    return "Administrator", password(domain, "Administrator")


def fault(lab, name, controller="dc1", only=None):
    if name == "killed":
        return lab.killed(controller)
    if name == "frozen":
        return lab.frozen(controller)
    return lab.fault(name, controller, only)


def remove_nt4_computer(lab, name):
    script = 'pdbedit -x -m "$1" >/dev/null 2>&1; userdel "$1\\$" 2>/dev/null; ! pdbedit -L | grep -i "^$1\\$:"'
    result = lab.exec("pdc", "sh", "-c", script, "remove", name)
    assert result.code == 0, result


def as_new(lab, host):
    """The machine as before its first start, without an account in LAB.TEST."""
    lab.must("renew", host)
    lab.vornd(host, "start")
    remove_computer(lab, host)


class Calls:
    """Calls that run at the same time, "get" again and again beside them."""

    def __init__(self, machine):
        self.machine = machine
        self.pool = concurrent.futures.ThreadPoolExecutor()
        self.running = {}

    def start(self, name, function, *words, **more):
        self.running[name] = self.pool.submit(function, *words, **more)

    def ask(self):
        client = self.machine.client
        self.start("test_dc", client.call, DOMAIN, 1, "test_dc")
        self.start("list", client.call, DOMAIN, 1, "get_domain_list")
        self.start("list 2", client.call, DOMAIN, 2, "get_domain_list")

    def refresh(self, domain=None):
        def timed():
            began = time.monotonic()
            return self.machine.client.refresh(domain), time.monotonic() - began

        self.start("refresh", timed)

    def end(self):
        """The answers, when all have come."""
        seconds = []
        try:
            while not all(call.done() for call in self.running.values()):
                answer = self.machine.client.call(DOMAIN, 1, "get")
                assert answer.ok
                seconds.append(answer.seconds)
                time.sleep(0.05)
        finally:
            concurrent.futures.wait(self.running.values(), 150)  # none goes on beside the next test
        # Other work of this machine may hold up some; of a short series, up to half.
        late = [took for took in seconds if took >= GET_SECONDS]
        few = len(seconds) < 20
        assert len(late) <= (max(1, len(seconds) // 2) if few else 1 + len(seconds) // 10), (len(seconds), late)
        answers = {name: call.result() for name, call in self.running.items()}
        if "refresh" in answers:
            answers["refresh"], took = answers["refresh"]
            assert took < REFRESH_SECONDS, took
        for names, limit in ((("test_dc", "list", "list 2"), ASK_SECONDS), (("set", "leave"), SET_SECONDS)):
            for name in names:
                assert name not in answers or answers[name].seconds < limit, (name, answers[name].seconds)
        return answers


def lists(machine, known):
    """Every list with its entries, and when it was fetched. They are those of the domains that are KNOWN."""
    found = {}
    for row in machine.client.call(DIRECTORY, 1, "domains").data["domains"]:
        kind = row["kind"] + "s"
        page = machine.client.call(DIRECTORY, 1, kind, {"domain": row["domain"], "offset": 0, "limit": 1000}).data
        found[row["domain"], kind] = (row["fetched"], [entry["name"] for entry in page["entries"]])
    assert {domain for domain, _ in found} == set(known)
    return found


def names_in(found):
    return {key: names for key, (_, names) in found.items()}


def fetched_in(found, domain):
    return {key: fetched for key, (fetched, _) in found.items() if key[0] == domain}


def record_of(machine):
    try:
        return json.loads(machine.path("/run/vorn/join_steps.json").read_bytes())
    except FileNotFoundError:
        return {"id": None, "steps": []}


def failed_step(machine):
    return next((step["name"] for step in record_of(machine)["steps"] if step["outcome"] == "failed"), None)


def wait_for_winbind(machine):
    """Samba's programs leave a controller alone for a minute that did not answer them, and ask it again then."""
    def trusts():
        try:
            return machine.exec("wbinfo", "-t", deadline=10).code == 0
        except DeadlinePassed:
            return False

    machine.wait_until(trusts, SETTLED_SECONDS, "winbind")


def tools(machine):
    return programs(machine, "vornjoin", "net", "wbinfo", "rpcclient")


def wait_for_step(machine, before, name):
    end = time.monotonic() + 20
    while True:
        record = record_of(machine)
        if record["id"] != before and any(step["name"] == name for step in record["steps"]):
            return
        assert time.monotonic() < end, (name, record)
        time.sleep(0.001)


GATE = "/mnt/gate"
# Samba's tool, but that calls with these words wait at the gate, before or after their work, as long as there is one.
GATED = """rm -f GATE && mkfifo -m 600 GATE && cat >"$1" <<'SCRIPT'
#!/bin/bash
wait_at_gate() { [[ ! -p GATE ]] || read -r <GATE; }
if [[ " $* " == *WORDS* ]]; then
    if [[ MOMENT == before ]]; then
        wait_at_gate
    else
        "$0.kept" "$@"
        code=$?
        wait_at_gate
        exit "$code"
    fi
fi
exec -a "${0##*/}" "$0.kept" "$@"
SCRIPT
"""
# Where a join stands still: at the first call of this tool with these words.
AT_STEP = {
    "workgroup": ("net", " lookup ", "before"),
    "credentials": ("net", " lookup ", "after"),
    "join": ("net", " join ", "before"),
    "confirm join": ("net", " testjoin ", "before"),
    "trust": ("wbinfo", "--check-secret", "before"),
    "dns": ("net", " dns register ", "before"),
    "domains": ("wbinfo", "--trusted-domains", "before"),
}
NT4_AT_STEP = {**AT_STEP, "credentials": ("net", " rpc info ", "before")}


@contextlib.contextmanager
def standing_at(machine, step, start, steps=None):
    """START begins a join, which has come to that step in the block, and goes on after it."""
    program, words, moment = (steps or AT_STEP)[step]
    command = GATED.replace("WORDS", shlex.quote(words)).replace("MOMENT", moment).replace("GATE", GATE)
    with replaced(machine, f"/usr/bin/{program}", command), contextlib.ExitStack() as opening:
        gate = machine.path(GATE)
        opening.callback(gate.unlink)
        start()
        end = time.monotonic() + 20
        while True:
            try:
                entrance = os.open(gate, os.O_WRONLY | os.O_NONBLOCK)
                break
            except OSError as error:
                # Nobody waits there yet.
                assert error.errno == errno.ENXIO and time.monotonic() < end, (step, error, record_of(machine))
            time.sleep(0.005)
        # Gone first, so that a later call does not wait there, too.
        opening.pop_all()
        opening.callback(os.close, entrance)
        opening.callback(gate.unlink)
        yield opening.close


@contextlib.contextmanager
def standing_at_the_account(machine, start):
    """The same for "computer account" of Active Directory, for which the join tool calls nothing."""
    before = record_of(machine)["id"]
    with contextlib.ExitStack() as stopped:
        # Else the step can be over before it is seen.
        with machine.lab.fault("slow", "dc1", only=machine.host):
            start()
            wait_for_step(machine, before, "computer account")
            assert stopped.enter_context(held(lambda: tools(machine)))
        yield stopped.close


def on_all(function, items):
    """The results of calls that run at the same time."""
    with concurrent.futures.ThreadPoolExecutor() as pool:
        return list(pool.map(function, items))


class Join:
    """A join of a machine that stands still at a step."""

    def __init__(self, machine, step, domain="lab.test", account="LAB", **more):
        self.machine = machine
        self.step = step
        self.domain = domain
        self.account = account
        self.more = more
        self.calls = Calls(machine)
        self.configuration = machine.configuration()

    def start(self):
        self.calls.start("set", self.machine.client.join, self.domain, *administrator(self.account), **self.more)

    def standing(self):
        if self.domain == "lab.test" and self.step == "computer account":
            return standing_at_the_account(self.machine, self.start)
        return standing_at(self.machine, self.step, self.start, NT4_AT_STEP if self.domain == "NT4DOM" else AT_STEP)

    def end(self):
        return self.calls.end()["set"]


def strike(joins, faults, then=()):
    """When all joins have come to their steps, there are the faults, which last until all have ended; the answers.
    THEN: what is called before the joins go on."""
    with contextlib.ExitStack() as faulty:
        with contextlib.ExitStack() as standing:
            # The tools wait three or four seconds for these steps; those for the others may wait meanwhile.
            ordered = sorted(joins, key=lambda join: join.step in ("credentials", "trust"))
            go_on = [standing.enter_context(join.standing()) for join in ordered]
            for each in faults:
                faulty.enter_context(each)
            for each in (*then, *go_on):
                each()
            return on_all(Join.end, joins)
