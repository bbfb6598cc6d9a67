"""What vornd takes at rest, and how long it takes to start."""

import time

from figures import Values
from machine import SOCKET, VORND
from peaks import memory
from refreshes import refresh

PSS_BYTES = 12e6
START_SECONDS = 0.3
SETTLE_SECONDS = 1.0
DEADLINE = 30
CALLS = 200


def measure_starts(machine, findings, details, runs, state):
    machine.stop()
    measured = machine.inside(runs * (2 * DEADLINE + SETTLE_SECONDS) + 30, do="start", words=[VORND], socket=SOCKET,
                              rounds=runs + 1, settle=SETTLE_SECONDS, deadline=DEADLINE)[1:]
    machine.start()
    findings.add(f"start of vornd until it answers, {state}", Values([run["seconds"] for run in measured], "ms"),
                 START_SECONDS)
    add_memory(findings, details, measured, f"{state}, just started")


def add_memory(findings, details, measured, state):
    findings.add(f"memory of vornd (PSS), {state}", Values([run["pss"] for run in measured], "MB"), PSS_BYTES,
                 worst=True)
    details.add(f"resident, {state}", Values([run["rss"] for run in measured], "MB"))
    details.add(f"private, {state}", Values([run["private"] for run in measured], "MB"))


def work(machine):
    """Every call that reads, the status many times."""
    for _ in range(CALLS):
        machine.client.get()
    for version in (1, 2):
        machine.client.domains(version)
    machine.client.test_dc()
    machine.client.options()
    machine.client.schedule()
    refresh(machine)


def measure(machine, findings, options, say):
    machine.fresh()
    details = findings.table_of("Memory of vornd at rest, beside the figures above", "memory")
    measure_starts(machine, findings, details, options.runs, "no member")
    machine.join()
    measure_starts(machine, findings, details, options.runs, "member")
    work(machine)
    time.sleep(SETTLE_SECONDS)
    add_memory(findings, details, [memory(machine, machine.vornd())], f"member, after {CALLS} calls and a refresh")
    say(f"vornd: {findings.figures[-1].measured / 1e6:.2f} MB after work")
