"""Counts what a program executes, under an emulator that tells of every instruction."""

import os
import re
import subprocess

TRACE = re.compile(rb"^Trace \d+: \S+ \[[0-9a-f]+/([0-9a-f]+)/\S+\] ?(\S*)")
BEGIN, END = b"MeasuredCall", b"MeasuredCallEnded"
DEADLINE_SECONDS = 900


def count(trace):
    """The number of instructions of each measured call, in their order. One counts from the first instruction of
    MeasuredCall to that of MeasuredCallEnded."""
    counts = []
    inside = False
    executed = 0
    for line in trace:
        found = TRACE.match(line)
        if not found:
            continue
        if found[2] == END:
            if inside:
                counts.append(executed)
            inside = False
        elif inside:
            executed += 1
        elif found[2] == BEGIN:
            inside = True
            executed = 1
    return counts


def instructions(emulator, program):
    """{case: (the call's instructions, those of its platform calls)}"""
    command = ["timeout", str(DEADLINE_SECONDS), *emulator, "-singlestep", "-d", "exec,nochain", "-D", "/dev/stderr"]
    # The loader's look-ups are the process's, not a call's.
    environment = dict(os.environ, LD_BIND_NOW="1")
    names = subprocess.run(
        [*command[:2], *emulator, program, "usual"], check=True, stdout=subprocess.PIPE, env=environment, text=True
    ).stdout.splitlines()
    with subprocess.Popen(
        [*command, program, "usual"], stdout=subprocess.DEVNULL, stderr=subprocess.PIPE, env=environment
    ) as run:
        counts = count(run.stderr)
    if run.returncode != 0 or len(counts) != len(names):
        raise subprocess.SubprocessError(f"{program} ended with {run.returncode}, {len(counts)} calls were seen")
    figures = {}
    for line, executed in zip(names, counts):
        case, _, side = line.split("|")
        figures.setdefault(case, {})[side] = executed
    return {case: (sides["call"], sides["platform"]) for case, sides in figures.items()}


def heap(emulator, program):
    """{case: the bytes that a call takes at most}"""
    command = ["timeout", str(DEADLINE_SECONDS), *emulator, program]
    output = subprocess.run(command, check=True, stdout=subprocess.PIPE, text=True).stdout
    rows = (line.split("|") for line in output.splitlines())
    return {case: int(peak) for case, peak, _ in rows}
