"""A join through the API against a bare "net ads join" with the configuration that the API's join writes."""

import re

from client import DIRECTORY
from figures import Values
from machine import CONFIGURATION, DOMAIN, HOST, PASSWORD, USER, Wrong

MORE_SECONDS = 1.0
DEADLINE = 60
BARE_CONFIGURATION = "/etc/samba/smb.conf"


def check_member(machine, configuration):
    result = machine.exec("net", f"--configfile={configuration}", "ads", "testjoin", deadline=30)
    if result.code != 0 or "Join is OK" not in result.text:
        raise Wrong(f"no member after the join: {result}")
    address = machine.lab.address(HOST)
    result = machine.exec("dig", "+short", f"{HOST}.{DOMAIN}", "A", deadline=30)
    if address not in result.out.split():
        raise Wrong(f"the join has not registered {address} in DNS: {result}")


def join_by_api(machine):
    """Seconds of the call, and of each of its steps."""
    machine.fresh()
    answer = machine.join()
    recorded = machine.client.call(DIRECTORY, 1, "join_steps").data
    check_member(machine, CONFIGURATION)
    return answer.seconds, {step["name"]: step["milliseconds"] / 1000 for step in recorded["steps"]}


def join_bare(machine, configuration):
    machine.fresh()
    machine.write(BARE_CONFIGURATION, configuration)
    # Without a full name the tool registers nothing in DNS, which the API's join does.
    machine.write("/etc/hosts", f"127.0.0.1 localhost\n{machine.lab.address(HOST)} {HOST}.{DOMAIN} {HOST}\n")
    command = {"words": ["net", f"--configfile={BARE_CONFIGURATION}", "ads", "join", "-U", USER],
               "environment": {"PASSWD": PASSWORD, "LC_ALL": "C"}}
    measured = machine.time({"net ads join": command}, rounds=1, deadline=DEADLINE)
    check_member(machine, BARE_CONFIGURATION)
    return measured["net ads join"][0]["seconds"]


def bare_configuration(machine):
    """What the API's join has written, without the reference to the options, none of which is set."""
    text = machine.read(CONFIGURATION).decode()
    return re.sub(r"(?m)^\s*include\s*=.*\n", "", text)


def measure(machine, findings, options, say):
    join_by_api(machine)
    configuration = bare_configuration(machine)
    api, bare, steps = [], [], {}
    for turn in range(options.runs):
        sides = ["api", "bare"] if turn % 2 == 0 else ["bare", "api"]
        for side in sides:
            if side == "bare":
                bare.append(join_bare(machine, configuration))
                continue
            seconds, parts = join_by_api(machine)
            api.append(seconds)
            for name, value in [*parts.items(), ("all steps", sum(parts.values())),
                                ("outside of the steps: administrators, services", seconds - sum(parts.values()))]:
                steps.setdefault(name, []).append(value)
        say(f"join {turn + 1}: {api[-1]:.2f} s through the API, {bare[-1]:.2f} s bare")
    more = [one - other for one, other in zip(api, bare)]
    findings.add("join through the API, longer than `net ads join`", Values(more, "s"), MORE_SECONDS)
    details = findings.table_of("A join, and the steps of the one through the API", "what")
    details.add("`net ads join`", Values(bare, "s"))
    details.add("through the API", Values(api, "s"))
    for name, values in steps.items():
        details.add(f"... {name}", Values(values, "s"))
