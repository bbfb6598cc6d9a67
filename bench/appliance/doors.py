"""The door to the network: "get" through TLS and a session against the same on the server's socket; beside a join; the
memory of a door that nobody uses."""

import json
import statistics
import subprocess
import threading

from door import COOKIE, Door
from figures import Values
from machine import SOCKET, Wrong

CONNECTIONS = 8
SECONDS = 4  # of each measurement of the throughput
RATE = 200  # calls a second beside a join
RATE_SECONDS = 6
LEAST_PART = 0.70  # of the calls that the socket answers
MOST_P99 = 0.050
MOST_MEMORY = 12e6  # bytes, proportional share


def load(program, *words):
    """One run of bench/appliance/load.cpp: what it has printed."""
    seconds = max(SECONDS, RATE_SECONDS) + 60
    done = subprocess.run([str(program), *map(str, words)], capture_output=True, text=True, timeout=seconds)
    if done.returncode != 0:
        raise Wrong(f"load ended with {done.returncode}: {done.stderr.strip()}")
    result = json.loads(done.stdout)
    if result["failed"] or result["calls"] == 0:
        raise Wrong(f"{result['failed']} connections failed: {done.stderr.strip()}")
    return result


def session_of(door):
    visitor = door.login()
    return ["--tls", f"{door.address}:{door.port}", "--cookie", f"{COOKIE}={visitor.cookie}", "--csrf", visitor.csrf]


def measure_throughput(machine, door, findings, options):
    """In turn, so that whatever else the machine does touches both alike."""
    many = ["--connections", CONNECTIONS, "--seconds", SECONDS]
    through, direct = session_of(door), ["--unix", machine.path(SOCKET)]
    calls = {"door": [], "socket": []}
    alone = {"door": [], "socket": []}
    for _ in range(options.runs):
        for name, where in (("socket", direct), ("door", through)):
            result = load(options.load, *where, *many)
            calls[name].append(result["seconds"] / result["calls"])
            alone[name].append(load(options.load, *where, "--connections", 1, "--seconds", 1)["p50"])
    parts = [socket / door_ for socket, door_ in zip(calls["socket"], calls["door"])]
    details = findings.table_of(f'"get" on the member, {CONNECTIONS} kept connections, and one alone', "way")
    for name, title in (("socket", "the server's socket"), ("door", "TLS and a session")):
        details.add(f"{title}: seconds for a call in the throughput", Values(calls[name], "µs"))
        details.add(f"{title}: one connection, median of a call", Values(alone[name], "µs"))
    # As the other figures it is a limit from above: of the time for a call.
    findings.add('"get" through TLS and session, time for a call against the socket',
                 Values([1 / part for part in parts], "times"), 1 / LEAST_PART)
    return statistics.median(parts)


def measure_beside_joins(machine, door, findings, options):
    through = session_of(door)
    slowest = []
    for _ in range(max(2, options.runs // 2)):
        failure = []

        def joins():
            try:
                machine.join()
                machine.join()
            except (Wrong, AssertionError) as error:
                failure.append(error)

        thread = threading.Thread(target=joins)
        thread.start()
        result = load(options.load, *through, "--connections", CONNECTIONS, "--rate", RATE, "--seconds", RATE_SECONDS)
        thread.join()
        if failure:
            raise Wrong(f"a join beside the load failed: {failure[0]}")
        slowest.append(result["p99"])
    findings.add(f'"get" at {RATE} a second beside a join, 99th percentile', Values(slowest, "ms"), MOST_P99)


def proportional_memory(machine, door):
    process = machine.exec("cat", f"/proc/{door.pid}/smaps_rollup").out
    return next(int(line.split()[1]) * 1024 for line in process.splitlines() if line.startswith("Pss:"))


def measure(machine, findings, options, say):
    machine.fresh()
    machine.join()
    door = Door(machine)
    memory = []
    try:
        for _ in range(options.runs):
            door.start()
            door.get("/")
            memory.append(proportional_memory(machine, door))
            door.stop()
        findings.add("vorn-httpd at rest, proportional memory", Values(memory, "MB"), MOST_MEMORY)
        door.start()
        part = measure_throughput(machine, door, findings, options)
        say(f'door: {part * 100:.0f} % of the calls that the socket answers')
        measure_beside_joins(machine, door, findings, options)
    finally:
        door.end()
