""""get" against a method that does nothing in the same server, and against what an administrator would call instead."""

import json
import socket
import statistics
import time

from client import DOMAIN
from figures import Values
from machine import CONFIGURATION, SOCKET, Wrong
from machine import DOMAIN as DOMAIN_NAME

MORE_SECONDS = 200e-6
PAIRS = 300  # of calls, in each run
WARM_UP = 100
DEADLINE = 30
NOTHING = "VORN.Bench"
MODULE = "/usr/vorn/lib/modules/bench_nothing.so"


class Connection:
    """One connection to the server, kept open."""

    def __init__(self, path):
        self.socket = socket.socket(socket.AF_UNIX, socket.SOCK_STREAM)
        self.socket.settimeout(DEADLINE)
        self.socket.connect(path)

    def __enter__(self):
        return self

    def __exit__(self, *error):
        self.socket.close()

    @staticmethod
    def request(api, method):
        return (f"POST /webapi/{api}/1/{method} HTTP/1.1\r\nHost: localhost\r\nContent-Type: application/json\r\n"
                "Content-Length: 2\r\n\r\n{}").encode()

    def call(self, request):
        """Seconds from the first byte sent to the last one received, and the answer's body."""
        begin = time.perf_counter()
        self.socket.sendall(request)
        received = b""
        while b"\r\n\r\n" not in received:
            received += self.piece()
        head, _, body = received.partition(b"\r\n\r\n")
        length = next(int(line.split(b":")[1]) for line in head.split(b"\r\n") if line.lower().startswith(b"content-l"))
        while len(body) < length:
            body += self.piece()
        return time.perf_counter() - begin, body

    def piece(self):
        piece = self.socket.recv(65536)
        if not piece:
            raise Wrong("the server has closed the connection")
        return piece


def pairs(connection, count):
    """Seconds of "get" and of the method that does nothing, in turn."""
    get, nothing = connection.request(DOMAIN, "get"), connection.request(NOTHING, "nothing")
    seconds = ([], [])
    for turn in range(count):
        order = (0, 1) if turn % 2 == 0 else (1, 0)
        for which in order:
            took, body = connection.call((get, nothing)[which])
            if not body.startswith(b'{"data":') or b'"success":true' not in body:
                raise Wrong(f"not answered: {body}")
            seconds[which].append(took)
    return seconds


def measure_socket(machine, findings, details, runs, state):
    with Connection(str(machine.path(SOCKET))) as connection:
        _, body = connection.call(connection.request(DOMAIN, "get"))
        if json.loads(body)["data"]["enable_domain"] is not (state == "member"):
            raise Wrong(f"not the state to be measured: {body}")
        pairs(connection, WARM_UP)
        gets, nothings = [], []
        for _ in range(runs):
            get, nothing = pairs(connection, PAIRS)
            gets.append(statistics.median(get))
            nothings.append(statistics.median(nothing))
    more = [get - nothing for get, nothing in zip(gets, nothings)]
    findings.add(f'"get", {state}, longer than a method that does nothing', Values(more, "µs"), MORE_SECONDS)
    details.add(f'"get" on a kept connection, {state}', Values(gets, "µs"))
    details.add(f"a method that does nothing, {state}", Values(nothings, "µs"))


STATUS = "`vornctl status`, which calls \"get\""
TEST = "`vornctl test`, which calls \"test_dc\""
REALM = "`realm list`"
TESTJOIN = "`net ads testjoin`"
ADCLI = "`adcli testjoin`"
COMPARED = ((STATUS, REALM), (STATUS, TESTJOIN), (TEST, TESTJOIN), (TEST, ADCLI))


def administrators_commands(machine):
    """What tells of the membership on a machine. `realm` asks a service on the message bus, which runs in the host."""
    machine.must("cp", CONFIGURATION, "/etc/samba/smb.conf")  # realmd knows no other place
    machine.must("sh", "-c", "mkdir -p /run/dbus && dbus-daemon --system --fork --nopidfile")
    machine.must("realm", "list")
    environment = {"LC_ALL": "C", "PATH": "/usr/sbin:/usr/bin:/sbin:/bin:/usr/vorn/bin"}
    net = ["net", f"--configfile={CONFIGURATION}", "ads", "testjoin"]
    return {
        STATUS: {"words": ["vornctl", "status"], "environment": environment},
        REALM: {"words": ["realm", "list"], "environment": environment},
        TEST: {"words": ["vornctl", "test"], "environment": environment},
        TESTJOIN: {"words": net, "environment": environment},
        ADCLI: {"words": ["adcli", "testjoin", f"--domain={DOMAIN_NAME}"], "environment": environment},
    }


def measure(machine, findings, options, say):
    machine.fresh()
    machine.stop()
    machine.write(MODULE, options.module.read_bytes())
    machine.path(MODULE).chmod(0o644)
    machine.start()
    calls = findings.table_of('"get" and a method that does nothing, medians of '
                              f"{PAIRS} calls each, in turn on one connection", "call")
    measure_socket(machine, findings, calls, options.runs, "no member")
    machine.join()
    measure_socket(machine, findings, calls, options.runs, "member")
    say("calls: " + ", ".join(f"{what} {values.median * 1e6:.0f} µs" for what, values in calls.rows))

    commands = findings.table_of("What an administrator would call, started in turn on the member", "command")
    measured = machine.time(administrators_commands(machine), rounds=2 * options.runs, deadline=DEADLINE)
    for name, runs in measured.items():
        commands.add(name, Values([run["seconds"] for run in runs], "ms"))
    ratios = findings.table_of("The same in pairs of one round, the first in times of the second", "pair")
    for first, second in COMPARED:
        pair = zip(measured[first], measured[second])
        ratios.add(f"{first.split(',')[0]} against {second}",
                   Values([one["seconds"] / other["seconds"] for one, other in pair], "times"))
    say("commands: " + ", ".join(f"{name} {values.median * 1000:.0f} ms" for name, values in commands.rows))
