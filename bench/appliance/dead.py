"""What the API answers when the controller is dead: how late at most, and with which code."""

import json

from calls import Connection
from client import DOMAIN as API
from figures import Values
from lab import password
from machine import DOMAIN, PASSWORD, SOCKET, USER, Wrong, lab_with
from refreshes import refresh

GET_SECONDS = 0.1
ANSWER_SECONDS = 15
SET_SECONDS = 30
GETS = 100
RUNS = 3
DEADLINE = 90
NO_CONTROLLER = 2605
NOT_RESOLVED = 2602
CONTROLLER = "dc1"
NT4_DOMAIN = "NT4DOM"
NT4_CONTROLLER = "pdc"


def gets(machine, enabled):
    with Connection(str(machine.path(SOCKET))) as connection:
        seconds = []
        for _ in range(GETS):
            took, body = connection.call(connection.request(API, "get"))
            answer = json.loads(body)
            if not answer["success"] or answer["data"]["enable_domain"] is not enabled:
                raise Wrong(f'"get" with a dead controller: {body}')
            seconds.append(took)
    return seconds


def call(machine, method, version, parameters, right, runs=RUNS):
    """Seconds of each call, and the first answer that is not right."""
    seconds, wrong = [], ""
    for _ in range(runs):
        answer = machine.client.call(API, version, method, parameters, deadline=DEADLINE)
        seconds.append(answer.seconds)
        if not wrong and not right(answer):
            wrong = json.dumps(answer.body)
    return seconds, wrong


def join(**more):
    return {"enable_domain": True, "domain_name": DOMAIN, "username": USER, "password": PASSWORD, **more}


def code(wanted):
    return lambda answer: answer.code == wanted


def fails(answer):
    return answer.data == {"test_join_success": False}


class Part:
    """The figures of one kind of member; WHAT is said in front of each."""

    def __init__(self, what, machine, findings, say):
        self.what = what
        self.machine = machine
        self.findings = findings
        self.say = say
        self.known = {}  # the lists, by version, while the controller answers

    def add(self, name, method, parameters, right, limit, version=1, runs=RUNS):
        what = f"{self.what}: {name}"
        seconds, wrong = call(self.machine, method, version, parameters, right, runs)
        self.findings.add(what, Values(seconds, "s"), limit, worst=True, wrong=wrong)
        self.say(f"{what} {max(seconds):.2f} s {wrong}")

    def add_gets(self, name, enabled):
        values = Values(gets(self.machine, enabled), "ms")
        self.findings.add(f'{self.what}: "get", {name}', values, GET_SECONDS, worst=True)

    def ask(self):
        """What a member asks. The lists are those that it knew before."""
        self.add_gets("member", True)
        self.add('"test_dc"', "test_dc", {}, fails, ANSWER_SECONDS)
        for version, known in self.known.items():
            self.add(f'"get_domain_list" {version}', "get_domain_list", {},
                     lambda answer, known=known: answer.data == {"domain_list": known}, ANSWER_SECONDS, version)

    def learn(self):
        self.known = {version: self.machine.client.domains(version) for version in (1, 2)}
        if not all(self.known.values()):
            raise Wrong(f"a member knows of no domains: {self.known}")

    def leave(self):
        self.add('"set", leaves', "set", {"enable_domain": False}, lambda answer: answer.ok, SET_SECONDS, runs=1)
        self.add_gets("no member", False)


def measure_trusting(machine, findings, say):
    machine.fresh()
    machine.join()
    refresh(machine)
    part = Part("dead controller", machine, findings, say)
    part.learn()
    with machine.lab.fault("dead", CONTROLLER):
        part.ask()
        part.add(f'"set", member joins again ({NO_CONTROLLER})', "set", join(), code(NO_CONTROLLER), SET_SECONDS)
        part.leave()
        part.add(f'"set", joins ({NO_CONTROLLER})', "set", join(), code(NO_CONTROLLER), SET_SECONDS)
        part.add(f'"set", joins with "dns" ({NOT_RESOLVED})', "set", join(dns=machine.lab.address(CONTROLLER)),
                 code(NOT_RESOLVED), SET_SECONDS)


def measure_units(machine, findings, say):
    machine.fresh()
    answer = machine.client.join(DOMAIN, USER, PASSWORD, manage_mode=1)
    if not answer.ok:
        raise Wrong(f"the join failed: {answer.body}")
    part = Part("dead controller, no trusts", machine, findings, say)
    part.learn()
    if part.known[2] == part.known[1]:
        raise Wrong(f"no organisational units are listed: {part.known}")
    with machine.lab.fault("dead", CONTROLLER):
        part.ask()


def measure_nt4(machine, findings, say):
    parameters = join(domain_name=NT4_DOMAIN, password=password(NT4_DOMAIN, USER))
    answer = machine.client.call(API, 1, "set", parameters, deadline=DEADLINE)
    if not answer.ok:
        raise Wrong(f"the join failed: {answer.body}")
    part = Part("dead controller, NT4", machine, findings, say)
    part.learn()
    with machine.lab.fault("dead", NT4_CONTROLLER):
        part.ask()
        part.add(f'"set", member joins again ({NO_CONTROLLER})', "set", parameters, code(NO_CONTROLLER), SET_SECONDS)
        part.leave()
        part.add(f'"set", joins ({NO_CONTROLLER})', "set", parameters, code(NO_CONTROLLER), SET_SECONDS)


def measure(machine, findings, options, say):
    measure_trusting(machine, findings, say)
    measure_units(machine, findings, say)
    say("bringing up a lab with an NT4-style controller")
    with lab_with(options.stage, "--no-ad", "--nt4") as other:
        other.start()
        measure_nt4(other, findings, say)
