"""What the API answers when the controller is dead: how late at most, and with which code."""

import json

from calls import Connection
from client import DOMAIN as API
from figures import Values
from machine import DOMAIN, PASSWORD, SOCKET, USER, Wrong
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


def measure(machine, findings, options, say):
    machine.fresh()
    machine.join()
    refresh(machine)
    address = machine.lab.address(CONTROLLER)

    def add(what, method, parameters, right, limit, version=1, runs=RUNS):
        seconds, wrong = call(machine, method, version, parameters, right, runs)
        findings.add(f"dead controller: {what}", Values(seconds, "s"), limit, worst=True, wrong=wrong)
        say(f"dead controller: {what} {max(seconds):.2f} s {wrong}")

    def code(wanted):
        return lambda answer: answer.code == wanted

    with machine.lab.fault("dead", CONTROLLER):
        findings.add('dead controller: "get", member', Values(gets(machine, True), "ms"), GET_SECONDS, worst=True)
        add('"test_dc"', "test_dc", {}, lambda answer: answer.data == {"test_join_success": False}, ANSWER_SECONDS)
        for version in (1, 2):
            add(f'"get_domain_list" {version}', "get_domain_list", {}, lambda answer: answer.data["domain_list"],
                ANSWER_SECONDS, version)
        add(f'"set", member joins again ({NO_CONTROLLER})', "set", join(), code(NO_CONTROLLER), SET_SECONDS)
        add('"set", leaves', "set", {"enable_domain": False}, lambda answer: answer.ok, SET_SECONDS, runs=1)
        findings.add('dead controller: "get", no member', Values(gets(machine, False), "ms"), GET_SECONDS, worst=True)
        add(f'"set", joins ({NO_CONTROLLER})', "set", join(), code(NO_CONTROLLER), SET_SECONDS)
        add(f'"set", joins with "dns" ({NOT_RESOLVED})', "set", join(dns=address), code(NOT_RESOLVED), SET_SECONDS)
